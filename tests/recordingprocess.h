#pragma once
/// \file
/// A process for parser tests: records every call the parser makes as one
/// line of text, and hands out the result objects a test registered.

#include "process/gdbinterfaces.h"

#include <cstdio>
#include <map>
#include <string>
#include <vector>

namespace midebug::test {

class TRecordingProcess : public IGDBInternalProcess {
public:
  // What the process answers.
  bool LLDB = false;
  bool Windows = false;
  bool Linux = true;
  bool Android64 = false;
  bool AttachMode = false;
  bool HXConsole = false;
  bool Dying = false;
  bool BreakpointHandled = false;
  std::string EndOfLineMarker = "(gdb) \n";
  std::map<std::string, TGDBResult*> WaitObjects;

  /// Every call, in order.
  std::vector<std::string> Calls;
  /// The arguments of the last calls that carry records.
  TGDBLocation LastLocation;
  TGDBException LastException;
  TGDBModule LastModule;

  void Register(const std::string& Key, TGDBResult& Result) { WaitObjects[Key] = &Result; }

  static std::string Str(Integer Value) { return std::to_string(Value); }

  static std::string Describe(const TGDBLocation& Location) {
    char Address[32];
    std::snprintf(Address, sizeof Address, "%#llx", static_cast<unsigned long long>(Location.Address));
    return Location.Source + ":" + std::to_string(Location.Line) + "@" + (Location.Address ? Address : "0x0");
  }

  int32_t QueryInterface(const TGUID&, void**) override { return IntfResultNoInterface; }
  int32_t AddRef() override { return 1; }
  int32_t Release() override { return 1; }

  void NotifyLogEvent(const TGDBLogEvent& Event) override {
    Calls.push_back(std::string("Log(") + Str(static_cast<int>(Event.Event)) + "," + Event.Data + ")");
  }
  void NotifyProcessStarted() override { Calls.push_back("Started"); }
  void NotifyProcessExited(Integer Code, const std::string& Signal) override {
    Calls.push_back(std::string("Exited(") + Str(Code) + "," + Signal + ")");
  }
  void NotifyProcessResumed() override { Calls.push_back("Resumed"); }
  void NotifyProcessFaulted(const std::string& Message) override { Calls.push_back("Faulted(" + Message + ")"); }
  void NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) override {
    LastLocation = Location;
    Calls.push_back(std::string("Suspended(") + Describe(Location) + "," + Str(ThreadId) + "," + Str(static_cast<int>(Reason)) + ")");
  }
  void NotifySignalReceived(const TGDBException& Signal, Integer ThreadId) override {
    LastException = Signal;
    Calls.push_back(std::string("Signal(") + Signal.Name + "," + Signal.Desc + "," + Describe(Signal.Location) + "," + Str(ThreadId) + ")");
  }
  void NotifyExceptionRaised(const TGDBException& Exception, Integer ThreadId) override {
    LastException = Exception;
    Calls.push_back(std::string("Exception(") + Exception.Name + "," + Str(ThreadId) + ")");
  }
  void NotifyThreadCreated(Integer ThreadId, Integer OsId) override {
    Calls.push_back(std::string("ThreadCreated(") + Str(ThreadId) + "," + Str(OsId) + ")");
  }
  void NotifyThreadExited(Integer ThreadId) override { Calls.push_back(std::string("ThreadExited(") + Str(ThreadId) + ")"); }
  void NotifyThreadSelected(Integer ThreadId) override {
    Calls.push_back(std::string("ThreadSelected(") + Str(ThreadId) + ")");
  }
  void NotifyProcessPidCreated(Integer Pid) override { Calls.push_back(std::string("Pid(") + Str(Pid) + ")"); }
  void NotifyLanguageChanged(const std::string& Language) override { Calls.push_back("Language(" + Language + ")"); }
  void NotifySettingMaxChildrenCountChanged(Integer Count) override {
    Calls.push_back(std::string("MaxChildren(") + Str(Count) + ")");
  }
  void NotifyModuleLoaded(const TGDBModule& Module) override {
    LastModule = Module;
    Calls.push_back(std::string("ModuleLoaded(") + Module.Name + ")");
  }
  void NotifyModuleUnLoaded(const TGDBModule& Module) override {
    LastModule = Module;
    Calls.push_back(std::string("ModuleUnloaded(") + Module.Name + ")");
  }
  bool NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) override {
    LastLocation = Location;
    Calls.push_back(std::string("Breakpoint(") + Str(Breakpoint) + "," + Describe(Location) + "," + Str(ThreadId) + ")");
    return BreakpointHandled;
  }
  void NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) override {
    Calls.push_back(std::string("BreakpointModified(") + Str(Breakpoint) + "," + Describe(Location) + ")");
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
  bool IsAndroid64() override { return Android64; }
  bool IsLinux() override { return Linux; }
  bool IsWindows() override { return Windows; }
  bool IsAttachMode() override { return AttachMode; }
  bool SupportHXConsole() override { return HXConsole; }
  bool IsDying() override { return Dying; }
  Integer GetModuleId(const std::string& Name) override {
    const auto Found = FModuleIds.try_emplace(Name, static_cast<Integer>(FModuleIds.size()) + 1);
    return Found.first->second;
  }

private:
  std::map<std::string, Integer> FModuleIds;
};

} // namespace midebug::test
