#include "kernel/gdbkernel.h"

#include "platform/hostfiles.h"
#include "platform/hostinfo.h"
#include "platform/hostthread.h"
#include "platform/quoting.h"
#include "platform/textencoding.h"

#include <cstdio>
#include <cstring>
#include <filesystem>

namespace midebug {

namespace {

constexpr const char* GDBLauncherParams = "--nw --nx  --interpreter=mi2";
constexpr const char* ProcessExitedText = "process exited";
constexpr size_t ReplyBufferStep = 2048;
constexpr size_t ReplyBufferShrinkAbove = 10240;
/// The longest a reader waits on the pipe before it looks at the stop flags.
constexpr int PollIntervalMs = 2;

constexpr Int64 DefaultCapabilities = capThreadNotification | capThreadInfoCommand | capExecAbortCommand |
                                      capExecInterruptCommand | capPidNotification |
                                      (HostEndsLinesWithCRLF ? Int64{capCRLFLineEnds} : Int64{0});

std::string LineEnd(bool CRLF) { return CRLF ? "\r\n" : "\n"; }

} // namespace

TGDBKernel::TGDBKernel(const std::string& LauncherPath, const std::string& CommandFile)
    : FLauncherPath(LauncherPath.empty() ? DefaultDebuggerProgram : LauncherPath),
      FCapabilities(DefaultCapabilities), FLauncherParams(GDBLauncherParams), FCommandFile(CommandFile),
      FGDBEndOfLineMarker("(gdb) " + LineEnd(HostEndsLinesWithCRLF)) {}

TGDBKernel::~TGDBKernel() {
  if (FRunning.exchange(false))
    KillProcess(FProcessHandle);
  // The reader polls the pipe; it must be gone before the pipe is closed, or
  // it could end up reading a descriptor number the host has reused.
  while (FReplyBusy)
    YieldAndSleep(PollIntervalMs);
  FStdInPipe.reset();
  FStdOutPipe.reset();
  if (FProcessHandle > 0) {
    KillProcess(FProcessHandle);
    ReapChildProcess(FProcessHandle);
  }
  if (!FCommandFile.empty()) {
    std::error_code Ignored;
    std::filesystem::remove(FCommandFile, Ignored);
  }
  FAndroidDevice.reset();
  FLogFile.reset();
}

Int64 TGDBKernel::GetCapabilities() { return FCapabilities; }

void TGDBKernel::SetCapabilites(Int64 Value) { FCapabilities = Value; }

std::string TGDBKernel::GetLLDBInitFile() {
  if (!IsWindows() && !IsAndroid64())
    return {};
  std::string Root = HostRootDirectory();
  if (!Root.empty() && Root.back() != PathDelimiter)
    Root += PathDelimiter;
  const std::string InitFile =
      Root + ((FKernelType & ktWindowsX) ? "bin/windows/lldbx/.lldbinit" : "bin/windows/lldb/.lldbinit");
  return FileExists(InitFile) ? InitFile : std::string();
}

std::string TGDBKernel::GetCommandFileOption() { return "-x"; }

bool TGDBKernel::TimeOutExpired(TDateTime& /*Start*/) { return false; }

void TGDBKernel::Terminate(Integer Pid) {
  if (Pid == -1)
    return;
  if (FAndroidDevice)
    FAndroidDevice->Terminate(Pid);
  else
    KillProcess(Pid);
}

void TGDBKernel::Interrupt(Integer /*Pid*/) {}

void TGDBKernel::Log(const std::string& Text, bool NewLine) {
  if (FLogFile)
    FLogFile->Write(Text, NewLine);
}

std::string TGDBKernel::GetCommandLine() {
  std::string CommandLine = DoubleQuoted(FLauncherPath) + " " + FLauncherParams;
  if (!FCommandFile.empty())
    CommandLine += " " + GetCommandFileOption() + " " + DoubleQuoted(FCommandFile);
  return CommandLine;
}

bool TGDBKernel::Start() {
  FLastError.clear();
  if (!ProgramExists(FLauncherPath)) {
    FLastError = "Could not find program, '" + FLauncherPath + "'";
    return false;
  }
  std::fflush(nullptr);

  // The debugger runs in the directory of its program, or of its command
  // file. Only the child's directory is set: the host's own is left alone.
  const std::string WorkingDir = ExtractFileDir(FCommandFile.empty() ? FLauncherPath : FCommandFile);
  const std::string CommandLine = GetCommandLine();

  if (ExtractFileName(FLauncherPath) == LLDBFrontEndFileName) {
    if (FKernelType & ktWindowsTarget) {
      FCapabilities |= capIsWindows | capStopOnEntryPoint;
    } else {
      const TAndroidLLDBInfo Info = AndroidLLDBInfo();
      FAndroidDevice = std::make_unique<TAndroidDevice>(Info.AdbPath, Info.LLDBServerArgs, Info.PsArgs, Info.KillArgs);
      if (!FAndroidDevice->StartLLDBServer()) {
        FLastError = FAndroidDevice->FLastError;
        return false;
      }
      FCapabilities |= capIsAndroid64;
    }
  }

  auto StdInPipe = std::make_unique<TPipe>();
  auto StdOutPipe = std::make_unique<TPipe>();
  TChildProcess Child;
  std::string SystemMessage;
  if (!StdInPipe->Created() || !StdOutPipe->Created()) {
    SystemMessage = SystemErrorMessage(errno);
  } else if (StartChildProcess(SplitCommandLine(CommandLine), WorkingDir, StdInPipe->ReadHandle(),
                               StdOutPipe->WriteHandle(), Child, SystemMessage)) {
    // The child's ends now belong to the child; holding the output pipe's
    // write end here would hide the debugger's end of file.
    StdInPipe->CloseRead();
    StdOutPipe->CloseWrite();
    FStdInPipe = std::move(StdInPipe);
    FStdOutPipe = std::move(StdOutPipe);
    FStdInHandle = FStdInPipe->WriteHandle();
    FStdOutHandle = FStdOutPipe->ReadHandle();
    FProcessHandle = Child.Pid;
    FBuffer.assign(ReplyBufferStep, 0);
    FHeldBytes = 0;
    FRunning = true;
    OpenLogFile();
    return true;
  }
  FLastError = FormatBadExeErrorMessage(SystemMessage, FLauncherPath);
  FRunning = false;
  return false;
}

std::string TGDBKernel::FormatBadExeErrorMessage(const std::string& SystemMessage, const std::string& Path) {
  std::string Message = SystemMessage;
  if (const size_t Placeholder = Message.find("%1"); Placeholder != std::string::npos)
    Message.replace(Placeholder, 2, "%s");
  if (const size_t Placeholder = Message.find("%s"); Placeholder != std::string::npos)
    Message.replace(Placeholder, 2, Path);
  return "Unable to create process: " + Message;
}

void TGDBKernel::OpenLogFile() {
  if (GetEnvironmentVariable("GDB_DEBUG").empty())
    return;
  std::string Dir = GetEnvironmentVariable("GDB_OUTDIR");
  if (!Dir.empty()) {
    Dir = ExpandFileName(Dir);
    if (!DirectoryExists(Dir))
      ForceDirectories(Dir);
  }
  if (Dir.empty() || !DirectoryExists(Dir))
    Dir = HostExecutableDir();
  auto LogFile = std::make_unique<TLogWriter>();
  if (LogFile->Open(Dir + PathDelimiter + "gdb_" + std::to_string(FProcessHandle) + ".log"))
    FLogFile = std::move(LogFile);
}

void TGDBKernel::Stop() { FStopping = true; }

std::string TGDBKernel::GetEndOfLineMarker() {
  const bool CRLF = (GetCapabilities() & capCRLFLineEnds) != 0;
  return (IsLLDB() ? "(gdb)" : "(gdb) ") + LineEnd(CRLF);
}

bool TGDBKernel::SendRequest(const std::string& Command) {
  if (FLogFile)
    FLogFile->Write(Command, true);
  const std::string Line = Command + LineEnd((GetCapabilities() & capCRLFLineEnds) != 0);
  return Write(Line.data(), Line.size()) == static_cast<Int64>(Line.size());
}

Int64 TGDBKernel::Write(const char* Buffer, size_t Count) {
  FLastError.clear();
  if (!FRunning) {
    FLastError = ProcessExitedText;
    return -1;
  }
  const Int64 Written = WriteHandle(FStdInHandle, Buffer, Count);
  if (Written < 0)
    FLastError = SystemErrorMessage(errno);
  return Written;
}

TGDBKernel::TWaitResult TGDBKernel::WaitForOutput() {
  TDateTime WaitStart{};
  for (;;) {
    switch (WaitForPipeData(FStdOutHandle, PollIntervalMs)) {
    case TPipeState::Data:
      return TWaitResult::Ready;
    case TPipeState::Closed:
      FLastReadError = ProcessExitedText;
      return TWaitResult::Failed;
    case TPipeState::Failed:
      FLastReadError = SystemErrorMessage(errno);
      return TWaitResult::Failed;
    case TPipeState::Empty:
      break;
    }
    if (!FRunning || FStopping) {
      FLastReadError = ProcessExitedText;
      return TWaitResult::Failed;
    }
    // A debuggee that inherited the debugger's output keeps the pipe open
    // after the debugger died; the debugger's own end tells.
    if (ChildProcessEnded(FProcessHandle)) {
      if (WaitForPipeData(FStdOutHandle, 0) == TPipeState::Data)
        return TWaitResult::Ready;
      FLastReadError = ProcessExitedText;
      return TWaitResult::Failed;
    }
    if (FLastBytesRead > 0 && TimeOutExpired(WaitStart))
      return TWaitResult::TimedOut;
  }
}

Int64 TGDBKernel::Read(char* Buffer, size_t Count) {
  switch (WaitForOutput()) {
  case TWaitResult::TimedOut:
    return 0;
  case TWaitResult::Failed:
    return -1;
  case TWaitResult::Ready:
    break;
  }
  FLastReadError.clear();
  const Int64 BytesRead = ReadHandle(FStdOutHandle, Buffer, Count);
  if (BytesRead < 0)
    FLastReadError = SystemErrorMessage(errno);
  else if (BytesRead == 0)
    FLastReadError = ProcessExitedText;
  return BytesRead > 0 ? BytesRead : -1;
}

namespace {

/// The offset just past the first prompt in the Count bytes at Data whose
/// last byte lies at or after offset From, or 0 when there is none.
size_t FindPromptEnd(const char* Data, size_t Count, size_t From, std::string_view Marker) {
  const std::string_view Bytes(Data, Count);
  const size_t Start = From >= Marker.size() ? From - Marker.size() + 1 : 0;
  const size_t Found = Bytes.find(Marker, Start);
  return Found == std::string_view::npos ? 0 : Found + Marker.size();
}

} // namespace

bool TGDBKernel::GetReply(std::string& Reply) {
  Reply.clear();
  FReplyBusy = true;
  // Bytes that came after the previous block's prompt in the same read
  // start this block. The prompt is looked for wherever it lands: GDB goes
  // on printing (a library loaded while the program starts) right after it,
  // and waiting for data that ends with it could wait for ever.
  FLastBytesRead = FHeldBytes;
  FHeldBytes = 0;
  size_t Searched = 0;
  bool Result = true;
  const std::string& Marker = FGDBEndOfLineMarker;
  for (;;) {
    if (const size_t End = FindPromptEnd(FBuffer.data(), FLastBytesRead, Searched, Marker)) {
      Reply = DecodeUTF8OrAnsi(std::string_view(FBuffer.data(), End - Marker.size()));
      Log({}, true);
      FHeldBytes = FLastBytesRead - End;
      std::memmove(FBuffer.data(), FBuffer.data() + End, FHeldBytes);
      break;
    }
    Searched = FLastBytesRead;
    if (FBuffer.size() <= FLastBytesRead)
      FBuffer.resize(FLastBytesRead + ReplyBufferStep);
    const Int64 BytesRead = Read(FBuffer.data() + FLastBytesRead, FBuffer.size() - FLastBytesRead);
    if (BytesRead < 0) {
      // What the debugger printed before it went (such as "^exit") is still
      // a reply; the next call reports the failure.
      if (FLastBytesRead > 0) {
        Reply = DecodeUTF8OrAnsi(std::string_view(FBuffer.data(), FLastBytesRead));
        Log({}, true);
      } else {
        Result = false;
      }
      break;
    }
    if (BytesRead == 0) {
      // An unfinished reply that waited long enough is handed over as it is.
      if (FLastBytesRead > 0) {
        Reply = DecodeUTF8OrAnsi(std::string_view(FBuffer.data(), FLastBytesRead));
        Log({}, true);
      }
      break;
    }
    if (FLogFile)
      FLogFile->Write(std::string_view(FBuffer.data() + FLastBytesRead, static_cast<size_t>(BytesRead)));
    FLastBytesRead += static_cast<size_t>(BytesRead);
    if (FLastBytesRead == FBuffer.size())
      FBuffer.resize(FBuffer.size() + ReplyBufferStep);
  }
  if (FBuffer.size() > ReplyBufferShrinkAbove && FHeldBytes <= ReplyBufferStep) {
    std::vector<char> Smaller(ReplyBufferStep, 0);
    std::memcpy(Smaller.data(), FBuffer.data(), FHeldBytes);
    FBuffer.swap(Smaller);
  }
  FReplyBusy = false;
  return Result;
}

std::string TGDBKernel::GetLastError(bool ReadError) { return ReadError ? FLastReadError : FLastError; }

} // namespace midebug
