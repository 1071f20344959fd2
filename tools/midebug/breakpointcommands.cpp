// The console debugger's breakpoints, watchpoints and exception catching:
// the session numbers its breakpoints itself, counts their hits and decides
// at each hit whether to stop.

#include "session.h"

#include <cxxabi.h>

#include <algorithm>
#include <cstdlib>
#include <memory>

namespace midebug::cli {

/// One breakpoint of the session, as 'info breakpoints' lists it.
struct TCliSession::TCliBreakpoint {
  Integer Id = 0;
  std::string Kind;  ///< "breakpoint" or "watchpoint"
  std::string Where; ///< as the user wrote it
  bool Temporary = false;
  bool Enabled = true;
  /// The debugger's number; -1 until it has answered.
  Integer Number = -1;
  bool Verified = false;
  /// Where the debugger placed it.
  std::vector<TGDBLocation> Locations;
  Integer Hits = 0;
  Integer IgnoreCount = 0;
  /// Stops only where this expression holds; empty: always.
  std::string Condition;
  TPlace Place;
};

namespace {

/// Hears one breakpoint of the session for it.
class TCliBreakpointListener : public TInterfaced<IGDBBreakpointListener> {
public:
  TCliBreakpointListener(TCliSession& Session, Integer Id) : FSession(Session), FId(Id) {}
  void BreakpointHits(bool& ShouldStop, Integer ThreadId, TGDBLocation& /*Location*/) override {
    ShouldStop = FSession.OnBreakpointHit(FId, ThreadId);
  }
  void BreakpointVerified(bool Verified, Integer Breakpoint, const TGDBLocation& Location) override {
    FSession.OnBreakpointVerified(FId, Verified, Breakpoint, Location);
  }

private:
  TCliSession& FSession;
  const Integer FId;
};

/// A decimal number, or a hexadecimal one after "0x".
/// Words From onwards, joined by single blanks.
std::string JoinWords(const std::vector<std::string>& Words, size_t From) {
  std::string Joined;
  for (size_t Index = From; Index < Words.size(); ++Index)
    Joined += (Joined.empty() ? "" : " ") + Words[Index];
  return Joined;
}

bool ParseAddress(const std::string& Text, UInt64& Value) {
  const bool Hex = Text.starts_with("0x") || Text.starts_with("0X");
  const std::string Digits = Hex ? Text.substr(2) : Text;
  if (Digits.empty() || Digits.size() > 16 ||
      Digits.find_first_not_of(Hex ? "0123456789abcdefABCDEF" : "0123456789") != std::string::npos)
    return false;
  errno = 0;
  Value = std::strtoull(Digits.c_str(), nullptr, Hex ? 16 : 10);
  return errno == 0;
}

bool ParseCount(const std::string& Text, Integer& Value) {
  UInt64 Number = 0;
  if (Text.starts_with("0x") || !ParseAddress(Text, Number) || Number > 1000000000)
    return false;
  Value = static_cast<Integer>(Number);
  return true;
}

/// The C++ type a mangled name stands for; the name itself otherwise.
std::string Demangled(const std::string& Name) {
  int Status = 0;
  std::unique_ptr<char, decltype(&std::free)> Readable(abi::__cxa_demangle(Name.c_str(), nullptr, nullptr, &Status),
                                                       &std::free);
  return Status == 0 && Readable ? std::string(Readable.get()) : Name;
}

/// What an exception stop is, by the kind the library gives it.
std::string ExceptionKindWord(Integer Kind) {
  if (Kind == 1)
    return "catch";
  if (Kind == 16)
    return "throw";
  return "raise";
}

const std::set<std::string> CatchKinds = {"throw", "catch", "raise"};

} // namespace

void TCliSession::NewBreakpoint(const std::string& Kind, const std::string& Where, bool Temporary, TPlace Place) {
  auto Breakpoint = std::make_shared<TCliBreakpoint>();
  Breakpoint->Id = FNextBreakpoint++;
  Breakpoint->Kind = Kind;
  Breakpoint->Where = Where;
  Breakpoint->Temporary = Temporary;
  Breakpoint->Place = std::move(Place);
  FBreakpoints[Breakpoint->Id] = Breakpoint;
  Breakpoint->Place(*FProcess, TIntfPtr<IGDBBreakpointListener>(new TCliBreakpointListener(*this, Breakpoint->Id)));
  FOutput.Emit({{"answer", Kind == "watchpoint" ? "watch" : Temporary ? "tbreak" : "break"}, {"id", Breakpoint->Id},
                {"verified", Breakpoint->Verified}},
               "");
}

void TCliSession::RestoreBreakpoints() {
  for (auto& [Id, Breakpoint] : FBreakpoints) {
    Breakpoint->Number = -1;
    Breakpoint->Verified = false;
    Breakpoint->Locations.clear();
    Breakpoint->Place(*FProcess, TIntfPtr<IGDBBreakpointListener>(new TCliBreakpointListener(*this, Id)));
    if (Breakpoint->Enabled)
      continue;
    FProcess->DisableBreakpoint(Breakpoint->Number);
  }
  if (!FCatches.empty())
    FProcess->SetOsException("SIGTRAP", true, false);
}

bool TCliSession::OnBreakpointHit(Integer Id, Integer ThreadId) {
  const auto Found = FBreakpoints.find(Id);
  if (Found == FBreakpoints.end())
    return false;
  TCliBreakpoint& Breakpoint = *Found->second;
  if (!Breakpoint.Enabled || !ConditionHolds(Breakpoint, ThreadId))
    return false;
  ++Breakpoint.Hits;
  if (Breakpoint.IgnoreCount > 0) {
    --Breakpoint.IgnoreCount;
    return false;
  }
  if (FStoppedBy == -1)
    FStoppedBy = Id;
  if (Breakpoint.Temporary) {
    FProcess->DeleteBreakpoint(Breakpoint.Number);
    Breakpoint.Enabled = false;
  }
  return true;
}

bool TCliSession::ConditionHolds(const TCliBreakpoint& Breakpoint, Integer ThreadId) {
  if (Breakpoint.Condition.empty())
    return true;
  const TIntfPtr<IGDBThread> Thread = FProcess->GetThread(ThreadId);
  std::string Value, TypeName;
  bool CanModify = false;
  if (!Thread || Thread->Evaluate(Breakpoint.Condition, "", 1, Value, CanModify, TypeName) != ercOk) {
    // A condition that cannot be tested stops the program, so a typo shows.
    FOutput.Emit({{"event", "warning"}, {"message", "cannot test the condition of breakpoint " +
                                                        std::to_string(Breakpoint.Id) + ": " + Value}},
                 "Error in testing the condition of breakpoint " + std::to_string(Breakpoint.Id) + ": " + Value);
    return true;
  }
  // GDB answers a comparison with 0 or 1, a pointer in hex, a C++ bool as a word.
  if (Value == "false")
    return false;
  char* End = nullptr;
  const double Number = std::strtod(Value.c_str(), &End);
  const long long Whole = std::strtoll(Value.c_str(), nullptr, 0);
  return End == Value.c_str() || Number != 0 || Whole != 0;
}

void TCliSession::OnBreakpointVerified(Integer Id, bool Verified, Integer Number, const TGDBLocation& Location) {
  const auto Found = FBreakpoints.find(Id);
  if (Found == FBreakpoints.end())
    return;
  TCliBreakpoint& Breakpoint = *Found->second;
  // One answer per location. A place told before the program ran is told
  // again where the program was loaded: the same line at the same offset in
  // its page.
  constexpr UInt64 PageOffset = 0xFFF;
  if (Number != -1 && Breakpoint.Number == -1)
    Breakpoint.Number = Number;
  Breakpoint.Verified = Verified;
  if (!Verified)
    Breakpoint.Locations.clear();
  const auto Moved = std::find_if(Breakpoint.Locations.begin(), Breakpoint.Locations.end(), [&](const TGDBLocation& Known) {
    return Known.Address == Location.Address ||
           (Known.Line == Location.Line && (Known.Address & PageOffset) == (Location.Address & PageOffset));
  });
  if (Moved != Breakpoint.Locations.end())
    *Moved = Location;
  else if (Verified)
    Breakpoint.Locations.push_back(Location);
  nlohmann::json Event = {{"event", "breakpoint"}, {"id", Id}, {"verified", Verified}};
  const std::string Place = Breakpoint.Kind == "watchpoint" ? Breakpoint.Where : LocationText(Location);
  FOutput.Emit(Event, std::string(Verified ? "" : "[not placed] ") + Breakpoint.Kind + " " + std::to_string(Id) +
                          (Verified ? " at " + Place : " at " + Breakpoint.Where + ", pending"));
}

void TCliSession::DescribeHit(nlohmann::json& Event, std::string& Text) {
  const Integer Id = FStoppedBy;
  FStoppedBy = -1;
  const auto Found = FBreakpoints.find(Id);
  if (Id == -1 || Found == FBreakpoints.end())
    return;
  Event["breakpoint"] = Id;
  Text = (Found->second->Kind == "watchpoint" ? "Watchpoint " : "Breakpoint ") + std::to_string(Id) + ", " + Text;
  if (Found->second->Temporary)
    FBreakpoints.erase(Found);
}

bool TCliSession::OnException(Integer ThreadId, const TGDBException& Exception) {
  const std::string Kind = ExceptionKindWord(Exception.Kind);
  if (!FCatches.contains(Kind))
    return false;
  const std::string Type = Demangled(Exception.Name);
  nlohmann::json Event = {{"event", "exception"}, {"thread", ThreadId},       {"kind", Kind},
                          {"name", Type},         {"mangled", Exception.Name}, {"description", Exception.Desc}};
  Event.update(LocationJson(Exception.Location));
  FOutput.Emit(Event, "Exception (" + Kind + ") " + (Type.empty() ? "of an unknown type" : Type) +
                          (Exception.Desc.empty() ? "" : ": " + Exception.Desc) + " in thread " +
                          std::to_string(ThreadId) + " at " + LocationText(Exception.Location));
  return true;
}

// --- Commands ----------------------------------------------------------------

void TCliSession::CmdBreak(const std::string& Name, const std::vector<std::string>& Arguments) {
  if (Arguments.empty() || (Arguments.size() > 1 && (Arguments[1] != "if" || Arguments.size() < 3))) {
    FOutput.Error(Name, "usage: " + Name + " FILE:LINE | FUNCTION | *ADDRESS [if CONDITION]");
    return;
  }
  if (FState == TRunState::Exited || FState == TRunState::Detached || FState == TRunState::Lost) {
    FOutput.Error(Name, "the program is gone");
    return;
  }
  const std::string& Where = Arguments[0];
  const size_t Colon = Where.rfind(':');
  Integer Line = 0;
  UInt64 Address = 0;
  if (Where.starts_with("*")) {
    if (!ResolveAddress(Where.substr(1), Address)) {
      FOutput.Error(Name, "not an address: " + Where.substr(1));
      return;
    }
    NewBreakpoint("breakpoint", Where, Name == "tbreak", [Address](IGDBProcess& Process, const auto& Listener) {
      Process.CreateAddressBreakpoint(Address, Listener);
    });
  } else if (Colon != std::string::npos && Colon > 0 && ParseCount(Where.substr(Colon + 1), Line) && Line > 0) {
    NewBreakpoint("breakpoint", Where, Name == "tbreak",
                  [File = Where.substr(0, Colon), Line](IGDBProcess& Process, const auto& Listener) {
                    Process.CreateSourceBreakpoint(File, Line, Listener);
                  });
  } else if (Colon != std::string::npos && Where.find("::") == std::string::npos) {
    FOutput.Error(Name, "not a line: " + Where.substr(Colon + 1));
  } else {
    NewBreakpoint("breakpoint", Where, Name == "tbreak", [Where](IGDBProcess& Process, const auto& Listener) {
      Process.CreateFunctionBreakpoint(Where, Listener);
    });
  }
  // Only a hit told later meets the condition: the breakpoint was just made.
  const auto Made = FBreakpoints.find(FNextBreakpoint - 1);
  if (Arguments.size() > 2 && Made != FBreakpoints.end() && Made->second->Where == Where)
    Made->second->Condition = JoinWords(Arguments, 2);
}

void TCliSession::CmdWatch(const std::string& Name, const std::vector<std::string>& Arguments) {
  std::vector<std::string> Words = Arguments;
  const bool Read = !Words.empty() && Words[0] == "-r";
  const bool Access = !Words.empty() && Words[0] == "-a";
  if (Read || Access)
    Words.erase(Words.begin());
  UInt64 Address = 0;
  Integer Size = 0;
  if (Words.empty() || Words.size() > 2 || !ResolveAddress(Words[0], Address) ||
      (Words.size() == 2 && (!ParseCount(Words[1], Size) || Size < 1))) {
    FOutput.Error(Name, "usage: watch [-r|-a] ADDRESS [SIZE]");
    return;
  }
  if (!RequireStopped(Name))
    return;
  const std::string Where = Words[0] + (Size > 0 ? " (" + std::to_string(Size) + " bytes)" : "");
  NewBreakpoint("watchpoint", Where, false, [=](IGDBProcess& Process, const auto& Listener) {
    if (Size > 0)
      Process.CreateSizedWatchBreakpoint(Address, Size, Read, Access, Listener);
    else
      Process.CreateWatchBreakpoint(Address, Read, Access, Listener);
  });
}

TCliSession::TCliBreakpoint* TCliSession::FindBreakpoint(const std::string& Name, const std::string& Text) {
  Integer Id = 0;
  const auto Found = ParseCount(Text, Id) ? FBreakpoints.find(Id) : FBreakpoints.end();
  if (Found == FBreakpoints.end()) {
    FOutput.Error(Name, "no breakpoint " + Text);
    return nullptr;
  }
  return Found->second.get();
}

void TCliSession::CmdDelete(const std::string& Name, const std::vector<std::string>& Arguments) {
  std::vector<Integer> Ids;
  for (const std::string& Text : Arguments) {
    const TCliBreakpoint* Breakpoint = FindBreakpoint(Name, Text);
    if (!Breakpoint)
      return;
    Ids.push_back(Breakpoint->Id);
  }
  if (Arguments.empty())
    for (const auto& [Id, Breakpoint] : FBreakpoints)
      Ids.push_back(Id);
  for (const Integer Id : Ids) {
    if (FProcess && FState != TRunState::Exited)
      FProcess->DeleteBreakpoint(FBreakpoints[Id]->Number);
    FBreakpoints.erase(Id);
  }
  FOutput.Emit({{"answer", Name}, {"deleted", Ids}}, "");
}

void TCliSession::CmdEnable(const std::string& Name, const std::vector<std::string>& Arguments) {
  if (Arguments.empty()) {
    FOutput.Error(Name, "usage: " + Name + " N...");
    return;
  }
  std::vector<TCliBreakpoint*> Chosen;
  for (const std::string& Text : Arguments) {
    TCliBreakpoint* Breakpoint = FindBreakpoint(Name, Text);
    if (!Breakpoint)
      return;
    Chosen.push_back(Breakpoint);
  }
  const bool Enable = Name == "enable";
  std::vector<Integer> Ids;
  for (TCliBreakpoint* Breakpoint : Chosen) {
    Breakpoint->Enabled = Enable;
    if (Enable)
      FProcess->EnableBreakpoint(Breakpoint->Number);
    else
      FProcess->DisableBreakpoint(Breakpoint->Number);
    Ids.push_back(Breakpoint->Id);
  }
  FOutput.Emit({{"answer", Name}, {Enable ? "enabled" : "disabled", Ids}}, "");
}

void TCliSession::CmdInfo(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  nlohmann::json List = nlohmann::json::array();
  std::string Text = FBreakpoints.empty() ? "No breakpoints.\n" : "Num  Type        Enb  Hits  Where\n";
  for (const auto& [Id, Breakpoint] : FBreakpoints) {
    nlohmann::json Entry = {{"id", Id},
                            {"type", Breakpoint->Kind},
                            {"enabled", Breakpoint->Enabled},
                            {"temporary", Breakpoint->Temporary},
                            {"verified", Breakpoint->Verified},
                            {"hits", Breakpoint->Hits},
                            {"ignore", Breakpoint->IgnoreCount},
                            {"condition", Breakpoint->Condition},
                            {"where", Breakpoint->Where}};
    nlohmann::json Locations = nlohmann::json::array();
    std::string Places;
    for (const TGDBLocation& Location : Breakpoint->Locations) {
      Locations.push_back(LocationJson(Location));
      Places += "\n       " + LocationText(Location);
    }
    Entry["locations"] = Locations;
    List.push_back(Entry);
    char Row[64];
    std::snprintf(Row, sizeof Row, "%-4d %-11s %-4s %-5d ", Id, Breakpoint->Kind.c_str(),
                  Breakpoint->Enabled ? "y" : "n", Breakpoint->Hits);
    Text += Row + Breakpoint->Where + (Breakpoint->Verified ? "" : " (pending)") +
            (Breakpoint->IgnoreCount > 0 ? " (ignore next " + std::to_string(Breakpoint->IgnoreCount) + ")" : "") +
            Places + "\n";
  }
  for (const std::string& Kind : FCatches) {
    List.push_back({{"type", "catchpoint"}, {"kind", Kind}});
    Text += "     catchpoint  y          exception " + Kind + "\n";
  }
  Text.pop_back();
  FOutput.Emit({{"answer", Name}, {"breakpoints", List}}, Text);
}

void TCliSession::CmdIgnore(const std::string& Name, const std::vector<std::string>& Arguments) {
  Integer Count = 0;
  if (Arguments.size() != 2 || !ParseCount(Arguments[1], Count)) {
    FOutput.Error(Name, "usage: ignore N COUNT");
    return;
  }
  TCliBreakpoint* Breakpoint = FindBreakpoint(Name, Arguments[0]);
  if (!Breakpoint)
    return;
  Breakpoint->IgnoreCount = Count;
  FOutput.Emit({{"answer", Name}, {"id", Breakpoint->Id}, {"ignore", Count}},
               "Will ignore the next " + std::to_string(Count) + " hits of breakpoint " +
                   std::to_string(Breakpoint->Id) + ".");
}

void TCliSession::CmdCondition(const std::string& Name, const std::vector<std::string>& Arguments) {
  if (Arguments.empty()) {
    FOutput.Error(Name, "usage: condition N [CONDITION]");
    return;
  }
  TCliBreakpoint* Breakpoint = FindBreakpoint(Name, Arguments[0]);
  if (!Breakpoint)
    return;
  Breakpoint->Condition = JoinWords(Arguments, 1);
  FOutput.Emit({{"answer", Name}, {"id", Breakpoint->Id}, {"condition", Breakpoint->Condition}},
               Breakpoint->Condition.empty()
                   ? "Breakpoint " + std::to_string(Breakpoint->Id) + " now unconditional."
                   : "Breakpoint " + std::to_string(Breakpoint->Id) + " stops where " + Breakpoint->Condition);
}

void TCliSession::CmdCatch(const std::string& Name, const std::vector<std::string>& Arguments) {
  const bool Catch = Name == "catch";
  if (Arguments.size() > 1 || (Catch && Arguments.empty()) ||
      (!Arguments.empty() && !CatchKinds.contains(Arguments[0]))) {
    FOutput.Error(Name, "usage: " + std::string(Catch ? "catch throw|catch|raise" : "uncatch [throw|catch|raise]"));
    return;
  }
  if (!Catch) {
    if (Arguments.empty())
      FCatches.clear();
    else
      FCatches.erase(Arguments[0]);
  } else {
    if (FState == TRunState::Exited || FState == TRunState::Detached || FState == TRunState::Lost) {
      FOutput.Error(Name, "the program is gone");
      return;
    }
    // The library places its exception breakpoints with the signal policy;
    // SIGTRAP keeps GDB's own (stop, do not pass).
    if (FCatches.empty())
      FProcess->SetOsException("SIGTRAP", true, false);
    FCatches.insert(Arguments[0]);
  }
  FOutput.Emit({{"answer", Name}, {"catching", FCatches}}, "");
}

} // namespace midebug::cli
