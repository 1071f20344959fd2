// Running, stopping, stepping, pausing, ending and detaching a program, and
// the events the IDE hears meanwhile: against the real GDB through the
// default "local" profile, and on the scripted fake debugger for what GDB
// cannot be made to do.

#include "midebug.h"
#include "platform/hostfiles.h"
#include "process/gdbprocess.h"
#include "testlistener.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

namespace midebug {
namespace {

using test::FakeDebuggerPath;
using test::TestDataDir;
using test::TScopedEnv;
using test::TScratchDir;
using test::TTestListener;

TGDBProcess& ProcessOf(const TIntfPtr<IGDBProcess>& Process) { return *static_cast<TGDBProcess*>(Process.get()); }

/// A listener whose answer to SignalReceived is chosen by the test.
class TSignalListener : public TTestListener {
public:
  bool StopOnSignal = true;
  void SignalReceived(bool& ShouldStop, Integer ThreadId, const TGDBException& Signal) override {
    TTestListener::SignalReceived(ShouldStop, ThreadId, Signal);
    ShouldStop = StopOnSignal;
  }
  bool HasCallContaining(const std::string& Text) const {
    for (const std::string& Call : Calls())
      if (Call.find(Text) != std::string::npos)
        return true;
    return false;
  }
  size_t CountOf(const std::string& Prefix) const {
    size_t Count = 0;
    for (const std::string& Call : Calls())
      Count += Call.rfind(Prefix, 0) == 0;
    return Count;
  }
};

/// Keeps the modules the IDE heard of, and what GetModule answered for each
/// while it was being delivered.
class TModuleListener : public TSignalListener {
public:
  /// Not owned: the process owns its listener.
  IGDBProcess* Process = nullptr;
  std::vector<TGDBModule> Loaded;
  std::vector<std::string> CurrentNames;
  void ModuleLoaded(const TGDBModule& Module) override {
    TSignalListener::ModuleLoaded(Module);
    Loaded.push_back(Module);
    CurrentNames.push_back(Process->GetModule(Module.Id).Name);
  }
};

/// Whether Pid names a process that has not ended (a zombie has ended).
bool ProcessRuns(int Pid) {
  std::ifstream Stat("/proc/" + std::to_string(Pid) + "/stat");
  std::string Line;
  if (!std::getline(Stat, Line))
    return false;
  const size_t Close = Line.rfind(')');
  return Close != std::string::npos && Close + 2 < Line.size() && Line[Close + 2] != 'Z' && Line[Close + 2] != 'X';
}

/// The pid of the process tracing Pid, 0 when none.
int TracerOf(int Pid) {
  std::ifstream Status("/proc/" + std::to_string(Pid) + "/status");
  std::string Line;
  while (std::getline(Status, Line))
    if (Line.rfind("TracerPid:", 0) == 0)
      return std::atoi(Line.c_str() + 10);
  return 0;
}

/// Running debuggers that this test started.
size_t DebuggersRunning() {
  size_t Count = 0;
  for (const auto& Entry : std::filesystem::directory_iterator("/proc")) {
    const int Pid = std::atoi(Entry.path().filename().c_str());
    if (Pid <= 0)
      continue;
    std::ifstream Stat(Entry.path() / "stat");
    std::string Line;
    std::getline(Stat, Line);
    const size_t Close = Line.rfind(')');
    if (Close == std::string::npos || Line.find("(gdb)") == std::string::npos)
      continue;
    char State = 0;
    int Parent = 0;
    std::sscanf(Line.c_str() + Close + 1, " %c %d", &State, &Parent);
    Count += Parent == getpid() && State != 'Z';
  }
  return Count;
}

enum TSourceLanguage { slC, slCPP, slPascal };

/// Builds Source (named Name plus the language's extension) with debug
/// information; empty on failure.
std::string Compile(const TScratchDir& Dir, const std::string& Name, TSourceLanguage Language,
                    const std::string& Source) {
  static const char* const Extensions[] = {".c", ".cpp", ".pas"};
  const std::string SourcePath = Dir.WriteFile(Name + Extensions[Language], Source);
  const std::string Program = Dir.Path() + "/" + Name;
  std::string Command;
  switch (Language) {
  case slC:
    Command = "gcc -g -O0 -pthread -o '" + Program + "' '" + SourcePath + "'";
    break;
  case slCPP:
    Command = "g++ -g -O0 -o '" + Program + "' '" + SourcePath + "'";
    break;
  case slPascal:
    Command = "cd '" + Dir.Path() + "' && fpc -g -O- -o'" + Program + "' '" + SourcePath + "' >/dev/null";
    break;
  }
  if (std::system(Command.c_str()) != 0)
    return {};
  return Program;
}

// Line numbers below are part of the programs' text; keep them in step.
const char* const SteppingC = R"(int twice(int value) {
  int doubled = value * 2;
  return doubled;
}
int main(void) {
  int first = 1;
  int second = twice(first);
  return second;
}
)";
constexpr Integer TwiceBodyLine = 2;
constexpr Integer MainFirstLine = 6;
constexpr Integer MainCallLine = 7;
constexpr Integer MainReturnLine = 8;

// Creates the file "started.flag" in its working directory once it runs.
const char* const BusyC = R"(#include <stdio.h>
int main(void) {
  volatile unsigned long counter = 0;
  fclose(fopen("started.flag", "w"));
  for (;;)
    ++counter;
  return 0;
}
)";

const char* const ThreadsC = R"(#include <pthread.h>
static void* work(void* arg) { return arg; }
int main(void) {
  pthread_t first, second;
  pthread_create(&first, 0, work, 0);
  pthread_join(first, 0);
  pthread_create(&second, 0, work, 0);
  pthread_join(second, 0);
  return 0;
}
)";

const char* const SignalsC = R"(#include <signal.h>
static volatile int handled = 0;
static void on_usr1(int signal_number) { handled = signal_number; }
int main(int argc, char** argv) {
  (void)argv;
  signal(SIGUSR1, on_usr1);
  raise(SIGUSR1);
  if (argc > 1)
    *(volatile int*)0 = 1;
  return handled == SIGUSR1 ? 5 : 6;
}
)";

// Loads "libplug.so" from its own directory, calls it and lets it go.
const char* const PluginHostC = R"(#include <dlfcn.h>
#include <stdio.h>
#include <string.h>
int main(int argc, char** argv) {
  (void)argc;
  char path[4096];
  snprintf(path, sizeof path, "%s", argv[0]);
  char* slash = strrchr(path, '/');
  snprintf(slash + 1, sizeof path - (size_t)(slash + 1 - path), "libplug.so");
  void* plugin = dlopen(path, RTLD_NOW);
  if (!plugin)
    return 9;
  int (*answer)(void) = (int (*)(void))dlsym(plugin, "answer");
  const int code = answer();
  dlclose(plugin);
  return code;
}
)";

class RunControl : public ::testing::Test {
protected:
  void SetUp() override { SetMainThread(); }
  void TearDown() override {
    Process = nullptr;
    ProcessPending();
  }

  /// Creates the process for Program through the "local" profile.
  void Launch(const std::string& Program, TGDBLanguage Language = glC, const std::string& Arguments = "") {
    ASSERT_FALSE(Program.empty());
    Process = TGDBProcessManager::CreateProcess(Listener, Program, Arguments, Scratch.Path(), "local", "Linux64",
                                                Language, gcAMD64, "gdb");
    ASSERT_TRUE(Process);
  }
  /// Pumps until the IDE has heard one more stop than before.
  bool NextStop() {
    const size_t Before = StopsSeen;
    const bool Stopped = Listener->PumpUntil([&] { return Listener->CountOf("Suspended(") > Before; });
    StopsSeen = Listener->CountOf("Suspended(");
    return Stopped;
  }
  TGDBLocation StopLocation() { return Process->GetThread(Process->GetSuspendedThreadId())->GetCurrentLocation(); }
  TThreadStopReason StopReason() { return Process->GetThread(Process->GetSuspendedThreadId())->GetStopReason(); }
  /// Releases the process and tells whether its debugger has gone.
  bool ReleaseAndCheckDebuggerGone() {
    Process = nullptr;
    ProcessPending();
    return DebuggersRunning() == 0;
  }

  TScratchDir Scratch;
  TIntfPtr<TSignalListener> Listener{new TSignalListener};
  TIntfPtr<IGDBProcess> Process;
  size_t StopsSeen = 0;
};

TEST_F(RunControl, RunReportsTheExitCode) {
  Launch(Compile(Scratch, "stepping", slC, SteppingC));
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(2,"));
  EXPECT_FALSE(Listener->HasCall("Suspended("));
}

struct TMainCase {
  TSourceLanguage Source;
  TGDBLanguage Language;
  const char* Text;
  const char* FileName;
  Integer MainLine;
};

std::string MainCaseName(const ::testing::TestParamInfo<TMainCase>& Info) {
  static const char* const Names[] = {"C", "CPlusPlus", "Pascal"};
  return Names[Info.param.Source];
}

class RunControlToMain : public RunControl, public ::testing::WithParamInterface<TMainCase> {};

TEST_P(RunControlToMain, StopsAtMainAsABreakpointStopAndLearnsTheLanguage) {
  const TMainCase& Case = GetParam();
  // The process starts believing the program is Pascal unless it is: the
  // language must come from the debugger.
  Launch(Compile(Scratch, "tomain", Case.Source, Case.Text), Case.Language == glPascal ? glC : glPascal);
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  EXPECT_TRUE(ProcessOf(Process).CanSetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  const Integer Thread = Process->GetSuspendedThreadId();
  EXPECT_EQ(Thread, 1);
  EXPECT_TRUE(Listener->HasCall("ThreadCreated(1)"));
  EXPECT_EQ(StopReason(), tsrAtBreakpoint);
  const TGDBLocation Location = StopLocation();
  EXPECT_EQ(std::filesystem::path(Location.Source).filename(), Case.FileName);
  EXPECT_EQ(Location.Line, Case.MainLine);
  EXPECT_NE(Location.Address, 0u);
  EXPECT_EQ(Process->GetThread(Thread)->GetState(), tsStop);
  EXPECT_EQ(Process->GetEvaluator(), Case.Language);
  EXPECT_FALSE(Listener->HasCallContaining("current source language"));
  Process->Terminate();
  EXPECT_TRUE(Listener->PumpUntilCall("Exited(0,"));
}

INSTANTIATE_TEST_SUITE_P(
    RunControlLanguages, RunControlToMain,
    ::testing::Values(TMainCase{slC, glC, "int main(void) {\n  int result = 0;\n  return result;\n}\n", "tomain.c", 2},
                      TMainCase{slCPP, glCPP,
                                "#include <string>\nint main() {\n  std::string text(\"x\");\n  return 0;\n}\n",
                                "tomain.cpp", 3},
                      TMainCase{slPascal, glPascal, "program tomain;\nvar i: integer;\nbegin\n  i := 1;\nend.\n",
                                "tomain.pas", 4}),
    MainCaseName);

TEST_F(RunControl, StepsReachTheListenerWithThreadLocationAndReason) {
  Launch(Compile(Scratch, "stepping", slC, SteppingC));
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopLocation().Line, MainFirstLine);
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());

  Thread->StepOver();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_EQ(StopReason(), tsrStepDone);
  EXPECT_EQ(StopLocation().Line, MainCallLine);
  EXPECT_TRUE(Listener->HasCall("Resumed(1)"));

  Thread->StepInto();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopReason(), tsrStepDone);
  EXPECT_EQ(StopLocation().Line, TwiceBodyLine);

  const UInt64 Before = StopLocation().Address;
  Thread->InstStepInto();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopReason(), tsrStepDone);
  EXPECT_NE(StopLocation().Address, Before);
  const UInt64 AfterInto = StopLocation().Address;
  Thread->InstStepOver();
  ASSERT_TRUE(NextStop());
  EXPECT_NE(StopLocation().Address, AfterInto);

  Thread->StepOut();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopReason(), tsrStepDone);
  EXPECT_EQ(StopLocation().Line, MainCallLine);

  Process->RunToFirstSource();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopLocation().Line, MainReturnLine);
  EXPECT_FALSE(Listener->HasCall("Signal("));

  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(2,"));
}

TEST_F(RunControl, RunToEntryPointStopsAtMain) {
  Launch(Compile(Scratch, "stepping", slC, SteppingC));
  Process->RunToEntryPoint();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopReason(), tsrAtBreakpoint);
  EXPECT_EQ(StopLocation().Line, MainFirstLine);
  Process->Terminate();
  EXPECT_TRUE(Listener->PumpUntilCall("Exited(0,"));
}

TEST_F(RunControl, PauseOfABusyLoopIsAStepStopAndResumeContinues) {
  Launch(Compile(Scratch, "busy", slC, BusyC));
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntil([&] { return std::filesystem::exists(Scratch.Path() + "/started.flag"); }));
  Process->Pause();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopReason(), tsrStepDone);
  EXPECT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_FALSE(Listener->HasCall("Signal("));

  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Resumed(1)"));
  EXPECT_FALSE(ProcessOf(Process).Suspended());
  Process->Pause();
  ASSERT_TRUE(NextStop());
  EXPECT_FALSE(Listener->HasCall("Signal("));
  const Integer Pid = Process->GetPid();
  Process->Terminate();
  EXPECT_TRUE(Listener->PumpUntilCall("Exited(0,"));
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
  EXPECT_FALSE(ProcessRuns(Pid));
}

TEST_F(RunControl, TerminateOfARunningProgramEndsProgramAndDebugger) {
  Launch(Compile(Scratch, "busy", slC, BusyC));
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntil([&] { return std::filesystem::exists(Scratch.Path() + "/started.flag"); }));
  const Integer Pid = Process->GetPid();
  ASSERT_TRUE(ProcessRuns(Pid));
  Process->Terminate();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(0,)"));
  // The pause that lets GDB take the kill is not the IDE's business.
  EXPECT_FALSE(Listener->HasCall("Suspended("));
  EXPECT_FALSE(Listener->HasCall("Signal("));
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
  EXPECT_FALSE(ProcessRuns(Pid));
}

TEST_F(RunControl, ThreadsStartedAndJoinedAreReported) {
  Launch(Compile(Scratch, "threads", slC, ThreadsC));
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(0,"));
  EXPECT_TRUE(Listener->HasCall("ThreadCreated(2)"));
  EXPECT_TRUE(Listener->HasCall("ThreadCreated(3)"));
  EXPECT_TRUE(Listener->HasCall("ThreadExited(2)"));
  EXPECT_TRUE(Listener->HasCall("ThreadExited(3)"));
  EXPECT_EQ(Listener->CountOf("ThreadExited(1)"), 1u);
}

TEST_F(RunControl, SignalsReachTheListenerAndResumeWhenNotStopping) {
  Listener->StopOnSignal = false;
  Launch(Compile(Scratch, "signals", slC, SignalsC), glC, "segv");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Signal(1,SIGUSR1)"));
  EXPECT_TRUE(Listener->HasCall("Signal(1,SIGSEGV)"));
  // The program went on, handled SIGUSR1 and was then killed by SIGSEGV.
  EXPECT_TRUE(Listener->HasCall("Exited(0,SIGSEGV)"));
  EXPECT_FALSE(Listener->HasCall("Suspended("));
}

TEST_F(RunControl, SignalTheIdeKeepsIsAStopThatResumes) {
  Launch(Compile(Scratch, "signals", slC, SignalsC));
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_TRUE(Listener->HasCall("Signal(1,SIGUSR1)"));
  EXPECT_EQ(StopReason(), tsrSignal);
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(5,"));
}

TEST_F(RunControl, SignalSetToNoStopPassNoLongerStops) {
  Launch(Compile(Scratch, "signals", slC, SignalsC));
  Process->SetOsException("SIGUSR1", false, true);
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_FALSE(Listener->HasCall("Signal("));
  EXPECT_TRUE(Listener->HasCall("Exited(5,"));
}

TEST_F(RunControl, TerminateOfAStoppedProgramEndsProgramAndDebugger) {
  Launch(Compile(Scratch, "stepping", slC, SteppingC));
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  const Integer Pid = Process->GetPid();
  ASSERT_TRUE(ProcessRuns(Pid));
  Process->Terminate();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(0,)"));
  EXPECT_EQ(Listener->CountOf("Exited("), 1u);
  EXPECT_FALSE(ProcessOf(Process).Alive());
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
  EXPECT_FALSE(ProcessRuns(Pid));
}

TEST_F(RunControl, DetachLeavesTheAttachedProgramRunning) {
  const std::string Program = Compile(Scratch, "busy", slC, BusyC);
  ASSERT_FALSE(Program.empty());
  const pid_t Busy = fork();
  if (Busy == 0) {
    if (chdir(Scratch.Path().c_str()) != 0)
      _exit(126);
    execl(Program.c_str(), Program.c_str(), static_cast<char*>(nullptr));
    _exit(127);
  }
  Process = TGDBProcessManager::AttachProcess(Listener, Busy, "local", "Linux64", glC, gcAMD64);
  ASSERT_TRUE(Process);
  EXPECT_NE(TracerOf(Busy), 0);
  Process->Detach();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(0,"));
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
  EXPECT_TRUE(ProcessRuns(Busy));
  EXPECT_EQ(TracerOf(Busy), 0);
  // Still running, not stopped: it takes a signal and ends by it.
  kill(Busy, SIGTERM);
  int Status = 0;
  EXPECT_EQ(waitpid(Busy, &Status, 0), Busy);
  EXPECT_TRUE(WIFSIGNALED(Status) && WTERMSIG(Status) == SIGTERM);
}

TEST_F(RunControl, LoadedAndUnloadedModulesReachTheListenerAndSetTheBaseAddress) {
  const std::string PluginSource = Scratch.WriteFile("plug.c", "int answer(void) { return 4; }\n");
  const std::string Build = "gcc -g -shared -fPIC -o '" + Scratch.Path() + "/libplug.so' '" + PluginSource + "'";
  ASSERT_EQ(std::system(Build.c_str()), 0);
  TIntfPtr<TModuleListener> Modules(new TModuleListener);
  Listener = Modules;
  Launch(Compile(Scratch, "pluginhost", slC, PluginHostC));
  Modules->Process = Process.get();
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_TRUE(Listener->HasCall("ModuleLoaded(libc.so.6)"));
  const UInt64 Base = Process->GetBaseAddress();
  EXPECT_NE(Base, 0u);
  EXPECT_LE(Base, StopLocation().Address);

  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(4,"));
  const std::vector<std::string> Calls = Listener->Calls();
  const auto Load = std::find(Calls.begin(), Calls.end(), "ModuleLoaded(libplug.so)");
  ASSERT_NE(Load, Calls.end());
  EXPECT_NE(std::find(Load, Calls.end(), "ModuleUnLoaded(libplug.so)"), Calls.end());
  EXPECT_EQ(Process->GetBaseAddress(), Base);

  const auto Plugin = std::find_if(Modules->Loaded.begin(), Modules->Loaded.end(),
                                   [](const TGDBModule& Module) { return Module.Name == "libplug.so"; });
  ASSERT_NE(Plugin, Modules->Loaded.end());
  EXPECT_EQ(Plugin->Path, Scratch.Path() + "/libplug.so");
  EXPECT_NE(Plugin->BaseAddress, 0u);
  EXPECT_GT(Plugin->Id, 0);
  for (size_t Index = 0; Index < Modules->Loaded.size(); ++Index)
    EXPECT_EQ(Modules->CurrentNames[Index], Modules->Loaded[Index].Name);
}

TEST_F(RunControl, LaunchThatCannotExecTheProgramEndsWithTheDebuggersReason) {
  // GDB names the shell's process id before the exec fails, so the launch
  // ends as an exit with the reason rather than as a missing process id.
  const std::string Program = Compile(Scratch, "stepping", slC, SteppingC);
  ASSERT_FALSE(Program.empty());
  std::filesystem::permissions(Program, std::filesystem::perms::owner_exec | std::filesystem::perms::group_exec |
                                            std::filesystem::perms::others_exec,
                               std::filesystem::perm_options::remove);
  Launch(Program);
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCallContaining("During startup program exited with code 126."));
  EXPECT_FALSE(ProcessOf(Process).Alive());
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
}

TEST_F(RunControl, DebuggerDyingEndsTheSessionWithoutHanging) {
  // GDB 13 hits a fatal signal on a variable object of a whole Pascal array.
  const char* const ArrayPas = "program arr;\nvar a: array[1..3] of integer;\nbegin\n  a[1] := 1;\nend.\n";
  Launch(Compile(Scratch, "arr", slPascal, ArrayPas), glPascal);
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  const Integer Pid = Process->GetPid();
  TGDBProcess& Core = ProcessOf(Process);
  std::string Token;
  TVarCreateResult Variable;
  const std::string Line = Core.Requests().Build(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateVarCreateCommand(Key, "-", "a", 0); });
  Core.ProcessSyncRequest(Token, Line, Variable);
  EXPECT_FALSE(Variable.FAvailable && !Variable.FError);
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("InternalError(Connection to GDB kernel is no longer available"));
  EXPECT_FALSE(Core.Alive());
  // Nothing waits for the lost debugger any more.
  TStackInfoDepthResult Depth;
  const std::string DepthLine = Core.Requests().Build(Token, &TGDBCommand::CreateStackInfoDepthCommand, -1);
  Core.ProcessSyncRequest(Token, DepthLine, Depth);
  EXPECT_FALSE(Depth.FAvailable && !Depth.FError);
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
  // The program does not outlive its debugger.
  EXPECT_TRUE(Listener->PumpUntil([&] { return !ProcessRuns(Pid); }));
}

// --- The scripted fake debugger -------------------------------------------------

class RunControlFake : public ::testing::Test {
protected:
  void SetUp() override { SetMainThread(); }
  void TearDown() override {
    Process = nullptr;
    ProcessPending();
  }
  /// Starts a process on the fake GDB running the script NAME.
  void Launch(const std::string& ScriptName) {
    const std::string Bin = Scratch.Path() + "/bin";
    std::filesystem::create_directories(Bin);
    std::filesystem::copy_file(FakeDebuggerPath(), Bin + "/gdb", std::filesystem::copy_options::overwrite_existing);
    PathEnv = std::make_unique<TScopedEnv>("PATH", Bin + ":" + GetEnvironmentVariable("PATH"));
    ScriptEnv = std::make_unique<TScopedEnv>("FAKEMI_SCRIPT", TestDataDir() + "/fakemi/" + ScriptName);
    Process = TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glC, gcAMD64,
                                                "gdb");
    ASSERT_TRUE(Process);
  }

  TScratchDir Scratch;
  std::unique_ptr<TScopedEnv> PathEnv;
  std::unique_ptr<TScopedEnv> ScriptEnv;
  TIntfPtr<TSignalListener> Listener{new TSignalListener};
  TIntfPtr<IGDBProcess> Process;
};

TEST_F(RunControlFake, ThreadBurstIsOneDeliveryLatestThreadFirst) {
  Launch("runcontrol-threads-burst.script");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Suspended(1)"));
  EXPECT_EQ(Process->GetEvaluator(), glCPP);
  EXPECT_EQ(Process->GetThread(1)->GetName(), "0x7ffff7d8a740 (LWP 4242)");
  ASSERT_EQ(ProcessPending(), 0u);

  TGDBProcess& Core = ProcessOf(Process);
  std::string Token;
  TStackInfoDepthResult Depth;
  const std::string Line = Core.Requests().Build(Token, &TGDBCommand::CreateStackInfoDepthCommand, -1);
  ASSERT_TRUE(Core.ProcessSyncRequest(Token, Line, Depth));
  ASSERT_FALSE(Depth.FError);
  EXPECT_EQ(ProcessPending(), 1u);
  const std::vector<std::string> Calls = Listener->Calls();
  ASSERT_GE(Calls.size(), 2u);
  EXPECT_EQ(Calls[Calls.size() - 2], "ThreadCreated(3)");
  EXPECT_EQ(Calls.back(), "ThreadCreated(2)");
  Core.NotifyProcessExited(0, "");
}

TEST_F(RunControlFake, SignalWithoutThreadIsNotOfferedAndResumes) {
  Launch("runcontrol-signal-no-thread.script");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(7,"));
  EXPECT_FALSE(Listener->HasCall("Signal("));
  EXPECT_FALSE(Listener->HasCall("Suspended("));
}

TEST_F(RunControlFake, FaultWhileRunningIsAnExitWithMinusOne) {
  Launch("runcontrol-fault.script");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(-1,)"));
  EXPECT_FALSE(ProcessOf(Process).Alive());
}

TEST_F(RunControlFake, WatchpointOutOfScopeResumesWithoutTellingTheIde) {
  Launch("runcontrol-watch-scope.script");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(4,"));
  EXPECT_FALSE(Listener->HasCall("Suspended("));
  EXPECT_FALSE(Listener->HasCall("Resumed("));
}

TEST_F(RunControlFake, LaunchRefusedBeforeAProcessIdReachesGetPid) {
  Launch("runcontrol-launch-fails.script");
  Process->Run();
  try {
    Process->GetPid();
    ADD_FAILURE() << "GetPid answered for a program that never started";
  } catch (const ENonAIRException& Error) {
    EXPECT_STREQ(Error.what(), "Unable to create process: 'During startup program exited with code 126.'");
  }
  EXPECT_FALSE(ProcessOf(Process).Alive());
  ProcessPending();
  EXPECT_FALSE(Listener->HasCall("Exited("));
}

} // namespace
} // namespace midebug
