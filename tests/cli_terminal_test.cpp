// The console debugger as a person uses it: on a terminal of its own, typing
// commands while the program runs, pressing Ctrl-C, closing the session with
// a signal. Nothing the session started may outlive it, and an attached
// program must.

#include "testsupport.h"

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <poll.h>
#include <pty.h>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace midebug {
namespace {

using test::ChildrenNamed;
using test::Debuggee;
using test::ProcessRuns;

/// midebug started on a new pseudo-terminal that is its controlling
/// terminal, as a shell starts it: Ctrl-C typed there reaches its
/// foreground process group.
class TCliOnTerminal {
public:
  explicit TCliOnTerminal(std::vector<std::string> Arguments) {
    Arguments.insert(Arguments.begin(), MIDEBUG_CLI);
    std::vector<char*> Argv;
    for (std::string& Argument : Arguments)
      Argv.push_back(Argument.data());
    Argv.push_back(nullptr);
    FPid = forkpty(&FMaster, nullptr, nullptr, nullptr);
    if (FPid == 0) {
      execv(Argv[0], Argv.data());
      _exit(127);
    }
  }
  ~TCliOnTerminal() {
    if (FExit == -1)
      kill(FPid, SIGKILL);
    close(FMaster);
    WaitForExit();
  }

  int Pid() const { return FPid; }
  void Type(const std::string& Text) { ASSERT_EQ(write(FMaster, Text.data(), Text.size()), ssize_t(Text.size())); }
  /// Reads the terminal until Text appears after what earlier waits used
  /// up; false when midebug closes it first or keeps silent for 30 s.
  bool WaitFor(const std::string& Text) {
    for (size_t Found; (Found = FSeen.find(Text, FUsed)) == std::string::npos;) {
      pollfd Poll{FMaster, POLLIN, 0};
      char Buffer[4096];
      const ssize_t Read = poll(&Poll, 1, 30000) == 1 ? read(FMaster, Buffer, sizeof Buffer) : -1;
      if (Read <= 0)
        return false;
      FSeen.append(Buffer, size_t(Read));
    }
    FUsed = FSeen.find(Text, FUsed) + Text.size();
    return true;
  }
  /// The exit status, once midebug has closed its terminal.
  int WaitForExit() {
    while (FExit == -1 && WaitFor("\x01never printed")) {
    }
    int Raw = 0;
    if (FExit == -1 && waitpid(FPid, &Raw, 0) == FPid)
      FExit = WIFEXITED(Raw) ? WEXITSTATUS(Raw) : 128 + WTERMSIG(Raw);
    return FExit;
  }
  const std::string& Seen() const { return FSeen; }

private:
  int FMaster = -1;
  int FPid = -1;
  int FExit = -1;
  std::string FSeen;
  size_t FUsed = 0;
};

TEST(CliOnTerminal, CtrlCPausesTheProgramOnlyAndCommandsWorkWhileItRuns) {
  // The program marks its start in its working directory, the session's.
  const test::TScratchDir Scratch;
  const std::filesystem::path Before = std::filesystem::current_path();
  std::filesystem::current_path(Scratch.Path());
  TCliOnTerminal Cli({Debuggee("busy")});
  std::filesystem::current_path(Before);
  ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
  Cli.Type("run\n");
  // The prompt comes back while the program runs.
  ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
  while (!std::filesystem::exists(Scratch.Path() + "/started.flag"))
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
  const std::vector<int> Debuggers = ChildrenNamed("gdb", Cli.Pid());
  ASSERT_EQ(Debuggers.size(), 1u);
  const std::vector<int> Programs = ChildrenNamed("busy", Debuggers.front());
  ASSERT_EQ(Programs.size(), 1u);

  Cli.Type("\x03");
  ASSERT_TRUE(Cli.WaitFor("Paused in thread 1: ")) << Cli.Seen();
  EXPECT_TRUE(ProcessRuns(Debuggers.front()));
  EXPECT_TRUE(ProcessRuns(Programs.front()));
  Cli.Type("continue\nthreads\n");
  ASSERT_TRUE(Cli.WaitFor("1  running")) << Cli.Seen();
  Cli.Type("pause\n");
  ASSERT_TRUE(Cli.WaitFor("Paused in thread 1: main () at busy.c:")) << Cli.Seen();
  // Quitting while it runs kills what the session launched.
  Cli.Type("continue\nquit\n");
  ASSERT_TRUE(Cli.WaitFor("Program killed.")) << Cli.Seen();
  EXPECT_EQ(Cli.WaitForExit(), 0);
  EXPECT_FALSE(ProcessRuns(Debuggers.front()));
  EXPECT_FALSE(ProcessRuns(Programs.front()));
}

TEST(CliOnTerminal, AnAttachedProgramOutlivesQuitAndTerminationSignals) {
  // How each session ends, while the program runs: a command, then SIGTERM
  // and SIGHUP sent to midebug alone.
  for (const int Ending : {0, SIGTERM, SIGHUP}) {
    SCOPED_TRACE(Ending);
    const int Pid = test::StartDebuggee("sleeper");
    ASSERT_NE(Pid, 0);
    const std::shared_ptr<void> KillAtEnd(nullptr, [Pid](void*) { kill(Pid, SIGKILL); });
    TCliOnTerminal Cli({"--attach", std::to_string(Pid)});
    ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
    // No debugger banner after attaching.
    EXPECT_EQ(Cli.Seen().find("GNU gdb"), std::string::npos) << Cli.Seen();
    const std::vector<int> Debuggers = ChildrenNamed("gdb", Cli.Pid());
    ASSERT_EQ(Debuggers.size(), 1u) << Cli.Seen();
    Cli.Type(Ending == 0 ? "continue\nquit\n" : "continue\n");
    if (Ending != 0) {
      ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
      kill(Cli.Pid(), Ending);
    }
    EXPECT_TRUE(Cli.WaitFor("Detached; the program goes on.")) << Cli.Seen();
    EXPECT_EQ(Cli.WaitForExit(), Ending == 0 ? 0 : 128 + Ending);
    EXPECT_FALSE(ProcessRuns(Debuggers.front()));
    EXPECT_TRUE(ProcessRuns(Pid));
  }
}

} // namespace
} // namespace midebug
