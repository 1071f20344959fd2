// Breakpoints the IDE sets, against the real GDB through the "local"
// profile: where GDB places them, what the IDE hears when they are hit, and
// the operations that change them; LLDB's forms on the fake debugger.

#include "breakpointtesting.h"

#include <filesystem>

namespace midebug {
namespace {

using test::Debuggee;
using test::MarkedLine;
using test::TBreakpointRecorder;

class Breakpoints : public test::TDebugFixture {};

Integer Line(const std::string& Marker) { return MarkedLine("breakpoints.c", Marker); }

TEST_F(Breakpoints, SourceBreakpointsAreVerifiedWhereGdbPlacesThemAndHitOnTheMainThread) {
  Launch(Debuggee("breakpoints"));
  // A line without code moves to the next line with code; a line or file
  // that does not exist is not verified, and the session goes on.
  auto Moved = Recorder(), NoLine = Recorder(), NoFile = Recorder();
  Process->CreateSourceBreakpoint("breakpoints.c", Line("comment"), Moved);
  Process->CreateSourceBreakpoint("breakpoints.c", 999, NoLine);
  Process->CreateSourceBreakpoint("nosuch.c", 3, NoFile);
  ASSERT_EQ(Moved->Verdicts().size(), 1u);
  EXPECT_TRUE(Moved->Last().Verified && Moved->Last().Location.Line == Line("bump-add"));
  EXPECT_FALSE(NoLine->Last().Verified || NoFile->Last().Verified);

  // The IDE's breakpoint at main declines, the run-to-main one there stops:
  // GDB names only one of them, both hear the hit.
  auto AtMain = Recorder();
  AtMain->Stop = false;
  Process->CreateSourceBreakpoint("breakpoints.c", Line("main-first"), AtMain);
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop() && AtMain->Hits == 1);
  EXPECT_EQ(StopLocation().Line, Line("main-first"));
  // Set while stopped.
  auto Later = Recorder();
  Process->CreateSourceBreakpoint("breakpoints.c", Line("upper-write"), Later);
  ASSERT_TRUE(Later->Last().Verified);

  ASSERT_TRUE(ResumeToStop());
  EXPECT_TRUE(Moved->Hits == 1 && Moved->LastThread == 1 && Process->GetSuspendedThreadId() == 1);
  EXPECT_EQ(StopReason(), tsrAtBreakpoint);
  EXPECT_EQ(StopLocation().Line, Line("bump-add"));
  // The program was loaded elsewhere than its file says: the listener heard
  // the address it is hit at.
  EXPECT_EQ(Moved->Last().Location.Address, StopLocation().Address);
  const size_t VerdictsBefore = Moved->Verdicts().size();

  // Declined hits resume silently.
  Moved->Stop = false;
  ASSERT_TRUE(ResumeToStop());
  EXPECT_TRUE(Moved->Hits == 3 && Later->Hits == 1);
  EXPECT_EQ(StopLocation().Line, Line("upper-write"));
  // GDB reports every hit as a change; the listener is not told again.
  EXPECT_EQ(Moved->Verdicts().size(), VerdictsBefore);
  EXPECT_EQ(Listener->CountOf("Suspended("), 3u);
}

TEST_F(Breakpoints, AddressBreakpointsFollowDeleteEnableAndDisable) {
  LaunchToMain(Debuggee("breakpoints"));
  auto BySource = Recorder();
  Process->CreateSourceBreakpoint("breakpoints.c", Line("bump-add"), BySource);
  const UInt64 Address = BySource->Last().Location.Address;
  Process->DeleteBreakpoint(BySource->Last().Breakpoint);
  auto ByAddress = Recorder(), End = Recorder();
  Process->CreateAddressBreakpoint(Address, ByAddress);
  ASSERT_TRUE(ByAddress->Last().Verified);
  EXPECT_EQ(ByAddress->Last().Location.Line, Line("bump-add"));
  Process->CreateSourceBreakpoint("breakpoints.c", Line("upper-write"), End);
  const Integer Number = ByAddress->Last().Breakpoint;

  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(StopLocation().Address, Address);
  Process->DisableBreakpoint(Number);
  Process->EnableBreakpoint(Number);
  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(ByAddress->Hits, 2);
  Process->DisableBreakpoint(Number);
  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(StopLocation().Line, Line("upper-write"));
  EXPECT_EQ(BySource->Hits, 0);
  Process->DeleteBreakpoint(End->Last().Breakpoint);
  Process->DeleteBreakpoint(-1);
  Process->EnableBreakpoint(-1);
  Process->DisableBreakpoint(-1);
  Process->Resume();
  EXPECT_TRUE(Listener->PumpUntilCall("Exited(1,"));
}

TEST_F(Breakpoints, ABreakpointWithSeveralLocationsIsOneNumberAndEveryLocationIsHit) {
  // A template instantiated for int and double: one line, two places. The
  // function breakpoint lands on the same two places and hears the same hits.
  const Integer Body = MarkedLine("templates.cpp", "twice-body");
  Launch(Debuggee("templates"), glCPP);
  auto OnLine = Recorder(), OnFunction = Recorder();
  Process->CreateSourceBreakpoint("templates.cpp", Body, OnLine);
  Process->CreateFunctionBreakpoint("twice", OnFunction);
  for (const auto& Recorded : {OnLine, OnFunction}) {
    const auto Verdicts = Recorded->Verdicts();
    ASSERT_EQ(Verdicts.size(), 2u);
    EXPECT_TRUE(Verdicts[0].Verified && Verdicts[1].Verified && Verdicts[1].Location.Line == Body);
    EXPECT_EQ(Verdicts[0].Breakpoint, Verdicts[1].Breakpoint);
    EXPECT_NE(Verdicts[0].Location.Address, Verdicts[1].Location.Address);
  }
  Process->Run();
  ASSERT_TRUE(NextStop() && ResumeToStop());
  EXPECT_EQ(StopLocation().Line, Body);
  EXPECT_EQ(OnLine->Hits + OnFunction->Hits, 4);
}

TEST_F(Breakpoints, APendingBreakpointInALibraryLoadedLaterIsVerifiedWhenItLoads) {
  Launch(Debuggee("pluginhost"));
  auto InPlugin = Recorder(), OnFunction = Recorder();
  Process->CreateSourceBreakpoint("plug.c", 1, InPlugin);
  Process->CreateFunctionBreakpoint("answer", OnFunction);
  Process->CreateFunctionBreakpoint("not a name", OnFunction);
  EXPECT_FALSE(InPlugin->Last().Verified || OnFunction->Verdicts()[0].Verified);
  EXPECT_EQ(OnFunction->Last().Breakpoint, -1);
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(InPlugin->Hits + OnFunction->Hits, 2);
  const auto Verdicts = InPlugin->Verdicts();
  ASSERT_GE(Verdicts.size(), 2u);
  EXPECT_TRUE(Verdicts[1].Verified && Verdicts[1].Location.Line == 1);
  EXPECT_EQ(Verdicts[1].Location.Address, StopLocation().Address);
  // Unloaded again, it is pending once more.
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(4,"));
  EXPECT_FALSE(InPlugin->Last().Verified);
}

TEST_F(Breakpoints, WatchpointsStopWhereTheWatchedBytesAreWrittenOrRead) {
  LaunchToMain(Debuggee("breakpoints"), "1");
  const UInt64 Counter = AddressOf("&counter");
  // The unsized watch covers an int: the write to the upper half of the
  // long escapes it, not the sized one.
  auto LowHalf = Recorder(), Whole = Recorder(), Reads = Recorder();
  Process->CreateWatchBreakpoint(Counter, false, false, LowHalf);
  Process->CreateSizedWatchBreakpoint(Counter, 8, false, false, Whole);
  ASSERT_TRUE(LowHalf->Last().Verified && Whole->Last().Verified);
  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(StopReason(), tsrAtBreakpoint);
  EXPECT_EQ(LowHalf->Hits + Whole->Hits, 1);
  Process->DeleteBreakpoint(LowHalf->Last().Breakpoint);
  const Integer WholeHits = Whole->Hits;
  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(Whole->Hits, WholeHits + 1);
  EXPECT_EQ(StopLocation().Line, Line("upper-read"));

  Process->DeleteBreakpoint(Whole->Last().Breakpoint);
  Process->CreateSizedWatchBreakpoint(Counter, 8, true, false, Reads);
  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(Reads->Hits, 1);
  EXPECT_EQ(StopLocation().Line, Line("upper-read"));
  auto Nothing = Recorder();
  Process->CreateSizedWatchBreakpoint(Counter, 0, false, false, Nothing);
  EXPECT_FALSE(Nothing->Last().Verified);
}

TEST_F(Breakpoints, AWatchpointBeyondTheHardwareSlotsIsNotVerifiedAndTheProgramStaysStopped) {
  LaunchToMain(Debuggee("breakpoints"), "1");
  const UInt64 Counter = AddressOf("&counter");
  std::vector<TIntfPtr<TBreakpointRecorder>> Watches;
  for (UInt64 Offset = 0; Offset < 40; Offset += 8) {
    Watches.push_back(Recorder());
    Process->CreateSizedWatchBreakpoint(Counter + Offset, 8, false, false, Watches.back());
    ASSERT_TRUE(Watches.back()->Last().Verified);
  }
  // The resume is refused: the stop is told again where it was.
  ASSERT_TRUE(ResumeToStop());
  EXPECT_TRUE(Listener->HasCallContaining("Could not insert hardware watchpoint"));
  EXPECT_FALSE(Watches.back()->Last().Verified);
  Process->DeleteBreakpoint(Watches.back()->Verdicts().front().Breakpoint);
  ASSERT_TRUE(ResumeToStop());
  EXPECT_EQ(Watches.front()->Hits, 1);
}

class BreakpointsOnLLDB : public test::TDebugFixture {};

TEST_F(BreakpointsOnLLDB, MatchedAddressesAreEachTheirOwnBreakpointAndTheAllOnesAddressIsUnverified) {
  test::TFakeOnPath Fake("lldb-mi", "breakpoints-lldb-matches.script");
  Process = TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glC, gcAMD64,
                                              "lldb-mi");
  ASSERT_TRUE(Process);
  auto Matched = Recorder(), Unplaced = Recorder();
  Process->CreateSourceBreakpoint("a.c", 5, Matched);
  Process->CreateSourceBreakpoint("b.c", 9, Unplaced);
  const auto Verdicts = Matched->Verdicts();
  ASSERT_EQ(Verdicts.size(), 3u);
  EXPECT_TRUE(Verdicts[0].Verified && Verdicts[1].Verified && Verdicts[1].Breakpoint == 2);
  EXPECT_FALSE(Verdicts[2].Verified || Unplaced->Last().Verified);
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(Matched->Hits, 1);
  // Placed later, LLDB says so.
  ASSERT_TRUE(Listener->PumpUntil([&] { return Unplaced->Verdicts().size() == 2; }));
  EXPECT_TRUE(Unplaced->Last().Verified);
  EXPECT_EQ(Unplaced->Last().Location.Address, 0x4000u);
}

TEST_F(BreakpointsOnLLDB, TheRealFrontEndVerifiesAndHitsASourceBreakpointAndNotAMissingFile) {
  if (!FindLLDB())
    GTEST_SKIP() << WhyNot;
  Process = TGDBProcessManager::CreateProcess(Listener, Debuggee("breakpoints"), "", Scratch.Path(), "local",
                                              "Linux64", glC, gcAMD64, LLDB);
  ASSERT_TRUE(Process);
  auto InBump = Recorder(), Missing = Recorder();
  Process->CreateSourceBreakpoint("breakpoints.c", Line("bump-add"), InBump);
  Process->CreateSourceBreakpoint("nosuch.c", 3, Missing);
  EXPECT_TRUE(InBump->Last().Verified && InBump->Last().Location.Line == Line("bump-add"));
  EXPECT_FALSE(Missing->Last().Verified);
  Process->Run();
  EXPECT_TRUE(NextStop() && InBump->Hits == 1);
}

} // namespace
} // namespace midebug
