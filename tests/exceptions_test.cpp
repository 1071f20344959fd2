// Language exceptions against the real GDB: C++ throws and catches through
// the C++ runtime, Free Pascal's raise, and the notifier functions a
// runtime may define, each reported to the IDE with what it names.

#include "breakpointtesting.h"

namespace midebug {
namespace {

using test::Debuggee;
using test::MarkedLine;

/// Keeps the last exception the IDE heard of and answers as told.
class TExceptionListener : public test::TTestListener {
public:
  std::atomic<bool> StopOnException{true};
  void ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& Exception) override {
    TTestListener::ExceptionRaised(ShouldStop, ThreadId, Exception);
    ShouldStop = StopOnException;
    std::lock_guard Guard(FLock);
    FLast = Exception;
  }
  TGDBException Last() const {
    std::lock_guard Guard(FLock);
    return FLast;
  }

private:
  mutable std::mutex FLock;
  TGDBException FLast;
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
  TIntfPtr<TExceptionListener> Heard{new TExceptionListener};
};

TEST_F(Exceptions, AThousandThrowsAllDeclinedRunToTheEnd) {
  Heard->StopOnException = false;
  LaunchAndRun("throws", glCPP, "1000");
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(", std::chrono::seconds(100)));
  EXPECT_TRUE(Listener->HasCall("Exited(0,"));
  EXPECT_EQ(Listener->CountOf("Exception("), 2002u);
  EXPECT_FALSE(Listener->HasCall("Suspended("));
}

/// One exception stop: what the IDE hears of it, and where the stop is
/// told (a line of Source when Line is not 0, else the address).
struct TExpected {
  Integer Kind;
  const char* Name;
  const char* Desc;
  const char* Source;
  const char* Marker;
  UInt64 Address;
};

struct TProgramCase {
  const char* Program;
  TGDBLanguage Language;
  const char* Arguments;
  std::vector<TExpected> Stops;
};

class ExceptionStops : public Exceptions, public ::testing::WithParamInterface<TProgramCase> {};

// C++ throws are named by the mangled type and told where the program threw
// or caught; Free Pascal's raise by class and message; the notifiers pass
// kind, name and address through (a zero address falls back to the fifth
// argument).
TEST_P(ExceptionStops, EachIsToldWithWhatItNamesAndTheProgramRunsOn) {
  const TProgramCase& Case = GetParam();
  LaunchAndRun(Case.Program, Case.Language, Case.Arguments);
  for (const TExpected& Expected : Case.Stops) {
    SCOPED_TRACE(Expected.Name);
    ASSERT_TRUE(NextStop());
    const TGDBException Told = Heard->Last();
    EXPECT_EQ(StopReason(), tsrExceptRaised);
    EXPECT_TRUE(Told.Kind == Expected.Kind && Told.Name == Expected.Name && Told.Desc == Expected.Desc);
    EXPECT_NE(Told.EObject, 0u);
    if (Expected.Marker)
      EXPECT_TRUE(Told.Location.Line == MarkedLine(Expected.Source, Expected.Marker) &&
                  StopLocation().Line == Told.Location.Line);
    else
      EXPECT_EQ(Told.Location.Address, Expected.Address);
    // What follows the last one expected runs on.
    Heard->StopOnException = &Expected != &Case.Stops.back();
    Process->Resume();
  }
  EXPECT_TRUE(Listener->PumpUntilCall("Exited(0,"));
}

INSTANTIATE_TEST_SUITE_P(
    Languages, ExceptionStops,
    ::testing::Values(
        TProgramCase{"throws", glCPP, "1",
                     {{16, "St13runtime_error", "", "throws.cpp", "throw", 0},
                      {1, "St13runtime_error", "", "throws.cpp", "catch", 0},
                      {16, "N6shapes8BadShapeE", "", "throws.cpp", "own-throw", 0}}},
        TProgramCase{"raises", glPascal, "",
                     {{8, "ETooDeep", "depth 12 is too deep", "raises.pas", "raise", 0}}},
        TProgramCase{"notifier", glC, "", {{3, "ETooBig", "", "", nullptr, 0x1234}, {5, "EPasky", "", "", nullptr, 0x5678}}}),
    [](const ::testing::TestParamInfo<TProgramCase>& Info) { return std::string(Info.param.Program); });

} // namespace
} // namespace midebug
