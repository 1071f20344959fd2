#include "inspect/gdbinspect.h"

#include "inspect/gdbevaluator.h"
#include "inspect/gdbthread.h"
#include "process/gdbprocess.h"

#include <algorithm>
#include <stdexcept>

namespace midebug {

namespace {

constexpr const char* InvalidInspector = "Invalid inspector";
constexpr const char* OutOfScope = "out of scope";

TGDBThread& ThreadOf(const TIntfPtr<IGDBThread>& Thread) { return *static_cast<TGDBThread*>(Thread.get()); }

/// The function a frame's header names: ":ADDRESS f(a=1)" and "F(1,2)" give
/// f and F.
std::string FunctionOf(const std::string& Header) {
  std::string Function = Header;
  if (Function.starts_with(':')) {
    const size_t Blank = Function.find(' ');
    Function = Blank == std::string::npos ? std::string() : Function.substr(Blank + 1);
  }
  return Function.substr(0, Function.find('('));
}

} // namespace

struct TGDBInspect::TVarObject {
  TVarObject(TGDBEvaluator& Evaluator, const TIntfPtr<IGDBProcess>& Process, const std::string& Name)
      : FEvaluator(Evaluator), FProcess(Process), FName(Name) {}
  ~TVarObject() { FEvaluator.VarDelete(FName); }
  TVarObject(const TVarObject&) = delete;
  TVarObject& operator=(const TVarObject&) = delete;

  TGDBEvaluator& FEvaluator;
  /// The process outlives the deletion.
  TIntfPtr<IGDBProcess> FProcess;
  std::string FName;
};

TGDBInspect::TGDBInspect(TGDBProcess& Process, const TIntfPtr<IGDBThread>& Thread, const std::string& Expr,
                         Integer NumChildren)
    : FProcess(Process), FProcessRef(static_cast<IGDBProcess*>(&Process)), FThread(Thread), FExpr(Expr) {
  SetNumChildren(NumChildren);
  if (!Thread) {
    FError = true;
    FLastError = NotSuspendedMessage;
  }
}

TGDBInspect::TGDBInspect(const std::string& Expr, UInt64 Address, TGDBProcess& Process,
                         const TIntfPtr<IGDBThread>& Thread)
    : TGDBInspect(Process, Thread, Expr, 0) {
  if (FError)
    return;
  TVarCreateResult Created;
  Evaluator().VarCreate(Expr, Address, Created);
  FError = Created.FError;
  if (Created.FError) {
    FLastError = Created.FErrorMessage;
    return;
  }
  Adopt(Created);
}

TGDBInspect::~TGDBInspect() {
  if (FRegistered)
    ThreadOf(FThread).RemoveInspect(FName);
}

TGDBEvaluator& TGDBInspect::Evaluator() { return FProcess.Evaluator(); }

void TGDBInspect::SetName(const std::string& Name, bool Register) {
  FName = Name;
  if (!Register && !Name.empty())
    FVarObject = std::make_shared<TVarObject>(Evaluator(), FProcessRef, Name);
  if (!Register || !FThread)
    return;
  ThreadOf(FThread).AddInspect(Name, this);
  FRegistered = true;
}

void TGDBInspect::SetNumChildren(Integer Count) {
  FNumChildren = std::max(Count, 0);
  FChildren.erase(FChildren.lower_bound(FNumChildren), FChildren.end());
}

void TGDBInspect::FillPlaceholders(const std::string& Error) {
  for (Integer Index = 0; Index < FNumChildren; ++Index) {
    TIntfPtr<TGDBInspect>& Slot = FChildren[Index];
    if (Slot)
      continue;
    Slot = new TGDBInspect(FProcess, FThread, "?", 0);
    Slot->FError = true;
    Slot->FValueDefined = true;
    Slot->FAutoDelete = false;
    Slot->FLastError = Error;
  }
}

bool TGDBInspect::StoreChildren(const TGDBVarChildArray& Children, Integer First,
                                const std::shared_ptr<TVarObject>& Owner) {
  for (size_t Index = 0; Index < Children.size(); ++Index) {
    const Integer Slot = First + static_cast<Integer>(Index);
    if (Slot >= FNumChildren)
      return true;
    const TGDBVarChild& Record = Children[Index];
    TIntfPtr<TGDBInspect> Child(new TGDBInspect(FProcess, FThread, Record.Expr, Record.NumChild));
    Child->FType = Record.VarType;
    Child->FAutoDelete = true;
    Child->FDynamic = Record.Dynamic;
    Child->FVarObject = Owner ? Owner : FVarObject;
    if (Owner)
      Child->FExpr = std::to_string(Slot);
    // A child's own pretty printer is asked for its children when opened.
    if (Record.Dynamic && Record.NumChild == 0)
      Child->SetNumChildren(1);
    try {
      Child->SetName(Record.Name, true);
    } catch (const std::logic_error&) {
      // Another inspector of the same variable object holds its children.
      return false;
    }
    FChildren[Slot] = Child;
  }
  return true;
}

void TGDBInspect::ListChildren(Integer Index) {
  TVarListChildrenResult Listed;
  if (FProcess.IsLLDB()) {
    // LLDB lists up to its own limit at once.
    if (!Evaluator().VarListChildren(FName, -1, -1, Listed)) {
      FillPlaceholders(Listed.FErrorMessage);
      return;
    }
    if (static_cast<Integer>(Listed.FChildren.size()) != FNumChildren)
      SetNumChildren(static_cast<Integer>(Listed.FChildren.size()));
    if (!StoreChildren(Listed.FChildren, 0))
      FillPlaceholders(InvalidInspector);
    return;
  }
  // A window from Index over the slots not listed yet, inside the range the
  // IDE shows: a million-element array costs a screenful.
  Integer End = std::min(FNumChildren, Index + TGDBEvaluator::ChildWindow);
  if (FRangeCount > 0 && Index >= FRangeStart && Index < FRangeStart + FRangeCount)
    End = std::min(End, FRangeStart + FRangeCount);
  const auto Next = FChildren.upper_bound(Index);
  if (Next != FChildren.end() && Next->first < End)
    End = Next->first;
  std::string Error;
  const bool Large = FNumChildren > TGDBEvaluator::ChildWindow && !FType.empty() && FType.back() == ']';
  if (Large) {
    if (ListSlice(Index, End, Error))
      return;
  } else {
    const bool Ok = Evaluator().VarListChildren(FName, Index, End, Listed);
    if (Ok && StoreChildren(Listed.FChildren, Index))
      return;
    Error = Ok ? std::string(InvalidInspector) : Listed.FErrorMessage;
  }
  for (Integer Slot = Index; Slot < End; ++Slot) {
    TIntfPtr<TGDBInspect>& Child = FChildren[Slot];
    if (Child)
      continue;
    Child = new TGDBInspect(FProcess, FThread, "?", 0);
    Child->FError = true;
    Child->FValueDefined = true;
    Child->FAutoDelete = false;
    Child->FLastError = Error;
  }
}

bool TGDBInspect::ListSlice(Integer From, Integer To, std::string& Error) {
  TVarCreateResult Slice;
  Evaluator().VarCreate("(" + GetFullExpr() + ")[" + std::to_string(From) + "]@" + std::to_string(To - From), 0,
                        Slice);
  if (Slice.FError) {
    Error = Slice.FErrorMessage;
    return false;
  }
  const auto Owner = std::make_shared<TVarObject>(Evaluator(), FProcessRef, Slice.FName);
  TVarListChildrenResult Listed;
  if (!Evaluator().VarListChildren(Slice.FName, -1, -1, Listed)) {
    Error = Listed.FErrorMessage;
    return false;
  }
  FSlices.push_back(Owner);
  if (StoreChildren(Listed.FChildren, From, Owner))
    return true;
  Error = InvalidInspector;
  return false;
}

void TGDBInspect::ListDynamicChildren() {
  FDynamic = false;
  TGDBVarChildArray All;
  // Windows until the printer has no more, never beyond a bound: an
  // uninitialised container may claim any number of elements.
  bool Failed = false;
  std::string Error;
  while (static_cast<Integer>(All.size()) < TGDBEvaluator::MaxDynamicChildren) {
    const Integer From = static_cast<Integer>(All.size());
    TVarListChildrenResult Listed;
    if (!Evaluator().VarListChildren(FName, From, From + TGDBEvaluator::ChildWindow, Listed)) {
      Failed = true;
      Error = Listed.FErrorMessage;
      break;
    }
    All.insert(All.end(), Listed.FChildren.begin(), Listed.FChildren.end());
    if (!Listed.FHasMore || Listed.FChildren.empty())
      break;
  }
  FChildren.clear();
  SetNumChildren(static_cast<Integer>(All.size()));
  if (Failed && All.empty()) {
    FLastError = Error;
    return;
  }
  if (!StoreChildren(All, 0)) {
    FillPlaceholders(InvalidInspector);
    return;
  }
  if (!FMapHint)
    return;
  // Key and value children in turn: one member per pair, named by its key.
  std::map<Integer, TIntfPtr<TGDBInspect>> Pairs;
  for (Integer Key = 0; Key + 1 < FNumChildren; Key += 2) {
    FChildren[Key]->FetchValueAndAttribute();
    FChildren[Key + 1]->FExpr = FChildren[Key]->FValue;
    Pairs[Key / 2] = FChildren[Key + 1];
  }
  FChildren = std::move(Pairs);
  FNumChildren = static_cast<Integer>(FChildren.size());
}

TIntfPtr<TGDBInspect> TGDBInspect::GetChildren(Integer Index) {
  if (FDynamic)
    ListDynamicChildren();
  if (Index < 0 || Index >= FNumChildren)
    return nullptr;
  if (!FChildren.contains(Index))
    ListChildren(Index);
  const auto Slot = FChildren.find(Index);
  if (Slot == FChildren.end() || !Slot->second)
    return nullptr;
  TIntfPtr<TGDBInspect> Child = Slot->second;
  if (Child->FName.empty() && !Child->FError) {
    SelectOwnFrame();
    Child->CreateVariableObject();
  }
  if (!Child->FValueDefined)
    Child->FetchValueAndAttribute();
  return Child;
}

void TGDBInspect::Adopt(const TVarCreateResult& Created) {
  FType = Created.FType;
  FValue = Created.FValue;
  FValueDefined = Created.FValueDefined;
  FEditable = Created.FEditable;
  FAutoDelete = false;
  SetName(Created.FName, false);
  FDynamic = Created.FDynamic;
  FMapHint = Created.FDisplayHint == "map";
  SetNumChildren(FDynamic && Created.FHasMore ? 1 : Created.FNumChild);
}

void TGDBInspect::CreateVariableObject() {
  TVarCreateResult Created;
  Evaluator().VarCreate(FExpr, 0, Created);
  FError = Created.FError;
  if (Created.FError) {
    FValueDefined = true;
    FLastError = Created.FErrorMessage;
    return;
  }
  Adopt(Created);
}

void TGDBInspect::FetchValueAndAttribute() {
  FValueDefined = true;
  TVarEvaluateExpressionResult Value;
  if (!Evaluator().VarEvaluateExpression(FName, Value)) {
    FError = true;
    FLastError = Value.FErrorMessage;
    return;
  }
  FValue = Value.FValue;
  TVarShowAttributesResult Attributes;
  if (!Evaluator().VarShowAttributes(FName, Attributes)) {
    FError = true;
    FLastError = Attributes.FErrorMessage;
    return;
  }
  FEditable = Attributes.FEditable;
}

TIntfPtr<IGDBInspect> TGDBInspect::CreateSubInspector(TInspectItem Item, Integer Index) {
  if (Item != iiVariable)
    return nullptr;
  return GetChildren(Index);
}

Integer TGDBInspect::GetMemberCount() {
  if (FDynamic)
    ListDynamicChildren();
  return FRangeCount != -1 ? FRangeCount : FNumChildren;
}

bool TGDBInspect::GetMember(Integer Index, std::string& Name, std::string& TypeName, std::string& Value,
                            UInt64& Address, TInspectFlags& Flags) {
  Name.clear();
  TypeName.clear();
  Value.clear();
  Address = 0;
  Flags = 0;
  if (Index < 0)
    return false;
  const TIntfPtr<TGDBInspect> Child = GetChildren(FRangeStart + Index);
  if (!Child)
    return false;
  Name = Child->FExpr;
  if (Child->FError) {
    Value = Child->FLastError;
    return false;
  }
  TypeName = Child->FType;
  Value = Child->FValue;
  Flags = InspectFlagBit(ifCanInspect);
  if (Child->FEditable)
    Flags |= InspectFlagBit(ifCanModify);
  return true;
}

std::string TGDBInspect::GetFullExpr() {
  if (FFullExprDefined)
    return FFullExpr;
  FFullExprDefined = true;
  FFullExpr = FExpr;
  if (FName.empty())
    return FFullExpr;
  // GDB cannot say it for a pretty printer's children: the expression
  // as listed stands in.
  TVarInfoPathExpressionResult Path;
  if (Evaluator().VarInfoPathExpression(FName, Path) && !Path.FExpr.empty())
    FFullExpr = Path.FExpr;
  return FFullExpr;
}

TInspectKind TGDBInspect::GetKind() {
  if (FError)
    return ikError;
  return FNumChildren == 0 ? ikScalar : ikObject;
}

TInspectFlags TGDBInspect::GetFlags() {
  TInspectFlags Flags = 0;
  if (FEditable)
    Flags |= InspectFlagBit(ifCanModify);
  if (FNumChildren > 0)
    Flags |= InspectFlagBit(ifCanInspect);
  return Flags;
}

void TGDBInspect::SetInspectRange(Integer Start, Integer Count) {
  if (FDynamic)
    ListDynamicChildren();
  Start = std::clamp(Start, 0, FNumChildren);
  // A negative count shows every child from Start on.
  if (Count < 0 || Count > FNumChildren - Start)
    Count = FNumChildren - Start;
  FRangeStart = Start;
  FRangeCount = Count;
}

bool TGDBInspect::Update() {
  if (FError)
    return false;
  // A locals view's child not opened yet has nothing to go stale.
  if (FName.empty())
    return true;
  TVarUpdateResult Changes;
  if (!Evaluator().VarUpdate(FName, Changes) || Changes.FOutOfScope) {
    // Say so rather than show the value the variable had.
    FError = true;
    FLastError = Changes.FOutOfScope ? OutOfScope : Changes.FErrorMessage;
    FValue.clear();
    return false;
  }
  for (const TNameValue& Change : Changes.FChangeList) {
    if (Change.Name == FName) {
      FValue = Change.Value;
      continue;
    }
    if (!FThread)
      continue;
    if (TGDBInspect* Changed = ThreadOf(FThread).GetInspect(Change.Name))
      Changed->SetValue(Change.Value);
  }
  for (const std::shared_ptr<TVarObject>& Slice : FSlices) {
    TVarUpdateResult SliceChanges;
    if (!Evaluator().VarUpdate(Slice->FName, SliceChanges))
      continue;
    for (const TNameValue& Change : SliceChanges.FChangeList)
      if (TGDBInspect* Changed = FThread ? ThreadOf(FThread).GetInspect(Change.Name) : nullptr)
        Changed->SetValue(Change.Value);
  }
  if (!FProcess.IsLLDB())
    return true;
  for (const auto& [Index, Child] : FChildren)
    if (Child && !Child->Update())
      return false;
  return true;
}

bool TGDBInspect::Refresh() {
  if (FAutoDelete)
    return false;
  return !Update();
}

// --- The locals view ----------------------------------------------------------

TGDBLocalInspect::TGDBLocalInspect(TGDBProcess& Process, const TIntfPtr<IGDBThread>& Thread, Integer Frame,
                                   Integer CallCount, Integer LocalCount, Integer NumChildren)
    : TGDBInspect(Process, Thread, "Local_and_Argument", NumChildren), FFrame(Frame), FCallCount(CallCount),
      FLocalCount(LocalCount) {
  FValueDefined = true;
}

std::string TGDBLocalInspect::FrameKey() {
  TGDBThread& Thread = ThreadOf(FThread);
  return std::to_string(Thread.GetCallCount()) + " " + FunctionOf(Thread.GetCallHeader(FFrame));
}

void TGDBLocalInspect::SelectOwnFrame() {
  if (!FThread)
    return;
  TGDBThread& Thread = ThreadOf(FThread);
  Thread.SetAsSuspendedThread();
  Thread.SelectFrame(FFrame);
}

void TGDBLocalInspect::Reset(Integer CallCount, const TStringArray& Params, const TStringArray& Locals) {
  FError = false;
  FLastError.clear();
  FCallCount = CallCount;
  FLocalCount = static_cast<Integer>(Locals.size());
  FChildren.clear();
  SetNumChildren(static_cast<Integer>(Params.size() + Locals.size()));
  Integer Slot = 0;
  for (const TStringArray* Names : {&Params, &Locals})
    for (const std::string& Name : *Names)
      FChildren[Slot++] = new TGDBInspect(FProcess, FThread, Name, 0);
  FFrameKey = FrameKey();
}

void TGDBLocalInspect::SetError(const std::string& Error) {
  FChildren.clear();
  SetNumChildren(0);
  FError = true;
  FLastError = Error;
}

bool TGDBLocalInspect::Refresh() {
  if (!FThread)
    return false;
  SelectOwnFrame();
  TGDBThread& Thread = ThreadOf(FThread);
  bool Rebuild = Thread.GetCallCount() != FCallCount || Evaluator().GetLocalVarsCount() != FLocalCount ||
                 FrameKey() != FFrameKey;
  for (auto Child = FChildren.begin(); !Rebuild && Child != FChildren.end(); ++Child)
    Rebuild = Child->second && !Child->second->Update();
  if (!Rebuild)
    return false;
  FChildren.clear();
  SelectOwnFrame();
  Evaluator().CreateLocalVarsInspector(FThread, FFrame, Thread.GetCallCount(), Thread.GetCallParams(FFrame), this);
  return FError;
}

} // namespace midebug
