#pragma once
/// \file
/// What the debugger's replies are decoded into: the plain records shared by
/// results, events and the process layer, and the result objects that carry
/// one synchronous request each.

#include "mi/gdbcommand.h"
#include "platform/types.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace midebug {

// ---------------------------------------------------------------------------
// Shared records

struct TNameValue {
  std::string Name;
  std::string Value;
};

struct TGDBLocation {
  /// Source line; 0 when the location has no source.
  Integer Line = 0;
  std::string Source;
  UInt64 Address = 0;
};

struct TGDBModule {
  Integer Id = 0;
  std::string Name;
  UInt64 BaseAddress = 0;
  UInt64 EntryPoint = 0;
  std::string Kind;
  std::string Path;
  /// Path of the symbol file.
  std::string SymPath;
};

struct TGDBException {
  TGDBLocation Location;
  std::string Name;
  std::string Desc;
  /// Address of the exception object.
  UInt64 EObject = 0;
  Integer Kind = 0;
};

using TInt64Array = std::vector<Int64>;
using TUInt64Array = std::vector<UInt64>;
using TDataByteArray = std::vector<Byte>;
using TXMMRegValueArray = std::vector<TXMMFPURegValue>;
using TFPURegValueArray = std::vector<TXMMFPURegValue>;
using TNameValueArray = std::vector<TNameValue>;
using TGDBLocationArray = std::vector<TGDBLocation>;

struct TGDBStackFrame {
  TGDBLocation Location;
  /// The frame's function text.
  std::string Header;
  TStringArray Params;
};

/// The arguments of one frame.
struct TGDBStackArgument {
  TNameValueArray NameValues;
};

struct TGDBVarChild {
  /// Name of the child's variable object.
  std::string Name;
  std::string Expr;
  Integer NumChild = 0;
  std::string VarType;
  /// A pretty printer's object: its children are counted by listing them.
  bool Dynamic = false;
};

struct TGDBDisassembleData {
  UInt64 Address = 0;
  /// Instruction length in bytes.
  Integer Size = 0;
  /// Instruction text.
  std::string AsmData;
  Integer Line = 0;
  std::string Source;
  /// Bytes from the start of the function holding it; -1 when not told.
  Integer FunctionOffset = -1;
  /// The function holding it and the instruction's bytes in hexadecimal
  /// ("48 89 e5"), where the debugger tells them.
  std::string FunctionName;
  std::string Opcodes;
};

using TStackFrameArray = std::vector<TGDBStackFrame>;
using TStackArgumentArray = std::vector<TGDBStackArgument>;
using TGDBVarChildArray = std::vector<TGDBVarChild>;
using TGDBDisassembleDataArray = std::vector<TGDBDisassembleData>;

/// The "nothing" values handed out where a location, exception or module is
/// asked for but none exists. Kind and Id -1 tell them apart from real ones.
inline const TGDBLocation DummyLocation{};
inline const TGDBException DummyException = [] {
  TGDBException Exception;
  Exception.Kind = -1;
  return Exception;
}();
inline const TGDBModule DummyModule = [] {
  TGDBModule Module;
  Module.Id = -1;
  return Module;
}();
inline const TXMMFPURegValue DummyXMMRegValue{};
/// x87 and SSE registers read as the same 16 zero bytes.
inline const TXMMFPURegValue& DummyFPURegValue = DummyXMMRegValue;

// ---------------------------------------------------------------------------
// Result objects

/// The reply of one synchronous request. The requester creates the subclass
/// that matches its command and registers it as a wait object; the output
/// parser decodes the reply into it and completes it; the requester then
/// reads the fields and frees it.
///
/// Threads: the parser writes the fields on the output thread and then calls
/// Complete(); the requester reads them after it has seen FAvailable true
/// under the monitor (WaitAvailable does this), so the monitor orders the
/// writes before the reads. FAvailable itself is atomic so that it can also
/// be polled without the monitor; FError, FErrorMessage, FTimeOut and the
/// subclass fields are plain and must only be read once the object is
/// available or timed out.
class TGDBResult {
public:
  explicit TGDBResult(TMiCommand Command);
  virtual ~TGDBResult() = default;

  TGDBResult(const TGDBResult&) = delete;
  TGDBResult& operator=(const TGDBResult&) = delete;

  /// Stores the message with the debugger's C-string escapes \n and \t
  /// turned into CR LF and three blanks. Leaves FError alone.
  void SetErrorMessage(const std::string& Msg);

  /// The reply has been decoded: under the monitor, sets FAvailable and wakes
  /// every waiter.
  void Complete();
  /// Wakes every waiter without completing the object (the debugger went
  /// away, or a fatal error ended all waits).
  void Pulse();
  /// Waits up to TimeOut for Complete(); true when the object is available.
  bool WaitAvailable(std::chrono::milliseconds TimeOut);

  /// The monitor for waits with conditions of their own: hold Monitor() and
  /// wait on MonitorSignal(), which Complete() and Pulse() notify.
  std::mutex& Monitor() { return FMonitor; }
  std::condition_variable& MonitorSignal() { return FMonitorSignal; }

  std::atomic<bool> FAvailable{false};
  TMiCommand FCommand;
  bool FError = false;
  std::string FErrorMessage;
  bool FTimeOut = false;

private:
  std::mutex FMonitor;
  std::condition_variable FMonitorSignal;
};

class TBreakInsertResult : public TGDBResult {
public:
  /// FError stays true until a reply has been decoded.
  TBreakInsertResult();
  Integer FBreakpoint = -1;
  TAddressArray FAddresses;
  TGDBLocation FLocation;
  /// Each location of a breakpoint GDB resolved to several places, beside
  /// FAddresses.
  TGDBLocationArray FLocations;
  /// GDB keeps the breakpoint for a file, function or library it does not
  /// know yet ("<PENDING>"): no error, but nothing is inserted.
  bool FPending = false;
};

class TBreakWatchResult : public TGDBResult {
public:
  TBreakWatchResult();
  Integer FBreakpoint = -1;
  TGDBLocation FLocation;
};

class TFileExecAndSymbolsResult : public TGDBResult {
public:
  TFileExecAndSymbolsResult();
};

class TSymbolListLinesResult : public TGDBResult {
public:
  explicit TSymbolListLinesResult(bool IncludeAddress);
  TIntegerArray FLines;
  TAddressArray FAddresses;
  bool FIncludeAddress;
};

/// The source files of the program and its libraries, each by its full
/// name where the debugger knows one, once each.
class TFileListExecSourceFilesResult : public TGDBResult {
public:
  TFileListExecSourceFilesResult();
  TStringArray FFiles;
};

class TTargetAttachResult : public TGDBResult {
public:
  TTargetAttachResult();
};

class TExecRunResult : public TGDBResult {
public:
  TExecRunResult();
};

class TThreadListIdsResult : public TGDBResult {
public:
  TThreadListIdsResult();
  TIntegerArray FIds;
  TIntegerArray FOsIds;
  TStringArray FNames;
  TStringArray FStates;
};

class TThreadInfoResult : public TGDBResult {
public:
  explicit TThreadInfoResult(bool StateOnly);
  /// Shortens a thread's target name to what follows its first blank
  /// ("Thread 0x1a2b" gives "0x1a2b"), else its first full stop
  /// ("main.worker" gives "worker"), else leaves it unchanged.
  static std::string FixupName(const std::string& Name);
  TIntegerArray FIds;
  TStringArray FNames;
  TStringArray FStates;
  TGDBLocationArray FLocations;
  bool FStateOnly;
};

class TPidInfoResult : public TGDBResult {
public:
  TPidInfoResult();
  Integer FPid = 0;
};

class TTargetInfoAsyncResult : public TGDBResult {
public:
  TTargetInfoAsyncResult();
  bool FAsyncTarget = false;
};

class TThreadSelectResult : public TGDBResult {
public:
  explicit TThreadSelectResult(Integer ThreadId);
  Integer FThreadId;
  TGDBLocation FLocation;
  Integer FFrameIndex = 0;
};

class TStackInfoDepthResult : public TGDBResult {
public:
  TStackInfoDepthResult();
  Integer FStackDepth = 0;
};

class TStackInfoFrameResult : public TGDBResult {
public:
  TStackInfoFrameResult();
  TGDBLocation FLocation;
};

class TStackListFramesResult : public TGDBResult {
public:
  TStackListFramesResult();
  TStackFrameArray FStackFrames;
};

class TStackListArgumentsResult : public TGDBResult {
public:
  TStackListArgumentsResult();
  TStackArgumentArray FStackArguments;
};

class TStackListLocalsResult : public TGDBResult {
public:
  TStackListLocalsResult();
  /// Names of the local variables.
  TStringArray FStackLocals;
};

/// The CLI "info line" answer comes back as console text; FExpected is the
/// text that precedes the address in it.
class TCLInfoLineAddressResult : public TGDBResult {
public:
  /// FExpected is `line <Line> of "<File>" starts at address ` with File in
  /// lower case.
  TCLInfoLineAddressResult(const std::string& File, Integer Line);
  std::string FExpected;
  UInt64 FAddress = 0;
};

class TCLKillResult : public TGDBResult {
public:
  TCLKillResult();
};

class TDataInfoLineResult : public TGDBResult {
public:
  TDataInfoLineResult();
  /// A result read from another command's answer.
  explicit TDataInfoLineResult(TMiCommand Command) : TGDBResult(Command) {}
  /// Bytes of code of the line: FEndAddr - FStartAddr, or 0 when the reply
  /// gave no end beyond the start.
  UInt64 GetSize() const;
  std::string FSource;
  Integer FLine = 0;
  UInt64 FStartAddr = 0;
  UInt64 FEndAddr = 0;
};

/// GDB's console answer to "info line": the line's file as GDB names it,
/// the line, its code range and the function the range starts in. A line
/// without code, an address without line information and a refusal leave
/// FEndAddr 0 and FMessage GDB's words.
class TCLInfoLineResult : public TDataInfoLineResult {
public:
  TCLInfoLineResult() : TDataInfoLineResult(ctCLInfoLine) {}
  std::string FFunction;
  std::string FMessage;
};

class TVarCreateResult : public TGDBResult {
public:
  TVarCreateResult();
  std::string FName;
  Integer FNumChild = 0;
  std::string FType;
  bool FEditable = false;
  std::string FValue;
  bool FValueDefined = false;
  /// A pretty printer's object: FNumChild is 0 and its children are counted
  /// by listing them until FHasMore is false.
  bool FDynamic = false;
  bool FHasMore = false;
  /// The printer's hint ("map", "array", "string"); empty without one.
  std::string FDisplayHint;
};

class TVarEvaluateExpressionResult : public TGDBResult {
public:
  TVarEvaluateExpressionResult();
  std::string FValue;
};

class TVarShowAttributesResult : public TGDBResult {
public:
  TVarShowAttributesResult();
  bool FEditable = false;
};

class TVarAssignResult : public TGDBResult {
public:
  TVarAssignResult();
  std::string FValue;
};

class TVarInfoNumChildrenResult : public TGDBResult {
public:
  TVarInfoNumChildrenResult();
  Integer FCount = 0;
};

class TVarListChildrenResult : public TGDBResult {
public:
  TVarListChildrenResult();
  TGDBVarChildArray FChildren;
  /// Children remain past the window listed.
  bool FHasMore = false;
};

class TVarInfoPathExpressionResult : public TGDBResult {
public:
  TVarInfoPathExpressionResult();
  std::string FExpr;
};

class TVarUpdateResult : public TGDBResult {
public:
  TVarUpdateResult();
  TNameValueArray FChangeList;
  bool FOutOfScope = false;
};

class TExecAbortResult : public TGDBResult {
public:
  TExecAbortResult();
};

class TTargetDetachResult : public TGDBResult {
public:
  TTargetDetachResult();
};

class TDataReadMemoryResult : public TGDBResult {
public:
  /// Bytes chooses "-data-read-memory-bytes" over "-data-read-memory".
  explicit TDataReadMemoryResult(bool Bytes);
  TDataByteArray FData;
};

/// Memory is written with a CLI command whose answer, when it gives one,
/// is checked against the expected count.
class TDataWriteMemoryBytesResult : public TGDBResult {
public:
  TDataWriteMemoryBytesResult(Integer Count, bool Expect);
  Integer FBytesWritten;
};

class TDataDisassembleResult : public TGDBResult {
public:
  explicit TDataDisassembleResult(bool IncludeSource);
  TGDBDisassembleDataArray FData;
  bool FIncludeSource;
};

/// General register values, asked for by a list of ids or one id.
class TDataListRegisterValuesResult : public TGDBResult {
public:
  /// The ids come in table order, so the flags register (last in the ARM
  /// tables) is the last position: FCpsrIndex is Ids.size() - 1.
  explicit TDataListRegisterValuesResult(const TIntegerArray& Ids);
  /// FCpsrIndex 0 when the one register is the flags register, else -1.
  TDataListRegisterValuesResult(Integer Id, bool HasCpsr);
  TUInt64Array FValues;
  TIntegerArray FIds;
  Integer FId = 0;
  UInt64 FValue = 0;
  /// Which requested position holds cpsr, whose value the debugger wraps in
  /// braces with extra fields; -1 for none.
  Integer FCpsrIndex;
};

/// x87 or SSE register values, 16 bytes each, asked for by a list of ids or
/// one id. The two differ only in their command, by which the reply decoder
/// knows what it is filling.
template <TMiCommand Command>
class TDataListVectorRegisterValuesResult : public TGDBResult {
public:
  explicit TDataListVectorRegisterValuesResult(const TIntegerArray& Ids) : TGDBResult(Command), FIds(Ids) {}
  explicit TDataListVectorRegisterValuesResult(Integer Id) : TGDBResult(Command), FId(Id) {}
  std::vector<TXMMFPURegValue> FValues;
  TIntegerArray FIds;
  Integer FId = 0;
  TXMMFPURegValue FValue{};
};

class TDataListXMMRegisterValuesResult : public TDataListVectorRegisterValuesResult<ctDataListXMMRegisterValues> {
public:
  using TDataListVectorRegisterValuesResult::TDataListVectorRegisterValuesResult;
};

class TDataListFPURegisterValuesResult : public TDataListVectorRegisterValuesResult<ctDataListFPURegisterValues> {
public:
  using TDataListVectorRegisterValuesResult::TDataListVectorRegisterValuesResult;
};

/// The register tables shown for a CPU and platform, and the debugger's own
/// register names, which give the debugger's number of each table entry.
class TDataListRegisterNamesResult : public TGDBResult {
public:
  /// Platform is the target platform name ("Win64", "OSX64", ...).
  TDataListRegisterNamesResult(TGDBCPU CPU, const std::string& Platform);

  /// The debugger's register number of each entry of FRegisters,
  /// FFPURegisters and FXMMRegisters; 0 for a name the debugger did not list.
  TIntegerArray GetRegisterIds() const;
  TIntegerArray GetFPURegisterIds() const;
  TIntegerArray GetXMMRegisterIds() const;

  TStringArray FRegisters;
  TStringArray FFPURegisters;
  TStringArray FXMMRegisters;
  /// The debugger's names in its numbering; empty names keep their place so
  /// that positions equal register numbers.
  TStringArray FNames;
};

class TDataEvaluateExpressionResult : public TGDBResult {
public:
  TDataEvaluateExpressionResult();
  std::string FValue;
};

class TGdbShowResult : public TGDBResult {
public:
  TGdbShowResult();
  std::string FValue;
};

} // namespace midebug
