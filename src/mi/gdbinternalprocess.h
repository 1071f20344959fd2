#pragma once
/// \file
/// The process as the output parser sees it: the sink through which the
/// parser reports what it reads, implemented by the process.

#include "mi/gdblogevent.h"
#include "mi/gdbresult.h"
#include "platform/interfaced.h"

#include <string>

namespace midebug {

/// Why a thread last stopped.
enum TThreadStopReason : uint8_t {
  tsrNotStopped = 0,
  tsrUnknown = 1,
  tsrAtBreakpoint = 2,
  tsrStepDone = 3,
  tsrFCallDone = 4,
  tsrSignal = 5,
  tsrError = 6,
  tsrExceptRaised = 7,
};

/// Implemented by the process; the output parser reports what it reads
/// through it and finds the result objects of pending requests.
class IGDBInternalProcess : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{FF5F9453-8CDC-456A-8A94-A3640DD63033}");

  virtual void NotifyLogEvent(const TGDBLogEvent& Event) = 0;
  virtual void NotifyProcessStarted() = 0;
  virtual void NotifyProcessExited(Integer Code, const std::string& Signal) = 0;
  virtual void NotifyProcessResumed() = 0;
  virtual void NotifyProcessFaulted(const std::string& Message) = 0;
  virtual void NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) = 0;
  virtual void NotifySignalReceived(const TGDBException& SignalException, Integer ThreadId) = 0;
  virtual void NotifyExceptionRaised(const TGDBException& LanguageException, Integer ThreadId) = 0;
  virtual void NotifyThreadCreated(Integer ThreadId, Integer OsId) = 0;
  virtual void NotifyThreadExited(Integer ThreadId) = 0;
  virtual void NotifyThreadSelected(Integer ThreadId) = 0;
  virtual void NotifyProcessPidCreated(Integer Pid) = 0;
  virtual void NotifyLanguageChanged(const std::string& LanguageName) = 0;
  virtual void NotifySettingMaxChildrenCountChanged(Integer Count) = 0;
  virtual void NotifyModuleLoaded(const TGDBModule& Module) = 0;
  virtual void NotifyModuleUnLoaded(const TGDBModule& Module) = 0;
  /// True when the breakpoint has a listener.
  virtual bool NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) = 0;
  virtual void NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) = 0;
  virtual void NotifyWatchpointOutOfScope() = 0;
  virtual void NotifyProcessRestart() = 0;
  /// Takes the result object waiting under Key out of the table; null when
  /// none waits. The object stays owned by its requester.
  virtual TGDBResult* RemoveWaitObject(const std::string& Key) = 0;   // not owned by the table
  virtual std::string GetEndOfLineMarker() = 0;
  virtual bool IsLLDB() = 0;
  virtual bool IsAndroid64() = 0;
  virtual bool IsLinux() = 0;
  virtual bool IsWindows() = 0;
  virtual bool IsAttachMode() = 0;
  virtual bool SupportHXConsole() = 0;
  virtual bool IsDying() = 0;
  /// A stable id per module name.
  virtual Integer GetModuleId(const std::string& Name) = 0;
  /// The debugger refused a command that was to resume the stopped program
  /// ("finish" in the outermost frame): the program did not move.
  virtual void NotifyCommandRefused(const std::string& Message) = 0;
  /// GDB changed a breakpoint: where it now stands, one location per place,
  /// none while it is pending. GDB also says so at every hit.
  virtual void NotifyBreakpointLocations(Integer /*Breakpoint*/, const TGDBLocationArray& /*Locations*/) {}
  /// A finished function returned Value (as the debugger prints it), told
  /// just before the stop it ends with.
  virtual void NotifyReturnValue(const std::string& /*Value*/) {}
};

} // namespace midebug
