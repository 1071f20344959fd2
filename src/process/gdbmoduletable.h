#pragma once
/// \file
/// The modules (program and libraries) of one process as the IDE learns them.

#include "mi/gdbresult.h"

#include <mutex>
#include <string>
#include <unordered_map>

namespace midebug {

/// A stable id per module name, and the module the IDE was told of last.
/// FLock guards both and is a leaf lock.
class TGDBModuleTable {
public:
  /// The id of Name, handed out at its first use (1, 2, ...).
  Integer GetModuleId(const std::string& Name) {
    std::lock_guard Guard(FLock);
    const auto [Entry, Added] = FModuleIdList.try_emplace(Name, FModuleId + 1);
    if (Added)
      ++FModuleId;
    return Entry->second;
  }
  void SetCurrent(const TGDBModule& Module) {
    std::lock_guard Guard(FLock);
    FCurrentLoadedModule = Module;
  }
  /// The module told last when its id is Id; the empty module otherwise.
  TGDBModule Current(Integer Id) {
    std::lock_guard Guard(FLock);
    return FCurrentLoadedModule.Id == Id ? FCurrentLoadedModule : DummyModule;
  }

private:
  std::mutex FLock;
  Integer FModuleId = 0;
  std::unordered_map<std::string, Integer> FModuleIdList;
  TGDBModule FCurrentLoadedModule = DummyModule;
};

} // namespace midebug
