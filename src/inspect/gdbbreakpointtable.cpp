#include "inspect/gdbbreakpointtable.h"

#include <algorithm>

namespace midebug {

void TGDBBreakpointTable::Add(Integer Breakpoint, const TIntfPtr<IGDBBreakpointListener>& Listener,
                              TBreakpointKind Kind, const TAddressArray& Addresses) {
  TIntfPtr<IGDBBreakpointListener> Released;
  std::lock_guard Guard(FLock);
  TEntry& Entry = FBreakpointList[Breakpoint];
  Released = std::move(Entry.Listener);
  Entry = TEntry{Listener, Kind, true, Addresses};
}

void TGDBBreakpointTable::Remove(Integer Breakpoint) {
  TIntfPtr<IGDBBreakpointListener> Released;
  std::lock_guard Guard(FLock);
  const auto Found = FBreakpointList.find(Breakpoint);
  if (Found == FBreakpointList.end())
    return;
  // The listener may be the last reference: it goes after the lock.
  Released = std::move(Found->second.Listener);
  FBreakpointList.erase(Found);
}

TIntfPtr<IGDBBreakpointListener> TGDBBreakpointTable::Find(Integer Breakpoint) {
  std::lock_guard Guard(FLock);
  const auto Found = FBreakpointList.find(Breakpoint);
  return Found != FBreakpointList.end() ? Found->second.Listener : nullptr;
}

void TGDBBreakpointTable::SetEnabled(Integer Breakpoint, bool Enabled) {
  std::lock_guard Guard(FLock);
  const auto Found = FBreakpointList.find(Breakpoint);
  if (Found != FBreakpointList.end())
    Found->second.Enabled = Enabled;
}

bool TGDBBreakpointTable::Relocate(Integer Breakpoint, const TAddressArray& Addresses) {
  std::lock_guard Guard(FLock);
  const auto Found = FBreakpointList.find(Breakpoint);
  if (Found == FBreakpointList.end() || Found->second.Addresses == Addresses)
    return false;
  Found->second.Addresses = Addresses;
  return true;
}

std::vector<TBreakpointHit> TGDBBreakpointTable::Hit(Integer Breakpoint, UInt64 Address) {
  std::vector<TBreakpointHit> Hits;
  std::vector<TIntfPtr<IGDBBreakpointListener>> Released;
  std::lock_guard Guard(FLock);
  auto Take = [&](std::map<Integer, TEntry>::iterator Found) {
    Hits.push_back({Found->second.Listener, Found->second.Kind});
    if (Found->second.Kind != bkTemporary)
      return std::next(Found);
    Released.push_back(std::move(Found->second.Listener));
    return FBreakpointList.erase(Found);
  };
  const auto Named = FBreakpointList.find(Breakpoint);
  if (Named == FBreakpointList.end())
    return Hits;
  Take(Named);
  if (Address == 0)
    return Hits;
  for (auto Other = FBreakpointList.begin(); Other != FBreakpointList.end();) {
    const TEntry& Entry = Other->second;
    const bool There = Other->first != Breakpoint && Entry.Enabled &&
                       std::find(Entry.Addresses.begin(), Entry.Addresses.end(), Address) != Entry.Addresses.end();
    Other = There ? Take(Other) : std::next(Other);
  }
  return Hits;
}

} // namespace midebug
