// The console debugger as a person uses it: on a terminal of its own, typing
// commands while the program runs, pressing Ctrl-C, closing the session with
// a signal. Nothing the session started may outlive it, and an attached
// program must.

#include "testsupport.h"

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
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

/// Bounds every wait: reached only when what is awaited never comes.
constexpr auto Patience = std::chrono::seconds(30);

/// midebug started on a new pseudo-terminal that is its controlling
/// terminal, as a shell would start it: Ctrl-C typed there reaches its
/// foreground process group.
class TCliOnTerminal {
public:
  explicit TCliOnTerminal(const std::vector<std::string>& Arguments) {
    std::vector<char*> Argv;
    std::string Program = MIDEBUG_CLI;
    Argv.push_back(Program.data());
    std::vector<std::string> Copies = Arguments;
    for (std::string& Argument : Copies)
      Argv.push_back(Argument.data());
    Argv.push_back(nullptr);
    FPid = forkpty(&FMaster, nullptr, nullptr, nullptr);
    if (FPid == 0) {
      execv(Argv[0], Argv.data());
      _exit(127);
    }
  }
  ~TCliOnTerminal() {
    if (FPid > 0 && Status() == -1) {
      kill(FPid, SIGKILL);
      waitpid(FPid, nullptr, 0);
    }
    if (FMaster >= 0)
      close(FMaster);
  }
  TCliOnTerminal(const TCliOnTerminal&) = delete;
  TCliOnTerminal& operator=(const TCliOnTerminal&) = delete;

  int Pid() const { return FPid; }
  void Type(const std::string& Text) { ASSERT_EQ(write(FMaster, Text.data(), Text.size()), ssize_t(Text.size())); }
  /// Reads the terminal until Text appears after what earlier waits used up;
  /// false when it never does.
  bool WaitFor(const std::string& Text) {
    const auto Deadline = std::chrono::steady_clock::now() + Patience;
    for (;;) {
      if (const size_t Found = FSeen.find(Text, FUsed); Found != std::string::npos) {
        FUsed = Found + Text.size();
        return true;
      }
      if (std::chrono::steady_clock::now() >= Deadline || !ReadSome())
        return false;
    }
  }
  /// The exit status once midebug has ended (read until the terminal
  /// closes), or -1.
  int WaitForExit() {
    while (ReadSome()) {
    }
    const auto Deadline = std::chrono::steady_clock::now() + Patience;
    while (std::chrono::steady_clock::now() < Deadline) {
      if (const int Code = Status(); Code != -1)
        return Code;
      std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    return -1;
  }
  const std::string& Seen() const { return FSeen; }

private:
  bool ReadSome() {
    pollfd Poll{FMaster, POLLIN, 0};
    if (poll(&Poll, 1, 200) < 0)
      return false;
    if (!(Poll.revents & (POLLIN | POLLHUP)))
      return true;
    char Buffer[4096];
    const ssize_t Read = read(FMaster, Buffer, sizeof Buffer);
    if (Read <= 0)
      return false;
    FSeen.append(Buffer, size_t(Read));
    return true;
  }
  int Status() {
    if (FExit != -1)
      return FExit;
    int Raw = 0;
    if (waitpid(FPid, &Raw, WNOHANG) == FPid)
      FExit = WIFEXITED(Raw) ? WEXITSTATUS(Raw) : 128 + WTERMSIG(Raw);
    return FExit;
  }

  int FMaster = -1;
  int FPid = -1;
  int FExit = -1;
  std::string FSeen;
  size_t FUsed = 0;
};

/// The debugger midebug started and the program that debugger runs.
struct TSessionProcesses {
  int Debugger = -1;
  int Program = -1;
};

TSessionProcesses FindSessionProcesses(int Cli, const std::string& ProgramName) {
  TSessionProcesses Found;
  const std::vector<int> Debuggers = ChildrenNamed("gdb", Cli);
  if (Debuggers.size() != 1)
    return Found;
  Found.Debugger = Debuggers.front();
  const std::vector<int> Programs = ChildrenNamed(ProgramName, Found.Debugger);
  if (!Programs.empty())
    Found.Program = Programs.front();
  return Found;
}

/// A program started outside any debugger, as a person's shell would, and
/// killed when the test is done with it.
class TProgramAlone {
public:
  explicit TProgramAlone(const std::string& Program) {
    FPid = fork();
    if (FPid == 0) {
      setsid();
      // Nothing of the test's own output stays open in it.
      const int Null = open("/dev/null", O_RDWR);
      for (const int Stream : {0, 1, 2})
        dup2(Null, Stream);
      execl(Program.c_str(), Program.c_str(), nullptr);
      _exit(127);
    }
  }
  ~TProgramAlone() {
    kill(FPid, SIGKILL);
    waitpid(FPid, nullptr, 0);
  }
  TProgramAlone(const TProgramAlone&) = delete;
  TProgramAlone& operator=(const TProgramAlone&) = delete;
  int Pid() const { return FPid; }

private:
  int FPid = -1;
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
  const TSessionProcesses Session = FindSessionProcesses(Cli.Pid(), "busy");
  ASSERT_NE(Session.Program, -1);

  Cli.Type("\x03");
  ASSERT_TRUE(Cli.WaitFor("Paused in thread 1: ")) << Cli.Seen();
  EXPECT_TRUE(ProcessRuns(Session.Debugger));
  EXPECT_TRUE(ProcessRuns(Session.Program));
  Cli.Type("continue\n");
  ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
  Cli.Type("threads\n");
  ASSERT_TRUE(Cli.WaitFor("running")) << Cli.Seen();
  Cli.Type("pause\n");
  ASSERT_TRUE(Cli.WaitFor("Paused in thread 1: main () at busy.c:")) << Cli.Seen();
  Cli.Type("continue\n");
  ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
  // Quitting while it runs kills what the session launched.
  Cli.Type("quit\n");
  ASSERT_TRUE(Cli.WaitFor("Program killed.")) << Cli.Seen();
  EXPECT_EQ(Cli.WaitForExit(), 0);
  EXPECT_FALSE(ProcessRuns(Session.Debugger));
  EXPECT_FALSE(ProcessRuns(Session.Program));
}

TEST(CliOnTerminal, AnAttachedProgramOutlivesQuitAndTerminationSignals) {
  const std::string Program = Debuggee("sleeper");
  // How each session ends, while the program runs: a command, then SIGTERM
  // and SIGHUP sent to midebug alone.
  for (const int Ending : {0, SIGTERM, SIGHUP}) {
    SCOPED_TRACE(Ending);
    const TProgramAlone Alone(Program);
    const int Pid = Alone.Pid();
    TCliOnTerminal Cli({"--attach", std::to_string(Pid)});
    ASSERT_TRUE(Cli.WaitFor("Attached to process")) << Cli.Seen();
    ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
    // No debugger banner after attaching.
    EXPECT_EQ(Cli.Seen().find("GNU gdb"), std::string::npos) << Cli.Seen();
    const std::vector<int> Debuggers = ChildrenNamed("gdb", Cli.Pid());
    ASSERT_EQ(Debuggers.size(), 1u) << Cli.Seen();
    Cli.Type("continue\n");
    ASSERT_TRUE(Cli.WaitFor("(midebug) ")) << Cli.Seen();
    if (Ending == 0)
      Cli.Type("quit\n");
    else
      kill(Cli.Pid(), Ending);
    EXPECT_TRUE(Cli.WaitFor("Detached; the program goes on.")) << Cli.Seen();
    EXPECT_EQ(Cli.WaitForExit(), Ending == 0 ? 0 : 128 + Ending);
    EXPECT_FALSE(ProcessRuns(Debuggers.front()));
    EXPECT_TRUE(ProcessRuns(Pid));
  }
}

} // namespace
} // namespace midebug
