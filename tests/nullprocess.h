#pragma once
/// \file
/// A process that ignores every notification and answers every question with
/// a plain default, to derive parser drivers from (fuzzing, benchmarks, the
/// recording process of the parser tests).

#include "midebug.h"

namespace midebug::test {

class TNullInternalProcess : public IGDBInternalProcess {
public:
  int32_t QueryInterface(const TGUID&, void**) override { return IntfResultNoInterface; }
  int32_t AddRef() override { return 1; }
  int32_t Release() override { return 1; }
  void NotifyLogEvent(const TGDBLogEvent&) override {}
  void NotifyProcessStarted() override {}
  void NotifyProcessExited(Integer, const std::string&) override {}
  void NotifyProcessResumed() override {}
  void NotifyProcessFaulted(const std::string&) override {}
  void NotifyProcessSuspended(const TGDBLocation&, Integer, TThreadStopReason) override {}
  void NotifySignalReceived(const TGDBException&, Integer) override {}
  void NotifyExceptionRaised(const TGDBException&, Integer) override {}
  void NotifyThreadCreated(Integer, Integer) override {}
  void NotifyThreadExited(Integer) override {}
  void NotifyThreadSelected(Integer) override {}
  void NotifyProcessPidCreated(Integer) override {}
  void NotifyLanguageChanged(const std::string&) override {}
  void NotifySettingMaxChildrenCountChanged(Integer) override {}
  void NotifyModuleLoaded(const TGDBModule&) override {}
  void NotifyModuleUnLoaded(const TGDBModule&) override {}
  bool NotifyBreakpointOccurred(Integer, const TGDBLocation&, Integer) override { return false; }
  void NotifyBreakpointModified(Integer, const TGDBLocation&) override {}
  void NotifyWatchpointOutOfScope() override {}
  void NotifyProcessRestart() override {}
  TGDBResult* RemoveWaitObject(const std::string&) override { return nullptr; }
  std::string GetEndOfLineMarker() override { return "(gdb) \n"; }
  bool IsLLDB() override { return false; }
  bool IsAndroid64() override { return false; }
  bool IsLinux() override { return true; }
  bool IsWindows() override { return false; }
  bool IsAttachMode() override { return false; }
  bool SupportHXConsole() override { return false; }
  bool IsDying() override { return false; }
  Integer GetModuleId(const std::string&) override { return 0; }
  void NotifyCommandRefused(const std::string&) override {}
};

} // namespace midebug::test
