#include "kernel/gdbremotekernel.h"

#include "platform/hostthread.h"
#include "kernel/ideservices.h"

namespace midebug {

namespace {

/// How long the destructor sleeps between looks at the reader.
constexpr int ReaderPollMs = 2;

constexpr const char* NotStartedText = "the remote debugger has not been started";

/// The bits a Windows target always has, whatever the agent reports.
constexpr Int64 WindowsTargetCapabilities =
    capIsWindows | capStopOnEntryPoint | capExecAbortCommand | capExecInterruptCommand;

} // namespace

TGDBRemoteKernel::TGDBRemoteKernel(const std::string& Profile, const std::string& Launcher, Integer PrepCommandId)
    : TGDBKernel(Launcher, ""), FRemoteProfile(Profile), FRemoteLauncher(Launcher), FPrepCommandId(PrepCommandId) {}

TGDBRemoteKernel::~TGDBRemoteKernel() {
  if (FWriteChannel) {
    // Stopping the instance also releases a GDBGetReply pending on the
    // read channel.
    FWriteChannel->GDBStop(FId);
    FHasWriteChannel = false;
    FWriteChannel.reset();
  }
  while (FChannelReplyBusy)
    YieldAndSleep(ReaderPollMs);
  FReadChannel.reset();
}

void TGDBRemoteKernel::Stop() {
  TGDBKernel::Stop();
  if (FWriteChannel)
    FWriteChannel->GDBStop(FId);
}

Int64 TGDBRemoteKernel::GetCapabilities() { return FHasWriteChannel ? FCapabilities.load() : 0; }

void TGDBRemoteKernel::SetCapabilites(Int64 Value) {
  if (FHasWriteChannel)
    FCapabilities = Value;
}

std::string TGDBRemoteKernel::GetLLDBInitFile() { return FLLDBInitFile; }

void TGDBRemoteKernel::Terminate(Integer Pid) {
  if (FWriteChannel)
    FWriteChannel->GDBTerminate(FId, Pid);
}

void TGDBRemoteKernel::Interrupt(Integer Pid) {
  if (FWriteChannel)
    FWriteChannel->GDBInterrupt(FId, Pid);
}

void TGDBRemoteKernel::Log(const std::string& Text, bool NewLine) {
  if (FWriteChannel)
    FWriteChannel->GDBLog(FId, Text, NewLine);
}

bool TGDBRemoteKernel::Start() {
  FStartError.clear();
  const TIntfPtr<IRemoteProfileServices> Profiles = VantageIDEServices().Service<IRemoteProfileServices>();
  if (!Profiles) {
    FStartError = "no remote profile service";
    return false;
  }
  const TIntfPtr<IInterface> Profile = Profiles->GetProfile(FRemoteProfile);
  if (!Profile) {
    FStartError = "no remote profile '" + FRemoteProfile + "'";
    return false;
  }
  const TIntfPtr<IRemoteChannelFactory> Factory = QueryIntf<IRemoteChannelFactory>(Profile);
  if (!Factory) {
    FStartError = "remote profile '" + FRemoteProfile + "' offers no channels";
    return false;
  }
  FReadChannel = Factory->CreateChannel();
  if (FReadChannel)
    FReadChannel->Connect(nullptr);
  FWriteChannel = Factory->CreateChannel();
  if (FWriteChannel) {
    FWriteChannel->Connect(nullptr);
    FHasWriteChannel = true;
  }
  for (TRAClient* Channel : {FReadChannel.get(), FWriteChannel.get()}) {
    if (!Channel) {
      FStartError = "remote profile '" + FRemoteProfile + "' gave no channel";
      return false;
    }
    if (!Channel->Connected()) {
      FStartError = "cannot reach the agent of remote profile '" + FRemoteProfile + "': " + Channel->GetLastError();
      return false;
    }
  }

  Integer Id = 0;
  Int64 EntryPoint = 0;
  Int64 Capabilities = 0;
  std::string InitFile;
  const bool Started =
      FWriteChannel->GDBStart(FRemoteLauncher, FPrepCommandId, FKernelType, Id, EntryPoint, Capabilities, InitFile);
  FId = Id;
  FEntryPoint = static_cast<UInt64>(EntryPoint);
  FLLDBInitFile = InitFile;
  if (FKernelType & ktWindowsTarget)
    Capabilities |= WindowsTargetCapabilities;
  FCapabilities = Capabilities;
  return Started;
}

bool TGDBRemoteKernel::SendRequest(const std::string& Command) {
  return FWriteChannel && FWriteChannel->GDBSendRequest(FId, Command);
}

bool TGDBRemoteKernel::GetReply(std::string& Reply) {
  Reply.clear();
  if (!FReadChannel)
    return false;
  FChannelReplyBusy = true;
  const bool Result = FReadChannel->GDBGetReply(FId, Reply);
  FChannelReplyBusy = false;
  return Result;
}

std::string TGDBRemoteKernel::GetLastError(bool ReadError) {
  if (!FStartError.empty())
    return FStartError;
  TRAClient* Channel = ReadError ? FReadChannel.get() : FWriteChannel.get();
  return Channel ? Channel->GetLastError() : NotStartedText;
}

} // namespace midebug
