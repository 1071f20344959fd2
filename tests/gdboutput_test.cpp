/// \file
/// The parser of the debugger's output: record classification, completion of
/// requests, stop and notification records, streams and program output, and
/// the value scanner underneath. Record texts are GDB 13.1 output captured
/// from a small threaded C program built with gcc -g.

#include "mi/gdboutput.h"
#include "recordingprocess.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

using namespace midebug;
using midebug::test::TRecordingProcess;

namespace {

using TCalls = std::vector<std::string>;

TCalls Parse(const std::string& Block, TRecordingProcess& Process) {
  ProcessGDBOutput(Block, Process);
  return Process.Calls;
}

TCalls Parse(const std::string& Block) {
  TRecordingProcess Process;
  return Parse(Block, Process);
}

// Log kinds as the recording process prints them.
std::string LogUnknown(const std::string& Data) { return "Log(0," + Data + ")"; }
std::string LogError(const std::string& Data) { return "Log(1," + Data + ")"; }
std::string LogConsole(const std::string& Data) { return "Log(2," + Data + ")"; }

// --- Scanner ----------------------------------------------------------------

TEST(ParserScanner, CStringUnescapesQuotesAndHighBytes) {
  struct TCase {
    std::string Input;
    std::string Value;
    std::string RestAfter;
  } Cases[] = {
      {R"("a\"b\"c",x)", R"(a"b"c)", ",x"},
      {R"("line\n")", R"(line\n)", ""},
      {R"("C:\\dir\\")", R"(C:\\dir\\)", ""},
      {R"("\"a\\\"b\"")", R"("a\\"b")", ""}, // GDB 13: -data-evaluate-expression "\"a\\\"b\""
      {R"("unterminated)", "", ""},
      {R"("ends in backslash\)", "", ""},
      {"x\"no\"", "", "x\"no\""},
      // GDB 13 on a program's UTF-8 text: the octal escapes are its bytes; an
      // escaped backslash before digits is the value's own escape.
      {R"("h\303\251llo \\377 \342\202\254")", "h\u00e9llo \\\\377 \u20ac", ""},
      {R"("\"\360\237\230\200\"")", "\"\U0001F600\"", ""},
      {R"("lone \377 and \303x \033[0m \1234")", "lone \u00ff and \u00c3x \\033[0m \\1234", ""},
  };
  for (const TCase& Case : Cases) {
    TMIScanner Scanner(Case.Input);
    EXPECT_EQ(Scanner.ReadCString(), Case.Value) << Case.Input;
    EXPECT_EQ(Scanner.Rest(), Case.RestAfter) << Case.Input;
  }
}

TEST(ParserScanner, ValuesOfEveryShape) {
  const std::pair<std::string, std::string> Cases[] = {
      {R"(v={a="1",b=[{c="2"}]})", R"(a="1",b=[{c="2"}])"},
      {R"(v=["i1","i2"])", R"("i1","i2")"},
      {R"(v=[frame={level="0"},frame={level="1"}])", R"(frame={level="0"},frame={level="1"})"},
      {"v={}", ""},
      {"v=[]", ""},
      {"v= 12", "12"},
      {"v= {0x1, 0x2}", "0x1, 0x2"},
      {"v= -1", ""},
      {R"(v={a="1")", ""},
      {R"(v=[ "x")", ""},
  };
  for (const auto& [Input, Value] : Cases) {
    TMIScanner Scanner(Input);
    EXPECT_EQ(Scanner.FindValue("v"), Value) << Input;
  }
}

TEST(ParserScanner, NumbersFollowTheProtocolsConverter) {
  EXPECT_EQ(MIStrToIntDef("  -7", 0), -7);
  EXPECT_EQ(MIStrToIntDef("$ff", 0), 255);
  EXPECT_EQ(MIStrToIntDef("0xFFFFFFFF", 0), -1);
  EXPECT_EQ(MIStrToIntDef("1.2", -1), -1);
  EXPECT_EQ(MIStrToIntDef("", -1), -1);
  EXPECT_EQ(MIStrToIntDef("2147483648", -1), -1);
  EXPECT_EQ(MIStrToIntDef("i1", 0), 0);
  EXPECT_EQ(MIStrToUInt64Def("0xffffffffffffffff", 0), ~UInt64{0});
  EXPECT_EQ(MIStrToUInt64Def("0x1ffffffffffffffff", 7), 7u);
  EXPECT_EQ(MIStrToUInt64Def("<MULTIPLE>", 0), 0u);
}

// --- Result records ------------------------------------------------------------

TEST(ParserResults, DoneWithResultsForACommandWithoutDecoderFails) {
  TRecordingProcess Process;
  TVarEvaluateExpressionResult Delete; // stands for any command without a decoder
  Delete.FCommand = ctVarDelete;
  Process.Register("7", Delete);
  Parse("7^done,ndeleted=\"1\"\n", Process);
  EXPECT_TRUE(Delete.FAvailable);
  EXPECT_TRUE(Delete.FError);
}

TEST(ParserResults, ErrorRecordCompletesWithMessage) {
  TRecordingProcess Process;
  TStackInfoDepthResult Depth;
  Process.Register("2004", Depth);
  EXPECT_EQ(Parse("2004^error,msg=\"No registers.\"\n", Process), TCalls{});
  EXPECT_TRUE(Depth.FAvailable);
  EXPECT_TRUE(Depth.FError);
  EXPECT_EQ(Depth.FErrorMessage, "No registers.");
}

TEST(ParserResults, ErrorWithoutWaiterIsAFaultOrALaunchFailure) {
  struct TCase {
    std::string Block;
    TCalls Calls;
  } Cases[] = {
      {"^error,msg=\"The program is not being run.\"\n",
       {LogError("The program is not being run."), "Faulted(The program is not being run.)"}},
      {"99^error,msg=\"Undefined MI command: bogus-command\",code=\"undefined-command\"\n",
       {LogError("Undefined MI command: bogus-command"), "Faulted(Undefined MI command: bogus-command)"}},
      {"^error,message=\"other key\"\n", {LogError("other key"), "Faulted(other key)"}},
      {"^error\n", {"Faulted()"}},
      {"0250000000001^error,msg=\"During startup program exited.\"\n",
       {LogError("During startup program exited."), "Exited(-1,During startup program exited.)"}},
  };
  for (const TCase& Case : Cases)
    EXPECT_EQ(Parse(Case.Block), Case.Calls) << Case.Block;
}

TEST(ParserResults, SecondResultForTheSameTokenFindsNobody) {
  // GDB answered -exec-continue after a SIGSEGV with ^running and later ^error.
  TRecordingProcess Process;
  TExecRunResult Continue;
  Process.Register("2002", Continue);
  const TCalls Calls = Parse("2002^running\n*running,thread-id=\"all\"\n"
                             "2002^error,msg=\"Couldn't get registers: No such process.\"\n",
                             Process);
  EXPECT_EQ(Calls, (TCalls{"Resumed", LogError("Couldn't get registers: No such process."),
                           "Faulted(Couldn't get registers: No such process.)"}));
  EXPECT_TRUE(Continue.FAvailable);
  EXPECT_FALSE(Continue.FError);
}

TEST(ParserResults, UnknownClassIsLoggedAndFailsTheRequest) {
  TRecordingProcess Process;
  TStackInfoDepthResult Depth;
  Process.Register("5", Depth);
  EXPECT_EQ(Parse("5^strange,x=\"1\"\r\n", Process), TCalls{LogUnknown("^strange,x=\"1\"\r\n")});
  EXPECT_TRUE(Depth.FAvailable);
  EXPECT_TRUE(Depth.FError);
}

TEST(ParserResults, CLIReplyRoutedThroughTheLogStream) {
  TRecordingProcess Process;
  TCLInfoLineAddressResult InfoLine("Prog.c", 12);
  Process.Register("info line prog.c:12\\n", InfoLine);
  const TCalls Calls = Parse("&\"info line prog.c:12\\n\"\n"
                             "~\"Line 12 of \\\"prog.c\\\" starts at address 0x1205 <main+28> and ends at 0x1217.\\n\"\n"
                             "^done\n",
                             Process);
  EXPECT_EQ(Calls, TCalls{});
  EXPECT_TRUE(InfoLine.FAvailable);
  EXPECT_FALSE(InfoLine.FError);
  EXPECT_EQ(InfoLine.FAddress, 0x1205u);
}

TEST(ParserResults, CLIReplyWithoutConsoleAnswerLeavesTheNextRecord) {
  TRecordingProcess Process;
  TCLInfoLineAddressResult InfoLine("prog.c", 12);
  Process.Register("info line prog.c:12\\n", InfoLine);
  const TCalls Calls = Parse("&\"info line prog.c:12\\n\"\n=thread-exited,id=\"2\",group-id=\"i1\"\n", Process);
  EXPECT_TRUE(InfoLine.FAvailable);
  EXPECT_EQ(Calls, TCalls{"ThreadExited(2)"});
}

// --- Stop records ---------------------------------------------------------------

TEST(ParserStops, ReasonsAndTheirNotifications) {
  struct TCase {
    std::string Record;
    TCalls Calls;
  } Cases[] = {
      {R"(*stopped,reason="function-finished",thread-id="1")", {"Suspended(:0@0x0,1,3)"}},
      {R"(*stopped,reason="exited")", {"Exited(-1,)"}},
      {R"(*stopped,reason="exited-normally")", {"Exited(0,)"}},
      {R"(*stopped,reason="watchpoint-scope",wpnum="3")", {"WatchpointOutOfScope"}},
      {R"(*stopped,addr="0x10",file="a.c",line="4",thread-id="3")", {"Suspended(a.c:4@0x10,3,1)"}},
      {R"(*stopped)", {"Suspended(:0@0x0,-1,1)"}},
      // GDB 13: a signal passed on without stopping is announced inside the
      // record of the stop that follows; that stop is what happened.
      {R"(*stopped,reason="signal-received",signal-name="SIGUSR1",signal-meaning="User defined signal 1",)"
       R"(reason="exited",exit-code="05")",
       {"Exited(5,)"}},
      {R"(*stopped,reason="exception-raised",kind="1",object="0x20",name="EMine",handler="0x40",thread-id="4")",
       {"Exception(EMine,4)"}},
  };
  for (const TCase& Case : Cases)
    EXPECT_EQ(Parse(Case.Record + "\n"), Case.Calls) << Case.Record;
}

TEST(ParserStops, ExitedNormallyWhileDyingReportsNothing) {
  TRecordingProcess Process;
  Process.Dying = true;
  EXPECT_EQ(Parse("*stopped,reason=\"exited-normally\"\n", Process), TCalls{});
}

TEST(ParserStops, SignalReceivedFromLLDBNamesTheNumber) {
  struct TCase {
    std::string Signal;
    std::string Call;
  } Cases[] = {
      {"9", "Exited(0,SIGKILL)"},
      {"11", "Signal(SIGSEGV,,:0@0x0,2)"},
      {"40", "Signal(40,,:0@0x0,2)"},
  };
  for (const TCase& Case : Cases) {
    TRecordingProcess Process;
    Process.LLDB = true;
    EXPECT_EQ(Parse("*stopped,reason=\"signal-received\",signal=\"" + Case.Signal + "\",thread-id=\"2\"\n", Process),
              TCalls{Case.Call});
  }
}

TEST(ParserStops, LocationFromOriginalLocation) {
  struct TCase {
    std::string Frame;
    std::string Location;
  } Cases[] = {
      {R"(addr="0x1",file="??")", ":0@0x1"},
      {R"(addr="0x1",from="/lib/libc.so.6")", "/lib/libc.so.6:0@0x1"},
      {R"(addr="0x1",original-location="unit.pas:42")", "unit.pas:42@0x1"},
      {R"(addr="0x1",line="-1",original-location="C:\\src\\unit.pas:42")", R"(C:\\src\\unit.pas:42@0x1)"},
  };
  for (const TCase& Case : Cases) {
    TMIScanner Scanner(Case.Frame);
    TGDBLocation Location;
    ParseLocation(Scanner, Location);
    EXPECT_EQ(TRecordingProcess::Describe(Location), Case.Location) << Case.Frame;
  }
}

// --- Notify records --------------------------------------------------------------

TEST(ParserNotify, ThreadAndGroupRecords) {
  struct TCase {
    std::string Record;
    TCalls Calls;
  } Cases[] = {
      {R"(=thread-created,id="3",osid="4711")", {"ThreadCreated(3,4711)"}},
      {R"(=thread-selected,id="2")", {"ThreadSelected(2)"}},
      {R"(=thread-group-added,id="i1")", {}},
      {R"(=thread-group-created,id="i1")", {}},
      {R"(=thread-group-exited,id="i1",exit-code="010")", {}},
      {R"(=cmd-param-changed,param="args",value="a b")", {}},
      {R"(=tsv-created,name="trace",initial="0")", {LogUnknown(R"(=tsv-created,name="trace",initial="0")"
                                                               "\n")}},
      {"=dyld-load-address-was-not-resolved", {"Restart"}},
      {"=thread-created", {}},
  };
  for (const TCase& Case : Cases)
    EXPECT_EQ(Parse(Case.Record + "\n"), Case.Calls) << Case.Record;
}

// --- Streams and program output ----------------------------------------------------

TEST(ParserStreams, ConsoleAndTargetText) {
  struct TCase {
    std::string Block;
    TCalls Calls;
  } Cases[] = {
      {R"(~"7\tstatic inline int twice(int v) { return v * 2; }\n")",
       {LogConsole("7   static inline int twice(int v) { return v * 2; }\n")}},
      {R"(~"Current language:  auto; currently c\n")",
       {LogConsole("Current language:  auto; currently c\n"), "Language(c)"}},
      {R"(~"C:\\new\n")", {LogConsole("C:\\\\new\n")}},
      {R"(~"")", {}},
      {R"(~"ODS: hello\n")", {LogConsole("ODS: hello\n")}},
      {R"(@"abc\r\n")", {LogConsole("abc")}},
      {R"(@"\n")", {LogConsole(R"(\n)")}},
  };
  for (const TCase& Case : Cases)
    EXPECT_EQ(Parse(Case.Block + "\n"), Case.Calls) << Case.Block;
}

TEST(ParserStreams, ProgramOutputKeepsItsDigitsAndPromptsVanish) {
  EXPECT_EQ(Parse("5 apples\n(gdb) \nx=8 \"quoted\"\n"),
            (TCalls{LogUnknown("5 apples\n"), LogUnknown("x=8 \"quoted\"\n")}));
  TRecordingProcess CRLF;
  CRLF.EndOfLineMarker = "(gdb) \r\n";
  EXPECT_EQ(Parse("(gdb) \n(gdb) \r\n", CRLF), TCalls{});
}

TEST(ParserStreams, RecordGluedToProgramOutputIsProcessed) {
  struct TCase {
    std::string Block;
    TCalls Calls;
  } Cases[] = {
      {"partial output=thread-created,id=\"2\",group-id=\"i1\"\n",
       {LogUnknown("partial output"), "ThreadCreated(2,2)"}},
      {"no-newline-output=library-loaded,id=\"/lib/a.so\",target-name=\"/lib/a.so\",host-name=\"/lib/a.so\",addr-low=\"0x10\"\n",
       {LogUnknown("no-newline-output"), "ModuleLoaded(a.so)"}},
      {"tail*stopped,reason=\"exited-normally\"\n", {LogUnknown("tail"), "Exited(0,)"}},
      {"a=b, x*y\n", {LogUnknown("a=b, x*y\n")}},
      // A breakpoint record is not split off: GDB 13 glued one behind a
      // program's "total=7", and the line is the program's.
      {"total=7=breakpoint-modified,bkpt={number=\"3\"}\n", {LogUnknown("total=7=breakpoint-modified,bkpt={number=\"3\"}\n")}},
      {"press ^error\n", {LogUnknown("press ^error\n")}},
  };
  for (const TCase& Case : Cases)
    EXPECT_EQ(Parse(Case.Block), Case.Calls) << Case.Block;

  TRecordingProcess Process;
  TExecRunResult Continue;
  Process.Register("1008", Continue);
  EXPECT_EQ(Parse("partial output1008^running\n", Process), (TCalls{LogUnknown("partial output"), "Resumed"}));
  EXPECT_TRUE(Continue.FAvailable);
}

TEST(ParserStreams, GluedRecordsAreLeftWholeWithHXConsole) {
  TRecordingProcess Process;
  Process.HXConsole = true;
  EXPECT_EQ(Parse("partial output=thread-created,id=\"2\"\n", Process),
            TCalls{LogUnknown("partial output=thread-created,id=\"2\"\n")});
}

TEST(ParserNotify, UnloadedModuleKeepsWhatTheBlockAlreadyRead) {
  TRecordingProcess Process;
  Parse("=library-loaded,id=\"/lib/a.so\",target-name=\"/lib/a.so\",host-name=\"/lib/a.so\",addr-low=\"0x10\"\n"
        "=library-unloaded,id=\"/lib/b.so\",target-name=\"/lib/b.so\"\n",
        Process);
  ASSERT_EQ(Process.Calls, (TCalls{"ModuleLoaded(a.so)", "ModuleUnloaded(b.so)"}));
  EXPECT_EQ(Process.Modules.back().Id, 2);
  EXPECT_EQ(Process.Modules.back().Path, "/lib/a.so");
  EXPECT_EQ(Process.Modules.back().EntryPoint, 0x10u);
}

} // namespace
