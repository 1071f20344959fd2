// The command line of the console debugger and its guesses about the
// program it debugs.

#include "options.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <utility>

namespace midebug::cli {

const char* const UsageText =
    "usage: midebug [options] PROGRAM [ARGS...]\n"
    "       midebug [options] --attach PID\n"
    "\n"
    "options:\n"
    "  --profile NAME        remote profile (default \"local\"; empty: LLDB's own route for Windows and\n"
    "                        Android targets, the local agent otherwise)\n"
    "  --debugger PATH       the debugger program (default \"gdb\")\n"
    "  --language c|c++|pascal   the program's language (default: guessed, else c)\n"
    "  --cpu ia32|amd64|arm32|arm64  the program's CPU (default: from its ELF header)\n"
    "  --platform NAME       the platform (default \"Linux64\")\n"
    "  -x FILE               read commands from FILE (then from the terminal, unless --batch)\n"
    "  --batch               no prompt; exit at the end of the input\n"
    "  --json                one JSON object per line for each event and answer\n"
    "  --log FILE            keep the debugger's MI traffic in FILE\n"
    "  --wait SECONDS        in batch mode, how long run, continue and the steps wait for a stop\n"
    "                        (default 60)\n"
    "  --stdin FILE          the program reads FILE (default: empty input, it sees end of file)\n"
    "  --tty DEVICE          the program reads and writes the terminal DEVICE (to type to it)\n"
    "  --no-thread-events    do not report threads starting and ending\n"
    "  --help                this text\n"
    "\n"
    "The program's arguments reach it exactly as given. Its output is printed as it comes.\n"
    "At the prompt, while the program runs: pause (or Ctrl-C), kill, detach, threads, quit.\n"
    "Ending the session (quit, end of input, SIGTERM, SIGHUP) detaches an attached program\n"
    "and kills a launched one.\n"
    "\n"
    "exit status: 0 done; 1 the program could not be loaded or attached; 2 a usage error;\n"
    "3 in batch mode, a command failed; 128+N ended by signal N (SIGTERM, SIGHUP).\n";

namespace {

const std::array<std::pair<std::string_view, TGDBLanguage>, 4> LanguageWords = {{
    {"c", glC}, {"c++", glCPP}, {"cpp", glCPP}, {"pascal", glPascal}}};

const std::array<std::pair<std::string_view, TGDBCPU>, 4> CPUWords = {{
    {"ia32", gcIA32}, {"amd64", gcAMD64}, {"arm32", gcARM32}, {"arm64", gcARM64}}};

/// Source extensions by language, tried beside the program.
const std::array<std::pair<std::string_view, TGDBLanguage>, 9> SourceExtensions = {{
    {".pas", glPascal}, {".pp", glPascal}, {".lpr", glPascal}, {".dpr", glPascal},
    {".cpp", glCPP}, {".cc", glCPP}, {".cxx", glCPP}, {".C", glCPP}, {".c", glC}}};

// ELF header fields (System V ABI).
constexpr std::size_t ElfMachineOffset = 18;
constexpr std::size_t ElfDataOffset = 5;
constexpr unsigned char ElfDataBigEndian = 2;
constexpr uint16_t EmI386 = 3;
constexpr uint16_t EmARM = 40;
constexpr uint16_t EmX8664 = 62;
constexpr uint16_t EmAArch64 = 183;

/// Programs larger than this are not scanned for run-time symbols.
constexpr std::uintmax_t MaxScannedSize = 64u << 20;

template <class T, std::size_t N>
bool Lookup(const std::array<std::pair<std::string_view, T>, N>& Table, const std::string& Word, T& Value) {
  for (const auto& [Name, Entry] : Table)
    if (Name == Word) {
      Value = Entry;
      return true;
    }
  return false;
}

bool ParseInteger(const std::string& Text, long long& Value) {
  if (Text.empty() || !std::all_of(Text.begin(), Text.end(), [](char C) { return C >= '0' && C <= '9'; }))
    return false;
  Value = std::stoll(Text);
  return true;
}

} // namespace

bool ParseOptions(int ArgCount, char** Args, TCliOptions& Options, std::string& Error) {
  int Index = 1;
  // An option's value, or false with Error set when the line ends first.
  auto Value = [&](const std::string& Option, std::string& Out) {
    if (Index + 1 >= ArgCount) {
      Error = "option " + Option + " needs a value";
      return false;
    }
    Out = Args[++Index];
    return true;
  };
  for (; Index < ArgCount; ++Index) {
    const std::string Arg = Args[Index];
    if (Arg.empty() || Arg[0] != '-')
      break;
    std::string Text;
    if (Arg == "--") {
      ++Index;
      break;
    }
    if (Arg == "--help" || Arg == "-h") {
      Options.ShowUsage = true;
      return true;
    }
    if (Arg == "--batch") {
      Options.Batch = true;
    } else if (Arg == "--json") {
      Options.Json = true;
    } else if (Arg == "--no-thread-events") {
      Options.ThreadEvents = false;
    } else if (Arg == "--stdin") {
      if (!Value(Arg, Options.StdinFile))
        return false;
    } else if (Arg == "--tty") {
      if (!Value(Arg, Options.Tty))
        return false;
    } else if (Arg == "--profile") {
      if (!Value(Arg, Options.Profile))
        return false;
    } else if (Arg == "--debugger") {
      if (!Value(Arg, Options.Debugger))
        return false;
      Options.DebuggerGiven = true;
    } else if (Arg == "--platform") {
      if (!Value(Arg, Options.Platform))
        return false;
    } else if (Arg == "-x") {
      if (!Value(Arg, Options.ScriptFile))
        return false;
    } else if (Arg == "--log") {
      if (!Value(Arg, Options.LogFile))
        return false;
    } else if (Arg == "--language") {
      TGDBLanguage Language{};
      if (!Value(Arg, Text))
        return false;
      if (!Lookup(LanguageWords, Text, Language)) {
        Error = "unknown language '" + Text + "' (c, c++ or pascal)";
        return false;
      }
      Options.Language = Language;
    } else if (Arg == "--cpu") {
      TGDBCPU CPU{};
      if (!Value(Arg, Text))
        return false;
      if (!Lookup(CPUWords, Text, CPU)) {
        Error = "unknown CPU '" + Text + "' (ia32, amd64, arm32 or arm64)";
        return false;
      }
      Options.CPU = CPU;
    } else if (Arg == "--attach") {
      long long Pid = 0;
      if (!Value(Arg, Text))
        return false;
      if (!ParseInteger(Text, Pid) || Pid <= 0) {
        Error = "--attach needs a process id, not '" + Text + "'";
        return false;
      }
      Options.AttachPid = static_cast<Integer>(Pid);
    } else if (Arg == "--wait") {
      long long Seconds = 0;
      if (!Value(Arg, Text))
        return false;
      if (!ParseInteger(Text, Seconds) || Seconds <= 0) {
        Error = "--wait needs a number of seconds, not '" + Text + "'";
        return false;
      }
      Options.WaitSeconds = static_cast<int>(Seconds);
    } else {
      Error = "unknown option '" + Arg + "'";
      return false;
    }
  }
  if (Index < ArgCount) {
    if (Options.AttachPid != 0) {
      Error = "--attach takes no program";
      return false;
    }
    Options.Program = Args[Index++];
    Options.Arguments.assign(Args + Index, Args + ArgCount);
  }
  if (Options.Program.empty() && Options.AttachPid == 0) {
    Error = "no program to debug";
    return false;
  }
  if (!Options.StdinFile.empty() && !Options.Tty.empty()) {
    Error = "--stdin and --tty exclude each other";
    return false;
  }
  if ((!Options.StdinFile.empty() || !Options.Tty.empty()) && Options.AttachPid != 0) {
    Error = "an attached program keeps its own input";
    return false;
  }
  if ((!Options.StdinFile.empty() || !Options.Tty.empty()) && IsLLDBDebugger(Options.Debugger)) {
    Error = "--stdin and --tty need GDB (LLDB's MI front end starts the program without a shell)";
    return false;
  }
  return true;
}

TGDBLanguage GuessLanguage(const std::string& Program) {
  namespace fs = std::filesystem;
  std::error_code Ignored;
  const fs::path ProgramPath(Program);
  for (const auto& [Extension, Language] : SourceExtensions) {
    fs::path Source = ProgramPath;
    Source.replace_extension(std::string(Extension));
    if (fs::is_regular_file(Source, Ignored))
      return Language;
  }
  const std::uintmax_t Size = fs::file_size(ProgramPath, Ignored);
  if (Ignored || Size > MaxScannedSize)
    return glC;
  std::ifstream File(Program, std::ios::binary);
  const std::string Image((std::istreambuf_iterator<char>(File)), std::istreambuf_iterator<char>());
  // The Free Pascal run-time library names its entry and helpers so; a C++
  // program links the C++ run-time's personality routine.
  if (Image.find("PASCALMAIN") != std::string::npos || Image.find("FPC_INITIALIZEUNITS") != std::string::npos)
    return glPascal;
  if (Image.find("__gxx_personality_v0") != std::string::npos)
    return glCPP;
  return glC;
}

TGDBCPU GuessCPU(const std::string& Program) {
  std::ifstream File(Program, std::ios::binary);
  std::array<unsigned char, 20> Header{};
  if (!File.read(reinterpret_cast<char*>(Header.data()), Header.size()))
    return gcAMD64;
  if (Header[0] != 0x7f || Header[1] != 'E' || Header[2] != 'L' || Header[3] != 'F')
    return gcAMD64;
  const unsigned char Low = Header[ElfMachineOffset];
  const unsigned char High = Header[ElfMachineOffset + 1];
  const uint16_t Machine = Header[ElfDataOffset] == ElfDataBigEndian ? static_cast<uint16_t>(Low << 8 | High)
                                                                     : static_cast<uint16_t>(High << 8 | Low);
  switch (Machine) {
  case EmI386:
    return gcIA32;
  case EmARM:
    return gcARM32;
  case EmAArch64:
    return gcARM64;
  case EmX8664:
  default:
    return gcAMD64;
  }
}

bool IsLLDBDebugger(const std::string& Debugger) {
  return std::filesystem::path(Debugger).filename().string().find("lldb") != std::string::npos;
}

std::string ProgramArgumentLine(const TCliOptions& Options) {
  if (IsLLDBDebugger(Options.Debugger))
    return QuoteProgramArguments(Options.Arguments, true);
  std::string Line = QuoteProgramArguments(Options.Arguments, false);
  if (!Line.empty())
    Line += " ";
  // The shell GDB starts the program with applies the redirection over the
  // library's own terminal; the names are quoted like any argument.
  if (!Options.Tty.empty()) {
    const std::string Device = QuoteProgramArguments({Options.Tty}, false);
    return Line + "<" + Device + " >" + Device + " 2>&1";
  }
  return Line + "<" + QuoteProgramArguments({Options.StdinFile.empty() ? "/dev/null" : Options.StdinFile}, false);
}

std::string LanguageName(TGDBLanguage Language) { return std::string(GDBLanguageNames.at(Language)); }

std::string CPUName(TGDBCPU CPU) {
  for (const auto& [Name, Entry] : CPUWords)
    if (Entry == CPU)
      return std::string(Name);
  return "amd64";
}

} // namespace midebug::cli
