#pragma once
/// \file
/// The kernel for LLDB's MI front end.

#include "kernel/gdbkernel.h"

namespace midebug {

/// LLDB's MI front end started on this machine. It prints "(gdb)" without a
/// blank, and an unfinished reply is handed over after 5 seconds of silence.
class TLLDBKernel : public TGDBKernel {
public:
  TLLDBKernel(const std::string& LauncherPath, const std::string& CommandFile);
  std::string GetCommandFileOption() override;
  bool TimeOutExpired(TDateTime& Start) override;

  static constexpr int UnfinishedReplyTimeoutMs = 5000;
};

} // namespace midebug
