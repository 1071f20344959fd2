// The adapter's values: scopes of a frame, variables paged through the
// library's inspectors, evaluation and assignment.

#include "dapaddress.h"
#include "dapsession.h"

#include <sstream>

namespace midebug::dap {

namespace {

/// The arguments a call header "name (a=1, b=2)" lists.
Integer ArgumentCount(const std::string& Header) {
  const size_t Open = Header.find('(');
  if (Open == std::string::npos)
    return 0;
  Integer Count = 0;
  int Depth = 0;
  bool Any = false;
  for (size_t Index = Open + 1; Index < Header.size(); ++Index) {
    const char Char = Header[Index];
    if (Char == '(' || Char == '[' || Char == '{')
      ++Depth;
    else if ((Char == ')' || Char == ']' || Char == '}') && Depth-- == 0)
      break;
    else if (Char == ',' && Depth == 0)
      ++Count;
    else if (Char != ' ')
      Any = true;
  }
  return Any ? Count + 1 : 0;
}

/// A decimal whole number shown in hexadecimal; anything else as it is.
std::string InHex(const std::string& Value) {
  const bool Negative = !Value.empty() && Value.front() == '-';
  const std::string Digits = Negative ? Value.substr(1) : Value;
  if (Digits.empty() || Digits.size() > 19 || Digits.find_first_not_of("0123456789") != std::string::npos)
    return Value;
  std::ostringstream Stream;
  Stream << (Negative ? "-0x" : "0x") << std::hex << std::stoull(Digits);
  return Stream.str();
}

bool WantsHex(TDapArguments& Arguments) {
  const nlohmann::json* Format = Arguments.Object("format");
  if (!Format)
    return false;
  const auto Hex = Format->find("hex");
  return Hex != Format->end() && Hex->is_boolean() && Hex->get<bool>();
}

} // namespace

Integer TDapSession::VariablesHandle(TVariablesRef Ref) {
  FVariables.push_back(std::move(Ref));
  return static_cast<Integer>(FVariables.size());
}

TIntfPtr<IGDBThread> TDapSession::FrameThread(TDapArguments& Arguments, Integer& Frame, TDapReply& Refusal,
                                              bool Optional) {
  const auto FrameId = Arguments.Number("frameId", 0, 0x7fffffff);
  if (!Arguments.Problem().empty() || (!FrameId && !Optional)) {
    Refusal = TDapReply::Refuse(Arguments.Problem().empty() ? "'frameId' is missing" : Arguments.Problem());
    return nullptr;
  }
  if (!FProcess || FState != TProgramState::Stopped) {
    Refusal = TDapReply::Refuse(NotStoppedReason());
    return nullptr;
  }
  Integer ThreadId = FProcess->GetSuspendedThreadId();
  Frame = 1;
  if (FrameId) {
    if (*FrameId < 1 || static_cast<size_t>(*FrameId) > FFrames.size()) {
      Refusal = TDapReply::Refuse("there is no frame " + std::to_string(*FrameId) + " since the last stop");
      return nullptr;
    }
    ThreadId = FFrames[static_cast<size_t>(*FrameId - 1)].first;
    Frame = FFrames[static_cast<size_t>(*FrameId - 1)].second + 1;
  }
  TIntfPtr<IGDBThread> Thread = FProcess->GetThread(ThreadId);
  if (!Thread || Thread->GetId() != ThreadId) {
    Refusal = TDapReply::Refuse("there is no thread " + std::to_string(ThreadId));
    return nullptr;
  }
  return Thread;
}

void TDapSession::DescribeChildren(const TIntfPtr<IGDBInspect>& Inspect, const TIntfPtr<IGDBThread>& Thread,
                                   Integer Frame, const std::string& Type, nlohmann::json& Entry) {
  Entry["variablesReference"] = 0;
  if (!Inspect || Inspect->HasError() || Inspect->GetKind() != ikObject)
    return;
  const Integer Count = Inspect->GetMemberCount();
  if (Count <= 0)
    return;
  TVariablesRef Ref;
  Ref.Inspect = Inspect;
  Ref.Thread = Thread;
  Ref.Frame = Frame;
  Ref.Total = Count;
  Entry["variablesReference"] = VariablesHandle(std::move(Ref));
  // An array is paged by index; a structure's members come whole.
  if (Type.find('[') != std::string::npos || Type.starts_with("array"))
    Entry["indexedVariables"] = Count;
  else
    Entry["namedVariables"] = Count;
}

TDapReply TDapSession::Scopes(TDapArguments& Arguments) {
  TDapReply Refusal;
  Integer Frame = 1;
  TIntfPtr<IGDBThread> Thread = FrameThread(Arguments, Frame, Refusal, false);
  if (!Thread)
    return Refusal;
  const TIntfPtr<IGDBInspect> Locals = Thread->CreateLocalVarsInspector(Frame);
  if (!Locals || Locals->HasError())
    return TDapReply::Refuse(Locals ? Locals->GetLastError() : "the frame has no variables view");
  // The view holds the arguments first, then the locals.
  const Integer Count = Locals->GetMemberCount();
  const Integer Arguments0 = std::min(ArgumentCount(Thread->GetCallHeader(Frame)), Count);
  auto Scope = [&](const char* Name, const char* Hint, Integer From, Integer To) {
    TVariablesRef Ref;
    Ref.Inspect = Locals;
    Ref.Thread = Thread;
    Ref.Frame = Frame;
    Ref.From = From;
    Ref.Total = To - From;
    Ref.Scope = true;
    return nlohmann::json{{"name", Name},
                          {"presentationHint", Hint},
                          {"namedVariables", To - From},
                          {"expensive", false},
                          {"variablesReference", VariablesHandle(std::move(Ref))}};
  };
  TVariablesRef Registers;
  Registers.Thread = Thread;
  Registers.Frame = Frame;
  Registers.Registers = true;
  Registers.Total = static_cast<Integer>(GeneralRegisterTable(Thread->GetCPUType(), "Linux64").Registers.size());
  const Integer RegisterCount = Registers.Total;
  return TDapReply::Ok({{"scopes",
                         {Scope("Locals", "locals", Arguments0, Count),
                          Scope("Arguments", "arguments", 0, Arguments0),
                          {{"name", "Registers"},
                           {"presentationHint", "registers"},
                           {"namedVariables", RegisterCount},
                           {"expensive", true},
                           {"variablesReference", VariablesHandle(std::move(Registers))}}}}});
}

TDapReply TDapSession::Variables(TDapArguments& Arguments) {
  const auto Reference = Arguments.Number("variablesReference", 0, 0x7fffffff);
  const auto Start = Arguments.Number("start", 0, 0x7fffffff);
  const auto Count = Arguments.Number("count", 0, 0x7fffffff);
  const bool Hex = WantsHex(Arguments);
  if (!Arguments.Problem().empty() || !Reference)
    return TDapReply::Refuse(Arguments.Problem().empty() ? "'variablesReference' is missing" : Arguments.Problem());
  if (FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  if (*Reference < 1 || static_cast<size_t>(*Reference) > FVariables.size())
    return TDapReply::Refuse("there is no variables reference " + std::to_string(*Reference) + " since the last stop");
  // Copied: new references may grow the list.
  const TVariablesRef Ref = FVariables[static_cast<size_t>(*Reference - 1)];
  const Integer First = static_cast<Integer>(std::min<long long>(Start.value_or(0), Ref.Total));
  const Integer Wanted =
      static_cast<Integer>(std::min<long long>(Count && *Count > 0 ? *Count : Ref.Total, Ref.Total - First));
  nlohmann::json List = nlohmann::json::array();
  std::map<std::string, std::string> Expressions;
  if (Wanted > 0 && Ref.Registers) {
    // The innermost frame's registers: the thread's own.
    const TRegisterTable Table = GeneralRegisterTable(Ref.Thread->GetCPUType(), "Linux64");
    TUInt64Array Values;
    UInt64 PC = 0;
    if (!Ref.Thread->GetRegisters(Values, PC))
      return TDapReply::Refuse("the registers cannot be read");
    for (Integer Index = First; Index < First + Wanted && static_cast<size_t>(Index) < Values.size() &&
                                static_cast<size_t>(Index) < Table.Registers.size();
         ++Index) {
      const std::string Name(Table.Registers[static_cast<size_t>(Index)]);
      std::ostringstream Value;
      Value << "0x" << std::hex << Values[static_cast<size_t>(Index)];
      List.push_back({{"name", Name}, {"value", Value.str()}, {"evaluateName", "$" + Name}, {"variablesReference", 0}});
      Expressions[Name] = "$" + Name;
    }
  } else if (Wanted > 0) {
    // The locals view is listed whole; other values through a window.
    Integer Base = Ref.From + First;
    const bool Locals = Ref.Scope;
    if (!Locals) {
      Ref.Inspect->SetInspectRange(First, Wanted);
      Base = First - Ref.Inspect->GetInspectRangeStart();
    }
    for (Integer Index = 0; Index < Wanted; ++Index) {
      std::string Name, TypeName, Value;
      UInt64 Address = 0;
      TInspectFlags Flags = 0;
      const Integer Slot = Base + Index;
      if (!Ref.Inspect->GetMember(Slot, Name, TypeName, Value, Address, Flags) && Value.empty())
        Value = "<unavailable>";
      const TIntfPtr<IGDBInspect> Child =
          Ref.Inspect->CreateSubInspector(iiVariable, (Locals ? 0 : Ref.Inspect->GetInspectRangeStart()) + Slot);
      nlohmann::json Entry = {{"name", Name}, {"value", Hex ? InHex(Value) : Value}, {"type", TypeName}};
      if (const auto Target = PointerTarget(TypeName, Value); Target && FClientHasMemoryViews)
        Entry["memoryReference"] = HexAddress(*Target);
      const std::string Full = Child ? Child->GetFullExpr() : std::string();
      if (!Full.empty())
        Entry["evaluateName"] = Full;
      Expressions[Name] = Full.empty() ? Name : Full;
      DescribeChildren(Child, Ref.Thread, Ref.Frame, TypeName, Entry);
      List.push_back(std::move(Entry));
    }
  }
  FVariables[static_cast<size_t>(*Reference - 1)].Expressions.merge(Expressions);
  return TDapReply::Ok({{"variables", List}});
}

TDapReply TDapSession::Assign(const TIntfPtr<IGDBThread>& Thread, Integer Frame, const std::string& Expr,
                              const std::string& Value, bool Hex) {
  // Asked first: the assignment goes to the last value evaluated. A value
  // without an address (a register variable) changes no memory.
  std::string NoMemory;
  const auto Storage = FindStorage(*Thread, Frame, Expr, NoMemory);
  std::string Old, TypeName, New;
  bool CanModify = false;
  if (Thread->Evaluate(Expr, "", Frame, Old, CanModify, TypeName) != ercOk)
    return TDapReply::Refuse(Old.empty() ? "cannot evaluate " + Expr : Old);
  if (!CanModify)
    return TDapReply::Refuse(Expr + " cannot be changed");
  if (Thread->Modify(Value, New) != ercOk)
    return TDapReply::Refuse(New.empty() ? "cannot assign " + Value + " to " + Expr : New);
  if (Storage)
    FPendingMemoryEvent = Storage;
  return TDapReply::Ok({{"value", Hex ? InHex(New) : New}, {"type", TypeName}});
}

TDapReply TDapSession::SetVariable(TDapArguments& Arguments) {
  const auto Reference = Arguments.Number("variablesReference", 0, 0x7fffffff);
  const auto Name = Arguments.String("name");
  const auto Value = Arguments.String("value");
  const bool Hex = WantsHex(Arguments);
  if (!Arguments.Problem().empty() || !Reference || !Name || !Value)
    return TDapReply::Refuse(Arguments.Problem().empty() ? "setVariable needs 'variablesReference', 'name', 'value'"
                                                         : Arguments.Problem());
  if (FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  if (*Reference < 1 || static_cast<size_t>(*Reference) > FVariables.size())
    return TDapReply::Refuse("there is no variables reference " + std::to_string(*Reference) + " since the last stop");
  const TVariablesRef Ref = FVariables[static_cast<size_t>(*Reference - 1)];
  const auto Found = Ref.Expressions.find(*Name);
  if (Found == Ref.Expressions.end())
    return TDapReply::Refuse("no variable '" + *Name + "' has been listed there");
  TDapReply Reply = Assign(Ref.Thread, Ref.Frame, Found->second, *Value, Hex);
  return Reply;
}

TDapReply TDapSession::SetExpression(TDapArguments& Arguments) {
  const auto Expression = Arguments.String("expression");
  const auto Value = Arguments.String("value");
  const bool Hex = WantsHex(Arguments);
  if (!Arguments.Problem().empty() || !Expression || !Value)
    return TDapReply::Refuse(Arguments.Problem().empty() ? "setExpression needs 'expression' and 'value'"
                                                         : Arguments.Problem());
  TDapReply Refusal;
  Integer Frame = 1;
  TIntfPtr<IGDBThread> Thread = FrameThread(Arguments, Frame, Refusal, true);
  if (!Thread)
    return Refusal;
  return Assign(Thread, Frame, *Expression, *Value, Hex);
}

TDapReply TDapSession::Evaluate(TDapArguments& Arguments) {
  const auto Expression = Arguments.String("expression");
  const bool Hex = WantsHex(Arguments);
  if (!Arguments.Problem().empty() || !Expression || Expression->empty())
    return TDapReply::Refuse(Arguments.Problem().empty() ? "evaluate needs an 'expression'" : Arguments.Problem());
  TDapReply Refusal;
  Integer Frame = 1;
  TIntfPtr<IGDBThread> Thread = FrameThread(Arguments, Frame, Refusal, true);
  if (!Thread)
    return Refusal;
  std::string Value, TypeName;
  bool CanModify = false;
  if (Thread->Evaluate(*Expression, Hex ? "x" : "", Frame, Value, CanModify, TypeName) != ercOk)
    return TDapReply::Refuse(Value.empty() ? "cannot evaluate " + *Expression : Value);
  nlohmann::json Body = {{"result", Value}, {"type", TypeName}, {"variablesReference", 0}};
  if (const auto Target = PointerTarget(TypeName, Value); Target && FClientHasMemoryViews)
    Body["memoryReference"] = HexAddress(*Target);
  // A value with members gets an inspector; a hover of a plain value needs
  // none.
  const bool Composite = Value.starts_with("{") || TypeName.find('[') != std::string::npos ||
                         TypeName.find('*') != std::string::npos || TypeName.starts_with("struct") ||
                         TypeName.starts_with("class") || TypeName.starts_with("union");
  if (Composite)
    DescribeChildren(Thread->CreateInspector(*Expression, Frame), Thread, Frame, TypeName, Body);
  return TDapReply::Ok(std::move(Body));
}

} // namespace midebug::dap
