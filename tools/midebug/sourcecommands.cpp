// The console debugger's source-line commands: list, info line and jump.

#include "session.h"

#include <charconv>
#include <filesystem>

namespace midebug::cli {

namespace {

/// Lines shown by list, and how many of them come before the one asked for.
constexpr Integer ListedLines = 10;
constexpr Integer LinesBefore = 5;

/// A whole decimal line number above 0, or a whole address ("0x" for
/// hexadecimal); false for anything else.
template <class TNumber>
bool ParseWhole(const std::string& Text, TNumber& Value) {
  const bool Hex = Text.starts_with("0x") || Text.starts_with("0X");
  const char* First = Text.data() + (Hex ? 2 : 0);
  const char* Last = Text.data() + Text.size();
  const auto [End, Error] = std::from_chars(First, Last, Value, Hex ? 16 : 10);
  return First != Last && Error == std::errc() && End == Last && Value > 0;
}

/// "FILE:LINE" split at its last colon; false when no line number ends it.
bool SplitFileLine(const std::string& Text, std::string& File, Integer& Line) {
  const size_t Colon = Text.rfind(':');
  if (Colon == std::string::npos || Colon == 0 || !ParseWhole(Text.substr(Colon + 1), Line))
    return false;
  File = Text.substr(0, Colon);
  return true;
}

bool SameFile(const std::string& One, const std::string& Other) {
  std::error_code Ignored;
  return !One.empty() && !Other.empty() && std::filesystem::equivalent(One, Other, Ignored);
}

} // namespace

TGDBLocation TCliSession::CurrentLocation() {
  if (FState != TRunState::Stopped || !FProcess)
    return DummyLocation;
  const Integer Thread = FCurrentThread >= 0 ? FCurrentThread : FProcess->GetSuspendedThreadId();
  TIntfPtr<IGDBThread> Current = Thread < 0 ? nullptr : FProcess->GetThread(Thread);
  return Current ? Current->GetCallLocation(FCurrentFrame + 1) : DummyLocation;
}

std::string TCliSession::SourcePath(const std::string& Name, Integer Line) {
  std::error_code Ignored;
  if (std::filesystem::is_regular_file(Name, Ignored))
    return Name;
  // The debugger finds a file by a part of its path: the line's code tells
  // which file it found, by its full name.
  TGDBLocation Location;
  UInt64 Start = 0;
  Integer Size = 0, FileIndex = 0, FoundLine = 0;
  if (!FProcess || !FProcess->FindSourceLocation(Name, Line, Location) ||
      !FProcess->FindSourceLine(Location.Address, Start, Size, FileIndex, FoundLine))
    return {};
  const std::string Found = FProcess->GetFileName(FileIndex);
  return std::filesystem::is_regular_file(Found, Ignored) ? Found : std::string();
}

void TCliSession::CmdList(const std::string& Name, const std::vector<std::string>& Arguments) {
  if (Arguments.size() > 1) {
    FOutput.Error(Name, "usage: list [FILE:]LINE | FUNCTION");
    return;
  }
  const TGDBLocation Current = CurrentLocation();
  std::string File = Current.Source;
  Integer Line = Current.Line;
  const std::string Asked = Arguments.empty() ? std::string() : Arguments[0];
  TGDBLocation Function;
  if (!Asked.empty() && !SplitFileLine(Asked, File, Line) && !ParseWhole(Asked, Line)) {
    if (!FProcess->FindSourceLocation(Asked, 0, Function)) {
      FOutput.Error(Name, "no function or line '" + Asked + "'");
      return;
    }
    File = Function.Source;
    Line = Function.Line;
  }
  if (File.empty() || Line <= 0) {
    FOutput.Error(Name, "no current source line; use list FILE:LINE or list FUNCTION");
    return;
  }
  const std::string Path = SourcePath(File, Line);
  const long Count = FSources.Count(Path);
  if (Path.empty() || Count == 0) {
    FOutput.Error(Name, "cannot find the source of '" + File + "'");
    return;
  }
  if (Line > Count) {
    FOutput.Error(Name, "line " + std::to_string(Line) + " is beyond the end of " + Path + " (" +
                            std::to_string(Count) + " lines)");
    return;
  }
  const bool HereIsCurrent = SameFile(Path, Current.Source);
  const Integer First = std::max<Integer>(1, Line - LinesBefore);
  const Integer Last = std::min<Integer>(static_cast<Integer>(Count), First + ListedLines - 1);
  nlohmann::json Lines = nlohmann::json::array();
  std::string Text;
  for (Integer Number = First; Number <= Last; ++Number) {
    const bool IsCurrent = HereIsCurrent && Number == Current.Line;
    const std::string Source = FSources.Line(Path, Number);
    Lines.push_back({{"line", Number}, {"text", Source}, {"current", IsCurrent}});
    Text += (IsCurrent ? "=> " : "   ") + std::to_string(Number) + "\t" + Source + "\n";
  }
  FOutput.Emit({{"answer", Name}, {"file", Path}, {"lines", Lines}}, Text);
}

void TCliSession::CmdInfoLine(const std::string& Name, const std::vector<std::string>& Arguments) {
  const std::string Usage = "usage: info line FILE:LINE | *ADDRESS";
  if (Arguments.size() != 1) {
    FOutput.Error(Name, Usage);
    return;
  }
  if (FState != TRunState::Loaded && !RequireStopped(Name))
    return;
  const std::string& Where = Arguments[0];
  UInt64 Address = 0;
  std::string File;
  Integer Line = 0;
  TGDBLocation Location;
  if (Where.starts_with("*")) {
    if (!ParseWhole(Where.substr(1), Address)) {
      FOutput.Error(Name, Usage);
      return;
    }
  } else if (!SplitFileLine(Where, File, Line)) {
    FOutput.Error(Name, Usage);
    return;
  } else if (!FProcess->FindSourceLocation(File, Line, Location)) {
    FOutput.Error(Name, "no code at " + Where);
    return;
  } else {
    Address = Location.Address;
  }
  UInt64 Start = 0;
  Integer Size = 0, FileIndex = 0;
  if (!FProcess->FindSourceLine(Address, Start, Size, FileIndex, Line)) {
    FOutput.Error(Name, "no line number information for address " + HexAddress(Address));
    return;
  }
  const std::string Source = FProcess->GetFileName(FileIndex);
  const std::string StartText = HexAddress(Start);
  const std::string EndText = HexAddress(Start + static_cast<UInt64>(Size));
  FOutput.Emit({{"answer", Name}, {"file", Source}, {"line", Line}, {"start", StartText}, {"end", EndText}},
               "Line " + std::to_string(Line) + " of \"" + Source + "\" starts at address " + StartText +
                   " and ends at " + EndText + ".");
}

void TCliSession::CmdJump(const std::string& Name, const std::vector<std::string>& Arguments) {
  Integer Line = 0;
  if (Arguments.size() != 1 || !ParseWhole(Arguments[0], Line)) {
    FOutput.Error(Name, "usage: jump LINE");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  // The next statement is the innermost frame's.
  const TGDBLocation Here = Thread->GetCallLocation(1);
  TGDBLocation Target;
  if (Here.Source.empty() || !FProcess->FindSourceLocation(Here.Source, Line, Target)) {
    FOutput.Error(Name, "line " + std::to_string(Line) + " has no code in " +
                            (Here.Source.empty() ? "the current file" : Here.Source));
    return;
  }
  if (!FProcess->SetNewEip(Target.Address)) {
    FOutput.Error(Name, "cannot move to line " + std::to_string(Line) + ": it is not in the current function");
    return;
  }
  FCurrentFrame = 0;
  const TGDBLocation Now = Thread->GetCallLocation(1);
  nlohmann::json Answer = {{"answer", Name}};
  Answer.update(LocationJson(Now));
  std::string Text = "Next statement: " + LocationText(Now);
  if (const std::string Source = SourceText(Now); !Source.empty())
    Text += "\n" + Source;
  FOutput.Emit(Answer, Text);
}

} // namespace midebug::cli
