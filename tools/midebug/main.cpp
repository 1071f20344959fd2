// midebug: a console debugger built on the library's public interfaces, the
// IDE's stand-in. Commands come from the terminal, a script (-x) or, with
// --batch, from standard input without a prompt; --json prints one JSON
// object per event and answer.

#include "options.h"
#include "output.h"
#include "session.h"

#include <chrono>
#include <cstdio>
#include <fstream>
#include <string>

namespace {

using namespace midebug;
using namespace midebug::cli;

// Exit codes of the console debugger itself (the usage text lists them).
constexpr int ExitOk = 0;
constexpr int ExitStartFailed = 1;
constexpr int ExitUsage = 2;
constexpr int ExitCommandFailed = 3;
constexpr int ExitBySignal = 128;

/// How long one wait for typed input lasts before events are delivered.
constexpr int InputSliceMs = 20;

bool Blank(const std::string& Line) {
  return Line.find_first_not_of(" \t") == std::string::npos || Line[Line.find_first_not_of(" \t")] == '#';
}

/// Runs the script's lines, each resuming command waiting for its stop;
/// false when the session was ended.
bool RunScript(TCliSession& Session, TCliOutput& Output, std::istream& Script) {
  Session.SetWaitForStops(true);
  for (std::string Line; std::getline(Script, Line);) {
    ProcessPending();
    if (!Session.HandleSignals())
      return false;
    if (!Blank(Line))
      Output.Echo(Line);
    if (!Session.Execute(Line))
      return false;
  }
  return true;
}

/// Runs the lines of standard input until it ends or a command ends the
/// session. In batch mode each resuming command waits for its stop; at the
/// prompt the person gets the prompt back at once, and events print as they
/// come while the next line is typed.
void RunConsole(TCliSession& Session, TCliOutput& Output, bool Batch) {
  Session.SetWaitForStops(Batch);
  TConsoleInput Input;
  for (;;) {
    // Events raised while the session waited for input (a stop, a thread
    // that ended, output of the program) come before the prompt.
    ProcessPending();
    if (!Session.HandleSignals())
      return;
    if (!Batch && !Output.PromptShown())
      Output.Prompt();
    std::string Line;
    const TConsoleInput::TState State = Input.ReadLine(Line, InputSliceMs);
    if (State == TConsoleInput::TState::Ended)
      return;
    if (State == TConsoleInput::TState::Waiting)
      continue;
    Output.LineRead();
    if (!Line.empty() && Line.back() == '\r')
      Line.pop_back();
    if (Batch && !Blank(Line))
      Output.Echo(Line);
    if (!Session.Execute(Line))
      return;
  }
}

} // namespace

int main(int ArgCount, char** Args) {
  TCliOptions Options;
  std::string Error;
  if (!ParseOptions(ArgCount, Args, Options, Error)) {
    std::fprintf(stderr, "midebug: %s\n%s", Error.c_str(), UsageText);
    return ExitUsage;
  }
  if (Options.ShowUsage) {
    std::fputs(UsageText, stdout);
    return ExitOk;
  }
  std::ifstream Script;
  if (!Options.ScriptFile.empty()) {
    Script.open(Options.ScriptFile);
    if (!Script) {
      std::fprintf(stderr, "midebug: cannot read the script '%s'\n", Options.ScriptFile.c_str());
      return ExitUsage;
    }
  }

  SetMainThread();
  // Ctrl-C pauses the program and SIGTERM or SIGHUP end the session; none of
  // them may end midebug before it has let the debugger and program go.
  CatchHostSignals();
  TCliOutput Output(Options.Json);
  TCliSession Session(Options, Output);
  if (!Session.Start())
    return ExitStartFailed;

  bool Going = true;
  if (Script.is_open())
    Going = RunScript(Session, Output, Script);
  // With --batch the input ends the session: the script when there is one,
  // else standard input.
  if (Going && !(Options.Batch && Script.is_open()))
    RunConsole(Session, Output, Options.Batch);
  Session.End();
  if (Session.Terminated())
    return ExitBySignal + CaughtTerminationSignal();
  if (Options.Batch && Output.Failed())
    return ExitCommandFailed;
  return ExitOk;
}
