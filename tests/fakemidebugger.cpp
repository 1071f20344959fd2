/// \file
/// fakemidebugger: a scripted stand-in for a debugger's MI front end (GDB or
/// lldb-mi), for what a real debugger cannot be made to show: exact byte
/// layouts, replies split across writes, invalid UTF-8, sudden exit, hangs.
///
/// It plays the script named by FAKEMI_SCRIPT, read whole first so that a
/// faulty script prints only a diagnostic naming its line (exit code 2).
/// One directive per line; blank lines and lines starting with `#` are
/// ignored. TEXT decodes `\n` `\r` `\t` `\\` `\s` (blank) and `\xHH`; in
/// expect, expect-prefix, skip-to, send and sendraw `{TOKEN}` is the MI token
/// (the digits bound by the last expectation that had one).
///
///   include FILE       FILE's directives, a path relative to this script
///   expect TEXT        the next line equals TEXT (`*`: any line)
///   expect-prefix TEXT the next line starts with TEXT
///   skip-to TEXT       read lines until one starts with TEXT
///                      (a mismatch or end of input: exit code 3)
///   send TEXT          write TEXT and LF in one write(2); sendraw: no LF
///   prompt             write the prompt, `(gdb) ` LF unless set-prompt TEXT
///   sendfill N C       write N bytes C in one write(2)
///   sleep MS, exit CODE, hang (until killed)
///   print-args, print-cwd   write the arguments or the working directory
///   close-output       close stdout and stderr and go on
///   wait-eof           read stdin to its end
///   serve              answer `<digits>-gdb-exit` with `<digits>^exit` and
///                      exit, `<digits>...` with `<digits>^done` and the
///                      prompt, anything else with the prompt
/// Exit code 0 at the end of the script, 4 once stdout's reader has gone.

#include <cctype>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>
#include <time.h>
#include <unistd.h>
#include <vector>

namespace {

constexpr std::string_view Placeholder = "{TOKEN}";

[[noreturn]] void Fail(int Code, const std::string& Message) {
  const std::string Line = "fakemi: " + Message + "\n";
  (void)!::write(STDERR_FILENO, Line.data(), Line.size());
  std::exit(Code);
}

struct TDirective {
  std::string Name;
  std::string Text;     ///< decoded argument
  std::string Written;  ///< the argument as written, for diagnostics
};

std::string Decode(const std::string& Written, const std::string& Where) {
  std::string Text;
  for (size_t At = 0; At < Written.size(); ++At) {
    if (Written[At] != '\\') {
      Text += Written[At];
      continue;
    }
    const char Kind = At + 1 < Written.size() ? Written[++At] : '\0';
    switch (Kind) {
    case 'n': Text += '\n'; break;
    case 'r': Text += '\r'; break;
    case 't': Text += '\t'; break;
    case 's': Text += ' '; break;
    case '\\': Text += '\\'; break;
    case 'x':
      if (At + 2 >= Written.size() || !std::isxdigit(static_cast<unsigned char>(Written[At + 1])) ||
          !std::isxdigit(static_cast<unsigned char>(Written[At + 2])))
        Fail(2, Where + ": \\x needs two hexadecimal digits");
      Text += static_cast<char>(std::stoi(Written.substr(At + 1, 2), nullptr, 16));
      At += 2;
      break;
    default:
      Fail(2, Where + ": unknown escape in '" + Written + "'");
    }
  }
  return Text;
}

/// Reads Path and the scripts it includes into one list of directives.
void Load(const std::string& Path, std::vector<TDirective>& Directives, int Depth = 0) {
  std::ifstream File(Path, std::ios::binary);
  if (!File || Depth > 16)
    Fail(2, "cannot read the script '" + Path + "'");
  const std::string Dir = Path.find('/') == std::string::npos ? "." : Path.substr(0, Path.rfind('/'));
  int Number = 0;
  for (std::string Line; std::getline(File, Line);) {
    ++Number;
    if (!Line.empty() && Line.back() == '\r')
      Line.pop_back();
    if (Line.find_first_not_of(" \t") == std::string::npos || Line[0] == '#')
      continue;
    const size_t Blank = Line.find(' ');
    TDirective Directive{Line.substr(0, Blank), "", Blank == std::string::npos ? "" : Line.substr(Blank + 1)};
    const std::string Where = Path + ":" + std::to_string(Number);
    static const char* const Known[] = {"expect", "expect-prefix", "skip-to",  "send",         "sendraw",
                                        "prompt", "set-prompt",    "sendfill", "sleep",        "print-args",
                                        "print-cwd", "exit",       "hang",     "close-output", "wait-eof",
                                        "serve"};
    if (Directive.Name == "include") {
      Load(Dir + "/" + Directive.Written, Directives, Depth + 1);
      continue;
    }
    bool Found = false;
    for (const char* Name : Known)
      Found = Found || Directive.Name == Name;
    if (!Found)
      Fail(2, Where + ": unknown directive '" + Directive.Name + "'");
    Directive.Text = Decode(Directive.Written, Where);
    Directives.push_back(Directive);
  }
}

class TRunner {
public:
  explicit TRunner(std::string Arguments) : FArguments(std::move(Arguments)) {}

  void Run(const std::vector<TDirective>& Directives) {
    for (const TDirective& D : Directives) {
      if (D.Name == "expect" || D.Name == "expect-prefix" || D.Name == "skip-to") {
        for (;;) {
          const std::optional<std::string> Line = ReadLine();
          if (!Line)
            Fail(3, "expected '" + D.Written + "' but got end of input");
          if (D.Name == "expect" && D.Written == "*")
            break;
          if (Match(D.Text, *Line, D.Name != "expect"))
            break;
          if (D.Name != "skip-to")
            Fail(3, "expected '" + D.Written + "' but got '" + *Line + "'");
        }
      } else if (D.Name == "send") {
        Write(Expand(D.Text) + "\n");
      } else if (D.Name == "sendraw") {
        Write(Expand(D.Text));
      } else if (D.Name == "prompt") {
        Write(FPrompt);
      } else if (D.Name == "set-prompt") {
        FPrompt = D.Text;
      } else if (D.Name == "sendfill") {
        std::istringstream Words(D.Text);
        size_t Count = 0;
        std::string Byte;
        Words >> Count >> Byte;
        Write(std::string(Count, Byte.empty() ? ' ' : Byte[0]));
      } else if (D.Name == "sleep") {
        const long Ms = std::atol(D.Text.c_str());
        timespec Wait{Ms / 1000, (Ms % 1000) * 1000000L};
        while (::nanosleep(&Wait, &Wait) != 0 && errno == EINTR) {
        }
      } else if (D.Name == "print-args") {
        Write(FArguments + "\n");
      } else if (D.Name == "print-cwd") {
        char Dir[4096];
        Write(std::string(::getcwd(Dir, sizeof Dir) ? Dir : "") + "\n");
      } else if (D.Name == "exit") {
        std::exit(std::atoi(D.Text.c_str()));
      } else if (D.Name == "hang") {
        for (;;)
          ::pause();
      } else if (D.Name == "close-output") {
        // /dev/null takes the numbers so that nothing opened later lands on 1 or 2.
        const int Null = ::open("/dev/null", O_WRONLY);
        ::dup2(Null, STDOUT_FILENO);
        ::dup2(Null, STDERR_FILENO);
        FClosed = true;
      } else if (D.Name == "wait-eof") {
        while (ReadLine()) {
        }
      } else if (D.Name == "serve") {
        Serve();
      }
    }
  }

private:
  /// Stdin is split by hand: stdio buffering could swallow input meant for
  /// a later directive. A last line without LF is still a line.
  std::optional<std::string> ReadLine() {
    for (;;) {
      const size_t End = FPending.find('\n');
      if (End != std::string::npos || FEof) {
        if (End == std::string::npos && FPending.empty())
          return std::nullopt;
        std::string Line = FPending.substr(0, End);
        FPending.erase(0, End == std::string::npos ? FPending.size() : End + 1);
        if (!Line.empty() && Line.back() == '\r')
          Line.pop_back();
        return Line;
      }
      char Chunk[4096];
      const ssize_t Count = ::read(STDIN_FILENO, Chunk, sizeof Chunk);
      if (Count < 0 && errno == EINTR)
        continue;
      if (Count <= 0)
        FEof = true;
      else
        FPending.append(Chunk, static_cast<size_t>(Count));
    }
  }

  void Write(std::string_view Data) {
    while (!FClosed && !Data.empty()) {
      const ssize_t Written = ::write(STDOUT_FILENO, Data.data(), Data.size());
      if (Written < 0 && errno == EINTR)
        continue;
      if (Written < 0)
        std::exit(4);
      Data.remove_prefix(static_cast<size_t>(Written));
    }
  }

  std::string Expand(const std::string& Text) const {
    std::string Out = Text;
    for (size_t At; (At = Out.find(Placeholder)) != std::string::npos;)
      Out.replace(At, Placeholder.size(), FToken);
    return Out;
  }

  /// Every placeholder matches the same run of digits, which becomes the
  /// token; the pattern has at most a handful of them, so a simple search
  /// over the run lengths is enough.
  bool Match(const std::string& Pattern, const std::string& Line, bool Prefix) {
    const size_t First = Pattern.find(Placeholder);
    if (First == std::string::npos)
      return Prefix ? Line.starts_with(Pattern) : Line == Pattern;
    size_t Digits = 0;
    while (First + Digits < Line.size() && std::isdigit(static_cast<unsigned char>(Line[First + Digits])))
      ++Digits;
    for (; Digits > 0; --Digits) {
      std::string Expanded = Pattern;
      const std::string Token = Line.substr(First, Digits);
      for (size_t At; (At = Expanded.find(Placeholder)) != std::string::npos;)
        Expanded.replace(At, Placeholder.size(), Token);
      if (Prefix ? Line.starts_with(Expanded) : Line == Expanded) {
        FToken = Token;
        return true;
      }
    }
    return false;
  }

  void Serve() {
    while (const std::optional<std::string> Line = ReadLine()) {
      const size_t Digits = Line->find_first_not_of("0123456789");
      const std::string Token = Line->substr(0, Digits);
      if (Line->substr(Token.size()) == "-gdb-exit") {
        Write(Token + "^exit\n");
        std::exit(0);
      }
      Write(Token.empty() ? FPrompt : Token + "^done\n" + FPrompt);
    }
    std::exit(0);
  }

  std::string FArguments;
  std::string FPending;
  bool FEof = false;
  bool FClosed = false;
  std::string FToken;
  std::string FPrompt = "(gdb) \n";
};

} // namespace

int main(int ArgumentCount, char** Arguments) {
  std::signal(SIGPIPE, SIG_IGN);
  const char* const Script = std::getenv("FAKEMI_SCRIPT");
  if (Script == nullptr || *Script == '\0')
    Fail(2, "FAKEMI_SCRIPT is not set; it must name the script to play");
  std::vector<TDirective> Directives;
  Load(Script, Directives);
  std::string Joined;
  for (int Index = 1; Index < ArgumentCount; ++Index)
    Joined += (Index > 1 ? " " : "") + std::string(Arguments[Index]);
  TRunner(Joined).Run(Directives);
  return 0;
}
