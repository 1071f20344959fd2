// The console debugger `midebug` as a tool sees it: run in batch mode with
// JSON output on small programs compiled here, driving the real GDB through
// the default "local" profile.

#include "testsupport.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <sstream>
#include <string>
#include <signal.h>
#include <sys/wait.h>
#include <vector>

namespace midebug {
namespace {

using nlohmann::json;
using test::Debuggee;
using test::TScratchDir;

/// The generous limit, in seconds, a resuming command waits for a stop;
/// only reached when the program never stops.
const char* const WaitLimit = "20";

/// What one run of the console debugger printed and how it ended.
struct TCliRun {
  std::vector<json> Lines;
  std::string Stdout;
  std::string Stderr;
  int ExitCode = -1;

  /// The first object for which Match holds, or null.
  const json* Find(const std::function<bool(const json&)>& Match) const {
    for (const json& Line : Lines)
      if (Match(Line))
        return &Line;
    return nullptr;
  }
  const json* Event(const std::string& Name) const {
    return Find([&](const json& Line) { return Line.value("event", "") == Name; });
  }
  const json* Answer(const std::string& Name) const {
    return Find([&](const json& Line) { return Line.value("answer", "") == Name; });
  }
  /// The events and answers in order, as "event:NAME" and "answer:NAME",
  /// without the debugger's console chatter and modules.
  std::vector<std::string> Sequence() const {
    std::vector<std::string> Names;
    for (const json& Line : Lines) {
      if (Line.contains("answer"))
        Names.push_back("answer:" + Line["answer"].get<std::string>());
      else if (Line.contains("event") && Line["event"] != "output" && Line["event"] != "module-loaded" &&
               Line["event"] != "module-unloaded" && Line["event"] != "running" &&
               Line["event"] != "thread-created" && Line["event"] != "thread-exited")
        Names.push_back("event:" + Line["event"].get<std::string>());
    }
    return Names;
  }
};

std::string ReadAll(const std::string& Path) {
  std::ifstream Stream(Path);
  return std::string((std::istreambuf_iterator<char>(Stream)), std::istreambuf_iterator<char>());
}

std::string Quote(const std::string& Text) { return "'" + Text + "'"; }

class CliTest : public ::testing::Test {
protected:
  /// Runs `midebug --batch --json --wait LIMIT Arguments` with Commands on
  /// its standard input.
  TCliRun RunCli(const std::string& Arguments, const std::string& Commands) {
    const std::string Input = Scratch.WriteFile("commands.txt", Commands);
    const std::string Output = Scratch.Path() + "/stdout.txt";
    const std::string Errors = Scratch.Path() + "/stderr.txt";
    const std::string Command = "cd " + Quote(Scratch.Path()) + " && " + Quote(MIDEBUG_CLI) +
                                " --batch --json --wait " + WaitLimit + " " + Arguments + " < " + Quote(Input) +
                                " > " + Quote(Output) + " 2> " + Quote(Errors);
    TCliRun Run;
    const int Status = std::system(Command.c_str());
    Run.ExitCode = WIFEXITED(Status) ? WEXITSTATUS(Status) : -1;
    Run.Stdout = ReadAll(Output);
    Run.Stderr = ReadAll(Errors);
    std::istringstream Lines(Run.Stdout);
    for (std::string Line; std::getline(Lines, Line);) {
      json Object = json::parse(Line, nullptr, false);
      EXPECT_FALSE(Object.is_discarded()) << "not JSON: " << Line;
      if (!Object.is_discarded())
        Run.Lines.push_back(std::move(Object));
    }
    return Run;
  }

  TScratchDir Scratch;
};

/// The line of tests/debuggees/loop.c that holds Marker.
int LineOf(const std::string& Marker) {
  std::istringstream Lines(ReadAll(test::DebuggeeSource("loop.c")));
  int Number = 0;
  for (std::string Line; std::getline(Lines, Line);) {
    ++Number;
    if (Line.find(Marker) != std::string::npos)
      return Number;
  }
  return -1;
}

std::string FileName(const json& Object) {
  return std::filesystem::path(Object.value("file", std::string())).filename().string();
}

// --- Start-up and the session's own commands ----------------------------------

TEST_F(CliTest, CliStartLoadsTheProgramAndNamesItsLanguageAndCpu) {
  const std::string Program = Debuggee("exitthree");
  const TCliRun Run = RunCli(Quote(Program), "quit\n");
  EXPECT_EQ(Run.ExitCode, 0) << Run.Stderr;
  const json* Loaded = Run.Event("loaded");
  ASSERT_NE(Loaded, nullptr) << Run.Stdout;
  EXPECT_EQ((*Loaded)["program"], Program);
  EXPECT_EQ((*Loaded)["language"], "c");
  EXPECT_EQ((*Loaded)["cpu"], "amd64");
  EXPECT_NE(Run.Answer("quit"), nullptr);
}

TEST_F(CliTest, CliStartGuessesCxxFromTheSourceBesideTheProgram) {
  // A copy of a C++ program with an empty file of its name and ".cpp" beside.
  const std::string Program = Scratch.Path() + "/plus";
  std::filesystem::copy_file(Debuggee("exitthree"), Program);
  Scratch.WriteFile("plus.cpp", "");
  const TCliRun Run = RunCli(Quote(Program), "");
  const json* Loaded = Run.Event("loaded");
  ASSERT_NE(Loaded, nullptr) << Run.Stdout;
  EXPECT_EQ((*Loaded)["language"], "c++");
}

TEST_F(CliTest, CliStartOfAMissingProgramIsAnErrorAndFails) {
  const TCliRun Run = RunCli(Quote(Scratch.Path() + "/no-such-program"), "run\n");
  EXPECT_NE(Run.ExitCode, 0);
  ASSERT_EQ(Run.Lines.size(), 1u) << Run.Stdout;
  EXPECT_EQ(Run.Lines[0]["answer"], "start");
  EXPECT_NE(Run.Lines[0]["error"].get<std::string>().find("No such file"), std::string::npos) << Run.Stdout;
}

TEST_F(CliTest, CliCommandsThatCannotRunSayWhyAndTheSessionGoesOn) {
  const std::string Program = Debuggee("exitthree");
  const TCliRun Run = RunCli(Quote(Program), "frobnicate now\nnext\nbt\nthread x\n");
  EXPECT_EQ(Run.ExitCode, 0);
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
}

// --- Running to the exit ---------------------------------------------------------

TEST_F(CliTest, CliRunReachesTheExitWithTheProgramsCodeAndOutput) {
  const std::string Program = Debuggee("exitthree");
  const TCliRun Run = RunCli(Quote(Program), "run\ncontinue\n");
  EXPECT_EQ(Run.ExitCode, 0);
  const json* Exited = Run.Event("exited");
  ASSERT_NE(Exited, nullptr) << Run.Stdout << Run.Stderr;
  EXPECT_EQ((*Exited)["code"], 3);
  const json* RunAnswer = Run.Answer("run");
  ASSERT_NE(RunAnswer, nullptr);
  EXPECT_EQ((*RunAnswer)["state"], "exited");
  EXPECT_NE(Run.Find([](const json& Line) {
    return Line.value("event", "") == "output" && Line.value("text", "").find("marker-7781") != std::string::npos;
  }),
            nullptr)
      << Run.Stdout;
  // After the exit, the session says so instead of resuming.
  const json* Continue = Run.Answer("continue");
  ASSERT_NE(Continue, nullptr);
  EXPECT_EQ((*Continue)["error"], "the program has exited");
}

TEST_F(CliTest, CliLogKeepsTheMiTrafficInTheNamedFile) {
  const std::string Program = Debuggee("exitthree");
  const std::string Log = Scratch.Path() + "/logs/session.log";
  const TCliRun Run = RunCli("--log " + Quote(Log) + " " + Quote(Program), "quit\n");
  EXPECT_EQ(Run.ExitCode, 0) << Run.Stderr;
  const std::string Traffic = ReadAll(Log);
  EXPECT_NE(Traffic.find("-file-exec-and-symbols"), std::string::npos) << Traffic;
  // Only the named file remains: the debugger's own log was renamed.
  size_t Files = 0;
  for ([[maybe_unused]] const auto& Entry : std::filesystem::directory_iterator(Scratch.Path() + "/logs"))
    ++Files;
  EXPECT_EQ(Files, 1u);
}

TEST_F(CliTest, CliRunPauseInterruptsAProgramThatNeverStopsAndKillEndsIt) {
  const std::string Program = Debuggee("busy");
  // The program never stops by itself, so the run's short wait always ends
  // unanswered; the later --wait wins over the default.
  // The wait also bounds the pause, whose stop takes several requests: leave
  // room for a loaded machine.
  const TCliRun Run = RunCli("--wait 6 " + Quote(Program), "run\npause\nkill\n");
  const json* RunAnswer = Run.Answer("run");
  ASSERT_NE(RunAnswer, nullptr) << Run.Stdout;
  EXPECT_NE((*RunAnswer)["error"].get<std::string>().find("did not stop"), std::string::npos);
  const json* Stopped = Run.Event("stopped");
  ASSERT_NE(Stopped, nullptr) << Run.Stdout;
  // An interruption is a step stop, not a signal.
  EXPECT_EQ((*Stopped)["reason"], "step");
  EXPECT_EQ(FileName(*Stopped), "busy.c");
  const std::vector<std::string> Expected = {"event:loaded", "answer:run",  "event:stopped", "answer:pause",
                                             "event:exited", "answer:kill"};
  EXPECT_EQ(Run.Sequence(), Expected) << Run.Stdout;
}

TEST_F(CliTest, CliAttachShowsTheStackAndDetachLeavesTheProgramRunning) {
  const std::string Program = Debuggee("sleeper");
  const std::string Start = "exec " + Quote(Program) + " >/dev/null 2>&1 & echo $!";
  FILE* Shell = popen(Start.c_str(), "r");
  ASSERT_NE(Shell, nullptr);
  int Pid = 0;
  ASSERT_EQ(std::fscanf(Shell, "%d", &Pid), 1);
  pclose(Shell);
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
  std::vector<const json*> Stops;
  for (const json& Line : Run.Lines)
    if (Line.value("event", "") == "stopped")
      Stops.push_back(&Line);
  ASSERT_EQ(Stops.size(), 5u) << Run.Stdout << Run.Stderr;
  EXPECT_EQ((*Stops[0])["reason"], "breakpoint");
  EXPECT_EQ((*Stops[0])["line"], LineOf("main-first"));
  EXPECT_NE((*Stops[0]).value("text", "").find("main-first"), std::string::npos);
  EXPECT_EQ((*Stops[1])["line"], LineOf("main-loop"));
  EXPECT_EQ((*Stops[1])["reason"], "step");
  EXPECT_EQ((*Stops[2])["line"], LineOf("main-call"));
  EXPECT_EQ((*Stops[3])["line"], LineOf("square-body"));
  // Out of square, back in main's loop line.
  EXPECT_EQ(FileName(*Stops[4]), "loop.c");
  EXPECT_EQ((*Stops[4])["line"], LineOf("main-call"));

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

TEST_F(CliTest, CliSteppingThreadsAndFrameDescribeTheStoppedProgram) {
  const std::string Program = Debuggee("loop");
  const TCliRun Run = RunCli(Quote(Program), "start\nnext\nnext\nstep\nthreads\nframe 1\nthread 1\nframe 9\nkill\n");
  const json* Threads = Run.Answer("threads");
  ASSERT_NE(Threads, nullptr) << Run.Stdout;
  ASSERT_FALSE(Threads->contains("error")) << *Threads;
  ASSERT_EQ((*Threads)["threads"].size(), 1u) << *Threads;
  EXPECT_EQ((*Threads)["threads"][0]["id"], 1);
  EXPECT_EQ((*Threads)["threads"][0]["state"], "stopped");
  EXPECT_EQ((*Threads)["threads"][0]["current"], true);

  const json* Frame = Run.Answer("frame");
  ASSERT_NE(Frame, nullptr);
  ASSERT_FALSE(Frame->contains("error")) << *Frame;
  EXPECT_EQ((*Frame)["level"], 1);
  EXPECT_EQ((*Frame)["line"], LineOf("main-call"));

  const json* Thread = Run.Answer("thread");
  ASSERT_NE(Thread, nullptr);
  EXPECT_EQ((*Thread)["thread"], 1);
  EXPECT_EQ((*Thread)["line"], LineOf("square-body"));

  const json* NoFrame = Run.Find([](const json& Line) { return Line.value("answer", "") == "frame" && Line.contains("error"); });
  ASSERT_NE(NoFrame, nullptr);
  EXPECT_EQ((*NoFrame)["error"], "no frame 9");

  const json* Kill = Run.Answer("kill");
  ASSERT_NE(Kill, nullptr);
  EXPECT_EQ((*Kill)["state"], "exited") << *Kill;
}

} // namespace
} // namespace midebug
