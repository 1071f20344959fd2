// Threads and call stacks: the thread table's requests (which thread and
// frame the debugger acts on, the stack depth, the header lines of the
// frames, the refresh of the table) and the process's thread events.

#include "inspect/gdbthreadtable.h"
#include "process/gdbprocess.h"

#include <algorithm>
#include <cstdio>

namespace midebug {

namespace {

/// The address in upper-case hexadecimal, zero-padded to Digits, without
/// "0x": the form the IDE shows in front of a frame.
std::string HeaderAddress(UInt64 Address, Integer Digits) {
  char Buffer[32];
  std::snprintf(Buffer, sizeof Buffer, "%0*llX", static_cast<int>(Digits), static_cast<unsigned long long>(Address));
  return Buffer;
}

bool HasSourceLine(const TGDBLocation& Location) { return !Location.Source.empty() && Location.Line != 0; }

/// Pascal shows a call as the IDE's Pascal evaluator would write it: the
/// argument values alone, "F(1,2)", and no parentheses without arguments.
std::string PascalHeader(const TGDBStackFrame& Frame, const TNameValueArray& Arguments, Integer Digits) {
  std::string Header = Frame.Header;
  if (!HasSourceLine(Frame.Location))
    Header = ":" + HeaderAddress(Frame.Location.Address, Digits) + " " + Header;
  if (Arguments.empty())
    return Header;
  Header += "(";
  for (size_t Index = 0; Index < Arguments.size(); ++Index) {
    if (Index != 0)
      Header += ",";
    Header += Arguments[Index].Value;
  }
  return Header + ")";
}

/// C and C++ show the address first and then the call with named arguments:
/// ":ADDRESS main(argc=1, argv=0x...)".
std::string CHeader(const TGDBStackFrame& Frame, const TNameValueArray& Arguments, Integer Digits) {
  std::string Header = ":" + HeaderAddress(Frame.Location.Address, Digits);
  if (!HasSourceLine(Frame.Location) && Frame.Header.empty())
    return Header + " ;";
  Header += " " + Frame.Header + "(";
  for (size_t Index = 0; Index < Arguments.size(); ++Index) {
    if (Index != 0)
      Header += ", ";
    Header += Arguments[Index].Name + "=" + Arguments[Index].Value;
  }
  return Header + ")";
}

/// Tells a Windows program's language runtime that a debugger is present.
constexpr const char* WindowsDebugHookLine = "expr *((int*)&__CPPdebugHook) = 1";
/// The same for an Android64 program.
constexpr const char* Android64DebugHookLine = "expr -l Tessel -- System.DebugHook := 1";

bool IsEmptyLocation(const TGDBLocation& Location) { return Location.Line == 0 && Location.Address == 0; }

} // namespace

// --- The thread table's requests ---------------------------------------------

TGDBLocation TGDBThreadTable::CurrentLocation() {
  TStackInfoFrameResult Frame;
  if (!FProcess.Requests().Ask(Frame, &TGDBCommand::CreateStackInfoFrameCommand))
    return DummyLocation;
  return FixupInlineLocation(Frame.FLocation);
}

void TGDBThreadTable::Select(Integer ThreadId) {
  const bool UseCLI = FProcess.Kernel().IsLLDB();
  std::string Token;
  const std::string Line = FProcess.Requests().Build(Token, &TGDBCommand::CreateThreadSelectCommand, ThreadId, UseCLI);
  TThreadSelectResult Selected(ThreadId);
  if (UseCLI) {
    // LLDB's CLI "thread select" carries no token, so its reply cannot be
    // matched: the location is asked for separately.
    if (!FProcess.ProcessAsyncRequest(Line))
      return;
    Selected.FFrameIndex = 0;
    Selected.FLocation = CurrentLocation();
  } else if (!FProcess.ProcessSyncRequest(Token, Line, Selected) || Selected.FError || Selected.FTimeOut) {
    // The debugger kept its current thread, and so does the process.
    return;
  }
  SetStopped(ThreadId, Selected.FLocation, tsrNotStopped, Selected.FFrameIndex);
}

void TGDBThreadTable::SelectFrame(Integer Frame) {
  FProcess.Requests().Fire(&TGDBCommand::CreateStackSelectFrameCommand, Frame);
  // The debugger answers in order, so the frame asked for next is the one
  // just selected.
  SetStoppedFrame(Frame, CurrentLocation());
}

Integer TGDBThreadTable::CallCount() {
  TStackInfoDepthResult Depth;
  if (!FProcess.Requests().Ask(Depth, &TGDBCommand::CreateStackInfoDepthCommand, MaxCallDepth + 1))
    return 0;
  return std::clamp(Depth.FStackDepth, 0, MaxCallDepth + 1);
}

bool TGDBThreadTable::CallHeaders(Integer Low, Integer High, TStackFrameArray& Frames) {
  Frames.clear();
  Integer Digits = 0;
  TStackListFramesResult Listed;
  const bool HasFrames = FProcess.Requests().Ask(Listed, [&](TGDBCommand& Builder, std::string& Token) {
    Digits = Builder.FAddressDigits;
    return Builder.CreateStackListFramesCommand(Token, Low, High);
  });
  // The decoder places each frame at the index of its level.
  const size_t First = static_cast<size_t>(Low);
  if (!HasFrames || Listed.FStackFrames.size() <= First)
    return false;
  Frames.assign(std::make_move_iterator(Listed.FStackFrames.begin() + Low),
                std::make_move_iterator(Listed.FStackFrames.end()));

  TStackListArgumentsResult Arguments;
  // Without arguments the frames keep their bare function names.
  if (!FProcess.Requests().Ask(Arguments, &TGDBCommand::CreateStackListArgumentsCommand, false, Low, High))
    return true;
  const bool Pascal = FProcess.GetEvaluator() == glPascal;
  const size_t Count = std::min(Arguments.FStackArguments.size(), First + Frames.size());
  for (size_t Level = First; Level < Count; ++Level) {
    TGDBStackFrame& Frame = Frames[Level - First];
    const TNameValueArray& Values = Arguments.FStackArguments[Level].NameValues;
    if (Pascal) {
      Frame.Header = PascalHeader(Frame, Values, Digits);
    } else {
      if (Level == 0)
        Frame.Location = FixupInlineLocation(Frame.Location);
      Frame.Header = CHeader(Frame, Values, Digits);
    }
    Frame.Params.clear();
    for (const TNameValue& Value : Values)
      Frame.Params.push_back(Value.Name);
  }
  return true;
}

void TGDBThreadTable::RefreshList() {
  TThreadListIdsResult Ids;
  if (!FProcess.Requests().Ask(Ids, &TGDBCommand::CreateThreadListIdsCommand) || !FProcess.FAlive) {
    FProcess.FUpdateThreadState = false;
    return;
  }
  std::vector<Integer> Created;
  std::vector<Integer> Exited;
  Merge(Ids, Created, Exited);
  FProcess.FUpdateThreadState = false;
  const TIntfPtr<IGDBProcessListener>& Listener = FProcess.FProcessListener;
  if (!Listener)
    return;
  for (const Integer Id : Created)
    Listener->ThreadCreated(Id);
  for (const Integer Id : Exited)
    Listener->ThreadExited(Id);
}

void TGDBThreadTable::RefreshStates(bool StateOnly) {
  TGDBKernel& Kernel = FProcess.Kernel();
  if (!Kernel.SupportThreadInfoCommand() || !(FProcess.FAsyncTarget || FProcess.FSuspended))
    return;
  TThreadInfoResult Info(StateOnly);
  // Windows and Android targets, and lldb-mi on Linux, list every thread of
  // a stopped program that has no stop reason of its own as "running".
  const bool ListsStoppedAsRunning =
      Kernel.IsWindows() || Kernel.IsAndroid64() || (Kernel.IsLLDB() && Kernel.IsLinux());
  if (FProcess.Requests().Ask(Info, &TGDBCommand::CreateThreadInfoCommand, -1) && FProcess.FAlive)
    Apply(Info, ListsStoppedAsRunning && FProcess.FSuspended);
  FProcess.FUpdateThreadState = false;
}

bool TGDBThreadTable::StatesStale() const { return FProcess.FUpdateThreadState; }

// --- The process's thread events ---------------------------------------------

TGDBLocation TGDBProcess::GetSuspendedLocation() { return FThreads->StoppedLocation(); }
Integer TGDBProcess::GetSuspendedThreadId() { return FThreads->StoppedId(); }
TIntfPtr<IGDBThread> TGDBProcess::GetThread(Integer Id) { return FThreads->Get(Id); }

void TGDBProcess::DoNotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) {
  // A stop that names no thread is inlined code whose frame lacks the
  // source: the thread is the last one stopped.
  if (ThreadId == -1) {
    ThreadId = FLastSuspendedThreadId;
    FThreads->SetInlineLocation(Location);
  }
  if (!FStoppedAtEntryPoint.exchange(true)) {
    if (!FKernel->IsLLDB()) {
      FThreads->RefreshList();
      // GDB's thread-id list carries neither names nor states.
      FThreads->RefreshStates(false);
    }
    if (FKernel->IsWindows())
      ProcessAsyncRequest(WindowsDebugHookLine);
    if (FKernel->IsAndroid64())
      ProcessAsyncRequest(Android64DebugHookLine);
  } else if (FKernel->SupportThreadNotification()) {
    FThreads->RefreshStates(false);
  } else {
    FThreads->RefreshList();
  }
  const TGDBLocation Stopped = IsEmptyLocation(Location) ? FThreads->CurrentLocation() : Location;
  FThreads->SetStopped(ThreadId, Stopped, Reason);
  if (FProcessListener)
    FProcessListener->ProcessSuspended(ThreadId);
}

void TGDBProcess::SetCurrentSuspendedThread(Integer ThreadId, const TGDBLocation& Location) {
  if (!FKernel->SupportLanguageChangedNotification())
    FLanguage = GetCurrentLanguage();
  FThreads->SetStopped(ThreadId, Location);
}

void TGDBProcess::EnsureThreadCreated(Integer ThreadId) {
  if (FKernel->SupportThreadNotification() || ThreadId == -1)
    return;
  if (FThreads->Add(ThreadId, ThreadId, "", "") && FProcessListener)
    FProcessListener->ThreadCreated(ThreadId);
}

void TGDBProcess::NotifyAllThreadExited() {
  for (const Integer Id : FThreads->Clear())
    if (FProcessListener)
      FProcessListener->ThreadExited(Id);
}

void TGDBProcess::NotifyThreadCreated(Integer ThreadId, Integer OsId) {
  if (!FAlive || (!FKernel->IsLLDB() && !FStoppedAtEntryPoint))
    return;
  if (!FThreads->Add(ThreadId, OsId, "", ""))
    return;
  FThreadCreatedPending.Raise(ThreadId, FDeferIfLive,
                              [this](Integer Id) {
                                if (!FDying && !FRequests.FatalError() && FProcessListener)
                                  FProcessListener->ThreadCreated(Id);
                              });
}

void TGDBProcess::NotifyThreadExited(Integer ThreadId) {
  if (!FKernel->IsLLDB() && !FStoppedAtEntryPoint)
    return;
  // Exits of threads the table did not know wait on the stack for the next
  // delivery; they must not keep later exits from being delivered.
  const bool Known = FThreads->Remove(ThreadId);
  FThreadExitedPending.Raise(
      ThreadId, FDeferIfLive,
      [this](Integer Id) {
        if (FProcessListener)
          FProcessListener->ThreadExited(Id);
      },
      Known);
}

} // namespace midebug
