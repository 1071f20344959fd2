// The console debugger's breakpoint, watchpoint and exception commands, run
// in batch mode with JSON output against the real GDB.

#include "breakpointtesting.h"

#include <nlohmann/json.hpp>


namespace midebug {
namespace {

using nlohmann::json;
using test::Debuggee;

using test::Quote;
using test::RunCli;
using test::TCliRun;

Integer Line(const std::string& File, const std::string& Marker) { return test::MarkedLine(File, Marker); }

class CliBreakpoints : public ::testing::Test {
protected:
  test::TScratchDir Scratch;
};

TEST_F(CliBreakpoints, BreakpointsStopSayWhichCountHitsAndFollowIgnoreEnableDisableAndDelete) {
  const std::string Bump = "breakpoints.c:" + std::to_string(Line("breakpoints.c", "bump-add"));
  const TCliRun Run = RunCli(Scratch, Quote(Debuggee("breakpoints")) + " 3",
                   "break " + Bump + "\ntbreak main\nbreak nosuch.c:3\nrun\ninfo breakpoints\nignore 1 1\ncontinue\n"
                   "disable 1\nenable 1\ncontinue\ninfo breakpoints\ndelete 1\ncontinue\n");
  const auto Stops = Run.All("event", "stopped");
  ASSERT_EQ(Stops.size(), 3u) << Run.Stdout;
  EXPECT_EQ(Stops[0]["breakpoint"], 2);
  EXPECT_EQ(Stops[1]["breakpoint"], 1);
  EXPECT_EQ(Stops[1]["line"], Line("breakpoints.c", "bump-add"));
  EXPECT_EQ(Stops[2]["breakpoint"], 1);
  const auto Lists = Run.All("answer", "info breakpoints");
  // The temporary one is gone once it stopped; the missing file is pending.
  ASSERT_EQ(Lists.at(0)["breakpoints"].size(), 2u);
  EXPECT_EQ(Lists.at(0)["breakpoints"][1]["verified"], false);
  EXPECT_EQ(Lists.at(1)["breakpoints"][0]["hits"], 3);
  EXPECT_EQ(Lists.at(1)["breakpoints"][0]["locations"].size(), 1u);
  EXPECT_EQ(Run.All("event", "exited").at(0)["code"], 1);
}

TEST_F(CliBreakpoints, AConditionStopsOnlyWhereItHoldsAndOneThatCannotBeTestedStopsSayingWhy) {
  const std::string Bump = "breakpoints.c:" + std::to_string(Line("breakpoints.c", "bump-add"));
  const TCliRun Run = RunCli(Scratch, Quote(Debuggee("breakpoints")) + " 5",
                             "break " + Bump + " if counter == 2\nrun\nprint counter\ncondition 1 nosuch > 1\n"
                             "continue\ncondition 1\ncontinue\ninfo breakpoints\n");
  ASSERT_EQ(Run.All("event", "stopped").size(), 3u) << Run.Stdout;
  EXPECT_EQ(Run.All("answer", "print").at(0)["value"], "2");
  EXPECT_EQ(Run.All("event", "warning").size(), 1u) << Run.Stdout;
  EXPECT_EQ(Run.All("answer", "info breakpoints").at(0)["breakpoints"][0]["hits"], 3);
}

TEST_F(CliBreakpoints, WatchStopsWhereTheWatchedBytesAreWrittenAndSaysWhichWatchpoint) {
  const std::string Address = test::Hex(test::SymbolAddress(Debuggee("breakpoints"), "counter"));
  const TCliRun Run = RunCli(Scratch, Quote(Debuggee("breakpoints")) + " 1",
                   "start\nwatch &counter 8\nwatch -r " + Address + " 8\ndelete 2\ncontinue\n" +
                       "continue\nwatch\nwatch -a 0x10 zero\n");
  const auto Stops = Run.All("event", "stopped");
  ASSERT_EQ(Stops.size(), 3u) << Run.Stdout;
  EXPECT_TRUE(Stops[1]["breakpoint"] == 1 && Stops[2]["breakpoint"] == 1);
  EXPECT_EQ(Stops[2]["line"], Line("breakpoints.c", "upper-read"));
  const auto Watches = Run.All("answer", "watch");
  ASSERT_EQ(Watches.size(), 4u);
  EXPECT_EQ(Watches[0]["verified"], true);
  EXPECT_EQ(Watches[2]["error"], "usage: watch [-r|-a] ADDRESS [SIZE]");
  EXPECT_TRUE(Watches[3].contains("error"));
}

TEST_F(CliBreakpoints, CatchStopsAtExceptionsNamedByTheirTypeAndMessageAndUncatchLetsThemGo) {
  const TCliRun Cpp = RunCli(Scratch, Quote(Debuggee("throws")) + " 1", "catch throw\nrun\nuncatch\ncontinue\n");
  const auto Thrown = Cpp.All("event", "exception");
  ASSERT_EQ(Thrown.size(), 1u) << Cpp.Stdout;
  EXPECT_TRUE(Thrown[0]["name"] == "std::runtime_error" && Thrown[0]["kind"] == "throw");
  EXPECT_EQ(Thrown[0]["line"], Line("throws.cpp", "throw"));
  EXPECT_EQ(Cpp.All("event", "stopped")[0]["reason"], "exception");
  EXPECT_EQ(Cpp.All("event", "exited")[0]["code"], 0);

  const TCliRun Pascal = RunCli(Scratch, Quote(Debuggee("raises")), "catch raise\nrun\ncontinue\ncontinue\n");
  const auto Raised = Pascal.All("event", "exception");
  ASSERT_EQ(Raised.size(), 2u) << Pascal.Stdout;
  EXPECT_TRUE(Raised[0]["name"] == "ETooDeep" && Raised[0]["description"] == "depth 12 is too deep");
  EXPECT_EQ(Raised[1]["name"], "TPlain");
}

TEST_F(CliBreakpoints, WrongArgumentsGetAClearErrorAndTheSessionGoesOn) {
  const TCliRun Run = RunCli(Scratch, Quote(Debuggee("breakpoints")),
                   "break *0xZZ\nbreak a.c:x\ndelete 7\nignore 9 1\ninfo frobs\ncatch bogus\n"
                   "break main\ninfo breakpoints\n");
  const std::pair<const char*, const char*> Expected[] = {
      {"break", "not an address: 0xZZ"},
      {"break", "not a line: x"},
      {"delete", "no breakpoint 7"},
      {"ignore", "no breakpoint 9"},
      {"info", "unknown command 'info'; 'help' lists the commands"},
      {"catch", "usage: catch throw|catch|raise"},
  };
  std::vector<json> Errors;
  for (const json& Object : Run.Lines)
    if (Object.contains("error"))
      Errors.push_back(Object);
  ASSERT_EQ(Errors.size(), std::size(Expected)) << Run.Stdout;
  for (size_t Index = 0; Index < Errors.size(); ++Index) {
    EXPECT_EQ(Errors[Index]["answer"], Expected[Index].first);
    EXPECT_EQ(Errors[Index]["error"], Expected[Index].second);
  }
  EXPECT_EQ(Run.All("answer", "info breakpoints").back()["breakpoints"][0]["verified"], true);
  EXPECT_NE(Run.ExitCode, 0);
}

} // namespace
} // namespace midebug
