/// \file
/// fakemidebugger: a scripted stand-in for a debugger's MI front end (GDB or
/// lldb-mi) in tests. It shows on demand what a real debugger cannot be made
/// to show: exact byte layouts, replies split across writes, invalid UTF-8,
/// time-outs, sudden exit, hangs. It depends on POSIX and the standard
/// library only.
///
/// Command line
/// ------------
/// Every argument is accepted and ignored (`--nw --nx --interpreter=mi2`,
/// `--interpreter`, ...); `print-args` reports them.
///
/// The script
/// ----------
/// Its path is taken from the environment variable FAKEMI_SCRIPT. The whole
/// script is read and checked before anything runs, so a faulty script
/// produces no output at all, only a diagnostic naming its line.
///
/// One directive per line. A CR before the LF ending a line is dropped.
/// Blank lines (empty or only blanks and tabs) and lines whose first
/// character is `#` are ignored. A directive is the line's text up to the
/// first blank; its argument is the rest of the line after that one blank.
///
/// TEXT arguments are taken byte for byte (further blanks included) with
/// these escapes decoded:
///   `\n` LF   `\r` CR   `\t` tab   `\\` backslash   `\s` blank
///   `\xHH` the byte with hexadecimal value HH (exactly two digits; any byte,
///          so invalid UTF-8 can be produced)
/// Any other backslash sequence is an error. In `expect`, `expect-prefix`,
/// `send` and `sendraw`, the eight characters `{TOKEN}` stand for the MI
/// token (see below); written with an escape (`\x7BTOKEN}`) they are plain
/// text. Elsewhere `{TOKEN}` is plain text.
/// Numeric arguments (N, MS, CODE) are decimal; blanks around numbers and
/// names are ignored.
///
/// The current token is a run of decimal digits bound by `expect` or
/// `expect-prefix`; it is empty until the first binding.
///
///   expect TEXT        Read one line from stdin (up to LF, one trailing CR
///                      dropped) and require it to equal TEXT. Each `{TOKEN}`
///                      matches a run of one or more decimal digits; all
///                      `{TOKEN}`s of one TEXT must match the same digits,
///                      which then become the current token. A TEXT without
///                      `{TOKEN}` leaves the current token as it was.
///                      `expect *` (the argument exactly `*`) accepts any
///                      line and leaves the token unchanged.
///                      A final line without LF before end of input counts
///                      as a line.
///   expect-prefix TEXT As `expect`, but the line need only start with TEXT.
///                      `expect-prefix {TOKEN}` accepts any tokenized command
///                      and binds its token.
///       On a mismatch or at end of input both write one line to stderr,
///       `fakemi: expected '<TEXT>' but got '<line>'` or
///       `fakemi: expected '<TEXT>' but got end of input`, where TEXT is the
///       argument as written in the script and control bytes of the line are
///       shown as `\r`, `\t` or `\xHH`; then the program exits with code 3.
///   send TEXT          Write TEXT and LF in one write(2); `{TOKEN}` is
///                      replaced by the current token.
///   sendraw TEXT       Write TEXT exactly, no LF added, in one write(2);
///                      `{TOKEN}` replaced.
///   prompt             Write the current prompt in one write(2). It starts
///                      as `(gdb) ` LF.
///   set-prompt TEXT    Change the prompt; e.g. `set-prompt (gdb)\n` for
///                      lldb-mi, which prints no blank. May be empty.
///   sendfill N C       Write N bytes (at most 67108864) of the byte C in one
///                      write(2). C is one byte after escape decoding, so
///                      `\s` gives blanks and `\xff` invalid UTF-8.
///   sleep MS           Sleep MS milliseconds.
///   print-args         Write argv[1..] joined by single blanks, then LF.
///   print-cwd          Write the current working directory, then LF.
///   print-env NAME     Write the value of environment variable NAME (empty if
///                      unset), then LF.
///   exit CODE          Exit at once with CODE (0 to 255).
///   hang               Sleep until killed.
///   close-output       Release stdout and stderr (the reader sees end of
///                      file) and go on with the script while the process
///                      lives; later output, diagnostics included, is
///                      discarded.
///   wait-eof           Read and discard stdin up to end of file, then go on.
///   serve              Answer like a minimal MI peer until end of input, then
///                      exit 0. Per line read:
///                        `<digits>-gdb-exit` -> `<digits>^exit` LF, exit 0
///                        `-gdb-exit`         -> `^exit` LF, exit 0
///                        `<digits>...`       -> `<digits>^done` LF and the
///                                               prompt, in one write(2)
///                        anything else       -> the prompt
/// At the end of the script the program exits with code 0.
///
/// Every write goes straight to write(2), unbuffered, retried until complete.
/// Stdin is buffered by hand, so no input is lost between directives.
///
/// Exit codes: 0 script done, `serve` saw end of input or `-gdb-exit`;
/// 2 no usable script (FAKEMI_SCRIPT unset or unreadable, unknown directive,
/// bad argument) or a directive that could not be carried out;
/// 3 `expect` or `expect-prefix` failed; 4 the reader of stdout has gone
/// (SIGPIPE is ignored, so this is quiet); CODE from `exit`.

#include <cerrno>
#include <charconv>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <limits.h>
#include <optional>
#include <string>
#include <string_view>
#include <time.h>
#include <unistd.h>
#include <vector>

namespace {

constexpr int ExitScriptError = 2;
constexpr int ExitMismatch = 3;
constexpr int ExitOutputGone = 4;

constexpr std::string_view TokenPlaceholder = "{TOKEN}";
constexpr std::string_view GdbExitCommand = "-gdb-exit";
constexpr std::string_view DefaultPrompt = "(gdb) \n";
/// Large enough for any reply a test could want, small enough that a typo
/// cannot exhaust memory.
constexpr std::uint64_t MaxFillBytes = 64u * 1024u * 1024u;

/// Writes all of Data with as few write(2) calls as the kernel allows (one,
/// for a pipe with room). Returns false once the descriptor is unusable.
bool WriteFully(int Descriptor, std::string_view Data) {
  while (!Data.empty()) {
    const ssize_t written = ::write(Descriptor, Data.data(), Data.size());
    if (written < 0) {
      if (errno == EINTR)
        continue;
      return false;
    }
    Data.remove_prefix(static_cast<std::size_t>(written));
  }
  return true;
}

/// Reports a problem on stderr as one line in one write, because the tests
/// read stderr merged with stdout. A lost diagnostic must not change the
/// exit code that follows it, so write errors are ignored.
void Diagnose(std::string_view Message) {
  std::string line = "fakemi: ";
  line += Message;
  line += '\n';
  (void)WriteFully(STDERR_FILENO, line);
}

[[noreturn]] void Fail(int ExitCode, std::string_view Message) {
  Diagnose(Message);
  std::exit(ExitCode);
}

/// Makes an input line readable in a one-line diagnostic.
std::string ShowControlBytes(std::string_view Line) {
  static constexpr char HexDigits[] = "0123456789abcdef";
  std::string shown;
  for (const char c : Line) {
    const auto byte = static_cast<unsigned char>(c);
    if (c == '\r')
      shown += "\\r";
    else if (c == '\t')
      shown += "\\t";
    else if (byte < 0x20 || byte == 0x7f) {
      shown += "\\x";
      shown += HexDigits[byte >> 4];
      shown += HexDigits[byte & 0xf];
    } else
      shown += c;
  }
  return shown;
}

/// Stdout of the program; after `close-output` everything is discarded.
class TOutput {
public:
  void Write(std::string_view Data) {
    if (FClosed || Data.empty())
      return;
    if (!WriteFully(STDOUT_FILENO, Data))
      std::exit(ExitOutputGone);
  }

  /// Lets go of the pipes behind stdout and stderr. /dev/null takes their
  /// descriptor numbers so that nothing opened later can land on 1 or 2.
  void Close() {
    const int nullDevice = ::open("/dev/null", O_WRONLY | O_CLOEXEC);
    if (nullDevice >= 0) {
      ::dup2(nullDevice, STDOUT_FILENO);
      ::dup2(nullDevice, STDERR_FILENO);
      if (nullDevice > STDERR_FILENO)
        ::close(nullDevice);
    } else {
      ::close(STDOUT_FILENO);
      ::close(STDERR_FILENO);
    }
    FClosed = true;
  }

private:
  bool FClosed = false;
};

/// Stdin split into lines by hand: stdio buffering could swallow input meant
/// for a later directive.
class TInput {
public:
  /// The next line without its LF and one trailing CR; nothing at end of
  /// input. A last line without LF is still a line.
  std::optional<std::string> ReadLine() {
    for (;;) {
      const std::size_t lineEnd = FPending.find('\n');
      if (lineEnd != std::string::npos) {
        std::string line = FPending.substr(0, lineEnd);
        FPending.erase(0, lineEnd + 1);
        return StripCarriageReturn(std::move(line));
      }
      if (!Fill()) {
        if (FPending.empty())
          return std::nullopt;
        std::string line = std::move(FPending);
        FPending.clear();
        return StripCarriageReturn(std::move(line));
      }
    }
  }

  void DiscardToEnd() {
    FPending.clear();
    while (Fill())
      FPending.clear();
  }

private:
  static std::string StripCarriageReturn(std::string Line) {
    if (!Line.empty() && Line.back() == '\r')
      Line.pop_back();
    return Line;
  }

  /// Appends what stdin has; false at end of input. A read error (stdin
  /// closed, say) is end of input as far as a script can tell.
  bool Fill() {
    char chunk[4096];
    for (;;) {
      const ssize_t count = ::read(STDIN_FILENO, chunk, sizeof chunk);
      if (count < 0 && errno == EINTR)
        continue;
      if (count <= 0)
        return false;
      FPending.append(chunk, static_cast<std::size_t>(count));
      return true;
    }
  }

  std::string FPending;
};

/// A piece of decoded TEXT: literal bytes or the token placeholder.
struct TPiece {
  bool IsToken = false;
  std::string Literal;
};

/// A TEXT argument: as written (for diagnostics) and decoded.
struct TText {
  std::string Written;
  std::vector<TPiece> Pieces;

  /// The bytes with each placeholder replaced by Token.
  std::string Expand(std::string_view Token) const {
    std::string bytes;
    for (const TPiece& piece : Pieces)
      bytes += piece.IsToken ? std::string(Token) : piece.Literal;
    return bytes;
  }
};

enum class TDirectiveKind {
  Expect,
  ExpectAny,
  ExpectPrefix,
  Send,
  SendRaw,
  Prompt,
  SetPrompt,
  SendFill,
  Sleep,
  PrintArgs,
  PrintCwd,
  PrintEnv,
  Exit,
  Hang,
  CloseOutput,
  WaitEof,
  Serve,
};

struct TDirective {
  TDirectiveKind Kind{};
  TText Text;             ///< expect, expect-prefix, send, sendraw, set-prompt
  std::uint64_t Number{}; ///< sendfill N, sleep MS, exit CODE
  char FillByte{};        ///< sendfill C
  std::string Name;       ///< print-env NAME
};

/// Turns the script's text into directives, or explains on stderr what is
/// wrong with it and exits with code 2.
class TScriptParser {
public:
  explicit TScriptParser(std::string ScriptPath) : FScriptPath(std::move(ScriptPath)) {}

  std::vector<TDirective> Parse(std::string_view Script) {
    std::vector<TDirective> directives;
    while (!Script.empty()) {
      ++FLineNumber;
      const std::size_t lineEnd = Script.find('\n');
      std::string_view line = Script.substr(0, lineEnd);
      Script.remove_prefix(lineEnd == std::string_view::npos ? Script.size() : lineEnd + 1);
      if (!line.empty() && line.back() == '\r')
        line.remove_suffix(1);
      if (line.find_first_not_of(" \t") == std::string_view::npos || line.front() == '#')
        continue;
      directives.push_back(ParseLine(line));
    }
    return directives;
  }

private:
  [[noreturn]] void Reject(std::string_view Problem) const {
    Fail(ExitScriptError, FScriptPath + ":" + std::to_string(FLineNumber) + ": " +
                              std::string(Problem));
  }

  TDirective ParseLine(std::string_view Line) {
    const std::size_t blank = Line.find(' ');
    const std::string_view name = Line.substr(0, blank);
    const std::string_view argument =
        blank == std::string_view::npos ? std::string_view() : Line.substr(blank + 1);
    TDirective directive;
    if (name == "expect") {
      directive.Kind = argument == "*" ? TDirectiveKind::ExpectAny : TDirectiveKind::Expect;
      directive.Text = ParseText(argument, true);
    } else if (name == "expect-prefix") {
      directive.Kind = TDirectiveKind::ExpectPrefix;
      directive.Text = ParseText(argument, true);
    } else if (name == "send") {
      directive.Kind = TDirectiveKind::Send;
      directive.Text = ParseText(argument, true);
    } else if (name == "sendraw") {
      directive.Kind = TDirectiveKind::SendRaw;
      directive.Text = ParseText(argument, true);
    } else if (name == "prompt") {
      directive.Kind = TDirectiveKind::Prompt;
      RequireNoArgument(argument);
    } else if (name == "set-prompt") {
      directive.Kind = TDirectiveKind::SetPrompt;
      directive.Text = ParseText(argument, false);
    } else if (name == "sendfill") {
      directive.Kind = TDirectiveKind::SendFill;
      ParseFill(argument, directive);
    } else if (name == "sleep") {
      directive.Kind = TDirectiveKind::Sleep;
      directive.Number = ParseNumber(Trim(argument), "MS", UINT32_MAX);
    } else if (name == "print-args") {
      directive.Kind = TDirectiveKind::PrintArgs;
      RequireNoArgument(argument);
    } else if (name == "print-cwd") {
      directive.Kind = TDirectiveKind::PrintCwd;
      RequireNoArgument(argument);
    } else if (name == "print-env") {
      directive.Kind = TDirectiveKind::PrintEnv;
      directive.Name = std::string(Trim(argument));
      if (directive.Name.empty() || directive.Name.find_first_of(" \t=") != std::string::npos)
        Reject("print-env needs one environment variable NAME");
    } else if (name == "exit") {
      directive.Kind = TDirectiveKind::Exit;
      directive.Number = ParseNumber(Trim(argument), "CODE", 255);
    } else if (name == "hang") {
      directive.Kind = TDirectiveKind::Hang;
      RequireNoArgument(argument);
    } else if (name == "close-output") {
      directive.Kind = TDirectiveKind::CloseOutput;
      RequireNoArgument(argument);
    } else if (name == "wait-eof") {
      directive.Kind = TDirectiveKind::WaitEof;
      RequireNoArgument(argument);
    } else if (name == "serve") {
      directive.Kind = TDirectiveKind::Serve;
      RequireNoArgument(argument);
    } else if (name.empty()) {
      Reject("a directive must start at the beginning of the line");
    } else {
      Reject("unknown directive '" + ShowControlBytes(name) + "'");
    }
    return directive;
  }

  static std::string_view Trim(std::string_view Text) {
    const std::size_t first = Text.find_first_not_of(" \t");
    if (first == std::string_view::npos)
      return {};
    const std::size_t last = Text.find_last_not_of(" \t");
    return Text.substr(first, last - first + 1);
  }

  void RequireNoArgument(std::string_view Argument) const {
    if (!Trim(Argument).empty())
      Reject("this directive takes no argument, got '" + ShowControlBytes(Argument) + "'");
  }

  std::uint64_t ParseNumber(std::string_view Digits, std::string_view What,
                            std::uint64_t Maximum) const {
    std::uint64_t value = 0;
    const char* const end = Digits.data() + Digits.size();
    const auto [stop, error] = std::from_chars(Digits.data(), end, value);
    if (Digits.empty() || error != std::errc() || stop != end || value > Maximum)
      Reject(std::string(What) + " must be a decimal number from 0 to " +
             std::to_string(Maximum) + ", got '" + ShowControlBytes(Digits) + "'");
    return value;
  }

  void ParseFill(std::string_view Argument, TDirective& Directive) const {
    const std::string_view trimmed = Trim(Argument);
    const std::size_t blank = trimmed.find_first_of(" \t");
    if (blank == std::string_view::npos)
      Reject("sendfill needs N and C");
    Directive.Number = ParseNumber(trimmed.substr(0, blank), "N", MaxFillBytes);
    const TText fill = ParseText(Trim(trimmed.substr(blank)), false);
    const std::string bytes = fill.Expand({});
    if (bytes.size() != 1)
      Reject("sendfill C must be exactly one byte, got '" + fill.Written + "'");
    Directive.FillByte = bytes.front();
  }

  static int HexValue(char Digit) {
    if (Digit >= '0' && Digit <= '9')
      return Digit - '0';
    if (Digit >= 'a' && Digit <= 'f')
      return Digit - 'a' + 10;
    if (Digit >= 'A' && Digit <= 'F')
      return Digit - 'A' + 10;
    return -1;
  }

  /// Decodes escapes in one pass so that an escaped brace can never form a
  /// placeholder.
  TText ParseText(std::string_view Written, bool WithToken) const {
    TText text;
    text.Written = std::string(Written);
    std::string literal;
    auto flushLiteral = [&] {
      if (!literal.empty())
        text.Pieces.push_back({false, std::move(literal)});
      literal.clear();
    };
    for (std::size_t at = 0; at < Written.size();) {
      if (WithToken && Written.substr(at).starts_with(TokenPlaceholder)) {
        flushLiteral();
        text.Pieces.push_back({true, {}});
        at += TokenPlaceholder.size();
        continue;
      }
      if (Written[at] != '\\') {
        literal += Written[at++];
        continue;
      }
      if (at + 1 >= Written.size())
        Reject("TEXT ends with a lone backslash");
      const char kind = Written[at + 1];
      at += 2;
      switch (kind) {
      case 'n': literal += '\n'; break;
      case 'r': literal += '\r'; break;
      case 't': literal += '\t'; break;
      case 's': literal += ' '; break;
      case '\\': literal += '\\'; break;
      case 'x': {
        const int high = at < Written.size() ? HexValue(Written[at]) : -1;
        const int low = at + 1 < Written.size() ? HexValue(Written[at + 1]) : -1;
        if (high < 0 || low < 0)
          Reject("\\x needs two hexadecimal digits");
        literal += static_cast<char>(high * 16 + low);
        at += 2;
        break;
      }
      default:
        Reject(std::string("unknown escape '\\") + ShowControlBytes(std::string_view(&kind, 1)) +
               "'");
      }
    }
    flushLiteral();
    return text;
  }

  std::string FScriptPath;
  int FLineNumber = 0;
};

/// The line's leading decimal digits, possibly none.
std::string_view LeadingToken(std::string_view Line) {
  std::size_t digits = 0;
  while (digits < Line.size() && Line[digits] >= '0' && Line[digits] <= '9')
    ++digits;
  return Line.substr(0, digits);
}

/// Matches Line against Pieces from the given positions, binding the token on
/// the way. Digit runs are tried longest first, so a prefix pattern ending in
/// the placeholder binds the whole token.
bool MatchPieces(const std::vector<TPiece>& Pieces, std::size_t PieceIndex, std::string_view Line,
                 std::size_t LineAt, bool PrefixOnly, std::optional<std::string>& Token) {
  if (PieceIndex == Pieces.size())
    return PrefixOnly || LineAt == Line.size();
  const TPiece& piece = Pieces[PieceIndex];
  const std::string_view rest = Line.substr(LineAt);
  if (!piece.IsToken) {
    return rest.starts_with(piece.Literal) &&
           MatchPieces(Pieces, PieceIndex + 1, Line, LineAt + piece.Literal.size(), PrefixOnly,
                       Token);
  }
  if (Token) {
    return rest.starts_with(*Token) &&
           MatchPieces(Pieces, PieceIndex + 1, Line, LineAt + Token->size(), PrefixOnly, Token);
  }
  for (std::size_t digits = LeadingToken(rest).size(); digits > 0; --digits) {
    Token = std::string(rest.substr(0, digits));
    if (MatchPieces(Pieces, PieceIndex + 1, Line, LineAt + digits, PrefixOnly, Token))
      return true;
  }
  Token.reset();
  return false;
}

void SleepMilliseconds(std::uint64_t Milliseconds) {
  timespec remaining{static_cast<time_t>(Milliseconds / 1000),
                     static_cast<long>(Milliseconds % 1000) * 1000000L};
  while (::nanosleep(&remaining, &remaining) != 0 && errno == EINTR) {
  }
}

/// Carries out the directives against stdin and stdout.
class TScriptRunner {
public:
  TScriptRunner(int ArgumentCount, char** Arguments)
      : FArgumentCount(ArgumentCount), FArguments(Arguments) {}

  void Run(const std::vector<TDirective>& Directives) {
    for (const TDirective& directive : Directives)
      Perform(directive);
  }

private:
  void Perform(const TDirective& Directive) {
    switch (Directive.Kind) {
    case TDirectiveKind::Expect:
      Expect(Directive.Text, false);
      return;
    case TDirectiveKind::ExpectPrefix:
      Expect(Directive.Text, true);
      return;
    case TDirectiveKind::ExpectAny:
      if (!FInput.ReadLine())
        Fail(ExitMismatch, "expected '" + Directive.Text.Written + "' but got end of input");
      return;
    case TDirectiveKind::Send:
      FOutput.Write(Directive.Text.Expand(FToken) + '\n');
      return;
    case TDirectiveKind::SendRaw:
      FOutput.Write(Directive.Text.Expand(FToken));
      return;
    case TDirectiveKind::Prompt:
      FOutput.Write(FPrompt);
      return;
    case TDirectiveKind::SetPrompt:
      FPrompt = Directive.Text.Expand({});
      return;
    case TDirectiveKind::SendFill:
      FOutput.Write(std::string(Directive.Number, Directive.FillByte));
      return;
    case TDirectiveKind::Sleep:
      SleepMilliseconds(Directive.Number);
      return;
    case TDirectiveKind::PrintArgs:
      PrintArgs();
      return;
    case TDirectiveKind::PrintCwd:
      PrintCwd();
      return;
    case TDirectiveKind::PrintEnv: {
      const char* const value = std::getenv(Directive.Name.c_str());
      FOutput.Write(std::string(value ? value : "") + '\n');
      return;
    }
    case TDirectiveKind::Exit:
      std::exit(static_cast<int>(Directive.Number));
    case TDirectiveKind::Hang:
      for (;;)
        ::pause();
    case TDirectiveKind::CloseOutput:
      FOutput.Close();
      return;
    case TDirectiveKind::WaitEof:
      FInput.DiscardToEnd();
      return;
    case TDirectiveKind::Serve:
      Serve();
      return;
    }
  }

  void Expect(const TText& Pattern, bool PrefixOnly) {
    const std::optional<std::string> line = FInput.ReadLine();
    if (!line)
      Fail(ExitMismatch, "expected '" + Pattern.Written + "' but got end of input");
    std::optional<std::string> token;
    if (!MatchPieces(Pattern.Pieces, 0, *line, 0, PrefixOnly, token))
      Fail(ExitMismatch,
           "expected '" + Pattern.Written + "' but got '" + ShowControlBytes(*line) + "'");
    if (token)
      FToken = std::move(*token);
  }

  void PrintArgs() {
    std::string line;
    for (int index = 1; index < FArgumentCount; ++index) {
      if (index > 1)
        line += ' ';
      line += FArguments[index];
    }
    FOutput.Write(line + '\n');
  }

  /// A script that asks for the directory must not receive an empty line
  /// that looks like an answer, so failure ends the run.
  void PrintCwd() {
    std::string directory(PATH_MAX, '\0');
    while (::getcwd(directory.data(), directory.size()) == nullptr) {
      if (errno != ERANGE)
        Fail(ExitScriptError, "print-cwd: cannot determine the working directory");
      directory.resize(directory.size() * 2);
    }
    directory.resize(directory.find('\0'));
    FOutput.Write(directory + '\n');
  }

  void Serve() {
    while (const std::optional<std::string> line = FInput.ReadLine()) {
      const std::string_view token = LeadingToken(*line);
      if (std::string_view(*line).substr(token.size()) == GdbExitCommand) {
        FOutput.Write(std::string(token) + "^exit\n");
        std::exit(0);
      }
      if (token.empty())
        FOutput.Write(FPrompt);
      else
        FOutput.Write(std::string(token) + "^done\n" + FPrompt);
    }
    std::exit(0);
  }

  int FArgumentCount;
  char** FArguments;
  TInput FInput;
  TOutput FOutput;
  std::string FToken;
  std::string FPrompt{DefaultPrompt};
};

/// The whole script, read with POSIX calls so that a directory or a read
/// error is reported rather than taken for an empty script.
std::string LoadScript(const char* ScriptPath) {
  const std::string unreadable = std::string("cannot read the script '") + ScriptPath + "': ";
  const int descriptor = ::open(ScriptPath, O_RDONLY | O_CLOEXEC);
  if (descriptor < 0)
    Fail(ExitScriptError, unreadable + std::strerror(errno));
  std::string script;
  char chunk[4096];
  for (;;) {
    const ssize_t count = ::read(descriptor, chunk, sizeof chunk);
    if (count < 0 && errno == EINTR)
      continue;
    if (count < 0)
      Fail(ExitScriptError, unreadable + std::strerror(errno));
    if (count == 0)
      break;
    script.append(chunk, static_cast<std::size_t>(count));
  }
  ::close(descriptor);
  return script;
}

} // namespace

int main(int ArgumentCount, char** Arguments) {
  std::signal(SIGPIPE, SIG_IGN);
  const char* const scriptPath = std::getenv("FAKEMI_SCRIPT");
  if (scriptPath == nullptr || *scriptPath == '\0')
    Fail(ExitScriptError, "FAKEMI_SCRIPT is not set; it must name the script to play");
  const std::string script = LoadScript(scriptPath);
  const std::vector<TDirective> directives = TScriptParser(scriptPath).Parse(script);
  TScriptRunner(ArgumentCount, Arguments).Run(directives);
  return 0;
}
