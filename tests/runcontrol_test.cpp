// Running, stopping, stepping, pausing and ending a program, and
// the events the IDE hears meanwhile: against the real GDB through the
// default "local" profile, and on the scripted fake debugger for what GDB
// cannot be made to do.

#include "midebug.h"
#include "platform/hostfiles.h"
#include "process/gdbprocess.h"
#include "breakpointtesting.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <filesystem>

namespace midebug {
namespace {

using test::Debuggee;
using test::ProcessRuns;
using test::TFakeOnPath;
using test::TTestListener;


/// Keeps the modules the IDE heard of, and what GetModule answered for each
/// while it was being delivered.
class TModuleListener : public TTestListener {
public:
  /// Not owned: the process owns its listener.
  IGDBProcess* Process = nullptr;
  std::vector<TGDBModule> Loaded;
  std::vector<std::string> CurrentNames;
  void ModuleLoaded(const TGDBModule& Module) override {
    TTestListener::ModuleLoaded(Module);
    Loaded.push_back(Module);
    CurrentNames.push_back(Process->GetModule(Module.Id).Name);
  }
};

// Line numbers of tests/debuggees/stepping.c.
constexpr Integer TwiceBodyLine = 2;
constexpr Integer MainFirstLine = 6;
constexpr Integer MainCallLine = 7;
constexpr Integer MainReturnLine = 8;

class RunControl : public test::TDebugFixture {
protected:
  /// Releases the process and tells whether its debugger has gone.
  bool ReleaseAndCheckDebuggerGone() {
    Process = nullptr;
    ProcessPending();
    return test::ChildrenNamed("gdb").empty();
  }
};

struct TMainCase {
  const char* Program;
  TGDBLanguage Language;
  const char* FileName;
  Integer MainLine;
};

void PrintTo(const TMainCase& Case, std::ostream* Out) { *Out << Case.Program; }

class RunControlToMain : public RunControl, public ::testing::WithParamInterface<TMainCase> {};

TEST_P(RunControlToMain, StopsAtMainAsABreakpointStopAndLearnsTheLanguage) {
  const TMainCase& Case = GetParam();
  // The process starts believing the program is Pascal unless it is: the
  // language must come from the debugger.
  Launch(Debuggee(Case.Program), Case.Language == glPascal ? glC : glPascal);
  ASSERT_TRUE(Process->SetRunToMainBreakpoint());
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_TRUE(Listener->HasCall("ThreadCreated(1)"));
  EXPECT_EQ(StopReason(), tsrAtBreakpoint);
  const TGDBLocation Location = StopLocation();
  EXPECT_EQ(std::filesystem::path(Location.Source).filename(), Case.FileName);
  EXPECT_EQ(Location.Line, Case.MainLine);
  EXPECT_NE(Location.Address, 0u);
  EXPECT_EQ(Process->GetThread(1)->GetState(), tsStop);
  EXPECT_EQ(Process->GetEvaluator(), Case.Language);
  EXPECT_FALSE(Listener->HasCallContaining("current source language"));
  // Terminating the stopped program ends it and its debugger.
  const Integer Pid = Process->GetPid();
  Process->Terminate();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(0,)"));
  EXPECT_EQ(Listener->CountOf("Exited("), 1u);
  EXPECT_FALSE(Core().Alive());
  EXPECT_TRUE(ReleaseAndCheckDebuggerGone());
  EXPECT_FALSE(ProcessRuns(Pid));
}

INSTANTIATE_TEST_SUITE_P(RunControlLanguages, RunControlToMain,
                         ::testing::Values(TMainCase{"stepping", glC, "stepping.c", 6},
                                           TMainCase{"nested", glCPP, "nested.cpp", 7},
                                           TMainCase{"calls", glPascal, "calls.pas", 15}),
                         [](const ::testing::TestParamInfo<TMainCase>& Info) { return std::string(Info.param.Program); });

TEST_F(RunControl, StepsReachTheListenerWithThreadLocationAndReason) {
  ASSERT_NO_FATAL_FAILURE(LaunchToMain(Debuggee("stepping")));
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

TEST_F(RunControl, AStepTheDebuggerRefusesIsReportedAndStopsAgainWhereItWas) {
  ASSERT_NO_FATAL_FAILURE(LaunchToMain(Debuggee("stepping")));
  const TGDBLocation AtMain = StopLocation();
  // Compiled as "gcc stepping.c": the location names the file by its path.
  EXPECT_EQ(AtMain.Source, test::DebuggeeSource("stepping.c"));
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());
  Thread->StepOut();
  ASSERT_TRUE(NextStop());
  EXPECT_TRUE(Listener->HasCallContaining("not meaningful in the outermost frame"));
  EXPECT_EQ(StopLocation().Line, AtMain.Line);
  EXPECT_EQ(StopReason(), tsrAtBreakpoint);
  // The session goes on: the next step is taken.
  Thread->StepOver();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopLocation().Line, MainCallLine);
}

TEST_F(RunControl, ADebuggerThatDiesWhileTheProgramIsStoppedIsReportedAtOnce) {
  ASSERT_NO_FATAL_FAILURE(LaunchToMain(Debuggee("stepping")));
  const std::vector<int> Debuggers = test::ChildrenNamed("gdb");
  ASSERT_EQ(Debuggers.size(), 1u);
  kill(Debuggers[0], SIGKILL);
  // No request is made: the loss is noticed by the reader alone.
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCallContaining("InternalError(Connection to GDB kernel is no longer available"));
}

TEST_F(RunControl, WithoutAProfileGdbOnThisMachineIsStartedAsOnTheLocalOne) {
  Process = TGDBProcessManager::CreateProcess(Listener, Debuggee("exitthree"), "", Scratch.Path(), "", "Linux64", glC,
                                              gcAMD64, "/usr/bin/gdb");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(3,)"));
}

TEST_F(RunControl, PauseOfABusyLoopIsAStepStopAndResumeContinues) {
  Launch(Debuggee("busy"));
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntil([&] { return std::filesystem::exists(Scratch.Path() + "/started.flag"); }));
  Process->Pause();
  ASSERT_TRUE(NextStop());
  EXPECT_EQ(StopReason(), tsrStepDone);
  EXPECT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_FALSE(Listener->HasCall("Signal("));

  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Resumed(1)"));
  EXPECT_FALSE(Core().Suspended());
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
  Launch(Debuggee("busy"));
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
  ASSERT_NO_FATAL_FAILURE(LaunchToMain(Debuggee("workers")));
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(6,"));
  EXPECT_TRUE(Listener->HasCall("ThreadCreated(2)"));
  EXPECT_TRUE(Listener->HasCall("ThreadCreated(3)"));
  EXPECT_TRUE(Listener->HasCall("ThreadExited(2)"));
  EXPECT_TRUE(Listener->HasCall("ThreadExited(3)"));
  EXPECT_EQ(Listener->CountOf("ThreadExited(1)"), 1u);
}

TEST_F(RunControl, SignalsReachTheListenerAndResumeWhenNotStopping) {
  Listener->StopOnSignal = false;
  Launch(Debuggee("usr1"), glC, "segv");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Signal(1,SIGUSR1)"));
  EXPECT_TRUE(Listener->HasCall("Signal(1,SIGSEGV)"));
  // The program went on, handled SIGUSR1 and was then killed by SIGSEGV.
  EXPECT_TRUE(Listener->HasCall("Exited(0,SIGSEGV)"));
  EXPECT_FALSE(Listener->HasCall("Suspended("));
}

TEST_F(RunControl, SignalTheIdeKeepsIsAStopThatResumes) {
  Launch(Debuggee("usr1"));
  Process->Run();
  ASSERT_TRUE(NextStop());
  EXPECT_TRUE(Listener->HasCall("Signal(1,SIGUSR1)"));
  EXPECT_EQ(StopReason(), tsrSignal);
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(5,"));
}

TEST_F(RunControl, SignalsTheProgramRaisesItselfAreSignalsNotPauses) {
  Launch(Debuggee("raised"));
  Process->Run();
  for (const char* Signal : {"Signal(1,SIGTRAP)", "Signal(1,SIGINT)"}) {
    ASSERT_TRUE(NextStop()) << Signal;
    EXPECT_TRUE(Listener->HasCall(Signal));
    EXPECT_EQ(StopReason(), tsrSignal) << Signal;
    Process->Resume();
  }
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(4,"));
}

TEST_F(RunControl, LoadedAndUnloadedModulesReachTheListenerAndSetTheBaseAddress) {
  TIntfPtr<TModuleListener> Modules(new TModuleListener);
  Listener = Modules;
  Launch(Debuggee("pluginhost"));
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
  EXPECT_EQ(Plugin->Path, Debuggee("libplug.so"));
  EXPECT_NE(Plugin->BaseAddress, 0u);
  EXPECT_GT(Plugin->Id, 0);
  for (size_t Index = 0; Index < Modules->Loaded.size(); ++Index)
    EXPECT_EQ(Modules->CurrentNames[Index], Modules->Loaded[Index].Name);
}

// --- The scripted fake debugger -------------------------------------------------

class RunControlFake : public test::TDebugFixture {
protected:
  /// Starts a process on the fake GDB playing the script Name and runs it.
  void Run(const std::string& Name) {
    Fake.reset();
    Fake = std::make_unique<TFakeOnPath>("gdb", Name);
    Process = TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local", "Linux64", glC, gcAMD64,
                                                "gdb");
    ASSERT_TRUE(Process);
    Process->Run();
  }

  std::unique_ptr<TFakeOnPath> Fake;
};

TEST_F(RunControlFake, ThreadBurstIsOneDeliveryLatestThreadFirst) {
  Run("runcontrol-threads-burst.script");
  ASSERT_TRUE(Listener->PumpUntilCall("Suspended(1)"));
  EXPECT_EQ(Process->GetEvaluator(), glCPP);
  EXPECT_EQ(Process->GetThread(1)->GetName(), "0x7ffff7d8a740 (LWP 4242)");
  ASSERT_EQ(ProcessPending(), 0u);

  TStackInfoDepthResult Depth;
  ASSERT_TRUE(Core().ProcessSyncRequest("0300000000901", "0300000000901-stack-info-depth", Depth));
  ASSERT_FALSE(Depth.FError);
  EXPECT_EQ(ProcessPending(), 1u);
  const std::vector<std::string> Calls = Listener->Calls();
  ASSERT_GE(Calls.size(), 2u);
  EXPECT_EQ(Calls[Calls.size() - 2], "ThreadCreated(3)");
  EXPECT_EQ(Calls.back(), "ThreadCreated(2)");
}

TEST_F(RunControlFake, SilentStopsAndFaultsEndInTheExit) {
  const struct {
    const char* Script;
    const char* Exit;
  } Cases[] = {
      // A signal stop that names no thread is not offered and resumes.
      {"runcontrol-signal-no-thread.script", "Exited(7,"},
      // A watchpoint out of scope resumes on its own.
      {"runcontrol-watch-scope.script", "Exited(4,"},
      // An error nobody waits for while the program runs is its fault.
      {"runcontrol-fault.script", "Exited(-1,)"},
  };
  for (const auto& Case : Cases) {
    SCOPED_TRACE(Case.Script);
    Listener = new TTestListener;
    Run(Case.Script);
    ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
    EXPECT_TRUE(Listener->HasCall(Case.Exit));
    EXPECT_FALSE(Listener->HasCall("Signal("));
    EXPECT_FALSE(Listener->HasCall("Suspended("));
    EXPECT_FALSE(Listener->HasCall("Resumed("));
    EXPECT_FALSE(Core().Alive());
    TearDown();
  }
}

TEST_F(RunControlFake, LaunchRefusedBeforeAProcessIdEndsTheSessionAndSaysWhy) {
  Run("runcontrol-launch-fails.script");
  try {
    Process->GetPid();
    ADD_FAILURE() << "GetPid answered for a program that never started";
  } catch (const ENonAIRException& Error) {
    EXPECT_STREQ(Error.what(), "Unable to create process: 'During startup program exited with code 126.'");
  }
  EXPECT_FALSE(Core().Alive());
  ProcessPending();
  EXPECT_TRUE(Listener->HasCall("Exited(-1,During startup program exited with code 126.)"));
}

} // namespace
} // namespace midebug
