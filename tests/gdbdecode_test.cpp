/// \file
/// The result decoders, fed through the parser as the debugger's replies.
/// Reply texts are GDB 13.1 output for tests/data/replies/prog.cpp and
/// regs.c (x86-64, gcc -g), pasted here or read from the recorded sessions
/// beside those programs; hand-written replies stand for the other shapes
/// the decoders read (LLDB's, older GDB's) and for broken input.

#include "mi/gdboutput.h"
#include "recordingprocess.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <fstream>
#include <string>
#include <vector>

using namespace midebug;
using midebug::test::TRecordingProcess;

namespace {

/// Feeds one reply record to the parser with Result waiting under the
/// record's token; true when it completed without FError.
bool Decode(TGDBResult& Result, const std::string& Record, bool LLDB = false) {
  TRecordingProcess Process;
  Process.LLDB = LLDB;
  const std::string Token = Record.substr(0, Record.find_first_not_of("0123456789"));
  Process.Register(Token, Result);
  ProcessGDBOutput(Record + "\n", Process);
  EXPECT_TRUE(Result.FAvailable) << Record;
  EXPECT_TRUE(Process.Calls.empty()) << Record;
  return !Result.FError;
}

/// The result record with Token from a recorded session.
std::string RecordedReply(const std::string& Session, const std::string& Token) {
  std::ifstream File(test::TestDataDir() + "/replies/" + Session);
  EXPECT_TRUE(File.good()) << Session;
  for (std::string Line; std::getline(File, Line);)
    if (Line.starts_with(Token + "^"))
      return Line;
  ADD_FAILURE() << "no reply " << Token << " in " << Session;
  return {};
}

std::vector<Byte> BytesOf(const TXMMFPURegValue& Value) { return {std::begin(Value.ByteReg), std::end(Value.ByteReg)}; }

std::vector<Byte> Bytes16(std::initializer_list<Byte> Leading) {
  std::vector<Byte> Bytes(Leading);
  Bytes.resize(16, 0);
  return Bytes;
}

// --- Breakpoints ----------------------------------------------------------------

TEST(DecoderBreakpoints, LocationsInsideBkpt) {
  // Newer GDB (and mi3) lists them as "locations" inside the tuple.
  TBreakInsertResult Result;
  ASSERT_TRUE(Decode(Result, R"(5^done,bkpt={number="3",addr="<MULTIPLE>",original-location="h.h:7",)"
                             R"(locations=[{number="3.1",addr="0x10",file="h.h",line="7"},)"
                             R"({number="3.2",addr="0x20",file="h.h",line="7"}]})"));
  EXPECT_EQ(Result.FBreakpoint, 3);
  EXPECT_EQ(Result.FAddresses, (TAddressArray{0x10, 0x20}));
  EXPECT_EQ(Result.FLocation.Address, 0x10u);
  EXPECT_EQ(Result.FLocation.Line, 7);
}

TEST(DecoderBreakpoints, MatchesGiveAddresses) {
  struct TCase {
    std::string Reply;
    bool Success;
    TAddressArray Addresses;
  } Cases[] = {
      {R"(7^done,matches={b={addr="0x1000"},b={addr="0x2000"},b={addr="junk"}})", true, {0x1000, 0x2000, 0}},
      {R"(7^done,matches={})", false, {}},
      {R"(7^done,other="1")", false, {}},
  };
  for (const TCase& Case : Cases) {
    TBreakInsertResult Result;
    Result.FAddresses = {0x99};
    EXPECT_EQ(Decode(Result, Case.Reply), Case.Success) << Case.Reply;
    EXPECT_EQ(Result.FAddresses, Case.Addresses) << Case.Reply;
  }
}

TEST(DecoderBreakpoints, WatchpointOfEveryKind) {
  struct TCase {
    std::string Reply;
    Integer Number;
  } Cases[] = {
      {RecordedReply("regs-gdb13.txt", "26"), 2}, // wpt={number="2",exp="r"}
      {R"(8^done,hw-awpt={number="4",exp="x"})", 4},
      {R"(8^done,hw-rwpt={number="5",exp="x"})", 5},
      {R"(8^done,wpt={exp="x"})", -1},
  };
  for (const TCase& Case : Cases) {
    TBreakWatchResult Result;
    Result.FLocation.Line = 5;
    EXPECT_EQ(Decode(Result, Case.Reply), Case.Number != -1) << Case.Reply;
    EXPECT_EQ(Result.FBreakpoint, Case.Number) << Case.Reply;
    EXPECT_EQ(Result.FLocation.Line, Case.Number != -1 ? 0 : 5) << Case.Reply;
  }
}

// --- Threads --------------------------------------------------------------------

TEST(DecoderThreads, ThreadInfoStateOnlySkipsNamesAndBadIds) {
  TThreadInfoResult Result(true);
  ASSERT_TRUE(Decode(Result, R"(4^done,threads=[{id="x",state="running"},)"
                             R"({id="3",target-id="Thread 1",state="running"}])"));
  EXPECT_EQ(Result.FIds, TIntegerArray{3});
  EXPECT_TRUE(Result.FNames.empty());
  EXPECT_EQ(Result.FStates, TStringArray{"running"});

  TThreadInfoResult Empty(false);
  EXPECT_TRUE(Decode(Empty, R"(4^done,threads=[])")) << "an empty list is an answer";
  TThreadInfoResult Missing(false);
  EXPECT_FALSE(Decode(Missing, R"(4^done,current-thread-id="1")"));
}

TEST(DecoderThreads, ThreadCountFromTheReplyIsBounded) {
  TThreadListIdsResult Result;
  ASSERT_TRUE(Decode(Result, R"(3^done,thread-ids={thread-id="1"},number-of-threads="2147483647")"));
  ASSERT_LE(Result.FIds.size(), 100000u);
  EXPECT_EQ(Result.FIds[0], 1);
  EXPECT_EQ(Result.FIds[1], -1);
}

TEST(DecoderThreads, ThreadSelectMustNameTheRequestedThread) {
  TThreadSelectResult Selected(2);
  ASSERT_TRUE(Decode(Selected, RecordedReply("regs-gdb13.txt", "34")));
  EXPECT_EQ(Selected.FFrameIndex, 0);
  EXPECT_EQ(Selected.FLocation.Address, 0x55555555516au);
  EXPECT_EQ(Selected.FLocation.Line, 6);

  TThreadSelectResult Other(3);
  EXPECT_FALSE(Decode(Other, RecordedReply("regs-gdb13.txt", "34")));
  EXPECT_EQ(Other.FLocation.Line, 0);
}

// --- Stack ----------------------------------------------------------------------

TEST(DecoderStack, FramesArePlacedByLevel) {
  TStackListFramesResult Result;
  ASSERT_TRUE(Decode(Result, R"(9^done,stack=[frame={level="0",func="a"},frame={level="1",func="b"},)"
                             R"(frame={level="3",func="d",file="??",line="-1"},frame={level="-7",func="x"},)"
                             R"(frame={level="2147483647",func="far"},frame={func="nolevel"}])"));
  ASSERT_EQ(Result.FStackFrames.size(), 4u);
  EXPECT_EQ(Result.FStackFrames[2].Header, "") << "slot 2 was never filled";
  EXPECT_EQ(Result.FStackFrames[3].Header, "d");
  EXPECT_EQ(Result.FStackFrames[3].Location.Source, "");
  EXPECT_EQ(Result.FStackFrames[3].Location.Line, 0);
}

TEST(DecoderStack, ArgumentsInEveryPrintValuesForm) {
  using TFrames = std::vector<std::vector<std::pair<std::string, std::string>>>;
  struct TCase {
    std::string Reply;
    TFrames Frames;
  } Cases[] = {
      {RecordedReply("prog-gdb13.txt", "8"), {{{"v", "3"}}, {{"argc", "1"}, {"argv", "0x7fffffffe798"}}}},
      // --no-values lists names alone.
      {R"(8^done,stack-args=[frame={level="0",args=[name="x",name="y"]},frame={level="1",args=[]}])",
       {{{"x", ""}, {"y", ""}}, {}}},
      // An element that is not a tuple stands for an unnamed argument.
      {R"(8^done,stack-args=[frame={level="1",args=["junk",{name="a",value="2"}]}])", {{}, {{"", ""}, {"a", "2"}}}},
  };
  for (const TCase& Case : Cases) {
    TStackListArgumentsResult Result;
    ASSERT_TRUE(Decode(Result, Case.Reply)) << Case.Reply;
    TFrames Frames;
    for (const TGDBStackArgument& Frame : Result.FStackArguments) {
      Frames.emplace_back();
      for (const TNameValue& Argument : Frame.NameValues)
        Frames.back().emplace_back(Argument.Name, Argument.Value);
    }
    EXPECT_EQ(Frames, Case.Frames) << Case.Reply;
  }
}

TEST(DecoderStack, LocalsInBothListForms) {
  struct TCase {
    std::string Reply;
    TStringArray Names;
  } Cases[] = {
      {RecordedReply("prog-gdb13.txt", "10"), {"r"}}, // --simple-values: tuples
      {RecordedReply("prog-gdb13.txt", "11"), {"r"}}, // 0: names alone
      {R"(6^done,locals=[])", {}},
      {R"(6^done,other="1")", {}},
  };
  for (const TCase& Case : Cases) {
    TStackListLocalsResult Result;
    Result.FStackLocals = {"stale"};
    EXPECT_TRUE(Decode(Result, Case.Reply)) << Case.Reply;
    EXPECT_EQ(Result.FStackLocals, Case.Names) << Case.Reply;
  }
}

TEST(DecoderStack, RunNotAtTheCursorIsReadOnce) {
  // FindValue finds a later result without moving; a run read that way would
  // never end.
  TStackListFramesResult Frames;
  ASSERT_TRUE(Decode(Frames, R"(9^done,stack=[x="1",frame={level="0",func="a"}])"));
  EXPECT_EQ(Frames.FStackFrames.size(), 1u);
  TStackListLocalsResult Locals;
  ASSERT_TRUE(Decode(Locals, R"(6^done,locals=[x="1",name="a"])"));
  EXPECT_EQ(Locals.FStackLocals, TStringArray{"a"});
}

// --- Source lines ---------------------------------------------------------------

TEST(DecoderSymbols, LinesWithAndWithoutAddresses) {
  const std::string Reply = R"(3^done,lines=[{pc="0x0000555555555159",line="6"},{pc="0x10",line="x"},)"
                            R"({pc="0x000055555555517c",line="8"}])";
  TSymbolListLinesResult WithAddresses(true);
  ASSERT_TRUE(Decode(WithAddresses, Reply));
  EXPECT_EQ(WithAddresses.FLines, (TIntegerArray{6, 8}));
  EXPECT_EQ(WithAddresses.FAddresses, (TAddressArray{0x555555555159, 0x55555555517c}));

  TSymbolListLinesResult LinesOnly(false);
  ASSERT_TRUE(Decode(LinesOnly, Reply));
  EXPECT_EQ(LinesOnly.FLines, (TIntegerArray{6, 8}));
  EXPECT_TRUE(LinesOnly.FAddresses.empty());
}

// --- Variable objects -------------------------------------------------------------

TEST(DecoderVariables, ChildCountIsBounded) {
  TVarInfoNumChildrenResult Count;
  ASSERT_TRUE(Decode(Count, R"(4^done,numchild="100000")"));
  EXPECT_EQ(Count.FCount, 5000);
}

TEST(DecoderVariables, ChildrenCountComesFromTheReply) {
  TVarListChildrenResult None;
  EXPECT_TRUE(Decode(None, R"(4^done,numchild="0",has_more="0")"));
  EXPECT_TRUE(None.FChildren.empty());
  TVarListChildrenResult Missing;
  EXPECT_FALSE(Decode(Missing, R"(4^done,numchild="2")"));
  EXPECT_EQ(Missing.FChildren.size(), 2u);
}

TEST(DecoderVariables, UpdateStopsAtTheFirstElementOutOfScope) {
  TVarUpdateResult Mixed;
  ASSERT_TRUE(Decode(Mixed, R"(5^done,changelist=[{name="a",value="1",in_scope="true"},)"
                            R"({name="b",in_scope="false"},{name="c",value="3",in_scope="true"}])"));
  ASSERT_EQ(Mixed.FChangeList.size(), 1u);
  EXPECT_EQ(Mixed.FChangeList[0].Name, "a");
  EXPECT_TRUE(Mixed.FOutOfScope);

  TVarUpdateResult Gone;
  ASSERT_TRUE(Decode(Gone, RecordedReply("regs-gdb13.txt", "14")));
  EXPECT_TRUE(Gone.FOutOfScope);
  EXPECT_TRUE(Gone.FChangeList.empty());

  TVarUpdateResult Empty;
  Empty.FChangeList = {{"kept", "1"}};
  ASSERT_TRUE(Decode(Empty, RecordedReply("prog-gdb13.txt", "37")));
  EXPECT_EQ(Empty.FChangeList.size(), 1u) << "an empty change list leaves the old one";
}

// --- Registers --------------------------------------------------------------------

TEST(DecoderRegisters, GeneralValuesInRequestedOrder) {
  TDataListRegisterValuesResult All(TIntegerArray{0, 1, 7, 16, 17});
  All.FCpsrIndex = -1;
  ASSERT_TRUE(Decode(All, RecordedReply("regs-gdb13.txt", "40")));
  EXPECT_EQ(All.FValues, (TUInt64Array{0x8, 0x7fffffffe798, 0x7fffffffe690, 0x7ffff7df924a, 0x206}))
      << "registers not asked for are passed over";

  TDataListRegisterValuesResult Gap(TIntegerArray{1, 3});
  ASSERT_TRUE(Decode(Gap, R"(4^done,register-values=[{number="1",value="0x11"},{number="2",value="0x22"}])"));
  EXPECT_EQ(Gap.FValues, TUInt64Array{0x11});

  TDataListRegisterValuesResult Single(17, false);
  ASSERT_TRUE(Decode(Single, RecordedReply("regs-gdb13.txt", "5")));
  EXPECT_EQ(Single.FValue, 0x202u);
  TDataListRegisterValuesResult Wrong(16, false);
  Wrong.FValue = 5;
  ASSERT_TRUE(Decode(Wrong, RecordedReply("regs-gdb13.txt", "5")));
  EXPECT_EQ(Wrong.FValue, 5u) << "another register's value is not taken";
}

TEST(DecoderRegisters, FlagsRegisterShapes) {
  struct TCase {
    std::string Value;
    bool FlagsRule;
    UInt64 Expected;
  } Cases[] = {
      {"{0x60000010, N = 0, Z = 1}", true, 0x60000010}, // LLDB's cpsr
      {"0x246", true, 0x246},
      {"[ ZF PF IF ]", false, 0x246}, // GDB 13 eflags in natural format
      {"[ ]", false, 0},
  };
  for (const TCase& Case : Cases) {
    TDataListRegisterValuesResult Result(17, Case.FlagsRule);
    ASSERT_TRUE(Decode(Result, "4^done,register-values=[{number=\"17\",value=\"" + Case.Value + "\"}]"));
    EXPECT_EQ(Result.FValue, Case.Expected) << Case.Value;
  }
  TDataListRegisterValuesResult Natural(17, false);
  ASSERT_TRUE(Decode(Natural, RecordedReply("regs-gdb13.txt", "3")));
  EXPECT_EQ(Natural.FValue, 0x202u);
}

TEST(DecoderRegisters, XmmFromNestedBraces) {
  struct TCase {
    std::string Value;
    std::vector<Byte> Bytes;
  } Cases[] = {
      {"{v4_float = {0x0, 0x0, 0x0, 0x0}, v16_int8 = {0x0 <repeats 16 times>}, uint128 = 0x0}", Bytes16({})},
      // Without uint128 the byte vector serves, repeats expanded.
      {"{v4_int32 = {0x1, 0x0, 0x0, 0x2000000}, v16_int8 = {0x1, 0x0 <repeats 14 times>, 0x2}}",
       {1, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 2}},
      {"{v16_int8 = {-1, 127, -128}}", Bytes16({0xff, 0x7f, 0x80})},
      {"(0x1, 0x2)", Bytes16({1, 2})},
      {"0x1f80", Bytes16({0x80, 0x1f})},               // mxcsr in hexadecimal
      {"[ IM DM ZM OM UM PM ]", Bytes16({0x80, 0x1f})}, // and in natural format
      {"{uint128 = 0x1000000000000000000000000000000000}", Bytes16({})},
  };
  for (const TCase& Case : Cases) {
    TDataListXMMRegisterValuesResult Result(40);
    const std::string Value = Case.Value.substr(0, Case.Value.find('"'));
    ASSERT_TRUE(Decode(Result, "4^done,register-values=[{number=\"40\",value=\"" + Value + "\"}]"));
    EXPECT_EQ(BytesOf(Result.FValue), Case.Bytes) << Value;
  }
}

TEST(DecoderRegisters, FpuKeepsTheWholeEightyBitValue) {
  // The control words, as GDB 13 prints them in raw format.
  TDataListFPURegisterValuesResult Result(TIntegerArray{32, 33});
  ASSERT_TRUE(Decode(Result, RecordedReply("regs-gdb13-flags.txt", "9")));
  ASSERT_EQ(Result.FValues.size(), 2u);
  EXPECT_EQ(BytesOf(Result.FValues[0]), Bytes16({0x7f, 0x03}));
  EXPECT_EQ(BytesOf(Result.FValues[1]), Bytes16({0x00, 0x38}));

  TDataListFPURegisterValuesResult Natural(24);
  ASSERT_TRUE(Decode(Natural, R"(5^done,register-values=[{number="24",value="5"}])"));
  EXPECT_EQ(BytesOf(Natural.FValue), Bytes16({5}));
}

// --- Memory -----------------------------------------------------------------------

TEST(DecoderMemory, BytesFromContentsOrWords) {
  struct TCase {
    bool AsBytes;
    std::string Reply;
    bool Success;
    std::vector<Byte> Bytes;
  } Cases[] = {
      {true, RecordedReply("regs-gdb13.txt", "23"), true, {0x0a, 0x0b, 0x0c, 0xff}},
      {true, R"(4^done,memory=[{begin="0x1",contents="0aff1"}])", true, {10, 255}},
      {true, R"(4^done,memory=[{begin="0x1",contents="zz01"}])", true, {0, 1}},
      {true, R"(4^done,memory=[{begin="0x1"}])", false, {9}},
      {false, RecordedReply("regs-gdb13.txt", "24"), true, {0x0a, 0x0b, 0x0c, 0xff}},
      {false, R"(4^done,nr-bytes="2",memory=[{addr="0x1",data=["0x1ff","7","0x3"]}])", true, {0xff, 7}},
      {false, R"(4^done,nr-bytes="0")", true, {9}},
      {false, R"(4^done,nr-bytes="3",memory=[{addr="0x1"}])", false, {9}},
      // A count far beyond the data reads what is there.
      {false, R"(4^done,nr-bytes="2147483647",memory=[{addr="0x1",data=["0x1"]}])", true, {1}},
  };
  for (const TCase& Case : Cases) {
    TDataReadMemoryResult Result(Case.AsBytes);
    Result.FData = {9};
    EXPECT_EQ(Decode(Result, Case.Reply), Case.Success) << Case.Reply;
    EXPECT_EQ(Result.FData, Case.Bytes) << Case.Reply;
  }
}

TEST(DecoderMemory, LineInformation) {
  TDataInfoLineResult Result;
  ASSERT_TRUE(Decode(Result, R"(4^done,start="0x1000",end="0x1010",file="a.c",line="12")"));
  EXPECT_EQ(Result.FStartAddr, 0x1000u);
  EXPECT_EQ(Result.GetSize(), 0x10u);
  EXPECT_EQ(Result.FSource, "a.c");
  EXPECT_EQ(Result.FLine, 12);
  TDataInfoLineResult NoEnd;
  EXPECT_FALSE(Decode(NoEnd, R"(4^done,start="0x1000",line="12")"));
  TDataInfoLineResult ZeroEnd;
  EXPECT_FALSE(Decode(ZeroEnd, R"(4^done,start="0x1000",end="0x0",line="12")"));
}

// --- Disassembly ------------------------------------------------------------------

struct TInstruction {
  UInt64 Address;
  Integer Size;
  std::string AsmData;
  Integer Line;
  std::string Source;
  bool operator==(const TInstruction&) const = default;
};

std::vector<TInstruction> Instructions(const TDataDisassembleResult& Result) {
  std::vector<TInstruction> Read;
  for (const TGDBDisassembleData& Data : Result.FData)
    Read.push_back({Data.Address, Data.Size, Data.AsmData, Data.Line, Data.Source});
  return Read;
}

TEST(DecoderDisassembly, SizesAndSourceLinesWhereTheReplyHasThem) {
  // GDB 13, mode 3: opcodes give the size, the source line (by its full
  // name) only the first.
  TDataDisassembleResult Mode3(true);
  ASSERT_TRUE(Decode(Mode3, RecordedReply("regs-gdb13-flags.txt", "6")));
  EXPECT_EQ(Mode3.FData.front().FunctionName, "scale");
  EXPECT_EQ(Mode3.FData.front().Opcodes, "55");
  EXPECT_EQ(Instructions(Mode3), (std::vector<TInstruction>{{0x555555555172, 1, "push   %rbp", 7, "/tmp/cap/regs.c"},
                                                             {0x555555555173, 3, "mov    %rsp,%rbp", 0, ""}}));
  // GDB 13, mode 1 on a function compiled without -g: plain instructions.
  TDataDisassembleResult NoLines(true);
  ASSERT_TRUE(Decode(NoLines, R"(2^done,asm_insns=[{address="0x0000000000001139",func-name="nodbg",offset="0",)"
                              R"(inst="push   %rbp"}])"));
  EXPECT_EQ(Instructions(NoLines), (std::vector<TInstruction>{{0x1139, 0, "push   %rbp", 0, ""}}));

  TDataDisassembleResult Sized(false);
  ASSERT_TRUE(Decode(Sized, R"(4^done,asm_insns=[{address="0x10",size="5",inst="call 0x20"}])"));
  EXPECT_EQ(Instructions(Sized), (std::vector<TInstruction>{{0x10, 5, "call 0x20", 0, ""}}));
  TDataDisassembleResult Missing(false);
  EXPECT_FALSE(Decode(Missing, R"(4^done,other=[])"));
}

// --- Other answers ----------------------------------------------------------------

TEST(DecoderOther, ResultOfAnotherClassThanItsCommandIsNotFilled) {
  // The decoder is chosen by the command, the fields by the class: a result
  // object whose command names another class must fail, not be overwritten.
  TPidInfoResult Pid;
  Pid.FCommand = ctStackInfoDepth;
  EXPECT_FALSE(Decode(Pid, R"(3^done,depth="4")"));
  EXPECT_EQ(Pid.FPid, 0);
  // x87 and SSE results share their layout but not their class.
  TDataListFPURegisterValuesResult Fpu(40);
  Fpu.FCommand = ctDataListXMMRegisterValues;
  EXPECT_FALSE(Decode(Fpu, R"(3^done,register-values=[{number="40",value="0x1"}])"));
  EXPECT_EQ(BytesOf(Fpu.FValue), Bytes16({}));
}

} // namespace
