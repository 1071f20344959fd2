// The adapter's breakpoints: source lines and functions with conditions,
// hit conditions and log messages, and the language exceptions that stop.
//
// Hit conditions: "N" stops on the Nth hit only, ">N" after the Nth, ">=N"
// from the Nth on, "%N" on every Nth (N a whole number from 1); anything else
// is refused. Hits are counted only when the condition, if any, holds.

#include "dapaddress.h"
#include "dapsession.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>

namespace midebug::dap {

namespace {

/// The library's kinds of language exceptions.
constexpr Integer CatchKind = 1;
constexpr Integer RaiseKind = 8;
constexpr Integer ThrowKind = 16;

/// Hears one of the client's breakpoints for the session.
class TDapBreakpointListener : public TInterfaced<IGDBBreakpointListener> {
public:
  TDapBreakpointListener(TIntfPtr<TDapListener> Owner, Integer Id) : FOwner(std::move(Owner)), FId(Id) {}
  void BreakpointHits(bool& ShouldStop, Integer ThreadId, TGDBLocation& /*Location*/) override {
    ShouldStop = FOwner->Session() && FOwner->Session()->OnBreakpointHit(FId, ThreadId);
  }
  void BreakpointVerified(bool Verified, Integer Breakpoint, const TGDBLocation& Location) override {
    if (FOwner->Session())
      FOwner->Session()->OnBreakpointVerified(FId, Verified, Breakpoint, Location);
  }

private:
  TIntfPtr<TDapListener> FOwner;
  const Integer FId;
};

/// Reads a hit condition; false when it follows no known form.
bool ParseHitCondition(const std::string& Text, char& Operator, long long& Count) {
  size_t Start = Text.find_first_not_of(' ');
  if (Start == std::string::npos)
    return false;
  Operator = '=';
  if (Text.compare(Start, 2, ">=") == 0) {
    Operator = 'g';
    Start += 2;
  } else if (Text[Start] == '>' || Text[Start] == '%') {
    Operator = Text[Start];
    Start += 1;
  }
  Start = std::min(Text.find_first_not_of(' ', Start), Text.size());
  const size_t End = Text.find_last_not_of(' ') + 1;
  const std::string Digits = Text.substr(Start, End > Start ? End - Start : 0);
  if (Digits.empty() || Digits.size() > 12 || Digits.find_first_not_of("0123456789") != std::string::npos)
    return false;
  Count = std::stoll(Digits);
  return Count >= 1;
}

bool HitConditionHolds(char Operator, long long Count, long long Hits) {
  switch (Operator) {
  case '=':
    return Hits == Count;
  case '>':
    return Hits > Count;
  case 'g':
    return Hits >= Count;
  case '%':
    return Hits % Count == 0;
  default:
    return true;
  }
}

/// Whether a condition's value counts as true: zero, a null pointer and
/// false do not.
bool ValueIsTrue(const std::string& Value) {
  std::string Text = Value;
  // A pointer reads "0x0 <symbol>" or "(type *) 0x0".
  if (const size_t Close = Text.rfind(") "); !Text.empty() && Text.front() == '(' && Close != std::string::npos)
    Text = Text.substr(Close + 2);
  Text = Text.substr(0, Text.find(' '));
  if (Text == "false" || Text == "False" || Text == "FALSE" || Text.empty())
    return false;
  if (Text.find_first_not_of("0x.-+") == std::string::npos || Text == "'\\000'")
    return false;
  return true;
}

} // namespace

std::shared_ptr<TDapSession::TBreakpoint> TDapSession::ReadBreakpoint(const nlohmann::json& Entry,
                                                                       TBreakpointKind Kind) {
  auto Breakpoint = std::make_shared<TBreakpoint>();
  Breakpoint->Id = ++FNextBreakpointId;
  Breakpoint->Kind = Kind;
  auto Text = [&](const char* Name) {
    const auto Found = Entry.is_object() ? Entry.find(Name) : Entry.end();
    if (Entry.is_object() && Found != Entry.end() && !Found->is_null() && !Found->is_string() &&
        Breakpoint->Message.empty())
      Breakpoint->Message = std::string("'") + Name + "' must be a string";
    return Entry.is_object() && Found != Entry.end() && Found->is_string() ? Found->get<std::string>()
                                                                            : std::string();
  };
  if (!Entry.is_object()) {
    Breakpoint->Message = "a breakpoint must be an object";
    return Breakpoint;
  }
  if (Kind == TBreakpointKind::Function) {
    Breakpoint->Function = Text("name");
    if (Breakpoint->Function.empty() && Breakpoint->Message.empty())
      Breakpoint->Message = "a function breakpoint needs a 'name'";
  } else if (Kind == TBreakpointKind::Instruction) {
    const auto Address = ParseAddress(Text("instructionReference"));
    const auto Offset = Entry.find("offset");
    const bool OffsetGood = Offset == Entry.end() || Offset->is_null() ||
                            (Offset->is_number_integer() && std::llabs(Offset->get<long long>()) < (1LL << 40));
    if ((!Address || !OffsetGood) && Breakpoint->Message.empty())
      Breakpoint->Message = "an instruction breakpoint needs an 'instructionReference' such as 0x401000 and a "
                            "whole-number 'offset'";
    else if (Address)
      Breakpoint->Address = *Address + static_cast<UInt64>(OffsetGood && Offset != Entry.end() && !Offset->is_null()
                                                              ? Offset->get<long long>()
                                                              : 0);
  } else if (Kind == TBreakpointKind::Data) {
    ReadDataBreakpoint(Entry, *Breakpoint);
  } else if (Kind == TBreakpointKind::Source) {
    const auto Line = Entry.find("line");
    if (Line == Entry.end() || !Line->is_number_integer() || Line->get<long long>() < (FLinesStartAt1 ? 1 : 0) ||
        Line->get<long long>() > 0x7fffffff)
      Breakpoint->Message = "a source breakpoint needs a whole-number 'line'";
    else
      Breakpoint->Line = static_cast<Integer>(Line->get<long long>() + (FLinesStartAt1 ? 0 : 1));
  }
  Breakpoint->Condition = Text("condition");
  Breakpoint->LogMessage = Text("logMessage");
  const std::string HitCondition = Text("hitCondition");
  if (!HitCondition.empty() && !ParseHitCondition(HitCondition, Breakpoint->HitOperator, Breakpoint->HitCount) &&
      Breakpoint->Message.empty())
    Breakpoint->Message = "the hit condition '" + HitCondition +
                          "' is none of N (the Nth hit), >N (after the Nth), >=N (from the Nth) or %N (every Nth)";
  return Breakpoint;
}

void TDapSession::PlaceBreakpoint(TBreakpoint& Breakpoint) {
  if (Breakpoint.Placed || !Breakpoint.Message.empty() || !FProcess)
    return;
  Breakpoint.Placed = true;
  TIntfPtr<IGDBBreakpointListener> Listener(new TDapBreakpointListener(FListener, Breakpoint.Id));
  switch (Breakpoint.Kind) {
  case TBreakpointKind::Source:
    FProcess->CreateSourceBreakpoint(Breakpoint.Source, Breakpoint.Line, Listener);
    break;
  case TBreakpointKind::Function:
    FProcess->CreateFunctionBreakpoint(Breakpoint.Function, Listener);
    break;
  case TBreakpointKind::Instruction:
    FProcess->CreateAddressBreakpoint(Breakpoint.Address, Listener);
    break;
  case TBreakpointKind::Data:
    FProcess->CreateSizedWatchBreakpoint(Breakpoint.Address, Breakpoint.Size, Breakpoint.Access == "read",
                                         Breakpoint.Access == "readWrite", Listener);
    break;
  }
}

void TDapSession::PlaceBreakpoints() {
  for (auto& [Id, Breakpoint] : FBreakpoints)
    PlaceBreakpoint(*Breakpoint);
  if (!FExceptionFilters.empty() && !FExceptionsPlaced) {
    // The library places its exception breakpoints with the signal policy;
    // SIGTRAP keeps the debugger's own (stop, do not pass).
    FExceptionsPlaced = true;
    FProcess->SetOsException("SIGTRAP", true, false);
  }
}

void TDapSession::RemoveBreakpoints(TBreakpointKind Kind, const std::string& Source) {
  for (auto Entry = FBreakpoints.begin(); Entry != FBreakpoints.end();) {
    const TBreakpoint& Breakpoint = *Entry->second;
    if (Breakpoint.Kind != Kind || (Kind == TBreakpointKind::Source && Breakpoint.Source != Source)) {
      ++Entry;
      continue;
    }
    if (FProcess && Breakpoint.Number >= 0 && !ProgramGone())
      FProcess->DeleteBreakpoint(Breakpoint.Number);
    Entry = FBreakpoints.erase(Entry);
  }
}

nlohmann::json TDapSession::BreakpointJson(const TBreakpoint& Breakpoint) const {
  nlohmann::json Entry = {{"id", Breakpoint.Id}, {"verified", Breakpoint.Verified}};
  if (!Breakpoint.Message.empty())
    Entry["message"] = Breakpoint.Message;
  else if (!Breakpoint.Verified)
    Entry["message"] = FProcess ? "not placed (yet): the code is not loaded" : "placed when the program starts";
  if (Breakpoint.Verified && !Breakpoint.Location.Source.empty() && Breakpoint.Location.Line > 0) {
    Entry["line"] = ClientLine(Breakpoint.Location.Line);
    Entry["source"] = {{"name", std::filesystem::path(Breakpoint.Location.Source).filename().string()},
                       {"path", Breakpoint.Location.Source}};
  } else if (Breakpoint.Kind == TBreakpointKind::Source) {
    Entry["line"] = ClientLine(Breakpoint.Line);
  }
  if (Breakpoint.Kind == TBreakpointKind::Instruction && Breakpoint.Message.empty())
    Entry["instructionReference"] = HexAddress(Breakpoint.Address);
  return Entry;
}

TDapReply TDapSession::SetBreakpoints(TDapArguments& Arguments) {
  const nlohmann::json* Source = Arguments.Object("source");
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  const auto Path = Source ? Source->find("path") : nlohmann::json::const_iterator();
  if (!Source || Path == Source->end() || !Path->is_string() || Path->get<std::string>().empty())
    return TDapReply::Refuse("setBreakpoints needs 'source' with a 'path'");
  const nlohmann::json* List = nullptr;
  static const nlohmann::json None = nlohmann::json::array();
  if ((List = Arguments.Value("breakpoints")) && !List->is_array())
    return TDapReply::Refuse("'breakpoints' must be a list");
  const std::string File = Path->get<std::string>();
  RemoveBreakpoints(TBreakpointKind::Source, File);
  std::vector<std::shared_ptr<TBreakpoint>> Set;
  for (const nlohmann::json& Entry : List ? *List : None) {
    Set.push_back(ReadBreakpoint(Entry, TBreakpointKind::Source));
    Set.back()->Source = File;
    FBreakpoints[Set.back()->Id] = Set.back();
  }
  return PlaceAndAnswer(Set);
}

TDapReply TDapSession::PlaceAndAnswer(const std::vector<std::shared_ptr<TBreakpoint>>& Set) {
  FPlacingForResponse = true;
  if (FProcess && !ProgramGone())
    for (const auto& Breakpoint : Set)
      PlaceBreakpoint(*Breakpoint);
  FPlacingForResponse = false;
  nlohmann::json Answer = nlohmann::json::array();
  for (const auto& Breakpoint : Set)
    Answer.push_back(BreakpointJson(*Breakpoint));
  return TDapReply::Ok({{"breakpoints", Answer}});
}

TDapReply TDapSession::ReplaceBreakpoints(TDapArguments& Arguments, TBreakpointKind Kind, const char* Request) {
  const nlohmann::json* List = nullptr;
  if (!(List = Arguments.Value("breakpoints")) || !List->is_array())
    return TDapReply::Refuse(std::string(Request) + " needs a list 'breakpoints'");
  RemoveBreakpoints(Kind, "");
  std::vector<std::shared_ptr<TBreakpoint>> Set;
  for (const nlohmann::json& Entry : *List) {
    Set.push_back(ReadBreakpoint(Entry, Kind));
    FBreakpoints[Set.back()->Id] = Set.back();
  }
  return PlaceAndAnswer(Set);
}

TDapReply TDapSession::SetFunctionBreakpoints(TDapArguments& Arguments) {
  return ReplaceBreakpoints(Arguments, TBreakpointKind::Function, "setFunctionBreakpoints");
}

TDapReply TDapSession::SetInstructionBreakpoints(TDapArguments& Arguments) {
  return ReplaceBreakpoints(Arguments, TBreakpointKind::Instruction, "setInstructionBreakpoints");
}

TDapReply TDapSession::SetExceptionBreakpoints(TDapArguments& Arguments) {
  const TStringArray Filters = Arguments.Strings("filters").value_or(TStringArray());
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  for (const std::string& Filter : Filters)
    if (Filter != "cpp_throw" && Filter != "cpp_catch" && Filter != "pascal_raise")
      return TDapReply::Refuse("unknown exception filter '" + Filter +
                               "'; known: cpp_throw, cpp_catch, pascal_raise");
  FExceptionFilters = std::set<std::string>(Filters.begin(), Filters.end());
  if (FProcess && !ProgramGone())
    PlaceBreakpoints();
  nlohmann::json Answer = nlohmann::json::array();
  for (size_t Index = 0; Index < Filters.size(); ++Index)
    Answer.push_back({{"verified", true}});
  return TDapReply::Ok({{"breakpoints", Answer}});
}

TDapReply TDapSession::BreakpointLocations(TDapArguments& Arguments) {
  const nlohmann::json* Source = Arguments.Object("source");
  const auto Line = Arguments.Number("line", 0, 0x7fffffff);
  const auto EndLine = Arguments.Number("endLine", 0, 0x7fffffff);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  const auto Path = Source ? Source->find("path") : nlohmann::json::const_iterator();
  if (!Source || Path == Source->end() || !Path->is_string() || !Line)
    return TDapReply::Refuse("breakpointLocations needs 'source' with a 'path', and 'line'");
  if (!FProcess || ProgramGone())
    return TDapReply::Refuse(NotStoppedReason());
  const Integer First = static_cast<Integer>(*Line + (FLinesStartAt1 ? 0 : 1));
  const Integer Last = static_cast<Integer>(EndLine ? *EndLine + (FLinesStartAt1 ? 0 : 1) : First);
  TIntegerArray Lines;
  FProcess->GetSourceLines(Path->get<std::string>(), Lines);
  nlohmann::json Answer = nlohmann::json::array();
  std::set<Integer> Seen;
  for (const Integer Found : Lines)
    if (Found >= First && Found <= Last && Seen.insert(Found).second)
      Answer.push_back({{"line", ClientLine(Found)}});
  return TDapReply::Ok({{"breakpoints", Answer}});
}

TDapReply TDapSession::ExceptionInfo(TDapArguments& Arguments) {
  const auto ThreadId = Arguments.Number("threadId", 0, 0x7fffffff);
  if (!ThreadId)
    return TDapReply::Refuse(Arguments.Problem().empty() ? "'threadId' is missing" : Arguments.Problem());
  const auto Found = FExceptions.find(static_cast<Integer>(*ThreadId));
  if (Found == FExceptions.end() || FState != TProgramState::Stopped)
    return TDapReply::Refuse("the thread is not stopped at an exception");
  const TGDBException& Exception = Found->second;
  return TDapReply::Ok({{"exceptionId", Exception.Name},
                        {"description", Exception.Desc},
                        {"breakMode", "always"},
                        {"details", {{"typeName", Exception.Name}, {"message", Exception.Desc}}}});
}

// --- What the library tells -----------------------------------------------------

bool TDapSession::CatchesException(const TGDBException& Exception) {
  switch (Exception.Kind) {
  case ThrowKind:
    return FExceptionFilters.contains("cpp_throw");
  case CatchKind:
    return FExceptionFilters.contains("cpp_catch");
  case RaiseKind:
    return FExceptionFilters.contains("pascal_raise");
  default:
    return false;
  }
}

void TDapSession::OnBreakpointVerified(Integer Id, bool Verified, Integer Number, const TGDBLocation& Location) {
  const auto Found = FBreakpoints.find(Id);
  if (Found == FBreakpoints.end()) {
    // Removed while the debugger placed it.
    if (Number >= 0 && FProcess && !ProgramGone())
      FProcess->DeleteBreakpoint(Number);
    return;
  }
  TBreakpoint& Breakpoint = *Found->second;
  if (Number >= 0)
    Breakpoint.Number = Number;
  // A breakpoint at several places is told once per place: the first place
  // is shown.
  if (Breakpoint.Verified && Verified && FPlacingForResponse)
    return;
  const bool Changed = Breakpoint.Verified != Verified || (Verified && Breakpoint.Location.Line != Location.Line) ||
                       (Verified && Breakpoint.Location.Source != Location.Source);
  Breakpoint.Verified = Verified;
  if (Verified)
    Breakpoint.Location = Location;
  if (Breakpoint.Kind == TBreakpointKind::Data && !Verified && Number >= 0) {
    // GDB took the watch but could not fit it in the processor when the
    // program went on, and refused to go on: with the watch gone the next
    // resume can.
    Breakpoint.Message = UnplacedWatchText();
    if (FProcess && !ProgramGone())
      FProcess->DeleteBreakpoint(Number);
    Breakpoint.Number = -1;
    const std::string Removed =
        "data breakpoint " + std::to_string(Id) + " on " + Breakpoint.Watched + " is removed: " + Breakpoint.Message;
    Output("console", "midebug-dap: " + Removed + "\n");
    // The refused resume is told as a stop where the program stood.
    if (FState == TProgramState::Running)
      FPendingStop.emplace("data breakpoint", nlohmann::json{{"description", "The program did not go on: " + Removed}});
  }
  if (Number < 0 && !Verified && Breakpoint.Message.empty())
    Breakpoint.Message = Breakpoint.Kind == TBreakpointKind::Function
                             ? "the debugger cannot place a breakpoint on that function"
                         : Breakpoint.Kind == TBreakpointKind::Data ? "the debugger cannot watch that memory"
                                                                    : "the debugger cannot place a breakpoint there";
  if (Changed && !FPlacingForResponse)
    SendEvent("breakpoint", {{"reason", "changed"}, {"breakpoint", BreakpointJson(Breakpoint)}});
}

std::string TDapSession::Interpolate(IGDBThread& Thread, const std::string& Message) {
  std::string Text;
  for (size_t Index = 0; Index < Message.size(); ++Index) {
    const size_t Close = Message[Index] == '{' ? Message.find('}', Index) : std::string::npos;
    if (Close == std::string::npos) {
      Text += Message[Index];
      continue;
    }
    const std::string Expr = Message.substr(Index + 1, Close - Index - 1);
    std::string Value, TypeName;
    bool CanModify = false;
    if (Thread.Evaluate(Expr, "", 1, Value, CanModify, TypeName) == ercOk)
      Text += Value;
    else
      Text += "<" + Expr + ": " + (Value.empty() ? "cannot be evaluated" : Value) + ">";
    Index = Close;
  }
  return Text;
}

bool TDapSession::OnBreakpointHit(Integer Id, Integer ThreadId) {
  const auto Found = FBreakpoints.find(Id);
  if (Found == FBreakpoints.end() || !FProcess)
    return false;
  // Kept alive should a request served meanwhile remove it.
  const std::shared_ptr<TBreakpoint> Breakpoint = Found->second;
  TIntfPtr<IGDBThread> Thread = FProcess->GetThread(ThreadId);
  if (!Breakpoint->Condition.empty() && Thread) {
    std::string Value, TypeName;
    bool CanModify = false;
    if (Thread->Evaluate(Breakpoint->Condition, "", 1, Value, CanModify, TypeName) != ercOk) {
      // A condition that cannot be evaluated stops: the client sees why.
      Output("console", "midebug-dap: the condition '" + Breakpoint->Condition + "' of breakpoint " +
                            std::to_string(Id) + " failed: " + Value + "\n");
    } else if (!ValueIsTrue(Value)) {
      return false;
    }
  }
  ++Breakpoint->Hits;
  if (!HitConditionHolds(Breakpoint->HitOperator, Breakpoint->HitCount, Breakpoint->Hits))
    return false;
  if (!Breakpoint->LogMessage.empty()) {
    std::string Text = Thread ? Interpolate(*Thread, Breakpoint->LogMessage) : Breakpoint->LogMessage;
    Output("console", Text + "\n");
    return false;
  }
  FHitBreakpoints.push_back(Id);
  return true;
}

} // namespace midebug::dap
