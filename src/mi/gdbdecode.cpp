/// \file
/// Decoding of result payloads into the result objects, and the location
/// readers shared with the stop records. DecodeResult picks the decoder by
/// the result's command; a command without one answers false, so a done
/// record with results completes its request with FError set. Disassembly,
/// registers, memory and line information are decoded in gdbdecodedata.cpp.

#include "mi/gdbdecodeinternal.h"
#include "mi/gdboutput.h"

#include <algorithm>
#include <map>
#include <set>

namespace midebug {

namespace decode {

bool FindResult(TMIScanner& Scanner, std::string_view Name, std::string_view& Value) {
  const TMIScanner::TState Saved = Scanner.SaveState();
  bool Found = false;
  while (!Scanner.AtEnd()) {
    const std::string_view Key = Scanner.ReadKey();
    if (Scanner.AtEnd())
      break;
    Scanner.NextChar();
    const std::string_view Candidate = Scanner.ReadValue();
    if (Key == Name) {
      Value = Candidate;
      Found = true;
      break;
    }
    if (Scanner.AtEnd() || Scanner.Char() != ',')
      break;
    Scanner.NextChar();
  }
  Scanner.RestoreState(Saved);
  return Found;
}

std::string_view TakeNext(TMIScanner& Scanner, std::string_view Name) {
  const TMIScanner::TState Saved = Scanner.SaveState();
  while (!Scanner.AtEnd()) {
    const std::string_view Key = Scanner.ReadKey();
    if (Scanner.AtEnd())
      break;
    Scanner.NextChar();
    const std::string_view Value = Scanner.ReadValue();
    const bool Separated = !Scanner.AtEnd() && Scanner.Char() == ',';
    if (Separated)
      Scanner.NextChar();
    if (Key == Name)
      return Value;
    if (!Separated)
      break;
  }
  Scanner.RestoreState(Saved);
  return {};
}

} // namespace decode

namespace {

using decode::DecodeAs;
using decode::FindResult;
using decode::ForEachElement;
using decode::TakeNext;

/// A frame level beyond this is not stored: levels place frames in an array,
/// and a level taken from the reply must not size that array at will.
constexpr Integer MaxFrameLevel = 100000;
/// The most threads a thread-id listing is read for; the count comes from
/// the reply and sizes the arrays.
constexpr Integer MaxThreadCount = 100000;
/// GDB's answer for a variable object with very many children reads as this.
constexpr Integer MaxNumChild = 5000;

std::string Text(std::string_view Value) { return std::string(Value); }

Integer ReadNumChild(TMIScanner& Scanner) {
  const Integer Count = Scanner.FindInteger("numchild", 0);
  return Count > MaxNumChild ? MaxNumChild : Count;
}

/// Stores Item at Level in Array, growing it as needed; slots never filled
/// stay empty records.
template <typename TItem>
void PlaceByLevel(std::vector<TItem>& Array, Integer Level, TItem&& Item) {
  const size_t Slot = static_cast<size_t>(Level);
  if (Slot >= Array.size())
    Array.resize(Slot + 1);
  Array[Slot] = std::move(Item);
}

/// GDB's address of a breakpoint it has not placed yet.
constexpr std::string_view PendingAddress = "<PENDING>";

bool ValidLevel(Integer Level) { return Level >= 0 && Level <= MaxFrameLevel; }

/// The address of every location tuple of a breakpoint that resolved to
/// several places. GDB 13 in mi2 puts the tuples beside "bkpt"
/// (bkpt={...},{number="1.1",...},{number="1.2",...}); in mi3 and later GDB
/// they come as "locations" inside it. FLocation becomes the first's.
void ReadBreakpointLocations(TMIScanner& Scanner, std::string_view Locations, TBreakInsertResult& Breakpoint) {
  TAddressArray Addresses;
  TGDBLocationArray Located;
  auto ReadLocation = [&] {
    TGDBLocation Location;
    ParseLocation(Scanner, Location);
    Addresses.push_back(Location.Address);
    Located.push_back(std::move(Location));
  };
  if (!Locations.empty()) {
    ForEachElement(Scanner, Locations, [&](std::string_view Element) {
      if (!Element.empty())
        ReadLocation();
    });
  } else {
    while (!Scanner.AtEnd() && Scanner.Char() == '{') {
      const std::string_view Tuple = Scanner.ReadValue();
      if (!Tuple.empty()) {
        TMIScanner::TNestedScan InTuple(Scanner, Tuple);
        ReadLocation();
      }
      if (Scanner.AtEnd() || Scanner.Char() != ',')
        break;
      Scanner.NextChar();
    }
  }
  if (Addresses.empty())
    return;
  Breakpoint.FLocation = Located.front();
  Breakpoint.FAddresses = std::move(Addresses);
  Breakpoint.FLocations = std::move(Located);
}

} // namespace

bool ReadGDBBreakpoint(TMIScanner& Scanner, std::string_view Bkpt, Integer& Number, TGDBLocationArray& Locations) {
  TBreakInsertResult Breakpoint;
  {
    TMIScanner::TNestedScan InBkpt(Scanner, Bkpt);
    Number = Scanner.FindInteger("number", -1);
    if (Number == -1)
      return false;
    ParseLocation(Scanner, Breakpoint.FLocation);
    Breakpoint.FPending = Scanner.FindValue("addr") == PendingAddress;
  }
  Locations.clear();
  ReadBreakpointLocations(Scanner, {}, Breakpoint);
  if (!Breakpoint.FLocations.empty())
    Locations = std::move(Breakpoint.FLocations);
  else if (!Breakpoint.FPending)
    Locations.push_back(Breakpoint.FLocation);
  return true;
}

namespace {

bool DecodeBreakInsert(TBreakInsertResult& Breakpoint, TMIScanner& Scanner) {
  const std::string_view Bkpt = TakeNext(Scanner, "bkpt");
  if (!Bkpt.empty()) {
    std::string_view Locations;
    {
      TMIScanner::TNestedScan InBkpt(Scanner, Bkpt);
      Breakpoint.FBreakpoint = Scanner.FindInteger("number", -1);
      if (Breakpoint.FBreakpoint == -1)
        return false;
      ParseLocation(Scanner, Breakpoint.FLocation);
      Breakpoint.FPending = Scanner.FindValue("addr") == PendingAddress;
      FindResult(Scanner, "locations", Locations);
    }
    // The cursor is now after "bkpt", on the location tuples GDB 13 puts
    // beside it.
    ReadBreakpointLocations(Scanner, Locations, Breakpoint);
    return true;
  }
  Breakpoint.FAddresses.clear();
  const std::string_view Matches = Scanner.FindValue("matches");
  if (Matches.empty())
    return false;
  TMIScanner::TNestedScan InMatches(Scanner, Matches);
  for (std::string_view Match = TakeNext(Scanner, "b"); !Match.empty(); Match = TakeNext(Scanner, "b")) {
    TMIScanner::TNestedScan InMatch(Scanner, Match);
    Breakpoint.FAddresses.push_back(Scanner.FindUInt64("addr", 0));
  }
  return true;
}

bool DecodeBreakWatch(TBreakWatchResult& Watch, TMIScanner& Scanner) {
  // GDB names read and access watchpoints "hw-rwpt" and "hw-awpt".
  std::string_view Tuple = Scanner.FindValue("wpt");
  if (Tuple.empty())
    Tuple = Scanner.FindValue("hw-awpt");
  if (Tuple.empty())
    Tuple = Scanner.FindValue("hw-rwpt");
  TMIScanner::TNestedScan InTuple(Scanner, Tuple);
  Watch.FBreakpoint = Scanner.FindInteger("number", -1);
  if (Watch.FBreakpoint == -1)
    return false;
  Watch.FLocation = DummyLocation;
  return true;
}

bool DecodeThreadInfo(TThreadInfoResult& Info, TMIScanner& Scanner) {
  std::string_view Threads;
  if (!FindResult(Scanner, "threads", Threads))
    return false;
  ForEachElement(Scanner, Threads, [&](std::string_view Element) {
    if (Element.empty())
      return;
    const Integer Id = Scanner.FindInteger("id", -1);
    if (Id == -1)
      return;
    Info.FIds.push_back(Id);
    if (!Info.FStateOnly)
      Info.FNames.push_back(TThreadInfoResult::FixupName(Text(Scanner.FindValue("target-id"))));
    TGDBLocation Location;
    Integer IgnoredThreadId = -1;
    ParseStopFrame(Scanner, Location, IgnoredThreadId);
    Info.FLocations.push_back(std::move(Location));
    Info.FStates.push_back(Text(Scanner.FindValue("state")));
  });
  return true;
}

bool DecodeThreadListIds(TThreadListIdsResult& List, TMIScanner& Scanner) {
  Integer Count = Scanner.FindInteger("number-of-threads", 0);
  if (Count > MaxThreadCount)
    Count = MaxThreadCount;
  const size_t Size = Count > 0 ? static_cast<size_t>(Count) : 0;
  List.FIds.assign(Size, 0);
  List.FNames.assign(Size, std::string());
  List.FStates.assign(Size, std::string());
  if (Size == 0)
    return true;
  {
    TMIScanner::TNestedScan InIds(Scanner, Scanner.FindValue("thread-ids"));
    for (Integer& Id : List.FIds)
      Id = MIStrToIntDef(TakeNext(Scanner, "thread-id"), -1);
  }
  std::multimap<Integer, size_t> SlotsById;
  for (size_t Slot = 0; Slot < Size; ++Slot)
    SlotsById.emplace(List.FIds[Slot], Slot);
  TMIScanner::TNestedScan InThreads(Scanner, Scanner.FindValue("threads"));
  for (size_t Index = 0; Index < Size; ++Index) {
    const std::string_view Thread = TakeNext(Scanner, "thread");
    if (Thread.empty())
      break;
    TMIScanner::TNestedScan InThread(Scanner, Thread);
    const Integer Id = Scanner.FindInteger("thread-id", -1);
    const std::string State = Text(Scanner.FindValue("state"));
    const std::string UniqueId = Text(Scanner.FindValue("unique-id"));
    const auto [First, Last] = SlotsById.equal_range(Id);
    for (auto Slot = First; Slot != Last; ++Slot) {
      List.FStates[Slot->second] = State;
      List.FNames[Slot->second] = UniqueId;
    }
  }
  return true;
}

bool DecodeThreadSelect(TThreadSelectResult& Select, TMIScanner& Scanner) {
  if (Scanner.FindInteger("new-thread-id", -1) != Select.FThreadId)
    return false;
  const std::string_view Frame = Scanner.FindValue("frame");
  if (Frame.empty())
    return false;
  TMIScanner::TNestedScan InFrame(Scanner, Frame);
  Select.FFrameIndex = Scanner.FindInteger("level", 0);
  ParseLocation(Scanner, Select.FLocation);
  return true;
}

bool DecodeStackInfoFrame(TStackInfoFrameResult& Info, TMIScanner& Scanner) {
  const std::string_view Frame = Scanner.FindValue("frame");
  if (Frame.empty())
    return false;
  TMIScanner::TNestedScan InFrame(Scanner, Frame);
  ParseLocation(Scanner, Info.FLocation);
  return true;
}

bool DecodeStackInfoDepth(TStackInfoDepthResult& Depth, TMIScanner& Scanner) {
  Depth.FStackDepth = Scanner.FindInteger("depth", -1);
  return Depth.FStackDepth != -1;
}

bool DecodeStackListFrames(TStackListFramesResult& Frames, TMIScanner& Scanner) {
  std::string_view Stack;
  if (!FindResult(Scanner, "stack", Stack))
    return false;
  TMIScanner::TNestedScan InStack(Scanner, Stack);
  for (std::string_view Frame = TakeNext(Scanner, "frame"); !Frame.empty(); Frame = TakeNext(Scanner, "frame")) {
    TMIScanner::TNestedScan InFrame(Scanner, Frame);
    const Integer Level = Scanner.FindInteger("level", -1);
    if (!ValidLevel(Level))
      continue;
    TGDBStackFrame StackFrame;
    ParseLocation(Scanner, StackFrame.Location);
    StackFrame.Header = Text(Scanner.FindValue("func"));
    PlaceByLevel(Frames.FStackFrames, Level, std::move(StackFrame));
  }
  return true;
}

/// True when a list's inner text holds results ("name=...") rather than
/// values (c-strings, tuples, lists).
bool HoldsResults(std::string_view ListText) {
  return !ListText.empty() && ListText.front() != '"' && ListText.front() != '{' && ListText.front() != '[';
}

bool DecodeStackListArguments(TStackListArgumentsResult& Arguments, TMIScanner& Scanner) {
  std::string_view StackArgs;
  if (!FindResult(Scanner, "stack-args", StackArgs))
    return false;
  TMIScanner::TNestedScan InStackArgs(Scanner, StackArgs);
  for (std::string_view Frame = TakeNext(Scanner, "frame"); !Frame.empty(); Frame = TakeNext(Scanner, "frame")) {
    TMIScanner::TNestedScan InFrame(Scanner, Frame);
    const Integer Level = Scanner.FindInteger("level", -1);
    if (!ValidLevel(Level))
      continue;
    TGDBStackArgument FrameArguments;
    const std::string_view Args = Scanner.FindValue("args");
    if (HoldsResults(Args)) {
      // Without values GDB lists the names alone: args=[name="x",name="y"].
      TMIScanner::TNestedScan InArgs(Scanner, Args);
      for (std::string_view Name = TakeNext(Scanner, "name"); !Name.empty(); Name = TakeNext(Scanner, "name"))
        FrameArguments.NameValues.push_back({Text(Name), std::string()});
    } else {
      ForEachElement(Scanner, Args, [&](std::string_view Element) {
        if (Element.empty()) {
          FrameArguments.NameValues.emplace_back();
          return;
        }
        std::string Name = Text(Scanner.FindValue("name"));
        FrameArguments.NameValues.push_back({std::move(Name), Text(Scanner.FindValue("value"))});
      });
    }
    PlaceByLevel(Arguments.FStackArguments, Level, std::move(FrameArguments));
  }
  return true;
}

bool DecodeStackListLocals(TStackListLocalsResult& Locals, TMIScanner& Scanner) {
  Locals.FStackLocals.clear();
  const std::string_view List = Scanner.FindValue("locals");
  if (HoldsResults(List)) {
    TMIScanner::TNestedScan InList(Scanner, List);
    for (std::string_view Name = TakeNext(Scanner, "name"); !Name.empty(); Name = TakeNext(Scanner, "name"))
      Locals.FStackLocals.push_back(Text(Name));
    return true;
  }
  // With values GDB lists a tuple per local: locals=[{name="i",...},...].
  ForEachElement(Scanner, List, [&](std::string_view Element) {
    if (!Element.empty())
      Locals.FStackLocals.push_back(Text(Scanner.FindValue("name")));
  });
  return true;
}

bool DecodeSymbolListLines(TSymbolListLinesResult& Lines, TMIScanner& Scanner) {
  std::string_view List;
  if (!FindResult(Scanner, "lines", List))
    return false;
  ForEachElement(Scanner, List, [&](std::string_view Element) {
    if (Element.empty())
      return;
    const UInt64 Address = Lines.FIncludeAddress ? Scanner.FindUInt64("pc", 0) : 0;
    const Integer Line = Scanner.FindInteger("line", -1);
    if (Line == -1)
      return;
    Lines.FLines.push_back(Line);
    if (Lines.FIncludeAddress)
      Lines.FAddresses.push_back(Address);
  });
  return true;
}

bool DecodeFileListExecSourceFiles(TFileListExecSourceFilesResult& Sources, TMIScanner& Scanner) {
  std::string_view List;
  if (!FindResult(Scanner, "files", List))
    return false;
  // A header included by many units is listed once for each.
  std::set<std::string_view> Seen;
  ForEachElement(Scanner, List, [&](std::string_view Element) {
    if (Element.empty())
      return;
    std::string_view Name = Scanner.FindValue("fullname");
    if (Name.empty())
      Name = Scanner.FindValue("file");
    if (!Name.empty() && Seen.insert(Name).second)
      Sources.FFiles.push_back(Text(Name));
  });
  return true;
}

bool DecodeVarCreate(TVarCreateResult& Create, TMIScanner& Scanner) {
  Create.FName = Text(Scanner.FindValue("name"));
  // The whole count: the children are listed a window at a time.
  Create.FNumChild = std::max(Scanner.FindInteger("numchild", 0), 0);
  Create.FType = Text(Scanner.FindValue("type"));
  Create.FValue = Text(Scanner.FindValue("value"));
  if (!Create.FValue.empty())
    Create.FValueDefined = true;
  Create.FDynamic = Scanner.FindValue("dynamic") == "1";
  Create.FHasMore = Scanner.FindInteger("has_more", 0) != 0;
  Create.FDisplayHint = Text(Scanner.FindValue("displayhint"));
  return true;
}

bool DecodeVarInfoNumChildren(TVarInfoNumChildrenResult& Info, TMIScanner& Scanner) {
  Info.FCount = ReadNumChild(Scanner);
  return true;
}

bool DecodeVarListChildren(TVarListChildrenResult& List, TMIScanner& Scanner) {
  const Integer Count = ReadNumChild(Scanner);
  List.FHasMore = Scanner.FindInteger("has_more", 0) != 0;
  if (Count <= 0)
    return true;
  std::string_view Children;
  const bool Present = FindResult(Scanner, "children", Children);
  List.FChildren.assign(static_cast<size_t>(Count), TGDBVarChild());
  TMIScanner::TNestedScan InChildren(Scanner, Children);
  for (TGDBVarChild& Child : List.FChildren) {
    TMIScanner::TNestedScan InChild(Scanner, TakeNext(Scanner, "child"));
    Child.Name = Text(Scanner.FindValue("name"));
    Child.Expr = Text(Scanner.FindValue("exp"));
    Child.NumChild = ReadNumChild(Scanner);
    Child.VarType = Text(Scanner.FindValue("type"));
    Child.Dynamic = Scanner.FindValue("dynamic") == "1";
  }
  return Present;
}

bool DecodeVarInfoPathExpression(TVarInfoPathExpressionResult& Path, TMIScanner& Scanner) {
  Path.FExpr = Text(Scanner.FindValue("path_expr"));
  return true;
}

bool DecodeVarShowAttributes(TVarShowAttributesResult& Attributes, TMIScanner& Scanner, bool IsLLDB) {
  if (Scanner.FindValue(IsLLDB ? "status" : "attr") == "editable")
    Attributes.FEditable = true;
  return true;
}

/// The commands whose whole answer is one "value".
template <typename TResult>
bool DecodeValue(TResult& Typed, TMIScanner& Scanner) {
  Typed.FValue = Text(Scanner.FindValue("value"));
  return true;
}

bool DecodeVarUpdate(TVarUpdateResult& Update, TMIScanner& Scanner) {
  const std::string_view List = Scanner.FindValue("changelist");
  if (List.empty())
    return true;
  TNameValueArray Changes;
  bool OutOfScope = false;
  ForEachElement(Scanner, List, [&](std::string_view Element) {
    if (OutOfScope || Element.empty())
      return;
    std::string Name = Text(Scanner.FindValue("name"));
    std::string Value = Text(Scanner.FindValue("value"));
    if (Scanner.FindValue("in_scope") != "true") {
      OutOfScope = true;
      return;
    }
    Changes.push_back({std::move(Name), std::move(Value)});
  });
  if (OutOfScope)
    Update.FOutOfScope = true;
  Update.FChangeList = std::move(Changes);
  return true;
}

bool DecodePidInfo(TPidInfoResult& Pid, TMIScanner& Scanner) {
  Pid.FPid = Scanner.FindInteger("process-id", -1);
  return Pid.FPid != -1;
}

bool DecodeTargetInfoAsync(TTargetInfoAsyncResult& Async, TMIScanner& Scanner) {
  std::string_view CanAsync;
  if (!FindResult(Scanner, "can_async", CanAsync))
    return false;
  Async.FAsyncTarget = CanAsync == "true";
  return true;
}

std::string LowerCaseASCII(std::string_view Text) {
  std::string Lower(Text);
  for (char& Letter : Lower)
    if (Letter >= 'A' && Letter <= 'Z')
      Letter = static_cast<char>(Letter - 'A' + 'a');
  return Lower;
}

bool DecodeCLInfoLineAddress(TCLInfoLineAddressResult& InfoLine, TMIScanner& Scanner) {
  const std::string Text = LowerCaseASCII(Scanner.ReadCString());
  if (!Text.starts_with(InfoLine.FExpected))
    return false;
  std::string_view Address = std::string_view(Text).substr(InfoLine.FExpected.size());
  Address = Address.substr(0, Address.find(' '));
  InfoLine.FAddress = MIStrToUInt64Def(Address, 0);
  return true;
}

/// The hexadecimal address at the head of Text and, when "<symbol+offset>"
/// follows it, the symbol; Text moves past both.
UInt64 ReadConsoleAddress(std::string_view& Text, std::string* Function) {
  const size_t End = std::min(Text.find(' '), Text.size());
  const UInt64 Address = MIStrToUInt64Def(Text.substr(0, End), 0);
  Text.remove_prefix(End);
  const size_t Open = Text.find_first_not_of(' ');
  if (Open == std::string_view::npos || Text[Open] != '<')
    return Address;
  const size_t Close = Text.find('>', Open);
  if (Close == std::string_view::npos)
    return Address;
  if (Function != nullptr) {
    std::string_view Symbol = Text.substr(Open + 1, Close - Open - 1);
    const size_t Plus = Symbol.rfind('+');
    if (Plus != std::string_view::npos && Symbol.find_first_not_of("0123456789", Plus + 1) == std::string_view::npos)
      Symbol = Symbol.substr(0, Plus);
    *Function = std::string(Symbol);
  }
  Text.remove_prefix(Close + 1);
  return Address;
}

// GDB 13 answers "info line" on the console, in one of these forms:
//   Line 7 of "t.c" starts at address 0x114c <main+15> and ends at 0x1159 <main+28>.
//   Line 3 of "t.c" is at address 0x1138 <twice+15> but contains no code.
//   No line number information available for address 0x10
//   Line number 30 is out of range for "t.c".
// Only the first is a code range; the others keep GDB's words.
bool DecodeCLInfoLine(TCLInfoLineResult& InfoLine, TMIScanner& Scanner) {
  const std::string Answer(Scanner.ReadCString());
  std::string_view Text = Answer;
  while (!Text.empty() && (Text.back() == '\n' || Text.back() == '.'))
    Text.remove_suffix(1);
  InfoLine.FMessage = std::string(Text);
  constexpr std::string_view LinePrefix = "Line ";
  constexpr std::string_view Of = " of \"";
  constexpr std::string_view Starts = "\" starts at address ";
  constexpr std::string_view NoCode = "\" is at address ";
  const size_t OfAt = Text.find(Of);
  if (!Text.starts_with(LinePrefix) || OfAt == std::string_view::npos)
    return false;
  InfoLine.FLine = static_cast<Integer>(MIStrToUInt64Def(Text.substr(LinePrefix.size(), OfAt - LinePrefix.size()), 0));
  // The file name is printed unescaped: the last of the two phrases that
  // may follow it ends it.
  size_t NameEnd = Text.rfind(Starts);
  const bool HasCode = NameEnd != std::string_view::npos;
  if (!HasCode)
    NameEnd = Text.rfind(NoCode);
  if (NameEnd == std::string_view::npos || NameEnd < OfAt + Of.size())
    return false;
  InfoLine.FSource = std::string(Text.substr(OfAt + Of.size(), NameEnd - OfAt - Of.size()));
  Text.remove_prefix(NameEnd + (HasCode ? Starts : NoCode).size());
  InfoLine.FStartAddr = ReadConsoleAddress(Text, &InfoLine.FFunction);
  constexpr std::string_view Ends = " and ends at ";
  if (!HasCode || !Text.starts_with(Ends))
    return false;
  Text.remove_prefix(Ends.size());
  InfoLine.FEndAddr = ReadConsoleAddress(Text, nullptr);
  return InfoLine.FEndAddr > InfoLine.FStartAddr;
}

} // namespace

bool DecodeResult(TGDBResult& Result, TMIScanner& Scanner, bool IsLLDB) {
  switch (Result.FCommand) {
  case ctBreakInsert:
    return DecodeAs(Result, Scanner, DecodeBreakInsert);
  case ctBreakWatch:
    return DecodeAs(Result, Scanner, DecodeBreakWatch);
  case ctThreadInfo:
    return DecodeAs(Result, Scanner, DecodeThreadInfo);
  case ctThreadListIds:
    return DecodeAs(Result, Scanner, DecodeThreadListIds);
  case ctThreadSelect:
    return DecodeAs(Result, Scanner, DecodeThreadSelect);
  case ctStackInfoFrame:
    return DecodeAs(Result, Scanner, DecodeStackInfoFrame);
  case ctStackInfoDepth:
    return DecodeAs(Result, Scanner, DecodeStackInfoDepth);
  case ctStackListFrames:
    return DecodeAs(Result, Scanner, DecodeStackListFrames);
  case ctStackListArguments:
    return DecodeAs(Result, Scanner, DecodeStackListArguments);
  case ctStackListLocals:
    return DecodeAs(Result, Scanner, DecodeStackListLocals);
  case ctSymbolListLines:
    return DecodeAs(Result, Scanner, DecodeSymbolListLines);
  case ctFileListExecSourceFiles:
    return DecodeAs(Result, Scanner, DecodeFileListExecSourceFiles);
  case ctVarCreate:
    return DecodeAs(Result, Scanner, DecodeVarCreate);
  case ctVarInfoNumChildren:
    return DecodeAs(Result, Scanner, DecodeVarInfoNumChildren);
  case ctVarListChildren:
    return DecodeAs(Result, Scanner, DecodeVarListChildren);
  case ctVarInfoPathExpression:
    return DecodeAs(Result, Scanner, DecodeVarInfoPathExpression);
  case ctVarShowAttributes:
    return DecodeAs(Result, Scanner, DecodeVarShowAttributes, IsLLDB);
  case ctVarEvaluateExpression:
    return DecodeAs(Result, Scanner, DecodeValue<TVarEvaluateExpressionResult>);
  case ctVarAssign:
    return DecodeAs(Result, Scanner, DecodeValue<TVarAssignResult>);
  case ctDataEvaluateExpression:
    return DecodeAs(Result, Scanner, DecodeValue<TDataEvaluateExpressionResult>);
  case ctGdbShow:
    return DecodeAs(Result, Scanner, DecodeValue<TGdbShowResult>);
  case ctVarUpdate:
    return DecodeAs(Result, Scanner, DecodeVarUpdate);
  case ctDataDisassemble:
    return DecodeAs(Result, Scanner, decode::DecodeDataDisassemble);
  case ctDataListRegisterNames:
    return DecodeAs(Result, Scanner, decode::DecodeDataListRegisterNames);
  case ctDataListRegisterValues:
    return DecodeAs(Result, Scanner, decode::DecodeDataListRegisterValues);
  case ctDataListXMMRegisterValues:
    return DecodeAs(Result, Scanner, decode::DecodeDataListVectorRegisterValues<TDataListXMMRegisterValuesResult>);
  case ctDataListFPURegisterValues:
    return DecodeAs(Result, Scanner, decode::DecodeDataListVectorRegisterValues<TDataListFPURegisterValuesResult>);
  case ctDataReadMemory:
    return DecodeAs(Result, Scanner, decode::DecodeDataReadMemory);
  case ctDataReadMemoryBytes:
    return DecodeAs(Result, Scanner, decode::DecodeDataReadMemoryBytes);
  case ctDataInfoLine:
    return DecodeAs(Result, Scanner, decode::DecodeDataInfoLine);
  case ctPidInfo:
    return DecodeAs(Result, Scanner, DecodePidInfo);
  case ctTargetInfoAsync:
    return DecodeAs(Result, Scanner, DecodeTargetInfoAsync);
  case ctExecRun:
  case ctFileExecAndSymbols:
  case ctTargetAttach:
  case ctTargetDetach:
  case ctExecAbort:
    return true;
  default:
    return false;
  }
}

bool DecodeConsoleResult(TGDBResult& Result, TMIScanner& Scanner) {
  switch (Result.FCommand) {
  case ctCLInfoLineAddress:
    return DecodeAs(Result, Scanner, DecodeCLInfoLineAddress);
  case ctCLInfoLine:
    return DecodeAs(Result, Scanner, DecodeCLInfoLine);
  case ctCLKill:
  case ctCLMemoryWrite:
    return true;
  default:
    return false;
  }
}

void ParseLocation(TMIScanner& Scanner, TGDBLocation& Location) {
  Location.Address = Scanner.FindUInt64("addr", DummyLocation.Address);
  // "file" is the name as compiled, often relative to a directory the IDE
  // does not know; "fullname" is the path GDB found the file at.
  std::string_view Source = Scanner.FindValue("fullname");
  if (Source.empty())
    Source = Scanner.FindValue("file");
  if (Source.empty())
    Source = Scanner.FindValue("from");
  if (Source == "??")
    Source = {};
  Location.Source = std::string(Source);
  Location.Line = Scanner.FindInteger("line", DummyLocation.Line);
  if (Location.Line == -1)
    Location.Line = 0;

  const std::string_view Original = Scanner.FindValue("original-location");
  size_t Colon = Original.find(':');
  if (Colon == std::string_view::npos)
    return;
  // "C:\src\unit.pas:12" names a file with a drive letter: when the text after
  // the last colon is a line number, the file is everything before it.
  const size_t LastColon = Original.rfind(':');
  if (LastColon != Colon && MIStrToIntDef(Original.substr(LastColon + 1), -1) >= 0)
    Colon = LastColon;
  Location.Source = std::string(Original.substr(0, Colon));
  if (Location.Line == 0)
    Location.Line = MIStrToIntDef(Original.substr(Colon + 1), 0);
}

void ParseStopFrame(TMIScanner& Scanner, TGDBLocation& Location, Integer& ThreadId) {
  const std::string_view Frame = Scanner.FindValue("frame");
  if (Frame.empty()) {
    Location = DummyLocation;
  } else {
    TMIScanner::TNestedScan Nested(Scanner, Frame);
    ParseLocation(Scanner, Location);
  }
  ThreadId = Scanner.FindInteger("thread-id", -1);
}

} // namespace midebug
