// The process's breakpoint events and its own run-to-main breakpoint. The
// IDE's breakpoint operations are in gdbprocessinspect.cpp until they are
// built.

#include "inspect/gdbbreakpointtable.h"
#include "process/gdbprocess.h"

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
  FBreakpoints->Add(Inserted->FBreakpoint, Listener);
  FBreakOnMain = Listener;
  return true;
}

bool TGDBProcess::NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) {
  FSuspended = true;
  FSuspending = false;
  const TIntfPtr<IGDBBreakpointListener> Listener = FBreakpoints->Find(Breakpoint);
  if (!Listener)
    return false;
  FTerminal.Drain(false);
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
  const TIntfPtr<IGDBBreakpointListener> Listener = FBreakpoints->Find(Breakpoint);
  if (!Listener)
    return;
  DeferIfLive([Listener, Breakpoint, Location] {
    Listener->BreakpointVerified(Location.Address != ~UInt64{0}, Breakpoint, Location);
  });
}

} // namespace midebug
