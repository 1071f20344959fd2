#pragma once
/// \file
/// The commands midebug can send to the debugger and the builder of their
/// command lines. A line is either an MI command behind a numeric token, or a
/// CLI command of GDB or LLDB without one; the builder also gives the wait key
/// under which the reply is expected. No I/O happens here.

#include "platform/types.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace midebug {

/// Every command midebug can issue, as listed in mi/micommands.def. 1 to 109
/// are MI commands, 110 to 123 CLI commands. The ordinal is part of the token,
/// so the values must not move. Three list and three write values share one MI
/// command each: they exist so that the reply decoder can tell which result it
/// is filling.
enum TMiCommand : uint8_t {
#define MI_COMMAND(Enumerator, Text) Enumerator,
#include "mi/micommands.def"
};

/// Number of TMiCommand values.
inline constexpr std::size_t MiCommandCount = 0
#define MI_COMMAND(Enumerator, Text) +1
#include "mi/micommands.def"
    ;

// Tokens carry the ordinal, and so do recorded transcripts: a line inserted
// into the catalogue anywhere but at its end would renumber the commands
// after it.
static_assert(ctExecRun == 25 && ctEnableDebugHook == 109, "MI command ordinals moved");
static_assert(ctCLInfoLineAddress == 110 && ctCLProcessAttach == 123, "CLI command ordinals moved");

/// The text that starts the command's line; empty for ctUnknown and for any
/// value outside the enumeration.
std::string_view MiCommandText(TMiCommand Command);

/// Length of an MI token: the command's ordinal in 3 digits, then the request
/// counter in 10.
inline constexpr std::size_t MiTokenLength = 13;

/// Target processor family.
enum TGDBCPU : uint8_t { gcIA32 = 0, gcARM32 = 1, gcAMD64 = 2, gcARM64 = 3 };

/// Value format of the variable-object, register and memory commands.
enum TDataValueFormat : uint8_t {
  dvfHex = 0,
  dvfOctal = 1,
  dvfBinary = 2,
  dvfDecimal = 3,
  dvfRaw = 4,
  dvfNatural = 5,
};

/// The word the variable-object commands take ("hexadecimal", ...).
std::string_view DataValueFormatWord(TDataValueFormat Format);
/// The letter the register and memory commands take ("x", ...).
std::string_view DataValueFormatLetter(TDataValueFormat Format);

/// How much of each value a listing command returns.
enum TPrintValuesFormat : uint8_t { pvfNoValues = 0, pvfAllValues = 1, pvfSimpleValues = 2 };

/// The option word of a TPrintValuesFormat ("--no-values", ...).
std::string_view PrintValuesFormatWord(TPrintValuesFormat Format);

/// The 16 bytes of one x87 or SSE register, seen in several widths; every
/// view starts at the first byte.
union TXMMFPURegValue {
  Byte ByteReg[16];
  uint16_t WordReg[8];
  int64_t Int64Reg[2];
  uint32_t LongReg;
};

static_assert(sizeof(TXMMFPURegValue) == 16);

/// True when the token is an MI token of -exec-run, the command whose reply
/// tells whether the program could be launched.
bool IsProcessLaunchCommand(const std::string& Token);
/// True when Token is that of a command that resumes a stopped program
/// (continue, a step, finish, until).
bool IsRunControlCommand(const std::string& Token);
/// True when all 16 bytes are equal.
bool XMMRegisterEqual(const TXMMFPURegValue& A, const TXMMFPURegValue& B);
/// An x87 value is compared as an SSE value is: all 16 bytes.
inline constexpr auto& FPURegisterEqual = XMMRegisterEqual;

/// Builds the command lines of one debugged process.
///
/// Every builder returns one line without line end, and sets Token to the wait
/// key of its reply: the MI token for MI commands, or for the CLI commands that
/// GDB echoes in a log record, the line followed by the two characters
/// backslash and "n". The CLI forms of thread select, process attach and
/// register write leave Token as it was.
///
/// No returned line holds a CR or LF: each is written as a blank, so a file
/// name, argument or value can never end the line early and smuggle in a
/// second command.
///
/// Not thread-safe: the request counter is a plain field, so one caller at a
/// time (the process's request lock) builds commands.
class TGDBCommand {
public:
  explicit TGDBCommand(TGDBCPU CPU);

  /// Incremented before each MI command is built, so the first token carries
  /// 1; wraps at 32 bits.
  Cardinal FRequestId = 0;
  /// Minimum number of hexadecimal digits of an address.
  Integer FAddressDigits;
  TGDBCPU FCPUType;

  /// Counts the request and returns its token followed by the command text.
  std::string CreateMiCommand(TMiCommand Command, std::string& Token);
  static std::string CreateCLCommand(TMiCommand Command);
  /// Prepares an expression argument: CR and LF become blanks, a leading "+"
  /// is dropped, a leading "$" of a hexadecimal number becomes "0x" (register
  /// names such as $eax stay), and the result is put in double quotes unless
  /// it is empty or starts with "*". Double quotes and backslashes inside
  /// are escaped, so that a string literal reaches the debugger intact.
  static std::string FixupExpr(const std::string& Expr);

  // Breakpoints
  std::string CreateBreakDeleteCommand(std::string& Token, const std::vector<Integer>& Numbers);
  std::string CreateBreakDisableCommand(std::string& Token, const std::vector<Integer>& Numbers);
  std::string CreateBreakEnableCommand(std::string& Token, const std::vector<Integer>& Numbers);
  /// Pending (-f) lets GDB keep a breakpoint in a library not loaded yet.
  std::string CreateBreakInsertCommand(std::string& Token, const std::string& Location, bool Temporary,
                                       bool Pending);
  /// File:Line, always pending.
  std::string CreateBreakInsertCommand(std::string& Token, const std::string& File, Integer Line,
                                       bool Temporary);
  /// *0xAddress, always pending.
  std::string CreateBreakInsertCommand(std::string& Token, UInt64 Address, bool Temporary);
  /// A write watchpoint unless exactly one of ReadFlag (-r) and AccessFlag
  /// (-a) is set.
  std::string CreateBreakWatchCommand(std::string& Token, const std::string& Expr, bool ReadFlag,
                                      bool AccessFlag);
  /// Watches the memory at Address: "0xADDR^" in Pascal syntax, "*0xADDR" in C.
  std::string CreateBreakWatchCommand(std::string& Token, UInt64 Address, bool ReadFlag, bool AccessFlag,
                                      bool PascalSyntax);
  /// Watches Size bytes at Address, whatever the language GDB is in.
  std::string CreateBreakWatchCommand(std::string& Token, UInt64 Address, Integer Size, bool ReadFlag,
                                      bool AccessFlag);

  // Program arguments, environment and threads
  /// Escape doubles every backslash, for debuggers that read the arguments as
  /// escaped text.
  std::string CreateExecArgumentsCommand(std::string& Token, const std::string& Args, bool Escape);
  std::string CreateExecArgumentsCommand(std::string& Token, const std::vector<std::string>& Args,
                                         bool Escape);
  /// GDB's console "set args", sent as an MI c-string: unlike
  /// "-exec-arguments" it carries line breaks (an argument may hold one).
  std::string CreateSetArgsCommand(std::string& Token, const std::string& Args);
  /// The directory goes in double quotes, escaped as an MI c-string.
  std::string CreateEnvCdCommand(std::string& Token, const std::string& Dir);
  std::string CreateEnvDirCommand(std::string& Token, const std::vector<std::string>& Dirs, bool Reset);
  std::string CreateEnvPathCommand(std::string& Token, const std::vector<std::string>& Paths, bool Reset);
  /// The program's terminal for its next run: a device path, in double
  /// quotes, escaped as an MI c-string.
  std::string CreateInferiorTtySetCommand(std::string& Token, const std::string& TtyPath);
  /// ThreadId -1 asks for every thread.
  std::string CreateThreadInfoCommand(std::string& Token, Integer ThreadId);
  std::string CreateThreadListIdsCommand(std::string& Token);
  /// UseCLI sends LLDB's "thread select" without token; Token is left alone.
  std::string CreateThreadSelectCommand(std::string& Token, Integer ThreadId, bool UseCLI);

  // Run control
  std::string CreateExecContinueCommand(std::string& Token);
  std::string CreateExecFinishCommand(std::string& Token);
  std::string CreateExecInterruptCommand(std::string& Token);
  std::string CreateExecNextCommand(std::string& Token);
  std::string CreateExecNextInstructionCommand(std::string& Token);
  std::string CreateExecReturnCommand(std::string& Token);
  std::string CreateExecStepCommand(std::string& Token);
  std::string CreateExecStepInstructionCommand(std::string& Token);
  /// Start stops the program at main.
  std::string CreateExecRunCommand(std::string& Token, bool Start);
  /// Without a location (empty File or Line -1) runs to the next line.
  std::string CreateExecUntilCommand(std::string& Token, const std::string& File, Integer Line);

  // Stack
  std::string CreateStackInfoFrameCommand(std::string& Token);
  /// MaxDepth -1 counts every frame.
  std::string CreateStackInfoDepthCommand(std::string& Token, Integer MaxDepth);
  /// Low -1 lists every frame.
  std::string CreateStackListArgumentsCommand(std::string& Token, bool NoValues, Integer Low, Integer High);
  /// Low -1 lists every frame.
  std::string CreateStackListFramesCommand(std::string& Token, Integer Low, Integer High);
  std::string CreateStackListLocalsCommand(std::string& Token, TPrintValuesFormat PrintValues);
  std::string CreateStackSelectFrameCommand(std::string& Token, Integer Level);

  // Variable objects. Quoted puts the name in double quotes, escaped as an MI
  // c-string, for debuggers whose names may hold blanks.
  /// Frame 0 evaluates in the current frame ("*").
  std::string CreateVarCreateCommand(std::string& Token, const std::string& Name, const std::string& Expr,
                                     UInt64 Frame);
  /// A variable object for the memory at Address.
  std::string CreateVarCreateCommand(std::string& Token, const std::string& Name, UInt64 Address,
                                     UInt64 Frame);
  std::string CreateVarDeleteCommand(std::string& Token, const std::string& Name, bool ChildrenOnly,
                                     bool Quoted = false);
  std::string CreateVarSetFormatCommand(std::string& Token, const std::string& Name, TDataValueFormat Format,
                                        bool Quoted = false);
  std::string CreateVarInfoNumChildrenCommand(std::string& Token, const std::string& Name);
  std::string CreateVarInfoTypeCommand(std::string& Token, const std::string& Name);
  std::string CreateVarInfoExpressionCommand(std::string& Token, const std::string& Name);
  /// Ranged asks for children 0 to 5000 only.
  std::string CreateVarListChildrenCommand(std::string& Token, const std::string& Name, bool Ranged,
                                           bool Quoted, TPrintValuesFormat PrintValues);
  /// The children From to To - 1 only.
  std::string CreateVarListChildrenCommand(std::string& Token, const std::string& Name, Integer From, Integer To,
                                           bool Quoted, TPrintValuesFormat PrintValues);
  std::string CreateVarInfoPathExpressionCommand(std::string& Token, const std::string& Name, bool Quoted);
  std::string CreateVarShowAttributesCommand(std::string& Token, const std::string& Name, bool Quoted);
  /// dvfRaw writes no format option, leaving the object's own format.
  std::string CreateVarEvaluateExpressionCommand(std::string& Token, const std::string& Name, bool Quoted,
                                                 TDataValueFormat Format);
  /// For GDB the value is sent as an MI c-string, so that blanks, quotes and
  /// backslashes survive GDB's argument splitting; LLDB gets Value as written.
  std::string CreateVarAssignCommand(std::string& Token, const std::string& Name, const std::string& TypeName,
                                     const std::string& Value, bool IsLLDB, bool Quoted = false);
  std::string CreateVarUpdateCommand(std::string& Token, const std::string& Name, TPrintValuesFormat PrintValues,
                                     bool Quoted = false);
  /// Lets pretty printers shape the values of variable objects made after it.
  std::string CreateEnablePrettyPrintingCommand(std::string& Token);

  // Disassembly, expressions, registers, memory
  std::string CreateDataDisassembleCommand(std::string& Token, UInt64 StartAddr, UInt64 EndAddr, Integer Mode);
  std::string CreateDataDisassembleCommand(std::string& Token, UInt64 StartAddr, Integer Count, Integer Mode);
  std::string CreateDataDisassembleCommand(std::string& Token, const std::string& File, Integer Line,
                                           Integer Count, Integer Mode);
  std::string CreateDataEvaluateExpressionCommand(std::string& Token, const std::string& Expr);
  /// An empty list asks for every register.
  std::string CreateDataListRegisterNames(std::string& Token, const std::vector<Integer>& Ids);
  std::string CreateDataListRegisterValues(std::string& Token, const std::vector<Integer>& Ids,
                                           TDataValueFormat Format);
  std::string CreateDataListRegisterValues(std::string& Token, Integer Id, TDataValueFormat Format);
  std::string CreateDataListXMMRegisterValues(std::string& Token, const std::vector<Integer>& Ids,
                                              TDataValueFormat Format);
  std::string CreateDataListXMMRegisterValues(std::string& Token, Integer Id, TDataValueFormat Format);
  std::string CreateDataListFPURegisterValues(std::string& Token, const std::vector<Integer>& Ids,
                                              TDataValueFormat Format);
  std::string CreateDataListFPURegisterValues(std::string& Token, Integer Id, TDataValueFormat Format);
  /// LLDB's "register write" of a named register; Token is left alone.
  std::string CreateDataWriteRegisterValues(std::string& Token, const std::string& Name, UInt64 Value);
  /// "register write" of the general register at position Id of the table the
  /// CPU's register view shows (for AMD64 the "Win64" table names eflags).
  /// Token is left alone. Throws std::out_of_range when Id is outside it.
  std::string CreateDataWriteRegisterValues(std::string& Token, Integer Id, UInt64 Value,
                                            const std::string& Platform);
  /// "register write" of SSE register Id (xmm0 to xmm15 as a byte list, 16 is
  /// mxcsr). Token is left alone. Throws std::out_of_range for an Id outside
  /// AMD64XMMRegisters.
  std::string CreateDataWriteXMMRegisterValues(std::string& Token, Integer Id, const TXMMFPURegValue& Value);
  /// "register write" of x87 register Id (st0 to st7 as a byte list, the
  /// control registers as one number); "OSX64" names the stack stmm0 to stmm7.
  /// Token is left alone. Throws std::out_of_range for an Id outside the table.
  std::string CreateDataWriteFPURegisterValues(std::string& Token, Integer Id, const TXMMFPURegValue& Value,
                                               const std::string& Platform);
  /// UseBytes sends -data-read-memory-bytes instead; AsChar '\0' asks for no
  /// character column.
  std::string CreateDataReadMemoryCommand(std::string& Token, UInt64 Address, Integer Count, bool UseBytes,
                                          Int64 Offset, TDataValueFormat Format, Integer WordSize,
                                          Integer Rows, char AsChar);
  std::string CreateDataReadMemoryBytesCommand(std::string& Token, UInt64 Address, Integer Count,
                                               Int64 Offset);
  /// LLDB's "memory write" of Count bytes, one byte per value; it goes behind
  /// an MI token, which is its wait key.
  std::string CreateDataWriteMemoryBytesCommand(std::string& Token, UInt64 Address, const Byte* Data,
                                                Integer Count);
  /// GDB's "-data-write-memory-bytes" of Count bytes as one hexadecimal
  /// string (GDB has no "memory write").
  std::string CreateGDBDataWriteMemoryBytesCommand(std::string& Token, UInt64 Address, const Byte* Data,
                                                   Integer Count);
  /// GDB's "-data-write-register-values" of the register the debugger
  /// numbers Number; Command tells which register set it belongs to.
  std::string CreateGDBDataWriteRegisterValues(std::string& Token, TMiCommand Command, Integer Number,
                                               UInt64 Value);
  std::string CreateDataInfoLineCommand(std::string& Token, const std::string& File, Integer Line);
  std::string CreateDataInfoLineCommand(std::string& Token, UInt64 Address);
  /// Start -1 lists every line of the file.
  std::string CreateSymbolListLinesCommand(std::string& Token, const std::string& File, Integer Start,
                                           Integer Count);

  // Program, target and debugger
  /// The file goes in double quotes, escaped as an MI c-string.
  std::string CreateFileExecAndSymbolsCommand(std::string& Token, const std::string& File);
  std::string CreateFileListExecSourceFileCommand(std::string& Token);
  std::string CreateFileListExecSourceFilesCommand(std::string& Token);
  /// UseCLI sends LLDB's "process attach --pid" without token; Token is left
  /// alone.
  std::string CreateTargetAttachCommand(std::string& Token, Integer Pid, bool UseCLI);
  std::string CreateTargetAttachCommand(std::string& Token, const std::string& Name);
  std::string CreateTargetDetachCommand(std::string& Token);
  std::string CreateGDBExitCommand(std::string& Token);
  std::string CreateExecAbortCommand(std::string& Token);
  std::string CreatePidInfoCommand(std::string& Token);
  std::string CreateTargetInfoAsyncCommand(std::string& Token);
  std::string CreateGDBSetCommand(std::string& Token, const std::string& Name, const std::string& Value);
  std::string CreateGDBShowCommand(std::string& Token, const std::string& Name);
  std::string CreateEnableTimingsCommand(std::string& Token, const std::string& Value);
  std::string CreateEnableDebugHookCommand(std::string& Token, const std::string& Value);
  /// Runs the bare text of a CLI command through the console interpreter.
  std::string CreateInterpreterExecCommand(std::string& Token, TMiCommand Command);

  // CLI commands answered through GDB's echo of the line
  std::string CreateCLInfoLineAddressCommand(std::string& Token, const std::string& File, Integer Line);
  /// GDB's "info line" for a line ("FILE:LINE") or an address ("*0x...").
  std::string CreateCLInfoLineCommand(std::string& Token, const std::string& File, Integer Line);
  std::string CreateCLInfoLineCommand(std::string& Token, UInt64 Address);
  /// "info line" for a function's name.
  std::string CreateCLInfoLineCommand(std::string& Token, const std::string& Function);
  std::string CreateCLSetVariableCommand(std::string& Token, const std::string& Name, const std::string& Value);
  std::string CreateCLSetVariableCommand(std::string& Token, const std::string& Name, UInt64 Value);
  /// LLDB sets the variable in the target's environment ("NAME=VALUE").
  std::string CreateCLSetEnvironmentCommand(std::string& Token, const std::string& Name,
                                            const std::string& Value, bool IsLLDB);
  std::string CreateCLKillCommand(std::string& Token);
  std::string CreateCLHandleCommand(std::string& Token, const std::string& Signal, bool Stop, bool Pass,
                                    bool IsLLDB);
  std::string CreateCLSettingsSetCommand(std::string& Token, const std::string& Name, const std::string& Value);
  std::string CreateCLSettingsShowCommand(std::string& Token, const std::string& Name);
  /// LLDB's "command source"; the file goes in double quotes, its backslashes
  /// and quotes escaped.
  std::string CreateCLCommandSourceCommand(std::string& Token, const std::string& File);

private:
  /// "0x" and the address in upper-case hex, at least FAddressDigits digits.
  std::string Hex(UInt64 Address) const;
  /// Token, command text and Arguments, as one line.
  std::string MiLine(std::string& Token, TMiCommand Command, std::string_view Arguments);
  /// Command text and Arguments as one line; Token becomes the echo key.
  static std::string EchoedCLLine(std::string& Token, TMiCommand Command, std::string_view Arguments);
  /// Command text and Arguments as one line; Token is untouched.
  static std::string CLLine(TMiCommand Command, std::string_view Arguments);
  std::string DataListRegisterValues(std::string& Token, TMiCommand Command, const std::vector<Integer>& Ids,
                                     TDataValueFormat Format);
  std::string DataListRegisterValues(std::string& Token, TMiCommand Command, Integer Id,
                                     TDataValueFormat Format);
};

} // namespace midebug
