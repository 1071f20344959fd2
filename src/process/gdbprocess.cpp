#include "process/gdbprocess.h"

#include "kernel/gdbremotekernel.h"
#include "kernel/ideservices.h"
#include "kernel/lldbkernel.h"
#include "mi/gdboutput.h"
#include "platform/hostfiles.h"
#include "platform/hostinfo.h"
#include "platform/hostthread.h"
#include "platform/mainthread.h"

#include <charconv>

namespace midebug {

namespace {

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

} // namespace

/// The kernel for a profile and debugger. Without a profile, LLDB's front
/// end debugs a Windows target, or an Android one through its bridge, by
/// itself; any other debugger (GDB), or a target of this machine, is started
/// by the agent that lives in this library, which knows how to start each.
static std::unique_ptr<TGDBKernel> MakeKernel(const std::string& RemoteProfile, const std::string& LauncherPath,
                                              Integer Pid, const std::string& CommandFile, const std::string& Platform) {
  if (!RemoteProfile.empty())
    return std::make_unique<TGDBRemoteKernel>(RemoteProfile, LauncherPath, Pid);
  const bool LLDBFrontEnd = ExtractFileName(LauncherPath) == LLDBFrontEndFileName;
  if (!LLDBFrontEnd || Platform.starts_with("Linux"))
    return std::make_unique<TGDBRemoteKernel>(LocalProfileName, LauncherPath, Pid);
  return std::make_unique<TLLDBKernel>(LauncherPath, CommandFile);
}

/// Whether Kernel's debugger, and so the program, runs on this machine: it
/// is started here, or by the agent that lives in this library.
static bool DebuggerOnThisMachine(TGDBKernel& Kernel) {
  const auto* Remote = dynamic_cast<const TGDBRemoteKernel*>(&Kernel);
  return !Remote || Remote->GetRemoteProfile() == LocalProfileName;
}

TGDBProcess::TGDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
                         const std::string& LauncherPath, Integer Pid, const std::string& CommandFile,
                         TGDBLanguage Language, TGDBCPU CPU, const std::string& Platform)
    : FKernel(MakeKernel(RemoteProfile, LauncherPath, Pid, CommandFile, Platform)), FLanguage(Language),
      FRequests(*FKernel, CPU, Platform, FAlive, FResuming, [this] { NotifyFatalError(); }),
      FTerminal(FDeferIfLive,
                [this](const std::string& Output) {
                  if (FProcessListener)
                    FProcessListener->LogEvent(CreateUnknownLogEvent(Output));
                }) {
  if (RemoteProfile.empty())
    FPid = Pid;
  MakeInspectComponents();
  std::lock_guard Guard(LiveProcessesLock());
  FProcessListener = Listener;
  FLiveKey = AddLiveProcess(this);
}

void TGDBProcess::BeforeDestruction() {
  // A debugger still running (the IDE let go without Terminate or Detach, or
  // start-up failed) is stopped, and the output thread awaited, while the
  // object is whole: that thread calls into it until it ends.
  FAlive = false;
  FRequests.NotifyWaitObjects();
  FKernel->Stop();
  if (FOutputThread.joinable())
    FOutputThread.join();
  FTerminal.Close();
}

TGDBProcess::~TGDBProcess() {
  BeforeDestruction();
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
    FRequests.SetSyncTimeout(Timeout);

  FOutputThread = std::thread([this] { OutputThreadExecute(); });
  FRequests.SetReaderThread(FOutputThread.get_id());
  WaitUntilProcessStarted();
  SendStartupSettings();
  FRequests.SetSyncTimeout(WaitPolicy().RunningTimeoutMs);
}

void TGDBProcess::SendStartupSettings() {
  const bool LLDB = FKernel->IsLLDB();
  auto GdbSet = [this](const std::string& Name, const std::string& Value) {
    FRequests.Fire(&TGDBCommand::CreateGDBSetCommand, Name, Value);
  };
  auto SettingsSet = [this](const std::string& Name, const std::string& Value) {
    FRequests.Fire(&TGDBCommand::CreateCLSettingsSetCommand, Name, Value);
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
    FRequests.Fire(&TGDBCommand::CreateCLSettingsShowCommand, "target.max-children-count");
    SettingsSet("target.process.thread.max-backtrace-depth", "512");
  }
  if (FKernel->SupportDisableTimings()) {
    if (FKernel->SupportTimingsEnableCommand())
      FRequests.Fire(&TGDBCommand::CreateEnableTimingsCommand, "no");
    else
      GdbSet("mi-timings-enabled", "off");
  }
  if (CPU() == gcIA32 || CPU() == gcAMD64) {
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
    if (FRequests.Ask(Show, &TGDBCommand::CreateGDBShowCommand, "target-async"))
      FAsyncTarget = Show.FValue == "on";
    const std::string InitFile = FKernel->GetLLDBInitFile();
    if (!InitFile.empty())
      FRequests.Fire(&TGDBCommand::CreateCLCommandSourceCommand, InitFile);
  }
}

void TGDBProcess::SetProgramEnvironment() {
  FRequests.Fire(&TGDBCommand::CreateCLSetEnvironmentCommand, "QVT_DBK_PRESENT", "1", FKernel->IsLLDB());
}

TIntfPtr<IGDBProcess> TGDBProcess::CreateProcess(const std::string& ExeName, const std::string& Arguments,
                                                 const std::string& WorkingDir) {
  Start();
  SetProgramEnvironment();
  TFileExecAndSymbolsResult Loaded;
  if (!FRequests.Ask(Loaded, &TGDBCommand::CreateFileExecAndSymbolsCommand, ExeName)) {
    FAlive = false;
    std::string Reason = Loaded.FErrorMessage;
    if (Reason.empty())
      Reason = FKernel->GetLastError(true);
    throw ENonAIRException(FormatText("Unable to create process: '%s'", {Reason}));
  }
  TIntfPtr<IGDBProcess> Result(static_cast<IGDBProcess*>(this));
  // GDB's "set args" keeps a line break inside an argument; LLDB's front end
  // knows only "-exec-arguments".
  if (!Arguments.empty() && FKernel->IsLLDB())
    FRequests.Fire([&Arguments](TGDBCommand& Builder, std::string& Token) {
      return Builder.CreateExecArgumentsCommand(Token, Arguments, false);
    });
  else if (!Arguments.empty())
    FRequests.Fire(&TGDBCommand::CreateSetArgsCommand, Arguments);
  std::string Dir = WorkingDir;
  while (Dir.size() > 1 && Dir.back() == PathDelimiter)
    Dir.pop_back();
  // GDB answers an empty directory with an error; there is nothing to change.
  if (!Dir.empty())
    FRequests.Fire(&TGDBCommand::CreateEnvCdCommand, Dir);
  // On GDB's own pipes the program's output would be read as MI, and its
  // reads would take GDB's commands: a GDB on this machine gives it a
  // terminal of its own. GDB opens it for every run.
  if (!FKernel->IsLLDB() && FKernel->IsLinux() && DebuggerOnThisMachine(*FKernel)) {
    std::string Error;
    if (FTerminal.Open(Error))
      FRequests.Fire(&TGDBCommand::CreateInferiorTtySetCommand, FTerminal.SlavePath());
    else
      FKernel->Log("The program shares the debugger's pipes, no terminal: " + Error, true);
  }
  return Result;
}

TIntfPtr<IGDBProcess> TGDBProcess::AttachProcess(Integer Pid) {
  Start();
  SetProgramEnvironment();
  TIntfPtr<IGDBProcess> Result(static_cast<IGDBProcess*>(this));
  if (Pid != -1) {
    const bool LLDB = FKernel->IsLLDB();
    auto Attach = [Pid](TGDBCommand& Builder, std::string& Token) {
      return Builder.CreateTargetAttachCommand(Token, Pid, false);
    };
    TTargetAttachResult Attached;
    if (LLDB) {
      FRequests.Fire(Attach);
    } else if (!FRequests.Ask(Attached, Attach)) {
      FAlive = false;
      std::string Reason = Attached.FErrorMessage;
      if (Reason.empty())
        Reason = FKernel->GetLastError(true);
      throw ENonAIRException(FormatText("Unable to attach: '%s'", {Reason}));
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
    Integer Timeout = FRequests.SyncTimeout();
    while (FPid == -1 && FAlive && !FRequests.WaitForReplyTimeOut(Timeout, true)) {
    }
    if (FPid != -1)
      return FPid;
    return Fail(FLaunchErrorMessage.empty() ? FRequests.GetTimeOutMessage() : FLaunchErrorMessage);
  }
  if (!FAsyncTarget) {
    Integer Timeout = FRequests.SyncTimeout();
    while (!FSuspended && FAlive && !FRequests.WaitForReplyTimeOut(Timeout, true)) {
    }
    if (!FSuspended)
      return Fail(FRequests.GetTimeOutMessage());
  }
  TPidInfoResult PidInfo;
  if (!FRequests.Ask(PidInfo, &TGDBCommand::CreatePidInfoCommand))
    return Fail(PidInfo.FErrorMessage);
  FPid = PidInfo.FPid;
  return FPid;
}

void TGDBProcess::NotifyFatalError() {
  const TLiveProcessKey Key = FLiveKey;
  Deliver([Key, this] {
    std::lock_guard Guard(LiveProcessesLock());
    if (!IsLiveProcess(Key))
      return;
    const bool AskIDE = !FDying && !FInternalError && FProcessListener;
    FRequests.AnswerFatalError(AskIDE ? FProcessListener->FatalError() : true);
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
    std::string ReplyBlock;
    while (FAlive) {
      if (FKernel->GetReply(ReplyBlock)) {
        ProcessGDBOutput(ReplyBlock, *this);
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

// --- Events ----------------------------------------------------------------

void TGDBProcess::NotifyProcessExited(Integer Code, const std::string& Signal) {
  if (!FAlive || FExiting.exchange(true))
    return;
  if (FPid == -1)
    FLaunchErrorMessage = Signal;
  FTerminal.Drain(true);
  FRequests.Fire(&TGDBCommand::CreateGDBExitCommand);
  FAlive = false;
  FRequests.NotifyWaitObjects();
  // A process the IDE has let go meanwhile reports nothing: the IDE asked to
  // hear no more of it.
  // A program that never started is reported only when its launch was
  // refused: the IDE, waiting for it to run, learns why at once.
  const bool Report = FPid != -1 || !Signal.empty();
  DeferIfLive([this, Code, Signal, Report] {
    NotifyAllThreadExited();
    if (FProcessListener && Report)
      FProcessListener->ProcessExited(Code, Signal);
  });
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

} // namespace midebug
