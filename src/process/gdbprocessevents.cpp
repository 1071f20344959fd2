// The events of the debugged program: the process's own state changes at
// once, on the output thread; the IDE hears of them on its main thread.
// Work that needs replies from the debugger (thread table, language, frame)
// is done only in main-thread deliveries: the output thread reads the
// replies and must never wait for one.

#include "process/gdbprocess.h"

#include "platform/hostthread.h"

#include <string_view>

namespace midebug {

namespace {

/// What "show language" and "-gdb-show language" put before the language
/// that "auto" chose.
constexpr std::string_view AutoLanguagePrefix = "auto; currently ";

/// The language a setting's value names ("c", or "auto; currently c").
bool LanguageFromSetting(std::string_view Value, TGDBLanguage& Language) {
  if (Value.starts_with(AutoLanguagePrefix))
    Value.remove_prefix(AutoLanguagePrefix.size());
  for (size_t Index = 0; Index < GDBLanguageNames.size(); ++Index)
    if (Value == GDBLanguageNames[Index]) {
      Language = static_cast<TGDBLanguage>(Index);
      return true;
    }
  return false;
}

} // namespace

void TGDBProcess::NotifyLogEvent(const TGDBLogEvent& Event) {
  // The answer to the process's own language question is not the user's.
  if (Event.Event == etConsole && FLanguageQuery.TakeAnswer(Event.Data))
    return;
  DeferIfLive([this, Event] {
    if (FProcessListener)
      FProcessListener->LogEvent(Event);
  });
}

/// Lowers the base address to Address unless it is lower already; Replace
/// also takes Address while the base address is 0.
static void LowerBaseAddress(std::atomic<UInt64>& BaseAddress, UInt64 Address, bool Replace) {
  UInt64 Base = BaseAddress;
  while (Address != 0 && ((Replace && Base == 0) || Address < Base) &&
         !BaseAddress.compare_exchange_weak(Base, Address)) {
  }
}

TGDBLanguage TGDBProcess::GetCurrentLanguage() {
  TGDBLanguage Language = FLanguage;
  if (FKernel->IsLLDB()) {
    TGdbShowResult Show;
    if (FRequests.Ask(Show, &TGDBCommand::CreateGDBShowCommand, "language"))
      LanguageFromSetting(Show.FValue, Language);
    return Language;
  }
  // "-gdb-show language" answers GDB 13 with "auto" alone; the console
  // command names the language. Its answer precedes the done record in the
  // same reply, so it has been taken once the request completes.
  const std::string Answer = FLanguageQuery.Query(FRequests);
  if (!Answer.empty())
    LanguageFromSetting(Answer, Language);
  return Language;
}

void TGDBProcess::NotifyProcessResumed() {
  if (FInternalResume) {
    FSuspended = false;
    FResuming = false;
    YieldAndSleep(WaitPolicy().PollMs);
    return;
  }
  const Integer ThreadId = ForgetStop();
  FSuspended = false;
  FResuming = false;
  FUpdateThreadState = true;
  FLastSuspendedThreadId = ThreadId;
  if (ThreadId != -1)
    DeferIfLive([this, ThreadId] {
      if (FProcessListener)
        FProcessListener->ProcessResumed(ThreadId);
    });
}

void TGDBProcess::NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) {
  // What the program wrote before it stopped reaches the IDE before the stop.
  FTerminal.Drain(false);
  FSuspended = true;
  FSuspending = false;
  LowerBaseAddress(FBaseAddress, Location.Address, false);
  DeferIfLive([this, Location, ThreadId, Reason] {
    if (FExiting)
      return;
    if (!FKernel->SupportLanguageChangedNotification())
      FLanguage = GetCurrentLanguage();
    if (!FRequests.FatalError())
      DoNotifyProcessSuspended(Location, ThreadId, Reason);
  });
}

void TGDBProcess::NotifySignalReceived(const TGDBException& SignalException, Integer ThreadId) {
  // SIGINT, SIGSTOP and SIGTRAP are how a pause the process asked for
  // arrives; a program that raises them itself gets them reported as
  // signals. Before the program's first stop only the debugger's own SIGSTOP
  // (attaching) is expected.
  // A function called by an expression faulted: GDB has put the program
  // back where it stopped and fails the evaluation, which says why.
  if (FEvaluating && !FKernel->IsLLDB())
    return;
  const std::string& Name = SignalException.Name;
  const bool Expected =
      (FSuspending && (Name == "SIGINT" || Name == "SIGSTOP" || Name == "SIGTRAP")) ||
      (!FStoppedAtEntryPoint && Name == "SIGSTOP");
  NotifyInterruption(SignalException, ThreadId, Expected, tsrSignal);
}

void TGDBProcess::NotifyExceptionRaised(const TGDBException& LanguageException, Integer ThreadId) {
  // The breakpoint exception is how a pause arrives on Windows.
  const bool Expected = (FSuspending || !FStoppedAtEntryPoint) && LanguageException.Name == "0x80000003";
  NotifyInterruption(LanguageException, ThreadId, Expected, tsrExceptRaised);
}

void TGDBProcess::NotifyInterruption(const TGDBException& Event, Integer ThreadId, bool Expected,
                                     TThreadStopReason Reason) {
  FTerminal.Drain(false);
  FSuspended = true;
  // A pause the process asked for, or the debugger's own stop before the
  // program reached its entry point, is a stop like a finished step.
  if (Expected) {
    FSuspending = false;
    if (FInternalPause)
      YieldAndSleep(WaitPolicy().PollMs);
    else if (!FDying)
      NotifyProcessSuspended(Event.Location, ThreadId, tsrStepDone);
    return;
  }
  FSuspending = false;
  DeferIfLive([this, Event, ThreadId, Reason] {
    EnsureThreadCreated(ThreadId);
    SetCurrentSuspendedThread(ThreadId, Event.Location);
    bool ShouldStop = false;
    if (Reason == tsrSignal && ThreadId != -1 && FProcessListener)
      FProcessListener->SignalReceived(ShouldStop, ThreadId, Event);
    else if (Reason == tsrExceptRaised && FProcessListener)
      FProcessListener->ExceptionRaised(ShouldStop, ThreadId, Event);
    if (ShouldStop)
      NotifyProcessSuspended(Event.Location, ThreadId, Reason);
    else
      Resume();
  });
}

void TGDBProcess::NotifyProcessFaulted(const std::string& Message) {
  if (FAsyncTarget || !FAlive || FSuspended)
    return;
  DeferIfLive([this, Message] {
    if (Message.find("System13_DbgExcNotify") != std::string::npos) {
      FSuspended = true;
      FSuspending = false;
      Resume();
    } else {
      NotifyProcessExited(-1, "");
    }
  });
}

void TGDBProcess::NotifyCommandRefused(const std::string& Message) {
  // GDB reports a resume running first and aborts it when it cannot insert
  // a breakpoint or watchpoint: the program never left its stop.
  constexpr std::string_view ResumeAborted = "Command aborted.";
  if (!FSuspended && Message == ResumeAborted && FLastSuspendedThreadId != -1)
    FSuspended = true;
  if (!FSuspended) {
    NotifyProcessFaulted(Message);
    return;
  }
  // The program did not move. The IDE, which is waiting for the stop that
  // ends the command, hears the stop again where it was, with its reason.
  FResuming = false;
  NotifyProcessSuspended(DummyLocation, GetSuspendedThreadId(), tsrNotStopped);
}

void TGDBProcess::NotifyThreadSelected(Integer ThreadId) {
  FLastSuspendedThreadId = ThreadId;
  if (FAttachNotifySuspended.exchange(false))
    NotifyProcessSuspended(DummyLocation, ThreadId, tsrStepDone);
}

void TGDBProcess::NotifyModuleLoaded(const TGDBModule& Module) {
  ForgetLineAddresses();
  if (Module.EntryPoint != 0)
    LowerBaseAddress(FBaseAddress, Module.BaseAddress, true);
  FModuleLoadedPending.Raise(Module, FDeferIfLive,
                             [this](const TGDBModule& Loaded) {
                               FModules.SetCurrent(Loaded);
                               if (FProcessListener)
                                 FProcessListener->ModuleLoaded(Loaded);
                             });
}

void TGDBProcess::NotifyModuleUnLoaded(const TGDBModule& Module) {
  ForgetLineAddresses();
  FModuleUnLoadedPending.Raise(Module, FDeferIfLive,
                               [this](const TGDBModule& Unloaded) {
                                 if (FProcessListener)
                                   FProcessListener->ModuleUnLoaded(Unloaded);
                               });
}

void TGDBProcess::NotifyWatchpointOutOfScope() {
  FSuspended = true;
  FSuspending = false;
  DeferIfLive([this] {
    FInternalResume = true;
    Resume();
    Integer Timeout = FRequests.SyncTimeout();
    while (FSuspended && FAlive && !FRequests.WaitForReplyTimeOut(Timeout, true)) {
    }
    FInternalResume = false;
  });
}

void TGDBProcess::NotifyProcessRestart() {
  if (FRestarting.exchange(true))
    return;
  TIntfPtr<IGDBProcessListener> Listener;
  {
    std::lock_guard Guard(LiveProcessesLock());
    Listener = FProcessListener;
  }
  if (Listener)
    Listener->ProcessRestart();
}

} // namespace midebug
