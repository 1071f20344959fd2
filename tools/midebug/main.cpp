// midebug: a console debugger built on the library's public interfaces, the
// IDE's stand-in. Commands come from the terminal, a script (-x) or, with
// --batch, from standard input without a prompt; --json prints one JSON
// object per event and answer.

#include "options.h"
#include "output.h"
#include "session.h"

#include <cstdio>
#include <fstream>
#include <iostream>
#include <string>

namespace {

using namespace midebug;
using namespace midebug::cli;

// Exit codes of the console debugger itself.
constexpr int ExitOk = 0;
constexpr int ExitStartFailed = 1;
constexpr int ExitUsage = 2;

/// Runs the lines of Input until it ends or a command ends the session;
/// false when the session was ended.
bool RunCommands(TCliSession& Session, TCliOutput& Output, std::istream& Input, bool Prompt, bool Echo) {
  for (;;) {
    // Events raised while the session waited for input (a thread that
    // ended, output of the program) come before the prompt.
    ProcessPending();
    if (Prompt)
      Output.Prompt();
    std::string Line;
    if (!std::getline(Input, Line))
      return true;
    if (Echo && Line.find_first_not_of(" \t") != std::string::npos && Line.front() != '#')
      Output.Echo(Line);
    if (!Session.Execute(Line))
      return false;
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
  TCliOutput Output(Options.Json);
  TCliSession Session(Options, Output);
  if (!Session.Start())
    return ExitStartFailed;

  bool Going = true;
  if (Script.is_open())
    Going = RunCommands(Session, Output, Script, false, true);
  // With --batch the input ends the session: the script when there is one,
  // else standard input.
  if (Going && !(Options.Batch && Script.is_open()))
    RunCommands(Session, Output, std::cin, !Options.Batch, Options.Batch);
  Session.End();
  return ExitOk;
}
