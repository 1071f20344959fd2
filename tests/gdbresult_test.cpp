// Result objects, the register-id mapping, interface reference counting and
// the completion hand-shake between the output thread and a requester.

#include "mi/gdbresult.h"
#include "process/gdbinterfaces.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <future>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace midebug {
namespace {

using namespace std::chrono_literals;

// ---------------------------------------------------------------------------
// Result objects

TEST(ResultPresets, BreakpointResultsReportFailureUntilAReplyIsDecoded) {
  TBreakInsertResult Insert;
  EXPECT_TRUE(Insert.FError);
  EXPECT_EQ(Insert.FBreakpoint, -1);
  TBreakWatchResult Watch;
  EXPECT_TRUE(Watch.FError);
  EXPECT_EQ(Watch.FBreakpoint, -1);
}

TEST(ResultPresets, MemoryWriteCountsBytesOnlyWhenExpected) {
  TDataWriteMemoryBytesResult Expected(16, true);
  EXPECT_EQ(Expected.FCommand, ctCLMemoryWrite);
  EXPECT_EQ(Expected.FBytesWritten, 16);
  TDataWriteMemoryBytesResult Unexpected(16, false);
  EXPECT_EQ(Unexpected.FCommand, ctUnknown);
  EXPECT_EQ(Unexpected.FBytesWritten, 0);
}

TEST(ResultPresets, CpsrIndexPointsAtTheFlagsPosition) {
  struct Case {
    const char* Name;
    Integer Expected;
    Integer Actual;
  };
  const Case Cases[] = {
      {"three ids", 2, TDataListRegisterValuesResult(TIntegerArray{4, 9, 25}).FCpsrIndex},
      {"no ids", -1, TDataListRegisterValuesResult(TIntegerArray{}).FCpsrIndex},
      {"single flags register", 0, TDataListRegisterValuesResult(25, true).FCpsrIndex},
      {"single other register", -1, TDataListRegisterValuesResult(3, false).FCpsrIndex},
  };
  for (const Case& Each : Cases)
    EXPECT_EQ(Each.Actual, Each.Expected) << Each.Name;
}

TEST(ResultErrorMessage, DebuggerEscapesBecomeLineBreaksAndBlanks) {
  struct Case {
    std::string Raw;
    std::string Expected;
  };
  const Case Cases[] = {
      {R"(a\nb\tc)", "a\r\nb   c"},
      {R"(\n\n)", "\r\n\r\n"},
      {"", ""},
      {"plain", "plain"},
      // A lone trailing backslash and unknown escapes stay as they came.
      {R"(end\)", R"(end\)"},
      {R"(\x41\")", R"(\x41\")"},
      // An escaped backslash before n is a path, not a line break.
      {R"(No file C:\\new\\tmp.c)", R"(No file C:\\new\\tmp.c)"},
  };
  for (const Case& Each : Cases) {
    TGDBResult Result(ctUnknown);
    Result.SetErrorMessage(Each.Raw);
    EXPECT_EQ(Result.FErrorMessage, Each.Expected) << Each.Raw;
    EXPECT_FALSE(Result.FError) << "SetErrorMessage must not flag the failure";
  }
}

TEST(ResultThreadNames, FixupNameKeepsTheShortName) {
  struct Case {
    std::string Name;
    std::string Expected;
  };
  const Case Cases[] = {
      {"Thread 0x1a2b", "0x1a2b"},
      {"main.worker", "worker"},
      {"worker", "worker"},
      {"LWP 1234", "1234"},
      // The blank wins over an earlier full stop.
      {"a.b c", "c"},
      {"", ""},
  };
  for (const Case& Each : Cases)
    EXPECT_EQ(TThreadInfoResult::FixupName(Each.Name), Each.Expected) << Each.Name;
}

TEST(ResultInfoLine, ExpectedTextHasTheLineAndTheLowerCaseFileName) {
  TCLInfoLineAddressResult Result("Src/MyUnit.PAS", 12);
  EXPECT_EQ(Result.FCommand, ctCLInfoLineAddress);
  EXPECT_EQ(Result.FExpected, "line 12 of \"src/myunit.pas\" starts at address ");
  EXPECT_EQ(Result.FAddress, 0u);

  // Bytes of a UTF-8 name other than ASCII letters are kept.
  TCLInfoLineAddressResult Utf8("\xC3\x84rger.C", 1);
  EXPECT_EQ(Utf8.FExpected, "line 1 of \"\xC3\x84rger.c\" starts at address ");
}

TEST(ResultInfoLine, GetSizeIsTheLengthOfTheLinesCode) {
  struct Case {
    UInt64 Start;
    UInt64 End;
    UInt64 Expected;
  };
  const Case Cases[] = {
      {4096, 4100, 4},
      {0, 0, 0},
      // No end address in the reply must not read as a size near 2^64.
      {4096, 0, 0},
  };
  for (const Case& Each : Cases) {
    TDataInfoLineResult Result;
    Result.FStartAddr = Each.Start;
    Result.FEndAddr = Each.End;
    EXPECT_EQ(Result.GetSize(), Each.Expected) << Each.Start << ".." << Each.End;
  }
}

// ---------------------------------------------------------------------------
// Register-id mapping

/// Every table entry maps to the position of its own name.
void ExpectEachMapsToItsName(const TStringArray& Table, const TIntegerArray& Ids, const TStringArray& Names) {
  ASSERT_EQ(Ids.size(), Table.size());
  for (std::size_t Entry = 0; Entry < Table.size(); ++Entry) {
    ASSERT_GE(Ids[Entry], 0);
    ASSERT_LT(static_cast<std::size_t>(Ids[Entry]), Names.size()) << Table[Entry];
    EXPECT_EQ(Names[Ids[Entry]], Table[Entry]);
  }
}

TEST(RegisterTables, ChosenByCpuAndPlatform) {
  struct Case {
    TGDBCPU CPU;
    std::string Platform;
    std::size_t General;
    std::string Flags; // name of the flags register in the general table
    std::string FirstX87;
    std::size_t Xmm;
  };
  const Case Cases[] = {
      {gcIA32, "Win32", 16, "eflags", "", 0},
      {gcARM32, "Android", 17, "cpsr", "", 0},
      {gcARM64, "Android64", 34, "cpsr", "", 0},
      {gcAMD64, "Win64", 24, "eflags", "st0", 17},
      {gcAMD64, "Win64x", 24, "rflags", "st0", 17},
      {gcAMD64, "Linux64", 24, "rflags", "st0", 17},
      {gcAMD64, "OSX64", 24, "rflags", "stmm0", 17},
  };
  for (const Case& Each : Cases) {
    SCOPED_TRACE(Each.Platform);
    TDataListRegisterNamesResult Result(Each.CPU, Each.Platform);
    EXPECT_EQ(Result.FCommand, ctDataListRegisterNames);
    ASSERT_EQ(Result.FRegisters.size(), Each.General);
    const bool HasFlags = std::find(Result.FRegisters.begin(), Result.FRegisters.end(), Each.Flags) !=
                          Result.FRegisters.end();
    EXPECT_TRUE(HasFlags);
    EXPECT_EQ(Result.FFPURegisters.empty() ? "" : Result.FFPURegisters[0], Each.FirstX87);
    EXPECT_EQ(Result.FXMMRegisters.size(), Each.Xmm);
    if (Each.FirstX87.empty()) {
      EXPECT_TRUE(Result.GetFPURegisterIds().empty());
      EXPECT_TRUE(Result.GetXMMRegisterIds().empty());
    }
  }
}

TEST(RegisterIds, FoundWhateverTheDebuggersOrder) {
  // Table order with other registers between, unnamed ones keeping their
  // numbers.
  TDataListRegisterNamesResult Between(gcAMD64, "Linux64");
  for (const TStringArray* Table : {&Between.FRegisters, &Between.FFPURegisters, &Between.FXMMRegisters})
    for (const std::string& Name : *Table) {
      Between.FNames.push_back("k" + std::to_string(Between.FNames.size()));
      Between.FNames.push_back("");
      Between.FNames.push_back(Name);
    }
  ExpectEachMapsToItsName(Between.FRegisters, Between.GetRegisterIds(), Between.FNames);
  ExpectEachMapsToItsName(Between.FFPURegisters, Between.GetFPURegisterIds(), Between.FNames);
  ExpectEachMapsToItsName(Between.FXMMRegisters, Between.GetXMMRegisterIds(), Between.FNames);

  // x87 listed before the general registers.
  TDataListRegisterNamesResult X87First(gcAMD64, "Linux64");
  X87First.FNames = X87First.FFPURegisters;
  X87First.FNames.insert(X87First.FNames.end(), X87First.FRegisters.begin(), X87First.FRegisters.end());
  ExpectEachMapsToItsName(X87First.FRegisters, X87First.GetRegisterIds(), X87First.FNames);
  ExpectEachMapsToItsName(X87First.FFPURegisters, X87First.GetFPURegisterIds(), X87First.FNames);

  // Reverse order, found only by searching.
  TDataListRegisterNamesResult Reverse(gcARM32, "Android");
  Reverse.FNames.assign(Reverse.FRegisters.rbegin(), Reverse.FRegisters.rend());
  ExpectEachMapsToItsName(Reverse.FRegisters, Reverse.GetRegisterIds(), Reverse.FNames);
}

TEST(RegisterIds, MissingNamesMapToZero) {
  TDataListRegisterNamesResult Result(gcIA32, "Linux");
  Result.FNames = Result.FRegisters;
  Result.FNames[9] = "flags"; // the debugger calls eflags something else
  const TIntegerArray Ids = Result.GetRegisterIds();
  ASSERT_EQ(Ids.size(), 16u);
  EXPECT_EQ(Ids[9], 0);
  EXPECT_EQ(Ids[8], 8);
  EXPECT_EQ(Ids[10], 10) << "the entry after a missing one is still found";
  EXPECT_EQ(Ids[15], 15);

  TDataListRegisterNamesResult NoNames(gcAMD64, "Win64");
  EXPECT_EQ(NoNames.GetRegisterIds(), TIntegerArray(24, 0));
  EXPECT_EQ(NoNames.GetXMMRegisterIds(), TIntegerArray(17, 0));
}

TEST(RegisterIds, FlagsRegisterFoundUnderEitherName) {
  // GDB 13 on x86-64 Linux, "-data-list-register-names" up to mxcsr.
  const TStringArray Gdb13Names = {
      "rax",   "rbx",   "rcx",   "rdx",   "rsi",   "rdi",   "rbp",   "rsp",   "r8",    "r9",    "r10",  "r11",
      "r12",   "r13",   "r14",   "r15",   "rip",   "eflags", "cs",   "ss",    "ds",    "es",    "fs",   "gs",
      "st0",   "st1",   "st2",   "st3",   "st4",   "st5",   "st6",   "st7",   "fctrl", "fstat", "ftag", "fiseg",
      "fioff", "foseg", "fooff", "fop",   "xmm0",  "xmm1",  "xmm2",  "xmm3",  "xmm4",  "xmm5",  "xmm6", "xmm7",
      "xmm8",  "xmm9",  "xmm10", "xmm11", "xmm12", "xmm13", "xmm14", "xmm15", "mxcsr"};
  TDataListRegisterNamesResult Linux(gcAMD64, "Linux64");
  Linux.FNames = Gdb13Names;
  const TIntegerArray Ids = Linux.GetRegisterIds();
  EXPECT_EQ(Ids[17], 17) << "rflags is GDB's eflags";
  EXPECT_EQ(Ids[14], 6) << "rbp";
  EXPECT_EQ(Ids[23], 22) << "fs";
  ExpectEachMapsToItsName(Linux.FFPURegisters, Linux.GetFPURegisterIds(), Linux.FNames);
  ExpectEachMapsToItsName(Linux.FXMMRegisters, Linux.GetXMMRegisterIds(), Linux.FNames);

  TDataListRegisterNamesResult Windows(gcAMD64, "Win64");
  Windows.FNames = Gdb13Names;
  Windows.FNames[17] = "rflags";
  EXPECT_EQ(Windows.GetRegisterIds()[17], 17) << "eflags is a debugger's rflags";
}

// ---------------------------------------------------------------------------
// Completion hand-shake

TEST(ResultCompletion, WaiterOnAnotherThreadWakesWhenCompleted) {
  TBreakInsertResult Result;
  auto Waiter = std::async(std::launch::async, [&Result] {
    const bool Available = Result.WaitAvailable(10s);
    return std::make_pair(Available, Available ? Result.FBreakpoint : -2);
  });
  std::this_thread::sleep_for(20ms);
  // The output thread's side: decode, then complete.
  Result.FBreakpoint = 7;
  Result.FError = false;
  const auto Started = std::chrono::steady_clock::now();
  Result.Complete();
  ASSERT_EQ(Waiter.wait_for(5s), std::future_status::ready);
  EXPECT_LT(std::chrono::steady_clock::now() - Started, 5s);
  const auto [Available, Breakpoint] = Waiter.get();
  EXPECT_TRUE(Available);
  EXPECT_EQ(Breakpoint, 7);
  EXPECT_TRUE(Result.FAvailable);
}

TEST(ResultCompletion, ShortWaitWithoutCompletionReturnsFalse) {
  TExecRunResult Result;
  const auto Started = std::chrono::steady_clock::now();
  EXPECT_FALSE(Result.WaitAvailable(30ms));
  EXPECT_GE(std::chrono::steady_clock::now() - Started, 30ms);
  EXPECT_FALSE(Result.FAvailable);
}

TEST(ResultCompletion, CompletedBeforeTheWaitIsSeenAtOnce) {
  TExecRunResult Result;
  Result.Complete();
  EXPECT_TRUE(Result.WaitAvailable(0ms));
}

TEST(ResultCompletion, PulseWakesAMonitorWaitWithoutCompleting) {
  TExecRunResult Result;
  std::atomic<bool> GivenUp{false};
  auto Waiter = std::async(std::launch::async, [&] {
    std::unique_lock Lock(Result.Monitor());
    return Result.MonitorSignal().wait_for(Lock, 10s, [&] { return Result.FAvailable || GivenUp; });
  });
  std::this_thread::sleep_for(20ms);
  {
    std::lock_guard Lock(Result.Monitor());
    GivenUp = true;
  }
  Result.Pulse();
  ASSERT_EQ(Waiter.wait_for(5s), std::future_status::ready);
  EXPECT_TRUE(Waiter.get());
  EXPECT_FALSE(Result.FAvailable);
}

// ---------------------------------------------------------------------------
// Interface identity and reference counting

TEST(IntfGuid, ParsesTheRegistryForm) {
  constexpr TGUID Upper = TGUID::Parse("{57313D26-3F2C-46F6-9814-062D7078F282}");
  static_assert(Upper.D1 == 0x57313D26 && Upper.D2 == 0x3F2C && Upper.D3 == 0x46F6);
  static_assert(Upper.D4 == std::array<uint8_t, 8>{0x98, 0x14, 0x06, 0x2D, 0x70, 0x78, 0xF2, 0x82});
  EXPECT_EQ(TGUID::Parse("{57313d26-3f2c-46f6-9814-062d7078f282}"), Upper);

  const char* Malformed[] = {
      "57313D26-3F2C-46F6-9814-062D7078F282",   // no braces
      "{57313D26-3F2C-46F6-9814-062D7078F28}",  // one digit short
      "{57313D26-3F2C-46F6-9814-062D7078F28G}", // not a digit
      "{57313D26+3F2C-46F6-9814-062D7078F282}", // wrong separator
      "",
  };
  for (const char* Text : Malformed)
    EXPECT_EQ(TGUID::Parse(Text), TGUID{}) << Text;
}

TEST(IntfGuid, EveryInterfaceHasItsOwnIdentifier) {
  const std::set<TGUID> Ids = {IInterface::IID,       IGDBProcess::IID,     IGDBInternalProcess::IID,
                               IGDBProcessListener::IID, IGDBBreakpointListener::IID, IGDBThread::IID,
                               IGDBInspect::IID,      IGDBDisassemble::IID};
  EXPECT_EQ(Ids.size(), 8u);
  EXPECT_EQ(Ids.count(TGUID{}), 0u);
}

class ITestProbe : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{0B1F6E2A-1C3D-4E5F-8A9B-0C1D2E3F4A5B}");
  virtual Integer Value() = 0;
};

class ITestOther : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{7A6B5C4D-3E2F-4A1B-9C8D-7E6F5A4B3C2D}");
  virtual Integer Other() = 0;
};

/// Counts its deletions so that a test sees a double or missing delete.
class TProbe : public TInterfaced<ITestProbe, ITestOther> {
public:
  explicit TProbe(std::atomic<int>& Deleted) : FDeleted(Deleted) {}
  ~TProbe() override { ++FDeleted; }
  Integer Value() override { return 42; }
  Integer Other() override { return 7; }

private:
  std::atomic<int>& FDeleted;
};

TEST(IntfRefCount, CopiesAndMovesShareOneObjectDeletedOnce) {
  std::atomic<int> Deleted{0};
  auto* Object = new TProbe(Deleted);
  {
    TIntfPtr<ITestProbe> First = Object;
    EXPECT_EQ(Object->RefCount(), 1);
    TIntfPtr<ITestProbe> Copy = First;
    EXPECT_EQ(Object->RefCount(), 2);
    TIntfPtr<ITestProbe> Moved = std::move(Copy);
    EXPECT_EQ(Object->RefCount(), 2);
    EXPECT_TRUE(Copy == nullptr);
    EXPECT_EQ(Moved->Value(), 42);
    EXPECT_TRUE(Moved == First);

    TIntfPtr<ITestProbe>& Alias = Moved;
    Moved = Alias; // self-assignment must not drop the object
    EXPECT_EQ(Object->RefCount(), 2);
    TIntfPtr<ITestProbe> Assigned;
    Assigned = First;
    EXPECT_EQ(Object->RefCount(), 3);
    Assigned = std::move(Moved);
    EXPECT_EQ(Object->RefCount(), 2);
    First.reset();
    EXPECT_EQ(Object->RefCount(), 1);
    EXPECT_EQ(Deleted, 0);
  }
  EXPECT_EQ(Deleted, 1);
}

TEST(IntfRefCount, QueryInterfaceAddsAReferenceOnlyOnSuccess) {
  std::atomic<int> Deleted{0};
  auto* Object = new TProbe(Deleted);
  {
    TIntfPtr<ITestProbe> Probe = Object;
    TIntfPtr<ITestOther> Other = QueryIntf<ITestOther>(Probe);
    ASSERT_TRUE(Other != nullptr);
    EXPECT_EQ(Other->Other(), 7);
    EXPECT_EQ(Object->RefCount(), 2);

    TIntfPtr<IInterface> Root = QueryIntf<IInterface>(Other);
    EXPECT_TRUE(Root != nullptr);
    EXPECT_EQ(Object->RefCount(), 3);

    EXPECT_TRUE(QueryIntf<IGDBThread>(Probe) == nullptr);
    void* Obj = &Deleted;
    EXPECT_EQ(Probe->QueryInterface(IGDBThread::IID, &Obj), IntfResultNoInterface);
    EXPECT_EQ(Obj, nullptr);
    EXPECT_EQ(Object->RefCount(), 3);
  }
  EXPECT_EQ(Deleted, 1);
}

TEST(IntfRefCount, CountsStayExactUnderConcurrentCopies) {
  std::atomic<int> Deleted{0};
  TIntfPtr<ITestProbe> Shared = new TProbe(Deleted);
  constexpr int ThreadCount = 4;
  constexpr int Rounds = 100000;
  std::vector<std::thread> Threads;
  for (int Index = 0; Index < ThreadCount; ++Index)
    Threads.emplace_back([&Shared] {
      for (int Round = 0; Round < Rounds; ++Round) {
        TIntfPtr<ITestProbe> Copy = Shared;
        TIntfPtr<ITestOther> Other = QueryIntf<ITestOther>(Copy);
      }
    });
  for (std::thread& Each : Threads)
    Each.join();
  EXPECT_EQ(static_cast<TProbe*>(Shared.get())->RefCount(), 1);
  EXPECT_EQ(Deleted, 0);
  Shared = nullptr;
  EXPECT_EQ(Deleted, 1);
}

TEST(IntfRefCount, LastReleaseOnAnotherThreadDeletesOnce) {
  std::atomic<int> Deleted{0};
  for (int Round = 0; Round < 200; ++Round) {
    TIntfPtr<ITestProbe> Mine = new TProbe(Deleted);
    TIntfPtr<ITestProbe> Theirs = Mine;
    std::thread Other([Held = std::move(Theirs)]() mutable { Held.reset(); });
    Mine.reset();
    Other.join();
  }
  EXPECT_EQ(Deleted, 200);
}

} // namespace
} // namespace midebug
