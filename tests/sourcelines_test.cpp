// Source lines and code addresses: the file index table on its own, then
// the real GDB through the "local" profile on C, C++ and Pascal programs and
// a program with a shared library of its own, then what only the fake
// debugger can show (a Windows target's line table read in chunks).

#include "inspect/gdbfiletable.h"
#include "platform/hostfiles.h"
#include "stoppedprogram.h"

#include <filesystem>
#include <set>

namespace midebug {
namespace {

using TIntegerSet = std::set<Integer>;

TEST(SourceLinesFileTable, OneIndexPerFileHoweverItsPathIsWritten) {
  TGDBFileTable Table;
  const std::string Here = GetCurrentDir();
  EXPECT_EQ(Table.AddFileName("./a.c", false), 1) << "the first name gets index 1";
  for (const std::string& Spelling : TStringArray{"dir/../a.c", "a.c", Here + "/a.c", Here + "//./a.c"}) {
    EXPECT_EQ(Table.AddFileName(Spelling, false), 1) << Spelling;
    EXPECT_EQ(Table.GetFileIndex(Spelling, false), 1) << Spelling;
  }
  EXPECT_EQ(Table.GetFileName(1), "./a.c") << "the name given first is kept as given";

  EXPECT_EQ(Table.AddFileName("/x/a.c", false), 2);
  EXPECT_EQ(Table.AddFileName("/y/a.c", false), 3) << "same name, another folder: another file";
  EXPECT_EQ(Table.GetFileIndex("/z/b.c", false) + Table.AddFileName("", false), 0) << "nothing added";
  EXPECT_EQ(Table.GetFileName(4) + Table.GetFileName(0), "");
  EXPECT_TRUE(Table.SetFileName(2, "renamed.c"));
  EXPECT_EQ(Table.GetFileName(2), "renamed.c");
  EXPECT_EQ(Table.GetFileIndex("/x/a.c", false), 2) << "the old name still finds the index";
  EXPECT_FALSE(Table.SetFileName(0, "n") || Table.SetFileName(4, "n"));
}

TEST(SourceLinesFileTable, WindowsTargetsSpellPathsWithBackslashesAndFallBackOnBareNames) {
  TGDBFileTable Table;
  EXPECT_EQ(Table.AddFileName("C:/src/a.pas", true), 1);
  EXPECT_EQ(Table.AddFileName("C:\\src\\a.pas", true), 1);
  EXPECT_EQ(Table.GetFileName(1), "C:\\src\\a.pas");
  EXPECT_EQ(Table.GetFileIndex("D:\\other\\a.pas", true), 0) << "a full path names one folder";
  EXPECT_EQ(Table.AddFileName("a.pas", true), 2);
  EXPECT_EQ(Table.GetFileIndex("D:\\other\\a.pas", true), 2) << "a bare name stands for any folder";
  EXPECT_EQ(Table.AddFileName("C:\\src\\..\\src\\.\\a.pas", true), 1);
}

/// A program stopped under GDB, whose traffic is logged so that the lines
/// sent can be counted.
class SourceLinesTest : public test::StoppedProgram {
protected:
  void TearDown() override {
    Process = nullptr;
    ProcessPending();
  }
  /// How many command lines sent so far start with Command.
  size_t Sent(const std::string& Command) {
    size_t Count = 0;
    for (const auto& Entry : std::filesystem::directory_iterator(Logs.Path()))
      for (const std::string& Line : test::SplitLines(test::ReadWholeFile(Entry.path().string())))
        Count += Line.find(Command) != std::string::npos && Line.find('"') == std::string::npos;
    return Count;
  }

  /// Loads Program, breaks at Where and runs to the first stop.
  void Launch(const std::string& Program, TGDBLanguage Language, const std::string& Where) {
    Process = TGDBProcessManager::CreateProcess(Listener, test::Debuggee(Program), "", "", "local", "Linux64",
                                                Language, gcAMD64, "gdb");
    ASSERT_TRUE(Process);
    ASSERT_TRUE(Core().ProcessAsyncRequest("-break-insert -f " + Where));
    ASSERT_TRUE(Core().ProcessAsyncRequest("-exec-run"));
    ASSERT_NO_FATAL_FAILURE(WaitFor("Suspended("));
  }
  void WaitFor(const std::string& Call) {
    const size_t Before = Listener->CountOf(Call);
    ASSERT_TRUE(Listener->PumpUntil([&] { return Listener->CountOf(Call) > Before; })) << "no " << Call;
  }
  TGDBLocation Stop() { return Process->GetSuspendedLocation(); }
  /// The file index of the stop's source, added as the IDE adds it.
  Integer StopFileIndex() { return Process->GetThread(Process->GetSuspendedThreadId())->GetFileIndex(Stop().Source); }

  test::TScratchDir Logs;
  test::TScopedEnv Debug{"GDB_DEBUG", "1"};
  test::TScopedEnv Where{"GDB_OUTDIR", Logs.Path()};
};

// tests/debuggees/sourcelines.c: line 6 (the loop) has code in three
// places, line 3 none, below (lines 13 to 15) lies below main; the program
// returns 114, less 10 when line 9 is skipped, plus 1 when line 8 runs twice.

TEST_F(SourceLinesTest, LinesAndAddressesOfACProgramMapBothWaysAskingOncePerLineAndFile) {
  ASSERT_NO_FATAL_FAILURE(Launch("sourcelines", glC, "sourcelines.c:9"));
  ASSERT_EQ(Stop().Line, 9);
  for (const std::string& Name : {std::string("./sourcelines.c"), Stop().Source}) {
    TIntegerArray Lines;
    Process->GetSourceLines(Name, Lines);
    EXPECT_EQ(Lines, (TIntegerArray{4, 5, 6, 6, 7, 6, 8, 9, 10, 11, 12, 13, 14, 15})) << Name;
  }
  const Integer File = StopFileIndex();
  ASSERT_GT(File, 0);
  EXPECT_EQ(Process->GetFileIndex(test::DebuggeeSource("../debuggees/sourcelines.c")), File);
  const TAddressArray Loop = Process->FindSourceAddress(File, 6);
  ASSERT_EQ(Loop.size(), 3u) << "every place of the loop's line, in the debugger's order";
  EXPECT_TRUE(Loop[0] < Loop[1] && Loop[1] < Loop[2]);
  EXPECT_TRUE(Process->FindSourceAddress(File, 3).empty()) << "a comment has no code";
  const TAddressArray Below = Process->FindSourceAddress(File, 14);
  ASSERT_EQ(Below.size(), 1u);
  EXPECT_GT(Below[0], Loop[2]) << "below lies below main";
  EXPECT_EQ(Sent("-symbol-list-lines /"), 2u) << "the file's table is fetched once, for the first look-up";

  const size_t Before = Sent("info line *");
  UInt64 Start = 0;
  Integer Size = 0, FileIndex = 0, Line = 0;
  for (const UInt64 Address : {Loop[1], Below[0], Below[0] + 1}) {
    ASSERT_TRUE(Process->FindSourceLine(Address, Start, Size, FileIndex, Line));
    EXPECT_EQ(Start, Address == Loop[1] ? Loop[1] : Below[0]);
    EXPECT_EQ(FileIndex, File) << "GDB names the file as the stop did";
    EXPECT_EQ(Line, Address == Loop[1] ? 6 : 14);
  }
  EXPECT_EQ(Sent("info line *"), Before + 2) << "the second look-up in the line's range asks nothing";
  EXPECT_FALSE(Process->FindSourceLine(1, Start, Size, FileIndex, Line));
  EXPECT_EQ(Start, 1u);
  EXPECT_EQ(Line, 0);
  // A step resumes the program: the line range is asked for again.
  Process->GetThread(Process->GetSuspendedThreadId())->StepOver();
  ASSERT_NO_FATAL_FAILURE(WaitFor("Suspended("));
  ASSERT_TRUE(Process->FindSourceLine(Below[0], Start, Size, FileIndex, Line));
  EXPECT_EQ(Sent("info line *"), Before + 4);

  TGDBLocation Location;
  ASSERT_TRUE(Process->FindSourceLocation("sourcelines.c", 14, Location));
  EXPECT_EQ(Location.Address, Below[0]);
  EXPECT_EQ(Location.Source, "sourcelines.c");
  for (const Integer NoCode : {3, 300})
    EXPECT_FALSE(Process->FindSourceLocation("sourcelines.c", NoCode, Location)) << NoCode;
  EXPECT_FALSE(Process->FindSourceLocation("nosuch.c", 3, Location));
  EXPECT_EQ(Location.Address, 0u);
}

TEST_F(SourceLinesTest, MovingTheNextStatementSkipsOrRepeatsLinesOfTheSameFunction) {
  const struct {
    Integer To;
    const char* Exit;
  } Cases[] = {{10, "Exited(104,"}, {8, "Exited(115,"}};
  for (const auto& Case : Cases) {
    SCOPED_TRACE(Case.To);
    ASSERT_NO_FATAL_FAILURE(Launch("sourcelines", glC, "sourcelines.c:9"));
    const Integer File = StopFileIndex();
    const TAddressArray Below = Process->FindSourceAddress(File, 14);
    ASSERT_EQ(Below.size(), 1u);
    EXPECT_FALSE(Process->SetNewEip(Below[0]));
    EXPECT_TRUE(Listener->HasCallContaining("not in the current function main"));
    EXPECT_EQ(Stop().Line, 9) << "a refused move leaves the program where it was";

    const TAddressArray To = Process->FindSourceAddress(File, Case.To);
    ASSERT_EQ(To.size(), 1u);
    ASSERT_TRUE(Process->SetNewEip(To[0]));
    EXPECT_EQ(Stop().Line, Case.To);
    EXPECT_EQ(Process->GetThread(Process->GetSuspendedThreadId())->GetCallLocation(1).Address, To[0]);
    // Stepping from there is what once stopped GDB on an internal error.
    Process->GetThread(Process->GetSuspendedThreadId())->StepOver();
    ASSERT_NO_FATAL_FAILURE(WaitFor("Suspended("));
    EXPECT_EQ(Stop().Line, Case.To + 1);
    Process->Resume();
    ASSERT_NO_FATAL_FAILURE(WaitFor("Exited("));
    EXPECT_TRUE(Listener->HasCall(Case.Exit));
    EXPECT_FALSE(Process->SetNewEip(To[0])) << "no stopped thread";
    Process = nullptr;
    ProcessPending();
  }
}

TEST_F(SourceLinesTest, ASharedLibrarysLinesAreFoundInsideIt) {
  ASSERT_NO_FATAL_FAILURE(Launch("pluginhost", glC, "answer"));
  ASSERT_TRUE(Stop().Source.ends_with("plug.c")) << Stop().Source;
  UInt64 Start = 0;
  Integer Size = 0, FileIndex = 0, Line = 0;
  ASSERT_TRUE(Process->FindSourceLine(Stop().Address, Start, Size, FileIndex, Line));
  EXPECT_EQ(Line, 1);
  EXPECT_EQ(FileIndex, StopFileIndex());
  TIntegerArray Lines;
  Process->GetSourceLines("plug.c", Lines);
  EXPECT_EQ(TIntegerSet(Lines.begin(), Lines.end()), TIntegerSet{1});
  const TAddressArray Addresses = Process->FindSourceAddress(FileIndex, 1);
  ASSERT_FALSE(Addresses.empty());
  EXPECT_TRUE(Addresses.front() <= Stop().Address && Addresses.front() >= Process->GetBaseAddress());
}

TEST_F(SourceLinesTest, CppAndPascalLinesMapAndPascalsNextStatementMoves) {
  ASSERT_NO_FATAL_FAILURE(Launch("nested", glCPP, "Calc::twice"));
  UInt64 Start = 0;
  Integer Size = 0, FileIndex = 0, Line = 0;
  ASSERT_TRUE(Process->FindSourceLine(Stop().Address, Start, Size, FileIndex, Line));
  EXPECT_EQ(Line, 3);
  Process = nullptr;
  ProcessPending();

  ASSERT_NO_FATAL_FAILURE(Launch("calls", glPascal, "calls.pas:8"));
  ASSERT_EQ(Stop().Line, 8);
  TIntegerArray Lines;
  Process->GetSourceLines("calls.pas", Lines);
  EXPECT_EQ(TIntegerSet(Lines.begin(), Lines.end()), (TIntegerSet{3, 4, 5, 7, 8, 9, 11, 12, 13, 14, 15, 16, 17}))
      << "Free Pascal's line 0 is no line";
  const Integer File = StopFileIndex();
  const TAddressArray Add = Process->FindSourceAddress(File, 4);
  const TAddressArray End = Process->FindSourceAddress(File, 9);
  ASSERT_FALSE(Add.empty());
  ASSERT_FALSE(End.empty());
  EXPECT_FALSE(Process->SetNewEip(Add.front()));
  ASSERT_TRUE(Process->SetNewEip(End.front()));
  EXPECT_EQ(Stop().Line, 9);
  Process->Resume();
  ASSERT_NO_FATAL_FAILURE(WaitFor("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(0,"));
}

TEST_F(SourceLinesTest, AWindowsTargetsTablesComeInChunksAndByBareName) {
  test::TFakeOnPath Fake("lldb-mi", "sourcelines-windows.script");
  Process = TGDBProcessManager::CreateProcess(Listener, "/work/prog.exe", "", "", "local", "Win64", glPascal,
                                              gcAMD64, "lldb-mi");
  TIntegerArray Lines;
  Process->GetSourceLines("C:/src/big.pas", Lines);
  ASSERT_EQ(Lines.size(), 2048u) << "three chunks, the last one empty";
  EXPECT_EQ(Lines.front(), 1);
  EXPECT_EQ(Lines.back(), 2048);

  const Integer File = Process->GetThread(1)->GetFileIndex("C:/src/small.pas");
  EXPECT_EQ(Process->GetFileName(File), "C:\\src\\small.pas");
  EXPECT_EQ(Process->FindSourceAddress(File, 7), (TAddressArray{0x401010, 0x401030}));
  EXPECT_EQ(Process->FindSourceAddress(File, 8), (TAddressArray{0x401020}));

  for (const UInt64 Address : {0x401012, 0x40101F}) {
    UInt64 Start = 0;
    Integer Size = 0, FileIndex = 0, Line = 0;
    ASSERT_TRUE(Process->FindSourceLine(Address, Start, Size, FileIndex, Line)) << "one request for both";
    EXPECT_EQ(Start, 0x401010u);
    EXPECT_EQ(Size, 0x10);
    EXPECT_EQ(Line, 7);
    EXPECT_EQ(FileIndex, File);
  }
}

TEST_F(SourceLinesTest, LLDBsFrontEndListsLinesAndMovesTheNextStatement) {
  if (!FindLLDB())
    GTEST_SKIP() << WhyNot;
  Process = TGDBProcessManager::CreateProcess(Listener, test::Debuggee("sourcelines"), "", Logs.Path(), "local",
                                              "Linux64", glC, gcAMD64, LLDB);
  TIntegerArray Lines;
  Process->GetSourceLines("sourcelines.c", Lines);
  // LLDB lists a line once for each of its statements.
  EXPECT_EQ(TIntegerSet(Lines.begin(), Lines.end()), (TIntegerSet{4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15}));
  // LLDB's front end answers a line's addresses as they are in the file.
  TGDBLocation Nine, Ten;
  ASSERT_TRUE(Process->FindSourceLocation("sourcelines.c", 9, Nine));
  ASSERT_TRUE(Process->FindSourceLocation("sourcelines.c", 10, Ten));
  ASSERT_GT(Ten.Address, Nine.Address);

  ASSERT_TRUE(Core().ProcessAsyncRequest("-break-insert sourcelines.c:9"));
  Process->Run();
  ASSERT_NO_FATAL_FAILURE(WaitFor("Suspended("));
  ASSERT_EQ(Stop().Line, 9);
  ASSERT_TRUE(Process->SetNewEip(Stop().Address + (Ten.Address - Nine.Address)));
  EXPECT_EQ(Stop().Line, 10);
  Process->Resume();
  ASSERT_NO_FATAL_FAILURE(WaitFor("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(104,"));
}

} // namespace
} // namespace midebug
