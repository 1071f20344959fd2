#include "mi/gdbcommand.h"

#include "mi/gdbregisters.h"
#include "platform/quoting.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdio>
#include <cstring>

namespace midebug {

namespace {

constexpr std::array<std::string_view, MiCommandCount> MiCommandTexts = {
#define MI_COMMAND(Enumerator, Text) Text,
#include "mi/micommands.def"
};

struct TFormatNames {
  std::string_view Word;
  std::string_view Letter;
};

constexpr std::array<TFormatNames, 6> DataValueFormats = {{
    {"hexadecimal", "x"},
    {"octal", "o"},
    {"binary", "t"},
    {"decimal", "d"},
    // The variable-object commands know no raw format; "r" is GDB's raw
    // letter for registers and memory.
    {"natural", "r"},
    {"natural", "N"},
}};

constexpr std::array<std::string_view, 3> PrintValuesFormats = {"--no-values", "--all-values", "--simple-values"};

// -var-list-children with a range asks for children 0 to this number only, so
// that a huge array does not stall the debugger.
constexpr Integer MaxListedChildren = 5000;

// x87 stack and SSE data registers are written as a brace list of their 16
// bytes; the control registers behind them as one number.
constexpr Integer FPUStackRegisterCount = 8;
constexpr Integer XMMDataRegisterCount = 16;

std::string UpperHex(UInt64 Value, Integer MinDigits) {
  char Digits[17];
  char* End = std::to_chars(std::begin(Digits), std::end(Digits), Value, 16).ptr;
  std::string Text(std::begin(Digits), End);
  std::transform(Text.begin(), Text.end(), Text.begin(), [](char Digit) {
    return Digit >= 'a' && Digit <= 'f' ? static_cast<char>(Digit - 'a' + 'A') : Digit;
  });
  if (static_cast<Integer>(Text.size()) < MinDigits)
    Text.insert(0, static_cast<std::size_t>(MinDigits) - Text.size(), '0');
  return Text;
}

/// " 0xNN" for each of Count bytes.
std::string ByteList(const Byte* Data, Integer Count) {
  std::string List;
  for (Integer Index = 0; Index < Count; ++Index)
    List += " 0x" + UpperHex(Data[Index], 2);
  return List;
}

/// Text as an MI c-string whose escapes GDB decodes: line breaks and tabs
/// travel as \n, \r and \t instead of ending the command line.
std::string EscapeCString(std::string_view Text) {
  std::string Quoted = "\"";
  for (const char Character : Text) {
    switch (Character) {
    case '\\':
    case '"':
      Quoted += '\\';
      Quoted += Character;
      break;
    case '\n':
      Quoted += "\\n";
      break;
    case '\r':
      Quoted += "\\r";
      break;
    case '\t':
      Quoted += "\\t";
      break;
    default:
      Quoted += Character;
    }
  }
  return Quoted + '"';
}

std::string DoubleBackslashes(std::string_view Text) {
  std::string Doubled;
  for (const char Character : Text) {
    if (Character == '\\')
      Doubled += '\\';
    Doubled += Character;
  }
  return Doubled;
}

/// A CR or LF would end the line and let the rest run as a second command.
std::string SingleLine(std::string Line) {
  std::replace_if(Line.begin(), Line.end(), [](char Character) { return Character == '\r' || Character == '\n'; },
                  ' ');
  return Line;
}

std::string NumberList(const std::vector<Integer>& Numbers) {
  std::string List;
  for (const Integer Number : Numbers)
    List += " " + std::to_string(Number);
  return List;
}

std::string NameArgument(const std::string& Name, bool Quoted) {
  return " " + (Quoted ? DoubleQuoted(Name) : Name);
}

UInt64 FirstInt64(const TXMMFPURegValue& Value) {
  UInt64 Number;
  std::memcpy(&Number, &Value, sizeof(Number));
  return Number;
}

/// The 16 bytes, in memory order, as the brace list LLDB's register write reads.
std::string RegisterByteList(const TXMMFPURegValue& Value) {
  Byte Bytes[sizeof(TXMMFPURegValue)];
  std::memcpy(Bytes, &Value, sizeof(Bytes));
  return " \"{" + ByteList(Bytes, static_cast<Integer>(sizeof(Bytes))) + " }\"";
}

} // namespace

std::string_view MiCommandText(TMiCommand Command) {
  if (Command >= MiCommandTexts.size())
    return {};
  return MiCommandTexts[Command];
}

std::string_view DataValueFormatWord(TDataValueFormat Format) {
  return Format < DataValueFormats.size() ? DataValueFormats[Format].Word : std::string_view();
}

std::string_view DataValueFormatLetter(TDataValueFormat Format) {
  return Format < DataValueFormats.size() ? DataValueFormats[Format].Letter : std::string_view();
}

std::string_view PrintValuesFormatWord(TPrintValuesFormat Format) {
  return Format < PrintValuesFormats.size() ? PrintValuesFormats[Format] : std::string_view();
}

/// The command ordinal a token of this builder starts with; 0 for any other
/// text.
static int TokenOrdinal(const std::string& Token) {
  if (Token.size() != MiTokenLength)
    return 0;
  int Ordinal = 0;
  const char* OrdinalEnd = Token.data() + 3;
  const auto [End, Error] = std::from_chars(Token.data(), OrdinalEnd, Ordinal);
  return Error == std::errc() && End == OrdinalEnd ? Ordinal : 0;
}

bool IsProcessLaunchCommand(const std::string& Token) { return TokenOrdinal(Token) == ctExecRun; }

bool IsRunControlCommand(const std::string& Token) {
  switch (TokenOrdinal(Token)) {
  case ctExecContinue:
  case ctExecFinish:
  case ctExecNext:
  case ctExecNextInstruction:
  case ctExecStep:
  case ctExecStepInstruction:
  case ctExecUntil:
    return true;
  default:
    return false;
  }
}

bool XMMRegisterEqual(const TXMMFPURegValue& A, const TXMMFPURegValue& B) {
  return std::memcmp(&A, &B, sizeof(TXMMFPURegValue)) == 0;
}

TGDBCommand::TGDBCommand(TGDBCPU CPU) : FAddressDigits(CPU == gcAMD64 || CPU == gcARM64 ? 16 : 8), FCPUType(CPU) {}

std::string TGDBCommand::CreateMiCommand(TMiCommand Command, std::string& Token) {
  ++FRequestId;
  char Text[MiTokenLength + 1];
  std::snprintf(Text, sizeof(Text), "%.3d%.10u", static_cast<int>(Command), static_cast<unsigned>(FRequestId));
  Token = Text;
  return Token + std::string(MiCommandText(Command));
}

std::string TGDBCommand::CreateCLCommand(TMiCommand Command) { return std::string(MiCommandText(Command)); }

std::string TGDBCommand::FixupExpr(const std::string& Expr) {
  std::string Fixed = SingleLine(Expr);
  if (Fixed.empty())
    return Fixed;
  if (Fixed.front() == '+') {
    Fixed.erase(0, 1);
  } else if (Fixed.front() == '$') {
    // Pascal writes hexadecimal numbers as $1F; the debugger wants 0x1F. Only
    // a whole 64-bit number is rewritten, so $eax and $1+2 stay as they are.
    UInt64 Number = 0;
    const char* DigitsEnd = Fixed.data() + Fixed.size();
    const auto [End, Error] = std::from_chars(Fixed.data() + 1, DigitsEnd, Number, 16);
    if (Error == std::errc() && End == DigitsEnd)
      Fixed.replace(0, 1, "0x");
  }
  if (Fixed.empty() || Fixed.front() == '*')
    return Fixed;
  return DoubleQuoted(Fixed);
}

std::string TGDBCommand::Hex(UInt64 Address) const { return "0x" + UpperHex(Address, FAddressDigits); }

std::string TGDBCommand::MiLine(std::string& Token, TMiCommand Command, std::string_view Arguments) {
  return SingleLine(CreateMiCommand(Command, Token) + std::string(Arguments));
}

std::string TGDBCommand::EchoedCLLine(std::string& Token, TMiCommand Command, std::string_view Arguments) {
  std::string Line = CLLine(Command, Arguments);
  // GDB echoes a CLI command in a log record as a c-string ending in "\n";
  // the reply is recognised by that echo.
  Token = Line + "\\n";
  return Line;
}

std::string TGDBCommand::CLLine(TMiCommand Command, std::string_view Arguments) {
  return SingleLine(CreateCLCommand(Command) + std::string(Arguments));
}

// Breakpoints

std::string TGDBCommand::CreateBreakDeleteCommand(std::string& Token, const std::vector<Integer>& Numbers) {
  return MiLine(Token, ctBreakDelete, NumberList(Numbers));
}

std::string TGDBCommand::CreateBreakDisableCommand(std::string& Token, const std::vector<Integer>& Numbers) {
  return MiLine(Token, ctBreakDisable, NumberList(Numbers));
}

std::string TGDBCommand::CreateBreakEnableCommand(std::string& Token, const std::vector<Integer>& Numbers) {
  return MiLine(Token, ctBreakEnable, NumberList(Numbers));
}

std::string TGDBCommand::CreateBreakInsertCommand(std::string& Token, const std::string& Location, bool Temporary,
                                                  bool Pending) {
  std::string Arguments;
  if (Pending)
    Arguments += " -f";
  if (Temporary)
    Arguments += " -t";
  return MiLine(Token, ctBreakInsert, Arguments + " " + Location);
}

std::string TGDBCommand::CreateBreakInsertCommand(std::string& Token, const std::string& File, Integer Line,
                                                  bool Temporary) {
  return CreateBreakInsertCommand(Token, File + ":" + std::to_string(Line), Temporary, true);
}

std::string TGDBCommand::CreateBreakInsertCommand(std::string& Token, UInt64 Address, bool Temporary) {
  return CreateBreakInsertCommand(Token, "*" + Hex(Address), Temporary, true);
}

namespace {

/// GDB takes the options only before the expression; behind it they are
/// "garbage following <expression>".
std::string WatchOption(bool ReadFlag, bool AccessFlag) {
  if (ReadFlag && !AccessFlag)
    return " -r";
  if (AccessFlag && !ReadFlag)
    return " -a";
  return {};
}

} // namespace

std::string TGDBCommand::CreateBreakWatchCommand(std::string& Token, const std::string& Expr, bool ReadFlag,
                                                 bool AccessFlag) {
  return MiLine(Token, ctBreakWatch, WatchOption(ReadFlag, AccessFlag) + " " + Expr);
}

std::string TGDBCommand::CreateBreakWatchCommand(std::string& Token, UInt64 Address, Integer Size, bool ReadFlag,
                                                 bool AccessFlag) {
  // The byte array is C's syntax; "--language" (which GDB reads only first)
  // makes it valid in a Pascal frame too.
  return MiLine(Token, ctBreakWatch,
                " --language c" + WatchOption(ReadFlag, AccessFlag) + " *(char(*)[" + std::to_string(Size) + "])" +
                    Hex(Address));
}

std::string TGDBCommand::CreateBreakWatchCommand(std::string& Token, UInt64 Address, bool ReadFlag,
                                                 bool AccessFlag, bool PascalSyntax) {
  // Pascal dereferences with a trailing "^", C with a leading "*".
  const std::string Expr = PascalSyntax ? Hex(Address) + "^" : "*" + Hex(Address);
  return CreateBreakWatchCommand(Token, Expr, ReadFlag, AccessFlag);
}

// Program arguments, environment and threads

std::string TGDBCommand::CreateExecArgumentsCommand(std::string& Token, const std::string& Args, bool Escape) {
  return MiLine(Token, ctExecArguments, " " + (Escape ? DoubleBackslashes(Args) : Args));
}

std::string TGDBCommand::CreateExecArgumentsCommand(std::string& Token, const std::vector<std::string>& Args,
                                                    bool Escape) {
  std::string Arguments;
  for (const std::string& Arg : Args)
    Arguments += " " + (Escape ? DoubleBackslashes(Arg) : Arg);
  return MiLine(Token, ctExecArguments, Arguments);
}

std::string TGDBCommand::CreateSetArgsCommand(std::string& Token, const std::string& Args) {
  return MiLine(Token, ctInterpreterExec, " console " + EscapeCString("set args " + Args));
}

std::string TGDBCommand::CreateEnvCdCommand(std::string& Token, const std::string& Dir) {
  return MiLine(Token, ctEnvironmentCd, " " + DoubleQuoted(Dir));
}

std::string TGDBCommand::CreateEnvDirCommand(std::string& Token, const std::vector<std::string>& Dirs, bool Reset) {
  std::string Arguments = Reset ? " -r" : "";
  for (const std::string& Dir : Dirs)
    Arguments += " " + Dir;
  return MiLine(Token, ctEnvironmentDirectory, Arguments);
}

std::string TGDBCommand::CreateEnvPathCommand(std::string& Token, const std::vector<std::string>& Paths,
                                              bool Reset) {
  std::string Arguments = Reset ? " -r" : "";
  for (const std::string& Path : Paths)
    Arguments += " " + Path;
  return MiLine(Token, ctEnvironmentPath, Arguments);
}

std::string TGDBCommand::CreateInferiorTtySetCommand(std::string& Token, const std::string& TtyPath) {
  return MiLine(Token, ctInferiorTtySet, " " + DoubleQuoted(TtyPath));
}

std::string TGDBCommand::CreateThreadInfoCommand(std::string& Token, Integer ThreadId) {
  return MiLine(Token, ctThreadInfo, ThreadId == -1 ? "" : " " + std::to_string(ThreadId));
}

std::string TGDBCommand::CreateThreadListIdsCommand(std::string& Token) { return MiLine(Token, ctThreadListIds, ""); }

std::string TGDBCommand::CreateThreadSelectCommand(std::string& Token, Integer ThreadId, bool UseCLI) {
  const std::string Arguments = " " + std::to_string(ThreadId);
  if (UseCLI)
    return CLLine(ctCLThreadSelect, Arguments);
  return MiLine(Token, ctThreadSelect, Arguments);
}

// Run control

std::string TGDBCommand::CreateExecContinueCommand(std::string& Token) { return MiLine(Token, ctExecContinue, ""); }

std::string TGDBCommand::CreateExecFinishCommand(std::string& Token) { return MiLine(Token, ctExecFinish, ""); }

std::string TGDBCommand::CreateExecInterruptCommand(std::string& Token) {
  return MiLine(Token, ctExecInterrupt, "");
}

std::string TGDBCommand::CreateExecNextCommand(std::string& Token) { return MiLine(Token, ctExecNext, ""); }

std::string TGDBCommand::CreateExecNextInstructionCommand(std::string& Token) {
  return MiLine(Token, ctExecNextInstruction, "");
}

std::string TGDBCommand::CreateExecReturnCommand(std::string& Token) { return MiLine(Token, ctExecReturn, ""); }

std::string TGDBCommand::CreateExecStepCommand(std::string& Token) { return MiLine(Token, ctExecStep, ""); }

std::string TGDBCommand::CreateExecStepInstructionCommand(std::string& Token) {
  return MiLine(Token, ctExecStepInstruction, "");
}

std::string TGDBCommand::CreateExecRunCommand(std::string& Token, bool Start) {
  return MiLine(Token, ctExecRun, Start ? " --start" : "");
}

std::string TGDBCommand::CreateExecUntilCommand(std::string& Token, const std::string& File, Integer Line) {
  if (File.empty() || Line == -1)
    return MiLine(Token, ctExecUntil, "");
  return MiLine(Token, ctExecUntil, " " + File + ":" + std::to_string(Line));
}

// Stack

std::string TGDBCommand::CreateStackInfoFrameCommand(std::string& Token) {
  return MiLine(Token, ctStackInfoFrame, "");
}

std::string TGDBCommand::CreateStackInfoDepthCommand(std::string& Token, Integer MaxDepth) {
  return MiLine(Token, ctStackInfoDepth, MaxDepth == -1 ? "" : " " + std::to_string(MaxDepth));
}

std::string TGDBCommand::CreateStackListArgumentsCommand(std::string& Token, bool NoValues, Integer Low,
                                                         Integer High) {
  std::string Arguments = NoValues ? " 0" : " 1";
  if (Low != -1)
    Arguments += " " + std::to_string(Low) + " " + std::to_string(High);
  return MiLine(Token, ctStackListArguments, Arguments);
}

std::string TGDBCommand::CreateStackListFramesCommand(std::string& Token, Integer Low, Integer High) {
  if (Low == -1)
    return MiLine(Token, ctStackListFrames, "");
  return MiLine(Token, ctStackListFrames, " " + std::to_string(Low) + " " + std::to_string(High));
}

std::string TGDBCommand::CreateStackListLocalsCommand(std::string& Token, TPrintValuesFormat PrintValues) {
  return MiLine(Token, ctStackListLocals, " " + std::string(PrintValuesFormatWord(PrintValues)));
}

std::string TGDBCommand::CreateStackSelectFrameCommand(std::string& Token, Integer Level) {
  return MiLine(Token, ctStackSelectFrame, " " + std::to_string(Level));
}

// Variable objects

std::string TGDBCommand::CreateVarCreateCommand(std::string& Token, const std::string& Name,
                                                const std::string& Expr, UInt64 Frame) {
  const std::string FrameArgument = Frame != 0 ? " " + Hex(Frame) : " *";
  return MiLine(Token, ctVarCreate, " " + Name + FrameArgument + " " + FixupExpr(Expr));
}

std::string TGDBCommand::CreateVarCreateCommand(std::string& Token, const std::string& Name, UInt64 Address,
                                                UInt64 Frame) {
  return CreateVarCreateCommand(Token, Name, "*" + Hex(Address), Frame);
}

std::string TGDBCommand::CreateVarDeleteCommand(std::string& Token, const std::string& Name, bool ChildrenOnly,
                                                bool Quoted) {
  return MiLine(Token, ctVarDelete, (ChildrenOnly ? " -c" : "") + NameArgument(Name, Quoted));
}

std::string TGDBCommand::CreateVarSetFormatCommand(std::string& Token, const std::string& Name,
                                                   TDataValueFormat Format, bool Quoted) {
  return MiLine(Token, ctVarSetFormat, NameArgument(Name, Quoted) + " " + std::string(DataValueFormatWord(Format)));
}

std::string TGDBCommand::CreateVarInfoNumChildrenCommand(std::string& Token, const std::string& Name) {
  return MiLine(Token, ctVarInfoNumChildren, " " + Name);
}

std::string TGDBCommand::CreateVarInfoTypeCommand(std::string& Token, const std::string& Name) {
  return MiLine(Token, ctVarInfoType, " " + Name);
}

std::string TGDBCommand::CreateVarInfoExpressionCommand(std::string& Token, const std::string& Name) {
  return MiLine(Token, ctVarInfoExpression, " " + Name);
}

std::string TGDBCommand::CreateVarListChildrenCommand(std::string& Token, const std::string& Name, bool Ranged,
                                                      bool Quoted, TPrintValuesFormat PrintValues) {
  std::string Arguments;
  if (PrintValues != pvfNoValues)
    Arguments += " " + std::string(PrintValuesFormatWord(PrintValues));
  Arguments += NameArgument(Name, Quoted);
  if (Ranged)
    Arguments += " 0 " + std::to_string(MaxListedChildren);
  return MiLine(Token, ctVarListChildren, Arguments);
}

std::string TGDBCommand::CreateVarListChildrenCommand(std::string& Token, const std::string& Name, Integer From,
                                                      Integer To, bool Quoted, TPrintValuesFormat PrintValues) {
  std::string Arguments;
  if (PrintValues != pvfNoValues)
    Arguments += " " + std::string(PrintValuesFormatWord(PrintValues));
  Arguments += NameArgument(Name, Quoted) + " " + std::to_string(From) + " " + std::to_string(To);
  return MiLine(Token, ctVarListChildren, Arguments);
}

std::string TGDBCommand::CreateVarInfoPathExpressionCommand(std::string& Token, const std::string& Name,
                                                            bool Quoted) {
  return MiLine(Token, ctVarInfoPathExpression, NameArgument(Name, Quoted));
}

std::string TGDBCommand::CreateVarShowAttributesCommand(std::string& Token, const std::string& Name, bool Quoted) {
  return MiLine(Token, ctVarShowAttributes, NameArgument(Name, Quoted));
}

std::string TGDBCommand::CreateVarEvaluateExpressionCommand(std::string& Token, const std::string& Name,
                                                            bool Quoted, TDataValueFormat Format) {
  std::string Arguments;
  if (Format != dvfRaw)
    Arguments += " -f " + std::string(DataValueFormatWord(Format));
  return MiLine(Token, ctVarEvaluateExpression, Arguments + NameArgument(Name, Quoted));
}

std::string TGDBCommand::CreateVarAssignCommand(std::string& Token, const std::string& Name,
                                                const std::string& /*TypeName*/, const std::string& Value,
                                                bool IsLLDB, bool Quoted) {
  // GDB splits MI arguments at blanks, so ' ' or 1 + 2 would arrive as
  // several arguments. Inside an MI c-string the value survives whole: GDB
  // unwraps the c-string and evaluates what the user wrote.
  const std::string Assigned = IsLLDB ? Value : DoubleQuoted(Value);
  return MiLine(Token, ctVarAssign, NameArgument(Name, Quoted) + " " + Assigned);
}

std::string TGDBCommand::CreateVarUpdateCommand(std::string& Token, const std::string& Name,
                                                TPrintValuesFormat PrintValues, bool Quoted) {
  std::string Arguments;
  if (PrintValues != pvfNoValues)
    Arguments += " " + std::string(PrintValuesFormatWord(PrintValues));
  return MiLine(Token, ctVarUpdate, Arguments + NameArgument(Name, Quoted));
}

std::string TGDBCommand::CreateEnablePrettyPrintingCommand(std::string& Token) {
  return MiLine(Token, ctEnablePrettyPrinting, "");
}

// Disassembly, expressions, registers, memory

std::string TGDBCommand::CreateDataDisassembleCommand(std::string& Token, UInt64 StartAddr, UInt64 EndAddr,
                                                      Integer Mode) {
  return MiLine(Token, ctDataDisassemble,
                " -s " + Hex(StartAddr) + " -e " + Hex(EndAddr) + " -- " + std::to_string(Mode));
}

std::string TGDBCommand::CreateDataDisassembleCommand(std::string& Token, UInt64 StartAddr, Integer Count,
                                                      Integer Mode) {
  return MiLine(Token, ctDataDisassemble,
                " -s " + Hex(StartAddr) + " -n " + std::to_string(Count) + " -- " + std::to_string(Mode));
}

std::string TGDBCommand::CreateDataDisassembleCommand(std::string& Token, const std::string& File, Integer Line,
                                                      Integer Count, Integer Mode) {
  return MiLine(Token, ctDataDisassemble,
                " -f " + File + " -l " + std::to_string(Line) + " -n " + std::to_string(Count) + " -- " +
                    std::to_string(Mode));
}

std::string TGDBCommand::CreateDataEvaluateExpressionCommand(std::string& Token, const std::string& Expr) {
  return MiLine(Token, ctDataEvaluateExpression, " " + FixupExpr(Expr));
}

std::string TGDBCommand::CreateDataListRegisterNames(std::string& Token, const std::vector<Integer>& Ids) {
  return MiLine(Token, ctDataListRegisterNames, NumberList(Ids));
}

std::string TGDBCommand::DataListRegisterValues(std::string& Token, TMiCommand Command,
                                                const std::vector<Integer>& Ids, TDataValueFormat Format) {
  return MiLine(Token, Command, " " + std::string(DataValueFormatLetter(Format)) + NumberList(Ids));
}

std::string TGDBCommand::DataListRegisterValues(std::string& Token, TMiCommand Command, Integer Id,
                                                TDataValueFormat Format) {
  return MiLine(Token, Command, " " + std::string(DataValueFormatLetter(Format)) + " " + std::to_string(Id));
}

std::string TGDBCommand::CreateDataListRegisterValues(std::string& Token, const std::vector<Integer>& Ids,
                                                      TDataValueFormat Format) {
  return DataListRegisterValues(Token, ctDataListRegisterValues, Ids, Format);
}

std::string TGDBCommand::CreateDataListRegisterValues(std::string& Token, Integer Id, TDataValueFormat Format) {
  return DataListRegisterValues(Token, ctDataListRegisterValues, Id, Format);
}

std::string TGDBCommand::CreateDataListXMMRegisterValues(std::string& Token, const std::vector<Integer>& Ids,
                                                         TDataValueFormat Format) {
  return DataListRegisterValues(Token, ctDataListXMMRegisterValues, Ids, Format);
}

std::string TGDBCommand::CreateDataListXMMRegisterValues(std::string& Token, Integer Id, TDataValueFormat Format) {
  return DataListRegisterValues(Token, ctDataListXMMRegisterValues, Id, Format);
}

std::string TGDBCommand::CreateDataListFPURegisterValues(std::string& Token, const std::vector<Integer>& Ids,
                                                         TDataValueFormat Format) {
  return DataListRegisterValues(Token, ctDataListFPURegisterValues, Ids, Format);
}

std::string TGDBCommand::CreateDataListFPURegisterValues(std::string& Token, Integer Id, TDataValueFormat Format) {
  return DataListRegisterValues(Token, ctDataListFPURegisterValues, Id, Format);
}

std::string TGDBCommand::CreateDataWriteRegisterValues(std::string& /*Token*/, const std::string& Name,
                                                       UInt64 Value) {
  return CLLine(ctCLRegisterWrite, " " + Name + " " + Hex(Value));
}

std::string TGDBCommand::CreateDataWriteRegisterValues(std::string& Token, Integer Id, UInt64 Value,
                                                       const std::string& Platform) {
  // The id is a position in the table the register view of this CPU shows,
  // so the name must come from that same table: on ARM32, AMD64's r10 at
  // position 8 would overwrite the wrong register.
  const std::string_view Name = GeneralRegisterTable(FCPUType, Platform).At(Id);
  return CreateDataWriteRegisterValues(Token, std::string(Name), Value);
}

std::string TGDBCommand::CreateDataWriteXMMRegisterValues(std::string& /*Token*/, Integer Id,
                                                          const TXMMFPURegValue& Value) {
  const std::string Name(XMMRegisterTable().At(Id));
  if (Id < XMMDataRegisterCount)
    return CLLine(ctCLRegisterWrite, " " + Name + RegisterByteList(Value));
  return CLLine(ctCLRegisterWrite, " " + Name + " 0x" + UpperHex(FirstInt64(Value), 16));
}

std::string TGDBCommand::CreateDataWriteFPURegisterValues(std::string& /*Token*/, Integer Id,
                                                          const TXMMFPURegValue& Value,
                                                          const std::string& Platform) {
  const std::string Name(FPURegisterTable(Platform).At(Id));
  if (Id < FPUStackRegisterCount)
    return CLLine(ctCLRegisterWrite, " " + Name + RegisterByteList(Value));
  return CLLine(ctCLRegisterWrite, " " + Name + " 0x" + UpperHex(FirstInt64(Value), 16));
}

std::string TGDBCommand::CreateDataReadMemoryCommand(std::string& Token, UInt64 Address, Integer Count,
                                                     bool UseBytes, Int64 Offset, TDataValueFormat Format,
                                                     Integer WordSize, Integer Rows, char AsChar) {
  if (UseBytes)
    return CreateDataReadMemoryBytesCommand(Token, Address, Count, Offset);
  std::string Arguments;
  if (Offset != 0)
    Arguments += " -o " + std::to_string(Offset);
  Arguments += " " + Hex(Address) + " " + std::string(DataValueFormatLetter(Format)) + " " +
               std::to_string(WordSize) + " " + std::to_string(Rows) + " " + std::to_string(Count);
  if (AsChar != '\0')
    Arguments += std::string(" ") + AsChar;
  return MiLine(Token, ctDataReadMemory, Arguments);
}

std::string TGDBCommand::CreateDataReadMemoryBytesCommand(std::string& Token, UInt64 Address, Integer Count,
                                                          Int64 Offset) {
  std::string Arguments;
  if (Offset != 0)
    Arguments += " -o " + std::to_string(Offset);
  return MiLine(Token, ctDataReadMemoryBytes, Arguments + " " + Hex(Address) + " " + std::to_string(Count));
}

std::string TGDBCommand::CreateDataWriteMemoryBytesCommand(std::string& Token, UInt64 Address, const Byte* Data,
                                                           Integer Count) {
  const std::string Bytes = Data != nullptr ? ByteList(Data, Count) : "";
  return MiLine(Token, ctCLMemoryWrite, " " + Hex(Address) + " -s 1" + Bytes);
}

std::string TGDBCommand::CreateGDBDataWriteMemoryBytesCommand(std::string& Token, UInt64 Address,
                                                              const Byte* Data, Integer Count) {
  std::string Bytes;
  for (Integer Index = 0; Data != nullptr && Index < Count; ++Index)
    Bytes += UpperHex(Data[Index], 2);
  return MiLine(Token, ctDataWriteMemoryBytes, " " + Hex(Address) + " " + Bytes);
}

std::string TGDBCommand::CreateGDBDataWriteRegisterValues(std::string& Token, TMiCommand Command, Integer Number,
                                                          UInt64 Value) {
  return MiLine(Token, Command, " x " + std::to_string(Number) + " 0x" + UpperHex(Value, 1));
}

std::string TGDBCommand::CreateDataInfoLineCommand(std::string& Token, const std::string& File, Integer Line) {
  return MiLine(Token, ctDataInfoLine, " " + File + ":" + std::to_string(Line));
}

std::string TGDBCommand::CreateDataInfoLineCommand(std::string& Token, UInt64 Address) {
  return MiLine(Token, ctDataInfoLine, " *" + Hex(Address));
}

std::string TGDBCommand::CreateSymbolListLinesCommand(std::string& Token, const std::string& File, Integer Start,
                                                      Integer Count) {
  std::string Arguments = " " + File;
  if (Start != -1)
    Arguments += " --start " + std::to_string(Start) + " --count " + std::to_string(Count);
  return MiLine(Token, ctSymbolListLines, Arguments);
}

// Program, target and debugger

std::string TGDBCommand::CreateFileExecAndSymbolsCommand(std::string& Token, const std::string& File) {
  return MiLine(Token, ctFileExecAndSymbols, " " + DoubleQuoted(File));
}

std::string TGDBCommand::CreateFileListExecSourceFileCommand(std::string& Token) {
  return MiLine(Token, ctFileListExecSourceFile, "");
}

std::string TGDBCommand::CreateFileListExecSourceFilesCommand(std::string& Token) {
  return MiLine(Token, ctFileListExecSourceFiles, "");
}

std::string TGDBCommand::CreateTargetAttachCommand(std::string& Token, Integer Pid, bool UseCLI) {
  if (UseCLI)
    return CLLine(ctCLProcessAttach, " --pid " + std::to_string(Pid));
  return MiLine(Token, ctTargetAttach, " " + std::to_string(Pid));
}

std::string TGDBCommand::CreateTargetAttachCommand(std::string& Token, const std::string& Name) {
  return MiLine(Token, ctTargetAttach, " " + Name);
}

std::string TGDBCommand::CreateTargetDetachCommand(std::string& Token) { return MiLine(Token, ctTargetDetach, ""); }

std::string TGDBCommand::CreateGDBExitCommand(std::string& Token) { return MiLine(Token, ctGdbExit, ""); }

std::string TGDBCommand::CreateExecAbortCommand(std::string& Token) { return MiLine(Token, ctExecAbort, ""); }

std::string TGDBCommand::CreatePidInfoCommand(std::string& Token) { return MiLine(Token, ctPidInfo, ""); }

std::string TGDBCommand::CreateTargetInfoAsyncCommand(std::string& Token) {
  return MiLine(Token, ctTargetInfoAsync, "");
}

std::string TGDBCommand::CreateGDBSetCommand(std::string& Token, const std::string& Name, const std::string& Value) {
  return MiLine(Token, ctGdbSet, " " + Name + " " + Value);
}

std::string TGDBCommand::CreateGDBShowCommand(std::string& Token, const std::string& Name) {
  return MiLine(Token, ctGdbShow, " " + Name);
}

std::string TGDBCommand::CreateEnableTimingsCommand(std::string& Token, const std::string& Value) {
  return MiLine(Token, ctEnableTimings, " " + Value);
}

std::string TGDBCommand::CreateEnableDebugHookCommand(std::string& Token, const std::string& Value) {
  return MiLine(Token, ctEnableDebugHook, " " + Value);
}

std::string TGDBCommand::CreateInterpreterExecCommand(std::string& Token, TMiCommand Command) {
  // Unquoted, GDB would run each word of "info line" as a command of its own.
  return MiLine(Token, ctInterpreterExec, " console " + DoubleQuoted(CreateCLCommand(Command)));
}

// CLI commands answered through GDB's echo of the line

std::string TGDBCommand::CreateCLInfoLineAddressCommand(std::string& Token, const std::string& File, Integer Line) {
  return EchoedCLLine(Token, ctCLInfoLineAddress, " " + File + ":" + std::to_string(Line));
}

std::string TGDBCommand::CreateCLInfoLineCommand(std::string& Token, const std::string& File, Integer Line) {
  return EchoedCLLine(Token, ctCLInfoLine, " " + File + ":" + std::to_string(Line));
}

std::string TGDBCommand::CreateCLInfoLineCommand(std::string& Token, UInt64 Address) {
  return EchoedCLLine(Token, ctCLInfoLine, " *" + Hex(Address));
}

std::string TGDBCommand::CreateCLInfoLineCommand(std::string& Token, const std::string& Function) {
  return EchoedCLLine(Token, ctCLInfoLine, " " + Function);
}

std::string TGDBCommand::CreateCLSetVariableCommand(std::string& Token, const std::string& Name,
                                                    const std::string& Value) {
  return EchoedCLLine(Token, ctCLSetVariable, " " + Name + " = " + Value);
}

std::string TGDBCommand::CreateCLSetVariableCommand(std::string& Token, const std::string& Name, UInt64 Value) {
  return EchoedCLLine(Token, ctCLSetVariable, " " + Name + " = " + Hex(Value));
}

std::string TGDBCommand::CreateCLSetEnvironmentCommand(std::string& Token, const std::string& Name,
                                                       const std::string& Value, bool IsLLDB) {
  if (IsLLDB)
    return EchoedCLLine(Token, ctCLSetTargetEnvironment, " " + Name + "=" + Value);
  return EchoedCLLine(Token, ctCLSetEnvironment, " " + Name + " = " + Value);
}

std::string TGDBCommand::CreateCLKillCommand(std::string& Token) { return EchoedCLLine(Token, ctCLKill, ""); }

std::string TGDBCommand::CreateCLHandleCommand(std::string& Token, const std::string& Signal, bool Stop, bool Pass,
                                               bool IsLLDB) {
  if (IsLLDB)
    return EchoedCLLine(Token, ctCLProcessHandle,
                        std::string(Stop ? " -s true" : " -s false") + (Pass ? " -p true" : " -p false") + " " +
                            Signal);
  return EchoedCLLine(Token, ctCLHandle,
                      " " + Signal + (Stop ? " stop" : " nostop") + (Pass ? " pass" : " nopass"));
}

std::string TGDBCommand::CreateCLSettingsSetCommand(std::string& Token, const std::string& Name,
                                                    const std::string& Value) {
  return EchoedCLLine(Token, ctCLSettingsSet, " " + Name + " " + Value);
}

std::string TGDBCommand::CreateCLSettingsShowCommand(std::string& Token, const std::string& Name) {
  return EchoedCLLine(Token, ctCLSettingsShow, " " + Name);
}

std::string TGDBCommand::CreateCLCommandSourceCommand(std::string& Token, const std::string& File) {
  return EchoedCLLine(Token, ctCLCommandSource, " " + DoubleQuoted(File));
}

} // namespace midebug
