// The console debugger's memory, disassembly and register commands, run in
// batch mode with JSON output on tests/debuggees/memory.c under the real GDB.

#include "testsupport.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <string>
#include <vector>

namespace midebug {
namespace {

using nlohmann::json;
using test::Hex;
using test::SymbolAddress;

class CliMemory : public ::testing::Test {
protected:
  /// The answers, in order, of `midebug --batch --json` on the memory
  /// program given Commands.
  std::vector<json> Answers(const std::string& Commands) {
    const test::TCliRun Run = test::RunCli(Scratch, test::Quote(Program), Commands);
    // Each script ends with commands that fail: batch mode then exits 3.
    EXPECT_EQ(Run.ExitCode, 3) << Run.Stderr;
    std::vector<json> Found;
    for (const json& Object : Run.Lines)
      if (Object.contains("answer") && Object["answer"] != "start")
        Found.push_back(Object);
    return Found;
  }

  const std::string Program = test::Debuggee("memory");
  test::TScratchDir Scratch;
};

TEST_F(CliMemory, ExamineWriteAndDisassemble) {
  const UInt64 Pattern = SymbolAddress(Program, "pattern");
  const UInt64 Main = SymbolAddress(Program, "main");
  ASSERT_NE(Pattern, 0u);
  const std::vector<json> Answers = this->Answers("start\nx " + Hex(Pattern) + " 8\nwrite " + Hex(Pattern) +
                                                  " 2a41\nx &pattern 2\ndisassemble\ndisassemble " +
                                                  Hex(Main) + " 3\nx 0x10\nwrite 0x10 00\nx " + Hex(Pattern) +
                                                  " 0\nwrite 1 zz\ndisassemble 0x10\n");
  ASSERT_EQ(Answers.size(), 10u);
  EXPECT_EQ(Answers[0]["bytes"], "0000000000000000") << "the pattern is filled after main's first line";
  EXPECT_EQ(Answers[1]["count"], 2);
  EXPECT_EQ(Answers[2]["bytes"], "2a41");

  // By default from the function's start, the current instruction marked.
  const json& Listing = Answers[3]["instructions"];
  ASSERT_EQ(Listing.size(), 20u);
  EXPECT_EQ(Listing[0]["address"], Hex(Main));
  int Current = 0;
  for (const json& Instruction : Listing)
    Current += Instruction["current"].get<bool>() ? 1 : 0;
  EXPECT_EQ(Current, 1);
  EXPECT_EQ(Answers[4]["instructions"].size(), 3u);

  const std::vector<std::string> Errors = {"cannot read memory at 0x0000000000000010",
                                           "the debugger refused to write 1 bytes at 0x0000000000000010",
                                           "usage: x ADDRESS", "usage: write ADDRESS HEXBYTES",
                                           "cannot disassemble at 0x0000000000000010"};
  for (size_t Index = 0; Index < Errors.size(); ++Index)
    EXPECT_TRUE(Answers[5 + Index].value("error", "").starts_with(Errors[Index])) << Answers[5 + Index];
}

TEST_F(CliMemory, InfoAndSetRegisters) {
  const std::vector<json> Answers =
      this->Answers("start\ninfo registers\ninfo registers sse\nset register rbx 0x1234\ninfo registers rbx\n"
                    "set register st0 2.5\ninfo registers st0\nset register xmm3 0x0102\ninfo registers xmm3\n"
                    "info registers nope\nset register rbx zz\nset register nope 1\n");
  ASSERT_EQ(Answers.size(), 11u);
  const json& General = Answers[0]["registers"];
  ASSERT_EQ(General.size(), 24u);
  EXPECT_EQ(General[16]["name"], "rip");
  EXPECT_EQ(Answers[1]["registers"].size(), 17u);
  EXPECT_EQ(Answers[3]["registers"][0], (json{{"name", "rbx"}, {"value", "0x0000000000001234"}}));
  EXPECT_EQ(Answers[5]["registers"][0]["value"], "0x4000a000000000000000");
  EXPECT_EQ(Answers[7]["registers"][0]["value"], "0x00000000000000000000000000000102");
  EXPECT_EQ(Answers[8]["error"], "no register named 'nope'");
  EXPECT_TRUE(Answers[9].value("error", "").starts_with("a general register takes a number")) << Answers[9];
  EXPECT_EQ(Answers[10]["error"], "no register named 'nope'");
}

} // namespace
} // namespace midebug
