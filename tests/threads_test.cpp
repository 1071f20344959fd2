// Threads and call stacks against the real GDB through the "local" profile:
// C, C++ and Pascal programs stopped in nested functions, their call-stack
// header lines, frame locations, and thread and frame selection.

#include "inspect/gdbthread.h"
#include "inspect/gdbthreadtable.h"
#include "stoppedprogram.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <string_view>

namespace midebug {
namespace {

using test::TTestListener;

/// Whether Text matches Pattern, where each '*' stands for any run of
/// characters.
bool Glob(std::string_view Text, std::string_view Pattern) {
  const size_t Star = Pattern.find('*');
  if (Star == std::string_view::npos)
    return Text == Pattern;
  if (!Text.starts_with(Pattern.substr(0, Star)))
    return false;
  for (size_t At = Star; At <= Text.size(); ++At)
    if (Glob(Text.substr(At), Pattern.substr(Star + 1)))
      return true;
  return false;
}

/// A frame header with an address: ':', the address in 16 upper-case
/// digits, a blank, then the call (a Glob pattern).
::testing::AssertionResult IsCHeader(const std::string& Header, const std::string& Call) {
  const bool Address = Header.size() > 18 && Header[0] == ':' && Header[17] == ' ' &&
                       std::all_of(Header.begin() + 1, Header.begin() + 17, [](char Digit) {
                         return std::isdigit(static_cast<unsigned char>(Digit)) || (Digit >= 'A' && Digit <= 'F');
                       });
  if (Address && Glob(Header.substr(18), Call))
    return ::testing::AssertionSuccess();
  return ::testing::AssertionFailure() << "'" << Header << "' is not ':ADDRESS " << Call << "'";
}

UInt64 HeaderAddress(const std::string& Header) { return std::stoull(Header.substr(1, 16), nullptr, 16); }

class ThreadsTest : public test::StoppedProgram {
protected:
  static TGDBThread& Of(const TIntfPtr<IGDBThread>& Thread) { return *static_cast<TGDBThread*>(Thread.get()); }
};

// tests/debuggees/threaded.c: the worker stops in inner, called from
// outer(1, 2), while main waits for it in finish, called from line 12
// whichever way the two threads race.

/// The threaded C program stopped in inner on the worker thread (2), with
/// both threads in the process's table.
class ThreadsInC : public ThreadsTest {
protected:
  void SetUp() override {
    ThreadsTest::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("threaded"), glC, {"ready", "inner"}));
    MainThread = Process->GetThread(1);
    ASSERT_FALSE(Of(MainThread).ZombieState());
    ASSERT_NO_FATAL_FAILURE(Continue());
    Worker = Process->GetThread(2);
    ASSERT_FALSE(Of(Worker).ZombieState());
    ASSERT_EQ(Process->GetSuspendedThreadId(), 2);
  }

  /// The 1-based number of the first frame of Thread whose header names
  /// Function, or 0.
  static Integer FrameOf(const TIntfPtr<IGDBThread>& Thread, const std::string& Function) {
    for (Integer Index = 1; Index <= Thread->GetCallCount(); ++Index)
      if (Thread->GetCallHeader(Index).find(" " + Function + "(") != std::string::npos)
        return Index;
    return 0;
  }

  TIntfPtr<IGDBThread> MainThread;
  TIntfPtr<IGDBThread> Worker;
};

TEST_F(ThreadsInC, StoppedThreadShowsItsCallsWithNamedArgumentsInnermostFirst) {
  EXPECT_EQ(Worker->GetStopReason(), tsrAtBreakpoint);
  const Integer Count = Worker->GetCallCount();
  ASSERT_GE(Count, 3);
  EXPECT_TRUE(IsCHeader(Worker->GetCallHeader(1), "inner(x=3)"));
  EXPECT_TRUE(IsCHeader(Worker->GetCallHeader(2), "outer(a=1, b=2)"));
  EXPECT_TRUE(IsCHeader(Worker->GetCallHeader(3), "worker(arg=0x0)"));
  EXPECT_EQ(Of(Worker).GetCallParams(2), (TStringArray{"a", "b"}));

  const TGDBLocation Inner = Worker->GetCallLocation(1);
  EXPECT_EQ(Inner.Line, 4);
  EXPECT_TRUE(Inner.Source.ends_with("threaded.c")) << Inner.Source;
  EXPECT_EQ(Inner.Address, HeaderAddress(Worker->GetCallHeader(1)));
  EXPECT_EQ(Worker->GetCallLocation(2).Line, 5);
  EXPECT_EQ(Worker->GetCallLocation(3).Line, 6);
  EXPECT_EQ(Worker->GetCallCount(), Count) << "the count after the fetch is the number of frames fetched";
}

TEST_F(ThreadsInC, FramesOutsideTheStackGiveEmptyValuesAndCannotBeSelected) {
  const Integer Count = Worker->GetCallCount();
  for (const Integer Index : {0, -1, Count + 1, 10000}) {
    EXPECT_EQ(Worker->GetCallHeader(Index), "") << Index;
    EXPECT_EQ(Worker->GetCallLocation(Index).Address, 0u) << Index;
    EXPECT_TRUE(Of(Worker).GetCallParams(Index).empty()) << Index;
  }
  EXPECT_NE(Worker->GetCallHeader(Count), "");

  // Selecting a frame outside the stack changes nothing.
  Of(Worker).SelectFrame(2);
  for (const Integer Frame : {0, -3, Count + 1}) {
    Of(Worker).SelectFrame(Frame);
    EXPECT_EQ(Of(Worker).FFrameIndex, 1) << Frame;
  }
  EXPECT_EQ(Core().Threads().CurrentLocation().Line, 5) << "still in outer";
}

TEST_F(ThreadsInC, AnotherThreadsFrameIsWhereTheDebuggerActsUntilTheThreadIsSelectedAgain) {
  ASSERT_NE(Worker->GetCallHeader(1), "");
  const Integer Main = FrameOf(MainThread, "main");
  ASSERT_GT(Main, 1) << "main waits in pthread_join";
  EXPECT_TRUE(IsCHeader(MainThread->GetCallHeader(Main), "main(argc=1, argv=0x*)"));
  EXPECT_EQ(FrameOf(MainThread, "inner"), 0) << "the worker's stack is not the main thread's";
  Of(MainThread).SetAsSuspendedThread();
  Of(MainThread).SelectFrame(Main);
  EXPECT_EQ(Of(MainThread).FFrameIndex, Main - 1);
  EXPECT_EQ(MainThread->GetCurrentLocation().Line, 12);
  EXPECT_EQ(Core().Threads().CurrentLocation().Line, 12) << "the debugger's frame is main's";

  Of(Worker).SetAsSuspendedThread();
  EXPECT_EQ(Process->GetSuspendedThreadId(), 2);
  EXPECT_EQ(Core().Threads().CurrentLocation().Line, 4);

  Of(MainThread).SetAsSuspendedThread();
  EXPECT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_EQ(Of(MainThread).FFrameIndex, 0);
  EXPECT_EQ(Core().Threads().CurrentLocation().Address, MainThread->GetCallLocation(1).Address)
      << "back at the innermost frame in the debugger";
  // The worker's stack stays cached and its own.
  EXPECT_TRUE(IsCHeader(Worker->GetCallHeader(1), "inner(x=3)"));
}

TEST_F(ThreadsInC, SteppingAThreadStepsThatThreadEvenWhenAnotherIsCurrent) {
  Of(MainThread).SetAsSuspendedThread();
  ASSERT_EQ(Process->GetSuspendedThreadId(), 1);
  Worker->StepOut();
  ASSERT_NO_FATAL_FAILURE(WaitForStop());
  EXPECT_EQ(Process->GetSuspendedThreadId(), 2);
  EXPECT_TRUE(IsCHeader(Worker->GetCallHeader(1), "outer(a=1, b=2)")) << "the stack is fetched anew after a stop";
  EXPECT_EQ(Worker->GetCallLocation(1).Line, 5);
}

TEST_F(ThreadsTest, CppFramesShowQualifiedNamesAndEmptyParenthesesWithoutArguments) {
  ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("nested"), glCPP, {"Calc::twice"}));
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(1);
  Core().Threads().Select(1);
  ASSERT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_EQ(Thread->GetCurrentLocation().Line, 3) << "the selection's reply gives the location";

  ASSERT_EQ(Thread->GetCallCount(), 3);
  const std::string Twice = Thread->GetCallHeader(1);
  EXPECT_TRUE(IsCHeader(Twice, "Calc::twice(this=0x*, n=21)"));
  EXPECT_TRUE(IsCHeader(Thread->GetCallHeader(2), "apply(c=@0x*: {base = 1}, n=21)"));
  EXPECT_TRUE(IsCHeader(Thread->GetCallHeader(3), "main()"));
  EXPECT_EQ(Thread->GetCallLocation(3).Line, 8);
}

TEST_F(ThreadsTest, PascalFramesShowArgumentValuesAndAnAddressWhereSourceIsMissing) {
  ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("calls"), glPascal, {"ADD", "BYE"}));
  TIntfPtr<IGDBThread> Thread = Process->GetThread(1);
  Core().Threads().Select(1);

  ASSERT_EQ(Thread->GetCallCount(), 3);
  EXPECT_EQ(Thread->GetCallHeader(1), "ADD(1,2)");
  EXPECT_EQ(Thread->GetCallHeader(2), "SHOW") << "no parentheses without arguments";
  EXPECT_EQ(Thread->GetCallHeader(3), "main");
  EXPECT_EQ(Thread->GetCallLocation(1).Line, 4);
  EXPECT_EQ(Of(Thread).GetCallParams(1), (TStringArray{"A", "B"}));

  // The exit procedure is called by the run-time library, which has no line
  // information.
  ASSERT_NO_FATAL_FAILURE(Continue());
  EXPECT_EQ(Process->GetSuspendedThreadId(), 1);
  EXPECT_EQ(Thread->GetCallHeader(1), "BYE");
  const std::string Runtime = Thread->GetCallHeader(2);
  EXPECT_TRUE(IsCHeader(Runtime, "SYSTEM_$$_DOEXITPROC"));
  EXPECT_EQ(HeaderAddress(Runtime), Thread->GetCallLocation(2).Address);
}


// tests/debuggees/deep.c stopped in bottom under its recursion: frame k
// (1-based) from 2 on is recurse(left=k-2), called from line 9, and main,
// at line 11, is outermost.

/// How many commands in the MI traffic logs in LogDir start with Command.
size_t CommandsSent(const std::string& LogDir, const std::string& Command) {
  size_t Count = 0;
  for (const auto& Log : std::filesystem::directory_iterator(LogDir))
    for (const std::string& Line : test::SplitLines(test::ReadWholeFile(Log.path().string())))
      Count += std::string_view(Line).substr(std::min(Line.find_first_not_of("0123456789"), Line.size()))
                   .starts_with(Command);
  return Count;
}

TEST_F(ThreadsTest, AStopFetchesNoFramesAndTheInnermostFrameOnlyTheFirstWindow) {
  test::TScratchDir LogDir;
  test::TScopedEnv Debug("GDB_DEBUG", "1");
  test::TScopedEnv OutDir("GDB_OUTDIR", LogDir.Path());
  ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("deep"), glC, {"bottom"}));
  ASSERT_EQ(CommandsSent(LogDir.Path(), "-stack-"), 0u) << "nothing is fetched until the IDE asks";

  EXPECT_TRUE(IsCHeader(Process->GetThread(1)->GetCallHeader(1), "bottom(calls=0)"));
  EXPECT_EQ(CommandsSent(LogDir.Path(), "-stack-"), 2u);
  EXPECT_EQ(CommandsSent(LogDir.Path(), "-stack-list-frames 0 31"), 1u);
  EXPECT_EQ(CommandsSent(LogDir.Path(), "-stack-list-arguments 1 0 31"), 1u);
}

TEST_F(ThreadsTest, DeepStacksCountEveryFrameDownToMain) {
  ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("deep"), glC, {"bottom"}));
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(1);
  ASSERT_EQ(Thread->GetCallCount(), 10003);
  EXPECT_TRUE(IsCHeader(Thread->GetCallHeader(10003), "main(argc=1, argv=0x*)"));
  EXPECT_TRUE(IsCHeader(Thread->GetCallHeader(5002), "recurse(left=5000)"));
  EXPECT_EQ(Thread->GetCallLocation(5002).Line, 9);
  EXPECT_EQ(Thread->GetCallHeader(10004), "");

  Of(Thread).SelectFrame(10003);
  Of(Thread).SelectFrame(10004);
  EXPECT_EQ(Of(Thread).FFrameIndex, 10002);
  EXPECT_EQ(Core().Threads().CurrentLocation().Line, 11) << "the debugger is at main";
}

TEST_F(ThreadsTest, AStackDeeperThanCountedEndsInAnEntryThatIsNoFrame) {
  constexpr Integer Counted = TGDBThreadTable::MaxCallDepth;
  ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("deep"), glC, {"bottom"}, "gdb", std::to_string(Counted)));
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(1);
  ASSERT_EQ(Thread->GetCallCount(), Counted + 1);
  EXPECT_TRUE(IsCHeader(Thread->GetCallHeader(Counted), "recurse(left=" + std::to_string(Counted - 2) + ")"));
  EXPECT_TRUE(Thread->GetCallHeader(Counted + 1).starts_with("...")) << Thread->GetCallHeader(Counted + 1);
  EXPECT_EQ(Thread->GetCallLocation(Counted + 1).Address, 0u);

  Of(Thread).SelectFrame(Counted);
  Of(Thread).SelectFrame(Counted + 1);
  EXPECT_EQ(Of(Thread).FFrameIndex, Counted - 1) << "only counted frames can be selected";
}

} // namespace
} // namespace midebug
