// The breakpoint operations of a process, the events of its breakpoints and
// its own run-to-main breakpoint.

#include "inspect/gdbbreakpointtable.h"
#include "inspect/gdbexceptionbreakpoints.h"
#include "inspect/gdbthreadtable.h"
#include "process/gdbprocess.h"

#include <array>
#include <memory>

namespace midebug {

namespace {

/// The entry functions a program's main code may start at, tried in order.
constexpr std::array<const char*, 5> MainEntryNames = {"main", "WinMain", "wWinMain", "VZMmain", "_NativeMain"};

/// LLDB's address of a breakpoint it could not place.
constexpr UInt64 UnresolvedAddress = ~UInt64{0};

/// The listener of the run-to-main breakpoint: every hit is a stop the IDE
/// sees as a breakpoint stop where the program halted.
class TBreakOnMain : public TInterfaced<IGDBBreakpointListener> {
public:
  void BreakpointHits(bool& ShouldStop, Integer /*ThreadId*/, TGDBLocation& /*Location*/) override {
    ShouldStop = true;
  }
  void BreakpointVerified(bool /*Verified*/, Integer /*Breakpoint*/, const TGDBLocation& /*Location*/) override {}
};

TAddressArray AddressesOf(const TGDBLocationArray& Locations) {
  TAddressArray Addresses;
  for (const TGDBLocation& Location : Locations)
    Addresses.push_back(Location.Address);
  return Addresses;
}

/// Tells Listener where GDB placed breakpoint Breakpoint: once per location,
/// or once unverified while it is pending.
void TellLocations(IGDBBreakpointListener& Listener, Integer Breakpoint, const TGDBLocationArray& Locations) {
  if (Locations.empty())
    Listener.BreakpointVerified(false, Breakpoint, DummyLocation);
  for (const TGDBLocation& Location : Locations)
    Listener.BreakpointVerified(true, Breakpoint, Location);
}

} // namespace

bool TGDBProcess::SetRunToMainBreakpoint() {
  const bool ByAddress = FLanguage == glPascal && FKernel->FEntryPoint != 0;
  const UInt64 EntryPoint = FKernel->FEntryPoint;
  std::unique_ptr<TBreakInsertResult> Inserted;
  for (const char* Name : MainEntryNames) {
    Inserted = std::make_unique<TBreakInsertResult>();
    FRequests.Ask(*Inserted, [&](TGDBCommand& Builder, std::string& Token) {
      return ByAddress ? Builder.CreateBreakInsertCommand(Token, EntryPoint, true)
                       : Builder.CreateBreakInsertCommand(Token, Name, false, true);
    });
    if (ByAddress || !Inserted->FError || Inserted->FTimeOut)
      break;
  }
  if (Inserted->FError || Inserted->FBreakpoint == -1)
    return false;
  TIntfPtr<IGDBBreakpointListener> Listener(new TBreakOnMain);
  FBreakpoints->Add(Inserted->FBreakpoint, Listener, ByAddress ? bkTemporary : bkUser,
                    {Inserted->FLocation.Address});
  FBreakOnMain = Listener;
  return true;
}

void TGDBProcess::WhilePaused(const std::function<void()>& Work) {
  bool Aborted = false;
  const bool Paused = SyncTargetPause(Aborted, false);
  if (Aborted)
    return;
  Work();
  if (Paused && FAlive && !FRequests.FatalError())
    ResumeUnheard(true);
}

void TGDBProcess::InsertBreakpoint(const std::function<std::string(TGDBCommand&, std::string&)>& Create,
                                   const TIntfPtr<IGDBBreakpointListener>& Listener, bool Watch) {
  if (!Listener)
    return;
  WhilePaused([&] {
    if (Watch) {
      TBreakWatchResult Watched;
      const bool Placed = FRequests.Ask(Watched, Create);
      if (Placed)
        FBreakpoints->Add(Watched.FBreakpoint, Listener, bkUser, {Watched.FLocation.Address});
      Listener->BreakpointVerified(Placed, Watched.FBreakpoint, Watched.FLocation);
      return;
    }
    TBreakInsertResult Inserted;
    const bool Answered = FRequests.Ask(Inserted, Create);
    if (Answered && Inserted.FBreakpoint == -1 && !Inserted.FAddresses.empty()) {
      // LLDB lists the matching addresses instead: each becomes its own.
      for (const UInt64 Address : Inserted.FAddresses)
        InsertBreakpoint(
            [Address](TGDBCommand& Builder, std::string& Token) {
              return Builder.CreateBreakInsertCommand(Token, Address, false);
            },
            Listener);
      return;
    }
    if (!Answered) {
      Listener->BreakpointVerified(false, Inserted.FBreakpoint, DummyLocation);
      return;
    }
    if (FKernel->IsLLDB()) {
      FBreakpoints->Add(Inserted.FBreakpoint, Listener, bkUser, {Inserted.FLocation.Address});
      Listener->BreakpointVerified(Inserted.FLocation.Address != UnresolvedAddress, Inserted.FBreakpoint,
                                   Inserted.FLocation);
      return;
    }
    // GDB keeps one number for all the places a breakpoint resolved to, and
    // a pending one until its library loads.
    TGDBLocationArray Locations = Inserted.FLocations;
    if (Locations.empty() && !Inserted.FPending)
      Locations.push_back(Inserted.FLocation);
    FBreakpoints->Add(Inserted.FBreakpoint, Listener, bkUser, AddressesOf(Locations));
    TellLocations(*Listener, Inserted.FBreakpoint, Locations);
  });
}

void TGDBProcess::CreateSourceBreakpoint(const std::string& FileName, Integer Line,
                                         const TIntfPtr<IGDBBreakpointListener>& Listener) {
  InsertBreakpoint(
      [&](TGDBCommand& Builder, std::string& Token) {
        return Builder.CreateBreakInsertCommand(Token, FileName, Line, false);
      },
      Listener);
}

void TGDBProcess::CreateFunctionBreakpoint(const std::string& Name, const TIntfPtr<IGDBBreakpointListener>& Listener) {
  // An unquoted location ends at the first blank; a name with one, or with
  // a quote, would insert something else.
  if (Name.empty() || Name.find_first_of(" \t\r\n\"\\") != std::string::npos) {
    if (Listener)
      Listener->BreakpointVerified(false, -1, DummyLocation);
    return;
  }
  InsertBreakpoint(
      [&](TGDBCommand& Builder, std::string& Token) { return Builder.CreateBreakInsertCommand(Token, Name, false, true); },
      Listener);
}

void TGDBProcess::CreateAddressBreakpoint(UInt64 Address, const TIntfPtr<IGDBBreakpointListener>& Listener) {
  InsertBreakpoint(
      [&](TGDBCommand& Builder, std::string& Token) { return Builder.CreateBreakInsertCommand(Token, Address, false); },
      Listener);
}

void TGDBProcess::CreateWatchBreakpoint(UInt64 Address, bool ReadFlag, bool AccessFlag,
                                        const TIntfPtr<IGDBBreakpointListener>& Listener) {
  const bool PascalSyntax = FLanguage == glPascal;
  InsertBreakpoint(
      [&](TGDBCommand& Builder, std::string& Token) {
        return Builder.CreateBreakWatchCommand(Token, Address, ReadFlag, AccessFlag, PascalSyntax);
      },
      Listener, true);
}

void TGDBProcess::CreateSizedWatchBreakpoint(UInt64 Address, Integer Size, bool ReadFlag, bool AccessFlag,
                                             const TIntfPtr<IGDBBreakpointListener>& Listener) {
  if (FKernel->IsLLDB()) {
    CreateWatchBreakpoint(Address, ReadFlag, AccessFlag, Listener);
    return;
  }
  // GDB splits a longer range over several debug registers; beyond a page
  // it is no watch anyone means.
  constexpr Integer MaxWatchSize = 4096;
  if (Size < 1 || Size > MaxWatchSize) {
    if (Listener)
      Listener->BreakpointVerified(false, -1, DummyLocation);
    return;
  }
  InsertBreakpoint(
      [&](TGDBCommand& Builder, std::string& Token) {
        return Builder.CreateBreakWatchCommand(Token, Address, Size, ReadFlag, AccessFlag);
      },
      Listener, true);
}

void TGDBProcess::DeleteBreakpoint(Integer Breakpoint) {
  if (Breakpoint == -1)
    return;
  WhilePaused([&] {
    FRequests.Fire(&TGDBCommand::CreateBreakDeleteCommand, std::vector<Integer>{Breakpoint});
    FBreakpoints->Remove(Breakpoint);
  });
}

void TGDBProcess::EnableBreakpoint(Integer Breakpoint) {
  if (Breakpoint == -1)
    return;
  WhilePaused([&] {
    FRequests.Fire(&TGDBCommand::CreateBreakEnableCommand, std::vector<Integer>{Breakpoint});
    FBreakpoints->SetEnabled(Breakpoint, true);
  });
}

void TGDBProcess::DisableBreakpoint(Integer Breakpoint) {
  if (Breakpoint == -1)
    return;
  WhilePaused([&] {
    FRequests.Fire(&TGDBCommand::CreateBreakDisableCommand, std::vector<Integer>{Breakpoint});
    FBreakpoints->SetEnabled(Breakpoint, false);
  });
}

bool TGDBProcess::NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) {
  FSuspended = true;
  FSuspending = false;
  std::vector<TBreakpointHit> Hits = FBreakpoints->Hit(Breakpoint, Location.Address);
  if (Hits.empty())
    return false;
  FTerminal.Drain(false);
  DeferIfLive([this, Hits = std::move(Hits), Location, ThreadId] {
    EnsureThreadCreated(ThreadId);
    // The language is asked when the stop is reported: a hit the listeners
    // decline (an ignore count, an exception nobody stops at) costs no
    // question.
    FThreads->SetStopped(ThreadId, Location);
    bool Stop = false;
    TGDBLocation Reported = Location;
    TThreadStopReason Reason = tsrAtBreakpoint;
    // Every listener placed there hears the hit; the first that keeps the
    // program stopped says where and why.
    for (const TBreakpointHit& Hit : Hits) {
      bool ShouldStop = false;
      TGDBLocation Where = Location;
      auto* Raising = Hit.Kind == bkException ? dynamic_cast<TExceptionBreakpoint*>(Hit.Listener.get()) : nullptr;
      if (Raising) {
        TGDBException Exception;
        Exception.Location.Source = Location.Source;
        if (Raising->GetExceptionInfo(Exception) && FProcessListener) {
          FProcessListener->ExceptionRaised(ShouldStop, ThreadId, Exception);
          Where = Exception.Location;
        }
      } else {
        Hit.Listener->BreakpointHits(ShouldStop, ThreadId, Where);
      }
      if (ShouldStop && !Stop) {
        Stop = true;
        Reported = Where;
        if (Raising && (FKernel->IsLLDB() || FKernel->IsLinux()))
          Reason = tsrExceptRaised;
      }
    }
    if (Stop)
      NotifyProcessSuspended(Reported, ThreadId, Reason);
    else
      Resume();
  });
  return true;
}

void TGDBProcess::NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) {
  const TIntfPtr<IGDBBreakpointListener> Listener = FBreakpoints->Find(Breakpoint);
  if (!Listener)
    return;
  DeferIfLive([Listener, Breakpoint, Location] {
    Listener->BreakpointVerified(Location.Address != UnresolvedAddress, Breakpoint, Location);
  });
}

void TGDBProcess::NotifyBreakpointLocations(Integer Breakpoint, const TGDBLocationArray& Locations) {
  // GDB says this at every hit too: only a change of verdict or place is
  // news to the listener.
  if (!FBreakpoints->Relocate(Breakpoint, AddressesOf(Locations)))
    return;
  const TIntfPtr<IGDBBreakpointListener> Listener = FBreakpoints->Find(Breakpoint);
  if (Listener)
    DeferIfLive([Listener, Breakpoint, Locations] { TellLocations(*Listener, Breakpoint, Locations); });
}

} // namespace midebug
