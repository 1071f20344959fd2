// A debugged process from start-up to its end: the start-up dialogue with
// each debugger, the time-out policy, and a debugger that goes away.

#include "midebug.h"
#include "process/gdbprocess.h"
#include "testlistener.h"
#include "testsupport.h"

#include <gtest/gtest.h>

namespace midebug {
namespace {

using test::Debuggee;
using test::TFakeOnPath;
using test::TTestListener;

TGDBProcess& ProcessOf(const TIntfPtr<IGDBProcess>& Process) { return *static_cast<TGDBProcess*>(Process.get()); }

/// Sets the default wait policy for the life of the object, shortened so
/// that the time-outs pass quickly.
class TShortWaits {
public:
  TShortWaits() : FOld(DefaultWaitPolicy()) {
    DefaultWaitPolicy().StartupTimeoutMs = 400;
    DefaultWaitPolicy().RunningTimeoutMs = 60;
    DefaultWaitPolicy().TimeoutStepMs = 30;
    DefaultWaitPolicy().MaxTimeoutMs = 150;
    DefaultWaitPolicy().TerminateTimeoutMs = 50;
  }
  ~TShortWaits() { DefaultWaitPolicy() = FOld; }

private:
  TWaitPolicy FOld;
};

class ProcessTest : public ::testing::Test {
protected:
  void SetUp() override { SetMainThread(); }
  TIntfPtr<IGDBProcess> Create(const std::string& Program, const std::string& Platform = "Linux64",
                               const std::string& Debugger = "gdb") {
    return TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", Platform, glC, gcAMD64, Debugger);
  }

  TIntfPtr<TTestListener> Listener{new TTestListener};
};

TEST_F(ProcessTest, GdbStartUpSendsItsSettingsInOrder) {
  TFakeOnPath Fake("gdb", "golden-startup-gdb.script");
  TIntfPtr<IGDBProcess> Process = TGDBProcessManager::CreateProcess(Listener, "/work/my prog", "a b", "/tmp/dir/",
                                                                    "local", "Linux64", glC, gcAMD64, "gdb");
  EXPECT_EQ(Process->GetPid(), 4242);
  EXPECT_FALSE(ProcessOf(Process).IsLLDB());
}

TEST_F(ProcessTest, LldbStartUpForAWindowsTargetSendsItsSettingsInOrder) {
  TFakeOnPath Fake("lldb-mi", "golden-startup-lldb.script");
  TIntfPtr<IGDBProcess> Process = Create("/work/prog.exe", "Win64", "lldb-mi");
  EXPECT_TRUE(ProcessOf(Process).IsLLDB());
  EXPECT_TRUE(ProcessOf(Process).IsWindows());
}

TEST_F(ProcessTest, StartFailuresNameTheirCause) {
  const struct {
    const char* Debugger;
    const char* Profile;
    const char* Program;
    const char* Message;
  } Cases[] = {
      {"/no/such/lldb-mi", "", "/bin/true", "Unable to start LLDB kernel: 'Could not find program, '/no/such/lldb-mi''"},
      {"gdb", "local", "/no/such/program", "Unable to create process: '/no/such/program: No such file"},
  };
  for (const auto& Case : Cases) {
    try {
      TGDBProcessManager::CreateProcess(Listener, Case.Program, "", "", Case.Profile, "Linux64", glC, gcAMD64,
                                        Case.Debugger);
      ADD_FAILURE() << "no exception for " << Case.Program;
    } catch (const ENonAIRException& Error) {
      EXPECT_TRUE(std::string(Error.what()).starts_with(Case.Message)) << Error.what();
    }
    EXPECT_EQ(LiveProcessCount(), 0u);
  }
}

TEST_F(ProcessTest, ExitOfAnUnknownThreadDoesNotHoldBackLaterExits) {
  TFakeOnPath Fake("lldb-mi", "lldb-unknown-thread-exit.script");
  TIntfPtr<IGDBProcess> Process = Create("/work/prog", "Linux64", "lldb-mi");
  EXPECT_TRUE(Listener->PumpUntilCall("ThreadExited(2)", std::chrono::seconds(5)));
}

TEST_F(ProcessTest, WaitGrowsInStepsUntilTheIdeGivesTheDebuggerUp) {
  TShortWaits Waits;
  std::vector<Integer> Seen;
  DefaultWaitPolicy().WaitObserver = [&Seen](Integer Timeout) { Seen.push_back(Timeout); };
  TFakeOnPath Fake("gdb", "gdb-silent.script");
  Listener->FatalAnswers = {false, false, false, false, true};
  TIntfPtr<IGDBProcess> Process = Create("/work/prog");
  Seen.clear();

  TStackInfoDepthResult Depth;
  EXPECT_TRUE(ProcessOf(Process).ProcessSyncRequest("0300000000901", "0300000000901-stack-info-depth", Depth));
  EXPECT_EQ(Seen, (std::vector<Integer>{60, 90, 120, 150, 150}));
  EXPECT_EQ(Listener->FatalAsks(), 5u);
  EXPECT_TRUE(Depth.FTimeOut && Depth.FError);
  EXPECT_EQ(Depth.FErrorMessage, "debug kernel timeout");

  // Given up for good: the next request is still written but returns at once.
  TStackInfoDepthResult Again;
  EXPECT_TRUE(ProcessOf(Process).ProcessSyncRequest("0300000000902", "0300000000902-stack-info-depth", Again));
  EXPECT_TRUE(Again.FTimeOut);
  EXPECT_EQ(Listener->FatalAsks(), 5u);
}

TEST_F(ProcessTest, LostDebuggerIsReportedAndWakesTheWaiter) {
  TFakeOnPath Fake("gdb", "gdb-dies-on-request.script");
  TIntfPtr<IGDBProcess> Process = Create("/work/prog");
  TStackInfoDepthResult Depth;
  EXPECT_TRUE(ProcessOf(Process).ProcessSyncRequest("0300000000901", "0300000000901-stack-info-depth", Depth));
  EXPECT_FALSE(Depth.FAvailable);
  EXPECT_FALSE(Depth.FTimeOut);
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  const std::string Lost = "Connection to GDB kernel is no longer available: 'process exited'";
  EXPECT_EQ(Listener->Calls().front(), "InternalError(" + Lost + ")");
  EXPECT_TRUE(Listener->HasCall("Exited(1," + Lost + ")"));
  EXPECT_EQ(Listener->FatalAsks(), 0u);
}

TEST_F(ProcessTest, ReleasingALiveProcessStopsItsDebugger) {
  TIntfPtr<IGDBProcess> Process = Create(Debuggee("exitthree"));
  EXPECT_EQ(LiveProcessCount(), 1u);
  Process = nullptr;
  EXPECT_EQ(LiveProcessCount(), 0u);
  EXPECT_TRUE(test::ChildrenNamed("gdb").empty());
  ProcessPending();
}

} // namespace
} // namespace midebug
