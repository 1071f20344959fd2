// The runner of host programs and the line and token splitting its
// callers read process listings with.

#include "kernel/raclient.h"
#include "testsupport.h"

#include <gtest/gtest.h>

namespace midebug {
namespace {

using test::TScratchDir;

/// One DoRun and what it reported.
struct TRun {
  bool Ran = false;
  std::string Text;
  Integer ExitCode = 0;
  Integer ProcessId = 0;
};

/// Runs Program to its end, output collected, with no time limit.
TRun RunProgram(const std::string& Program, const std::string& Arguments, const std::string& Input = {}) {
  TLocalMethodsClient Client;
  TRun Result;
  Result.Ran = Client.DoRun(Program, Arguments, Input, true, true, Result.ExitCode, Result.ProcessId, 0, nullptr);
  Result.Text = Client.ResultText();
  return Result;
}

TEST(LocalMethodsRun, ProgramThatRanSucceedsWithItsOutputAndExitCode) {
  const TRun Result = RunProgram("sh", "-c \"echo out; echo err >&2; exit 7\"");
  ASSERT_TRUE(Result.Ran) << Result.Text;
  EXPECT_EQ(Result.Text, "out\nerr\n");
  EXPECT_EQ(Result.ExitCode, 7);
  EXPECT_GT(Result.ProcessId, 0);
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

} // namespace
} // namespace midebug
