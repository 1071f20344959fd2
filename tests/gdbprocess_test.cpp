// A debugged process end to end: start-up through the default "local"
// profile with the real GDB and the scripted fake debugger, the time-out
// policy, and a debugger that goes away.

#include "midebug.h"
#include "platform/hostfiles.h"
#include "platform/hostprocess.h"
#include "process/gdbprocess.h"
#include "process/lldbprocess.h"
#include "testlistener.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <dirent.h>
#include <filesystem>
#include <fstream>
#include <signal.h>
#include <unistd.h>

namespace midebug {
namespace {

using test::FakeDebuggerPath;
using test::TScopedEnv;
using test::TScratchDir;
using test::TTestListener;

TGDBProcess& ProcessOf(const TIntfPtr<IGDBProcess>& Process) { return *static_cast<TGDBProcess*>(Process.get()); }

/// Sets the default wait policy for the life of the object.
class TScopedWaitPolicy {
public:
  explicit TScopedWaitPolicy(const TWaitPolicy& Policy) : FOld(DefaultWaitPolicy()) { DefaultWaitPolicy() = Policy; }
  ~TScopedWaitPolicy() { DefaultWaitPolicy() = FOld; }

private:
  TWaitPolicy FOld;
};

TWaitPolicy ShortWaits() {
  TWaitPolicy Policy;
  Policy.StartupTimeoutMs = 400;
  Policy.RunningTimeoutMs = 60;
  Policy.TimeoutStepMs = 30;
  Policy.MaxTimeoutMs = 150;
  Policy.TerminateTimeoutMs = 50;
  return Policy;
}

std::string CompileC(const TScratchDir& Dir, const std::string& Name, const std::string& Source) {
  const std::string SourcePath = Dir.WriteFile(Name + ".c", Source);
  const std::string Program = Dir.Path() + "/" + Name;
  const std::string Command = "gcc -g -O0 -o '" + Program + "' '" + SourcePath + "'";
  if (std::system(Command.c_str()) != 0)
    return {};
  return Program;
}

/// Debugger started by the process, found among this test's children.
std::vector<int> ChildrenNamed(const std::string& Name) {
  std::vector<int> Found;
  DIR* Proc = opendir("/proc");
  while (dirent* Entry = readdir(Proc)) {
    const int Pid = std::atoi(Entry->d_name);
    if (Pid <= 0)
      continue;
    std::ifstream Stat("/proc/" + std::to_string(Pid) + "/stat");
    std::string Line;
    std::getline(Stat, Line);
    const size_t Close = Line.rfind(')');
    const size_t Open = Line.find('(');
    if (Close == std::string::npos || Open == std::string::npos)
      continue;
    int Parent = 0;
    char State = 0;
    std::sscanf(Line.c_str() + Close + 1, " %c %d", &State, &Parent);
    if (Parent == getpid() && Line.substr(Open + 1, Close - Open - 1) == Name && State != 'Z')
      Found.push_back(Pid);
  }
  closedir(Proc);
  return Found;
}

class ProcessTest : public ::testing::Test {
protected:
  void SetUp() override { SetMainThread(); }

  /// The fake debugger installed as NAME on a PATH of its own, running Script.
  void InstallFake(const std::string& Name, const std::string& Script) {
    const std::string Bin = Scratch.Path() + "/bin";
    std::filesystem::create_directories(Bin);
    std::filesystem::copy_file(FakeDebuggerPath(), Bin + "/" + Name,
                               std::filesystem::copy_options::overwrite_existing);
    PathEnv = std::make_unique<TScopedEnv>("PATH", Bin + ":" + GetEnvironmentVariable("PATH"));
    ScriptEnv = std::make_unique<TScopedEnv>("FAKEMI_SCRIPT", Scratch.WriteFile(Name + ".script", Script));
  }

  TScratchDir Scratch;
  std::unique_ptr<TScopedEnv> PathEnv;
  std::unique_ptr<TScopedEnv> ScriptEnv;
  TIntfPtr<TTestListener> Listener{new TTestListener};
};

/// GDB's start-up settings and the program's environment: eight lines the
/// fake debugger reads before the program is loaded.
#define SKIP_GDB_STARTUP "expect *\nexpect *\nexpect *\nexpect *\nexpect *\nexpect *\nexpect *\nexpect *\n"

const char* const ExitingProgram = "int main(void) { return 3; }\n";

TEST_F(ProcessTest, GdbThroughTheLocalProfileLoadsRunsAndReportsTheExit) {
  const std::string Program = CompileC(Scratch, "three", ExitingProgram);
  ASSERT_FALSE(Program.empty());
  TIntfPtr<IGDBProcess> Process = TGDBProcessManager::CreateProcess(Listener, Program, "", Scratch.Path(), "local",
                                                                    "Linux64", glC, gcAMD64, "gdb");
  ASSERT_TRUE(Process);
  TGDBProcess& Core = ProcessOf(Process);
  EXPECT_TRUE(Core.IsLinux());
  EXPECT_FALSE(Core.IsLLDB());
  EXPECT_EQ(Core.Requests().SyncTimeout(), DefaultWaitPolicy().RunningTimeoutMs);
  ASSERT_TRUE(Core.ProcessAsyncRequest("-exec-run"));
  const Integer Pid = Process->GetPid();
  EXPECT_GT(Pid, 1);
  EXPECT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(3,"));
  EXPECT_FALSE(Core.Alive());
}

TEST_F(ProcessTest, GdbAttachesToARunningProgramByPid) {
  const std::string Program = CompileC(Scratch, "sleeper", "#include <unistd.h>\nint main(void) { sleep(60); return 0; }\n");
  ASSERT_FALSE(Program.empty());
  const pid_t Sleeper = fork();
  if (Sleeper == 0) {
    execl(Program.c_str(), Program.c_str(), static_cast<char*>(nullptr));
    _exit(127);
  }
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::AttachProcess(Listener, Sleeper, "local", "Linux64", glC, gcAMD64);
  EXPECT_EQ(Process->GetPid(), Sleeper);
  EXPECT_TRUE(ProcessOf(Process).Suspended());
  ProcessOf(Process).NotifyProcessExited(0, "");
  Process = nullptr;
  kill(Sleeper, SIGKILL);
  ReapChildProcess(Sleeper);
}

TEST_F(ProcessTest, KernelThatDoesNotStartIsNamedInTheError) {
  try {
    TGDBProcessManager::CreateProcess(Listener, "/bin/true", "", "", "", "Linux64", glC, gcAMD64,
                                      "/no/such/lldb-mi");
    FAIL() << "no exception";
  } catch (const ENonAIRException& Error) {
    EXPECT_STREQ(Error.what(), "Unable to start LLDB kernel: 'Could not find program, '/no/such/lldb-mi''");
  }
  EXPECT_EQ(LiveProcessCount(), 0u);
}

TEST_F(ProcessTest, ProgramThatCannotBeLoadedGivesGdbsReason) {
  try {
    TGDBProcessManager::CreateProcess(Listener, "/no/such/program", "", "", "local", "Linux64", glC, gcAMD64, "gdb");
    FAIL() << "no exception";
  } catch (const ENonAIRException& Error) {
    EXPECT_EQ(std::string(Error.what()).rfind("Unable to create process: '/no/such/program: No such file", 0), 0u)
        << Error.what();
  }
  EXPECT_EQ(LiveProcessCount(), 0u);
}

TEST_F(ProcessTest, GdbStartUpSendsItsSettingsInOrder) {
  InstallFake("gdb", R"(prompt
expect {TOKEN}-gdb-set host-charset UTF-8
expect {TOKEN}-gdb-set confirm off
expect {TOKEN}-gdb-set height 0
expect {TOKEN}-gdb-set width 0
expect {TOKEN}-gdb-set language auto
expect {TOKEN}-enable-timings no
expect {TOKEN}-gdb-set disassembly-flavor intel
expect set environment QVT_DBK_PRESENT = 1
expect {TOKEN}-file-exec-and-symbols "/work/my prog"
send {TOKEN}^done
prompt
expect {TOKEN}-exec-arguments a b
expect {TOKEN}-environment-cd "/tmp/dir"
send =thread-group-started,id="i1",pid="4242"
prompt
wait-eof
)");
  TIntfPtr<IGDBProcess> Process = TGDBProcessManager::CreateProcess(Listener, "/work/my prog", "a b", "/tmp/dir/",
                                                                    "local", "Linux64", glC, gcAMD64, "gdb");
  EXPECT_EQ(Process->GetPid(), 4242);
  ProcessOf(Process).NotifyProcessExited(0, "");
}

TEST_F(ProcessTest, LldbStartUpSendsItsSettingsAndAsksForTargetAsync) {
  InstallFake("lldb-mi", R"(set-prompt (gdb)\n
prompt
expect version
expect {TOKEN}-gdb-set host-charset UTF-8
expect {TOKEN}-gdb-set confirm off
expect {TOKEN}-gdb-set height 0
expect {TOKEN}-gdb-set width 0
expect {TOKEN}-gdb-set language auto
expect {TOKEN}-gdb-set print expand-aggregates on
expect settings set target.move-to-nearest-code 0
expect settings show target.max-children-count
expect settings set target.process.thread.max-backtrace-depth 512
expect settings set target.x86-disassembly-flavor intel
expect {TOKEN}-gdb-show target-async
send {TOKEN}^done,value="on"
prompt
expect settings set target.env-vars QVT_DBK_PRESENT=1
expect {TOKEN}-file-exec-and-symbols "/work/prog"
send {TOKEN}^done
prompt
wait-eof
)");
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glCPP, gcAMD64, "lldb-mi");
  EXPECT_TRUE(ProcessOf(Process).IsLLDB());
  EXPECT_TRUE(ProcessOf(Process).IsLinux());
  ProcessOf(Process).NotifyProcessExited(0, "");
}

TEST_F(ProcessTest, ExitOfAnUnknownThreadDoesNotHoldBackLaterExits) {
  // LLDB follows threads from the start; its eleven start-up lines are skipped.
  InstallFake("lldb-mi", R"(set-prompt (gdb)\n
prompt
expect *
expect *
expect *
expect *
expect *
expect *
expect *
expect *
expect *
expect *
expect *
expect {TOKEN}-gdb-show target-async
send {TOKEN}^done,value="off"
prompt
expect *
expect-prefix {TOKEN}-file-exec-and-symbols
send {TOKEN}^done
prompt
wait-eof
)");
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glC, gcAMD64, "lldb-mi");
  TGDBProcess& Core = ProcessOf(Process);
  Core.NotifyThreadCreated(2, 2);
  Core.NotifyThreadExited(7);
  Core.NotifyThreadExited(2);
  EXPECT_TRUE(Listener->PumpUntilCall("ThreadExited(2)", std::chrono::seconds(5)));
  Core.NotifyProcessExited(0, "");
}

TEST_F(ProcessTest, LldbForAWindowsTargetDisablesStdio) {
  InstallFake("lldb-mi", R"(set-prompt (gdb)\n
prompt
expect version
expect-prefix {TOKEN}-gdb-set host-charset
expect-prefix {TOKEN}-gdb-set confirm
expect-prefix {TOKEN}-gdb-set height
expect-prefix {TOKEN}-gdb-set width
expect-prefix {TOKEN}-gdb-set language
expect settings set target.disable-stdio true
expect *
expect *
expect *
expect *
expect *
expect {TOKEN}-gdb-show target-async
send {TOKEN}^done,value="off"
prompt
expect *
expect {TOKEN}-file-exec-and-symbols "/work/prog.exe"
send {TOKEN}^done
prompt
wait-eof
)");
  TIntfPtr<IGDBProcess> Process = TGDBProcessManager::CreateProcess(Listener, "/work/prog.exe", "", "", "local",
                                                                    "Win64", glC, gcAMD64, "lldb-mi");
  EXPECT_TRUE(ProcessOf(Process).IsWindows());
  ProcessOf(Process).NotifyProcessExited(0, "");
}

TEST_F(ProcessTest, WaitGrowsInStepsUntilTheIdeGivesTheDebuggerUp) {
  TWaitPolicy Policy = ShortWaits();
  std::vector<Integer> Waits;
  Policy.WaitObserver = [&Waits](Integer Timeout) { Waits.push_back(Timeout); };
  TScopedWaitPolicy Scoped(Policy);
  InstallFake("gdb", "prompt\n" SKIP_GDB_STARTUP R"(expect-prefix {TOKEN}-file-exec-and-symbols
send {TOKEN}^done
prompt
expect {TOKEN}-stack-info-depth
expect {TOKEN}-stack-info-depth
wait-eof
)");
  Listener->FatalAnswers = {false, false, false, false, true};
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glC, gcAMD64, "gdb");
  TGDBProcess& Core = ProcessOf(Process);
  Waits.clear();

  std::string Token;
  TStackInfoDepthResult Depth;
  std::string Line = Core.Requests().Build(Token, &TGDBCommand::CreateStackInfoDepthCommand, -1);
  EXPECT_TRUE(Core.ProcessSyncRequest(Token, Line, Depth));
  EXPECT_EQ(Waits, (std::vector<Integer>{60, 90, 120, 150, 150}));
  EXPECT_EQ(Listener->FatalAsks(), 5u);
  EXPECT_TRUE(Depth.FTimeOut);
  EXPECT_TRUE(Depth.FError);
  EXPECT_EQ(Depth.FErrorMessage, "debug kernel timeout");

  // Given up for good: the next request is still written but returns at once.
  TStackInfoDepthResult Again;
  Line = Core.Requests().Build(Token, &TGDBCommand::CreateStackInfoDepthCommand, -1);
  EXPECT_TRUE(Core.ProcessSyncRequest(Token, Line, Again));
  EXPECT_TRUE(Again.FTimeOut);
  EXPECT_EQ(Listener->FatalAsks(), 5u);
  Core.NotifyProcessExited(0, "");
}

TEST_F(ProcessTest, DeviceTargetsTimeOutWithTheDeviceMessage) {
  TScopedWaitPolicy Scoped(ShortWaits());
  InstallFake("gdb", "prompt\n" SKIP_GDB_STARTUP R"(expect-prefix {TOKEN}-file-exec-and-symbols
send {TOKEN}^done
prompt
wait-eof
)");
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Android64", glC, gcARM64, "gdb");
  TGDBProcess& Core = ProcessOf(Process);
  std::string Token;
  TStackInfoDepthResult Depth;
  Core.ProcessSyncRequest(Token, Core.Requests().Build(Token, &TGDBCommand::CreateStackInfoDepthCommand, -1), Depth);
  EXPECT_EQ(Depth.FErrorMessage, "Connection device timeout");
  Core.NotifyProcessExited(0, "");
}

TEST_F(ProcessTest, LostDebuggerIsReportedAndWakesTheWaiter) {
  InstallFake("gdb", "prompt\n" SKIP_GDB_STARTUP R"(expect-prefix {TOKEN}-file-exec-and-symbols
send =thread-group-started,id="i1",pid="777"
send {TOKEN}^done
prompt
expect {TOKEN}-stack-info-depth
exit 9
)");
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glC, gcAMD64, "gdb");
  TGDBProcess& Core = ProcessOf(Process);
  std::string Token;
  TStackInfoDepthResult Depth;
  EXPECT_TRUE(Core.ProcessSyncRequest(Token, Core.Requests().Build(Token, &TGDBCommand::CreateStackInfoDepthCommand, -1), Depth));
  EXPECT_FALSE(Depth.FAvailable);
  EXPECT_FALSE(Depth.FTimeOut);
  EXPECT_FALSE(Core.Alive());
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  const std::string Lost = "Connection to GDB kernel is no longer available: 'process exited'";
  EXPECT_EQ(Listener->Calls().front(), "InternalError(" + Lost + ")");
  EXPECT_TRUE(Listener->HasCall("Exited(1," + Lost + ")"));
  EXPECT_EQ(Listener->FatalAsks(), 0u);
}

TEST_F(ProcessTest, KilledGdbEndsTheSessionThroughTheLostDebuggerPath) {
  const std::string Program = CompileC(Scratch, "three", ExitingProgram);
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", glC, gcAMD64, "gdb");
  const std::vector<int> Debuggers = ChildrenNamed("gdb");
  ASSERT_EQ(Debuggers.size(), 1u);
  kill(Debuggers.front(), SIGKILL);
  EXPECT_TRUE(Listener->PumpUntil([&] { return !ProcessOf(Process).Alive(); }));
  EXPECT_TRUE(Listener->HasCall("InternalError(Connection to GDB kernel is no longer available"));
}

TEST_F(ProcessTest, ReleasingALiveProcessStopsItsDebugger) {
  const std::string Program = CompileC(Scratch, "three", ExitingProgram);
  TIntfPtr<IGDBProcess> Process =
      TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", glC, gcAMD64, "gdb");
  EXPECT_EQ(LiveProcessCount(), 1u);
  Process = nullptr;
  EXPECT_EQ(LiveProcessCount(), 0u);
  EXPECT_TRUE(ChildrenNamed("gdb").empty());
  ProcessPending();
}

TEST(ProcessPolling, WaitForReplyTimeOutCountsDownInPollSteps) {
  SetMainThread();
  TIntfPtr<TTestListener> Listener(new TTestListener);
  TIntfPtr<IGDBProcess> Holder(static_cast<IGDBProcess*>(
      new TLLDBProcess(Listener, "", "/no/such/lldb-mi", -1, "", glC, gcAMD64, "Linux64")));
  TGDBProcess& Core = ProcessOf(Holder);
  Integer Timeout = 10;
  int Calls = 0;
  while (!Core.Requests().WaitForReplyTimeOut(Timeout, false))
    ++Calls;
  EXPECT_EQ(Calls, 5);
}

} // namespace
} // namespace midebug
