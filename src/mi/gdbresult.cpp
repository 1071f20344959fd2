#include "mi/gdbresult.h"

#include <algorithm>
#include <cstddef>
#include <utility>

namespace midebug {

// ---------------------------------------------------------------------------
// TGDBResult

TGDBResult::TGDBResult(TMiCommand Command) : FCommand(Command) {}

void TGDBResult::SetErrorMessage(const std::string& Msg) {
  // The message arrives with GDB's C-string escapes still in it. An escaped
  // backslash is kept as it is, so that "\\n" in a Windows path does not
  // become a line break.
  std::string Message;
  Message.reserve(Msg.size() + 8);
  for (std::size_t Pos = 0; Pos < Msg.size(); ++Pos) {
    const char Current = Msg[Pos];
    const char Next = Pos + 1 < Msg.size() ? Msg[Pos + 1] : '\0';
    if (Current != '\\' || Pos + 1 >= Msg.size()) {
      Message += Current;
      continue;
    }
    if (Next == 'n')
      Message += "\r\n";
    else if (Next == 't')
      Message += "   ";
    else
      Message.append(Msg, Pos, 2);
    ++Pos;
  }
  FErrorMessage = std::move(Message);
}

void TGDBResult::Complete() {
  std::lock_guard Lock(FMonitor);
  FAvailable.store(true);
  FMonitorSignal.notify_all();
}

void TGDBResult::Pulse() {
  std::lock_guard Lock(FMonitor);
  FMonitorSignal.notify_all();
}

bool TGDBResult::WaitAvailable(std::chrono::milliseconds TimeOut) {
  std::unique_lock Lock(FMonitor);
  return FMonitorSignal.wait_for(Lock, TimeOut, [this] { return FAvailable.load(); });
}

// ---------------------------------------------------------------------------
// Result classes

TBreakInsertResult::TBreakInsertResult() : TGDBResult(ctBreakInsert) { FError = true; }

TBreakWatchResult::TBreakWatchResult() : TGDBResult(ctBreakWatch) { FError = true; }

TFileExecAndSymbolsResult::TFileExecAndSymbolsResult() : TGDBResult(ctFileExecAndSymbols) {}

TSymbolListLinesResult::TSymbolListLinesResult(bool IncludeAddress)
    : TGDBResult(ctSymbolListLines), FIncludeAddress(IncludeAddress) {}

TTargetAttachResult::TTargetAttachResult() : TGDBResult(ctTargetAttach) {}

TExecRunResult::TExecRunResult() : TGDBResult(ctExecRun) {}

TThreadListIdsResult::TThreadListIdsResult() : TGDBResult(ctThreadListIds) {}

TThreadInfoResult::TThreadInfoResult(bool StateOnly) : TGDBResult(ctThreadInfo), FStateOnly(StateOnly) {}

std::string TThreadInfoResult::FixupName(const std::string& Name) {
  std::size_t Separator = Name.find(' ');
  if (Separator == std::string::npos)
    Separator = Name.find('.');
  if (Separator == std::string::npos)
    return Name;
  return Name.substr(Separator + 1);
}

TPidInfoResult::TPidInfoResult() : TGDBResult(ctPidInfo) {}

TTargetInfoAsyncResult::TTargetInfoAsyncResult() : TGDBResult(ctTargetInfoAsync) {}

TThreadSelectResult::TThreadSelectResult(Integer ThreadId) : TGDBResult(ctThreadSelect), FThreadId(ThreadId) {}

TStackInfoDepthResult::TStackInfoDepthResult() : TGDBResult(ctStackInfoDepth) {}

TStackInfoFrameResult::TStackInfoFrameResult() : TGDBResult(ctStackInfoFrame) {}

TStackListFramesResult::TStackListFramesResult() : TGDBResult(ctStackListFrames) {}

TStackListArgumentsResult::TStackListArgumentsResult() : TGDBResult(ctStackListArguments) {}

TStackListLocalsResult::TStackListLocalsResult() : TGDBResult(ctStackListLocals) {}

TCLInfoLineAddressResult::TCLInfoLineAddressResult(const std::string& File, Integer Line)
    : TGDBResult(ctCLInfoLineAddress) {
  // Only ASCII letters are folded, so UTF-8 file names keep their bytes.
  std::string LowerFile = File;
  for (char& Letter : LowerFile)
    if (Letter >= 'A' && Letter <= 'Z')
      Letter = static_cast<char>(Letter - 'A' + 'a');
  FExpected = "line " + std::to_string(Line) + " of \"" + LowerFile + "\" starts at address ";
}

TCLKillResult::TCLKillResult() : TGDBResult(ctCLKill) {}

TDataInfoLineResult::TDataInfoLineResult() : TGDBResult(ctDataInfoLine) {}

UInt64 TDataInfoLineResult::GetSize() const {
  // A reply without an end address must not turn into a size near 2^64.
  if (FEndAddr <= FStartAddr)
    return 0;
  return FEndAddr - FStartAddr;
}

TVarCreateResult::TVarCreateResult() : TGDBResult(ctVarCreate) {}

TVarEvaluateExpressionResult::TVarEvaluateExpressionResult() : TGDBResult(ctVarEvaluateExpression) {}

TVarShowAttributesResult::TVarShowAttributesResult() : TGDBResult(ctVarShowAttributes) {}

TVarAssignResult::TVarAssignResult() : TGDBResult(ctVarAssign) {}

TVarInfoNumChildrenResult::TVarInfoNumChildrenResult() : TGDBResult(ctVarInfoNumChildren) {}

TVarListChildrenResult::TVarListChildrenResult() : TGDBResult(ctVarListChildren) {}

TVarInfoPathExpressionResult::TVarInfoPathExpressionResult() : TGDBResult(ctVarInfoPathExpression) {}

TVarUpdateResult::TVarUpdateResult() : TGDBResult(ctVarUpdate) {}

TExecAbortResult::TExecAbortResult() : TGDBResult(ctExecAbort) {}

TTargetDetachResult::TTargetDetachResult() : TGDBResult(ctTargetDetach) {}

TDataReadMemoryResult::TDataReadMemoryResult(bool Bytes)
    : TGDBResult(Bytes ? ctDataReadMemoryBytes : ctDataReadMemory) {}

TDataWriteMemoryBytesResult::TDataWriteMemoryBytesResult(Integer Count, bool Expect)
    : TGDBResult(Expect ? ctCLMemoryWrite : ctUnknown), FBytesWritten(Expect ? Count : 0) {}

TDataDisassembleResult::TDataDisassembleResult(bool IncludeSource)
    : TGDBResult(ctDataDisassemble), FIncludeSource(IncludeSource) {}

TDataListRegisterValuesResult::TDataListRegisterValuesResult(const TIntegerArray& Ids)
    : TGDBResult(ctDataListRegisterValues), FIds(Ids), FCpsrIndex(static_cast<Integer>(Ids.size()) - 1) {}

TDataListRegisterValuesResult::TDataListRegisterValuesResult(Integer Id, bool HasCpsr)
    : TGDBResult(ctDataListRegisterValues), FId(Id), FCpsrIndex(HasCpsr ? 0 : -1) {}

TDataListXMMRegisterValuesResult::TDataListXMMRegisterValuesResult(const TIntegerArray& Ids)
    : TGDBResult(ctDataListXMMRegisterValues), FIds(Ids) {}

TDataListXMMRegisterValuesResult::TDataListXMMRegisterValuesResult(Integer Id)
    : TGDBResult(ctDataListXMMRegisterValues), FId(Id) {}

TDataListFPURegisterValuesResult::TDataListFPURegisterValuesResult(const TIntegerArray& Ids)
    : TGDBResult(ctDataListFPURegisterValues), FIds(Ids) {}

TDataListFPURegisterValuesResult::TDataListFPURegisterValuesResult(Integer Id)
    : TGDBResult(ctDataListFPURegisterValues), FId(Id) {}

TDataEvaluateExpressionResult::TDataEvaluateExpressionResult() : TGDBResult(ctDataEvaluateExpression) {}

TGdbShowResult::TGdbShowResult() : TGDBResult(ctGdbShow) {}

// ---------------------------------------------------------------------------
// TDataListRegisterNamesResult

namespace {

template <std::size_t Count>
TStringArray TableCopy(const std::array<std::string_view, Count>& Table) {
  return TStringArray(Table.begin(), Table.end());
}

/// The other name of the x86-64 flags register. GDB calls it eflags on
/// every platform, LLDB rflags except on Windows; without the alias the flags
/// entry would show register 0 (rax) under GDB on Linux.
std::string_view FlagsRegisterAlias(std::string_view Name) {
  if (Name == "rflags")
    return "eflags";
  if (Name == "eflags")
    return "rflags";
  return {};
}

} // namespace

TDataListRegisterNamesResult::TDataListRegisterNamesResult(TGDBCPU CPU, const std::string& Platform)
    : TGDBResult(ctDataListRegisterNames) {
  switch (CPU) {
  case gcIA32:
    FRegisters = TableCopy(IA32Registers);
    return;
  case gcARM32:
    FRegisters = TableCopy(ARM32Registers);
    return;
  case gcARM64:
    FRegisters = TableCopy(ARM64Registers);
    return;
  case gcAMD64:
    // Only the plain Windows debugger says eflags; "Win64x" targets are
    // debugged by an LLDB that says rflags.
    FRegisters = TableCopy(Platform == "Win64" ? winAMD64Registers : AMD64Registers);
    FFPURegisters = TableCopy(Platform == "OSX64" ? macAMD64FPURegisters : AMD64FPURegisters);
    FXMMRegisters = TableCopy(AMD64XMMRegisters);
    return;
  }
}

TIntegerArray TDataListRegisterNamesResult::GetRegisterIds() const { return MapToDebuggerIds(FRegisters); }

TIntegerArray TDataListRegisterNamesResult::GetFPURegisterIds() const { return MapToDebuggerIds(FFPURegisters); }

TIntegerArray TDataListRegisterNamesResult::GetXMMRegisterIds() const { return MapToDebuggerIds(FXMMRegisters); }

TIntegerArray TDataListRegisterNamesResult::MapToDebuggerIds(const TStringArray& Table) const {
  // Debuggers list the registers mostly in table order with others between
  // them: try the place after the last match first, then search from the
  // start for any other order.
  TIntegerArray Ids(Table.size(), 0);
  std::size_t Cursor = 0;
  for (std::size_t Entry = 0; Entry < Table.size(); ++Entry) {
    if (Cursor < FNames.size() && FNames[Cursor] == Table[Entry]) {
      Ids[Entry] = static_cast<Integer>(Cursor);
      ++Cursor;
      continue;
    }
    auto Found = std::find(FNames.begin(), FNames.end(), Table[Entry]);
    if (Found == FNames.end()) {
      const std::string_view Alias = FlagsRegisterAlias(Table[Entry]);
      if (!Alias.empty())
        Found = std::find(FNames.begin(), FNames.end(), Alias);
    }
    if (Found == FNames.end())
      continue;
    const auto Position = static_cast<std::size_t>(Found - FNames.begin());
    Ids[Entry] = static_cast<Integer>(Position);
    Cursor = Position + 1;
  }
  return Ids;
}

// ---------------------------------------------------------------------------
// Register name tables


const std::array<std::string_view, 16> IA32Registers = {
    "eax", "ebx", "ecx", "edx", "esi", "edi", "ebp", "esp",
    "eip", "eflags", "cs", "ss", "ds", "es", "gs", "fs",
};

const std::array<std::string_view, 24> AMD64Registers = {
    "rax", "rbx", "rcx", "rdx", "rsi", "rdi", "r8", "r9", "r10", "r11", "r12", "r13",
    "r14", "r15", "rbp", "rsp", "rip", "rflags", "cs", "ss", "ds", "es", "gs", "fs",
};

const std::array<std::string_view, 24> winAMD64Registers = {
    "rax", "rbx", "rcx", "rdx", "rsi", "rdi", "r8", "r9", "r10", "r11", "r12", "r13",
    "r14", "r15", "rbp", "rsp", "rip", "eflags", "cs", "ss", "ds", "es", "gs", "fs",
};

const std::array<std::string_view, 17> ARM32Registers = {
    "r0", "r1", "r2", "r3", "r4", "r5", "r6", "r7", "r8",
    "r9", "r10", "r11", "r12", "sp", "lr", "pc", "cpsr",
};

const std::array<std::string_view, 34> ARM64Registers = {
    "x0",  "x1",  "x2",  "x3",  "x4",  "x5",  "x6",  "x7",  "x8",  "x9",  "x10", "x11",
    "x12", "x13", "x14", "x15", "x16", "x17", "x18", "x19", "x20", "x21", "x22", "x23",
    "x24", "x25", "x26", "x27", "x28", "fp",  "lr",  "sp",  "pc",  "cpsr",
};

const std::array<std::string_view, 16> AMD64FPURegisters = {
    "st0",   "st1",   "st2",   "st3",   "st4",   "st5",   "st6",   "st7",
    "fctrl", "fstat", "ftag",  "fiseg", "fioff", "foseg", "fooff", "fop",
};

const std::array<std::string_view, 16> macAMD64FPURegisters = {
    "stmm0", "stmm1", "stmm2", "stmm3", "stmm4", "stmm5", "stmm6", "stmm7",
    "fctrl", "fstat", "ftag",  "fiseg", "fioff", "foseg", "fooff", "fop",
};

const std::array<std::string_view, 17> AMD64XMMRegisters = {
    "xmm0", "xmm1", "xmm2",  "xmm3",  "xmm4",  "xmm5",  "xmm6",  "xmm7",  "xmm8",
    "xmm9", "xmm10", "xmm11", "xmm12", "xmm13", "xmm14", "xmm15", "mxcsr",
};

} // namespace midebug
