// The remote kernel against a scripted agent channel reached through a test
// profile on the IDE's service registry.

#include "kernel/gdbkernel.h"
#include "kernel/gdbremotekernel.h"
#include "kernel/raclient.h"
#include "midebug.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

namespace midebug {
namespace {

constexpr const char* TestProfileName = "scripted-agent";

/// The scripted agent: how it answers, and every call its channels received
/// ("<channel number> <operation> <arguments>"), shared by its channels.
struct TScriptedAgent {
  bool ConnectSucceeds = true;
  Integer Id = 7;
  Int64 EntryPoint = 0x401000;
  Int64 Capabilities = 0;
  std::string InitFile;

  std::mutex Lock;
  std::condition_variable Changed;
  std::vector<std::string> Calls;
  bool Stopped = false;

  void Record(const std::string& Call) {
    std::lock_guard Guard(Lock);
    Calls.push_back(Call);
    Changed.notify_all();
  }
  std::vector<std::string> TakeCalls() {
    std::lock_guard Guard(Lock);
    return std::exchange(Calls, {});
  }
  void WaitForCall(const std::string& Call) {
    std::unique_lock Guard(Lock);
    Changed.wait(Guard, [&] { return std::find(Calls.begin(), Calls.end(), Call) != Calls.end(); });
  }
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
  /// Blocks until the instance is stopped.
  bool GDBGetReply(Integer Id, std::string& Reply) override {
    FAgent->Record(FName + " reply " + std::to_string(Id));
    std::unique_lock Guard(FAgent->Lock);
    FAgent->Changed.wait(Guard, [this] { return FAgent->Stopped; });
    Reply = "late";
    FAgent->Calls.push_back(FName + " reply returned");
    return false;
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
  void GDBStop(Integer Id) override {
    FAgent->Record(FName + " stop " + std::to_string(Id));
    std::lock_guard Guard(FAgent->Lock);
    FAgent->Stopped = true;
    FAgent->Changed.notify_all();
  }
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

  // Everything but replies goes to the write channel, with the agent's id.
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

TEST_F(RemoteKernel, DestructionStopsTheAgentThenWaitsForThePendingReader) {
  auto* Kernel = new TGDBRemoteKernel(TestProfileName, "gdb", 0);
  ASSERT_TRUE(Kernel->Start());
  bool ReadResult = true;
  std::thread Reader([&] {
    std::string Reply;
    ReadResult = Kernel->GetReply(Reply);
  });
  Agent->WaitForCall("1 reply 7");
  delete Kernel;
  Reader.join();
  EXPECT_FALSE(ReadResult);
  const TCalls Calls = Agent->TakeCalls();
  auto Position = [&Calls](const std::string& Call) {
    return std::find(Calls.begin(), Calls.end(), Call) - Calls.begin();
  };
  // The read channel outlives the reader; the stop is what releases it.
  EXPECT_EQ(Calls.back(), "1 free");
  EXPECT_LT(Position("2 stop 7"), Position("1 reply returned"));
  EXPECT_LT(Position("2 stop 7"), Position("2 free"));
}

} // namespace
} // namespace midebug
