#include "inspect/gdbevaluator.h"

#include "inspect/gdbinspect.h"
#include "process/gdbprocess.h"

#include <cctype>

namespace midebug {

namespace {

/// The variable-object format a one-letter display format names; false for
/// a letter GDB has no such format for.
bool FormatOfSuffix(const std::string& Suffix, TDataValueFormat& Format) {
  if (Suffix == "x" || Suffix == "h")
    Format = dvfHex;
  else if (Suffix == "d")
    Format = dvfDecimal;
  else if (Suffix == "o")
    Format = dvfOctal;
  else if (Suffix == "t" || Suffix == "b")
    Format = dvfBinary;
  else if (Suffix == "r" || Suffix == "n")
    Format = dvfNatural;
  else
    return false;
  return true;
}

/// A Pascal name path (letters, digits, "_", ".", indexes) in capitals; any
/// other expression unchanged.
std::string PascalCapitals(const std::string& Expr) {
  std::string Capitals = Expr;
  for (char& Character : Capitals) {
    const unsigned char Byte = static_cast<unsigned char>(Character);
    if (!std::isalnum(Byte) && Character != '_' && Character != '.' && Character != '[' && Character != ']')
      return Expr;
    Character = static_cast<char>(std::toupper(Byte));
  }
  return Capitals;
}

/// The text a failed request leaves: the debugger's message, or why no
/// answer came.
std::string ErrorText(const TGDBResult& Result) {
  return Result.FErrorMessage.empty() ? std::string("no answer from the debugger") : Result.FErrorMessage;
}

} // namespace

class TGDBEvaluator::TEvaluatingScope {
public:
  explicit TEvaluatingScope(std::atomic<bool>& Flag) : FFlag(Flag), FBefore(Flag.exchange(true)) {}
  ~TEvaluatingScope() { FFlag = FBefore; }
  TEvaluatingScope(const TEvaluatingScope&) = delete;
  TEvaluatingScope& operator=(const TEvaluatingScope&) = delete;

private:
  std::atomic<bool>& FFlag;
  const bool FBefore;
};

/// GDB dies printing the type of a Pascal array, and every command that
/// names a variable object's type prints it: a Pascal program's objects are
/// made and listed with the language set to C.
class TGDBEvaluator::TCLanguageScope {
public:
  explicit TCLanguageScope(TGDBEvaluator& Evaluator) : FEvaluator(Evaluator), FActive(Evaluator.PascalOnGDB()) {
    if (FActive)
      FEvaluator.FProcess.Requests().Fire(&TGDBCommand::CreateGDBSetCommand, "language", "c");
  }
  ~TCLanguageScope() {
    if (FActive)
      FEvaluator.FProcess.Requests().Fire(&TGDBCommand::CreateGDBSetCommand, "language", "auto");
  }
  TCLanguageScope(const TCLanguageScope&) = delete;
  TCLanguageScope& operator=(const TCLanguageScope&) = delete;

private:
  TGDBEvaluator& FEvaluator;
  const bool FActive;
};

bool TGDBEvaluator::PascalOnGDB() { return !FProcess.IsLLDB() && FProcess.GetEvaluator() == glPascal; }

TGDBEvaluator::TGDBEvaluator(TGDBProcess& Process, std::atomic<bool>& Evaluating,
                             const std::atomic<Integer>& MaxChildrenCount)
    : FProcess(Process), FEvaluating(Evaluating), FMaxChildrenCount(MaxChildrenCount) {}

std::string TGDBEvaluator::GetUniqueVarName() { return "var" + std::to_string(++FVarCreateId); }

bool TGDBEvaluator::Quoted() { return !FProcess.IsLLDB() || FProcess.IsWindows(); }

void TGDBEvaluator::Prepare() {
  std::call_once(FPrepared, [this] {
    if (FProcess.IsLLDB())
      return;
    // A function called by an expression that faults would leave the
    // program stopped inside the call: GDB puts it back where it was.
    FProcess.Requests().Fire(&TGDBCommand::CreateGDBSetCommand, "unwindonsignal", "on");
    FProcess.Requests().Fire(&TGDBCommand::CreateEnablePrettyPrintingCommand);
  });
}

void TGDBEvaluator::VarCreate(const std::string& Expr, UInt64 Address, TVarCreateResult& Created) {
  Prepare();
  TEvaluatingScope Evaluating(FEvaluating);
  const bool AsC = PascalOnGDB();
  const TCLanguageScope InC(*this);
  auto Create = [&](const std::string& Sent, TVarCreateResult& Result) {
    return FProcess.Requests().Ask(Result, [&](TGDBCommand& Command, std::string& Token) {
      return Command.CreateVarCreateCommand(Token, GetUniqueVarName(), Sent, Address);
    });
  };
  Create(Expr, Created);
  // C matches names by case; Free Pascal's default debug format writes
  // them in capitals.
  const std::string Capitals = PascalCapitals(Expr);
  TVarCreateResult Retry;
  if (AsC && Created.FError && !Created.FTimeOut && Capitals != Expr && Create(Capitals, Retry)) {
    Created.FError = false;
    Created.FErrorMessage.clear();
    Created.FName = Retry.FName;
    Created.FNumChild = Retry.FNumChild;
    Created.FType = Retry.FType;
    Created.FValue = Retry.FValue;
    Created.FValueDefined = Retry.FValueDefined;
  }
  if (!Created.FError && !Created.FAvailable) {
    Created.FError = true;
    Created.SetErrorMessage(ErrorText(Created));
  }
  if (!Created.FError && !Created.FValueDefined) {
    TVarEvaluateExpressionResult Value;
    if (!VarEvaluateExpression(Created.FName, Value)) {
      Created.FError = true;
      Created.SetErrorMessage(ErrorText(Value));
    } else {
      Created.FValue = Value.FValue;
      Created.FValueDefined = true;
    }
  }
  if (!Created.FError) {
    TVarShowAttributesResult Attributes;
    if (!VarShowAttributes(Created.FName, Attributes)) {
      Created.FError = true;
      Created.SetErrorMessage(ErrorText(Attributes));
    } else {
      Created.FEditable = Attributes.FEditable;
    }
  }
  if (Created.FError && !Created.FName.empty())
    VarDelete(Created.FName);
}

void TGDBEvaluator::VarDelete(const std::string& Name) {
  if (!Name.empty())
    FProcess.Requests().Fire(&TGDBCommand::CreateVarDeleteCommand, Name, false, Quoted());
}

bool TGDBEvaluator::VarListChildren(const std::string& Name, Integer From, Integer To,
                                    TVarListChildrenResult& Children) {
  TEvaluatingScope Evaluating(FEvaluating);
  const TCLanguageScope InC(*this);
  if (From < 0)
    return FProcess.Requests().Ask(Children, [&](TGDBCommand& Command, std::string& Token) {
      return Command.CreateVarListChildrenCommand(Token, Name, FProcess.IsLLDB(), Quoted(), pvfNoValues);
    });
  return FProcess.Requests().Ask(Children, [&](TGDBCommand& Command, std::string& Token) {
    return Command.CreateVarListChildrenCommand(Token, Name, From, To, Quoted(), pvfNoValues);
  });
}

bool TGDBEvaluator::VarInfoPathExpression(const std::string& Name, TVarInfoPathExpressionResult& Path) {
  return FProcess.Requests().Ask(Path, &TGDBCommand::CreateVarInfoPathExpressionCommand, Name, Quoted());
}

bool TGDBEvaluator::VarShowAttributes(const std::string& Name, TVarShowAttributesResult& Attributes) {
  return FProcess.Requests().Ask(Attributes, &TGDBCommand::CreateVarShowAttributesCommand, Name, Quoted());
}

bool TGDBEvaluator::VarEvaluateExpression(const std::string& Name, TVarEvaluateExpressionResult& Value) {
  return FProcess.Requests().Ask(Value, &TGDBCommand::CreateVarEvaluateExpressionCommand, Name, Quoted(), dvfRaw);
}

bool TGDBEvaluator::VarAssign(const std::string& Name, const std::string& TypeName, const std::string& Value,
                              TVarAssignResult& Assigned) {
  TEvaluatingScope Evaluating(FEvaluating);
  return FProcess.Requests().Ask(Assigned, &TGDBCommand::CreateVarAssignCommand, Name, TypeName, Value,
                                 FProcess.IsLLDB(), Quoted());
}

bool TGDBEvaluator::VarUpdate(const std::string& Name, TVarUpdateResult& Update) {
  TEvaluatingScope Evaluating(FEvaluating);
  const TCLanguageScope InC(*this);
  return FProcess.Requests().Ask(Update, &TGDBCommand::CreateVarUpdateCommand, Name, pvfAllValues, Quoted());
}

TGDBRetCode TGDBEvaluator::EvaluateError(std::string& Value, bool& CanModify, std::string& TypeName,
                                         const std::string& Reason) {
  Value = Reason;
  CanModify = false;
  TypeName.clear();
  return ercError;
}

TGDBRetCode TGDBEvaluator::Evaluate(const std::string& Expr, const std::string& Suffix, UInt64 Address,
                                    std::string& Value, bool& CanModify, std::string& TypeName) {
  EvaluateError(Value, CanModify, TypeName);
  if (FEvaluating)
    return ercBusy;
  {
    std::string Previous;
    {
      std::lock_guard Guard(FLock);
      Previous.swap(FEvalVarName);
    }
    VarDelete(Previous);
  }
  TEvaluatingScope Evaluating(FEvaluating);
  const bool LLDB = FProcess.IsLLDB();
  // In GDB's C "v,x" is a comma expression: the format is the variable
  // object's instead.
  TDataValueFormat Format = dvfNatural;
  if (!LLDB && !Suffix.empty() && Suffix != "c" && !FormatOfSuffix(Suffix, Format))
    return EvaluateError(Value, CanModify, TypeName, "Unknown display format '" + Suffix + "'");
  std::string Sent = Expr;
  if (LLDB && !Suffix.empty())
    Sent += "," + Suffix;
  else if (Suffix == "c")
    Sent = FProcess.GetEvaluator() == glPascal ? "Chr(" + Expr + ")" : "(char)(" + Expr + ")";
  if (LLDB)
    FProcess.Requests().Fire(&TGDBCommand::CreateCLSettingsSetCommand, "target.max-children-count", "100");
  TVarCreateResult Created;
  VarCreate(Sent, Address, Created);
  if (LLDB && FMaxChildrenCount != -1)
    FProcess.Requests().Fire(&TGDBCommand::CreateCLSettingsSetCommand, "target.max-children-count",
                             std::to_string(FMaxChildrenCount));
  // An empty value without children is what GDB gives a call that faulted
  // (GDB put the program back): the fallback below says why.
  const bool Empty = !Created.FError && Created.FValue.empty() && Created.FNumChild == 0 && !Created.FDynamic;
  if (!Created.FError && !Empty) {
    // The format's answer carries the value in it, read as an evaluation's.
    TVarEvaluateExpressionResult Formatted;
    if (Format != dvfNatural &&
        FProcess.Requests().Ask(Formatted, &TGDBCommand::CreateVarSetFormatCommand, Created.FName, Format, Quoted()))
      Created.FValue = Formatted.FValue;
    // The object was read as C; the value is shown as Pascal writes it
    // (strings, sets, arrays), which evaluating alone does safely.
    TDataEvaluateExpressionResult AsPascal;
    if (PascalOnGDB() && Format == dvfNatural && Suffix.empty() &&
        FProcess.Requests().Ask(AsPascal, &TGDBCommand::CreateDataEvaluateExpressionCommand, Sent))
      Created.FValue = AsPascal.FValue;
    {
      std::lock_guard Guard(FLock);
      FEvalVarName = Created.FName;
      FEvalVarType = Created.FType;
    }
    Value = Created.FValue;
    TypeName = Created.FType;
    CanModify = Created.FEditable;
    return ercOk;
  }
  if (Empty)
    VarDelete(Created.FName);
  if (Created.FTimeOut)
    return EvaluateError(Value, CanModify, TypeName, ErrorText(Created));
  TDataEvaluateExpressionResult Evaluated;
  if (!FProcess.Requests().Ask(Evaluated, &TGDBCommand::CreateDataEvaluateExpressionCommand, Sent))
    return EvaluateError(Value, CanModify, TypeName, ErrorText(Evaluated));
  Value = Evaluated.FValue;
  return ercOk;
}

TGDBRetCode TGDBEvaluator::Modify(const std::string& NewValue, std::string& Value) {
  Value.clear();
  std::string Name, Type;
  {
    std::lock_guard Guard(FLock);
    Name = FEvalVarName;
    Type = FEvalVarType;
  }
  if (Name.empty())
    return ercError;
  TVarAssignResult Assigned;
  if (!VarAssign(Name, Type, NewValue, Assigned)) {
    Value = ErrorText(Assigned);
    return ercError;
  }
  Value = Assigned.FValue;
  return ercOk;
}

TIntfPtr<IGDBInspect> TGDBEvaluator::CreateLocalVarsInspector(const TIntfPtr<IGDBThread>& Thread, Integer Frame,
                                                              Integer CallCount, const TStringArray& Params,
                                                              TGDBLocalInspect* Existing) {
  TStackListLocalsResult Locals;
  const bool Listed = FProcess.Requests().Ask(Locals, &TGDBCommand::CreateStackListLocalsCommand, pvfNoValues);
  const Integer Count = static_cast<Integer>(Locals.FStackLocals.size());
  TIntfPtr<TGDBLocalInspect> Inspector(Existing);
  if (!Inspector)
    Inspector = new TGDBLocalInspect(FProcess, Thread, Frame, CallCount, Count, Count);
  if (!Listed)
    Inspector->SetError(ErrorText(Locals));
  else
    Inspector->Reset(CallCount, Params, Locals.FStackLocals);
  return Inspector;
}

Integer TGDBEvaluator::GetLocalVarsCount() {
  TStackListLocalsResult Locals;
  if (!FProcess.Requests().Ask(Locals, &TGDBCommand::CreateStackListLocalsCommand, pvfNoValues))
    return 0;
  return static_cast<Integer>(Locals.FStackLocals.size());
}

} // namespace midebug
