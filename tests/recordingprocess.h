#pragma once
/// \file
/// A process for parser tests: records every call the parser makes as one
/// line of text, keeps the values of the calls a user would see, and hands
/// out the result objects a test registered.

#include "nullprocess.h"
#include "process/gdbinterfaces.h"

#include <algorithm>
#include <cstdio>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace midebug::test {

/// One stop as the process heard it.
struct TStop {
  TGDBLocation Location;
  Integer ThreadId = -1;
  TThreadStopReason Reason = tsrNotStopped;
};

class TRecordingProcess : public TNullInternalProcess {
public:
  // What the process answers.
  bool LLDB = false;
  bool HXConsole = false;
  bool Dying = false;
  bool BreakpointHandled = false;
  std::string EndOfLineMarker = "(gdb) \n";
  std::map<std::string, TGDBResult*> WaitObjects;

  /// Every call, in order, and the values of the calls that carry records.
  std::vector<std::string> Calls;
  std::vector<TStop> Suspensions;
  std::vector<std::pair<Integer, TStop>> BreakpointHits;
  std::vector<std::pair<Integer, std::string>> Exits;
  std::vector<TGDBModule> Modules;

  void Register(const std::string& Key, TGDBResult& Result) { WaitObjects[Key] = &Result; }

  static std::string Describe(const TGDBLocation& Location) {
    char Address[32];
    std::snprintf(Address, sizeof Address, "%#llx", static_cast<unsigned long long>(Location.Address));
    return Location.Source + ":" + std::to_string(Location.Line) + "@" + (Location.Address ? Address : "0x0");
  }
  bool Called(std::string_view Prefix) const {
    return std::any_of(Calls.begin(), Calls.end(), [&](const std::string& Call) { return Call.starts_with(Prefix); });
  }

  void NotifyLogEvent(const TGDBLogEvent& Event) override {
    Record("Log", std::to_string(static_cast<int>(Event.Event)) + "," + Event.Data);
  }
  void NotifyProcessStarted() override { Calls.push_back("Started"); }
  void NotifyProcessExited(Integer Code, const std::string& Signal) override {
    Exits.emplace_back(Code, Signal);
    Record("Exited", std::to_string(Code) + "," + Signal);
  }
  void NotifyProcessResumed() override { Calls.push_back("Resumed"); }
  void NotifyProcessFaulted(const std::string& Message) override { Record("Faulted", Message); }
  void NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) override {
    Suspensions.push_back({Location, ThreadId, Reason});
    Record("Suspended", Describe(Location) + "," + std::to_string(ThreadId) + "," + std::to_string(static_cast<int>(Reason)));
  }
  void NotifySignalReceived(const TGDBException& Signal, Integer ThreadId) override {
    Record("Signal", Signal.Name + "," + Signal.Desc + "," + Describe(Signal.Location) + "," + std::to_string(ThreadId));
  }
  void NotifyExceptionRaised(const TGDBException& Exception, Integer ThreadId) override {
    Record("Exception", Exception.Name + "," + std::to_string(ThreadId));
  }
  void NotifyThreadCreated(Integer ThreadId, Integer OsId) override {
    Record("ThreadCreated", std::to_string(ThreadId) + "," + std::to_string(OsId));
  }
  void NotifyThreadExited(Integer ThreadId) override { Record("ThreadExited", std::to_string(ThreadId)); }
  void NotifyThreadSelected(Integer ThreadId) override { Record("ThreadSelected", std::to_string(ThreadId)); }
  void NotifyProcessPidCreated(Integer Pid) override { Record("Pid", std::to_string(Pid)); }
  void NotifyLanguageChanged(const std::string& Language) override { Record("Language", Language); }
  void NotifySettingMaxChildrenCountChanged(Integer Count) override { Record("MaxChildren", std::to_string(Count)); }
  void NotifyModuleLoaded(const TGDBModule& Module) override {
    Modules.push_back(Module);
    Record("ModuleLoaded", Module.Name);
  }
  void NotifyModuleUnLoaded(const TGDBModule& Module) override {
    Modules.push_back(Module);
    Record("ModuleUnloaded", Module.Name);
  }
  bool NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) override {
    BreakpointHits.push_back({Breakpoint, {Location, ThreadId, tsrAtBreakpoint}});
    Record("Breakpoint", std::to_string(Breakpoint) + "," + Describe(Location) + "," + std::to_string(ThreadId));
    return BreakpointHandled;
  }
  void NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) override {
    Record("BreakpointModified", std::to_string(Breakpoint) + "," + Describe(Location));
  }
  void NotifyWatchpointOutOfScope() override { Calls.push_back("WatchpointOutOfScope"); }
  void NotifyProcessRestart() override { Calls.push_back("Restart"); }
  TGDBResult* RemoveWaitObject(const std::string& Key) override {
    const auto Found = WaitObjects.find(Key);
    if (Found == WaitObjects.end())
      return nullptr;
    TGDBResult* Result = Found->second;
    WaitObjects.erase(Found);
    return Result;
  }
  std::string GetEndOfLineMarker() override { return EndOfLineMarker; }
  bool IsLLDB() override { return LLDB; }
  bool SupportHXConsole() override { return HXConsole; }
  bool IsDying() override { return Dying; }
  Integer GetModuleId(const std::string& Name) override {
    return FModuleIds.try_emplace(Name, static_cast<Integer>(FModuleIds.size()) + 1).first->second;
  }
  void NotifyCommandRefused(const std::string& Message) override { Record("Refused", Message); }

private:
  void Record(const std::string& Name, const std::string& Arguments) { Calls.push_back(Name + "(" + Arguments + ")"); }

  std::map<std::string, Integer> FModuleIds;
};

} // namespace midebug::test
