// The in-process agent: GDB started on this machine through the "local"
// profile, one session end to end.

#include "kernel/gdbkernel.h"
#include "kernel/gdbremotekernel.h"
#include "kernel/localagent.h"
#include "midebug.h"
#include "testsupport.h"

#include <gtest/gtest.h>

namespace midebug {
namespace {

using test::ReplyContaining;

/// Sends Command and returns the reply block that holds its result record.
std::string Ask(TGDBKernel& Kernel, const std::string& Token, const std::string& Command) {
  if (!Kernel.SendRequest(Token + Command))
    return "write failed: " + Kernel.GetLastError(false);
  return ReplyContaining(Kernel, Token + "^");
}

/// A remote kernel on GDB through the local profile, past its greeting.
std::unique_ptr<TGDBRemoteKernel> StartLocalGdb() {
  auto Kernel = std::make_unique<TGDBRemoteKernel>(LocalProfileName, "gdb", 0);
  if (!Kernel->Start()) {
    ADD_FAILURE() << Kernel->GetLastError(false);
    return Kernel;
  }
  std::string Greeting;
  EXPECT_TRUE(Kernel->GetReply(Greeting)) << Kernel->GetLastError(true);
  EXPECT_NE(Greeting.find("=thread-group-added"), std::string::npos) << Greeting;
  return Kernel;
}

TEST(LocalAgentWithGdb, SessionRunsInterruptsAndKillsTheDebuggeeThroughBothChannels) {
  auto Kernel = StartLocalGdb();
  const std::string Version = Ask(*Kernel, "0980000000001", "-gdb-version");
  EXPECT_NE(Version.find("~\"GNU gdb"), std::string::npos) << Version;
  EXPECT_TRUE(Version.ends_with("0980000000001^done\n")) << Version;
  EXPECT_TRUE(Kernel->IsLinux());
  EXPECT_FALSE(Kernel->IsLLDB());

  ASSERT_NE(Ask(*Kernel, "1", "-file-exec-and-symbols /bin/sleep").find("1^done"), std::string::npos);
  ASSERT_NE(Ask(*Kernel, "2", "-exec-arguments 60").find("2^done"), std::string::npos);
  ASSERT_TRUE(Kernel->SendRequest("3-exec-run"));
  const std::string Started = ReplyContaining(*Kernel, "3^running");
  const std::string PidField = "pid=\"";
  const size_t PidAt = Started.find(PidField);
  ASSERT_NE(PidAt, std::string::npos) << Started;
  const Integer Pid = std::stoi(Started.substr(PidAt + PidField.size()));

  // GDB reads nothing while the program runs; the signal is what stops it.
  Kernel->Interrupt(Pid);
  EXPECT_NE(ReplyContaining(*Kernel, "*stopped").find("signal-name=\"SIGINT\""), std::string::npos);

  Kernel->Terminate(Pid);
  ASSERT_TRUE(Kernel->SendRequest("4-exec-continue"));
  // Either the continue reaches GDB before the kill has taken the program,
  // which then runs into its end, or after, and GDB says it cannot resume
  // a program that is gone.
  const std::string Resumed = ReplyContaining(*Kernel, "4^");
  if (Resumed.find("4^running") == std::string::npos) {
    EXPECT_NE(Resumed.find("No such process"), std::string::npos) << Resumed;
    return;
  }
  const std::string End =
      Resumed.find("*stopped") != std::string::npos ? Resumed : ReplyContaining(*Kernel, "*stopped");
  EXPECT_NE(End.find("exited-signalled"), std::string::npos) << End;
}

} // namespace
} // namespace midebug
