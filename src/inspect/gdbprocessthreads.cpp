// The process's side of threads and call stacks: which thread and frame the
// debugger acts on, the stack depth, and the header lines of the frames.

#include "inspect/gdbthread.h"
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

} // namespace

void TGDBProcess::SetSuspendedThread(Integer ThreadId) {
  const bool UseCLI = FKernel->IsLLDB();
  std::string Token;
  const std::string Line = BuildCommand(Token, [ThreadId, UseCLI](TGDBCommand& Builder, std::string& Key) {
    return Builder.CreateThreadSelectCommand(Key, ThreadId, UseCLI);
  });
  TThreadSelectResult Selected(ThreadId);
  if (UseCLI) {
    // LLDB's CLI "thread select" carries no token, so its reply cannot be
    // matched: the location is asked for separately.
    if (!ProcessAsyncRequest(Line))
      return;
    Selected.FFrameIndex = 0;
    Selected.FLocation = GetCurrentLocation();
  } else if (!ProcessSyncRequest(Token, Line, Selected) || Selected.FError || Selected.FTimeOut) {
    // The debugger kept its current thread, and so does the process.
    return;
  }
  std::lock_guard Guard(FThreadLock);
  const TIntfPtr<IGDBThread> Thread = GetThread(ThreadId);
  if (Thread.get() == FZombieThread.get()) {
    FSuspendedThread = nullptr;
    return;
  }
  FSuspendedThread = static_cast<TGDBThread*>(Thread.get());
  FSuspendedThread->FLocation = Selected.FLocation;
  FSuspendedThread->FFrameIndex = Selected.FFrameIndex;
}

void TGDBProcess::SetSuspendedThreadFrame(Integer Frame) {
  std::string Token;
  ProcessAsyncRequest(BuildCommand(Token, [Frame](TGDBCommand& Builder, std::string& Key) {
    return Builder.CreateStackSelectFrameCommand(Key, Frame);
  }));
  // The debugger answers in order, so the frame asked for next is the one
  // just selected. The request runs without the thread lock: the output
  // thread takes it while it reads the reply.
  const TGDBLocation Location = GetCurrentLocation();
  std::lock_guard Guard(FThreadLock);
  if (!FSuspendedThread)
    return;
  FSuspendedThread->FFrameIndex = Frame;
  FSuspendedThread->FLocation = Location;
}

Integer TGDBProcess::GetCallCount() {
  std::string Token;
  const std::string Line = BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) {
    return Builder.CreateStackInfoDepthCommand(Key, MaxCallFrames);
  });
  TStackInfoDepthResult Depth;
  if (!ProcessSyncRequest(Token, Line, Depth) || Depth.FError || Depth.FTimeOut)
    return 0;
  return std::clamp(Depth.FStackDepth, 0, MaxCallFrames);
}

void TGDBProcess::GetCallHeaders(TStackFrameArray& Frames) {
  Frames.clear();
  Integer Digits = 0;
  std::string Token;
  const std::string FramesLine = BuildCommand(Token, [&Digits](TGDBCommand& Builder, std::string& Key) {
    Digits = Builder.FAddressDigits;
    return Builder.CreateStackListFramesCommand(Key, 0, MaxCallFrames - 1);
  });
  TStackListFramesResult Listed;
  if (!ProcessSyncRequest(Token, FramesLine, Listed) || Listed.FError || Listed.FTimeOut)
    return;
  Frames = std::move(Listed.FStackFrames);

  const std::string ArgumentsLine = BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) {
    return Builder.CreateStackListArgumentsCommand(Key, false, 0, MaxCallFrames - 1);
  });
  TStackListArgumentsResult Arguments;
  // Without arguments the frames keep their bare function names.
  if (!ProcessSyncRequest(Token, ArgumentsLine, Arguments) || Arguments.FError || Arguments.FTimeOut)
    return;

  const bool Pascal = FLanguage == glPascal;
  const size_t Count = std::min(Arguments.FStackArguments.size(), Frames.size());
  for (size_t Index = 0; Index < Count; ++Index) {
    TGDBStackFrame& Frame = Frames[Index];
    const TNameValueArray& Values = Arguments.FStackArguments[Index].NameValues;
    if (Pascal) {
      Frame.Header = PascalHeader(Frame, Values, Digits);
    } else {
      if (Index == 0)
        Frame.Location = FixupInlineLocation(Frame.Location);
      Frame.Header = CHeader(Frame, Values, Digits);
    }
    Frame.Params.clear();
    for (const TNameValue& Value : Values)
      Frame.Params.push_back(Value.Name);
  }
}

} // namespace midebug
