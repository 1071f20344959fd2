#include "kernel/localagent.h"

#include "kernel/gdbkernel.h"
#include "kernel/lldbkernel.h"
#include "platform/hostfiles.h"
#include "platform/hostinfo.h"
#include "platform/hostprocess.h"

#include <map>
#include <memory>
#include <utility>

namespace midebug {

// What stock GDB 13 on Linux offers, each bit found by asking GDB itself
// ("-list-features", "-info-gdb-mi-command NAME") or by trying the command:
const Int64 TLocalAgentClient::GDBCapabilities =
    // 1: "=thread-created" and "=thread-exited" are printed.
    capThreadNotification |
    // 2: "-thread-info" exists.
    capThreadInfoCommand |
    // 4 clear: "-gdb-set new-console on" is an error; the setting exists on
    // Windows hosts only.
    // 8: "-enable-timings" exists.
    capTimingsEnableCommand |
    // 16 clear: there is no "-exec-abort".
    // 32 clear: "-exec-interrupt" exists, but in GDB's default synchronous
    // mode GDB reads no command while the program runs: the interrupt is
    // read, and answered, only after the program has stopped by itself. A
    // running program is stopped with SIGINT instead (GDBInterrupt).
    // 64 clear: there is no "-pid-info".
    // 128: "=thread-group-started" carries the program's pid.
    capPidNotification |
    // 256 clear: lines end with LF alone.
    // 512 clear: a plain "-exec-run" does not stop at the entry point.
    // 1024: "-enable-timings no" is accepted ("-gdb-set mi-timings-enabled
    // off" is not: no such setting).
    capDisableTimings |
    // 16384 clear: GDB prints nothing when the language changes with the
    // frame.
    // 32768 clear: not LLDB.
    // 65536: the debugger and its programs run on Linux.
    capIsLinux;
// 131072, 262144 and 524288 (HX console, Android, Windows) stay clear.

namespace {

constexpr const char* NoInstanceText = "no debugger instance ";
constexpr const char* NotConnectedText = "not connected to the agent";
constexpr const char* NoSuchProcessText = "no such process: ";

/// One debugger the agent runs.
struct TAgentInstance {
  explicit TAgentInstance(std::unique_ptr<TGDBKernel> StartedKernel) : Kernel(std::move(StartedKernel)) {}

  std::unique_ptr<TGDBKernel> Kernel;
  /// Serialises the writing calls of all channels and the write error they
  /// leave in the kernel.
  std::mutex WriteLock;
  /// Serialises readers: the kernel has one reply buffer.
  std::mutex ReadLock;
};

/// The agent's debuggers by id, shared by every channel of the process.
/// FLock guards the table only and is a leaf lock: no kernel is called, and
/// no instance freed, while it is held. The write and read locks of an
/// instance are each taken alone, never one inside the other.
///
/// An instance lives while the table or a call in progress holds it; the
/// last holder frees it, and with it the kernel, which kills the debugger.
class TInstanceTable {
public:
  Integer Add(std::shared_ptr<TAgentInstance> Instance) {
    std::lock_guard Guard(FLock);
    const Integer Id = FNextId++;
    FInstances.emplace(Id, std::move(Instance));
    return Id;
  }

  std::shared_ptr<TAgentInstance> Find(Integer Id) {
    std::lock_guard Guard(FLock);
    const auto Found = FInstances.find(Id);
    return Found == FInstances.end() ? nullptr : Found->second;
  }

  std::shared_ptr<TAgentInstance> Remove(Integer Id) {
    std::lock_guard Guard(FLock);
    const auto Found = FInstances.find(Id);
    if (Found == FInstances.end())
      return nullptr;
    std::shared_ptr<TAgentInstance> Removed = std::move(Found->second);
    FInstances.erase(Found);
    return Removed;
  }

private:
  std::mutex FLock;
  std::map<Integer, std::shared_ptr<TAgentInstance>> FInstances;
  /// 0 is never an id: it is what a failed start reports.
  Integer FNextId = 1;
};

TInstanceTable& Instances() {
  static TInstanceTable Table;
  return Table;
}

} // namespace

Int64 TLocalAgentClient::LLDBCapabilities() {
  static const Int64 Capabilities = [] {
    TLLDBKernel FrontEnd(LLDBFrontEndFileName, "");
    return (FrontEnd.GetCapabilities() & ~Int64{capCRLFLineEnds}) | capIsLinux;
  }();
  return Capabilities;
}

void TLocalAgentClient::Connect(void* /*Listener*/) { FConnected = true; }

void TLocalAgentClient::SetLastError(const std::string& Text) {
  std::lock_guard Guard(FErrorLock);
  FLastError = Text;
}

std::string TLocalAgentClient::GetLastError() const {
  std::lock_guard Guard(FErrorLock);
  return FLastError;
}

bool TLocalAgentClient::GDBStart(const std::string& LauncherPath, Integer /*PrepCommandId*/, Integer /*KernelType*/,
                                 Integer& Id, Int64& EntryPoint, Int64& Capabilities, std::string& LLDBInitFile) {
  Id = 0;
  EntryPoint = 0;
  Capabilities = 0;
  LLDBInitFile.clear();
  SetLastError({});
  if (!FConnected) {
    SetLastError(NotConnectedText);
    return false;
  }
  const bool FrontEnd = ExtractFileName(LauncherPath) == LLDBFrontEndFileName;
  std::unique_ptr<TGDBKernel> Kernel;
  if (FrontEnd) {
    Kernel = std::make_unique<TLLDBKernel>(LauncherPath, "");
    // The front end debugs programs of this machine. The Windows-target bit
    // is what makes the kernel run it here instead of through an Android
    // device; the bits the kernel then adds to its own word are not reported.
    Kernel->FKernelType = ktLLDB | ktWindowsTarget;
  } else {
    Kernel = std::make_unique<TGDBKernel>(LauncherPath, "");
  }
  if (!Kernel->Start()) {
    SetLastError(Kernel->GetLastError(false));
    return false;
  }
  Capabilities = FrontEnd ? LLDBCapabilities() : GDBCapabilities;
  Id = Instances().Add(std::make_shared<TAgentInstance>(std::move(Kernel)));
  return true;
}

bool TLocalAgentClient::GDBSendRequest(Integer Id, const std::string& Command) {
  const std::shared_ptr<TAgentInstance> Instance = Instances().Find(Id);
  if (!Instance) {
    SetLastError(NoInstanceText + std::to_string(Id));
    return false;
  }
  std::lock_guard Guard(Instance->WriteLock);
  if (Instance->Kernel->SendRequest(Command))
    return true;
  SetLastError(Instance->Kernel->GetLastError(false));
  return false;
}

bool TLocalAgentClient::GDBGetReply(Integer Id, std::string& Reply) {
  Reply.clear();
  const std::shared_ptr<TAgentInstance> Instance = Instances().Find(Id);
  if (!Instance) {
    SetLastError(NoInstanceText + std::to_string(Id));
    return false;
  }
  std::lock_guard Guard(Instance->ReadLock);
  if (Instance->Kernel->GetReply(Reply))
    return true;
  SetLastError(Instance->Kernel->GetLastError(true));
  return false;
}

bool TLocalAgentClient::GDBInterrupt(Integer Id, Integer Pid) {
  if (!Instances().Find(Id)) {
    SetLastError(NoInstanceText + std::to_string(Id));
    return false;
  }
  if (InterruptProcess(Pid))
    return true;
  SetLastError(NoSuchProcessText + std::to_string(Pid));
  return false;
}

bool TLocalAgentClient::GDBTerminate(Integer Id, Integer Pid) {
  if (!Instances().Find(Id)) {
    SetLastError(NoInstanceText + std::to_string(Id));
    return false;
  }
  if (KillProcess(Pid))
    return true;
  SetLastError(NoSuchProcessText + std::to_string(Pid));
  return false;
}

void TLocalAgentClient::GDBLog(Integer Id, const std::string& Text, bool NewLine) {
  if (const std::shared_ptr<TAgentInstance> Instance = Instances().Find(Id))
    Instance->Kernel->Log(Text, NewLine);
}

void TLocalAgentClient::GDBStop(Integer Id) {
  const std::shared_ptr<TAgentInstance> Instance = Instances().Remove(Id);
  if (!Instance)
    return;
  // A reader waiting on the debugger sees the stop within one poll and
  // returns; whichever of us lets the instance go last ends the debugger.
  Instance->Kernel->Stop();
}

} // namespace midebug
