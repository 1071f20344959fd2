// The console debugger's value commands in batch mode with JSON output, on
// tests/debuggees/clivalues.c stopped in main after its locals are set.

#include "testsupport.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <string>
#include <vector>

namespace midebug {
namespace {

using nlohmann::json;

/// What `midebug --batch --json` printed for Commands, run after "start" and
/// three steps (count, pt and many set).
test::TCliRun RunValues(const std::string& Commands) {
  test::TScratchDir Scratch;
  return test::RunCli(Scratch, test::Quote(test::Debuggee("clivalues")), "start\nnext\nnext\nnext\n" + Commands);
}

TEST(CliValues, InfoListsTheFrameAndPrintInEveryFormatAndSetVarReachTheProgram) {
  const test::TCliRun Run = RunValues("info args\ninfo locals\nprint count\nprint/x count + 10\nprint/d pt.left\n"
                                      "print/c 65\nprint $_streq(\"a b\", \"a b\")\nprint nosuch\n"
                                      "set var count = count * 7\nset var count\nprint count\n");
  const std::vector<json> Prints = Run.All("answer", "print");
  ASSERT_EQ(Prints.size(), 7u);
  const char* Values[] = {"5", "0xf", "1", "65 'A'", "1", nullptr, "35"};
  for (size_t Index = 0; Index < Prints.size(); ++Index) {
    if (!Values[Index]) {
      EXPECT_EQ(Prints[Index].value("error", ""), "No symbol \"nosuch\" in current context.");
      continue;
    }
    EXPECT_EQ(Prints[Index].value("value", ""), Values[Index]) << Prints[Index].dump();
  }
  EXPECT_EQ(Prints[0].value("type", ""), "int");
  const std::vector<json> Sets = Run.All("answer", "set var");
  ASSERT_EQ(Sets.size(), 2u);
  EXPECT_EQ(Sets[0].value("value", ""), "35");
  EXPECT_EQ(Sets[1].value("error", ""), "usage: set var EXPRESSION = VALUE");
  const std::vector<json> Arguments = Run.All("answer", "info args");
  ASSERT_EQ(Arguments.size(), 1u);
  ASSERT_EQ(Arguments[0]["variables"].size(), 2u);
  EXPECT_EQ(Arguments[0]["variables"][0].value("name", ""), "argc");
  EXPECT_EQ(Arguments[0]["variables"][0].value("value", ""), "1");
  const std::vector<json> Locals = Run.All("answer", "info locals");
  ASSERT_EQ(Locals.size(), 1u);
  ASSERT_EQ(Locals[0]["variables"].size(), 3u);
  EXPECT_EQ(Locals[0]["variables"][0].value("name", ""), "count");
  EXPECT_EQ(Locals[0]["variables"][2].value("type", ""), "int [300]");
}

TEST(CliValues, InspectOpensOneLevelWithARangeAndDisplayMarksChanges) {
  const test::TCliRun Run = RunValues("inspect pt\ninspect many 100 3\ninspect nosuch\ndisplay count\nnext\nnext\n");
  const std::vector<json> Inspects = Run.All("answer", "inspect");
  ASSERT_EQ(Inspects.size(), 3u);
  EXPECT_EQ(Inspects[0].value("count", 0), 2);
  EXPECT_EQ(Inspects[0]["children"][1].value("name", ""), "right");
  EXPECT_EQ(Inspects[0]["children"][1].value("value", ""), "2");
  EXPECT_EQ(Inspects[1].value("count", 0), 300);
  EXPECT_EQ(Inspects[1].value("from", 0), 100);
  ASSERT_EQ(Inspects[1]["children"].size(), 3u);
  EXPECT_EQ(Inspects[1]["children"][1].value("name", ""), "101");
  EXPECT_EQ(Inspects[2].value("error", ""), "-var-create: unable to create variable object");

  const std::vector<json> Displays = Run.All("event", "display");
  ASSERT_EQ(Displays.size(), 3u) << "once when asked, then at each stop";
  EXPECT_EQ(Displays[0].value("value", ""), "5");
  EXPECT_FALSE(Displays[1].value("changed", true));
  EXPECT_EQ(Displays[2].value("value", ""), "6");
  EXPECT_TRUE(Displays[2].value("changed", false));
}

} // namespace
} // namespace midebug
