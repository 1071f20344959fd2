/// \file
/// The command lines midebug sends, their tokens and wait keys, and the
/// register name tables the register-write lines take their names from.

#include "mi/gdbcommand.h"
#include "mi/gdbregisters.h"
#include "mi/gdbresult.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <functional>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

using namespace midebug;

namespace {

using TBuild = std::function<std::string(TGDBCommand&, std::string&)>;

// Builds a line with builder C and token T.
#define BUILD(Call) [](TGDBCommand& C, std::string& T) { return C.Call; }

/// What a builder's Token holds afterwards.
enum TKey { kMiToken, kEcho, kUntouched };

/// One builder call and the line it must produce on a fresh builder.
struct TLineCase {
  std::string Behaviour;
  TBuild Build;
  /// For kMiToken: the command whose ordinal starts the token.
  TMiCommand Command;
  /// The line, without the token of an MI line.
  std::string Expected;
  TKey Key = kMiToken;
  TGDBCPU CPU = gcAMD64;
};

void PrintTo(const TLineCase& Case, std::ostream* Out) { *Out << Case.Behaviour; }

std::string FirstToken(TMiCommand Command) {
  char Ordinal[4];
  std::snprintf(Ordinal, sizeof(Ordinal), "%03d", static_cast<int>(Command));
  return std::string(Ordinal) + "0000000001";
}

class CommandLine : public testing::TestWithParam<TLineCase> {};

TEST_P(CommandLine, IsBuiltExactly) {
  const TLineCase& Case = GetParam();
  TGDBCommand Builder(Case.CPU);
  std::string Token = "caller's";
  const std::string Line = Case.Build(Builder, Token);
  switch (Case.Key) {
  case kMiToken:
    EXPECT_EQ(Token, FirstToken(Case.Command));
    EXPECT_EQ(Line, FirstToken(Case.Command) + Case.Expected);
    break;
  case kEcho:
    EXPECT_EQ(Line, Case.Expected);
    EXPECT_EQ(Token, Case.Expected + "\\n");
    break;
  case kUntouched:
    EXPECT_EQ(Line, Case.Expected);
    EXPECT_EQ(Token, "caller's");
    break;
  }
}

std::string CaseName(const testing::TestParamInfo<TLineCase>& Info) { return Info.param.Behaviour; }

const std::vector<TLineCase> BreakpointCases = {
    {"DeleteListsEveryNumber", BUILD(CreateBreakDeleteCommand(T, {1, 2, 3})), ctBreakDelete, "-break-delete 1 2 3"},
    {"InsertAtLocationPendingTemporary", BUILD(CreateBreakInsertCommand(T, "main", true, true)), ctBreakInsert,
     "-break-insert -f -t main"},
    {"InsertAtLocationPlain", BUILD(CreateBreakInsertCommand(T, "main", false, false)), ctBreakInsert,
     "-break-insert main"},
    {"InsertAtFileLineIsPending", BUILD(CreateBreakInsertCommand(T, std::string("unit1.pas"), 12, false)),
     ctBreakInsert, "-break-insert -f unit1.pas:12"},
    {"InsertAtAddressIsPending", BUILD(CreateBreakInsertCommand(T, UInt64{0x401000}, true)), ctBreakInsert,
     "-break-insert -f -t *0x0000000000401000"},
    {"InsertAtAddressPadsTo8DigitsOn32Bit", BUILD(CreateBreakInsertCommand(T, UInt64{0xabc}, false)),
     ctBreakInsert, "-break-insert -f *0x00000ABC", kMiToken, gcARM32},
    {"WatchWrite", BUILD(CreateBreakWatchCommand(T, "g", false, false)), ctBreakWatch, "-break-watch g"},
    {"WatchReadPutsOptionFirst", BUILD(CreateBreakWatchCommand(T, "g", true, false)), ctBreakWatch,
     "-break-watch -r g"},
    {"WatchAccessPutsOptionFirst", BUILD(CreateBreakWatchCommand(T, "g", false, true)), ctBreakWatch,
     "-break-watch -a g"},
    {"WatchReadAndAccessIsWrite", BUILD(CreateBreakWatchCommand(T, "g", true, true)), ctBreakWatch,
     "-break-watch g"},
    {"WatchAddressPascalSyntax", BUILD(CreateBreakWatchCommand(T, UInt64{4096}, false, false, true)),
     ctBreakWatch, "-break-watch 0x0000000000001000^"},
    {"WatchAddressCSyntax", BUILD(CreateBreakWatchCommand(T, UInt64{4096}, true, false, false)), ctBreakWatch,
     "-break-watch -r *0x0000000000001000"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderBreakpoints, CommandLine, testing::ValuesIn(BreakpointCases), CaseName);

const std::vector<TLineCase> ExecCases = {
    {"ArgumentsAsWritten", BUILD(CreateExecArgumentsCommand(T, std::string("a\\b c"), false)), ctExecArguments,
     "-exec-arguments a\\b c"},
    {"ArgumentsEscapedDoubleBackslashes", BUILD(CreateExecArgumentsCommand(T, std::string("C:\\d\\f"), true)),
     ctExecArguments, "-exec-arguments C:\\\\d\\\\f"},
    {"ArgumentListEscaped", BUILD(CreateExecArgumentsCommand(T, std::vector<std::string>{"x\\y", "z"}, true)),
     ctExecArguments, "-exec-arguments x\\\\y z"},
    {"EnvDirectoryReset", BUILD(CreateEnvDirCommand(T, {"/a", "/b"}, true)), ctEnvironmentDirectory,
     "-environment-directory -r /a /b"},
    {"ThreadInfoOfOneThread", BUILD(CreateThreadInfoCommand(T, 3)), ctThreadInfo, "-thread-info 3"},
    {"ThreadSelectCLIHasNoToken", BUILD(CreateThreadSelectCommand(T, 2, true)), ctUnknown, "thread select 2",
     kUntouched},
    {"UntilLine", BUILD(CreateExecUntilCommand(T, "a.c", 7)), ctExecUntil, "-exec-until a.c:7"},
    {"UntilWithoutFileIsBare", BUILD(CreateExecUntilCommand(T, "", 7)), ctExecUntil, "-exec-until"},
    {"UntilWithoutLineIsBare", BUILD(CreateExecUntilCommand(T, "a.c", -1)), ctExecUntil, "-exec-until"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderExec, CommandLine, testing::ValuesIn(ExecCases), CaseName);

const std::vector<TLineCase> StackCases = {
    {"InfoDepthUnlimited", BUILD(CreateStackInfoDepthCommand(T, -1)), ctStackInfoDepth, "-stack-info-depth"},
    {"ListArgumentsNamesOfAllFrames", BUILD(CreateStackListArgumentsCommand(T, true, -1, 5)),
     ctStackListArguments, "-stack-list-arguments 0"},
    {"ListAllFrames", BUILD(CreateStackListFramesCommand(T, -1, 0)), ctStackListFrames, "-stack-list-frames"},
    {"ListLocals", BUILD(CreateStackListLocalsCommand(T, pvfSimpleValues)), ctStackListLocals,
     "-stack-list-locals --simple-values"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderStack, CommandLine, testing::ValuesIn(StackCases), CaseName);

const std::vector<TLineCase> VarObjectCases = {
    {"CreateInCurrentFrame", BUILD(CreateVarCreateCommand(T, "var1", std::string("a+b"), UInt64{0})),
     ctVarCreate, "-var-create var1 * \"a+b\""},
    {"CreateInFrame", BUILD(CreateVarCreateCommand(T, "var2", std::string("x"), UInt64{0x7ffe0000})),
     ctVarCreate, "-var-create var2 0x000000007FFE0000 \"x\""},
    {"CreateAtAddressIsNotQuoted", BUILD(CreateVarCreateCommand(T, "var3", UInt64{0x1000}, UInt64{0})),
     ctVarCreate, "-var-create var3 * *0x0000000000001000"},
    {"Delete", BUILD(CreateVarDeleteCommand(T, "var1", false)), ctVarDelete, "-var-delete var1"},
    {"DeleteChildrenOnly", BUILD(CreateVarDeleteCommand(T, "var1", true)), ctVarDelete, "-var-delete -c var1"},
    {"SetFormat", BUILD(CreateVarSetFormatCommand(T, "var1", dvfBinary)), ctVarSetFormat,
     "-var-set-format var1 binary"},
    {"ListChildrenRangedQuoted", BUILD(CreateVarListChildrenCommand(T, "var1", true, true, pvfAllValues)),
     ctVarListChildren, "-var-list-children --all-values \"var1\" 0 5000"},
    {"ListChildrenPlain", BUILD(CreateVarListChildrenCommand(T, "var1", false, false, pvfNoValues)),
     ctVarListChildren, "-var-list-children var1"},
    {"EvaluateRawWritesNoFormat", BUILD(CreateVarEvaluateExpressionCommand(T, "var1", false, dvfRaw)),
     ctVarEvaluateExpression, "-var-evaluate-expression var1"},
    {"EvaluateNaturalNamesFormat", BUILD(CreateVarEvaluateExpressionCommand(T, "var1", true, dvfNatural)),
     ctVarEvaluateExpression, "-var-evaluate-expression -f natural \"var1\""},
    // GDB unwraps the c-string and evaluates the literal 'A'; "A" alone would
    // be read as a variable named A.
    {"AssignCharForGdbWrapsLiteral", BUILD(CreateVarAssignCommand(T, "var1", "char", "'A'", false)), ctVarAssign,
     "-var-assign var1 \"'A'\""},
    {"AssignBlankCharForGdbSurvivesSplitting", BUILD(CreateVarAssignCommand(T, "var1", "char", "' '", false)),
     ctVarAssign, "-var-assign var1 \"' '\""},
    {"AssignQuoteCharForGdbEscapesIt", BUILD(CreateVarAssignCommand(T, "var1", "char", "'\"'", false)),
     ctVarAssign, "-var-assign var1 \"'\\\"'\""},
    {"AssignCharForLldbAsWritten", BUILD(CreateVarAssignCommand(T, "var1", "char", "'A'", true)), ctVarAssign,
     "-var-assign var1 'A'"},
    {"AssignOtherTypeAsWritten", BUILD(CreateVarAssignCommand(T, "var1", "int", "'A'", false)), ctVarAssign,
     "-var-assign var1 'A'"},
    {"AssignLoneQuoteAsWritten", BUILD(CreateVarAssignCommand(T, "var1", "char", "'", false)), ctVarAssign,
     "-var-assign var1 '"},
    {"UpdateWithValues", BUILD(CreateVarUpdateCommand(T, "var1", pvfAllValues)), ctVarUpdate,
     "-var-update --all-values var1"},
    {"UpdateWithoutValues", BUILD(CreateVarUpdateCommand(T, "*", pvfNoValues)), ctVarUpdate, "-var-update *"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderVarObjects, CommandLine, testing::ValuesIn(VarObjectCases), CaseName);

TXMMFPURegValue CountingBytes() {
  TXMMFPURegValue Value{};
  for (Byte Index = 0; Index < 16; ++Index)
    Value.ByteReg[Index] = Index;
  return Value;
}

TXMMFPURegValue Int64Value(int64_t Number) {
  TXMMFPURegValue Value{};
  Value.Int64Reg[0] = Number;
  return Value;
}

const std::string CountingByteList =
    "\"{ 0x00 0x01 0x02 0x03 0x04 0x05 0x06 0x07 0x08 0x09 0x0A 0x0B 0x0C 0x0D 0x0E 0x0F }\"";
const Byte TwoBytes[] = {0x0A, 0xFF};

const std::vector<TLineCase> DataCases = {
    {"DisassembleRange", BUILD(CreateDataDisassembleCommand(T, UInt64{0x1000}, UInt64{0x1020}, 1)),
     ctDataDisassemble, "-data-disassemble -s 0x0000000000001000 -e 0x0000000000001020 -- 1"},
    {"DisassembleCount", BUILD(CreateDataDisassembleCommand(T, UInt64{0x1000}, Integer{5}, 0)), ctDataDisassemble,
     "-data-disassemble -s 0x0000000000001000 -n 5 -- 0"},
    {"DisassembleFileLine", BUILD(CreateDataDisassembleCommand(T, "a.c", 10, 20, 1)), ctDataDisassemble,
     "-data-disassemble -f a.c -l 10 -n 20 -- 1"},
    {"EvaluateExpression", BUILD(CreateDataEvaluateExpressionCommand(T, "$1F")), ctDataEvaluateExpression,
     "-data-evaluate-expression \"0x1F\""},
    {"ListRegisterValues", BUILD(CreateDataListRegisterValues(T, {0, 1, 2}, dvfHex)), ctDataListRegisterValues,
     "-data-list-register-values x 0 1 2"},
    {"ListOneRegisterValue", BUILD(CreateDataListRegisterValues(T, 7, dvfDecimal)), ctDataListRegisterValues,
     "-data-list-register-values d 7"},
    {"ListXMMValuesCarryOwnOrdinal", BUILD(CreateDataListXMMRegisterValues(T, {40, 41}, dvfRaw)),
     ctDataListXMMRegisterValues, "-data-list-register-values r 40 41"},
    {"ListFPUValuesCarryOwnOrdinal", BUILD(CreateDataListFPURegisterValues(T, {24}, dvfNatural)),
     ctDataListFPURegisterValues, "-data-list-register-values N 24"},
    {"WriteWin64FlagsIsEflags", BUILD(CreateDataWriteRegisterValues(T, 17, UInt64{0x246}, "Win64")), ctUnknown,
     "register write eflags 0x0000000000000246", kUntouched},
    {"WriteWin64xFlagsIsRflags", BUILD(CreateDataWriteRegisterValues(T, 17, UInt64{0x246}, "Win64x")), ctUnknown,
     "register write rflags 0x0000000000000246", kUntouched},
    {"WriteARM64Register", BUILD(CreateDataWriteRegisterValues(T, 32, UInt64{0x1000}, "Android64")), ctUnknown,
     "register write pc 0x0000000000001000", kUntouched, gcARM64},
    // Position 8 of the AMD64 table is r10, which ARM32 has too.
    {"WriteARM32RegisterFromOwnTable", BUILD(CreateDataWriteRegisterValues(T, 8, UInt64{0xFF}, "Android")),
     ctUnknown, "register write r8 0x000000FF", kUntouched, gcARM32},
    {"WriteIA32RegisterFromOwnTable", BUILD(CreateDataWriteRegisterValues(T, 8, UInt64{0x401000}, "")), ctUnknown,
     "register write eip 0x00401000", kUntouched, gcIA32},
    {"WriteXMMAsByteList", BUILD(CreateDataWriteXMMRegisterValues(T, 0, CountingBytes())), ctUnknown,
     "register write xmm0 " + CountingByteList, kUntouched},
    {"WriteMxcsrAsNumber", BUILD(CreateDataWriteXMMRegisterValues(T, 16, Int64Value(0x1F80))), ctUnknown,
     "register write mxcsr 0x0000000000001F80", kUntouched},
    {"WriteFPUStackOnMacAsStmm", BUILD(CreateDataWriteFPURegisterValues(T, 7, CountingBytes(), "OSX64")),
     ctUnknown, "register write stmm7 " + CountingByteList, kUntouched},
    {"WriteFPUControlAsNumber", BUILD(CreateDataWriteFPURegisterValues(T, 8, Int64Value(-1), "Win64")), ctUnknown,
     "register write fctrl 0xFFFFFFFFFFFFFFFF", kUntouched},
    {"ReadMemoryWithOffsetAndCharColumn",
     BUILD(CreateDataReadMemoryCommand(T, UInt64{0x2000}, 8, false, Int64{-4}, dvfHex, 1, 2, '.')),
     ctDataReadMemory, "-data-read-memory -o -4 0x0000000000002000 x 1 2 8 ."},
    {"ReadMemoryPlain", BUILD(CreateDataReadMemoryCommand(T, UInt64{0x2000}, 8, false, Int64{0}, dvfHex, 1, 2, '\0')),
     ctDataReadMemory, "-data-read-memory 0x0000000000002000 x 1 2 8"},
    {"ReadMemoryAsBytes", BUILD(CreateDataReadMemoryCommand(T, UInt64{0x2000}, 8, true, Int64{4}, dvfHex, 1, 2, '.')),
     ctDataReadMemoryBytes, "-data-read-memory-bytes -o 4 0x0000000000002000 8"},
    {"WriteMemoryBytesBehindToken", BUILD(CreateDataWriteMemoryBytesCommand(T, UInt64{0x2000}, TwoBytes, 2)),
     ctCLMemoryWrite, "memory write 0x0000000000002000 -s 1 0x0A 0xFF"},
    {"InfoLineOfFileLine", BUILD(CreateDataInfoLineCommand(T, "a b.c", 5)), ctDataInfoLine,
     "-data-info-line a b.c:5"},
    {"InfoLineOfAddress", BUILD(CreateDataInfoLineCommand(T, UInt64{0x2000})), ctDataInfoLine,
     "-data-info-line *0x0000000000002000"},
    {"ListAllLines", BUILD(CreateSymbolListLinesCommand(T, "a.c", -1, 0)), ctSymbolListLines,
     "-symbol-list-lines a.c"},
    {"ListLineRange", BUILD(CreateSymbolListLinesCommand(T, "a.c", 10, 5)), ctSymbolListLines,
     "-symbol-list-lines a.c --start 10 --count 5"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderData, CommandLine, testing::ValuesIn(DataCases), CaseName);

const std::vector<TLineCase> TargetCases = {
    {"AttachToPidCLIHasNoToken", BUILD(CreateTargetAttachCommand(T, 123, true)), ctUnknown,
     "process attach --pid 123", kUntouched},
    {"AttachToName", BUILD(CreateTargetAttachCommand(T, "prog")), ctTargetAttach, "-target-attach prog"},
    {"InterpreterExecQuotesTheCommand", BUILD(CreateInterpreterExecCommand(T, ctCLInfoLineAddress)),
     ctInterpreterExec, "-interpreter-exec console \"info line\""},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderTarget, CommandLine, testing::ValuesIn(TargetCases), CaseName);

const std::vector<TLineCase> EchoedCLICases = {
    {"InfoLine", BUILD(CreateCLInfoLineAddressCommand(T, "a.c", 12)), ctUnknown, "info line a.c:12", kEcho},
    {"SetVariableAddress", BUILD(CreateCLSetVariableCommand(T, "p", UInt64{0x1000})), ctUnknown,
     "set variable p = 0x00001000", kEcho, gcIA32},
    {"HandleLldb", BUILD(CreateCLHandleCommand(T, "SIGUSR1", true, false, true)), ctUnknown,
     "process handle -s true -p false SIGUSR1", kEcho},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderEchoedCLI, CommandLine, testing::ValuesIn(EchoedCLICases), CaseName);

// A path that GDB's and LLDB's argument splitters would cut or misread.
const std::string AwkwardPath = "/tmp/a b\"c\\d/prog";
const std::string AwkwardPathQuoted = "\"/tmp/a b\\\"c\\\\d/prog\"";

const std::vector<TLineCase> QuotingCases = {
    {"ExecFileEscapesQuoteAndBackslash", BUILD(CreateFileExecAndSymbolsCommand(T, AwkwardPath)),
     ctFileExecAndSymbols, "-file-exec-and-symbols " + AwkwardPathQuoted},
    {"EnvCdEscapesQuoteAndBackslash", BUILD(CreateEnvCdCommand(T, AwkwardPath)), ctEnvironmentCd,
     "-environment-cd " + AwkwardPathQuoted},
    {"CommandSourceEscapesQuoteAndBackslash", BUILD(CreateCLCommandSourceCommand(T, AwkwardPath)), ctUnknown,
     "command source " + AwkwardPathQuoted, kEcho},
    {"QuotedVarNameEscaped", BUILD(CreateVarEvaluateExpressionCommand(T, "v\"1\\", true, dvfRaw)),
     ctVarEvaluateExpression, "-var-evaluate-expression \"v\\\"1\\\\\""},
    {"LineBreakInValueBecomesBlank", BUILD(CreateGDBSetCommand(T, "args", "x\r\n-gdb-exit")), ctGdbSet,
     "-gdb-set args x  -gdb-exit"},
    {"EchoKeyIsOfCleanedLine", BUILD(CreateCLSetVariableCommand(T, "x", std::string("1\nkill"))), ctUnknown,
     "set variable x = 1 kill", kEcho},
    {"LineBreakInQuotedPathBecomesBlank", BUILD(CreateFileExecAndSymbolsCommand(T, "/tmp/a\nb")),
     ctFileExecAndSymbols, "-file-exec-and-symbols \"/tmp/a b\""},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderSafety, CommandLine, testing::ValuesIn(QuotingCases), CaseName);

// Text that would end the line early and run a second command.
const std::string Evil = "x\r\n-target-detach\n";

// Every builder that takes text, fed that text everywhere it can go.
TEST(CommandBuilderSafety, NoBuilderReturnsALineBreak) {
  const std::vector<TBuild> Builders = {
      BUILD(CreateBreakInsertCommand(T, Evil, false, false)), BUILD(CreateBreakInsertCommand(T, Evil, 1, false)),
      BUILD(CreateBreakWatchCommand(T, Evil, true, false)), BUILD(CreateExecArgumentsCommand(T, Evil, true)),
      BUILD(CreateExecArgumentsCommand(T, TStringArray{Evil}, false)), BUILD(CreateEnvCdCommand(T, Evil)),
      BUILD(CreateEnvDirCommand(T, {Evil}, false)), BUILD(CreateEnvPathCommand(T, {Evil}, true)),
      BUILD(CreateExecUntilCommand(T, Evil, 1)), BUILD(CreateVarCreateCommand(T, Evil, Evil, UInt64{0})),
      BUILD(CreateVarCreateCommand(T, Evil, UInt64{1}, UInt64{0})), BUILD(CreateVarDeleteCommand(T, Evil, true)),
      BUILD(CreateVarSetFormatCommand(T, Evil, dvfHex)), BUILD(CreateVarInfoNumChildrenCommand(T, Evil)),
      BUILD(CreateVarInfoTypeCommand(T, Evil)), BUILD(CreateVarInfoExpressionCommand(T, Evil)),
      BUILD(CreateVarListChildrenCommand(T, Evil, true, true, pvfNoValues)),
      BUILD(CreateVarInfoPathExpressionCommand(T, Evil, false)), BUILD(CreateVarShowAttributesCommand(T, Evil, true)),
      BUILD(CreateVarEvaluateExpressionCommand(T, Evil, false, dvfHex)),
      BUILD(CreateVarAssignCommand(T, Evil, "char", "'" + Evil + "'", false)),
      BUILD(CreateVarAssignCommand(T, Evil, "int", Evil, true)), BUILD(CreateVarUpdateCommand(T, Evil, pvfAllValues)),
      BUILD(CreateDataDisassembleCommand(T, Evil, 1, 2, 0)), BUILD(CreateDataEvaluateExpressionCommand(T, Evil)),
      BUILD(CreateDataWriteRegisterValues(T, Evil, UInt64{1})),
      BUILD(CreateDataReadMemoryCommand(T, UInt64{0}, 1, false, Int64{0}, dvfHex, 1, 1, '\n')),
      BUILD(CreateDataInfoLineCommand(T, Evil, 1)), BUILD(CreateSymbolListLinesCommand(T, Evil, 1, 1)),
      BUILD(CreateFileExecAndSymbolsCommand(T, Evil)), BUILD(CreateTargetAttachCommand(T, Evil)),
      BUILD(CreateGDBSetCommand(T, Evil, Evil)), BUILD(CreateGDBShowCommand(T, Evil)),
      BUILD(CreateEnableTimingsCommand(T, Evil)), BUILD(CreateEnableDebugHookCommand(T, Evil)),
      BUILD(CreateCLInfoLineAddressCommand(T, Evil, 1)), BUILD(CreateCLSetVariableCommand(T, Evil, Evil)),
      BUILD(CreateCLSetVariableCommand(T, Evil, UInt64{1})), BUILD(CreateCLSetEnvironmentCommand(T, Evil, Evil, true)),
      BUILD(CreateCLSetEnvironmentCommand(T, Evil, Evil, false)), BUILD(CreateCLHandleCommand(T, Evil, 1, 1, 1)),
      BUILD(CreateCLHandleCommand(T, Evil, 0, 0, 0)), BUILD(CreateCLSettingsSetCommand(T, Evil, Evil)),
      BUILD(CreateCLSettingsShowCommand(T, Evil)), BUILD(CreateCLCommandSourceCommand(T, Evil)),
  };
  for (std::size_t Index = 0; Index < Builders.size(); ++Index) {
    TGDBCommand Builder(gcAMD64);
    std::string Token;
    const std::string Line = Builders[Index](Builder, Token);
    EXPECT_EQ(Line.find_first_of("\r\n"), std::string::npos) << "builder #" << Index << ": " << Line;
    EXPECT_EQ(Token.find_first_of("\r\n"), std::string::npos) << "builder #" << Index << ": " << Token;
  }
}

/// Runs GDB on the given MI lines and returns everything it printed.
std::string RunGdb(const test::TScratchDir& Dir, const std::string& Commands) {
  const std::string Script = Dir.WriteFile("commands.mi", Commands + "-gdb-exit\n");
  const std::string Shell = "/usr/bin/gdb --nx --interpreter=mi2 < '" + Script + "' 2>&1";
  std::string Output;
  FILE* Pipe = popen(Shell.c_str(), "r");
  if (Pipe == nullptr)
    return Output;
  char Buffer[4096];
  for (std::size_t Count; (Count = std::fread(Buffer, 1, sizeof(Buffer), Pipe)) > 0;)
    Output.append(Buffer, Count);
  pclose(Pipe);
  return Output;
}

TEST(CommandBuilderSafety, GdbLoadsProgramAndChangesToDirectoryWithBlankQuoteAndBackslash) {
  if (!std::filesystem::exists("/usr/bin/gdb") || !std::filesystem::exists("/bin/true"))
    GTEST_SKIP() << "needs /usr/bin/gdb and /bin/true";
  const test::TScratchDir Scratch;
  const std::filesystem::path Dir = std::filesystem::path(Scratch.Path()) / "a b\"c\\d";
  std::filesystem::create_directory(Dir);
  std::filesystem::copy_file("/bin/true", Dir / "prog");

  TGDBCommand Builder(gcAMD64);
  std::string LoadToken;
  std::string CdToken;
  const std::string Load = Builder.CreateFileExecAndSymbolsCommand(LoadToken, (Dir / "prog").string());
  const std::string Cd = Builder.CreateEnvCdCommand(CdToken, Dir.string());
  const std::string Output = RunGdb(Scratch, Load + "\n" + Cd + "\n-environment-pwd\n");

  EXPECT_NE(Output.find(LoadToken + "^done"), std::string::npos) << Output;
  EXPECT_NE(Output.find(CdToken + "^done"), std::string::npos) << Output;
  // GDB prints the directory back as a c-string.
  EXPECT_NE(Output.find("cwd=\"" + Scratch.Path() + "/a b\\\"c\\\\d\""), std::string::npos) << Output;
}

TEST(CommandBuilderTokens, ThousandthRequestIsALaunchToken) {
  TGDBCommand Builder(gcAMD64);
  std::string Token;
  for (int Request = 1; Request < 1000; ++Request)
    Builder.CreateExecNextCommand(Token);
  EXPECT_EQ(Builder.CreateExecRunCommand(Token, false), "0250000001000-exec-run");
  EXPECT_EQ(Token, "0250000001000");
  EXPECT_TRUE(IsProcessLaunchCommand(Token));
}

TEST(CommandBuilderTokens, CounterWrapsAt32Bits) {
  TGDBCommand Builder(gcIA32);
  Builder.FRequestId = 0xFFFFFFFF;
  std::string Token;
  Builder.CreateExecNextCommand(Token);
  EXPECT_EQ(Token, "0220000000000");
  Builder.CreateExecNextCommand(Token);
  EXPECT_EQ(Token, "0220000000001");
}

TEST(CommandBuilderTokens, LaunchTokenNeedsRunOrdinalAndThirteenCharacters) {
  const struct {
    const char* Token;
    bool IsLaunch;
  } Cases[] = {
      {"0250000001000", true},  {"025000000100", false}, {"02500000010000", false},
      {"0220000001000", false}, {"kill\\n0000000", false}, {"", false},
  };
  for (const auto& Case : Cases)
    EXPECT_EQ(IsProcessLaunchCommand(Case.Token), Case.IsLaunch) << Case.Token;
}

TEST(CommandBuilderExpressions, FixupExprPreparesExpressionArgument) {
  const struct {
    const char* Expr;
    const char* Sent;
  } Cases[] = {
      {"", ""},
      {"+5", "\"5\""},
      {"+", ""},
      {"$FFFFFFFFFFFFFFFF", "\"0xFFFFFFFFFFFFFFFF\""},
      {"$10000000000000000", "\"$10000000000000000\""}, // does not fit in 64 bits
      {"$eax", "\"$eax\""},
      {"$1+2", "\"$1+2\""},
      {"$", "\"$\""},
      {"+$1F", "\"$1F\""},
      {"*0x1000", "*0x1000"},
      {"a\nb", "\"a b\""},
      {"a\r\nb", "\"a  b\""},
      {"s = \"x\"", "\"s = \"x\"\""},
  };
  for (const auto& Case : Cases)
    EXPECT_EQ(TGDBCommand::FixupExpr(Case.Expr), Case.Sent) << Case.Expr;
}

TEST(CommandBuilderRegisters, IdOutsideItsTableThrowsNamingTableAndId) {
  const struct {
    TGDBCPU CPU;
    TBuild Build;
    const char* Message;
  } Cases[] = {
      {gcAMD64, BUILD(CreateDataWriteRegisterValues(T, 24, UInt64{0}, "Linux")), "24 is outside AMD64Registers"},
      {gcAMD64, BUILD(CreateDataWriteRegisterValues(T, -1, UInt64{0}, "Win64")), "-1 is outside winAMD64Registers"},
      {gcARM64, BUILD(CreateDataWriteRegisterValues(T, 34, UInt64{0}, "")), "34 is outside ARM64Registers"},
      {gcARM32, BUILD(CreateDataWriteRegisterValues(T, 17, UInt64{0}, "")), "17 is outside ARM32Registers"},
      {gcIA32, BUILD(CreateDataWriteRegisterValues(T, 16, UInt64{0}, "")), "16 is outside IA32Registers"},
      {gcAMD64, BUILD(CreateDataWriteXMMRegisterValues(T, 17, TXMMFPURegValue{})), "17 is outside AMD64XMMRegisters"},
      {gcAMD64, BUILD(CreateDataWriteFPURegisterValues(T, 16, TXMMFPURegValue{}, "")), "16 is outside AMD64FPURegisters"},
      {gcAMD64, BUILD(CreateDataWriteFPURegisterValues(T, -3, TXMMFPURegValue{}, "OSX64")),
       "-3 is outside macAMD64FPURegisters"},
  };
  for (const auto& Case : Cases) {
    TGDBCommand Builder(Case.CPU);
    std::string Token;
    try {
      Case.Build(Builder, Token);
      ADD_FAILURE() << "no exception for " << Case.Message;
    } catch (const std::out_of_range& Error) {
      EXPECT_NE(std::string(Error.what()).find(Case.Message), std::string::npos) << Error.what();
    }
  }
}

TEST(CommandBuilderRegisters, ValuesAreEqualOnlyWhenAll16BytesAre) {
  const TXMMFPURegValue A = CountingBytes();
  TXMMFPURegValue B = CountingBytes();
  EXPECT_TRUE(XMMRegisterEqual(A, B));
  EXPECT_TRUE(FPURegisterEqual(A, B));
  B.ByteReg[15] ^= 1;
  EXPECT_FALSE(XMMRegisterEqual(A, B));
  EXPECT_FALSE(FPURegisterEqual(A, B));
}

template <std::size_t N> std::size_t DistinctNames(const std::array<std::string_view, N>& Table) {
  std::set<std::string_view> Names(Table.begin(), Table.end());
  Names.erase("");
  return Names.size();
}

TEST(CommandBuilderRegisterTables, HoldDistinctNamesWithPlatformVariantsWhereTheirDebuggersDiffer) {
  EXPECT_EQ(DistinctNames(IA32Registers), 16u);
  EXPECT_EQ(DistinctNames(AMD64Registers), 24u);
  EXPECT_EQ(DistinctNames(winAMD64Registers), 24u);
  EXPECT_EQ(DistinctNames(ARM32Registers), 17u);
  EXPECT_EQ(DistinctNames(ARM64Registers), 34u);
  EXPECT_EQ(DistinctNames(AMD64FPURegisters), 16u);
  EXPECT_EQ(DistinctNames(macAMD64FPURegisters), 16u);
  EXPECT_EQ(DistinctNames(AMD64XMMRegisters), 17u);
  for (std::size_t Index = 0; Index < AMD64Registers.size(); ++Index) {
    EXPECT_EQ(winAMD64Registers[Index] == AMD64Registers[Index], Index != 17) << Index;
  }
  for (std::size_t Index = 0; Index < AMD64FPURegisters.size(); ++Index) {
    EXPECT_EQ(macAMD64FPURegisters[Index] == AMD64FPURegisters[Index], Index >= 8) << Index;
  }
  // The register reader finds the flags register of ARM at the end.
  EXPECT_EQ(ARM32Registers.back(), "cpsr");
  EXPECT_EQ(ARM64Registers.back(), "cpsr");
  EXPECT_EQ(ARM64Registers[29], "fp");
  EXPECT_EQ(IA32Registers[9], "eflags");
}

// The command lines above check the text of each command they build; these
// are the table's ends and the formats no line shows.
TEST(CommandBuilderTexts, TableEndsAndFormatsHaveTheirTexts) {
  EXPECT_EQ(MiCommandText(ctUnknown), "");
  EXPECT_EQ(MiCommandText(ctCLProcessAttach), "process attach");
  EXPECT_EQ(MiCommandText(static_cast<TMiCommand>(MiCommandCount)), "");
  // Variable objects know no raw format.
  EXPECT_EQ(DataValueFormatWord(dvfRaw), "natural");
}

} // namespace
