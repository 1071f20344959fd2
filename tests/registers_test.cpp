// Registers against the real GDB: the general, x87 and SSE registers of a
// stopped thread as GDB shows them, writes the program then sees (in C and
// in Pascal frames), and writes that are refused.

#include "inspect/gdbregisterids.h"
#include "inspect/gdbthread.h"
#include "inspect/gdbthreadtable.h"
#include "stoppedprogram.h"

#include <cstring>

namespace midebug {
namespace {

// Positions in the AMD64 tables.
constexpr size_t Rbx = 1, Rip = 16, St0 = 0, Xmm1 = 1, Xmm2 = 2;

TXMMFPURegValue Bytes(std::initializer_list<int> Values) {
  TXMMFPURegValue Value{};
  size_t Index = 0;
  for (int Part : Values)
    Value.ByteReg[Index++] = static_cast<Byte>(Part);
  return Value;
}

/// 1.5 as an x87 extended value: mantissa 0xc000..., exponent 0x3fff.
const TXMMFPURegValue OnePointFive = Bytes({0, 0, 0, 0, 0, 0, 0, 0xc0, 0xff, 0x3f});
/// Every mantissa bit set: text with fewer than 21 digits would lose some.
const TXMMFPURegValue AllBits = Bytes({0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0xff, 0x00, 0x40});
const TXMMFPURegValue Vector = Bytes({1, 0x82, 3, 0xf4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 0xff});

/// tests/debuggees/memory.c stopped at registers_stop: rbx 0x1111, st0 1.5,
/// xmm2 the bytes 0 to 15.
class RegistersInC : public test::StoppedProgram {
protected:
  void SetUp() override {
    StoppedProgram::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("memory"), glC, {"*registers_stop", "report"}));
    Thread = Process->GetThread(Process->GetSuspendedThreadId());
    ASSERT_TRUE(Thread);
  }

  TIntfPtr<IGDBThread> Thread;
};

TEST_F(RegistersInC, ReadsTheValuesGdbShows) {
  TUInt64Array General;
  UInt64 PC = 0;
  ASSERT_TRUE(Thread->GetRegisters(General, PC));
  ASSERT_EQ(General.size(), 24u);
  EXPECT_EQ(General[Rip], AddressOf("&registers_stop"));
  EXPECT_EQ(PC, General[Rip]);
  EXPECT_EQ(General[Rbx], 0x1111u);

  TFPURegValueArray FPU;
  ASSERT_TRUE(Thread->GetFPURegisters(FPU));
  ASSERT_EQ(FPU.size(), 16u);
  EXPECT_TRUE(XMMRegisterEqual(FPU[St0], OnePointFive));

  TXMMRegValueArray XMM;
  ASSERT_TRUE(Thread->GetXMMRegisters(XMM));
  ASSERT_EQ(XMM.size(), 17u);
  EXPECT_TRUE(XMMRegisterEqual(XMM[Xmm2], Bytes({0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15})));
}

TEST_F(RegistersInC, WritesReachTheProgramAndMoveThePc) {
  TUInt64Array General;
  UInt64 PC = 0;
  ASSERT_TRUE(Thread->GetRegisters(General, PC));
  TFPURegValueArray FPU;
  ASSERT_TRUE(Thread->GetFPURegisters(FPU));
  TXMMRegValueArray XMM;
  ASSERT_TRUE(Thread->GetXMMRegisters(XMM));

  const Integer Before = Requests();
  EXPECT_TRUE(Thread->SetRegisters(General, General));
  EXPECT_TRUE(Thread->SetFPURegisters(FPU, FPU));
  EXPECT_TRUE(Thread->SetXMMRegisters(XMM, XMM));
  EXPECT_EQ(Requests(), Before) << "equal sets send nothing";

  const UInt64 Resume = AddressOf("&registers_resume");
  TUInt64Array NewGeneral = General;
  NewGeneral[Rbx] = 0xfedcba9876543210;
  NewGeneral[Rip] = Resume;
  EXPECT_TRUE(Thread->SetRegisters(General, NewGeneral));
  EXPECT_EQ(Thread->GetCurrentLocation().Address, Resume) << "the location is fetched again";
  TFPURegValueArray NewFPU = FPU;
  NewFPU[St0] = AllBits;
  EXPECT_TRUE(Thread->SetFPURegisters(FPU, NewFPU));
  TXMMRegValueArray NewXMM = XMM;
  NewXMM[Xmm2] = Vector;
  EXPECT_TRUE(Thread->SetXMMRegisters(XMM, NewXMM));


  ASSERT_NO_FATAL_FAILURE(Continue());
  const auto Seen = [&](const char* Name, Integer Size) { return Read(AddressOf(Name), Size); };
  EXPECT_EQ(Seen("&seenRbx", 8), (std::vector<Byte>{0x10, 0x32, 0x54, 0x76, 0x98, 0xba, 0xdc, 0xfe}));
  EXPECT_EQ(Seen("&seenXmm", 16), std::vector<Byte>(Vector.ByteReg, Vector.ByteReg + 16));
  EXPECT_EQ(Seen("&seenSt0", 10), std::vector<Byte>(AllBits.ByteReg, AllBits.ByteReg + 10)) << "to the last bit";
  EXPECT_EQ(Seen("&pcNotMoved", 4), (std::vector<Byte>{0, 0, 0, 0})) << "the store was skipped";
}

TEST_F(RegistersInC, ReadsInAnOuterFrameAreOfTheInnermostAndLeaveTheFrameSelected) {
  ASSERT_NO_FATAL_FAILURE(Continue());
  // Now in report, called from main.
  const UInt64 Innermost = Process->GetSuspendedLocation().Address;
  TGDBThread& Stopped = *static_cast<TGDBThread*>(Thread.get());
  ASSERT_GE(Thread->GetCallCount(), 2);
  Stopped.SelectFrame(2);
  ASSERT_EQ(Stopped.FFrameIndex, 1);
  TUInt64Array General;
  UInt64 PC = 0;
  ASSERT_TRUE(Thread->GetRegisters(General, PC));
  EXPECT_EQ(General[Rip], Innermost);
  EXPECT_EQ(Stopped.FFrameIndex, 1);
  EXPECT_EQ(Core().Threads().CurrentLocation().Address, Thread->GetCallLocation(2).Address)
      << "the debugger is back at the frame the IDE selected";
}

TEST_F(RegistersInC, RefusedWritesAreReportedAndKeepGdbAlive) {
  TFPURegValueArray FPU;
  ASSERT_TRUE(Thread->GetFPURegisters(FPU));
  TFPURegValueArray NaN = FPU;
  NaN[St0] = Bytes({0, 0, 0, 0, 0, 0, 0, 0xc0, 0xff, 0x7f});
  EXPECT_FALSE(Thread->SetFPURegisters(FPU, NaN));
  EXPECT_NE(Core().Registers().LastError().find("NaN"), std::string::npos);
  TFPURegValueArray Short(3);
  EXPECT_FALSE(Thread->SetFPURegisters(Short, Short));
  EXPECT_NE(Core().Registers().LastError().find("16 values expected"), std::string::npos);

  // Infinities and denormals have a text.
  for (const TXMMFPURegValue& Value : {Bytes({0, 0, 0, 0, 0, 0, 0, 0x80, 0xff, 0xff}),
                                       Bytes({1, 0, 0, 0, 0, 0, 0, 0, 0, 0})}) {
    TFPURegValueArray New = FPU;
    New[St0] = Value;
    ASSERT_TRUE(Thread->SetFPURegisters(FPU, New)) << Core().Registers().LastError();
    TFPURegValueArray ReadBack;
    ASSERT_TRUE(Thread->GetFPURegisters(ReadBack));
    EXPECT_TRUE(XMMRegisterEqual(ReadBack[St0], Value));
    FPU = ReadBack;
  }
}

class RegistersBeforeTheProgramRuns : public test::StoppedProgram {};

TEST_F(RegistersBeforeTheProgramRuns, WritesAreRefusedBeforeTheyReachGdb) {
  Process = TGDBProcessManager::CreateProcess(Listener, test::Debuggee("memory"), "", "", "local",
                                                      "Linux64", glC, gcAMD64, "gdb");
  TGDBRegisterIds& Registers = Core().Registers();
  TUInt64Array Old(24, 0), New(24, 0);
  New[Rbx] = 1;
  EXPECT_FALSE(Registers.SetRegisters(Old, New));
  EXPECT_EQ(Registers.LastError(), "register write: no stopped thread");
  EXPECT_NE(AddressOf("&pattern"), 0u) << "GDB still answers";
}

class RegistersInPascal : public test::StoppedProgram {};

TEST_F(RegistersInPascal, VectorAndX87WritesTakeEffectInAPascalFrame) {
  ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("calls"), glPascal, {"ADD"}));
  const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());
  TFPURegValueArray FPU;
  ASSERT_TRUE(Thread->GetFPURegisters(FPU));
  TXMMRegValueArray XMM;
  ASSERT_TRUE(Thread->GetXMMRegisters(XMM));

  TFPURegValueArray NewFPU = FPU;
  NewFPU[St0] = AllBits;
  EXPECT_TRUE(Thread->SetFPURegisters(FPU, NewFPU)) << Core().Registers().LastError();
  TXMMRegValueArray NewXMM = XMM;
  NewXMM[Xmm1] = Vector;
  EXPECT_TRUE(Thread->SetXMMRegisters(XMM, NewXMM)) << Core().Registers().LastError();

  TFPURegValueArray FPUBack;
  ASSERT_TRUE(Thread->GetFPURegisters(FPUBack));
  EXPECT_TRUE(XMMRegisterEqual(FPUBack[St0], AllBits));
  TXMMRegValueArray XMMBack;
  ASSERT_TRUE(Thread->GetXMMRegisters(XMMBack));
  EXPECT_TRUE(XMMRegisterEqual(XMMBack[Xmm1], Vector));
  EXPECT_EQ(Process->GetEvaluator(), glPascal);
  TDataEvaluateExpressionResult Comparison;
  ASSERT_TRUE(Core().Requests().Ask(Comparison, &TGDBCommand::CreateDataEvaluateExpressionCommand, "1 = 1"));
  EXPECT_EQ(Comparison.FValue, "true") << "GDB speaks Pascal again";
}

TEST(RegistersOnTheFake, AFailedListFallsBackToSingleReadsAndFailuresReadAsZero) {
  SetMainThread();
  test::TFakeOnPath Fake("gdb", "registers-single-reads.script");
  TIntfPtr<test::TTestListener> Listener{new test::TTestListener};
  TIntfPtr<IGDBProcess> Process = TGDBProcessManager::CreateProcess(Listener, "/work/prog", "", "", "local",
                                                                    "Linux64", glC, gcIA32, "gdb");
  TGDBRegisterIds& Registers = static_cast<TGDBProcess*>(Process.get())->Registers();
  TUInt64Array Values;
  ASSERT_TRUE(Registers.GetRegisters(Values)) << "one single read succeeded";
  TUInt64Array Expected(16, 0);
  Expected[2] = 0xc0ffee;
  EXPECT_EQ(Values, Expected);
}

} // namespace
} // namespace midebug
