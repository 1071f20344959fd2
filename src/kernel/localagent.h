#pragma once
/// \file
/// The agent that runs inside this library: it starts debuggers on this
/// machine through the pipe transport and serves them to remote kernels
/// through the agent's client contract, so the remote kernel debugs local
/// programs with no agent process of its own.

#include "kernel/raclient.h"

#include <atomic>
#include <mutex>
#include <string>

namespace midebug {

/// One channel to the in-process agent. Debugger instances live in a table
/// shared by every channel of the process; any channel reaches an instance
/// through the id GDBStart returned, so a read channel and a write channel
/// serve the same debugger.
///
/// The launcher "lldb-mi" (LLDB's MI front end, found on PATH) is started
/// with "--interpreter" as an LLDB kernel; any other launcher, and the empty
/// one ("gdb"), as GDB with its MI options.
class TLocalAgentClient : public TRAClient {
public:
  /// The agent is in this process: it is always reached.
  void Connect(void* Listener) override;
  bool Connected() const override { return FConnected; }

  bool GDBStart(const std::string& LauncherPath, Integer PrepCommandId, Integer KernelType, Integer& Id,
                Int64& EntryPoint, Int64& Capabilities, std::string& LLDBInitFile) override;
  bool GDBSendRequest(Integer Id, const std::string& Command) override;
  bool GDBGetReply(Integer Id, std::string& Reply) override;
  /// Sends SIGINT to the debuggee Pid.
  bool GDBInterrupt(Integer Id, Integer Pid) override;
  /// Kills the debuggee Pid (SIGKILL).
  bool GDBTerminate(Integer Id, Integer Pid) override;
  /// Writes into the traffic log of the instance's kernel, kept when
  /// "GDB_DEBUG" is set.
  void GDBLog(Integer Id, const std::string& Text, bool NewLine) override;
  /// Takes the instance out of the table and stops its reader; the debugger
  /// ends as soon as no call on any channel uses it any more.
  void GDBStop(Integer Id) override;
  std::string GetLastError() const override;

  /// What GDBStart reports for GDB on this machine.
  static const Int64 GDBCapabilities;
  /// What GDBStart reports for LLDB's MI front end on this machine.
  static Int64 LLDBCapabilities();

private:
  void SetLastError(const std::string& Text);

  std::atomic<bool> FConnected{false};
  /// Guards FLastError, which the channel's caller may read from another
  /// thread than the one whose call failed. A leaf lock.
  mutable std::mutex FErrorLock;
  std::string FLastError;
};

} // namespace midebug
