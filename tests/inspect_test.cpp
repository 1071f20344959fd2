// Inspectors against the real GDB: structures, unions, arrays small and
// large, pointers and lists, updates after a step, variables that leave
// scope, and the locals view of a frame.

#include "valuesession.h"

namespace midebug {
namespace {

using Strings = std::vector<std::string>;

/// tests/debuggees/values.c stopped in touch after its locals are set.
class InspectInC : public test::ValueSession {
protected:
  void SetUp() override {
    ValueSession::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("values"), glC,
                                   {At("values.c", "stop here"), At("values.c", "deepest"),
                                    At("manylocals.h", "many end")}));
  }
  TIntfPtr<IGDBInspect> Inspect(const std::string& Expr, Integer Frame = 1) {
    return Thread()->CreateInspector(Expr, Frame);
  }
};

TEST_F(InspectInC, StructuresUnionsPointersAndListsOpenOneLevelAtATime) {
  const TIntfPtr<IGDBInspect> Area = Inspect("area");
  ASSERT_FALSE(Area->HasError()) << Area->GetLastError();
  EXPECT_EQ(Area->GetType(), "struct rect");
  EXPECT_EQ(Area->GetKind(), ikObject);
  EXPECT_EQ(Members(Area), (Strings{"topleft={...}", "bottomright={...}"}));
  const TIntfPtr<IGDBInspect> TopLeft = Area->CreateSubInspector(iiVariable, 0);
  ASSERT_TRUE(TopLeft);
  EXPECT_EQ(TopLeft->GetType(), "struct point");
  const Strings Point = Members(TopLeft);
  ASSERT_EQ(Point.size(), 3u);
  EXPECT_EQ(Point[0], "x=1");
  EXPECT_TRUE(Point[2].starts_with("name=0x") && Point[2].ends_with("\"corner\"")) << Point[2];
  EXPECT_EQ(TopLeft->CreateSubInspector(iiVariable, 1)->GetFullExpr(), "((area).topleft).y");
  EXPECT_FALSE(Area->CreateSubInspector(iiMethod, 0));

  EXPECT_EQ(Members(Inspect("both"))[0], "whole=1094861636");

  const TIntfPtr<IGDBInspect> Where = Inspect("where");
  EXPECT_EQ(Where->GetAddress(), Where->GetValue()) << "a pointer's value is its address";
  EXPECT_EQ(Members(Where)[1], "y=20");

  // The list followed three levels down: list->next->next->value.
  TIntfPtr<IGDBInspect> Node = Inspect("list");
  for (const char* Value : {"1", "2", "3"}) {
    ASSERT_TRUE(Node);
    EXPECT_EQ(Member(Node, 0), std::string("value=") + Value);
    Node = Node->CreateSubInspector(iiVariable, 1);
  }
}

TEST_F(InspectInC, ArraysAreListedInWindowsInsideTheRangeShown) {
  const TIntfPtr<IGDBInspect> Small = Inspect("small");
  EXPECT_EQ(Small->GetMemberCount(), 10);
  Small->SetInspectRange(-5, 1000);
  EXPECT_EQ(Small->GetInspectRangeStart(), 0);
  EXPECT_EQ(Small->GetMemberCount(), 10);
  EXPECT_EQ(Member(Small, 9), "9=9");

  const TIntfPtr<IGDBInspect> Big = Inspect("big");
  EXPECT_EQ(Big->GetMemberCount(), 100000);
  Big->SetInspectRange(99990, 20);
  EXPECT_EQ(Big->GetMemberCount(), 10);
  EXPECT_EQ(Member(Big, 9), "99999=99999");
  EXPECT_EQ(Member(Big, 10), "!") << "past the range";
  // Windows that overlap ones listed before reuse their children.
  for (const Integer Start : {50000, 49990, 50050, 49950}) {
    Big->SetInspectRange(Start, 100);
    for (Integer Index = 0; Index < 100; Index += 33)
      EXPECT_EQ(Member(Big, Index), std::to_string(Start + Index) + "=" + std::to_string(Start + Index));
  }
}

TEST_F(InspectInC, AnExpressionThatCannotBeInspectedIsAnErrorWithoutChildren) {
  const TIntfPtr<IGDBInspect> Missing = Inspect("nosuch");
  EXPECT_EQ(Missing->GetKind(), ikError);
  EXPECT_TRUE(Missing->HasError());
  EXPECT_EQ(Missing->GetLastError(), "-var-create: unable to create variable object");
  EXPECT_EQ(Missing->GetMemberCount(), 0);
  EXPECT_EQ(Member(Missing, 0), "!");
  EXPECT_FALSE(Missing->CreateSubInspector(iiVariable, 0));
}

TEST_F(InspectInC, AfterAStepInspectorsShowNewValuesAndSayWhenTheirVariableLeftScope) {
  const TIntfPtr<IGDBInspect> Pt = Inspect("pt");
  const TIntfPtr<IGDBInspect> Number = Inspect("number");
  const TIntfPtr<IGDBInspect> Big = Inspect("big");
  Big->SetInspectRange(99998, 2);
  ASSERT_EQ(Member(Pt, 0), "x=5");
  ASSERT_EQ(Member(Big, 1), "99999=99999");
  for (int Line = 0; Line < 3; ++Line)
    ASSERT_NO_FATAL_FAILURE(StepOver());
  EXPECT_FALSE(Pt->Refresh());
  EXPECT_EQ(Member(Pt, 0), "x=50");
  EXPECT_FALSE(Big->Refresh());
  EXPECT_EQ(Member(Big, 1), "99999=-1") << "a window listed through a slice is updated with its array";
  EXPECT_FALSE(Pt->CreateSubInspector(iiVariable, 0)->Refresh()) << "a child is refreshed by its root";

  ASSERT_NO_FATAL_FAILURE(Continue()); // into many, touch has returned
  EXPECT_TRUE(Number->Refresh());
  EXPECT_EQ(Number->GetKind(), ikError);
  EXPECT_EQ(Number->GetLastError(), "out of scope");
  EXPECT_EQ(Number->GetValue(), "");
}

TEST_F(InspectInC, EachFrameOfARecursionShowsItsOwnLocalsParametersFirst) {
  const TIntfPtr<IGDBInspect> Touch = Thread()->CreateLocalVarsInspector(1);
  const Strings TouchLocals = Members(Touch);
  ASSERT_EQ(TouchLocals.size(), 8u);
  EXPECT_EQ(TouchLocals[0], "number=3");
  EXPECT_EQ(TouchLocals[2], "mark=113 'q'");
  EXPECT_EQ(TouchLocals[6], "pt={...}");

  ASSERT_NO_FATAL_FAILURE(Continue()); // many(1)
  ASSERT_NO_FATAL_FAILURE(Continue()); // recurse(50), 50 calls deep
  std::vector<TIntfPtr<IGDBInspect>> Frames;
  for (Integer Frame = 1; Frame <= 50; ++Frame)
    Frames.push_back(Thread()->CreateLocalVarsInspector(Frame));
  // Read outermost first: each view reads in its own frame, whichever frame
  // the debugger shows.
  for (Integer Frame = 50; Frame >= 1; --Frame) {
    const Integer Depth = 51 - Frame;
    EXPECT_EQ(Members(Frames[static_cast<size_t>(Frame - 1)]),
              (Strings{"depth=" + std::to_string(Depth), "here=" + std::to_string(Depth * 10)}))
        << "frame " << Frame;
  }
  EXPECT_FALSE(Frames[0]->Refresh()) << "nothing moved";
  EXPECT_EQ(Members(Frames[0])[0], "depth=50");
}

TEST_F(InspectInC, TheLocalsViewOfTwoHundredLocalsIsRebuiltWhenTheFrameChanges) {
  ASSERT_NO_FATAL_FAILURE(Continue()); // at the end of many(1)
  const TIntfPtr<IGDBInspect> Locals = Thread()->CreateLocalVarsInspector(1);
  ASSERT_EQ(Locals->GetMemberCount(), 202) << "seed, 200 locals and total";
  EXPECT_EQ(Member(Locals, 0), "seed=1");
  EXPECT_EQ(Member(Locals, 200), "local199=200");
  EXPECT_EQ(Member(Locals, 201), "total=910");
  ASSERT_NO_FATAL_FAILURE(StepOver());
  ASSERT_NO_FATAL_FAILURE(StepOver()); // back in main
  EXPECT_FALSE(Locals->Refresh());
  EXPECT_EQ(Members(Locals), (Strings{"origin={...}"})) << "the innermost frame is main's now";
}

/// tests/debuggees/cppvalues.cpp, first before its containers are built,
/// then once they hold their values.
class InspectInCpp : public test::ValueSession {
protected:
  void SetUp() override {
    ValueSession::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee("cppvalues"), glCPP,
                                   {At("cppvalues.cpp", "line:fresh"), At("cppvalues.cpp", "line:show")}));
  }
};

TEST_F(InspectInCpp, ContainersReadThroughPrettyPrintersAndUninitialisedOnesDoNotHang) {
  // Garbage storage: the printers may claim anything, the listing stops.
  for (const char* Expr : {"fresh", "ages"}) {
    const TIntfPtr<IGDBInspect> Garbage = Thread()->CreateInspector(Expr, 1);
    EXPECT_LE(Garbage->GetMemberCount(), 1000) << Expr;
  }
  ASSERT_NO_FATAL_FAILURE(Continue());

  EXPECT_EQ(Eval("text"), "\"hello\"");
  const TIntfPtr<IGDBInspect> Copy = Thread()->CreateInspector("copy", 1);
  EXPECT_EQ(Copy->GetKind(), ikObject);
  EXPECT_TRUE(Copy->GetFlags() & InspectFlagBit(ifCanInspect));
  ASSERT_EQ(Copy->GetMemberCount(), 250) << "listed in windows until the printer had no more";
  EXPECT_EQ(Member(Copy, 0), "[0]=0");
  EXPECT_EQ(Member(Copy, 249), "[249]=498");
  EXPECT_EQ(Copy->CreateSubInspector(iiVariable, 3)->GetFullExpr(), "[3]")
      << "GDB has no path for a printer's child: the expression listed stands in";

  EXPECT_EQ(Members(Thread()->CreateInspector("ages", 1)), (Strings{"\"ann\"=31", "\"bob\"=42"}));
}

TEST_F(InspectInCpp, AClassShowsItsBasesAndItsMembersUnderTheirAccessGroups) {
  ASSERT_NO_FATAL_FAILURE(Continue());
  const TIntfPtr<IGDBInspect> Square = Thread()->CreateInspector("square", 1);
  EXPECT_EQ(Members(Square), (Strings{"Named={...}", "Counted={...}", "public=", "private=", "protected="}));
  EXPECT_EQ(Members(Square->CreateSubInspector(iiVariable, 2)), (Strings{"side=4"}));
  EXPECT_EQ(Members(Square->CreateSubInspector(iiVariable, 3)), (Strings{"ratio=0.5"}));
  EXPECT_EQ(Members(Square->CreateSubInspector(iiVariable, 4)), (Strings{"area=16"}));
  const TIntfPtr<IGDBInspect> Counted = Square->CreateSubInspector(iiVariable, 1);
  EXPECT_EQ(Members(Counted->CreateSubInspector(iiVariable, 0)), (Strings{"count=2"}));
  const TIntfPtr<IGDBInspect> Named = Square->CreateSubInspector(iiVariable, 0);
  EXPECT_EQ(Members(Named->CreateSubInspector(iiVariable, 0)), (Strings{"label=\"shape\""}));
}

/// tests/debuggees/pasvalues.pas stopped in Total, whose parameter is an
/// open array, built with the default debug format and with DWARF 3.
class InspectInPascal : public test::ValueSession, public ::testing::WithParamInterface<const char*> {
protected:
  void SetUp() override {
    ValueSession::SetUp();
    ASSERT_NO_FATAL_FAILURE(Launch(test::Debuggee(GetParam()), glPascal, {At("pasvalues.pas", "line:total-body")}));
  }
};

TEST_P(InspectInPascal, EveryKindOfValueShowsWithoutKillingGdb) {
  const struct {
    const char* Expr;
    const char* Value; // what the value holds
  } Cases[] = {
      {"Fixed", "{11, 22, 33, 44, 55}"}, {"Growing", ""}, {"Items", ""}, {"Short", "'short text'"},
      {"Ansi", "'ansi text'"}, {"Wide", "'wide text'"}, {"Pair", "{Left = 1, Right = 2}"}, {"Shape", "0x"},
      {"Colours", "[Red, Blue]"}, {"Colour", "Green"}, {"Index", ""}, {"Fixed[2]", "22"},
  };
  const auto Upper = [](std::string Text) {
    for (char& Letter : Text)
      Letter = static_cast<char>(std::toupper(static_cast<unsigned char>(Letter)));
    return Text;
  };
  for (const auto& Case : Cases) {
    const std::string Value = Eval(Case.Expr);
    EXPECT_FALSE(Value.starts_with("error:")) << Case.Expr << ": " << Value;
    EXPECT_NE(Upper(Value).find(Upper(Case.Value)), std::string::npos) << Case.Expr << ": " << Value;

    const TIntfPtr<IGDBInspect> Inspector = Thread()->CreateInspector(Case.Expr, 1);
    for (Integer Index = 0; Index < std::min(Inspector->GetMemberCount(), 3); ++Index) {
      const TIntfPtr<IGDBInspect> Child = Inspector->CreateSubInspector(iiVariable, Index);
      if (Child)
        Child->GetMemberCount();
    }
  }
  const TIntfPtr<IGDBInspect> Locals = Thread()->CreateLocalVarsInspector(1);
  EXPECT_GE(Members(Locals).size(), 2u);
  const TIntfPtr<IGDBInspect> Pair = Thread()->CreateInspector("Pair", 1);
  ASSERT_EQ(Members(Pair).size(), 2u);
  EXPECT_TRUE(Members(Pair)[1].ends_with("=2")) << Members(Pair)[1];
  EXPECT_EQ(Eval("1+1"), "2") << "GDB is alive";
  EXPECT_FALSE(Listener->HasCall("Exited"));
}

INSTANTIATE_TEST_SUITE_P(DebugFormats, InspectInPascal, ::testing::Values("pasvalues", "pasvalues-gw3"));

/// tests/debuggees/values.c under LLDB's real MI front end, where it runs.
class InspectOnLLDB : public test::ValueSession {
protected:
  void SetUp() override {
    ValueSession::SetUp();
    if (!FindLLDB())
      GTEST_SKIP() << WhyNot;
    Process = TGDBProcessManager::CreateProcess(Listener, test::Debuggee("values"), "", "", "local", "Linux64", glC,
                                                gcAMD64, LLDB);
    ASSERT_TRUE(Process);
    ASSERT_TRUE(Core().ProcessAsyncRequest("-break-insert " + At("values.c", "stop here")));
    Process->Run();
    ASSERT_NO_FATAL_FAILURE(WaitForStop());
  }
  void TearDown() override {
    Process = nullptr;
    ProcessPending();
  }
};

TEST_F(InspectOnLLDB, ChildrenAreListedInOneBracketUpToLLDBsLimit) {
  EXPECT_EQ(Eval("number"), "3");
  const TIntfPtr<IGDBInspect> Area = Thread()->CreateInspector("area", 1);
  EXPECT_EQ(Members(Area).size(), 2u);
  EXPECT_EQ(Members(Area->CreateSubInspector(iiVariable, 1))[1], "y=4");
  const TIntfPtr<IGDBInspect> Small = Thread()->CreateInspector("small", 1);
  Small->SetInspectRange(8, 20);
  EXPECT_EQ(Small->GetMemberCount(), 2);
  EXPECT_EQ(Member(Small, 1), "[9]=9");
}

} // namespace
} // namespace midebug
