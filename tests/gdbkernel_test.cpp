// The local debugger transport against the real GDB and the scripted fake.

#include "kernel/gdbkernel.h"
#include "midebug.h"
#include "platform/hostthread.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace midebug {
namespace {

using test::ReplyContaining;
using test::ReadWholeFile;
using test::FakeDebuggerPath;
using test::TScopedEnv;
using test::TScratchDir;

/// A kernel running the fake debugger on a script given inline.
class FakeDebuggerTest : public ::testing::Test {
protected:
  std::unique_ptr<TGDBKernel> StartFake(const std::string& Script) {
    ScriptEnv.reset();
    ScriptEnv = std::make_unique<TScopedEnv>("FAKEMI_SCRIPT", Scratch.WriteFile("fake.script", Script));
    auto Kernel = std::make_unique<TGDBKernel>(FakeDebuggerPath(), "");
    EXPECT_TRUE(Kernel->Start()) << Kernel->GetLastError(false);
    return Kernel;
  }

  TScratchDir Scratch;
  std::unique_ptr<TScopedEnv> ScriptEnv;
};

TEST(KernelWithGdb, StartsWithMiOptionsAndAnswersARequest) {
  TGDBKernel Kernel("", "");
  EXPECT_EQ(Kernel.GetCommandLine(), "\"gdb\" --nw --nx  --interpreter=mi2");
  ASSERT_TRUE(Kernel.Start()) << Kernel.GetLastError(false);

  std::string Greeting;
  ASSERT_TRUE(Kernel.GetReply(Greeting));
  EXPECT_NE(Greeting.find("=thread-group-added"), std::string::npos);

  ASSERT_TRUE(Kernel.SendRequest("0980000000001-gdb-version"));
  std::string Reply;
  ASSERT_TRUE(Kernel.GetReply(Reply));
  EXPECT_NE(Reply.find("~\"GNU gdb"), std::string::npos);
  // The block ends with the result record's line; the prompt is not part of it.
  EXPECT_TRUE(Reply.ends_with("0980000000001^done\n")) << Reply;
  EXPECT_EQ(Reply.find("(gdb)"), std::string::npos);
}

TEST(KernelWithGdb, ReportsTheDebuggersEndAsProcessExited) {
  TGDBKernel Kernel("", "");
  ASSERT_TRUE(Kernel.Start());
  ASSERT_TRUE(Kernel.SendRequest("7-gdb-exit"));
  EXPECT_EQ(ReplyContaining(Kernel, "7^exit").find("read failed"), std::string::npos);
  std::string Reply;
  while (Kernel.GetReply(Reply)) {
  }
  EXPECT_EQ(Kernel.GetLastError(true), "process exited");
  // Writing to a debugger that has gone fails; it never ends the host.
  bool Written = true;
  for (int Attempt = 0; Attempt < 500 && Written; ++Attempt) {
    Written = Kernel.SendRequest("8-gdb-version");
    YieldAndSleep(2);
  }
  EXPECT_FALSE(Written);
}

TEST(KernelWithGdb, LogsTheTrafficIntoANewNestedDirectory) {
  TScratchDir Scratch;
  const std::string LogDir = Scratch.Path() + "/one/two";
  TScopedEnv Debug("GDB_DEBUG", "1");
  TScopedEnv OutDir("GDB_OUTDIR", LogDir);
  std::string LogFile;
  {
    TGDBKernel Kernel("", "");
    ASSERT_TRUE(Kernel.Start());
    LogFile = Kernel.GetLogFileName();
    EXPECT_EQ(LogFile, LogDir + "/gdb_" + std::to_string(Kernel.GetProcessHandle()) + ".log");
    std::string Reply;
    ASSERT_TRUE(Kernel.GetReply(Reply));
    ASSERT_TRUE(Kernel.SendRequest("42-gdb-version"));
    ASSERT_TRUE(Kernel.GetReply(Reply));
  }
  const std::string Log = ReadWholeFile(LogFile);
  // The command as sent, then the raw reply with its prompt.
  EXPECT_NE(Log.find("42-gdb-version\n"), std::string::npos);
  EXPECT_NE(Log.find("42^done\n(gdb) \n"), std::string::npos);
}

TEST_F(FakeDebuggerTest, RepliesOfAndBeyondTheBufferSizeArriveWhole) {
  for (const size_t Size : {2048u, 100000u}) {
    auto Kernel = StartFake("sendfill " + std::to_string(Size) + " x\nsleep 20\nprompt\nwait-eof\n");
    std::string Reply;
    ASSERT_TRUE(Kernel->GetReply(Reply));
    EXPECT_EQ(Reply, std::string(Size, 'x'));
  }
}

TEST_F(FakeDebuggerTest, PromptInsideOneReadEndsABlockAndTheRestStartsTheNext) {
  // GDB prints the next library record right after the prompt that follows
  // "*running"; nothing more may come while the program runs, so the block
  // before the prompt must not wait for it.
  auto Kernel = StartFake(ReadWholeFile(test::FakeScript("prompt-inside-a-read.script")));
  std::string Reply;
  ASSERT_TRUE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "1^done\n");
  ASSERT_TRUE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "=thread-created,id=\"1\"\n");
  // A prompt split between two reads.
  ASSERT_TRUE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "=library-loaded\n");
  ASSERT_TRUE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "2^done\n");
}

TEST_F(FakeDebuggerTest, OnlyTheBytesThatAreNotUtf8AreReadAsWindows1252) {
  const std::pair<const char*, const char*> Cases[] = {
      // The UTF-8 on the second line stays what it is.
      {"send ~\"caf\\xe9 \\x80 \\x9f\"\nsend ~\"\\xc3\\xa9\"\n", "~\"caf\u00e9 \u20ac \u0178\"\n~\"\u00e9\"\n"},
      {"send ~\"\\xc3\\xa9\\xe2\\x82\\xac\"\n", "~\"\u00e9\u20ac\"\n"},
  };
  for (const auto& [Script, Expected] : Cases) {
    auto Kernel = StartFake(std::string(Script) + "prompt\nwait-eof\n");
    std::string Reply;
    ASSERT_TRUE(Kernel->GetReply(Reply));
    EXPECT_EQ(Reply, Expected);
  }
}

TEST_F(FakeDebuggerTest, DebuggerDyingMidReplyDeliversWhatItPrintedThenFails) {
  auto Kernel = StartFake("sendraw ^done,partial\nexit 1\n");
  std::string Reply;
  ASSERT_TRUE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "^done,partial");
  EXPECT_FALSE(Kernel->GetReply(Reply));
  EXPECT_EQ(Reply, "");
  EXPECT_EQ(Kernel->GetLastError(true), "process exited");
}

TEST_F(FakeDebuggerTest, ClosedOutputOfALivingDebuggerEndsTheRead) {
  auto Kernel = StartFake("close-output\nhang\n");
  std::string Reply;
  EXPECT_FALSE(Kernel->GetReply(Reply));
  EXPECT_EQ(Kernel->GetLastError(true), "process exited");
}

TEST_F(FakeDebuggerTest, CommandFileIsPassedAndTheDebuggerRunsBesideIt) {
  const std::string CommandFile = Scratch.WriteFile("start up.gdb", "");
  ScriptEnv = std::make_unique<TScopedEnv>("FAKEMI_SCRIPT", Scratch.WriteFile("fake.script", "print-args\nprint-cwd\nprompt\nwait-eof\n"));
  {
    TGDBKernel Kernel(FakeDebuggerPath(), CommandFile);
    EXPECT_EQ(Kernel.GetCommandLine(),
              "\"" + FakeDebuggerPath() + "\" --nw --nx  --interpreter=mi2 -x \"" + CommandFile + "\"");
    ASSERT_TRUE(Kernel.Start());
    std::string Reply;
    ASSERT_TRUE(Kernel.GetReply(Reply));
    EXPECT_EQ(Reply, "--nw --nx --interpreter=mi2 -x " + CommandFile + "\n" + Scratch.Path() + "\n");
  }
  // The command file is the kernel's: it goes with it.
  EXPECT_FALSE(std::filesystem::exists(CommandFile));
}

} // namespace
} // namespace midebug
