// The events of the debugged program: the process's own state changes at
// once, on the output thread; the IDE hears of them on its main thread.

#include "inspect/gdbthread.h"
#include "process/gdbprocess.h"

#include "platform/hostthread.h"

namespace midebug {

namespace {

bool IsEmptyLocation(const TGDBLocation& Location) { return Location.Line == 0 && Location.Address == 0; }

} // namespace

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
    if (FKernel->SupportThreadNotification())
      for (const auto& [Id, Thread] : FThreadList)
        static_cast<TGDBThread*>(Thread.get())->ResetCallStack();
  }
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
  FSuspended = true;
  FSuspending = false;
  const UInt64 Address = Location.Address;
  UInt64 Base = FBaseAddress;
  while (Address != 0 && Address < Base && !FBaseAddress.compare_exchange_weak(Base, Address)) {
  }
  DeferIfLive([this, Location, ThreadId, Reason] {
    if (FExiting)
      return;
    Integer StopThread = ThreadId;
    if (StopThread == -1) {
      StopThread = FLastSuspendedThreadId;
      std::lock_guard Guard(FThreadLock);
      FInlineLocation = Location;
    }
    if (FFatalError)
      return;
    FStoppedAtEntryPoint = true;
    SetCurrentSuspendedThread(StopThread, IsEmptyLocation(Location) ? GetCurrentLocation() : Location);
    {
      std::lock_guard Guard(FThreadLock);
      if (FSuspendedThread)
        FSuspendedThread->FReason = Reason;
    }
    if (FProcessListener)
      FProcessListener->ProcessSuspended(StopThread);
  });
}

void TGDBProcess::SetCurrentSuspendedThread(Integer ThreadId, const TGDBLocation& Location) {
  std::lock_guard Guard(FThreadLock);
  const auto Found = FThreadList.find(ThreadId);
  FSuspendedThread = Found != FThreadList.end() ? static_cast<TGDBThread*>(Found->second.get()) : nullptr;
  if (FSuspendedThread)
    FSuspendedThread->FLocation = Location;
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
    std::lock_guard Guard(FThreadLock);
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
    Known = FThreadList.erase(ThreadId) > 0;
    if (FSuspendedThread && FSuspendedThread->FId == ThreadId)
      FSuspendedThread = nullptr;
  }
  bool FirstOfBurst = false;
  {
    std::lock_guard Guard(FPendingLock);
    FThreadExitedPending.push(ThreadId);
    FirstOfBurst = FThreadExitedPending.size() == 1;
  }
  if (FirstOfBurst && Known)
    DeferIfLive([this] {
      for (;;) {
        Integer Id;
        {
          std::lock_guard Guard(FPendingLock);
          if (FThreadExitedPending.empty())
            return;
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
