#pragma once
/// \file
/// The command line of the console debugger and the guesses it makes about
/// the program it debugs.

#include "midebug.h"

#include <optional>
#include <string>
#include <vector>

namespace midebug::cli {

/// What the command line asks for.
struct TCliOptions {
  std::string Program;
  std::vector<std::string> Arguments;
  /// The process to attach to; 0 when a program is launched.
  Integer AttachPid = 0;
  std::string Profile = "local";
  std::string Debugger = "gdb";
  /// True when --debugger was given (attaching then bypasses the profile).
  bool DebuggerGiven = false;
  std::optional<TGDBLanguage> Language;
  std::optional<TGDBCPU> CPU;
  std::string Platform = "Linux64";
  std::string ScriptFile;
  bool Batch = false;
  bool Json = false;
  std::string LogFile;
  /// The program's standard input: a file (--stdin), else empty input.
  std::string StdinFile;
  /// A terminal the program reads and writes instead (--tty).
  std::string Tty;
  /// False with --no-thread-events: thread starts and ends are not reported.
  bool ThreadEvents = true;
  /// How long a command that resumes the program waits for it to stop.
  int WaitSeconds = 60;
  bool ShowUsage = false;
};

/// The usage text printed by --help and on a command-line error.
extern const char* const UsageText;

/// Reads argv into Options; false with Error set when it is malformed.
bool ParseOptions(int ArgCount, char** Args, TCliOptions& Options, std::string& Error);

/// The source language of Program: a sibling source file's extension
/// ("hello" beside "hello.pas"), else symbols typical of the Free Pascal or
/// C++ run-time libraries, else C.
TGDBLanguage GuessLanguage(const std::string& Program);

/// The CPU of an ELF file, from the machine field of its header; amd64 when
/// the file is not an ELF file of a known machine.
TGDBCPU GuessCPU(const std::string& Program);

/// True when Debugger names LLDB's MI front end, as the library decides.
bool IsLLDBDebugger(const std::string& Debugger);

/// The argument line for the debugger: the program arguments, quoted so
/// that each reaches the program exactly as given, then, for GDB (which
/// starts the program through the shell), the redirection of its input:
/// --tty's terminal for all three streams, --stdin's file, else /dev/null.
std::string ProgramArgumentLine(const TCliOptions& Options);

/// The language's name as the command line spells it.
std::string LanguageName(TGDBLanguage Language);
std::string CPUName(TGDBCPU CPU);

} // namespace midebug::cli
