// The runner of host programs and the Android bridge settings.

#include "kernel/raclient.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <cstdlib>

namespace midebug {
namespace {

using test::TScopedEnv;
using test::TScratchDir;

/// One DoRun and what it reported.
struct TRun {
  bool Ran = false;
  std::string Text;
  Integer ExitCode = 0;
  Integer ProcessId = 0;
};

TRun RunProgram(const std::string& Program, const std::string& Arguments, const std::string& Input = {},
                Integer TimeoutMs = 0, bool CollectOutput = true) {
  TLocalMethodsClient Client;
  TRun Result;
  Result.Ran = Client.DoRun(Program, Arguments, Input, CollectOutput, true, Result.ExitCode, Result.ProcessId,
                            TimeoutMs, nullptr);
  Result.Text = Client.ResultText();
  return Result;
}

TEST(LocalMethodsRun, CollectsStandardOutputAndError) {
  const TRun Result = RunProgram("/bin/sh", "-c \"echo out; echo err >&2\"");
  ASSERT_TRUE(Result.Ran) << Result.Text;
  EXPECT_EQ(Result.Text, "out\nerr\n");
  EXPECT_EQ(Result.ExitCode, 0);
  EXPECT_GT(Result.ProcessId, 0);
}

TEST(LocalMethodsRun, ProgramThatRanSucceedsWhateverItsExitCode) {
  const TRun Result = RunProgram("sh", "-c \"echo partial; exit 7\"");
  ASSERT_TRUE(Result.Ran) << Result.Text;
  EXPECT_EQ(Result.Text, "partial\n");
  EXPECT_EQ(Result.ExitCode, 7);
}

TEST(LocalMethodsRun, OutputNotCollectedIsStillDrained) {
  // A megabyte is far beyond a pipe's buffer: the run ends only when the
  // output is read, collected or not.
  const TRun Result = RunProgram("head", "-c 1000000 /dev/zero", {}, 0, false);
  ASSERT_TRUE(Result.Ran) << Result.Text;
  EXPECT_EQ(Result.Text, "");
  EXPECT_EQ(Result.ExitCode, 0);
}

TEST(LocalMethodsRun, ProgramThatCannotRunFailsWithItsReason) {
  TScratchDir Scratch;
  const std::string Missing = Scratch.Path() + "/no-such-program";
  const TRun Result = RunProgram(Missing, "--version");
  EXPECT_FALSE(Result.Ran);
  EXPECT_NE(Result.Text.find(Missing), std::string::npos) << Result.Text;
  EXPECT_NE(Result.Text.find("No such file or directory"), std::string::npos) << Result.Text;
  EXPECT_EQ(Result.ProcessId, -1);
}

TEST(LocalMethodsRun, LargeInputEchoedBackDoesNotDeadlock) {
  // More than the two pipes hold together: the program's output must be read
  // while its input is still being written.
  std::string Input;
  while (Input.size() < 1000000)
    Input += "line " + std::to_string(Input.size()) + "\n";
  const TRun Result = RunProgram("cat", "", Input);
  ASSERT_TRUE(Result.Ran) << Result.Text;
  EXPECT_TRUE(Result.Text == Input) << "got " << Result.Text.size() << " of " << Input.size() << " bytes";
}

TEST(LocalMethodsRun, ProgramIgnoringItsInputStillSucceeds) {
  const TRun Result = RunProgram("true", "", std::string(1000000, 'x'));
  EXPECT_TRUE(Result.Ran) << Result.Text;
  EXPECT_EQ(Result.ExitCode, 0);
}

TEST(LocalMethodsRun, ProgramOutlivingTheTimeOutIsKilledAndFails) {
  const struct {
    const char* Name;
    std::string Arguments;
  } Cases[] = {
      {"keeps its output open", "-c \"echo started; exec sleep 30\""},
      {"closes its output but keeps running", "-c \"exec >&- 2>&-; exec sleep 30\""},
  };
  for (const auto& Case : Cases) {
    const TRun Result = RunProgram("/bin/sh", Case.Arguments, {}, 200);
    EXPECT_FALSE(Result.Ran) << Case.Name;
    EXPECT_NE(Result.Text.find("did not end in time"), std::string::npos) << Case.Name << ": " << Result.Text;
    EXPECT_EQ(Result.ExitCode, 128 + 9) << Case.Name;
  }
}

TEST(LocalMethodsText, GetLineSplitsOffTheFirstLine) {
  const struct {
    std::string Text;
    std::string Line;
    std::string Rest;
  } Cases[] = {
      {"first\nsecond\n", "first", "second\n"},
      {"first\r\nsecond\r\n", "first", "second\r\n"},
      {"last without end", "last without end", ""},
      {"last with CR\r", "last with CR", ""},
      {"\nafter empty", "", "after empty"},
      {"\r\n", "", ""},
      {"", "", ""},
      {"a\rb\n", "a\rb", ""},
  };
  for (const auto& Case : Cases) {
    std::string Text = Case.Text;
    EXPECT_EQ(TLocalMethodsClient::GetLine(Text), Case.Line) << ::testing::PrintToString(Case.Text);
    EXPECT_EQ(Text, Case.Rest) << ::testing::PrintToString(Case.Text);
  }
}

TEST(LocalMethodsText, GetTokenSkipsBlanksAndTabs) {
  const struct {
    std::string Text;
    std::string Token;
    std::string Rest;
  } Cases[] = {
      {"shell 1234", "shell", " 1234"},
      {"   shell 1234", "shell", " 1234"},
      {"\t\tshell\t1234", "shell", "\t1234"},
      {"single", "single", ""},
      {" \t ", "", ""},
      {"", "", ""},
  };
  for (const auto& Case : Cases) {
    std::string Text = Case.Text;
    EXPECT_EQ(TLocalMethodsClient::GetToken(Text), Case.Token) << ::testing::PrintToString(Case.Text);
    EXPECT_EQ(Text, Case.Rest) << ::testing::PrintToString(Case.Text);
  }
}

TEST(LocalMethodsAndroidInfo, EnvironmentOverridesEachSetting) {
  TScopedEnv Adb("MIDEBUG_ADB", "/opt/sdk/platform-tools/adb");
  TScopedEnv Server("MIDEBUG_ADB_LLDB_SERVER_ARGS", "-s emulator-5554 shell /data/lldb-server platform");
  TScopedEnv Ps("MIDEBUG_ADB_PS_ARGS", "-s emulator-5554 shell ps -A");
  TScopedEnv Kill("MIDEBUG_ADB_KILL_ARGS", "-s emulator-5554 shell kill");
  const TAndroidLLDBInfo Info = AndroidLLDBInfo();
  EXPECT_EQ(Info.AdbPath, "/opt/sdk/platform-tools/adb");
  EXPECT_EQ(Info.LLDBServerArgs, "-s emulator-5554 shell /data/lldb-server platform");
  EXPECT_EQ(Info.PsArgs, "-s emulator-5554 shell ps -A");
  EXPECT_EQ(Info.KillArgs, "-s emulator-5554 shell kill");
}

} // namespace
} // namespace midebug
