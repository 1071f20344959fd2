#include "inspect/gdbbreakpointtable.h"

namespace midebug {

void TGDBBreakpointTable::Add(Integer Breakpoint, const TIntfPtr<IGDBBreakpointListener>& Listener) {
  std::lock_guard Guard(FLock);
  FBreakpointList[Breakpoint] = Listener;
}

void TGDBBreakpointTable::Remove(Integer Breakpoint) {
  TIntfPtr<IGDBBreakpointListener> Released;
  std::lock_guard Guard(FLock);
  const auto Found = FBreakpointList.find(Breakpoint);
  if (Found == FBreakpointList.end())
    return;
  // The listener may be the last reference: it goes after the lock.
  Released = std::move(Found->second);
  FBreakpointList.erase(Found);
}

TIntfPtr<IGDBBreakpointListener> TGDBBreakpointTable::Find(Integer Breakpoint) {
  std::lock_guard Guard(FLock);
  const auto Found = FBreakpointList.find(Breakpoint);
  return Found != FBreakpointList.end() ? Found->second : nullptr;
}

} // namespace midebug
