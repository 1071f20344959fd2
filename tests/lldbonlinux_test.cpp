// LLDB's MI front end on Linux, the real one, through the "local" profile:
// what it reports wrongly or in GDB's words for something else (exit codes,
// the program's output, the state of paused threads) reaches the IDE as it
// is.

#include "breakpointtesting.h"

#include <csignal>
#include <filesystem>
#include <string>

namespace midebug {
namespace {

using test::Debuggee;

class LLDBOnLinux : public test::TDebugFixture {
protected:
  void SetUp() override {
    TDebugFixture::SetUp();
    if (!FindLLDB())
      GTEST_SKIP() << WhyNot;
  }
  void Launch(const std::string& Program, const std::string& Arguments = "") {
    Process = TGDBProcessManager::CreateProcess(Listener, Debuggee(Program), Arguments, Scratch.Path(), "local",
                                                "Linux64", glC, gcAMD64, LLDB);
    ASSERT_TRUE(Process);
  }

};

TEST_F(LLDBOnLinux, ExitCodeIsTheOneTheProgramReturned) {
  Launch("exitthree");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(3,)"));
  // The question that found the code is not the user's to read.
  EXPECT_FALSE(Listener->HasCallContaining("exited with status"));
}

TEST_F(LLDBOnLinux, WithoutAProfileALinuxTargetTakesNoAndroidRoute) {
  Process = TGDBProcessManager::CreateProcess(Listener, Debuggee("exitthree"), "", Scratch.Path(), "", "Linux64", glC,
                                              gcAMD64, LLDB);
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(3,)"));
}

TEST_F(LLDBOnLinux, ALaunchRefusedBeforeAnyProcessEndsAtOnceWithTheReason) {
  const test::TScopedEnv NoServer("LLDB_DEBUGSERVER_PATH", Scratch.Path() + "/no-lldb-server");
  Launch("exitthree");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCallContaining("unable to locate lldb-server"));
}

TEST_F(LLDBOnLinux, EveryThreadOfAPausedProgramIsStopped) {
  Launch("idlers");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntil([&] { return std::filesystem::exists(Scratch.Path() + "/started.flag"); }));
  Process->Pause();
  ASSERT_TRUE(Listener->PumpUntilCall("Suspended("));
  for (Integer Id = 1; Id <= 3; ++Id) {
    const TIntfPtr<IGDBThread> Thread = Process->GetThread(Id);
    ASSERT_TRUE(Thread) << "thread " << Id;
    EXPECT_EQ(Thread->GetState(), tsStop) << "thread " << Id;
  }
  Process->Terminate();
  EXPECT_TRUE(Listener->PumpUntilCall("Exited("));
}

TEST_F(LLDBOnLinux, TheLocalProfileAttachesWithTheDebuggerNamedAndDetachLeavesTheProgram) {
  const int Pid = test::StartDebuggee("sleeper");
  ASSERT_NE(Pid, 0);
  Process = TGDBProcessManager::AttachProcess(Listener, Pid, "local", "Linux64", glC, gcAMD64, LLDB);
  ASSERT_TRUE(Process);
  ASSERT_TRUE(Listener->PumpUntilCall("Suspended("));
  EXPECT_EQ(Process->GetPid(), Pid);
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());
  ASSERT_TRUE(Thread);
  EXPECT_GT(Thread->GetCallCount(), 1);
  Process->Detach();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  Process = nullptr;
  const bool StillRunning = test::ProcessRuns(Pid);
  kill(Pid, SIGKILL);
  EXPECT_TRUE(StillRunning);
}

} // namespace
} // namespace midebug
