// Run control: starting, pausing, resuming, stepping, ending and detaching
// the debugged program, and how the debugger treats its signals. Every
// command here is sent without waiting unless noted; the stop, resume or exit
// it causes arrives later as a notification.

#include "process/gdbprocess.h"

namespace midebug {

void TGDBProcess::Run() { FRequests.Fire(&TGDBCommand::CreateExecRunCommand, false); }

void TGDBProcess::RunToFirstSource() { FRequests.Fire(&TGDBCommand::CreateExecUntilCommand, "", -1); }

void TGDBProcess::RunToEntryPoint() {
  if (!FKernel->SupportStopOnEntryPoint())
    SetRunToMainBreakpoint();
  FRequests.Fire(&TGDBCommand::CreateExecRunCommand, FKernel->IsLLDB());
}

void TGDBProcess::Pause() {
  if (FSuspended || FSuspending)
    return;
  // The stop may be read before the interrupt call returns: the flag that
  // makes it the expected interruption is set first.
  if (FAsyncTarget && FKernel->SupportExecInterruptCommand()) {
    FSuspending = true;
    if (!FRequests.Fire(&TGDBCommand::CreateExecInterruptCommand))
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
  if (!FRequests.Fire(&TGDBCommand::CreateExecContinueCommand))
    FResuming = false;
}

bool TGDBProcess::SyncTargetPause(bool& Aborted, bool FatalOnExpiry) {
  Aborted = false;
  if (FAsyncTarget || !FAlive || FRequests.FatalError())
    return false;
  if (FSuspended || FSuspending || FInternalPause) {
    if (FInternalPause)
      Aborted = true;
    return false;
  }
  FInternalPause = true;
  Pause();
  Integer Timeout = FRequests.SyncTimeout();
  while (FSuspending && FAlive) {
    if (FRequests.WaitForReplyTimeOut(Timeout, FatalOnExpiry)) {
      Aborted = true;
      FSuspending = false;
      break;
    }
  }
  FInternalPause = false;
  return true;
}

void TGDBProcess::ResumeUnheard(bool FatalOnExpiry) {
  FInternalResume = true;
  Resume();
  Integer Timeout = FRequests.SyncTimeout();
  while (FResuming && FAlive && !FRequests.WaitForReplyTimeOut(Timeout, FatalOnExpiry)) {
  }
  FInternalResume = false;
}

void TGDBProcess::ASyncTargetResume() {
  if (!FAsyncTarget || !FAlive || FRequests.FatalError())
    return;
  ResumeUnheard(true);
}

void TGDBProcess::Terminate() {
  FDying = true;
  FRequests.SetSyncTimeout(WaitPolicy().TerminateTimeoutMs);
  bool Aborted = false;
  SyncTargetPause(Aborted, true);
  if (!FAsyncTarget && !FSuspended) {
    FKernel->Terminate(FPid);
  } else if (FKernel->SupportExecAbortCommand()) {
    if (FAttachMode)
      ASyncTargetResume();
    TExecAbortResult Aborting;
    if (!FRequests.Ask(Aborting, &TGDBCommand::CreateExecAbortCommand) || FKernel->IsAndroid64() || FAttachMode)
      FKernel->Terminate(FPid);
  } else {
    // GDB has no "-exec-abort"; its console "kill" ends a stopped program
    // (and prints no stop record for it).
    TCLKillResult Killed;
    if (!FRequests.Ask(Killed, &TGDBCommand::CreateCLKillCommand))
      FKernel->Terminate(FPid);
  }
  NotifyProcessExited(0, "");
}

void TGDBProcess::Detach() {
  FRequests.SetSyncTimeout(WaitPolicy().TerminateTimeoutMs);
  bool Aborted = false;
  SyncTargetPause(Aborted, true);
  if (FAttachMode)
    ASyncTargetResume();
  TTargetDetachResult Detached;
  if (!FRequests.Ask(Detached, &TGDBCommand::CreateTargetDetachCommand)) {
    // Still attached: requests wait as long as before.
    FRequests.SetSyncTimeout(WaitPolicy().RunningTimeoutMs);
    return;
  }
  NotifyProcessExited(0, "");
}

void TGDBProcess::SetOsException(const std::string& Signal, bool Stop, bool Pass) {
  InstallExceptionBreakpoints();
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
  FRequests.Fire(&TGDBCommand::CreateCLHandleCommand, Signal, Stop, Pass, FKernel->IsLLDB());
}

} // namespace midebug
