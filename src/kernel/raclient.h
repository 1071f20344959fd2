#pragma once
/// \file
/// The client side of the remote platform agent, as the kernels use it: the
/// channel to a debugger instance run by an agent, the runner of host
/// programs, and where the Android tools are.

#include "platform/types.h"

#include <string>

namespace midebug {

/// One channel to the remote agent. Every call after GDBStart names the
/// debugger instance by the id GDBStart returned; two channels (one only for
/// reading replies, one for everything else) may reach the same instance.
class TRAClient {
public:
  virtual ~TRAClient() = default;

  /// Reaches the agent; Connected tells afterwards whether that worked.
  virtual void Connect(void* Listener) = 0;
  virtual bool Connected() const = 0;

  /// Starts the debugger LauncherPath on the agent's machine. KernelType
  /// carries the kernel's target bits (16: Windows target, 32: its variant).
  /// Fills the instance id, the debuggee's entry point (0 when unknown), the
  /// debugger's capability bits and an LLDB initialisation file (may be empty).
  virtual bool GDBStart(const std::string& LauncherPath, Integer PrepCommandId, Integer KernelType, Integer& Id,
                        Int64& EntryPoint, Int64& Capabilities, std::string& LLDBInitFile) = 0;
  /// Hands one command line, without line end, to the debugger.
  virtual bool GDBSendRequest(Integer Id, const std::string& Command) = 0;
  /// Blocks until the next reply block (the output up to, without, the
  /// prompt); false when the connection or the debugger is gone.
  virtual bool GDBGetReply(Integer Id, std::string& Reply) = 0;
  virtual bool GDBInterrupt(Integer Id, Integer Pid) = 0;
  virtual bool GDBTerminate(Integer Id, Integer Pid) = 0;
  /// The agent keeps the instance's traffic log.
  virtual void GDBLog(Integer Id, const std::string& Text, bool NewLine) = 0;
  /// Ends the instance; a GDBGetReply pending on another channel returns.
  virtual void GDBStop(Integer Id) = 0;
  virtual std::string GetLastError() const = 0;
};

/// Runs one host program to its end and collects what it printed. One object
/// per run.
class TLocalMethodsClient {
public:
  /// Runs Program with the blank-separated Arguments and waits until it has
  /// ended. Input is written to its standard input (then closed). Output and
  /// error output are collected when CollectOutput is set. True when the
  /// program ran (whatever its exit code); ExitCode and ProcessId tell how.
  /// TimeoutMs 0 waits without limit; a program still running after a
  /// positive TimeoutMs is killed and the run fails.
  bool DoRun(const std::string& Program, const std::string& Arguments, const std::string& Input, bool CollectOutput,
             bool Hidden, Integer& ExitCode, Integer& ProcessId, Integer TimeoutMs, void* Callback);

  /// The collected output after a successful run, the error text after a
  /// failed one.
  const std::string& ResultText() const { return FResultText; }

  /// Removes the first line from Text and returns it without its line end.
  static std::string GetLine(std::string& Text);
  /// Removes the first blank-separated token from Text and returns it.
  static std::string GetToken(std::string& Text);

private:
  std::string FResultText;
};

/// Where the Android debug bridge is and what to ask of it.
struct TAndroidLLDBInfo {
  std::string AdbPath;
  /// Starts lldb-server on the device; the run lasts as long as the server.
  std::string LLDBServerArgs;
  /// Lists the device's processes (user, pid, ppid, ..., name).
  std::string PsArgs;
  /// Kills a device process; its id is appended after a blank.
  std::string KillArgs;
};

/// The bridge settings: the environment variables MIDEBUG_ADB,
/// MIDEBUG_ADB_LLDB_SERVER_ARGS, MIDEBUG_ADB_PS_ARGS and MIDEBUG_ADB_KILL_ARGS
/// when set, else "adb" on PATH with the usual device commands.
TAndroidLLDBInfo AndroidLLDBInfo();

} // namespace midebug
