/// \file
/// The command lines midebug sends where they take more than the command
/// text: padding, escaping, option order and flags; their tokens and keys.

#include "mi/gdbcommand.h"
#include "mi/gdbregisters.h"
#include "mi/gdbresult.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>
#include <functional>
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
    {"InsertAtLocationPendingTemporary", BUILD(CreateBreakInsertCommand(T, "main", true, true)), ctBreakInsert,
     "-break-insert -f -t main"},
    {"InsertAtAddressPadsTo8DigitsOn32Bit", BUILD(CreateBreakInsertCommand(T, UInt64{0xabc}, false)),
     ctBreakInsert, "-break-insert -f *0x00000ABC", kMiToken, gcARM32},
    {"WatchReadPutsOptionFirst", BUILD(CreateBreakWatchCommand(T, "g", true, false)), ctBreakWatch,
     "-break-watch -r g"},
    {"WatchReadAndAccessIsWrite", BUILD(CreateBreakWatchCommand(T, "g", true, true)), ctBreakWatch,
     "-break-watch g"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderBreakpoints, CommandLine, testing::ValuesIn(BreakpointCases), CaseName);

const std::vector<TLineCase> ExecCases = {
    {"ArgumentsEscapedDoubleBackslashes", BUILD(CreateExecArgumentsCommand(T, std::string("C:\\d\\f"), true)),
     ctExecArguments, "-exec-arguments C:\\\\d\\\\f"},
    {"ThreadSelectCLIHasNoToken", BUILD(CreateThreadSelectCommand(T, 2, true)), ctUnknown, "thread select 2",
     kUntouched},
    {"UntilWithoutLineIsBare", BUILD(CreateExecUntilCommand(T, "a.c", -1)), ctExecUntil, "-exec-until"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderExec, CommandLine, testing::ValuesIn(ExecCases), CaseName);


const std::vector<TLineCase> VarObjectCases = {
    {"CreateInFrame", BUILD(CreateVarCreateCommand(T, "var2", std::string("x"), UInt64{0x7ffe0000})),
     ctVarCreate, "-var-create var2 0x000000007FFE0000 \"x\""},
    {"ListChildrenRangedQuoted", BUILD(CreateVarListChildrenCommand(T, "var1", true, true, pvfAllValues)),
     ctVarListChildren, "-var-list-children --all-values \"var1\" 0 5000"},
    {"EvaluateNaturalNamesFormat", BUILD(CreateVarEvaluateExpressionCommand(T, "var1", true, dvfNatural)),
     ctVarEvaluateExpression, "-var-evaluate-expression -f natural \"var1\""},
    // GDB unwraps the c-string and evaluates the literal 'A'; "A" alone would
    // be read as a variable named A, and "1 + 2" as three arguments.
    {"AssignCharForGdbWrapsLiteral", BUILD(CreateVarAssignCommand(T, "var1", "char", "'A'", false)), ctVarAssign,
     "-var-assign var1 \"'A'\""},
    {"AssignQuoteCharForGdbEscapesIt", BUILD(CreateVarAssignCommand(T, "var1", "char", "'\"'", false)),
     ctVarAssign, "-var-assign var1 \"'\\\"'\""},
    {"AssignExpressionForGdbQuotedNameAndValue",
     BUILD(CreateVarAssignCommand(T, "var1.std::a b", "int", "1 + \\2", false, true)), ctVarAssign,
     "-var-assign \"var1.std::a b\" \"1 + \\\\2\""},
    {"AssignForLLDBAsWritten", BUILD(CreateVarAssignCommand(T, "var1", "char", "'", true)), ctVarAssign,
     "-var-assign var1 '"},
    {"ListChildrenWindowQuoted", BUILD(CreateVarListChildrenCommand(T, "var1.a b", 100, 200, true, pvfNoValues)),
     ctVarListChildren, "-var-list-children \"var1.a b\" 100 200"},
    {"DeleteQuoted", BUILD(CreateVarDeleteCommand(T, "var1.a b", false, true)), ctVarDelete,
     "-var-delete \"var1.a b\""},
    {"UpdateQuoted", BUILD(CreateVarUpdateCommand(T, "var1", pvfAllValues, true)), ctVarUpdate,
     "-var-update --all-values \"var1\""},
    {"SetFormatQuoted", BUILD(CreateVarSetFormatCommand(T, "var1", dvfHex, true)), ctVarSetFormat,
     "-var-set-format \"var1\" hexadecimal"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderVarObjects, CommandLine, testing::ValuesIn(VarObjectCases), CaseName);

TXMMFPURegValue CountingBytes() {
  TXMMFPURegValue Value{};
  for (Byte Index = 0; Index < 16; ++Index)
    Value.ByteReg[Index] = Index;
  return Value;
}

const std::string CountingByteList =
    "\"{ 0x00 0x01 0x02 0x03 0x04 0x05 0x06 0x07 0x08 0x09 0x0A 0x0B 0x0C 0x0D 0x0E 0x0F }\"";
const Byte TwoBytes[] = {0x0A, 0xFF};

const std::vector<TLineCase> DataCases = {
    {"EvaluateExpression", BUILD(CreateDataEvaluateExpressionCommand(T, "$1F")), ctDataEvaluateExpression,
     "-data-evaluate-expression \"0x1F\""},
    {"WriteWin64FlagsIsEflags", BUILD(CreateDataWriteRegisterValues(T, 17, UInt64{0x246}, "Win64")), ctUnknown,
     "register write eflags 0x0000000000000246", kUntouched},
    // Position 8 of the AMD64 table is r10, which ARM32 has too.
    {"WriteARM32RegisterFromOwnTable", BUILD(CreateDataWriteRegisterValues(T, 8, UInt64{0xFF}, "Android")),
     ctUnknown, "register write r8 0x000000FF", kUntouched, gcARM32},
    {"WriteFPUStackOnMacAsStmm", BUILD(CreateDataWriteFPURegisterValues(T, 7, CountingBytes(), "OSX64")),
     ctUnknown, "register write stmm7 " + CountingByteList, kUntouched},
    {"ReadMemoryWithOffsetAndCharColumn",
     BUILD(CreateDataReadMemoryCommand(T, UInt64{0x2000}, 8, false, Int64{-4}, dvfHex, 1, 2, '.')),
     ctDataReadMemory, "-data-read-memory -o -4 0x0000000000002000 x 1 2 8 ."},
    {"WriteMemoryBytesBehindToken", BUILD(CreateDataWriteMemoryBytesCommand(T, UInt64{0x2000}, TwoBytes, 2)),
     ctCLMemoryWrite, "memory write 0x0000000000002000 -s 1 0x0A 0xFF"},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderData, CommandLine, testing::ValuesIn(DataCases), CaseName);

const std::vector<TLineCase> TargetCases = {
    {"InterpreterExecQuotesTheCommand", BUILD(CreateInterpreterExecCommand(T, ctCLInfoLineAddress)),
     ctInterpreterExec, "-interpreter-exec console \"info line\""},
};
INSTANTIATE_TEST_SUITE_P(CommandBuilderTarget, CommandLine, testing::ValuesIn(TargetCases), CaseName);

const std::vector<TLineCase> EchoedCLICases = {
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
      BUILD(CreateExecArgumentsCommand(T, TStringArray{Evil}, false)), BUILD(CreateEnvCdCommand(T, Evil)), BUILD(CreateInferiorTtySetCommand(T, Evil)),
      BUILD(CreateEnvDirCommand(T, {Evil}, false)), BUILD(CreateEnvPathCommand(T, {Evil}, true)),
      BUILD(CreateExecUntilCommand(T, Evil, 1)), BUILD(CreateVarCreateCommand(T, Evil, Evil, UInt64{0})),
      BUILD(CreateVarListChildrenCommand(T, Evil, true, true, pvfNoValues)),
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
      {"0250000001000", true}, {"025000000100", false}, {"0220000001000", false}, {"kill\\n0000000", false},
  };
  for (const auto& Case : Cases)
    EXPECT_EQ(IsProcessLaunchCommand(Case.Token), Case.IsLaunch) << Case.Token;
}

TEST(CommandBuilderExpressions, FixupExprPreparesExpressionArgument) {
  const struct {
    const char* Expr;
    const char* Sent;
  } Cases[] = {
      {"+5", "\"5\""},
      {"$FFFFFFFFFFFFFFFF", "\"0xFFFFFFFFFFFFFFFF\""},
      {"$10000000000000000", "\"$10000000000000000\""}, // does not fit in 64 bits
      {"$eax", "\"$eax\""},
      {"+$1F", "\"$1F\""},
      {"*0x1000", "*0x1000"},
      {"a\r\nb", "\"a  b\""},
      {"$_streq(s, \"a\\\\b\")", "\"$_streq(s, \\\"a\\\\\\\\b\\\")\""},
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
      {gcARM32, BUILD(CreateDataWriteRegisterValues(T, 17, UInt64{0}, "")), "17 is outside ARM32Registers"},
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

} // namespace
