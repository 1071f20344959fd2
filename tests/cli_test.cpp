// The console debugger `midebug` as a tool sees it: run in batch mode with
// JSON output on small programs compiled here, driving the real GDB through
// the default "local" profile.

#include "testsupport.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <filesystem>
#include <regex>
#include <string>
#include <signal.h>
#include <vector>

namespace midebug {
namespace {

using nlohmann::json;
using test::Debuggee;
using test::Quote;
using test::TCliRun;

class CliTest : public ::testing::Test {
protected:
  TCliRun RunCli(const std::string& Arguments, const std::string& Commands, bool Json = true) {
    return test::RunCli(Scratch, Arguments, Commands, Json);
  }
  test::TScratchDir Scratch;
};

/// The line of tests/debuggees/loop.c that holds Marker.
Integer LineOf(const std::string& Marker) { return test::LineOf("loop.c", Marker); }

std::string FileName(const json& Object) {
  return std::filesystem::path(Object.value("file", std::string())).filename().string();
}

// --- Errors -------------------------------------------------------------------

TEST_F(CliTest, CliCommandsThatCannotRunSayWhyAndTheSessionGoesOn) {
  const std::string Program = Debuggee("exitthree");
  const TCliRun Run = RunCli(Quote(Program), "frobnicate now\nnext\nbt\nthread x\nkill now\n");
  // A batch run in which a command failed says so in its exit status.
  EXPECT_EQ(Run.ExitCode, 3);
  const json* Unknown = Run.Answer("frobnicate");
  ASSERT_NE(Unknown, nullptr) << Run.Stdout;
  EXPECT_NE((*Unknown)["error"].get<std::string>().find("unknown command 'frobnicate'"), std::string::npos);
  for (const char* Name : {"next", "bt"}) {
    const json* Answer = Run.Answer(Name);
    ASSERT_NE(Answer, nullptr) << Name;
    EXPECT_NE((*Answer)["error"].get<std::string>().find("not running"), std::string::npos) << Name;
  }
  const json* Thread = Run.Answer("thread");
  ASSERT_NE(Thread, nullptr);
  EXPECT_EQ((*Thread)["error"], "usage: thread N");
  const json* Kill = Run.Answer("kill");
  ASSERT_NE(Kill, nullptr);
  EXPECT_EQ((*Kill)["error"], "'kill' takes no arguments");
}

// --- Attaching -----------------------------------------------------------------

TEST_F(CliTest, CliAttachShowsTheStackAndDetachLeavesTheProgramRunning) {
  const int Pid = test::StartDebuggee("sleeper");
  ASSERT_NE(Pid, 0);
  const TCliRun Run = RunCli("--attach " + std::to_string(Pid), "bt\ndetach\n");
  const bool StillRunning = kill(Pid, 0) == 0;
  kill(Pid, SIGKILL);

  const json* Attached = Run.Event("attached");
  ASSERT_NE(Attached, nullptr) << Run.Stdout << Run.Stderr;
  EXPECT_EQ((*Attached)["pid"], Pid);
  const json* Backtrace = Run.Answer("bt");
  ASSERT_NE(Backtrace, nullptr);
  ASSERT_FALSE(Backtrace->contains("error")) << *Backtrace;
  const json& Frames = (*Backtrace)["frames"];
  ASSERT_FALSE(Frames.empty());
  EXPECT_NE(Frames.back()["header"].get<std::string>().find("main"), std::string::npos) << *Backtrace;
  EXPECT_EQ(FileName(Frames.back()), "sleeper.c");
  const json* Detach = Run.Answer("detach");
  ASSERT_NE(Detach, nullptr);
  EXPECT_EQ((*Detach)["state"], "detached");
  EXPECT_TRUE(StillRunning);
}

// --- Stopping and stepping -------------------------------------------------------

TEST_F(CliTest, CliSteppingNextStepAndFinishFollowTheSource) {
  const std::string Program = Debuggee("loop");
  const TCliRun Run = RunCli(Quote(Program), "start\nnext\nnext\nstep\nbt\nfinish\ncontinue\n");
  EXPECT_EQ(Run.ExitCode, 0) << Run.Stderr;
  const json* Loaded = Run.Event("loaded");
  ASSERT_NE(Loaded, nullptr) << Run.Stdout;
  EXPECT_EQ((*Loaded)["program"], Program);
  EXPECT_EQ((*Loaded)["language"], "c");
  const std::vector<json> Stops = Run.All("event", "stopped");
  ASSERT_EQ(Stops.size(), 5u) << Run.Stdout << Run.Stderr;
  EXPECT_EQ(Stops[0]["reason"], "breakpoint");
  EXPECT_EQ(Stops[0]["line"], LineOf("main-first"));
  EXPECT_NE(Stops[0].value("text", "").find("main-first"), std::string::npos);
  EXPECT_EQ(Stops[1]["line"], LineOf("main-loop"));
  EXPECT_EQ(Stops[1]["reason"], "step");
  EXPECT_EQ(Stops[2]["line"], LineOf("main-call"));
  EXPECT_EQ(Stops[3]["line"], LineOf("square-body"));
  // Out of square, back in main's loop line.
  EXPECT_EQ(FileName(Stops[4]), "loop.c");
  EXPECT_EQ(Stops[4]["line"], LineOf("main-call"));
  EXPECT_EQ(Stops[4]["returned"], "1") << "square(1)";
  EXPECT_FALSE(Stops[3].contains("returned"));

  const json* Backtrace = Run.Answer("bt");
  ASSERT_NE(Backtrace, nullptr);
  ASSERT_FALSE(Backtrace->contains("error")) << *Backtrace;
  const json& Frames = (*Backtrace)["frames"];
  ASSERT_EQ(Frames.size(), 2u) << *Backtrace;
  EXPECT_EQ(Frames[0]["level"], 0);
  EXPECT_NE(Frames[0]["header"].get<std::string>().find("square"), std::string::npos) << Frames[0];
  EXPECT_EQ(Frames[0]["line"], LineOf("square-body"));
  EXPECT_NE(Frames[1]["header"].get<std::string>().find("main"), std::string::npos) << Frames[1];
  EXPECT_EQ(Frames[1]["line"], LineOf("main-call"));

  const json* Exited = Run.Event("exited");
  ASSERT_NE(Exited, nullptr);
  EXPECT_EQ((*Exited)["code"], 4);
}

// --- The program's arguments, input and ends ------------------------------------

TEST_F(CliTest, CliProgramGetsItsArgumentsExactlyAndEmptyOrChosenInput) {
  const std::string Marker = Scratch.Path() + "/touched";
  const std::vector<std::string> Arguments = {"$HOME", "*", "x;y", "$(touch " + Marker + ")", "two\nlines", "", "end"};
  std::string Line;
  for (const std::string& Argument : Arguments)
    Line += " " + Quote(Argument);
  const TCliRun Echoed = RunCli(Quote(Debuggee("argsecho")) + Line, "run\n");
  EXPECT_EQ(Echoed.ExitCode, 0) << Echoed.Stderr;
  EXPECT_EQ(Echoed.Output(), "[$HOME]\n[*]\n[x;y]\n[$(touch " + Marker + ")]\n[two\nlines]\n[]\n[end]\n");
  EXPECT_FALSE(std::filesystem::exists(Marker));
  // Every address is a hex string, a module's base too.
  const std::vector<json> Modules = Echoed.All("event", "module-loaded");
  ASSERT_FALSE(Modules.empty()) << Echoed.Stdout;
  EXPECT_TRUE(Modules.front()["base"].get<std::string>().starts_with("0x")) << Modules.front();

  // A program reading its input sees its end at once, or reads --stdin's file.
  const TCliRun Empty = RunCli(Quote(Debuggee("terminal")) + " read", "run\n");
  EXPECT_EQ(Empty.Output(), "waiting for input\n");
  const std::string Input = Scratch.WriteFile("input.txt", "first\nsecond\n");
  const TCliRun Fed = RunCli("--stdin " + Quote(Input) + " " + Quote(Debuggee("terminal")) + " read", "run\n");
  EXPECT_EQ(Fed.Output(), "waiting for input\ngot:first\ngot:second\n");
  for (const TCliRun* Run : {&Empty, &Fed}) {
    const json* Exited = Run->Event("exited");
    ASSERT_NE(Exited, nullptr) << Run->Stdout;
    EXPECT_EQ((*Exited)["code"], 0);
  }
}

TEST_F(CliTest, CliEndsAreReportedAsTheyHappenAndTheProgramRunsAgain) {
  // A relative path, with the debugger named by its path.
  const std::string Relative =
      std::filesystem::relative(Debuggee("exitthree"), std::filesystem::canonical(Scratch.Path())).string();
  const TCliRun Again =
      RunCli("--debugger /usr/bin/gdb --no-thread-events " + Quote(Relative), "start\nkill\nrun\nstart\ncontinue\n");
  EXPECT_EQ(Again.ExitCode, 0) << Again.Stderr;
  const std::vector<json> Ends = Again.All("event", "exited");
  ASSERT_EQ(Ends.size(), 3u) << Again.Stdout;
  EXPECT_EQ(Ends[0], json({{"event", "exited"}, {"reason", "killed"}}));
  EXPECT_EQ(Ends[1], json({{"event", "exited"}, {"reason", "exited"}, {"code", 3}}));
  EXPECT_EQ(Ends[2], Ends[1]);
  EXPECT_EQ(Again.Event("thread-created"), nullptr);

  const TCliRun Signalled = RunCli(Quote(Debuggee("signals")), "run\ncontinue\n");
  const json* Stop = Signalled.Event("stopped");
  ASSERT_NE(Stop, nullptr) << Signalled.Stdout;
  EXPECT_EQ((*Stop)["reason"], "signal");
  EXPECT_EQ((*Stop)["signal"], "SIGUSR1");
  const json* End = Signalled.Event("exited");
  ASSERT_NE(End, nullptr) << Signalled.Stdout;
  EXPECT_EQ(*End, json({{"event", "exited"}, {"reason", "signal"}, {"signal", "SIGUSR1"}}));
  // GDB's own notes on threads and the end are not repeated.
  for (const TCliRun* Run : {&Again, &Signalled})
    for (const char* Chatter : {"[New Thread", "[Inferior", "Program terminated"})
      EXPECT_EQ(Run->Output().find(Chatter), std::string::npos) << Run->Output();

  {
    // A debugger that dies is reported at once, as such.
    test::TFakeOnPath Fake("gdb", "gdb-dies-on-request.script");
    const TCliRun Lost = RunCli(Quote(Debuggee("exitthree")), "run\n");
    const json* Gone = Lost.Event("exited");
    ASSERT_NE(Gone, nullptr) << Lost.Stdout << Lost.Stderr;
    EXPECT_EQ((*Gone)["reason"], "debugger-lost") << *Gone;
  }

  const std::string Text = Scratch.WriteFile("notes.txt", "not a program\n");
  const TCliRun Refused = RunCli(Quote(Text), "run\n");
  EXPECT_EQ(Refused.ExitCode, 1);
  const json* Refusal = Refused.Answer("start");
  ASSERT_NE(Refusal, nullptr) << Refused.Stdout;
  EXPECT_EQ((*Refusal)["error"], Text + " is not an executable program");
}

TEST_F(CliTest, CliBacktraceOfADeepStackReadsLikeGdbsAndReachesEveryFrame) {
  // Past atoi, two steps per call take main about 25 calls deep into recurse.
  std::string Commands = "start\nstep\nfinish\n";
  for (int Step = 0; Step < 50; ++Step)
    Commands += "step\n";
  const TCliRun Run =
      RunCli("--no-thread-events " + Quote(Debuggee("deep")) + " 30", Commands + "bt\nbt -2\nframe 22\n", false);
  EXPECT_EQ(Run.ExitCode, 0) << Run.Stderr;
  const std::string Frame = R"(0x[0-9a-f]{16} in recurse \(left=[0-9]+\) at deep\.c:[0-9]+)";
  EXPECT_TRUE(std::regex_search(Run.Stdout, std::regex("\n  #1  " + Frame + "\n"))) << Run.Stdout;
  EXPECT_TRUE(std::regex_search(Run.Stdout, std::regex("\n  #19  " + Frame + "\n\\([0-9]+ more frames; ")))
      << Run.Stdout;
  const std::regex Main(R"(\n  #[0-9]+  0x[0-9a-f]{16} in main \(argc=2, argv=0x[0-9a-f]+\) at deep\.c:11\n)");
  EXPECT_TRUE(std::regex_search(Run.Stdout, Main)) << Run.Stdout;
  EXPECT_TRUE(std::regex_search(Run.Stdout, std::regex("\n#22  " + Frame + "\n"))) << Run.Stdout;
}

// --- Source lines -------------------------------------------------------------

// tests/debuggees/sourcelines.c: main runs from line 4 to 12, below is at
// lines 13 to 15.
TEST_F(CliTest, CliListsSourceShowsALinesCodeAndMovesTheNextStatement) {
  const std::string Program = Quote(Debuggee("sourcelines"));
  const TCliRun Run = RunCli(Program, "list below\nstart\ninfo line sourcelines.c:9\nlist\njump 14\njump 10\n"
                                      "next\ninfo line *0x1\nlist nosuch\njump x\n");
  const std::vector<json> Lists = Run.All("answer", "list");
  ASSERT_EQ(Lists.size(), 3u) << Run.Stdout;
  EXPECT_EQ(Lists[0]["lines"].front()["line"], 8) << "five lines before below's first line";
  EXPECT_EQ(Lists[0]["lines"].back()["line"], 15) << "to the end of the file";
  const json& AtStart = Lists[1]["lines"];
  ASSERT_EQ(AtStart.size(), 10u);
  for (const json& Line : AtStart)
    EXPECT_EQ(Line["current"], Line["line"] == 5) << Line;
  EXPECT_EQ(AtStart[4]["text"], "  int total = 0;");
  EXPECT_EQ(Lists[2]["error"], "no function or line 'nosuch'");

  const std::vector<json> Infos = Run.All("answer", "info line");
  ASSERT_EQ(Infos.size(), 2u) << Run.Stdout;
  EXPECT_EQ(Infos[0]["line"], 9);
  EXPECT_EQ(FileName(Infos[0]), "sourcelines.c");
  EXPECT_LT(std::stoull(Infos[0]["start"].get<std::string>(), nullptr, 16),
            std::stoull(Infos[0]["end"].get<std::string>(), nullptr, 16));
  EXPECT_TRUE(Infos[1].contains("error")) << Infos[1];

  const std::vector<json> Jumps = Run.All("answer", "jump");
  ASSERT_EQ(Jumps.size(), 3u) << Run.Stdout;
  EXPECT_EQ(Jumps[0]["error"], "cannot move to line 14: it is not in the current function");
  EXPECT_EQ(Jumps[1]["line"], 10);
  EXPECT_EQ(Jumps[2]["error"], "usage: jump LINE");
  const json* Next = Run.Find([](const json& Line) { return Line.value("event", "") == "stopped" && Line["line"] == 11; });
  EXPECT_NE(Next, nullptr) << "the program went on from line 10: " << Run.Stdout;
}

} // namespace
} // namespace midebug
