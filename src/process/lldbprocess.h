#pragma once
/// \file
/// The process kind every manager operation creates: it sets the kernel's
/// target bits from the platform and language, and on an iOS device waits
/// for LLDB to say the process is ready.

#include "process/gdbprocess.h"

namespace midebug {

class TLLDBProcess : public TGDBProcess {
public:
  TLLDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
               const std::string& LauncherPath, Integer Pid, const std::string& CommandFile, TGDBLanguage Language,
               TGDBCPU CPU, const std::string& Platform);

  void WaitUntilProcessStarted() override;
  void NotifyProcessStarted() override { FProcessStarted = true; }

private:
  /// LLDB has announced "Process ready to launch" (set at once but on an iOS
  /// device).
  std::atomic<bool> FProcessStarted{false};
};

} // namespace midebug
