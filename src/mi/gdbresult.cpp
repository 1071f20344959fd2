#include "mi/gdbresult.h"

#include "mi/gdbregisters.h"

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

TFileListExecSourceFilesResult::TFileListExecSourceFilesResult() : TGDBResult(ctFileListExecSourceFiles) {}

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

TDataEvaluateExpressionResult::TDataEvaluateExpressionResult() : TGDBResult(ctDataEvaluateExpression) {}

TGdbShowResult::TGdbShowResult() : TGDBResult(ctGdbShow) {}

// ---------------------------------------------------------------------------
// TDataListRegisterNamesResult

TDataListRegisterNamesResult::TDataListRegisterNamesResult(TGDBCPU CPU, const std::string& Platform)
    : TGDBResult(ctDataListRegisterNames) {
  FRegisters = GeneralRegisterTable(CPU, Platform).Copy();
  // Only AMD64 has x87 and SSE register views.
  if (CPU != gcAMD64)
    return;
  FFPURegisters = FPURegisterTable(Platform).Copy();
  FXMMRegisters = XMMRegisterTable().Copy();
}

TIntegerArray TDataListRegisterNamesResult::GetRegisterIds() const { return MapRegisterIds(FRegisters, FNames); }

TIntegerArray TDataListRegisterNamesResult::GetFPURegisterIds() const {
  return MapRegisterIds(FFPURegisters, FNames);
}

TIntegerArray TDataListRegisterNamesResult::GetXMMRegisterIds() const {
  return MapRegisterIds(FXMMRegisters, FNames);
}

} // namespace midebug
