// The in-process agent: debuggers started on this machine through the
// "local" profile, the real GDB and lldb-mi played by the scripted fake.

#include "kernel/gdbkernel.h"
#include "kernel/gdbremotekernel.h"
#include "kernel/localagent.h"
#include "midebug.h"
#include "platform/hostfiles.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace midebug {
namespace {

using test::ReplyContaining;
using test::TScopedEnv;
using test::TScratchDir;

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

TEST(LocalAgentWithGdb, RemoteKernelRunsARoundTripThroughBothChannels) {
  auto Kernel = StartLocalGdb();
  const std::string Reply = Ask(*Kernel, "0980000000001", "-gdb-version");
  EXPECT_NE(Reply.find("~\"GNU gdb"), std::string::npos) << Reply;
  EXPECT_TRUE(Reply.ends_with("0980000000001^done\n")) << Reply;
  EXPECT_EQ(Kernel->FEntryPoint, 0u);
  EXPECT_EQ(Kernel->GetLLDBInitFile(), "");
}

TEST(LocalAgentWithGdb, ReportsTheCapabilitiesGdbHasOnLinux) {
  auto Kernel = StartLocalGdb();
  EXPECT_TRUE(Kernel->IsLinux());
  EXPECT_FALSE(Kernel->IsLLDB());

  // Each command-backed bit agrees with what this GDB says of the command.
  struct TCommandBit {
    const char* Command;
    Int64 Bit;
  };
  const TCommandBit CommandBits[] = {
      {"exec-abort", capExecAbortCommand},       {"pid-info", capPidInfoCommand},
      {"thread-info", capThreadInfoCommand},     {"enable-timings", capTimingsEnableCommand},
  };
  int Token = 100;
  for (const TCommandBit& Entry : CommandBits) {
    const std::string Reply =
        Ask(*Kernel, std::to_string(++Token), std::string("-info-gdb-mi-command ") + Entry.Command);
    const bool Exists = Reply.find("exists=\"true\"") != std::string::npos;
    EXPECT_EQ(Exists, (Kernel->GetCapabilities() & Entry.Bit) != 0) << Entry.Command << ": " << Reply;
  }
  EXPECT_NE(Ask(*Kernel, "201", "-gdb-set new-console on").find("201^error"), std::string::npos);
  EXPECT_FALSE(Kernel->SupportNewConsoleOption());
  EXPECT_NE(Ask(*Kernel, "202", "-enable-timings no").find("202^done"), std::string::npos);
  EXPECT_TRUE(Kernel->SupportDisableTimings());
}

TEST(LocalAgentWithGdb, InterruptsAndKillsTheDebuggee) {
  auto Kernel = StartLocalGdb();
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
  EXPECT_NE(ReplyContaining(*Kernel, "*stopped").find("exited-signalled"), std::string::npos);
}

TEST(LocalAgentWithLldbMi, StartsTheFrontEndFromPathAndReportsLldbCapabilities) {
  test::TFakeOnPath Fake("lldb-mi", "localagent-lldb.script");

  TGDBRemoteKernel Kernel(LocalProfileName, "lldb-mi", 0);
  Kernel.FKernelType = 6;
  ASSERT_TRUE(Kernel.Start()) << Kernel.GetLastError(false);
  EXPECT_TRUE(Kernel.IsLLDB());
  EXPECT_FALSE(Kernel.IsWindows());

  // The greeting block is what the front end printed before its prompt:
  // here, the arguments it was started with.
  std::string Reply;
  ASSERT_TRUE(Kernel.GetReply(Reply)) << Kernel.GetLastError(true);
  EXPECT_EQ(Reply, "--interpreter\n");

  EXPECT_NE(Ask(Kernel, "11", "-break-insert -f main").find("pending=[\"main\"]"), std::string::npos);

  // The front end prints a prompt after each asynchronous record of a run.
  // A prompt ends a block only when it ends what has been read so far, so
  // the records come in one block or several; either way all of them, in
  // order, and without the last prompt.
  ASSERT_TRUE(Kernel.SendRequest("12-exec-run"));
  std::string Records;
  while (Records.find("*running") == std::string::npos && Kernel.GetReply(Reply))
    Records += Reply;
  for (size_t Prompt; (Prompt = Records.find("(gdb)\n")) != std::string::npos;)
    Records.erase(Prompt, 6);
  EXPECT_EQ(Records, "12^running\n=thread-group-started,id=\"i1\",pid=\"4242\"\n"
                     "=thread-created,id=\"1\",group-id=\"i1\"\n*running,thread-id=\"all\"\n");

  ASSERT_TRUE(Kernel.SendRequest("13-gdb-exit"));
  EXPECT_EQ(ReplyContaining(Kernel, "13^exit"), "13^exit\n");
  EXPECT_FALSE(Kernel.GetReply(Reply));
  EXPECT_EQ(Kernel.GetLastError(true), "process exited");
}

} // namespace
} // namespace midebug
