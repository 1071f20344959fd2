#include "inspect/gdbthread.h"

#include "inspect/gdbevaluator.h"
#include "inspect/gdbinspect.h"
#include "inspect/gdbregisterids.h"
#include "inspect/gdbthreadtable.h"
#include "process/gdbprocess.h"

#include <algorithm>
#include <cctype>
#include <stdexcept>

namespace midebug {

namespace {

/// What the IDE shows past the frames counted on a stack cut short, in place
/// of an outermost frame it never saw.
const TGDBStackFrame& CutMarker() {
  static const TGDBStackFrame Marker{
      DummyLocation, "... more than " + std::to_string(TGDBThreadTable::MaxCallDepth) + " frames", {}};
  return Marker;
}

} // namespace

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
  FCallWindows.clear();
  FFrameIndex = 0;
  FReason = tsrUnknown;
  FLocation = DummyLocation;
}

std::string TGDBThread::GetName() {
  // The zombie is in no list: asking would only cost a request.
  if (FName.empty() && !ZombieState())
    FProcess->Threads().RefreshStates(false);
  return FName;
}

TThreadState TGDBThread::GetState() {
  if (FProcess->Threads().StatesStale() && !ZombieState())
    FProcess->Threads().RefreshStates(!FName.empty());
  return FState;
}

TThreadStopReason TGDBThread::GetStopReason() { return FProcess->Suspended() ? FReason : tsrNotStopped; }
TGDBCPU TGDBThread::GetCPUType() { return FProcess->CPU(); }
TGDBLanguage TGDBThread::GetEvaluator() { return FProcess->GetEvaluator(); }

void TGDBThread::SetAsSuspendedThread() {
  const Integer Current = FProcess->GetSuspendedThreadId();
  if (Current == -1 || Current == FId || ZombieState())
    return;
  FProcess->Threads().Select(FId);
  // Only once the debugger has really switched: resetting the frame of the
  // thread that stayed current would move that thread's selection instead.
  if (FProcess->GetSuspendedThreadId() != FId || FFrameIndex == 0)
    return;
  FProcess->Threads().SelectFrame(0);
  FFrameIndex = 0;
}

void TGDBThread::SelectFrame(Integer Frame) {
  if (Frame < 1 || Frame == FFrameIndex + 1 || FProcess->GetSuspendedThreadId() != FId)
    return;
  // The debugger refuses a frame beyond the stack but the selection would
  // still be recorded, leaving the thread at a frame it is not at.
  if (Frame > GetCallCount() || IsCutMarker(Frame))
    return;
  FProcess->Threads().SelectFrame(Frame - 1);
  FFrameIndex = Frame - 1;
}

bool TGDBThread::ActsOnThisThread() {
  // The zombie stands for every unknown thread number and is never reset:
  // a stack fetched for it would be another thread's, and kept for good.
  if (ZombieState())
    return false;
  const Integer Current = FProcess->GetSuspendedThreadId();
  return Current == -1 || Current == FId;
}

Integer TGDBThread::GetCallCount() {
  if (FCallCount == -1) {
    SetAsSuspendedThread();
    if (!ActsOnThisThread())
      return 0;
    FCallCount = FProcess->Threads().CallCount();
  }
  return FCallCount;
}

bool TGDBThread::IsCutMarker(Integer Index) const {
  return FCallCount > TGDBThreadTable::MaxCallDepth && Index == FCallCount;
}

const TGDBStackFrame* TGDBThread::CallFrame(Integer Index) {
  if (Index < 1 || (FCallCount != -1 && Index > FCallCount))
    return nullptr;
  // The first window tells on its own where a shallow stack ends; beyond it
  // only the depth can refuse a frame past the end without a failed fetch.
  if (Index > CallWindow && Index > GetCallCount())
    return nullptr;
  if (IsCutMarker(Index))
    return &CutMarker();
  const Integer Low = (Index - 1) / CallWindow * CallWindow;
  auto Window = FCallWindows.find(Low);
  if (Window == FCallWindows.end()) {
    SetAsSuspendedThread();
    if (!ActsOnThisThread())
      return nullptr;
    TStackFrameArray Frames;
    if (!FProcess->Threads().CallHeaders(Low, Low + CallWindow - 1, Frames))
      return nullptr;
    if (FCallCount == -1 && Frames.size() < static_cast<size_t>(CallWindow))
      FCallCount = Low + static_cast<Integer>(Frames.size());
    Window = FCallWindows.emplace(Low, std::move(Frames)).first;
  }
  const size_t Offset = static_cast<size_t>(Index - 1 - Low);
  return Offset < Window->second.size() ? &Window->second[Offset] : nullptr;
}

std::string TGDBThread::GetCallHeader(Integer Index) {
  const TGDBStackFrame* Frame = CallFrame(Index);
  return Frame ? Frame->Header : std::string();
}

TGDBLocation TGDBThread::GetCallLocation(Integer Index) {
  const TGDBStackFrame* Frame = CallFrame(Index);
  return Frame ? Frame->Location : DummyLocation;
}

TStringArray TGDBThread::GetCallParams(Integer Index) {
  const TGDBStackFrame* Frame = CallFrame(Index);
  return Frame ? Frame->Params : TStringArray();
}

Integer TGDBThread::GetFileIndex(const std::string& FileName) { return FProcess->AddFileName(FileName); }

// --- Registers -----------------------------------------------------------------

bool TGDBThread::AtFrameZero(const std::function<bool()>& Read) {
  SetAsSuspendedThread();
  if (!ActsOnThisThread())
    return false;
  // Registers are read in the innermost frame; the frame the IDE selected is
  // selected again afterwards.
  const Integer Frame = FFrameIndex;
  if (Frame != 0)
    FProcess->Threads().SelectFrame(0);
  const bool Done = Read();
  if (Frame != 0)
    FProcess->Threads().SelectFrame(Frame);
  return Done;
}

bool TGDBThread::Writable() {
  SetAsSuspendedThread();
  return !ZombieState() && FProcess->GetSuspendedThreadId() == FId;
}

void TGDBThread::Relocate() {
  // The debugger reports no new location for a written pc or stack pointer,
  // and GDB 13 even answers with its frames from before the write until a
  // thread is selected: selecting this one again fetches the new location.
  FCallCount = -1;
  FCallWindows.clear();
  const Integer Frame = FFrameIndex;
  FProcess->Threads().Select(FId);
  if (Frame != 0)
    FProcess->Threads().SelectFrame(Frame);
}

bool TGDBThread::GetRegisters(TUInt64Array& Values, UInt64& PC) {
  const bool Read = AtFrameZero([&] { return FProcess->Registers().GetRegisters(Values); });
  PC = FLocation.Address;
  return Read;
}

bool TGDBThread::SetRegisters(const TUInt64Array& Old, const TUInt64Array& New) {
  if (!Writable())
    return false;
  const bool Written = FProcess->Registers().SetRegisters(Old, New);
  if (Old != New)
    Relocate();
  return Written;
}

bool TGDBThread::GetFPURegisters(TFPURegValueArray& Values) {
  return AtFrameZero([&] { return FProcess->Registers().GetFPURegisters(Values); });
}

bool TGDBThread::SetFPURegisters(const TFPURegValueArray& Old, const TFPURegValueArray& New) {
  return Writable() && FProcess->Registers().SetFPURegisters(Old, New);
}

bool TGDBThread::GetXMMRegisters(TXMMRegValueArray& Values) {
  return AtFrameZero([&] { return FProcess->Registers().GetXMMRegisters(Values); });
}

bool TGDBThread::SetXMMRegisters(const TXMMRegValueArray& Old, const TXMMRegValueArray& New) {
  return Writable() && FProcess->Registers().SetXMMRegisters(Old, New);
}

bool TGDBThread::SetRunToMainBreakpoint(bool& NoEntryStop) {
  if (!FProcess->Kernel().SupportStopOnEntryPoint()) {
    NoEntryStop = true;
    return FProcess->CanSetRunToMainBreakpoint();
  }
  NoEntryStop = false;
  return FProcess->SetRunToMainBreakpoint();
}

void TGDBThread::Step(TStepCreate Create) {
  SetAsSuspendedThread();
  // Sent without waiting: the stop that ends the step arrives later.
  FProcess->Requests().Fire(Create);
}

void TGDBThread::StepInto() { Step(&TGDBCommand::CreateExecStepCommand); }
void TGDBThread::StepOver() { Step(&TGDBCommand::CreateExecNextCommand); }
void TGDBThread::StepOut() { Step(&TGDBCommand::CreateExecFinishCommand); }
void TGDBThread::InstStepInto() { Step(&TGDBCommand::CreateExecStepInstructionCommand); }
void TGDBThread::InstStepOver() { Step(&TGDBCommand::CreateExecNextInstructionCommand); }

TGDBRetCode TGDBThread::Evaluate(const std::string& Expr, const std::string& Suffix, Integer Frame,
                                 std::string& Value, bool& CanModify, std::string& TypeName) {
  if (!FProcess->Suspended() || !FProcess->Alive())
    return TGDBEvaluator::EvaluateError(Value, CanModify, TypeName, NotSuspendedMessage);
  SetAsSuspendedThread();
  SelectFrame(Frame);
  return FProcess->Evaluator().Evaluate(Expr, Suffix, 0, Value, CanModify, TypeName);
}

TGDBRetCode TGDBThread::Modify(const std::string& NewValue, std::string& Value) {
  Value.clear();
  if (!FProcess->Suspended() || !FProcess->Alive()) {
    Value = NotSuspendedMessage;
    return ercError;
  }
  return FProcess->Evaluator().Modify(NewValue, Value);
}

TIntfPtr<IGDBDisassemble> TGDBThread::GetDisassembler() { return FProcess->GetDisassembler(); }
TIntfPtr<IGDBInspect> TGDBThread::CreateLocalVarsInspector(Integer Frame) {
  if (!FProcess->Suspended() || !FProcess->Alive())
    return new TGDBLocalInspect(*FProcess, nullptr, Frame, 0, 0, 0);
  SetAsSuspendedThread();
  SelectFrame(Frame);
  const Integer Selected = FFrameIndex + 1;
  return FProcess->Evaluator().CreateLocalVarsInspector(this, Selected, GetCallCount(), GetCallParams(Selected),
                                                        nullptr);
}

TIntfPtr<IGDBInspect> TGDBThread::CreateInspector(const std::string& Expr, Integer Frame) {
  if (!FProcess->Suspended() || !FProcess->Alive())
    return new TGDBInspect(*FProcess, nullptr, Expr, 0);
  SetAsSuspendedThread();
  SelectFrame(Frame);
  return new TGDBInspect(Expr, 0, *FProcess, this);
}

void TGDBThread::AddInspect(const std::string& Name, TGDBInspect* Inspect) {
  if (Name.empty())
    return;
  std::lock_guard Guard(FInspectLock);
  if (!FInspects.emplace(Name, Inspect).second)
    throw std::logic_error("variable object " + Name + " is inspected already");
}

void TGDBThread::RemoveInspect(const std::string& Name) {
  if (Name.empty())
    return;
  std::lock_guard Guard(FInspectLock);
  FInspects.erase(Name);
}

TGDBInspect* TGDBThread::GetInspect(const std::string& Name) {
  std::lock_guard Guard(FInspectLock);
  const auto Found = FInspects.find(Name);
  return Found == FInspects.end() ? nullptr : Found->second;
}

} // namespace midebug
