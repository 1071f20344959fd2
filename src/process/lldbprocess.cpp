#include "process/lldbprocess.h"

#include "mi/miscanner.h"
#include "platform/hostthread.h"

namespace midebug {

TLLDBProcess::TLLDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
                           const std::string& LauncherPath, Integer Pid, const std::string& CommandFile,
                           TGDBLanguage Language, TGDBCPU CPU, const std::string& Platform)
    : TGDBProcess(Listener, RemoteProfile, LauncherPath, Pid, CommandFile, Language, CPU, Platform) {
  if (Platform == "iOSDevice64") {
    FKernel->FKernelType = ktLLDB;
  } else {
    // 6 or 10: an LLDB kernel, and the language it debugs.
    Integer KernelType = Language == glCPP ? 10 : 6;
    if (Platform == "Win64" || Platform == "Win64x")
      KernelType += ktWindowsTarget;
    if (Platform == "Win64x")
      KernelType += ktWindowsX;
    FKernel->FKernelType = KernelType;
  }
  FProcessStarted = Platform != "iOSDevice64";
}

void TLLDBProcess::WaitUntilProcessStarted() {
  while (!FProcessStarted && FAlive)
    YieldAndSleep(WaitPolicy().PollMs);
}

void TLLDBProcess::NotifyLogEvent(const TGDBLogEvent& Event) {
  if (Event.Event == etConsole && FExitStatusQuery.TakeAnswer(Event.Data))
    return;
  TGDBProcess::NotifyLogEvent(Event);
}

void TLLDBProcess::NotifyProcessExited(Integer Code, const std::string& Signal) {
  // lldb-mi reports every exit as "exited-normally" with code 0, whatever
  // the program returned; its console still knows the code. A kill the IDE
  // asked for, a signal or a lost connection says all there is to say.
  const bool Normal = IsLLDB() && Code == 0 && Signal.empty() && !IsDying();
  if (!Normal || !FAlive || FExitCodeAsked.exchange(true)) {
    TGDBProcess::NotifyProcessExited(Code, Signal);
    return;
  }
  // The question waits for its reply, which the output thread reads: it is
  // asked on the main thread, after the program output already queued.
  DeferIfLive([this] {
    const Integer Status = MIStrToIntDef(FExitStatusQuery.Query(Requests()), 0);
    TGDBProcess::NotifyProcessExited(Status, "");
  });
}

} // namespace midebug
