#pragma once
/// \file
/// The process kind every manager operation creates: it sets the kernel's
/// target bits from the platform and language, on an iOS device waits for
/// LLDB to say the process is ready, and learns from LLDB the exit code its
/// MI front end does not report.

#include "process/gdbprocess.h"

namespace midebug {

class TLLDBProcess : public TGDBProcess {
public:
  TLLDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
               const std::string& LauncherPath, Integer Pid, const std::string& CommandFile, TGDBLanguage Language,
               TGDBCPU CPU, const std::string& Platform);

  void WaitUntilProcessStarted() override;
  void NotifyProcessStarted() override { FProcessStarted = true; }
  void NotifyLogEvent(const TGDBLogEvent& Event) override;
  void NotifyProcessExited(Integer Code, const std::string& Signal) override;

private:
  /// LLDB has announced "Process ready to launch" (set at once but on an iOS
  /// device).
  std::atomic<bool> FProcessStarted{false};
  /// The exit code has been asked for (once per process).
  std::atomic<bool> FExitCodeAsked{false};
  /// LLDB 14's answer to "process status" once the program has exited:
  /// Process 26078 exited with status = 7 (0x00000007)
  TGDBConsoleQuery FExitStatusQuery{"process status", " exited with status = ", ' '};
};

} // namespace midebug
