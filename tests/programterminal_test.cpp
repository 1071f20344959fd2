// The program's own terminal, against the real GDB through the default
// "local" profile: what the program writes reaches the IDE whole, as program
// output and never as the debugger's records, ahead of the stop or exit that
// follows it; its standard streams are a terminal, not GDB's pipes.

#include "breakpointtesting.h"

#include <unistd.h>

#include <fstream>
#include <string>

namespace midebug {
namespace {

using test::Debuggee;

class ProgramTerminal : public test::TDebugFixture {
protected:
  /// The program output the IDE heard before the Count-th call starting
  /// with Prefix (all of it when there is no such call), in order.
  std::string OutputBefore(const std::string& Prefix, size_t Count = 1) {
    const std::string ProgramOutput = "Log(" + std::to_string(etUnknown) + ",";
    std::string Output;
    for (const std::string& Call : Listener->Calls()) {
      if (Call.starts_with(Prefix) && --Count == 0)
        break;
      if (Call.starts_with(ProgramOutput))
        Output += Call.substr(ProgramOutput.size(), Call.size() - ProgramOutput.size() - 1);
    }
    return Output;
  }
};

TEST_F(ProgramTerminal, OutputLikeRecordsIsDeliveredIntactBeforeTheRealExitCode) {
  Launch(Debuggee("terminal"));
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  EXPECT_TRUE(Listener->HasCall("Exited(3,"));
  EXPECT_EQ(OutputBefore("Exited("), "~x\n*stopped,reason=\"exited\",exit-code=\"42\"\n(gdb) \n12^done\n"
                                     "stdin is a terminal, stdout is a terminal\n"
                                     "no final newline");
  EXPECT_FALSE(Listener->HasCallContaining("Log(2,x"));
}

TEST_F(ProgramTerminal, OutputOfASteppedOverCallArrivesWholeBeforeTheStop) {
  ASSERT_NO_FATAL_FAILURE(LaunchToMain(Debuggee("printlines")));
  EXPECT_EQ(OutputBefore("Suspended("), "");
  Process->GetThread(Process->GetSuspendedThreadId())->StepOver();
  ASSERT_TRUE(Listener->PumpUntil([&] { return Listener->CountOf("Suspended(") == 2; }));
  // Multi-byte characters are cut wherever the terminal's reads end.
  std::string Expected;
  for (int Line = 0; Line < 5000; ++Line)
    Expected += "line " + std::to_string(Line) + " costs \xe2\x82\xac" + std::to_string(Line) + "\n";
  EXPECT_EQ(OutputBefore("Suspended(", 2), Expected);
  Process->Terminate();
  EXPECT_TRUE(Listener->PumpUntilCall("Exited(0,"));
}

TEST_F(ProgramTerminal, ProgramWaitingForInputLeavesTheSessionFreeToPauseAndEnd) {
  Launch(Debuggee("terminal"), glC, "read");
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntil([&] { return OutputBefore("Exited(").find("waiting for input\n") == 0; }));
  Process->Pause();
  ASSERT_TRUE(Listener->PumpUntilCall("Suspended("));
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Resumed("));
  Process->Terminate();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(0,"));
  // The commands GDB read were not the program's input.
  EXPECT_EQ(OutputBefore("Exited("), "waiting for input\n");
  Process = nullptr;
  ProcessPending();
  EXPECT_TRUE(test::ChildrenNamed("gdb").empty());
}

TEST_F(ProgramTerminal, EachQuotedArgumentArrivesExactlyAndNothingRunsInTheShell) {
  const std::string Injected = Scratch.Path() + "/INJECTED";
  const TStringArray Arguments = {"$HOME", "*", "x;y", "it's", "\"q w\"", "back\\slash", "two\nlines", "",
                                  "h\xc3\xa9llo \xe2\x82\xac", "$(touch${IFS}" + Injected + ")", "a b"};
  Launch(Debuggee("argsecho"), glC, QuoteProgramArguments(Arguments, false));
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited(0,"));
  std::string Expected;
  for (const std::string& Argument : Arguments)
    Expected += "[" + Argument + "]\n";
  EXPECT_EQ(OutputBefore("Exited("), Expected);
  EXPECT_FALSE(std::ifstream(Injected).good()) << "the shell ran a command substitution";
}

TEST_F(ProgramTerminal, LLDBKeepsEachArgumentWholeAndTheOutputIsProgramOutput) {
  if (!FindLLDB())
    GTEST_SKIP() << WhyNot;
  const TStringArray Arguments = {"$HOME", "*", "x;y", "it's", "\"q w\"", "", "a b", "back\\slash",
                                  "h\xc3\xa9llo \xe2\x82\xac"};
  Process = TGDBProcessManager::CreateProcess(Listener, Debuggee("argsecho"), QuoteProgramArguments(Arguments, true),
                                              Scratch.Path(), "local", "Linux64", glC, gcAMD64, LLDB);
  Process->Run();
  ASSERT_TRUE(Listener->PumpUntilCall("Exited("));
  // LLDB relays the program's output on its target stream, escaped its own
  // way; the IDE hears it as program output, byte for byte.
  std::string Expected;
  for (const std::string& Argument : Arguments)
    Expected += "[" + Argument + "]\n";
  EXPECT_EQ(OutputBefore("Exited("), Expected);
  EXPECT_FALSE(Listener->HasCallContaining("Log(" + std::to_string(etConsole) + ",["));
}

} // namespace
} // namespace midebug
