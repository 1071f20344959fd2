#include "process/gdbprocess.h"

#include "inspect/gdbthread.h"
#include "kernel/gdbremotekernel.h"
#include "kernel/lldbkernel.h"
#include "mi/gdboutput.h"
#include "platform/hostfiles.h"
#include "platform/hostthread.h"
#include "platform/mainthread.h"

#include <cassert>
#include <charconv>
#include <thread>

namespace midebug {

namespace {

/// How long a requester looks for its reply before it goes to sleep.
constexpr int ReplySpinMicroseconds = 100;
constexpr const char* ProcessNotSuspended = "process not suspended";
constexpr const char* ConnectionLost = "Connection to %s kernel is no longer available: '%s'";

/// Text with each "%s" replaced, in order, by the next of Values.
std::string FormatText(std::string Text, std::initializer_list<std::string> Values) {
  size_t Position = 0;
  for (const std::string& Value : Values) {
    Position = Text.find("%s", Position);
    if (Position == std::string::npos)
      break;
    Text.replace(Position, 2, Value);
    Position += Value.size();
  }
  return Text;
}

bool ParseInteger(const std::string& Text, Integer& Value) {
  const auto [End, Error] = std::from_chars(Text.data(), Text.data() + Text.size(), Value);
  return Error == std::errc() && End == Text.data() + Text.size() && !Text.empty();
}

bool IsDeviceTimeoutPlatform(const std::string& Platform) {
  return Platform == "iOSDevice64" || Platform == "iOSSimARM64" || Platform == "Android" || Platform == "Android64";
}

} // namespace

TWaitPolicy& DefaultWaitPolicy() {
  static TWaitPolicy Policy;
  return Policy;
}

TGDBProcess::TGDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
                         const std::string& LauncherPath, Integer Pid, const std::string& CommandFile,
                         TGDBLanguage Language, TGDBCPU CPU, const std::string& Platform)
    : FLanguage(Language), FCPUType(CPU), FPlatform(Platform), FCommand(std::make_unique<TGDBCommand>(CPU)),
      FSyncRequestTimeout(DefaultWaitPolicy().StartupTimeoutMs), FWaitPolicy(DefaultWaitPolicy()) {
  if (!RemoteProfile.empty()) {
    FKernel = std::make_unique<TGDBRemoteKernel>(RemoteProfile, LauncherPath, Pid);
  } else {
    FKernel = std::make_unique<TLLDBKernel>(LauncherPath, CommandFile);
    FPid = Pid;
  }
  FZombieThread = new TGDBThread(0, 0, "", "@@zombie", this);
  std::lock_guard Guard(LiveProcessesLock());
  FProcessListener = Listener;
  FLiveKey = AddLiveProcess(this);
}

void TGDBProcess::BeforeDestruction() {
  // A debugger still running (the IDE let go without Terminate or Detach, or
  // start-up failed) is stopped, and the output thread awaited, while the
  // object is whole: that thread calls into it until it ends.
  FAlive = false;
  NotifyWaitObjects();
  if (FKernel)
    FKernel->Stop();
  TerminateAndFreeOutputThread();
}

TGDBProcess::~TGDBProcess() {
  BeforeDestruction();
  {
    std::lock_guard Guard(FThreadLock);
    FSuspendedThread = nullptr;
    FThreadList.clear();
  }
  FKernel.reset();
  FZombieThread = nullptr;
  std::lock_guard Guard(LiveProcessesLock());
  FProcessListener = nullptr;
  RemoveLiveProcess(FLiveKey);
}

void TGDBProcess::DeferIfLive(std::function<void()> Delivery) {
  const TLiveProcessKey Key = FLiveKey;
  Deliver([Key, Delivery = std::move(Delivery)] {
    std::lock_guard Guard(LiveProcessesLock());
    if (IsLiveProcess(Key))
      Delivery();
  });
}

// --- Start-up --------------------------------------------------------------

void TGDBProcess::Start() {
  if (!FKernel->Start()) {
    std::string Reason = FKernel->GetLastError(false);
    if (Reason.empty())
      Reason = FKernel->FLauncherPath;
    const bool NamedLLDB = (FKernel->FKernelType & ktLLDB) != 0;
    throw ENonAIRException(FormatText("Unable to start %s kernel: '%s'", {NamedLLDB ? "LLDB" : "GDB", Reason}));
  }
  FAlive = true;
  FStarted = true;
  FEndOfLineMarker = FKernel->GetEndOfLineMarker();
  Integer Timeout = 0;
  if (ParseInteger(GetEnvironmentVariable("GDB_WAITTIMEOUT"), Timeout))
    FSyncRequestTimeout = Timeout;

  FOutputThread = std::thread([this] { OutputThreadExecute(); });
  FOutputThreadId = FOutputThread.get_id();
  WaitUntilProcessStarted();
  SendStartupSettings();
  FSyncRequestTimeout = FWaitPolicy.RunningTimeoutMs;
}

void TGDBProcess::SendStartupSettings() {
  const bool LLDB = FKernel->IsLLDB();
  std::string Token;
  auto GdbSet = [&](const std::string& Name, const std::string& Value) {
    ProcessAsyncRequest(
        BuildCommand(Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateGDBSetCommand(Key, Name, Value); }));
  };
  auto SettingsSet = [&](const std::string& Name, const std::string& Value) {
    ProcessAsyncRequest(BuildCommand(
        Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateCLSettingsSetCommand(Key, Name, Value); }));
  };

  if (LLDB)
    ProcessAsyncRequest("version");
  GdbSet("host-charset", "UTF-8");
  GdbSet("confirm", "off");
  GdbSet("height", "0");
  GdbSet("width", "0");
  GdbSet("language", "auto");
  if (LLDB && FKernel->IsWindows())
    SettingsSet("target.disable-stdio", "true");
  if (LLDB) {
    GdbSet("print expand-aggregates", "on");
    SettingsSet("target.move-to-nearest-code", "0");
    ProcessAsyncRequest(BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) {
      return Builder.CreateCLSettingsShowCommand(Key, "target.max-children-count");
    }));
    SettingsSet("target.process.thread.max-backtrace-depth", "512");
  }
  if (FKernel->SupportDisableTimings()) {
    if (FKernel->SupportTimingsEnableCommand())
      ProcessAsyncRequest(BuildCommand(
          Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateEnableTimingsCommand(Key, "no"); }));
    else
      GdbSet("mi-timings-enabled", "off");
  }
  if (FCPUType == gcIA32 || FCPUType == gcAMD64) {
    if (LLDB)
      SettingsSet("target.x86-disassembly-flavor", "intel");
    else
      GdbSet("disassembly-flavor", "intel");
  } else {
    GdbSet("arm disassembler", "std");
  }
  if (FKernel->SupportNewConsoleOption())
    GdbSet("new-console", "on");
  if (LLDB) {
    TGdbShowResult Show;
    const std::string Line = BuildCommand(
        Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateGDBShowCommand(Key, "target-async"); });
    if (ProcessSyncRequest(Token, Line, Show) && !Show.FError)
      FAsyncTarget = Show.FValue == "on";
    const std::string InitFile = FKernel->GetLLDBInitFile();
    if (!InitFile.empty())
      ProcessAsyncRequest(BuildCommand(
          Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateCLCommandSourceCommand(Key, InitFile); }));
  }
}

void TGDBProcess::SetProgramEnvironment() {
  std::string Token;
  const bool LLDB = FKernel->IsLLDB();
  ProcessAsyncRequest(BuildCommand(Token, [LLDB](TGDBCommand& Builder, std::string& Key) {
    return Builder.CreateCLSetEnvironmentCommand(Key, "QVT_DBK_PRESENT", "1", LLDB);
  }));
}

TIntfPtr<IGDBProcess> TGDBProcess::CreateProcess(const std::string& ExeName, const std::string& Arguments,
                                                 const std::string& WorkingDir) {
  Start();
  SetProgramEnvironment();
  std::string Token;
  TFileExecAndSymbolsResult Loaded;
  const std::string Line = BuildCommand(
      Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateFileExecAndSymbolsCommand(Key, ExeName); });
  ProcessSyncRequest(Token, Line, Loaded);
  if (Loaded.FError || !Loaded.FAvailable) {
    FAlive = false;
    std::string Reason = Loaded.FErrorMessage;
    if (Reason.empty())
      Reason = FKernel->GetLastError(true);
    throw ENonAIRException(FormatText("Unable to create process: '%s'", {Reason}));
  }
  TIntfPtr<IGDBProcess> Result(static_cast<IGDBProcess*>(this));
  if (!Arguments.empty())
    ProcessAsyncRequest(BuildCommand(
        Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateExecArgumentsCommand(Key, Arguments, false); }));
  std::string Dir = WorkingDir;
  while (Dir.size() > 1 && Dir.back() == PathDelimiter)
    Dir.pop_back();
  // GDB answers an empty directory with an error; there is nothing to change.
  if (!Dir.empty())
    ProcessAsyncRequest(
        BuildCommand(Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateEnvCdCommand(Key, Dir); }));
  return Result;
}

TIntfPtr<IGDBProcess> TGDBProcess::AttachProcess(Integer Pid) {
  Start();
  SetProgramEnvironment();
  TIntfPtr<IGDBProcess> Result(static_cast<IGDBProcess*>(this));
  if (Pid != -1) {
    std::string Token;
    const bool LLDB = FKernel->IsLLDB();
    const std::string Line = BuildCommand(
        Token, [&](TGDBCommand& Builder, std::string& Key) { return Builder.CreateTargetAttachCommand(Key, Pid, false); });
    if (LLDB) {
      ProcessAsyncRequest(Line);
    } else {
      TTargetAttachResult Attached;
      ProcessSyncRequest(Token, Line, Attached);
      if (Attached.FError || !Attached.FAvailable) {
        FAlive = false;
        std::string Reason = Attached.FErrorMessage;
        if (Reason.empty())
          Reason = FKernel->GetLastError(true);
        throw ENonAIRException(FormatText("Unable to attach: '%s'", {Reason}));
      }
    }
    FPid = Pid;
    FSuspended = true;
    if (LLDB)
      FAttachNotifySuspended = true;
    if (FKernel->IsWindows()) {
      FAttachMode = true;
      FAttachNotifySuspended = true;
    }
  }
  if (FKernel->IsAndroid64())
    FSuspended = true;
  return Result;
}

Integer TGDBProcess::GetPid() {
  if (FPid != -1)
    return FPid;
  auto Fail = [this](const std::string& Reason) -> Integer {
    FAlive = false;
    throw ENonAIRException(FormatText("Unable to create process: '%s'", {Reason}));
  };
  if (!FKernel->SupportPidInfoCommand()) {
    if (!FKernel->SupportPidNotification()) {
      FPid = 1;
      return 1;
    }
    Integer Timeout = FSyncRequestTimeout;
    while (FPid == -1 && FAlive && !WaitForReplyTimeOut(Timeout, true)) {
    }
    if (FPid != -1)
      return FPid;
    return Fail(FLaunchErrorMessage.empty() ? GetTimeOutMessage() : FLaunchErrorMessage);
  }
  if (!FAsyncTarget) {
    Integer Timeout = FSyncRequestTimeout;
    while (!FSuspended && FAlive && !WaitForReplyTimeOut(Timeout, true)) {
    }
    if (!FSuspended)
      return Fail(GetTimeOutMessage());
  }
  std::string Token;
  TPidInfoResult PidInfo;
  const std::string Line =
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreatePidInfoCommand(Key); });
  ProcessSyncRequest(Token, Line, PidInfo);
  if (PidInfo.FError || !PidInfo.FAvailable)
    return Fail(PidInfo.FErrorMessage);
  FPid = PidInfo.FPid;
  return FPid;
}

Int64 TGDBProcess::GetKernelCapabilities() { return FKernel ? FKernel->GetCapabilities() : 0; }

void TGDBProcess::SetKernelCapabilites(Int64 Value) {
  if (FKernel)
    FKernel->SetCapabilites(Value);
}

TGDBLocation TGDBProcess::GetCurrentLocation() {
  std::string Token;
  TStackInfoFrameResult Frame;
  const std::string Line =
      BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateStackInfoFrameCommand(Key); });
  if (!ProcessSyncRequest(Token, Line, Frame) || Frame.FError || !Frame.FAvailable)
    return DummyLocation;
  return FixupInlineLocation(Frame.FLocation);
}

TGDBLocation TGDBProcess::FixupInlineLocation(const TGDBLocation& Location) {
  std::lock_guard Guard(FThreadLock);
  if (Location.Line != 0 && Location.Source.empty() && !FInlineLocation.Source.empty()) {
    TGDBLocation Fixed = Location;
    Fixed.Line = FInlineLocation.Line;
    Fixed.Source = FInlineLocation.Source;
    return Fixed;
  }
  return Location;
}

// --- Requests and replies --------------------------------------------------

bool TGDBProcess::ProcessAsyncRequest(const std::string& Request) {
  if (!FAlive)
    return false;
  std::lock_guard Guard(FRequestLock);
  return FKernel->SendRequest(Request);
}

bool TGDBProcess::ProcessSyncRequest(const std::string& Key, const std::string& Request, TGDBResult& Result) {
  // The output thread is the only reader of replies: it would wait forever.
  assert(std::this_thread::get_id() != FOutputThreadId.load());
  if (FResuming) {
    Result.FError = true;
    Result.SetErrorMessage(ProcessNotSuspended);
    return false;
  }
  AddWaitObject(Key, Result);
  if (ProcessAsyncRequest(Request)) {
    WaitForReply(Key, Result);
    return true;
  }
  RemoveWaitObject(Key);
  Result.FError = true;
  std::string Reason = FKernel->GetLastError(false);
  if (Reason.empty())
    Reason = FKernel->GetLastError(true);
  Result.SetErrorMessage(Reason);
  return false;
}

void TGDBProcess::AddWaitObject(const std::string& Key, TGDBResult& Result) {
  if (!FAlive)
    return;
  std::lock_guard Guard(FWaitObjectLock);
  FWaitObjectList[Key] = &Result;
}

TGDBResult* TGDBProcess::RemoveWaitObject(const std::string& Key) {
  if (!FAlive)
    return nullptr;
  std::lock_guard Guard(FWaitObjectLock);
  const auto Found = FWaitObjectList.find(Key);
  if (Found == FWaitObjectList.end())
    return nullptr;
  TGDBResult* Result = Found->second;
  FWaitObjectList.erase(Found);
  return Result;
}

void TGDBProcess::WaitForReply(const std::string& Key, TGDBResult& Result) {
  bool GaveUp = false;
  {
    std::unique_lock Monitor(Result.Monitor());
    if (FFatalError) {
      GaveUp = true;
    } else {
      // Most replies arrive within a few dozen microseconds: looking again
      // for that long, giving the processor away in between, saves the sleep
      // and the wake-up of the thread.
      const auto SpinEnd = std::chrono::steady_clock::now() + std::chrono::microseconds(ReplySpinMicroseconds);
      while (!Result.FAvailable && FAlive && std::chrono::steady_clock::now() < SpinEnd) {
        Monitor.unlock();
        std::this_thread::yield();
        Monitor.lock();
      }
      Integer Timeout = FSyncRequestTimeout;
      while (!Result.FAvailable && FAlive) {
        std::this_thread::yield();
        if (FWaitPolicy.WaitObserver)
          FWaitPolicy.WaitObserver(Timeout);
        const bool Woken = Result.MonitorSignal().wait_for(Monitor, std::chrono::milliseconds(Timeout),
                                                           [&] { return Result.FAvailable || !FAlive; });
        if (Woken)
          continue;
        if (FFatalError) {
          GaveUp = true;
          break;
        }
        // The IDE is asked without the monitor held, so that a reply that
        // arrives meanwhile can still complete the result.
        Monitor.unlock();
        AskFatalError();
        Monitor.lock();
        if (FFatalError) {
          GaveUp = true;
          break;
        }
        if (Timeout < FWaitPolicy.MaxTimeoutMs)
          Timeout += FWaitPolicy.TimeoutStepMs;
      }
    }
  }
  // The key leaves the table after the monitor is released: the exit handling
  // takes the table's lock before each result's monitor.
  if (GaveUp && !RemoveWaitObject(Key) && FAlive) {
    // The parser took the object out already and is completing it; it must
    // be done with it before the requester may free it.
    std::unique_lock Monitor(Result.Monitor());
    Result.MonitorSignal().wait(Monitor, [&] { return Result.FAvailable || !FAlive; });
  }
  std::lock_guard Monitor(Result.Monitor());
  if (!Result.FAvailable && FAlive) {
    Result.FError = true;
    Result.SetErrorMessage(GetTimeOutMessage());
    Result.FTimeOut = true;
  }
}

void TGDBProcess::AskFatalError() {
  FFatalErrorNotified = false;
  NotifyFatalError();
  std::this_thread::yield();
  while (!FFatalErrorNotified)
    YieldAndSleep(FWaitPolicy.PollMs);
}

bool TGDBProcess::WaitForReplyTimeOut(Integer& TimeOutMs, bool FatalOnExpiry) {
  TimeOutMs -= FWaitPolicy.PollMs;
  if (TimeOutMs >= 0) {
    YieldAndSleep(FWaitPolicy.PollMs);
    return false;
  }
  if (!FatalOnExpiry || FFatalError)
    return true;
  AskFatalError();
  if (FFatalError)
    return true;
  TimeOutMs = FSyncRequestTimeout;
  return false;
}

std::string TGDBProcess::GetTimeOutMessage() const {
  return IsDeviceTimeoutPlatform(FPlatform) ? "Connection device timeout" : "debug kernel timeout";
}

void TGDBProcess::NotifyWaitObjects() {
  std::lock_guard Guard(FWaitObjectLock);
  for (const auto& [Key, Result] : FWaitObjectList)
    Result->Pulse();
  FWaitObjectList.clear();
}

void TGDBProcess::NotifyFatalError() {
  const TLiveProcessKey Key = FLiveKey;
  Deliver([Key, this] {
    std::lock_guard Guard(LiveProcessesLock());
    if (!IsLiveProcess(Key))
      return;
    if (!FDying && !FInternalError && FProcessListener)
      FFatalError = FProcessListener->FatalError();
    else
      FFatalError = true;
    FFatalErrorNotified = true;
  });
}

void TGDBProcess::NotifyInternalError(const std::string& Message) {
  FInternalError = true;
  TIntfPtr<IGDBProcessListener> Listener;
  {
    std::lock_guard Guard(LiveProcessesLock());
    Listener = FProcessListener;
  }
  if (Listener)
    Listener->InternalError(Message);
}

void TGDBProcess::OutputThreadExecute() {
  SetCurrentThreadName("Output");
  try {
    std::string Reply;
    while (FAlive) {
      if (FKernel->GetReply(Reply)) {
        ProcessGDBOutput(Reply, *this);
        continue;
      }
      if (!FAlive)
        break;
      const std::string Message =
          FormatText(ConnectionLost, {FKernel->IsLLDB() ? "LLDB" : "GDB", FKernel->GetLastError(true)});
      NotifyInternalError(Message);
      NotifyProcessExited(1, Message);
    }
  } catch (...) {
    // The thread ends; the process learns it from its flags.
  }
}

void TGDBProcess::TerminateAndFreeOutputThread() {
  if (FOutputThread.joinable())
    FOutputThread.join();
}

// --- Events ----------------------------------------------------------------

void TGDBProcess::NotifyProcessExited(Integer Code, const std::string& Signal) {
  if (!FAlive || FExiting.exchange(true))
    return;
  if (FPid == -1)
    FLaunchErrorMessage = Signal;
  std::string Token;
  ProcessAsyncRequest(BuildCommand(Token, [](TGDBCommand& Builder, std::string& Key) { return Builder.CreateGDBExitCommand(Key); }));
  FAlive = false;
  NotifyWaitObjects();
  // A process the IDE has let go meanwhile reports nothing: the IDE asked to
  // hear no more of it.
  DeferIfLive([this, Code, Signal] {
    NotifyAllThreadExited();
    if (FProcessListener && FPid != -1)
      FProcessListener->ProcessExited(Code, Signal);
  });
}

void TGDBProcess::NotifyAllThreadExited() {
  std::lock_guard Guard(FThreadLock);
  for (const auto& [Id, Thread] : FThreadList)
    if (FProcessListener)
      FProcessListener->ThreadExited(Id);
  FThreadList.clear();
  FSuspendedThread = nullptr;
}

void TGDBProcess::NotifyProcessPidCreated(Integer Pid) {
  Integer Unknown = -1;
  FPid.compare_exchange_strong(Unknown, Pid);
}

void TGDBProcess::NotifyLanguageChanged(const std::string& LanguageName) {
  for (size_t Index = 0; Index < GDBLanguageNames.size(); ++Index)
    if (LanguageName == GDBLanguageNames[Index])
      FLanguage = static_cast<TGDBLanguage>(Index);
}

void TGDBProcess::NotifySettingMaxChildrenCountChanged(Integer Count) {
  Integer Unknown = -1;
  FMaxChildrenCount.compare_exchange_strong(Unknown, Count);
}

Integer TGDBProcess::GetModuleId(const std::string& Name) {
  std::lock_guard Guard(FModuleLock);
  const auto Found = FModuleIdList.find(Name);
  if (Found != FModuleIdList.end())
    return Found->second;
  FModuleIdList[Name] = ++FModuleId;
  return FModuleId;
}

// --- Simple queries ----------------------------------------------------------

TGDBLocation TGDBProcess::GetSuspendedLocation() {
  std::lock_guard Guard(FThreadLock);
  return FSuspendedThread ? FSuspendedThread->GetCurrentLocation() : DummyLocation;
}

Integer TGDBProcess::GetSuspendedThreadId() {
  std::lock_guard Guard(FThreadLock);
  return FSuspendedThread ? FSuspendedThread->FId : -1;
}

TIntfPtr<IGDBThread> TGDBProcess::GetThread(Integer Id) {
  std::lock_guard Guard(FThreadLock);
  const auto Found = FThreadList.find(Id);
  return Found != FThreadList.end() ? Found->second : FZombieThread;
}

TGDBModule TGDBProcess::GetModule(Integer Id) {
  std::lock_guard Guard(FModuleLock);
  return FCurrentLoadedModule.Id == Id ? FCurrentLoadedModule : DummyModule;
}

} // namespace midebug
