// Run control: starting, pausing, resuming, stepping, ending and detaching
// the debugged program, and how the debugger treats its signals. Every
// command here is sent without waiting unless noted; the stop, resume or exit
// it causes arrives later as a notification.

#include "process/gdbprocess.h"

#include "platform/hostthread.h"

#include <array>
#include <memory>

namespace midebug {

namespace {

/// The entry functions a program's main code may start at, tried in order.
constexpr std::array<const char*, 5> MainEntryNames = {"main", "WinMain", "wWinMain", "VZMmain", "_NativeMain"};

/// The listener of the run-to-main breakpoint: every hit is a stop the IDE
/// sees as a breakpoint stop where the program halted.
class TBreakOnMain : public TInterfaced<IGDBBreakpointListener> {
public:
  void BreakpointHits(bool& ShouldStop, Integer /*ThreadId*/, TGDBLocation& /*Location*/) override {
    ShouldStop = true;
  }
  void BreakpointVerified(bool /*Verified*/, Integer /*Breakpoint*/, const TGDBLocation& /*Location*/) override {}
};

} // namespace

void TGDBProcess::Run() {
  std::string Token;
  ProcessAsyncRequest(
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecRunCommand(Key, false); }));
}

bool TGDBProcess::SetRunToMainBreakpoint() {
  const bool ByAddress = FLanguage == glPascal && FKernel->FEntryPoint != 0;
  const UInt64 EntryPoint = FKernel->FEntryPoint;
  std::unique_ptr<TBreakInsertResult> Inserted;
  for (const char* Name : MainEntryNames) {
    Inserted = std::make_unique<TBreakInsertResult>();
    std::string Token;
    const std::string Line = BuildCommand(Token, [&](TGDBCommand& Builder, std::string& Key) {
      return ByAddress ? Builder.CreateBreakInsertCommand(Key, EntryPoint, true)
                       : Builder.CreateBreakInsertCommand(Key, Name, false, true);
    });
    ProcessSyncRequest(Token, Line, *Inserted);
    if (ByAddress || !Inserted->FError || Inserted->FTimeOut)
      break;
  }
  if (Inserted->FError || Inserted->FBreakpoint == -1)
    return false;
  TIntfPtr<IGDBBreakpointListener> Listener(new TBreakOnMain);
  {
    std::lock_guard Guard(FBreakpointLock);
    FBreakpointList[Inserted->FBreakpoint] = Listener;
  }
  FBreakOnMain = Listener;
  return true;
}

void TGDBProcess::RunToFirstSource() {
  std::string Token;
  ProcessAsyncRequest(BuildCommand(
      Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecUntilCommand(Key, "", -1); }));
}

void TGDBProcess::RunToEntryPoint() {
  if (!FKernel->SupportStopOnEntryPoint())
    SetRunToMainBreakpoint();
  const bool Start = FKernel->IsLLDB();
  std::string Token;
  ProcessAsyncRequest(BuildCommand(
      Token, [Start](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecRunCommand(Key, Start); }));
}

void TGDBProcess::Pause() {
  if (FSuspended || FSuspending)
    return;
  // The stop may be read before the interrupt call returns: the flag that
  // makes it the expected interruption is set first.
  if (FAsyncTarget && FKernel->SupportExecInterruptCommand()) {
    FSuspending = true;
    std::string Token;
    if (!ProcessAsyncRequest(BuildCommand(
            Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecInterruptCommand(Key); })))
      FSuspending = false;
    return;
  }
  // GDB in its synchronous mode reads no command while the program runs;
  // the program itself is interrupted (SIGINT on Linux).
  if (FPid == -1)
    return;
  FSuspending = true;
  FKernel->Interrupt(FPid);
}

void TGDBProcess::Resume() {
  if (!FSuspended || FResuming)
    return;
  FResuming = true;
  std::string Token;
  if (!ProcessAsyncRequest(
          BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecContinueCommand(Key); })))
    FResuming = false;
}

void TGDBProcess::StepInto() {
  std::string Token;
  ProcessAsyncRequest(
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecStepCommand(Key); }));
}

void TGDBProcess::StepOver() {
  std::string Token;
  ProcessAsyncRequest(
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecNextCommand(Key); }));
}

void TGDBProcess::StepOut() {
  std::string Token;
  ProcessAsyncRequest(
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecFinishCommand(Key); }));
}

void TGDBProcess::InstStepInto() {
  std::string Token;
  ProcessAsyncRequest(BuildCommand(
      Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecStepInstructionCommand(Key); }));
}

void TGDBProcess::InstStepOver() {
  std::string Token;
  ProcessAsyncRequest(BuildCommand(
      Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecNextInstructionCommand(Key); }));
}

bool TGDBProcess::SyncTargetPause(bool& Aborted, bool FatalOnExpiry) {
  Aborted = false;
  if (FAsyncTarget || !FAlive || FFatalError)
    return false;
  if (FSuspended || FSuspending || FInternalPause) {
    if (FInternalPause)
      Aborted = true;
    return false;
  }
  FInternalPause = true;
  Pause();
  Integer Timeout = FSyncRequestTimeout;
  while (FSuspending && FAlive) {
    if (WaitForReplyTimeOut(Timeout, FatalOnExpiry)) {
      Aborted = true;
      FSuspending = false;
      break;
    }
  }
  FInternalPause = false;
  return true;
}

void TGDBProcess::InternalResume() {
  FInternalResume = true;
  Resume();
  Integer Timeout = FSyncRequestTimeout;
  while (FResuming && FAlive && !WaitForReplyTimeOut(Timeout, true)) {
  }
  FInternalResume = false;
}

void TGDBProcess::SyncTargetResume() {
  if (FAsyncTarget || !FAlive || FFatalError)
    return;
  InternalResume();
}

void TGDBProcess::ASyncTargetResume() {
  if (!FAsyncTarget || !FAlive || FFatalError)
    return;
  InternalResume();
}

void TGDBProcess::Terminate() {
  FDying = true;
  FSyncRequestTimeout = FWaitPolicy.TerminateTimeoutMs;
  bool Aborted = false;
  SyncTargetPause(Aborted, true);
  if (!FAsyncTarget && !FSuspended) {
    FKernel->Terminate(FPid);
  } else if (FKernel->SupportExecAbortCommand()) {
    if (FAttachMode)
      ASyncTargetResume();
    std::string Token;
    TExecAbortResult Aborting;
    const std::string Line =
        BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecAbortCommand(Key); });
    ProcessSyncRequest(Token, Line, Aborting);
    if (Aborting.FError || !Aborting.FAvailable || FKernel->IsAndroid64() || FAttachMode)
      FKernel->Terminate(FPid);
  } else {
    // GDB has no "-exec-abort"; its console "kill" ends a stopped program
    // (and prints no stop record for it).
    std::string Key;
    TCLKillResult Killed;
    const std::string Line =
        BuildCommand(Key, [](TGDBCommand& Builder, std::string& Echo) { return Builder.CreateCLKillCommand(Echo); });
    ProcessSyncRequest(Key, Line, Killed);
    if (Killed.FError || !Killed.FAvailable)
      FKernel->Terminate(FPid);
  }
  NotifyProcessExited(0, "");
}

void TGDBProcess::Detach() {
  FSyncRequestTimeout = FWaitPolicy.TerminateTimeoutMs;
  bool Aborted = false;
  SyncTargetPause(Aborted, true);
  if (FAttachMode)
    ASyncTargetResume();
  std::string Token;
  TTargetDetachResult Detached;
  const std::string Line =
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateTargetDetachCommand(Key); });
  ProcessSyncRequest(Token, Line, Detached);
  if (Detached.FError || !Detached.FAvailable) {
    // Still attached: requests wait as long as before.
    FSyncRequestTimeout = FWaitPolicy.RunningTimeoutMs;
    return;
  }
  NotifyProcessExited(0, "");
}

void TGDBProcess::SetOsException(const std::string& Signal, bool Stop, bool Pass) {
  // The language-exception breakpoints that LLDB and Linux targets install
  // first come with the breakpoint operations.
  const bool Linux = FKernel->IsLinux();
  const bool CannotInterruptByCommand = !FAsyncTarget || !FKernel->SupportExecInterruptCommand();
  // Pause stops the program with this signal when the interrupt command
  // cannot: a signal that no longer stopped it would make Pause hang. The
  // local agent interrupts Linux programs with SIGINT, so SIGINT is kept
  // stopping on Linux as well as SIGSTOP.
  const bool PauseSignal = Signal == "SIGINT" || (Linux && Signal == "SIGSTOP");
  if (PauseSignal && CannotInterruptByCommand) {
    Stop = true;
    Pass = false;
  }
  if (FKernel->IsWindows())
    return;
  const bool LLDB = FKernel->IsLLDB();
  std::string Key;
  ProcessAsyncRequest(BuildCommand(Key, [&](TGDBCommand& Builder, std::string& Echo) {
    return Builder.CreateCLHandleCommand(Echo, Signal, Stop, Pass, LLDB);
  }));
}

} // namespace midebug
