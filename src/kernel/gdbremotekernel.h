#pragma once
/// \file
/// The kernel for a debugger run by a remote platform agent.

#include "kernel/gdbkernel.h"

#include <atomic>
#include <memory>
#include <string>

namespace midebug {

/// Drives a debugger that a remote agent runs, through the agent's client
/// channels, behind the interface of the local kernel. The agent is found
/// through the remote profile named at construction, on the IDE's service
/// registry. Two channels reach the debugger: the read channel, used only by
/// the output thread for replies, and the write channel for everything else.
class TGDBRemoteKernel : public TGDBKernel {
public:
  TGDBRemoteKernel(const std::string& Profile, const std::string& Launcher, Integer PrepCommandId);
  /// Stops the debugger on the agent, waits until the output thread has
  /// left GetReply, then frees the channels.
  ~TGDBRemoteKernel() override;

  /// 0 until the write channel exists.
  Int64 GetCapabilities() override;
  /// Ignored until the write channel exists.
  void SetCapabilites(Int64 Value) override;
  /// The initialisation file the agent named at start.
  std::string GetLLDBInitFile() override;
  void Terminate(Integer Pid) override;
  void Interrupt(Integer Pid) override;
  /// The agent keeps the log.
  void Log(const std::string& Text, bool NewLine) override;
  /// Finds the profile's agent, opens both channels and has the agent start
  /// the debugger.
  bool Start() override;
  bool SendRequest(const std::string& Command) override;
  bool GetReply(std::string& Reply) override;
  /// The read channel's error text for ReadError, else the write channel's;
  /// before the agent was reached, why it was not.
  std::string GetLastError(bool ReadError) override;
  /// Ends the instance on the agent, which releases a pending read.
  void Stop() override;

  const std::string& GetRemoteProfile() const { return FRemoteProfile; }

private:
  std::string FRemoteProfile;
  std::string FRemoteLauncher;
  std::string FLLDBInitFile;
  Integer FPrepCommandId;
  /// The debugger's instance on the agent; set by Start before the output
  /// thread exists.
  std::atomic<Integer> FId{0};
  std::unique_ptr<TRAClient> FReadChannel;
  std::unique_ptr<TRAClient> FWriteChannel;
  /// Set by Start once the write channel exists; read by any thread.
  std::atomic<bool> FHasWriteChannel{false};
  std::atomic<bool> FChannelReplyBusy{false};
  /// Why Start failed before it could ask the agent.
  std::string FStartError;
};

} // namespace midebug
