#include "inspect/gdbthreadtable.h"

#include <set>

namespace midebug {

TGDBThreadTable::TGDBThreadTable(TGDBProcess& Process)
    : FProcess(Process), FZombie(new TGDBThread(0, 0, "", "@@zombie", &Process)) {}

TGDBThreadTable::~TGDBThreadTable() { Clear(); }

TIntfPtr<IGDBThread> TGDBThreadTable::Get(Integer Id) {
  std::lock_guard Guard(FLock);
  const auto Found = FThreads.find(Id);
  return Found != FThreads.end() ? Found->second : FZombie;
}

bool TGDBThreadTable::Add(Integer Id, Integer OsId, const std::string& Name, const std::string& State) {
  std::lock_guard Guard(FLock);
  // A thread the table already holds (a refresh found it first) is not new;
  // replacing it would leave FStopped pointing at freed memory.
  if (FThreads.contains(Id))
    return false;
  FThreads[Id] = new TGDBThread(Id, OsId, Name, State, &FProcess);
  return true;
}

bool TGDBThreadTable::Remove(Integer Id) {
  std::lock_guard Guard(FLock);
  if (FStopped && FStopped->FId == Id)
    FStopped = nullptr;
  return FThreads.erase(Id) > 0;
}

std::vector<Integer> TGDBThreadTable::Clear() {
  std::lock_guard Guard(FLock);
  std::vector<Integer> Ids;
  for (const auto& Entry : FThreads)
    Ids.push_back(Entry.first);
  FStopped = nullptr;
  FThreads.clear();
  return Ids;
}

void TGDBThreadTable::Merge(const TThreadListIdsResult& Ids, std::vector<Integer>& Created,
                            std::vector<Integer>& Exited) {
  std::lock_guard Guard(FLock);
  std::set<Integer> Seen;
  for (size_t Index = 0; Index < Ids.FIds.size(); ++Index) {
    const Integer Id = Ids.FIds[Index];
    if (Id == -1)
      continue;
    const std::string State = Index < Ids.FStates.size() ? Ids.FStates[Index] : std::string();
    Seen.insert(Id);
    const auto Found = FThreads.find(Id);
    if (Found != FThreads.end()) {
      // GDB's list names no states: a thread keeps the one it has.
      if (!State.empty())
        Found->second->FState = TGDBThread::StrToState(State);
      Found->second->ResetCallStack();
      continue;
    }
    const std::string Name = Index < Ids.FNames.size() ? Ids.FNames[Index] : std::string();
    FThreads[Id] = new TGDBThread(Id, Id, Name, State, &FProcess);
    Created.push_back(Id);
  }
  for (auto Entry = FThreads.begin(); Entry != FThreads.end();) {
    if (Seen.contains(Entry->first)) {
      ++Entry;
      continue;
    }
    if (FStopped == Entry->second.get())
      FStopped = nullptr;
    Exited.push_back(Entry->first);
    Entry = FThreads.erase(Entry);
  }
}

void TGDBThreadTable::Apply(const TThreadInfoResult& Info, bool RunningMeansStopped) {
  std::lock_guard Guard(FLock);
  for (size_t Index = 0; Index < Info.FIds.size(); ++Index) {
    const auto Found = FThreads.find(Info.FIds[Index]);
    if (Found == FThreads.end())
      continue;
    TGDBThread& Thread = *Found->second;
    if (Index < Info.FStates.size())
      Thread.FState = TGDBThread::StrToState(Info.FStates[Index]);
    if (Index < Info.FLocations.size())
      Thread.FLocation = Info.FLocations[Index];
    if (RunningMeansStopped && Thread.FState == tsRunnable)
      Thread.FState = tsStop;
    if (!Info.FStateOnly && Index < Info.FNames.size())
      Thread.FName = Info.FNames[Index];
  }
}

void TGDBThreadTable::ResetCallStacks() {
  std::lock_guard Guard(FLock);
  for (const auto& Entry : FThreads)
    Entry.second->ResetCallStack();
}

Integer TGDBThreadTable::StoppedId() {
  std::lock_guard Guard(FLock);
  return FStopped ? FStopped->FId : -1;
}

TGDBLocation TGDBThreadTable::StoppedLocation() {
  std::lock_guard Guard(FLock);
  return FStopped ? FStopped->FLocation : DummyLocation;
}

void TGDBThreadTable::SetStopped(Integer Id, const TGDBLocation& Location, TThreadStopReason Reason, Integer Frame) {
  std::lock_guard Guard(FLock);
  const auto Found = FThreads.find(Id);
  FStopped = Found != FThreads.end() ? Found->second.get() : nullptr;
  if (!FStopped)
    return;
  FStopped->FLocation = Location;
  if (Reason != tsrNotStopped)
    FStopped->FReason = Reason;
  if (Frame != -1)
    FStopped->FFrameIndex = Frame;
}

void TGDBThreadTable::SetStoppedFrame(Integer Frame, const TGDBLocation& Location) {
  std::lock_guard Guard(FLock);
  if (!FStopped)
    return;
  FStopped->FFrameIndex = Frame;
  FStopped->FLocation = Location;
}

Integer TGDBThreadTable::Resume() {
  std::lock_guard Guard(FLock);
  const Integer Id = FStopped ? FStopped->FId : -1;
  FStopped = nullptr;
  FInlineLocation = DummyLocation;
  FReturnValue.clear();
  return Id;
}

void TGDBThreadTable::SetReturnValue(const std::string& Value) {
  std::lock_guard Guard(FLock);
  FReturnValue = Value;
}

std::string TGDBThreadTable::ReturnValue() {
  std::lock_guard Guard(FLock);
  return FReturnValue;
}

void TGDBThreadTable::SetInlineLocation(const TGDBLocation& Location) {
  std::lock_guard Guard(FLock);
  FInlineLocation = Location;
}

TGDBLocation TGDBThreadTable::FixupInlineLocation(const TGDBLocation& Location) {
  std::lock_guard Guard(FLock);
  if (Location.Line == 0 || !Location.Source.empty() || FInlineLocation.Source.empty())
    return Location;
  TGDBLocation Fixed = Location;
  Fixed.Line = FInlineLocation.Line;
  Fixed.Source = FInlineLocation.Source;
  return Fixed;
}

} // namespace midebug
