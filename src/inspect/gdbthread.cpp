#include "inspect/gdbthread.h"

#include "process/gdbprocess.h"

#include <algorithm>
#include <cctype>

namespace midebug {

TGDBThread::TGDBThread(Integer Id, Integer OsId, const std::string& Name, const std::string& State,
                       TGDBProcess* Process)
    : FId(Id), FOsId(OsId), FName(Name), FState(StrToState(State)), FProcess(Process) {
  ResetCallStack();
}

TThreadState TGDBThread::StrToState(const std::string& State) {
  std::string Lower = State;
  std::transform(Lower.begin(), Lower.end(), Lower.begin(),
                 [](unsigned char C) { return static_cast<char>(std::tolower(C)); });
  if (Lower == "stopped")
    return tsStop;
  if (Lower == "running")
    return tsRunnable;
  if (Lower == "waiting")
    return tsBlocked;
  if (Lower == "@@zombie")
    return tsZombie;
  return tsNone;
}

void TGDBThread::ResetCallStack() {
  FCallCount = -1;
  FCallHeaders.clear();
  FFrameIndex = 0;
}

TThreadStopReason TGDBThread::GetStopReason() { return FProcess->Suspended() ? FReason : tsrNotStopped; }
TGDBCPU TGDBThread::GetCPUType() { return FProcess->Command().FCPUType; }
TGDBLanguage TGDBThread::GetEvaluator() { return FProcess->GetEvaluator(); }

// Call stacks, registers, stepping and evaluation come with their own
// operations; until then they report nothing.
Integer TGDBThread::GetCallCount() { return 0; }
std::string TGDBThread::GetCallHeader(Integer) { return {}; }
TGDBLocation TGDBThread::GetCallLocation(Integer) { return DummyLocation; }
Integer TGDBThread::GetFileIndex(const std::string& FileName) { return FProcess->GetFileIndex(FileName); }
bool TGDBThread::GetRegisters(TUInt64Array& Values, UInt64& PC) {
  Values.clear();
  PC = FLocation.Address;
  return false;
}
bool TGDBThread::SetRegisters(const TUInt64Array&, const TUInt64Array&) { return false; }
bool TGDBThread::GetFPURegisters(TFPURegValueArray& Values) {
  Values.clear();
  return false;
}
bool TGDBThread::SetFPURegisters(const TFPURegValueArray&, const TFPURegValueArray&) { return false; }
bool TGDBThread::GetXMMRegisters(TXMMRegValueArray& Values) {
  Values.clear();
  return false;
}
bool TGDBThread::SetXMMRegisters(const TXMMRegValueArray&, const TXMMRegValueArray&) { return false; }
bool TGDBThread::SetRunToMainBreakpoint(bool& NoEntryStop) {
  NoEntryStop = true;
  return false;
}
void TGDBThread::StepInto() {}
void TGDBThread::StepOver() {}
void TGDBThread::StepOut() {}
void TGDBThread::InstStepInto() {}
void TGDBThread::InstStepOver() {}
TGDBRetCode TGDBThread::Evaluate(const std::string&, const std::string&, Integer, std::string& Value, bool& CanModify,
                                 std::string& TypeName) {
  Value.clear();
  CanModify = false;
  TypeName.clear();
  return ercError;
}
TGDBRetCode TGDBThread::Modify(const std::string&, std::string& Value) {
  Value.clear();
  return ercError;
}
TIntfPtr<IGDBDisassemble> TGDBThread::GetDisassembler() { return nullptr; }
TIntfPtr<IGDBInspect> TGDBThread::CreateLocalVarsInspector(Integer) { return nullptr; }
TIntfPtr<IGDBInspect> TGDBThread::CreateInspector(const std::string&, Integer) { return nullptr; }

} // namespace midebug
