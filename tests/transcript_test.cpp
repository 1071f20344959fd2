/// \file
/// Real GDB 13 transcripts (tests/data/transcripts, recorded by record.sh
/// there) fed to the output parser block by block, as the kernel hands them
/// over. TranscriptEvents pins down the stops and notifications a
/// user sees; TranscriptDecoders the replies in the stream whose shapes the
/// decoder tests' recorded replies do not already show.

#include "mi/gdboutput.h"
#include "mi/gdbresult.h"
#include "recordingprocess.h"
#include "testsupport.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace midebug::test {
namespace {

using ::testing::ElementsAre;

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

// ---------------------------------------------------------------------------
// Stops, notifications and streams

TEST(TranscriptEvents, StopsOfBreakpointsStepsFinishAndWatchpointsInOrder) {
  TTranscriptReplay Replay;
  Replay.Replay("stops");
  const auto& Stops = Replay.Process.Suspensions;

  // Breakpoint at main, four steps (the last glued behind the program's
  // "partial "),
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

  // A watchpoint's hit is offered to its listener by the first number the
  // stop names.
  ASSERT_EQ(Replay.Process.BreakpointHits.size(), 4u);
  EXPECT_EQ(Replay.Process.BreakpointHits[0].first, 1);
  EXPECT_EQ(Replay.Process.BreakpointHits[1].first, 2);
  EXPECT_EQ(Replay.Process.BreakpointHits[1].second.Location.Address, 0x0000555555555163u);
  EXPECT_EQ(Replay.Process.BreakpointHits[2].first, 3);
  EXPECT_EQ(Replay.Process.BreakpointHits[3].first, 5);
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

} // namespace
} // namespace midebug::test
