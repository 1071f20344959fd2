// One-shot evaluation and modification against the real GDB: values of
// every kind of expression, GDB's errors, a faulting call, display formats,
// and text that must reach GDB intact.

#include "mi/gdbresult.h"
#include "valuesession.h"

namespace midebug {
namespace {

/// tests/debuggees/values.c stopped in touch(3, 2.5, 'q', &origin) after its
/// locals are set.
class EvaluateInC : public test::ValueSession {
protected:
  void SetUp() override {
    ValueSession::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("values"), glC, {At("values.c", "stop here")}));
  }
};

TEST_F(EvaluateInC, ExpressionsOfEveryKindGiveGdbsValues) {
  const struct {
    const char* Expr;
    const char* Value;
  } Cases[] = {
      {"number", "3"},
      {"scale * 2", "5"},
      {"mark", "113 'q'"},
      {"counter", "7"},
      {"where->x", "10"},
      {"(char)65", "65 'A'"},
      {"small[3] + small[9]", "12"},
      {"area.bottomright.y", "4"},
      {"list->next->next->value", "3"},
      {"twice(21)", "42"},
      // A string literal inside the expression reaches GDB with its quotes;
      // comparing buf == "hello" would compare addresses.
      {"$_streq(pt.name, \"corner\")", "1"},
      {"$_streq(buf, \"hel\\\"lo\")", "0"},
      {"sizeof(\"a\\\\b\")", "4"},
      {"counter\n+ 1", "8"},
  };
  for (const auto& Case : Cases)
    EXPECT_EQ(Eval(Case.Expr), Case.Value) << Case.Expr;

  std::string Value, TypeName;
  bool CanModify = false;
  ASSERT_EQ(Thread()->Evaluate("pt", "", 1, Value, CanModify, TypeName), ercOk);
  EXPECT_EQ(TypeName, "struct point");
  EXPECT_FALSE(CanModify) << "a struct is not assigned whole";
  ASSERT_EQ(Thread()->Evaluate("ratio", "", 1, Value, CanModify, TypeName), ercOk);
  EXPECT_EQ(TypeName, "double");
  EXPECT_TRUE(CanModify);
}

TEST_F(EvaluateInC, ErrorsAndFaultingCallsReturnGdbsMessageAndLeaveTheProgramWhereItWas) {
  EXPECT_EQ(Eval("nosuch"), "error: No symbol \"nosuch\" in current context.");
  EXPECT_EQ(Eval("1 +"), "error: A syntax error in expression, near `'.");
  EXPECT_EQ(Eval("number,x"), "error: No symbol \"x\" in current context.") << "GDB reads a comma expression";

  const TGDBLocation Before = Thread()->GetCallLocation(1);
  const std::string Fault = Eval("fault()");
  EXPECT_TRUE(Fault.starts_with("error: The program being debugged was signaled")) << Fault;
  EXPECT_FALSE(Listener->HasCall("Signal(")) << "the fault inside the call is not the program's";
  EXPECT_EQ(Core().Threads().CurrentLocation().Line, Before.Line) << "the program is back where it stopped";
  EXPECT_EQ(Eval("number"), "3");
  ASSERT_NO_FATAL_FAILURE(StepOver());
  EXPECT_EQ(Thread()->GetCurrentLocation().Line, Before.Line + 1);
}

TEST_F(EvaluateInC, DisplayFormatsShowTheValueInThatFormat) {
  EXPECT_EQ(Eval("number + 3", "x"), "0x6");
  EXPECT_EQ(Eval("mark", "d"), "113");
  EXPECT_EQ(Eval("65", "c"), "65 'A'");
  EXPECT_EQ(Eval("number", "t"), "11");
  EXPECT_TRUE(Eval("number", "?").starts_with("error: Unknown display format"));
}

TEST_F(EvaluateInC, ModifyAssignsToTheLastExpressionAndTheProgramSeesIt) {
  std::string Value;
  EXPECT_EQ(Thread()->Modify("1", Value), ercError) << "nothing evaluated yet";
  EXPECT_EQ(Value, "");

  const struct {
    const char* Expr;
    const char* NewValue;
    const char* Assigned;
  } Cases[] = {
      {"number", "number * 3 + 1", "10"},
      {"scale", "0.25", "0.25"},
      // Values keep GDB's escapes: the character is a backslash.
      {"mark", "'\\\\'", "92 '\\\\\\\\'"},
      {"where", "&pt", ""},
      {"pt.x", "-7", "-7"},
      {"counter", "'\"'", "34"},
  };
  for (const auto& Case : Cases) {
    ASSERT_NE(Eval(Case.Expr).substr(0, 6), "error:") << Case.Expr;
    ASSERT_EQ(Thread()->Modify(Case.NewValue, Value), ercOk) << Case.Expr << ": " << Value;
    if (*Case.Assigned) {
      EXPECT_EQ(Value, Case.Assigned) << Case.Expr;
    }
  }
  EXPECT_EQ(Thread()->Modify("1 +", Value), ercError);
  EXPECT_EQ(Value, "A syntax error in expression, near `'.");

  // The next line computes with the new values.
  ASSERT_NO_FATAL_FAILURE(StepOver());
  EXPECT_EQ(Eval("number + where->x"), "3") << "10 + -7: where points at pt now";
  EXPECT_EQ(Eval("scale"), "0.25");
  EXPECT_EQ(Eval("mark"), "92 '\\\\\\\\'");
  EXPECT_EQ(Eval("counter"), "34");
}

TEST_F(EvaluateInC, OnlyTheLastEvaluationsVariableObjectStaysAndNamesAreNeverReused) {
  auto Exists = [&](const std::string& Name) {
    TVarEvaluateExpressionResult Value;
    return Core().Requests().Ask(Value, &TGDBCommand::CreateVarEvaluateExpressionCommand, Name, true, dvfRaw);
  };
  ASSERT_EQ(Eval("counter"), "7");
  ASSERT_EQ(Eval("number"), "3");
  EXPECT_FALSE(Exists("var1"));
  EXPECT_TRUE(Exists("var2"));
  ASSERT_EQ(Eval("nosuch").substr(0, 6), "error:");
  EXPECT_FALSE(Exists("var2")) << "a failed evaluation leaves none";
  ASSERT_EQ(Eval("ratio"), "1.5");
  EXPECT_TRUE(Exists("var4")) << "the failed creation took var3";
}

TEST_F(EvaluateInC, RequestsWhileTheProgramRunsAreRefused) {
  const TIntfPtr<IGDBThread> Stopped = Thread();
  Process->Resume();
  ASSERT_TRUE(Listener->PumpUntilCall("Resumed("));
  std::string Value, TypeName;
  bool CanModify = true;
  EXPECT_EQ(Stopped->Evaluate("number", "", 1, Value, CanModify, TypeName), ercError);
  EXPECT_EQ(Value, "process not suspended");
  EXPECT_EQ(Stopped->Modify("1", Value), ercError);
  EXPECT_EQ(Value, "process not suspended");
  const TIntfPtr<IGDBInspect> Inspector = Stopped->CreateInspector("number", 1);
  EXPECT_EQ(Inspector->GetKind(), ikError);
  EXPECT_EQ(Inspector->GetLastError(), "process not suspended");
  EXPECT_FALSE(Process->EvaluatorBusy());
}

} // namespace
} // namespace midebug
