// The commands that read and change values: print, set var, info locals and
// info args, inspect and display.

#include "session.h"

#include <string>
#include <vector>

namespace midebug::cli {

namespace {

/// The words from First on, joined by single blanks.
std::string Joined(const std::vector<std::string>& Words, size_t First) {
  std::string Text;
  for (size_t Index = First; Index < Words.size(); ++Index)
    Text += (Text.empty() ? "" : " ") + Words[Index];
  return Text;
}

bool ParseCount(const std::string& Text, Integer& Value) {
  if (Text.empty() || Text.size() > 9 || Text.find_first_not_of("0123456789") != std::string::npos)
    return false;
  Value = std::stoi(Text);
  return true;
}

/// The assignment's "=" in "EXPRESSION = VALUE": not part of ==, <=, >= or !=.
size_t AssignmentAt(const std::string& Text) {
  for (size_t At = 0; At < Text.size(); ++At) {
    if (Text[At] != '=')
      continue;
    const bool Before = At > 0 && std::string("=<>!").find(Text[At - 1]) != std::string::npos;
    const bool After = At + 1 < Text.size() && Text[At + 1] == '=';
    if (!Before && !After)
      return At;
    if (After)
      ++At;
  }
  return std::string::npos;
}

std::string Trimmed(const std::string& Text) {
  const size_t First = Text.find_first_not_of(' ');
  if (First == std::string::npos)
    return {};
  return Text.substr(First, Text.find_last_not_of(' ') - First + 1);
}

/// How many of a frame's values are its arguments: the names (C and C++) or
/// values (Pascal) between the outer parentheses of its header.
size_t ArgumentCount(const std::string& Header) {
  const size_t Open = Header.find('(');
  const size_t Close = Header.rfind(')');
  if (Open == std::string::npos || Close == std::string::npos || Close <= Open + 1)
    return 0;
  size_t Count = 1;
  int Depth = 0;
  bool Quoted = false;
  for (size_t At = Open + 1; At < Close; ++At) {
    const char Character = Header[At];
    if (Character == '"' || Character == '\'')
      Quoted = !Quoted;
    else if (!Quoted && (Character == '(' || Character == '{' || Character == '['))
      ++Depth;
    else if (!Quoted && (Character == ')' || Character == '}' || Character == ']'))
      --Depth;
    else if (!Quoted && Depth == 0 && Character == ',')
      ++Count;
  }
  return Count;
}

} // namespace

void TCliSession::CmdPrint(const std::string& Name, const std::vector<std::string>& Arguments) {
  const std::string Expr = Joined(Arguments, 0);
  if (Expr.empty()) {
    FOutput.Error(Name, "usage: print[/x|/d|/c] EXPRESSION");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const std::string Format = Name.size() > 6 ? Name.substr(6) : std::string();
  std::string Value, TypeName;
  bool CanModify = false;
  if (Thread->Evaluate(Expr, Format, FCurrentFrame + 1, Value, CanModify, TypeName) != ercOk) {
    FOutput.Error(Name, Value.empty() ? "cannot evaluate " + Expr : Value);
    return;
  }
  FOutput.Emit({{"answer", "print"}, {"expression", Expr}, {"value", Value}, {"type", TypeName}},
               Expr + " = " + Value);
}

void TCliSession::CmdSetVar(const std::string& Name, const std::vector<std::string>& Arguments) {
  const std::string Text = Joined(Arguments, 0);
  const size_t Assignment = AssignmentAt(Text);
  if (Assignment == std::string::npos) {
    FOutput.Error(Name, "usage: set var EXPRESSION = VALUE");
    return;
  }
  const std::string Expr = Trimmed(Text.substr(0, Assignment));
  const std::string NewValue = Trimmed(Text.substr(Assignment + 1));
  if (Expr.empty() || NewValue.empty()) {
    FOutput.Error(Name, "usage: set var EXPRESSION = VALUE");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  std::string Value, TypeName;
  bool CanModify = false;
  if (Thread->Evaluate(Expr, "", FCurrentFrame + 1, Value, CanModify, TypeName) != ercOk) {
    FOutput.Error(Name, Value);
    return;
  }
  if (Thread->Modify(NewValue, Value) != ercOk) {
    FOutput.Error(Name, Value.empty() ? Expr + " cannot be assigned" : Value);
    return;
  }
  FOutput.Emit({{"answer", "set var"}, {"expression", Expr}, {"value", Value}}, Expr + " = " + Value);
}

void TCliSession::CmdInfoValues(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const TIntfPtr<IGDBInspect> Locals = Thread->CreateLocalVarsInspector(FCurrentFrame + 1);
  if (!Locals || Locals->HasError()) {
    FOutput.Error(Name, Locals ? Locals->GetLastError() : "no locals view");
    return;
  }
  // The view holds the arguments first, then the locals.
  const Integer Count = Locals->GetMemberCount();
  const Integer Arguments0 =
      std::min(static_cast<Integer>(ArgumentCount(Thread->GetCallHeader(FCurrentFrame + 1))), Count);
  const bool WantArguments = Name == "info args";
  nlohmann::json Variables = nlohmann::json::array();
  std::string Text;
  for (Integer Index = WantArguments ? 0 : Arguments0; Index < (WantArguments ? Arguments0 : Count); ++Index) {
    std::string Member, TypeName, Value;
    UInt64 Address = 0;
    TInspectFlags Flags = 0;
    Locals->GetMember(Index, Member, TypeName, Value, Address, Flags);
    Variables.push_back({{"name", Member}, {"type", TypeName}, {"value", Value}});
    Text += (Text.empty() ? "" : "\n") + Member + " = " + Value;
  }
  FOutput.Emit({{"answer", Name}, {"variables", Variables}},
               Text.empty() ? (WantArguments ? "No arguments." : "No locals.") : Text);
}

void TCliSession::CmdInspect(const std::string& Name, const std::vector<std::string>& Arguments) {
  Integer From = 0;
  Integer Count = -1;
  size_t ExprWords = Arguments.size();
  if (Arguments.size() >= 3 && ParseCount(Arguments[Arguments.size() - 2], From) &&
      ParseCount(Arguments.back(), Count))
    ExprWords -= 2;
  const std::string Expr = Joined(std::vector<std::string>(Arguments.begin(), Arguments.begin() + ExprWords), 0);
  if (Expr.empty()) {
    FOutput.Error(Name, "usage: inspect EXPRESSION [FROM COUNT]");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const TIntfPtr<IGDBInspect> Inspector = Thread->CreateInspector(Expr, FCurrentFrame + 1);
  if (!Inspector || Inspector->HasError()) {
    FOutput.Error(Name, Inspector ? Inspector->GetLastError() : "cannot inspect " + Expr);
    return;
  }
  const Integer Total = Inspector->GetMemberCount();
  Inspector->SetInspectRange(From, Count);
  nlohmann::json Children = nlohmann::json::array();
  std::string Text = Expr + " = " + Inspector->GetValue() + " (" + Inspector->GetType() + ", " +
                     std::to_string(Total) + " children)";
  for (Integer Index = 0; Index < Inspector->GetMemberCount(); ++Index) {
    std::string Member, TypeName, Value;
    UInt64 Address = 0;
    TInspectFlags Flags = 0;
    const bool Ok = Inspector->GetMember(Index, Member, TypeName, Value, Address, Flags);
    const TIntfPtr<IGDBInspect> Child = Inspector->CreateSubInspector(iiVariable, Inspector->GetInspectRangeStart() + Index);
    const bool Inspectable = Ok && Child && Child->GetKind() == ikObject;
    nlohmann::json Entry = {{"name", Member}, {"type", TypeName}, {"value", Value}, {"inspectable", Inspectable}};
    if (!Ok)
      Entry["error"] = Value;
    Children.push_back(Entry);
    Text += "\n  " + Member + " = " + Value + (Inspectable ? "  {+}" : "");
  }
  FOutput.Emit({{"answer", "inspect"},
                {"expression", Expr},
                {"type", Inspector->GetType()},
                {"value", Inspector->GetValue()},
                {"count", Total},
                {"from", Inspector->GetInspectRangeStart()},
                {"children", Children}},
               Text);
}

void TCliSession::CmdDisplay(const std::string& Name, const std::vector<std::string>& Arguments) {
  const std::string Expr = Joined(Arguments, 0);
  if (Expr.empty()) {
    FOutput.Error(Name, "usage: display EXPRESSION");
    return;
  }
  FDisplays.push_back({Expr, {}});
  FOutput.Emit({{"answer", "display"}, {"expression", Expr}, {"number", FDisplays.size()}},
               std::to_string(FDisplays.size()) + ": " + Expr + " is displayed at every stop");
  if (FState == TRunState::Stopped)
    ShowDisplays();
}

void TCliSession::ShowDisplays() {
  if (FDisplays.empty() || !FProcess)
    return;
  const TIntfPtr<IGDBThread> Thread = FProcess->GetThread(FCurrentThread);
  if (!Thread)
    return;
  for (size_t Index = 0; Index < FDisplays.size(); ++Index) {
    TDisplay& Display = FDisplays[Index];
    std::string Value, TypeName;
    bool CanModify = false;
    if (Thread->Evaluate(Display.Expr, "", FCurrentFrame + 1, Value, CanModify, TypeName) != ercOk)
      Value = "<" + Value + ">";
    const bool Changed = !Display.Value.empty() && Display.Value != Value;
    Display.Value = Value;
    FOutput.Emit({{"event", "display"},
                  {"number", Index + 1},
                  {"expression", Display.Expr},
                  {"value", Value},
                  {"changed", Changed}},
                 std::to_string(Index + 1) + ": " + Display.Expr + " = " + Value + (Changed ? "  (changed)" : ""));
  }
}

} // namespace midebug::cli
