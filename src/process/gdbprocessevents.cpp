// The events of the debugged program: the process's own state changes at
// once, on the output thread; the IDE hears of them on its main thread.
// Work that needs replies from the debugger (thread table, language, frame)
// is done only in main-thread deliveries: the output thread reads the
// replies and must never wait for one.

#include "inspect/gdbthread.h"
#include "process/gdbprocess.h"

#include "platform/hostthread.h"

#include <set>
#include <string_view>

namespace midebug {

namespace {

bool IsEmptyLocation(const TGDBLocation& Location) { return Location.Line == 0 && Location.Address == 0; }

/// Tells a Windows program's language runtime that a debugger is present.
constexpr const char* WindowsDebugHookLine = "expr *((int*)&__CPPdebugHook) = 1";
/// The same for an Android64 program.
constexpr const char* Android64DebugHookLine = "expr -l Tessel -- System.DebugHook := 1";
/// What "show language" and "-gdb-show language" put before the language
/// that "auto" chose.
constexpr std::string_view AutoLanguagePrefix = "auto; currently ";
/// GDB 13's console answer to "show language":
/// The current source language is "auto; currently c".
constexpr std::string_view LanguageAnswerPrefix = "The current source language is \"";
/// "-gdb-show language" answers GDB 13 with "auto" alone; the console
/// command names the language.
constexpr std::string_view ShowLanguageConsole = " console \"show language\"";

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
  if (Event.Event == etConsole && TakeLanguageAnswer(Event.Data))
    return;
  DeferIfLive([this, Event] {
    if (FProcessListener)
      FProcessListener->LogEvent(Event);
  });
}

bool TGDBProcess::TakeLanguageAnswer(const std::string& Text) {
  if (!Text.starts_with(LanguageAnswerPrefix))
    return false;
  std::lock_guard Guard(FLanguageAnswerLock);
  if (!FLanguageQueryPending)
    return false;
  FLanguageAnswer = Text;
  return true;
}

TGDBLanguage TGDBProcess::GetCurrentLanguage() {
  TGDBLanguage Language = FLanguage;
  std::string Token;
  if (FKernel->IsLLDB()) {
    TGdbShowResult Show;
    const std::string Line = BuildCommand(
        Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateGDBShowCommand(Key, "language"); });
    if (ProcessSyncRequest(Token, Line, Show) && !Show.FError)
      LanguageFromSetting(Show.FValue, Language);
    return Language;
  }
  std::lock_guard Query(FLanguageQueryLock);
  {
    std::lock_guard Guard(FLanguageAnswerLock);
    FLanguageQueryPending = true;
    FLanguageAnswer.clear();
  }
  // The console answer precedes the done record in the same reply, so it
  // has been taken once the request completes; the done record itself
  // carries nothing to decode.
  TGDBResult Reply(ctInterpreterExec);
  const std::string Line = BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) {
    return Builder.CreateMiCommand(ctInterpreterExec, Key) + std::string(ShowLanguageConsole);
  });
  ProcessSyncRequest(Token, Line, Reply);
  std::string Answer;
  {
    std::lock_guard Guard(FLanguageAnswerLock);
    FLanguageQueryPending = false;
    Answer.swap(FLanguageAnswer);
  }
  const size_t Open = LanguageAnswerPrefix.size();
  const size_t Close = Answer.find('"', Open);
  if (!Answer.empty() && Close != std::string::npos)
    LanguageFromSetting(std::string_view(Answer).substr(Open, Close - Open), Language);
  return Language;
}

void TGDBProcess::ResetAllThreadCallStack() {
  std::lock_guard Guard(FThreadLock);
  for (const auto& [Id, Thread] : FThreadList)
    static_cast<TGDBThread*>(Thread.get())->ResetCallStack();
}

void TGDBProcess::NotifyProcessResumed() {
  if (FInternalResume) {
    FSuspended = false;
    FResuming = false;
    YieldAndSleep(FWaitPolicy.PollMs);
    return;
  }
  Integer ThreadId = -1;
  {
    std::lock_guard Guard(FThreadLock);
    if (FSuspendedThread)
      ThreadId = FSuspendedThread->FId;
    FSuspendedThread = nullptr;
    FInlineLocation = DummyLocation;
  }
  FSuspended = false;
  FResuming = false;
  FUpdateThreadState = true;
  FLastSuspendedThreadId = ThreadId;
  // The disassembly, memory and line caches come with their operations.
  if (FKernel->SupportThreadNotification())
    ResetAllThreadCallStack();
  if (ThreadId != -1)
    DeferIfLive([this, ThreadId] {
      if (FProcessListener)
        FProcessListener->ProcessResumed(ThreadId);
    });
}

void TGDBProcess::NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) {
  FSuspended = true;
  FSuspending = false;
  const UInt64 Address = Location.Address;
  UInt64 Base = FBaseAddress;
  while (Address != 0 && Address < Base && !FBaseAddress.compare_exchange_weak(Base, Address)) {
  }
  DeferIfLive([this, Location, ThreadId, Reason] {
    if (FExiting)
      return;
    if (!FKernel->SupportLanguageChangedNotification())
      FLanguage = GetCurrentLanguage();
    Integer StopThread = ThreadId;
    if (StopThread == -1) {
      StopThread = FLastSuspendedThreadId;
      std::lock_guard Guard(FThreadLock);
      FInlineLocation = Location;
    }
    if (!FFatalError)
      DoNotifyProcessSuspended(Location, StopThread, Reason);
  });
}

void TGDBProcess::DoNotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) {
  if (!FStoppedAtEntryPoint.exchange(true)) {
    if (!FKernel->IsLLDB()) {
      UpdateThreadList();
      // GDB's thread-id list carries neither names nor states.
      UpdateAllThreadState(false);
    }
    if (FKernel->IsWindows())
      ProcessAsyncRequest(WindowsDebugHookLine);
    if (FKernel->IsAndroid64())
      ProcessAsyncRequest(Android64DebugHookLine);
  } else if (FKernel->SupportThreadNotification()) {
    UpdateAllThreadState(false);
  } else {
    UpdateThreadList();
  }
  const TGDBLocation Stopped = IsEmptyLocation(Location) ? GetCurrentLocation() : Location;
  {
    std::lock_guard Guard(FThreadLock);
    const TIntfPtr<IGDBThread> Thread = GetThread(ThreadId);
    if (Thread.get() == FZombieThread.get()) {
      FSuspendedThread = nullptr;
    } else {
      FSuspendedThread = static_cast<TGDBThread*>(Thread.get());
      FSuspendedThread->FReason = Reason;
      FSuspendedThread->FLocation = Stopped;
    }
  }
  if (FProcessListener)
    FProcessListener->ProcessSuspended(ThreadId);
}

void TGDBProcess::SetCurrentSuspendedThread(Integer ThreadId, const TGDBLocation& Location) {
  if (!FKernel->SupportLanguageChangedNotification())
    FLanguage = GetCurrentLanguage();
  std::lock_guard Guard(FThreadLock);
  const auto Found = FThreadList.find(ThreadId);
  FSuspendedThread = Found != FThreadList.end() ? static_cast<TGDBThread*>(Found->second.get()) : nullptr;
  if (FSuspendedThread)
    FSuspendedThread->FLocation = Location;
}

void TGDBProcess::EnsureThreadCreated(Integer ThreadId) {
  if (FKernel->SupportThreadNotification() || ThreadId == -1)
    return;
  {
    std::lock_guard Guard(FThreadLock);
    if (FThreadList.contains(ThreadId))
      return;
    FThreadList[ThreadId] = new TGDBThread(ThreadId, ThreadId, "", "", this);
  }
  if (FProcessListener)
    FProcessListener->ThreadCreated(ThreadId);
}

void TGDBProcess::UpdateThreadList() {
  std::string Token;
  TThreadListIdsResult Ids;
  const std::string Line =
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateThreadListIdsCommand(Key); });
  if (!ProcessSyncRequest(Token, Line, Ids) || Ids.FError || !Ids.FAvailable || !FAlive) {
    FUpdateThreadState = false;
    return;
  }
  std::lock_guard Guard(FThreadLock);
  std::set<Integer> Seen;
  for (size_t Index = 0; Index < Ids.FIds.size(); ++Index) {
    const Integer Id = Ids.FIds[Index];
    if (Id == -1)
      continue;
    const std::string State = Index < Ids.FStates.size() ? Ids.FStates[Index] : std::string();
    Seen.insert(Id);
    const auto Found = FThreadList.find(Id);
    if (Found != FThreadList.end()) {
      auto* Thread = static_cast<TGDBThread*>(Found->second.get());
      // GDB's list names no states: a thread keeps the one it has.
      if (!State.empty())
        Thread->FState = TGDBThread::StrToState(State);
      Thread->ResetCallStack();
      continue;
    }
    const std::string Name = Index < Ids.FNames.size() ? Ids.FNames[Index] : std::string();
    FThreadList[Id] = new TGDBThread(Id, Id, Name, State, this);
    if (FProcessListener)
      FProcessListener->ThreadCreated(Id);
  }
  for (auto Entry = FThreadList.begin(); Entry != FThreadList.end();) {
    if (Seen.contains(Entry->first)) {
      ++Entry;
      continue;
    }
    if (FSuspendedThread == Entry->second.get())
      FSuspendedThread = nullptr;
    const Integer Id = Entry->first;
    Entry = FThreadList.erase(Entry);
    if (FProcessListener)
      FProcessListener->ThreadExited(Id);
  }
  FUpdateThreadState = false;
}

void TGDBProcess::UpdateAllThreadState(bool StateOnly) {
  if (!FKernel->SupportThreadInfoCommand() || !(FAsyncTarget || FSuspended))
    return;
  std::string Token;
  TThreadInfoResult Info(StateOnly);
  const std::string Line = BuildCommand(
      Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateThreadInfoCommand(Key, -1); });
  if (ProcessSyncRequest(Token, Line, Info) && !Info.FError && Info.FAvailable && FAlive) {
    const bool RunningMeansStopped = (FKernel->IsWindows() || FKernel->IsAndroid64()) && FSuspended;
    std::lock_guard Guard(FThreadLock);
    for (size_t Index = 0; Index < Info.FIds.size(); ++Index) {
      const auto Found = FThreadList.find(Info.FIds[Index]);
      if (Found == FThreadList.end())
        continue;
      auto* Thread = static_cast<TGDBThread*>(Found->second.get());
      if (Index < Info.FStates.size())
        Thread->FState = TGDBThread::StrToState(Info.FStates[Index]);
      if (Index < Info.FLocations.size())
        Thread->FLocation = Info.FLocations[Index];
      if (RunningMeansStopped && Thread->FState == tsRunnable)
        Thread->FState = tsStop;
      if (!StateOnly && Index < Info.FNames.size())
        Thread->FName = Info.FNames[Index];
    }
  }
  FUpdateThreadState = false;
}

void TGDBProcess::NotifySignalReceived(const TGDBException& SignalException, Integer ThreadId) {
  FSuspended = true;
  const bool Expected = SignalException.Name == "SIGINT" || SignalException.Name == "SIGSTOP" ||
                        SignalException.Name == "SIGTRAP";
  if ((FSuspending || !FStoppedAtEntryPoint) && Expected) {
    FSuspending = false;
    if (FInternalPause)
      YieldAndSleep(FWaitPolicy.PollMs);
    else if (!FDying)
      NotifyProcessSuspended(SignalException.Location, ThreadId, tsrStepDone);
    return;
  }
  FSuspending = false;
  DeferIfLive([this, SignalException, ThreadId] {
    EnsureThreadCreated(ThreadId);
    SetCurrentSuspendedThread(ThreadId, SignalException.Location);
    bool ShouldStop = false;
    if (ThreadId != -1 && FProcessListener)
      FProcessListener->SignalReceived(ShouldStop, ThreadId, SignalException);
    if (ShouldStop)
      NotifyProcessSuspended(SignalException.Location, ThreadId, tsrSignal);
    else
      Resume();
  });
}

void TGDBProcess::NotifyExceptionRaised(const TGDBException& LanguageException, Integer ThreadId) {
  FSuspended = true;
  if ((FSuspending || !FStoppedAtEntryPoint) && LanguageException.Name == "0x80000003") {
    FSuspending = false;
    if (FInternalPause)
      YieldAndSleep(FWaitPolicy.PollMs);
    else if (!FDying)
      NotifyProcessSuspended(LanguageException.Location, ThreadId, tsrStepDone);
    return;
  }
  FSuspending = false;
  DeferIfLive([this, LanguageException, ThreadId] {
    EnsureThreadCreated(ThreadId);
    SetCurrentSuspendedThread(ThreadId, LanguageException.Location);
    bool ShouldStop = false;
    if (FProcessListener)
      FProcessListener->ExceptionRaised(ShouldStop, ThreadId, LanguageException);
    if (ShouldStop)
      NotifyProcessSuspended(LanguageException.Location, ThreadId, tsrExceptRaised);
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

void TGDBProcess::NotifyThreadCreated(Integer ThreadId, Integer OsId) {
  if (!FAlive || (!FKernel->IsLLDB() && !FStoppedAtEntryPoint))
    return;
  {
    // A thread the table already holds (a refresh found it first) is not
    // new; replacing it would leave FSuspendedThread pointing at freed memory.
    std::lock_guard Guard(FThreadLock);
    if (FThreadList.contains(ThreadId))
      return;
    FThreadList[ThreadId] = new TGDBThread(ThreadId, OsId, "", "", this);
  }
  bool FirstOfBurst = false;
  {
    std::lock_guard Guard(FPendingLock);
    FThreadCreatedPending.push(ThreadId);
    FirstOfBurst = FThreadCreatedPending.size() == 1;
  }
  if (FirstOfBurst)
    DeferIfLive([this] {
      if (FDying || FFatalError)
        return;
      for (;;) {
        Integer Id;
        {
          std::lock_guard Guard(FPendingLock);
          if (FThreadCreatedPending.empty())
            return;
          Id = FThreadCreatedPending.top();
          FThreadCreatedPending.pop();
        }
        if (FProcessListener)
          FProcessListener->ThreadCreated(Id);
      }
    });
}

void TGDBProcess::NotifyThreadExited(Integer ThreadId) {
  if (!FKernel->IsLLDB() && !FStoppedAtEntryPoint)
    return;
  bool Known = false;
  {
    std::lock_guard Guard(FThreadLock);
    // The table holds the last reference the process has: the suspended
    // thread is let go before the entry.
    if (FSuspendedThread && FSuspendedThread->FId == ThreadId)
      FSuspendedThread = nullptr;
    Known = FThreadList.erase(ThreadId) > 0;
  }
  // One delivery empties the stack. Exits of threads the table did not know
  // wait on it for the next delivery; they must not keep later exits from
  // being delivered.
  bool Schedule = false;
  {
    std::lock_guard Guard(FPendingLock);
    FThreadExitedPending.push(ThreadId);
    Schedule = Known && !FThreadExitedDeliveryQueued;
    if (Schedule)
      FThreadExitedDeliveryQueued = true;
  }
  if (Schedule)
    DeferIfLive([this] {
      for (;;) {
        Integer Id;
        {
          std::lock_guard Guard(FPendingLock);
          if (FThreadExitedPending.empty()) {
            FThreadExitedDeliveryQueued = false;
            return;
          }
          Id = FThreadExitedPending.top();
          FThreadExitedPending.pop();
        }
        if (FProcessListener)
          FProcessListener->ThreadExited(Id);
      }
    });
}

void TGDBProcess::NotifyThreadSelected(Integer ThreadId) {
  FLastSuspendedThreadId = ThreadId;
  if (FAttachNotifySuspended.exchange(false))
    NotifyProcessSuspended(DummyLocation, ThreadId, tsrStepDone);
}

void TGDBProcess::NotifyModuleLoaded(const TGDBModule& Module) {
  if (Module.EntryPoint != 0) {
    UInt64 Base = FBaseAddress;
    while ((Base == 0 || (Module.BaseAddress != 0 && Module.BaseAddress < Base)) &&
           !FBaseAddress.compare_exchange_weak(Base, Module.BaseAddress)) {
    }
  }
  bool FirstOfBurst = false;
  {
    std::lock_guard Guard(FPendingLock);
    FModuleLoadedPending.push(Module);
    FirstOfBurst = FModuleLoadedPending.size() == 1;
  }
  if (FirstOfBurst)
    DeferIfLive([this] {
      for (;;) {
        TGDBModule Loaded;
        {
          std::lock_guard Guard(FPendingLock);
          if (FModuleLoadedPending.empty())
            return;
          Loaded = FModuleLoadedPending.top();
          FModuleLoadedPending.pop();
        }
        {
          std::lock_guard Guard(FModuleLock);
          FCurrentLoadedModule = Loaded;
        }
        if (FProcessListener)
          FProcessListener->ModuleLoaded(Loaded);
      }
    });
}

void TGDBProcess::NotifyModuleUnLoaded(const TGDBModule& Module) {
  bool FirstOfBurst = false;
  {
    std::lock_guard Guard(FPendingLock);
    FModuleUnLoadedPending.push(Module);
    FirstOfBurst = FModuleUnLoadedPending.size() == 1;
  }
  if (FirstOfBurst)
    DeferIfLive([this] {
      for (;;) {
        TGDBModule Unloaded;
        {
          std::lock_guard Guard(FPendingLock);
          if (FModuleUnLoadedPending.empty())
            return;
          Unloaded = FModuleUnLoadedPending.top();
          FModuleUnLoadedPending.pop();
        }
        if (FProcessListener)
          FProcessListener->ModuleUnLoaded(Unloaded);
      }
    });
}

bool TGDBProcess::NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) {
  FSuspended = true;
  FSuspending = false;
  TIntfPtr<IGDBBreakpointListener> Listener;
  {
    std::lock_guard Guard(FBreakpointLock);
    const auto Found = FBreakpointList.find(Breakpoint);
    if (Found == FBreakpointList.end())
      return false;
    Listener = Found->second;
  }
  DeferIfLive([this, Listener, Location, ThreadId] {
    EnsureThreadCreated(ThreadId);
    SetCurrentSuspendedThread(ThreadId, Location);
    bool ShouldStop = false;
    TGDBLocation Reported = Location;
    Listener->BreakpointHits(ShouldStop, ThreadId, Reported);
    if (ShouldStop)
      NotifyProcessSuspended(Reported, ThreadId, tsrAtBreakpoint);
    else
      Resume();
  });
  return true;
}

void TGDBProcess::NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) {
  TIntfPtr<IGDBBreakpointListener> Listener;
  {
    std::lock_guard Guard(FBreakpointLock);
    const auto Found = FBreakpointList.find(Breakpoint);
    if (Found == FBreakpointList.end())
      return;
    Listener = Found->second;
  }
  DeferIfLive([Listener, Breakpoint, Location] {
    Listener->BreakpointVerified(Location.Address != ~UInt64{0}, Breakpoint, Location);
  });
}

void TGDBProcess::NotifyWatchpointOutOfScope() {
  FSuspended = true;
  FSuspending = false;
  DeferIfLive([this] {
    FInternalResume = true;
    Resume();
    Integer Timeout = FSyncRequestTimeout;
    while (FSuspended && FAlive && !WaitForReplyTimeOut(Timeout, true)) {
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
