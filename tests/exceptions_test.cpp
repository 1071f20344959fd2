// Language exceptions against the real GDB: C++ throws and catches through
// the C++ runtime, Free Pascal's raise, and the notifier functions a
// runtime may define, each reported to the IDE with what it names.

#include "breakpointtesting.h"

namespace midebug {
namespace {

using test::Debuggee;
using test::MarkedLine;

/// Keeps every exception the IDE heard of and answers as told.
class TExceptionListener : public test::TTestListener {
public:
  std::atomic<bool> StopOnException{true};
  void ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& Exception) override {
    TTestListener::ExceptionRaised(ShouldStop, ThreadId, Exception);
    ShouldStop = StopOnException;
    std::lock_guard Guard(FLock);
    FExceptions.push_back(Exception);
  }
  std::vector<TGDBException> Exceptions() const {
    std::lock_guard Guard(FLock);
    return FExceptions;
  }
  TGDBException Last() const {
    std::lock_guard Guard(FLock);
    return FExceptions.empty() ? DummyException : FExceptions.back();
  }

private:
  mutable std::mutex FLock;
  std::vector<TGDBException> FExceptions;
};

class Exceptions : public test::TDebugFixture {
protected:
  void SetUp() override {
    TDebugFixture::SetUp();
    Listener = TIntfPtr<test::TTestListener>(Heard.get());
  }
  /// Launches, lets the process place its exception breakpoints as the IDE
  /// does when it sets its signal policy, and runs.
  void LaunchAndRun(const std::string& Program, TGDBLanguage Language, const std::string& Arguments = "") {
    Launch(Debuggee(Program), Language, Arguments);
    Process->SetOsException("SIGUSR1", true, true);
    Process->Run();
  }
  /// The next exception stop: its exception and the stop reason.
  bool NextException(TGDBException& Exception) {
    if (!NextStop())
      return false;
    Exception = Heard->Last();
    return StopReason() == tsrExceptRaised;
  }

  TIntfPtr<TExceptionListener> Heard{new TExceptionListener};
};

TEST_F(Exceptions, ACppThrowNamesItsTypeAndPlaceAndTheCatchWhereItIsCaught) {
  const auto Line = [](const char* Marker) { return MarkedLine("throws.cpp", Marker); };
  LaunchAndRun("throws", glCPP, "1");
  TGDBException Thrown, Caught, Own;
  ASSERT_TRUE(NextException(Thrown));
  EXPECT_EQ(Thrown.Kind, 16);
  EXPECT_EQ(Thrown.Name, "St13runtime_error");
  EXPECT_NE(Thrown.EObject, 0u);
  EXPECT_EQ(Thrown.Location.Line, Line("throw"));
  // The stop is told at the throw, in the program.
  EXPECT_EQ(Process->GetThread(Process->GetSuspendedThreadId())->GetCurrentLocation().Line, Line("throw"));
  ASSERT_TRUE(ResumeToStop());
  Caught = Heard->Last();
  EXPECT_EQ(Caught.Kind, 1);
  EXPECT_EQ(Caught.Name, "St13runtime_error");
  EXPECT_EQ(Caught.Location.Line, Line("catch"));
  ASSERT_TRUE(ResumeToStop());
  Own = Heard->Last();
  EXPECT_EQ(Own.Name, "N6shapes8BadShapeE");
  EXPECT_EQ(Own.Location.Line, Line("own-throw"));
  Heard->StopOnException = false;
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(0,"));
  EXPECT_EQ(Heard->Exceptions().size(), 4u);
}

TEST_F(Exceptions, AThousandThrowsAllDeclinedRunToTheEnd) {
  Heard->StopOnException = false;
  LaunchAndRun("throws", glCPP, "1000");
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(", std::chrono::seconds(100)));
  EXPECT_TRUE(Listener->HasCall("Exited(0,"));
  EXPECT_EQ(Heard->Exceptions().size(), 2002u);
  EXPECT_FALSE(Listener->HasCall("Suspended("));
}

TEST_F(Exceptions, TheNotifierFunctionsReportKindObjectNameAndAddress) {
  LaunchAndRun("notifier", glC);
  TGDBException FromCpp, FromPascal;
  ASSERT_TRUE(NextException(FromCpp));
  EXPECT_EQ(FromCpp.Kind, 3);
  EXPECT_EQ(FromCpp.Name, "ETooBig");
  EXPECT_EQ(FromCpp.Location.Address, 0x1234u);
  EXPECT_NE(FromCpp.EObject, 0u);
  ASSERT_TRUE(ResumeToStop());
  FromPascal = Heard->Last();
  EXPECT_EQ(FromPascal.Kind, 5);
  EXPECT_EQ(FromPascal.Name, "EPasky");
  EXPECT_EQ(FromPascal.Location.Address, 0x5678u);
  EXPECT_EQ(FromPascal.EObject, FromCpp.EObject);
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(0,"));
}

TEST_F(Exceptions, APascalRaiseNamesTheClassAndTheMessageOfAnException) {
  LaunchAndRun("raises", glPascal);
  TGDBException Raised, Plain;
  ASSERT_TRUE(NextException(Raised));
  EXPECT_EQ(Raised.Name, "ETooDeep");
  EXPECT_EQ(Raised.Desc, "depth 12 is too deep");
  EXPECT_EQ(Raised.Location.Line, MarkedLine("raises.pas", "raise"));
  ASSERT_TRUE(ResumeToStop());
  Plain = Heard->Last();
  EXPECT_EQ(Plain.Name, "TPlain");
  EXPECT_EQ(Plain.Desc, "");
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(0,"));
}

} // namespace
} // namespace midebug
