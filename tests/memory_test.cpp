// Memory and disassembly against the real GDB: reads of globals and stack
// buffers, the cache the last disassembly leaves, writes the program sees,
// and the disassembly cursor.

#include "stoppedprogram.h"

#include <numeric>

namespace midebug {
namespace {

/// tests/debuggees/memory.c stopped in inspect_stack, whose argument points
/// at stack_buffer's local bytes 0xa0 to 0xbf; pattern holds 0 to 63.
class MemoryInC : public test::StoppedProgram {
protected:
  void SetUp() override {
    StoppedProgram::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("memory"), glC, {"inspect_stack", "report"}));
    PC = Process->GetSuspendedLocation().Address;
    ASSERT_NE(PC, 0u);
  }

  UInt64 PC = 0;
};

std::vector<Byte> Counting(Byte From, size_t Count) {
  std::vector<Byte> Bytes(Count);
  std::iota(Bytes.begin(), Bytes.end(), From);
  return Bytes;
}

TEST_F(MemoryInC, ReadsGlobalAndStackBytesAndOnlyReadableOnes) {
  EXPECT_EQ(Read(AddressOf("&pattern"), 64), Counting(0, 64));
  EXPECT_EQ(Read(AddressOf("buffer"), 32), Counting(0xa0, 32));

  Byte Buffer[8];
  EXPECT_EQ(Process->GetMemory(0x10, Buffer, 8), -1) << "unmapped";
  EXPECT_EQ(Process->GetMemory(AddressOf("&pattern"), nullptr, 8), -1);
  EXPECT_EQ(Process->GetMemory(AddressOf("&pattern"), Buffer, -1), -1);
  EXPECT_EQ(Process->GetMemory(AddressOf("&pattern"), Buffer, 0), 0);

  // A read that starts before the program's first page: GDB answers with
  // the bytes after the gap, which are not the bytes asked for.
  const UInt64 FirstPage = (AddressOf("&main") & ~UInt64{0xfff}) - 0x1000;
  if (Process->GetMemory(FirstPage - 1, Buffer, 1) == -1) {
    EXPECT_EQ(Process->GetMemory(FirstPage - 4, Buffer, 8), 0);
  }

  // The program's last writable page ends where nothing is mapped: a read
  // across its end gives only the bytes before it.
  const UInt64 PageEnd = (AddressOf("&pattern") | 0xfff) + 1;
  if (Process->GetMemory(PageEnd, Buffer, 1) != -1)
    GTEST_SKIP() << "memory is mapped after the program's last page";
  EXPECT_EQ(Process->GetMemory(PageEnd - 4, Buffer, 8), 4);
  EXPECT_EQ(Process->GetMemory(PageEnd - 4, Buffer, 5), 4);
}

TEST_F(MemoryInC, OneDisassemblyAnswersFortyInstructionsAndTheBytesBeforeTheLast) {
  const TIntfPtr<IGDBDisassemble> Cursor = Process->GetDisassembler();
  ASSERT_TRUE(Cursor);
  EXPECT_EQ(Cursor, Process->GetThread(1)->GetDisassembler()) << "one cursor per process";
  UInt64 Next = 1;
  Cursor->GetNextAddress(Next);
  EXPECT_EQ(Next, 0u) << "a fresh cursor has no instruction";

  UInt64 Actual = 0;
  Cursor->ToAddress(PC, Actual);
  EXPECT_EQ(Actual, PC);
  EXPECT_TRUE(Cursor->IsValid());
  const Integer AfterFirst = Requests();
  std::vector<UInt64> Addresses{PC};
  for (int Step = 1; Step < 40; ++Step) {
    Cursor->GetNextAddress(Next);
    ASSERT_GT(Next, Addresses.back());
    Addresses.push_back(Next);
  }
  EXPECT_EQ(Requests(), AfterFirst) << "the first block holds 40 instructions";

  // Inside an instruction: that instruction, from the cache.
  Cursor->ToAddress(Addresses[2] + 1, Actual);
  EXPECT_EQ(Actual, Addresses[2]);
  Cursor->ToAddress(Addresses.back(), Actual);
  EXPECT_EQ(Actual, Addresses.back()) << "the last cached instruction";

  // The bytes from the first instruction up to the last one's start.
  const Integer Cached = static_cast<Integer>(Addresses.back() - PC);
  const std::vector<Byte> Block = Read(PC, Cached);
  EXPECT_EQ(static_cast<Integer>(Block.size()), Cached);
  EXPECT_EQ(Read(PC + 4, 8), std::vector<Byte>(Block.begin() + 4, Block.begin() + 12));
  EXPECT_EQ(Requests(), AfterFirst) << "reads inside the block ask nothing";

  Read(PC, Cached + 1);
  EXPECT_EQ(Requests(), AfterFirst + 1) << "the last instruction's own bytes are not cached";
  Read(PC - 2, 4);
  EXPECT_EQ(Requests(), AfterFirst + 2) << "starting before the block";
  Cursor->GetNextAddress(Next);
  EXPECT_GT(Next, Addresses.back());
  EXPECT_EQ(Requests(), AfterFirst + 4) << "beyond the block: a disassembly and its bytes";

  // The program runs on: the cache and the cursor start afresh.
  ASSERT_NO_FATAL_FAILURE(Continue());
  Cursor->GetNextAddress(Next);
  EXPECT_EQ(Next, 0u);
  const Integer AfterResume = Requests();
  Read(PC, 4);
  EXPECT_EQ(Requests(), AfterResume + 1);
}

TEST_F(MemoryInC, CodeThatCannotBeReadFailsOnceAndTheCursorSkipsIt) {
  Integer Size = 0;
  std::string Text = "stale";
  Process->DisassembleAt(0x10, Size, Text);
  EXPECT_EQ(Size, -1);
  EXPECT_EQ(Text, "");
  const Integer AfterFailure = Requests();
  Process->DisassembleAt(0x10, Size, Text);
  EXPECT_EQ(Size, -1);
  EXPECT_EQ(Requests(), AfterFailure) << "a failed start is not asked again";

  const TIntfPtr<IGDBDisassemble> Cursor = Process->GetDisassembler();
  UInt64 Actual = 0;
  Cursor->ToAddress(0x10, Actual);
  EXPECT_EQ(Actual, 0x10u);
  EXPECT_FALSE(Cursor->IsValid());
  UInt64 Next = 0;
  Cursor->GetNextAddress(Next);
  EXPECT_EQ(Next, 0x12u);
}

TEST_F(MemoryInC, AFunctionBelowTheFirstStopDisassembles) {
  const UInt64 Below = AddressOf("&below_main");
  ASSERT_LT(Below, PC);
  ASSERT_LT(Below, Process->GetBaseAddress()) << "the base address comes from the first stop";
  Integer Size = 0;
  std::string Text;
  Process->DisassembleAt(Below, Size, Text);
  EXPECT_GT(Size, 0);
  EXPECT_FALSE(Text.empty());
}

TEST_F(MemoryInC, WritesReachTheProgramAndTheNextDisassembly) {
  const UInt64 Shown = AddressOf("&shown");
  const Integer NewValue = 42;
  EXPECT_EQ(Process->SetMemory(Shown, &NewValue, sizeof NewValue), 4);
  EXPECT_EQ(Read(Shown, 4), (std::vector<Byte>{42, 0, 0, 0}));
  Byte Nothing = 0;
  EXPECT_EQ(Process->SetMemory(0x10, &Nothing, 1), -1) << "refused by the debugger";

  // A write into disassembled code: the next disassembly shows it.
  Integer Size = 0;
  std::string Text;
  Process->DisassembleAt(PC, Size, Text);
  const UInt64 Target = PC + static_cast<UInt64>(Size);
  Process->DisassembleAt(Target, Size, Text);
  ASSERT_GT(Size, 0);
  const std::vector<Byte> Original = Read(Target, Size);
  const std::vector<Byte> Nops(static_cast<size_t>(Size), 0x90);
  ASSERT_EQ(Process->SetMemory(Target, Nops.data(), Size), Size);
  Process->DisassembleAt(Target, Size, Text);
  EXPECT_EQ(Size, 1);
  EXPECT_EQ(Text, "nop");
  ASSERT_EQ(Process->SetMemory(Target, Original.data(), static_cast<Integer>(Original.size())),
            static_cast<Integer>(Original.size()));

  ASSERT_NO_FATAL_FAILURE(Continue());
  ASSERT_TRUE(Core().ProcessAsyncRequest("-exec-continue"));
  EXPECT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCallContaining("shown=42"));
}

/// The same services on LLDB's MI front end, whose forms differ: a byte
/// range to disassemble, "memory write" and "register write", whose
/// refusals come as an error line before a plain done record.
class MemoryOnLLDB : public test::StoppedProgram {
protected:
  void SetUp() override {
    if (!FindLLDB())
      GTEST_SKIP() << WhyNot;
    StoppedProgram::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("memory"), glC, {"inspect_stack"}, LLDB));
  }
};

TEST_F(MemoryOnLLDB, MemoryCursorAndRegisterWritesWork) {
  const UInt64 Pattern = AddressOf("&pattern");
  EXPECT_EQ(Read(Pattern, 64), Counting(0, 64));
  const Integer NewValue = 42;
  EXPECT_EQ(Process->SetMemory(AddressOf("&shown"), &NewValue, sizeof NewValue), 4);
  EXPECT_EQ(Read(AddressOf("&shown"), 4), (std::vector<Byte>{42, 0, 0, 0}));
  EXPECT_EQ(Process->SetMemory(0, &NewValue, sizeof NewValue), -1) << "LLDB's error line is the refusal";

  const UInt64 PC = Process->GetSuspendedLocation().Address;
  const TIntfPtr<IGDBDisassemble> Cursor = Process->GetDisassembler();
  UInt64 Address = 0;
  Cursor->ToAddress(PC, Address);
  for (int Step = 0; Step < 60; ++Step) {
    UInt64 Next = 0;
    Cursor->GetNextAddress(Next);
    ASSERT_GT(Next, Address);
    ASSERT_TRUE(Cursor->IsValid());
    Address = Next;
  }

  const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());
  TUInt64Array General;
  UInt64 Stop = 0;
  ASSERT_TRUE(Thread->GetRegisters(General, Stop));
  TUInt64Array NewGeneral = General;
  NewGeneral[9] = 0x1234; // r10: free for the callee to clobber
  EXPECT_TRUE(Thread->SetRegisters(General, NewGeneral));

  TUInt64Array GeneralBack;
  ASSERT_TRUE(Thread->GetRegisters(GeneralBack, Stop));
  EXPECT_EQ(GeneralBack[9], 0x1234u);
}

} // namespace
} // namespace midebug
