// The remote kernel against a scripted agent channel reached through a test
// profile on the IDE's service registry.

#include "kernel/gdbkernel.h"
#include "kernel/gdbremotekernel.h"
#include "kernel/raclient.h"
#include "midebug.h"

#include <gtest/gtest.h>

#include <memory>
#include <utility>
#include <vector>

namespace midebug {
namespace {

constexpr const char* TestProfileName = "scripted-agent";

/// The scripted agent: how it answers, and every call its channels received
/// ("<channel number> <operation> <arguments>"), shared by its channels.
/// The kernel reads and writes on one thread here, so no locking.
struct TScriptedAgent {
  bool ConnectSucceeds = true;
  Integer Id = 7;
  Int64 EntryPoint = 0x401000;
  Int64 Capabilities = 0;
  std::string InitFile;
  std::vector<std::string> Calls;

  void Record(const std::string& Call) { Calls.push_back(Call); }
  std::vector<std::string> TakeCalls() { return std::exchange(Calls, {}); }
};

class TScriptedChannel : public TRAClient {
public:
  TScriptedChannel(std::shared_ptr<TScriptedAgent> Agent, int Number)
      : FAgent(std::move(Agent)), FName(std::to_string(Number)) {}
  ~TScriptedChannel() override { FAgent->Record(FName + " free"); }

  void Connect(void*) override {
    FAgent->Record(FName + " connect");
    FConnected = FAgent->ConnectSucceeds;
  }
  bool Connected() const override { return FConnected; }
  bool GDBStart(const std::string& LauncherPath, Integer PrepCommandId, Integer KernelType, Integer& Id,
                Int64& EntryPoint, Int64& Capabilities, std::string& LLDBInitFile) override {
    FAgent->Record(FName + " start " + LauncherPath + " " + std::to_string(PrepCommandId) + " " +
                   std::to_string(KernelType));
    Id = FAgent->Id;
    EntryPoint = FAgent->EntryPoint;
    Capabilities = FAgent->Capabilities;
    LLDBInitFile = FAgent->InitFile;
    return true;
  }
  bool GDBSendRequest(Integer Id, const std::string& Command) override {
    FAgent->Record(FName + " send " + std::to_string(Id) + " " + Command);
    return true;
  }
  bool GDBGetReply(Integer Id, std::string& Reply) override {
    FAgent->Record(FName + " reply " + std::to_string(Id));
    Reply = "^done";
    return true;
  }
  bool GDBInterrupt(Integer Id, Integer Pid) override {
    FAgent->Record(FName + " interrupt " + std::to_string(Id) + " " + std::to_string(Pid));
    return true;
  }
  bool GDBTerminate(Integer Id, Integer Pid) override {
    FAgent->Record(FName + " terminate " + std::to_string(Id) + " " + std::to_string(Pid));
    return true;
  }
  void GDBLog(Integer Id, const std::string& Text, bool NewLine) override {
    FAgent->Record(FName + " log " + std::to_string(Id) + " " + Text + (NewLine ? " +newline" : ""));
  }
  void GDBStop(Integer Id) override { FAgent->Record(FName + " stop " + std::to_string(Id)); }
  std::string GetLastError() const override { return "error of channel " + FName; }

private:
  std::shared_ptr<TScriptedAgent> FAgent;
  std::string FName;
  bool FConnected = false;
};

class TScriptedProfile : public TInterfaced<IRemoteChannelFactory> {
public:
  explicit TScriptedProfile(std::shared_ptr<TScriptedAgent> Agent) : FAgent(std::move(Agent)) {}
  std::string GetProfileName() override { return TestProfileName; }
  std::string GetAgentAddress() override { return "test:0"; }
  std::unique_ptr<TRAClient> CreateChannel() override {
    return std::make_unique<TScriptedChannel>(FAgent, ++FChannels);
  }

private:
  std::shared_ptr<TScriptedAgent> FAgent;
  int FChannels = 0;
};

/// Registers the scripted agent's profile for the test's lifetime.
class RemoteKernel : public ::testing::Test {
protected:
  RemoteKernel() { Profiles()->AddProfile(TestProfileName, new TScriptedProfile(Agent)); }
  ~RemoteKernel() override { Profiles()->RemoveProfile(TestProfileName); }

  static TIntfPtr<IRemoteProfileServices> Profiles() {
    return VantageIDEServices().Service<IRemoteProfileServices>();
  }

  std::shared_ptr<TScriptedAgent> Agent = std::make_shared<TScriptedAgent>();
};

using TCalls = std::vector<std::string>;

TEST_F(RemoteKernel, StartHandsTheAgentItsArgumentsAndKeepsWhatItReturns) {
  Agent->Capabilities = capIsLLDB | capThreadNotification;
  Agent->InitFile = "/opt/lldb/.lldbinit";
  auto Kernel = std::make_unique<TGDBRemoteKernel>(TestProfileName, "/usr/bin/gdb", 3);
  Kernel->FKernelType = 6;
  ASSERT_TRUE(Kernel->Start());
  EXPECT_EQ(Agent->TakeCalls(), (TCalls{"1 connect", "2 connect", "2 start /usr/bin/gdb 3 6"}));
  EXPECT_EQ(Kernel->FEntryPoint, 0x401000u);
  EXPECT_EQ(Kernel->GetCapabilities(), capIsLLDB | capThreadNotification);
  EXPECT_EQ(Kernel->GetLLDBInitFile(), "/opt/lldb/.lldbinit");
  EXPECT_EQ(Kernel->GetEndOfLineMarker(), "(gdb)\n");

  // Replies come from the read channel, everything else goes to the write
  // channel, all with the agent's id.
  std::string Reply;
  EXPECT_TRUE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "^done");
  EXPECT_EQ(Agent->TakeCalls(), TCalls{"1 reply 7"});
  EXPECT_TRUE(Kernel->SendRequest("1-gdb-version"));
  Kernel->Interrupt(1234);
  Kernel->Terminate(1234);
  Kernel->Log("text", true);
  EXPECT_EQ(Agent->TakeCalls(), (TCalls{"2 send 7 1-gdb-version", "2 interrupt 7 1234", "2 terminate 7 1234",
                                        "2 log 7 text +newline"}));
  EXPECT_EQ(Kernel->GetLastError(true), "error of channel 1");
  EXPECT_EQ(Kernel->GetLastError(false), "error of channel 2");

  Kernel.reset();
  EXPECT_EQ(Agent->TakeCalls(), (TCalls{"2 stop 7", "2 free", "1 free"}));
}

TEST_F(RemoteKernel, ChannelThatDoesNotConnectFailsBeforeTheAgentIsAsked) {
  Agent->ConnectSucceeds = false;
  TGDBRemoteKernel Kernel(TestProfileName, "gdb", 0);
  EXPECT_FALSE(Kernel.Start());
  EXPECT_EQ(Kernel.GetLastError(false),
            std::string("cannot reach the agent of remote profile '") + TestProfileName + "': error of channel 1");
  EXPECT_EQ(Agent->TakeCalls(), (TCalls{"1 connect", "2 connect"}));
}

} // namespace
} // namespace midebug
