#pragma once
/// \file
/// One thread of the debugged process as the IDE holds it.

#include "process/gdbinterfaces.h"

#include <string>

namespace midebug {

class TGDBProcess;

/// A thread's identity, state and last stop. Every question that needs the
/// debugger is routed to the owning process.
class TGDBThread : public TInterfaced<IGDBThread> {
public:
  TGDBThread(Integer Id, Integer OsId, const std::string& Name, const std::string& State, TGDBProcess* Process);

  /// The state a debugger's state text names; letter case is ignored and
  /// unknown text gives tsNone.
  static TThreadState StrToState(const std::string& State);
  void ResetCallStack();
  bool ZombieState() const { return FState == tsZombie; }

  Integer GetId() override { return FId; }
  Integer GetOsId() override { return FOsId; }
  std::string GetName() override { return FName; }
  TThreadState GetState() override { return FState; }
  TThreadStopReason GetStopReason() override;
  TGDBLocation GetCurrentLocation() override { return FLocation; }
  TGDBCPU GetCPUType() override;
  TGDBLanguage GetEvaluator() override;
  Integer GetCallCount() override;
  std::string GetCallHeader(Integer Index) override;
  TGDBLocation GetCallLocation(Integer Index) override;
  Integer GetFileIndex(const std::string& FileName) override;
  bool GetRegisters(TUInt64Array& Values, UInt64& PC) override;
  bool SetRegisters(const TUInt64Array& Old, const TUInt64Array& New) override;
  bool GetFPURegisters(TFPURegValueArray& Values) override;
  bool SetFPURegisters(const TFPURegValueArray& Old, const TFPURegValueArray& New) override;
  bool GetXMMRegisters(TXMMRegValueArray& Values) override;
  bool SetXMMRegisters(const TXMMRegValueArray& Old, const TXMMRegValueArray& New) override;
  bool SetRunToMainBreakpoint(bool& NoEntryStop) override;
  void StepInto() override;
  void StepOver() override;
  void StepOut() override;
  void InstStepInto() override;
  void InstStepOver() override;
  void Stop() override {}
  void Run() override {}
  TGDBRetCode Evaluate(const std::string& Expr, const std::string& Suffix, Integer Frame, std::string& Value,
                       bool& CanModify, std::string& TypeName) override;
  TGDBRetCode Modify(const std::string& NewValue, std::string& Value) override;
  TIntfPtr<IGDBDisassemble> GetDisassembler() override;
  TIntfPtr<IGDBInspect> CreateLocalVarsInspector(Integer Frame) override;
  TIntfPtr<IGDBInspect> CreateInspector(const std::string& Expr, Integer Frame) override;

  Integer FId;
  Integer FOsId;
  std::string FName;
  Integer FCallCount = -1;
  TStackFrameArray FCallHeaders;
  TThreadState FState;
  bool FActive = true;
  TGDBProcess* FProcess;
  Integer FFrameIndex = 0;
  TGDBLocation FLocation;
  TThreadStopReason FReason = tsrNotStopped;
};

} // namespace midebug
