/// \file
/// Real GDB 13 transcripts (tests/data/transcripts, recorded by record.sh
/// there) fed to the output parser block by block, as the kernel hands them
/// over. TranscriptEvents pins down the stops, notifications and streams a
/// user sees; TranscriptDecoders the replies in the stream whose shapes the
/// decoder tests' recorded replies do not already show.

#include "mi/gdboutput.h"
#include "mi/gdbresult.h"
#include "recordingprocess.h"
#include "testsupport.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace midebug::test {
namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::StartsWith;

/// The prompt line that ends each reply block of GDB's MI output.
constexpr std::string_view GDBPrompt = "(gdb) \n";

/// Splits GDB's output at its prompt lines: each block is everything up to,
/// without, one "(gdb) " line; what follows the last prompt is a block too.
std::vector<std::string> SplitReplyBlocks(const std::string& Output) {
  std::vector<std::string> Blocks;
  size_t BlockStart = 0;
  size_t LineStart = 0;
  while (LineStart < Output.size()) {
    size_t LineEnd = Output.find('\n', LineStart);
    LineEnd = LineEnd == std::string::npos ? Output.size() : LineEnd + 1;
    if (std::string_view(Output).substr(LineStart, LineEnd - LineStart) == GDBPrompt) {
      Blocks.push_back(Output.substr(BlockStart, LineStart - BlockStart));
      BlockStart = LineEnd;
    }
    LineStart = LineEnd;
  }
  if (BlockStart < Output.size())
    Blocks.push_back(Output.substr(BlockStart));
  return Blocks;
}

/// A transcript replayed through the parser, with result objects registered
/// under the tokens of the commands record.sh sent.
class TTranscriptReplay {
public:
  /// Registers a result object under a command token and keeps it alive.
  template <class TResult, class... TArgs> TResult& Expect(const std::string& Token, TArgs&&... Args) {
    auto Result = std::make_unique<TResult>(std::forward<TArgs>(Args)...);
    TResult& Registered = *Result;
    Process.Register(Token, Registered);
    FResults.push_back(std::move(Result));
    return Registered;
  }

  /// Feeds the transcript to the parser one reply block at a time.
  void Replay(const std::string& Name) {
    const std::string Output = ReadWholeFile(TestDataDir() + "/transcripts/" + Name + ".mi");
    ASSERT_FALSE(Output.empty()) << "transcript " << Name << " is missing";
    for (const std::string& Block : SplitReplyBlocks(Output))
      ProcessGDBOutput(Block, Process);
  }

  TRecordingProcess Process;

private:
  std::vector<std::unique_ptr<TGDBResult>> FResults;
};

bool IsEntered(const TGDBResult& Result) { return Result.FAvailable && !Result.FError; }

::testing::AssertionResult IsAt(const TGDBLocation& Location, std::string_view File, Integer Line) {
  if (Location.Source.ends_with(File) && Location.Line == Line)
    return ::testing::AssertionSuccess();
  return ::testing::AssertionFailure() << "at " << Location.Source << ":" << Location.Line << ", expected " << File
                                       << ":" << Line;
}

std::vector<Byte> BytesOf(const TXMMFPURegValue& Value) {
  return std::vector<Byte>(std::begin(Value.ByteReg), std::end(Value.ByteReg));
}

// ---------------------------------------------------------------------------
// Stops, notifications and streams

TEST(TranscriptEvents, StopsOfBreakpointsStepsFinishAndWatchpointsInOrder) {
  TTranscriptReplay Replay;
  Replay.Replay("stops");
  const auto& Stops = Replay.Process.Suspensions;

  // Breakpoint at main, four steps (the last glued behind program output),
  // the breakpoint in add, finish back to the call, one more step, two
  // watchpoints firing together in bump (one stop), the read watchpoint in
  // probe.
  const std::pair<Integer, TThreadStopReason> Expected[] = {
      {34, tsrAtBreakpoint}, {35, tsrStepDone}, {38, tsrStepDone}, {39, tsrStepDone},     {40, tsrStepDone},
      {18, tsrAtBreakpoint}, {40, tsrStepDone}, {41, tsrStepDone}, {25, tsrAtBreakpoint}, {29, tsrAtBreakpoint},
  };
  ASSERT_EQ(Stops.size(), std::size(Expected));
  for (size_t Index = 0; Index < Stops.size(); ++Index) {
    EXPECT_TRUE(IsAt(Stops[Index].Location, "stops.c", Expected[Index].first)) << "stop " << Index;
    EXPECT_EQ(Stops[Index].Reason, Expected[Index].second) << "stop " << Index;
  }
  EXPECT_EQ(Stops[8].Location.Address, 0x0000555555555186u);
  for (const TStop& Stop : Stops)
    EXPECT_EQ(Stop.ThreadId, 1);

  ASSERT_EQ(Replay.Process.BreakpointHits.size(), 2u);
  EXPECT_EQ(Replay.Process.BreakpointHits[0].first, 1);
  EXPECT_EQ(Replay.Process.BreakpointHits[1].first, 2);
  EXPECT_EQ(Replay.Process.BreakpointHits[1].second.Location.Address, 0x0000555555555163u);
}

TEST(TranscriptEvents, ExitCodesReadAsGdbMeansThem) {
  struct TCase {
    const char* Transcript;
    Integer Code;
    const char* Signal;
  };
  // GDB prints exit codes in octal: "010" is 8, "03" is 3.
  const TCase Cases[] = {{"stops", 8, ""}, {"records", 3, ""}, {"threads", 0, ""}, {"signals", 0, "SIGSEGV"}};
  for (const TCase& Case : Cases) {
    TTranscriptReplay Replay;
    Replay.Replay(Case.Transcript);
    ASSERT_EQ(Replay.Process.Exits.size(), 1u) << Case.Transcript;
    EXPECT_EQ(Replay.Process.Exits[0].first, Case.Code) << Case.Transcript;
    EXPECT_EQ(Replay.Process.Exits[0].second, Case.Signal) << Case.Transcript;
  }
}

TEST(TranscriptEvents, SignalsReportNameMeaningLocationAndThread) {
  TTranscriptReplay Replay;
  Replay.Replay("signals");
  const auto& Signals = Replay.Process.Signals;

  ASSERT_EQ(Signals.size(), 2u);
  EXPECT_EQ(Signals[0].first.Name, "SIGUSR1");
  EXPECT_EQ(Signals[0].first.Desc, "User defined signal 1");
  EXPECT_TRUE(IsAt(Signals[0].first.Location, "pthread_kill.c", 44));
  EXPECT_EQ(Signals[0].second, 1);
  EXPECT_EQ(Signals[1].first.Name, "SIGSEGV");
  EXPECT_EQ(Signals[1].first.Desc, "Segmentation fault");
  EXPECT_TRUE(IsAt(Signals[1].first.Location, "signals.c", 14));
  EXPECT_EQ(Signals[1].first.Location.Address, 0x00005555555551bfu);
  EXPECT_EQ(Signals[1].second, 1);
  // A signal is not a suspension of its own, and the fatal one ends the run.
  EXPECT_TRUE(Replay.Process.Suspensions.empty());
  EXPECT_THAT(Replay.Process.Exits, ElementsAre(std::make_pair(0, std::string("SIGSEGV"))));
}

TEST(TranscriptEvents, ThreadsCreatedHitAndExited) {
  TTranscriptReplay Replay;
  Replay.Replay("threads");
  const TRecordingProcess& Process = Replay.Process;

  // GDB 13 gives no "osid": the OS id defaults to the thread id.
  EXPECT_THAT(Process.CreatedThreads, ElementsAre(std::make_pair(1, 1), std::make_pair(2, 2), std::make_pair(3, 3)));
  // Which worker reaches the breakpoint first, and which ends first, is
  // the scheduler's choice; the main thread ends last.
  ASSERT_EQ(Process.ExitedThreads.size(), 3u);
  EXPECT_THAT(std::vector<Integer>(Process.ExitedThreads.begin(), Process.ExitedThreads.begin() + 2),
              ::testing::UnorderedElementsAre(2, 3));
  EXPECT_EQ(Process.ExitedThreads[2], 1);
  ASSERT_EQ(Process.BreakpointHits.size(), 2u);
  EXPECT_EQ(Process.BreakpointHits[0].first, 1);
  EXPECT_TRUE(IsAt(Process.BreakpointHits[0].second.Location, "threads.c", 14));
  EXPECT_THAT(Process.BreakpointHits[0].second.ThreadId, ::testing::AnyOf(2, 3)) << "a worker thread hit it";
  EXPECT_EQ(Process.BreakpointHits[1].first, 2);
  EXPECT_TRUE(IsAt(Process.BreakpointHits[1].second.Location, "threads.c", 27));
  EXPECT_EQ(Process.BreakpointHits[1].second.ThreadId, 1);
  // The pid of "=thread-group-started"; the group id "i1" is no pid.
  ASSERT_EQ(Process.Pids.size(), 1u);
  EXPECT_GT(Process.Pids[0], 0);
  EXPECT_FALSE(Process.Called("ThreadSelected")) << "-thread-select answers with a result, not a notification";
}

TEST(TranscriptEvents, LibrariesLoadedWithNamesAndAddresses) {
  TTranscriptReplay Replay;
  Replay.Replay("threads");
  const auto& Modules = Replay.Process.Modules;

  ASSERT_EQ(Modules.size(), 2u);
  EXPECT_EQ(Modules[0].Name, "ld-linux-x86-64.so.2");
  EXPECT_EQ(Modules[1].Name, "libc.so.6");
  for (const TGDBModule& Module : Modules) {
    // GDB 13 gives address ranges instead of "addr-low".
    EXPECT_NE(Module.EntryPoint, 0u) << Module.Name;
    EXPECT_EQ(Module.BaseAddress, Module.EntryPoint) << Module.Name;
    EXPECT_THAT(Module.Path, EndsWith(Module.Name));
    EXPECT_TRUE(Module.SymPath.empty()) << "GDB read no symbols of " << Module.Name;
  }
  EXPECT_EQ(Modules[1].EntryPoint, 0x00007ffff7df8380u);
  EXPECT_NE(Modules[0].Id, Modules[1].Id);
}

TEST(TranscriptEvents, TemplateBreakpointStopsInBothInstances) {
  TTranscriptReplay Replay;
  Replay.Replay("templates");
  const auto& Hits = Replay.Process.BreakpointHits;

  ASSERT_EQ(Hits.size(), 3u);
  EXPECT_EQ(Hits[0].first, 1);
  EXPECT_EQ(Hits[0].second.Location.Address, 0x000055555555526eu);
  EXPECT_EQ(Hits[1].first, 1) << "the second location of breakpoint 1";
  EXPECT_EQ(Hits[1].second.Location.Address, 0x0000555555555284u);
  EXPECT_TRUE(IsAt(Hits[1].second.Location, "templates.cpp", 7));
  EXPECT_EQ(Hits[2].first, 2);
  EXPECT_TRUE(IsAt(Hits[2].second.Location, "templates.cpp", 27));
  // GDB's "=breakpoint-modified" (every hit, the multi-location shape too)
  // is not a move of the breakpoint.
  EXPECT_FALSE(Replay.Process.Called("BreakpointModified"));
  // Step into the method, then finish back into main.
  ASSERT_EQ(Replay.Process.Suspensions.size(), 5u);
  EXPECT_TRUE(IsAt(Replay.Process.Suspensions[3].Location, "templates.cpp", 15));
  EXPECT_TRUE(IsAt(Replay.Process.Suspensions[4].Location, "templates.cpp", 28));
}

TEST(TranscriptEvents, ProgramOutputInterleavedWithRecordsIsLogged) {
  TTranscriptReplay Replay;
  Replay.Replay("stops");
  const std::vector<std::string> Output = Replay.Process.Logged(etUnknown);

  // "partial " had no line end; the stop record glued behind it is still a
  // stop (checked in the stop order above), and only the text is logged.
  EXPECT_THAT(Output, ::testing::Contains("partial "));
  // "total=7" is glued to a "=breakpoint-modified" record, which is not one
  // of the records split off program output: the whole line is logged.
  EXPECT_THAT(Output, ::testing::Contains(StartsWith("total=7=breakpoint-modified,")));
  EXPECT_THAT(Output, ::testing::Contains(" done\n"));
  EXPECT_FALSE(Replay.Process.Called("Faulted"));
}

TEST(TranscriptEvents, ConsoleStreamReachesTheLogFlattened) {
  TTranscriptReplay Replay;
  Replay.Replay("stops");
  const std::vector<std::string> Console = Replay.Process.Logged(etConsole);

  EXPECT_THAT(Console, ::testing::Contains("GNU gdb (Debian 13.1-3) 13.1 "));
  EXPECT_THAT(Console, ::testing::Contains(StartsWith("Breakpoint 2, add (left=3, right=4) at ")));
  EXPECT_THAT(Console, ::testing::Contains("Hardware watchpoint 4: counter*2 "));
  EXPECT_THAT(Console, ::testing::Contains(::testing::MatchesRegex(R"(\[Inferior 1 \(process [0-9]+\) exited with code 010\] )")));
}

TEST(TranscriptEvents, SignalTextGluedToProgramOutputNeitherLostNorFatal) {
  TTranscriptReplay Replay;
  Replay.Replay("signals");
  const std::vector<std::string> Output = Replay.Process.Logged(etUnknown);

  // "raising" had no line end; GDB's console record follows on the same line.
  EXPECT_THAT(Output, ::testing::Contains(StartsWith("raising")));
  EXPECT_THAT(Output, ::testing::Contains(" faulting\n"));
  // The log stream's "No such file" for glibc's source is not an error.
  EXPECT_FALSE(Replay.Process.Called("Faulted"));
}

// ---------------------------------------------------------------------------
// Result decoders

TEST(TranscriptDecoders, BreakInsertResolvingToSeveralLocations) {
  TTranscriptReplay Replay;
  auto& Twice = Replay.Expect<TBreakInsertResult>("0070000000002");
  Replay.Replay("templates");

  // GDB 13 (mi2) puts the location tuples beside "bkpt", whose own address
  // is "<MULTIPLE>".
  EXPECT_TRUE(IsEntered(Twice));
  EXPECT_EQ(Twice.FBreakpoint, 1);
  EXPECT_TRUE(IsAt(Twice.FLocation, "templates.cpp", 7));
}

TEST(TranscriptDecoders, StackFramesThroughLibrariesAndOtherLanguages) {
  struct TCase {
    const char* Transcript;
    const char* Token;
    std::vector<std::string> Functions;
    const char* OuterFile;
    Integer OuterLine;
  };
  const TCase Cases[] = {
      {"signals", "0320000000004", {"__pthread_kill_implementation", "__pthread_kill_internal", "__GI_raise", "main"},
       "signals.c", 11},
      {"templates", "0320000000005", {"twice<int>", "main"}, "templates.cpp", 25},
      {"records", "0320000000004", {"SHIFT", "main"}, "records.pas", 27},
  };
  for (const TCase& Case : Cases) {
    TTranscriptReplay Replay;
    auto& Frames = Replay.Expect<TStackListFramesResult>(Case.Token);
    Replay.Replay(Case.Transcript);
    EXPECT_TRUE(IsEntered(Frames)) << Case.Transcript;
    std::vector<std::string> Functions;
    for (const TGDBStackFrame& Frame : Frames.FStackFrames)
      Functions.push_back(Frame.Header);
    EXPECT_EQ(Functions, Case.Functions) << Case.Transcript;
    if (!Frames.FStackFrames.empty()) {
      EXPECT_TRUE(IsAt(Frames.FStackFrames.back().Location, Case.OuterFile, Case.OuterLine)) << Case.Transcript;
    }
  }
}

TEST(TranscriptDecoders, PascalRecordArgumentAndNoLocals) {
  TTranscriptReplay Pascal;
  auto& PascalArguments = Pascal.Expect<TStackListArgumentsResult>("0310000000005");
  auto& NoLocals = Pascal.Expect<TStackListLocalsResult>("0330000000009");
  Pascal.Replay("records");

  EXPECT_TRUE(IsEntered(PascalArguments));
  ASSERT_FALSE(PascalArguments.FStackArguments.empty());
  const TNameValueArray& ShiftArguments = PascalArguments.FStackArguments[0].NameValues;
  ASSERT_EQ(ShiftArguments.size(), 2u);
  EXPECT_EQ(ShiftArguments[0].Name, "POINT");
  EXPECT_EQ(ShiftArguments[0].Value, "{X = 3, Y = 4}");
  EXPECT_EQ(ShiftArguments[1].Value, "2");
  EXPECT_TRUE(IsEntered(NoLocals));
  EXPECT_TRUE(NoLocals.FStackLocals.empty());
}

TEST(TranscriptDecoders, VariableObjectsOfArrayAndQuotedString) {
  TTranscriptReplay Replay;
  auto& Squares = Replay.Expect<TVarCreateResult>("0350000000020");
  auto& SquareChildren = Replay.Expect<TVarListChildrenResult>("0400000000021");
  auto& Count = Replay.Expect<TVarInfoNumChildrenResult>("0390000000022");
  auto& Name = Replay.Expect<TVarEvaluateExpressionResult>("0450000000023");
  Replay.Replay("stops");

  EXPECT_TRUE(IsEntered(Squares));
  EXPECT_EQ(Squares.FNumChild, 5);
  EXPECT_EQ(Squares.FType, "int [5]");
  EXPECT_TRUE(IsEntered(SquareChildren));
  std::vector<std::string> Expressions;
  for (const TGDBVarChild& Child : SquareChildren.FChildren)
    Expressions.push_back(Child.Expr);
  EXPECT_THAT(Expressions, ElementsAre("0", "1", "2", "3", "4"));
  EXPECT_TRUE(IsEntered(Count));
  EXPECT_EQ(Count.FCount, 5);
  EXPECT_TRUE(IsEntered(Name));
  EXPECT_EQ(Name.FValue, "0x555555556004 \"origin\"");
}

TEST(TranscriptDecoders, VariableObjectsOfClassAndPascalRecord) {
  TTranscriptReplay Replay;
  auto& Account = Replay.Expect<TVarCreateResult>("0350000000010");
  auto& Sections = Replay.Expect<TVarListChildrenResult>("0400000000011");
  auto& Path = Replay.Expect<TVarInfoPathExpressionResult>("0430000000014");
  Replay.Replay("templates");
  TTranscriptReplay Pascal;
  auto& Origin = Pascal.Expect<TVarCreateResult>("0350000000006");
  auto& Element = Pascal.Expect<TDataEvaluateExpressionResult>("0500000000008");
  Pascal.Replay("records");

  EXPECT_TRUE(IsEntered(Account));
  EXPECT_EQ(Account.FType, "Account");
  EXPECT_EQ(Account.FNumChild, 2);
  EXPECT_TRUE(IsEntered(Sections));
  ASSERT_EQ(Sections.FChildren.size(), 2u);
  EXPECT_EQ(Sections.FChildren[0].Expr, "public");
  EXPECT_EQ(Sections.FChildren[1].Expr, "private");
  EXPECT_EQ(Sections.FChildren[1].NumChild, 2);
  EXPECT_TRUE(Sections.FChildren[1].VarType.empty()) << "access sections have no type";
  EXPECT_TRUE(IsEntered(Path));
  EXPECT_EQ(Path.FExpr, "((savings).balance)");

  EXPECT_TRUE(IsEntered(Origin));
  EXPECT_EQ(Origin.FType, "TPOINT");
  EXPECT_TRUE(IsEntered(Element));
  EXPECT_EQ(Element.FValue, "20");
}

TEST(TranscriptDecoders, DisassemblyOverTwoSourceLinesAndLineAddresses) {
  TTranscriptReplay Replay;
  auto& Mixed = Replay.Expect<TDataDisassembleResult>("0490000000028", true);
  auto& Lines = Replay.Expect<TSymbolListLinesResult>("0680000000029", true);
  Replay.Replay("stops");

  // Only the first instruction of a source line carries the line.
  EXPECT_TRUE(IsEntered(Mixed));
  ASSERT_EQ(Mixed.FData.size(), 7u);
  EXPECT_TRUE(IsAt({Mixed.FData[0].Line, Mixed.FData[0].Source, 0}, "stops.c", 33));
  EXPECT_EQ(Mixed.FData[0].AsmData, "push   %rbp");
  EXPECT_EQ(Mixed.FData[1].Line, 0);
  EXPECT_TRUE(Mixed.FData[1].Source.empty());
  EXPECT_TRUE(IsAt({Mixed.FData[3].Line, Mixed.FData[3].Source, 0}, "stops.c", 34));
  EXPECT_EQ(Mixed.FData[3].Address, 0x000055555555519fu);

  EXPECT_TRUE(IsEntered(Lines));
  ASSERT_EQ(Lines.FLines.size(), 27u);
  ASSERT_EQ(Lines.FAddresses.size(), Lines.FLines.size());
  EXPECT_EQ(Lines.FLines[0], 17);
  EXPECT_EQ(Lines.FAddresses[0], 0x0000555555555159u);
}

TEST(TranscriptDecoders, RegisterNamesMapToGdbNumbers) {
  TTranscriptReplay Replay;
  auto& Names = Replay.Expect<TDataListRegisterNamesResult>("0520000000004", gcAMD64, "Linux64");
  Replay.Replay("registers");

  EXPECT_TRUE(IsEntered(Names));
  const TIntegerArray Ids = Names.GetRegisterIds();
  ASSERT_EQ(Ids.size(), 24u);
  EXPECT_EQ(Ids[14], 6) << "rbp";
  EXPECT_EQ(Ids[17], 17) << "our rflags is GDB's eflags";
  const TIntegerArray FPUIds = Names.GetFPURegisterIds();
  ASSERT_EQ(FPUIds.size(), 16u);
  EXPECT_EQ(FPUIds[15], 39) << "fop";
  const TIntegerArray XMMIds = Names.GetXMMRegisterIds();
  ASSERT_EQ(XMMIds.size(), 17u);
  EXPECT_EQ(XMMIds[16], 56) << "mxcsr";
}

TEST(TranscriptDecoders, X87RegistersHoldTheir80BitValue) {
  TTranscriptReplay Replay;
  auto& Stack = Replay.Expect<TDataListFPURegisterValuesResult>("0570000000007", TIntegerArray{24, 25, 26, 27, 28, 29, 30, 31});
  Replay.Replay("registers");

  // 5.0 as GDB prints st0 in hexadecimal: 0x4001a000000000000000.
  const std::vector<Byte> Five = {0, 0, 0, 0, 0, 0, 0, 0xa0, 0x01, 0x40, 0, 0, 0, 0, 0, 0};
  EXPECT_TRUE(IsEntered(Stack));
  ASSERT_EQ(Stack.FValues.size(), 8u);
  EXPECT_EQ(BytesOf(Stack.FValues[0]), Five);
  EXPECT_EQ(BytesOf(Stack.FValues[1]), std::vector<Byte>(16, 0));
}

TEST(TranscriptDecoders, SSERegistersFromGdbVectorGroups) {
  TTranscriptReplay Replay;
  auto& Set = Replay.Expect<TDataListXMMRegisterValuesResult>("0550000000013", TIntegerArray{42, 43});
  auto& Raw = Replay.Expect<TDataListXMMRegisterValuesResult>("0550000000014", 41);
  Replay.Replay("registers");

  const std::vector<Byte> Packed = {0x44, 0x33, 0x22, 0x11, 0x88, 0x77, 0x66, 0x55,
                                    0x08, 0x19, 0x2a, 0x3b, 0x4c, 0x5d, 0x6e, 0x7f};
  EXPECT_TRUE(IsEntered(Raw));
  EXPECT_EQ(BytesOf(Raw.FValue), Packed);

  EXPECT_TRUE(IsEntered(Set));
  ASSERT_EQ(Set.FValues.size(), 2u);
  EXPECT_EQ(BytesOf(Set.FValues[0]), (std::vector<Byte>{0x04, 0x03, 0x02, 0x01, 0x08, 0x07, 0x06, 0x05, 0x0c, 0x0b,
                                                        0x0a, 0x09, 0x10, 0x0f, 0x0e, 0x0d}));
  // GDB compresses the twelve zero bytes as "0x0 <repeats 12 times>".
  std::vector<Byte> Answer(16, 0);
  Answer[12] = 0x2a;
  EXPECT_EQ(BytesOf(Set.FValues[1]), Answer);
}

} // namespace
} // namespace midebug::test
