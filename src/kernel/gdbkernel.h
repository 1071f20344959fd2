#pragma once
/// \file
/// The transport to one debugger program on this machine: start it on two
/// pipes, write command lines, read reply blocks up to the MI prompt, log the
/// traffic. Also the capability bits that tell the rest of the system which
/// MI features the debugger offers.

#include "kernel/raclient.h"
#include "platform/hostprocess.h"
#include "platform/logwriter.h"
#include "platform/types.h"

#include <atomic>
#include <chrono>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace midebug {

/// A point in time for the reply time-out; the default value means "not
/// started yet".
using TDateTime = std::chrono::steady_clock::time_point;

/// Capability bits of a kernel.
enum : Int64 {
  capThreadNotification = 1,
  capThreadInfoCommand = 2,
  capNewConsoleOption = 4,
  capTimingsEnableCommand = 8,
  capExecAbortCommand = 16,
  capExecInterruptCommand = 32,
  capPidInfoCommand = 64,
  capPidNotification = 128,
  /// The debugger ends its lines with CR LF (Windows hosts).
  capCRLFLineEnds = 256,
  capStopOnEntryPoint = 512,
  capDisableTimings = 1024,
  capLanguageChangedNotification = 16384,
  capIsLLDB = 32768,
  capIsLinux = 65536,
  capHXConsole = 131072,
  capIsAndroid64 = 262144,
  capIsWindows = 524288,
};

/// Bits of FKernelType that the kernel itself reads.
enum : Integer {
  ktGDB = 1,
  ktLLDB = 2,
  ktWindowsTarget = 16,
  ktWindowsX = 32,
};

class TAndroidDevice;

/// The local debugger transport. One kernel belongs to one debugged process:
/// the process's output thread alone calls GetReply; SendRequest is called
/// under the process's request lock; Stop and the destructor run on the
/// owner's thread.
class TGDBKernel {
public:
  TGDBKernel(const std::string& LauncherPath, const std::string& CommandFile);
  virtual ~TGDBKernel();
  TGDBKernel(const TGDBKernel&) = delete;
  TGDBKernel& operator=(const TGDBKernel&) = delete;

  virtual Int64 GetCapabilities();
  virtual void SetCapabilites(Int64 Value);
  /// The LLDB initialisation file to source after start, or empty. Only for
  /// Windows and Android targets, and only when the file exists.
  virtual std::string GetLLDBInitFile();
  /// The option that names a command file on the debugger's command line.
  virtual std::string GetCommandFileOption();
  /// Whether an unfinished reply has waited long enough to be handed over
  /// as it is. GDB's replies are awaited without limit.
  virtual bool TimeOutExpired(TDateTime& Start);
  /// Kills the debuggee Pid; -1 means none.
  virtual void Terminate(Integer Pid);
  virtual void Interrupt(Integer Pid);
  virtual void Log(const std::string& Text, bool NewLine);
  /// Launches the debugger. False with GetLastError(false) on failure.
  virtual bool Start();
  /// Writes one command line. True when every byte was written.
  virtual bool SendRequest(const std::string& Command);
  /// Reads one reply block: everything the debugger printed up to, without,
  /// the next prompt. False when the debugger is gone (GetLastError(true)).
  virtual bool GetReply(std::string& Reply);
  virtual std::string GetLastError(bool ReadError);

  /// Reading ends as soon as the debugger's output is drained. Virtual so
  /// that a kernel whose reads block elsewhere can release its reader.
  virtual void Stop();
  /// The prompt line that ends a reply, as the process layer recognises it.
  std::string GetEndOfLineMarker();

  bool SupportThreadNotification() { return HasCapability(capThreadNotification); }
  bool SupportThreadInfoCommand() { return HasCapability(capThreadInfoCommand); }
  bool SupportNewConsoleOption() { return HasCapability(capNewConsoleOption); }
  bool SupportTimingsEnableCommand() { return HasCapability(capTimingsEnableCommand); }
  bool SupportExecAbortCommand() { return HasCapability(capExecAbortCommand); }
  bool SupportExecInterruptCommand() { return HasCapability(capExecInterruptCommand); }
  bool SupportPidInfoCommand() { return HasCapability(capPidInfoCommand); }
  bool SupportPidNotification() { return HasCapability(capPidNotification); }
  bool SupportStopOnEntryPoint() { return HasCapability(capStopOnEntryPoint); }
  bool SupportDisableTimings() { return HasCapability(capDisableTimings); }
  bool SupportLanguageChangedNotification() { return HasCapability(capLanguageChangedNotification); }
  bool IsLLDB() { return HasCapability(capIsLLDB); }
  bool IsLinux() { return HasCapability(capIsLinux); }
  bool SupportHXConsole() { return HasCapability(capHXConsole); }
  bool IsAndroid64() { return HasCapability(capIsAndroid64); }
  bool IsWindows() { return HasCapability(capIsWindows); }

  /// The command line Start runs: the quoted program, its options and, with a
  /// command file, the command-file option and the quoted file.
  std::string GetCommandLine();
  /// Process id of the running debugger, 0 before Start.
  Integer GetProcessHandle() const { return FProcessHandle; }
  /// Path of the traffic log, empty when none is kept.
  std::string GetLogFileName() const { return FLogFile ? FLogFile->Path() : std::string(); }
  /// Size of the reply buffer (it grows for long replies and shrinks after).
  size_t GetBufferSize() const { return FBuffer.size(); }

  std::string FLauncherPath;
  /// Target bits set by the owner after construction (see ktWindowsTarget).
  Integer FKernelType = ktGDB;
  /// Entry point of the debuggee when an agent reports one; 0 otherwise.
  std::atomic<UInt64> FEntryPoint{0};

protected:
  bool HasCapability(Int64 Bit) { return (GetCapabilities() & Bit) != 0; }
  /// Replaces the prompt that ends every reply block.
  void SetEndOfLineMarker(const std::string& Marker) { FGDBEndOfLineMarker = Marker; }

  std::atomic<Int64> FCapabilities;
  std::string FLauncherParams;
  std::unique_ptr<TAndroidDevice> FAndroidDevice;

private:
  enum class TWaitResult { Ready, TimedOut, Failed };
  TWaitResult WaitForOutput();
  Int64 Read(char* Buffer, size_t Count);
  Int64 Write(const char* Buffer, size_t Count);
  std::string FormatBadExeErrorMessage(const std::string& SystemMessage, const std::string& Path);
  void OpenLogFile();
  void ReleaseChild();

  /// Written by Start and SendRequest (request lock held).
  std::string FLastError;
  /// Written and read by the output thread.
  std::string FLastReadError;
  std::atomic<bool> FRunning{false};
  std::atomic<bool> FStopping{false};
  std::atomic<bool> FReplyBusy{false};
  Integer FProcessHandle = 0;
  std::unique_ptr<TPipe> FStdInPipe;
  std::unique_ptr<TPipe> FStdOutPipe;
  THandle FStdOutHandle = InvalidHandle;
  THandle FStdInHandle = InvalidHandle;
  std::vector<char> FBuffer;
  size_t FLastBytesRead = 0;
  /// Bytes read after the last reply's prompt, kept at the front of FBuffer.
  size_t FHeldBytes = 0;
  std::unique_ptr<TLogWriter> FLogFile;
  std::string FCommandFile;
  std::string FGDBEndOfLineMarker;
};

/// An Android device reached through the debug bridge, on which lldb-server
/// runs for the time of a debug session.
class TAndroidDevice {
public:
  TAndroidDevice(const std::string& AdbPath, const std::string& LLDBServerCmd, const std::string& PsCmd,
                 const std::string& KillCmd);
  /// Shuts the server down and waits for its thread.
  ~TAndroidDevice();
  TAndroidDevice(const TAndroidDevice&) = delete;
  TAndroidDevice& operator=(const TAndroidDevice&) = delete;

  /// Starts lldb-server through the bridge and finds its device process id.
  bool StartLLDBServer();
  /// Kills the device process Pid; failures are ignored.
  void Terminate(Integer Pid);
  void ShutdownLLDBServer();

  std::string FLastError;
  Integer FLLDBServerPid = -1;

private:
  /// The run of lldb-server; it lasts as long as the server.
  void RunLLDBServer();
  void RunBridge(const std::string& Arguments);

  std::string FAdbPath;
  std::string FLLDBServerCmd;
  std::string FPsCmd;
  std::string FKillCmd;
  std::thread FLLDBServerThread;
  std::atomic<bool> FServerStarted{false};
  std::atomic<bool> FServerFinished{false};
  /// Written by the server thread before FServerFinished is set.
  std::string FServerError;
};

} // namespace midebug
