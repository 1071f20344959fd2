#include "mi/miscanner.h"

#include "platform/textencoding.h"

#include <cstring>
#include <limits>

namespace midebug {

namespace {

bool IsDigit(char C) { return C >= '0' && C <= '9'; }
bool IsLetter(char C) { return (C >= 'a' && C <= 'z') || (C >= 'A' && C <= 'Z'); }
bool IsBlank(char C) { return C == ' ' || C == '\t'; }
bool IsOctal(char C) { return C >= '0' && C <= '7'; }

/// The byte of the three octal digits that start Text when it lies above
/// 0x7f (debuggers escape such bytes of a c-string so), else -1.
int HighOctalByte(std::string_view Text) {
  if (Text.size() < 3 || (Text[0] != '2' && Text[0] != '3') || !IsOctal(Text[1]) || !IsOctal(Text[2]))
    return -1;
  return (Text[0] - '0') * 64 + (Text[1] - '0') * 8 + (Text[2] - '0');
}

/// True when Raw holds a real (not backslash-escaped) high octal escape.
bool HasHighOctalEscape(std::string_view Raw) {
  for (size_t I = Raw.find('\\'); I != std::string_view::npos; I = Raw.find('\\', I + 2)) {
    if (HighOctalByte(Raw.substr(I + 1)) >= 0)
      return true;
  }
  return false;
}

/// The sign and magnitude of a number text, or false when the text is not a
/// number. Hexadecimal magnitudes may use all of MaxHexDigits digits; decimal
/// ones must not exceed MaxDecimal.
bool ParseNumber(std::string_view Text, unsigned MaxHexDigits, uint64_t MaxDecimal, bool& Negative,
                 uint64_t& Magnitude, bool& Hex) {
  size_t I = 0;
  while (I < Text.size() && IsBlank(Text[I]))
    ++I;
  Negative = false;
  if (I < Text.size() && (Text[I] == '-' || Text[I] == '+')) {
    Negative = Text[I] == '-';
    ++I;
  }
  Hex = false;
  if (I < Text.size() && Text[I] == '$') {
    Hex = true;
    ++I;
  } else if (I + 1 < Text.size() && Text[I] == '0' && (Text[I + 1] == 'x' || Text[I + 1] == 'X')) {
    Hex = true;
    I += 2;
  }
  if (I >= Text.size())
    return false;
  Magnitude = 0;
  if (Hex) {
    // Leading zeros do not count towards the width.
    while (I + 1 < Text.size() && Text[I] == '0')
      ++I;
    if (Text.size() - I > MaxHexDigits)
      return false;
    for (; I < Text.size(); ++I) {
      const int Digit = HexDigitValue(Text[I]);
      if (Digit < 0)
        return false;
      Magnitude = Magnitude * 16 + static_cast<uint64_t>(Digit);
    }
    return true;
  }
  for (; I < Text.size(); ++I) {
    if (!IsDigit(Text[I]))
      return false;
    const uint64_t Digit = static_cast<uint64_t>(Text[I] - '0');
    if (Magnitude > (MaxDecimal - Digit) / 10)
      return false;
    Magnitude = Magnitude * 10 + Digit;
  }
  return true;
}

/// Records that may follow program output on the same line: the debugger
/// writes them while a partial line of the program is still in the pipe.
constexpr std::string_view GluedStopRecord = "stopped,reason=";
constexpr std::string_view GluedRunningRecord = "running,thread-id=";
constexpr std::string_view GluedNotifyRecords[] = {
    "library-loaded,id=", "library-unloaded,id=", "thread-created,id=", "thread-exited,id=",
    "thread-selected,id=",
};
constexpr std::string_view GluedResultClasses[] = {"done", "running", "error", "connected", "exit"};

bool StartsWith(std::string_view Text, size_t At, std::string_view Prefix) {
  return At <= Text.size() && Text.substr(At).starts_with(Prefix);
}

/// True when a result record "^class" (the class followed by a comma or the
/// line end) starts at Caret. Losing such a record would leave its requester
/// waiting until its time-out.
bool IsGluedResultRecord(std::string_view Text, size_t Caret) {
  for (std::string_view Class : GluedResultClasses) {
    if (!StartsWith(Text, Caret + 1, Class))
      continue;
    const size_t After = Caret + 1 + Class.size();
    if (After >= Text.size() || Text[After] == ',' || Text[After] == '\r' || Text[After] == '\n')
      return true;
  }
  return false;
}

} // namespace

std::string_view TrimBlanks(std::string_view Text) {
  while (!Text.empty() && IsBlank(Text.front()))
    Text.remove_prefix(1);
  while (!Text.empty() && IsBlank(Text.back()))
    Text.remove_suffix(1);
  return Text;
}

Integer MIStrToIntDef(std::string_view Text, Integer Default) {
  bool Negative = false;
  bool Hex = false;
  uint64_t Magnitude = 0;
  if (!ParseNumber(Text, 8, uint64_t{1} << 31, Negative, Magnitude, Hex))
    return Default;
  if (Hex) {
    const uint32_t Pattern = static_cast<uint32_t>(Negative ? (~Magnitude + 1) : Magnitude);
    return static_cast<Integer>(Pattern);
  }
  if (Negative)
    return static_cast<Integer>(-static_cast<int64_t>(Magnitude));
  if (Magnitude > static_cast<uint64_t>(std::numeric_limits<Integer>::max()))
    return Default;
  return static_cast<Integer>(Magnitude);
}

UInt64 MIStrToUInt64Def(std::string_view Text, UInt64 Default) {
  bool Negative = false;
  bool Hex = false;
  uint64_t Magnitude = 0;
  if (!ParseNumber(Text, 16, uint64_t{1} << 63, Negative, Magnitude, Hex))
    return Default;
  if (!Hex && !Negative && Magnitude > static_cast<uint64_t>(std::numeric_limits<Int64>::max()))
    return Default;
  return Negative ? ~Magnitude + 1 : Magnitude;
}

// --- Nested scans ---------------------------------------------------------

TMIScanner::TNestedScan::TNestedScan(TMIScanner& Scanner, std::string_view Text)
    : FScanner(Scanner), FSaved(Scanner.SaveState()) {
  FScanner.RestoreState({Text, 0});
}

TMIScanner::TNestedScan::~TNestedScan() { FScanner.RestoreState(FSaved); }

void TMIScanner::RestoreState(const TState& State) {
  FText = State.Text;
  FPos = State.Pos < FText.size() ? State.Pos : FText.size();
}

// --- Characters and lines -------------------------------------------------

char TMIScanner::NextChar() {
  if (FPos < FText.size())
    ++FPos;
  return Char();
}

char TMIScanner::PeekChar() const { return FPos + 1 < FText.size() ? FText[FPos + 1] : '\0'; }

void TMIScanner::SkipLine() {
  if (AtEnd())
    return;
  const void* LineEnd = std::memchr(FText.data() + FPos, '\n', FText.size() - FPos);
  FPos = LineEnd ? static_cast<size_t>(static_cast<const char*>(LineEnd) - FText.data()) + 1 : FText.size();
}

bool TMIScanner::IsPromptLine(std::string_view Line, std::string_view EndOfLineMarker) const {
  // The prompt may reach us with LF where the kernel expects CR LF, or the
  // other way round; both are the same prompt line.
  auto WithoutLineEnd = [](std::string_view Text) {
    if (Text.ends_with('\n'))
      Text.remove_suffix(1);
    if (Text.ends_with('\r'))
      Text.remove_suffix(1);
    return Text;
  };
  if (EndOfLineMarker.empty())
    return false;
  return Line == EndOfLineMarker || WithoutLineEnd(Line) == WithoutLineEnd(EndOfLineMarker);
}

std::string_view TMIScanner::ReadRestOfLine(std::string_view EndOfLineMarker) {
  const size_t Start = FPos;
  SkipLine();
  const std::string_view Line = FText.substr(Start, FPos - Start);
  return IsPromptLine(Line, EndOfLineMarker) ? std::string_view() : Line;
}

std::string_view TMIScanner::ReadConsoleLine(std::string_view EndOfLineMarker) {
  const size_t Start = FPos;
  size_t Stop = FText.size();
  for (size_t I = Start + 1; I <= FText.size(); ++I) {
    if (FText[I - 1] == '\n') {
      Stop = I;
      break;
    }
    if (I == FText.size())
      break;
    const char C = FText[I];
    if (C == '*' && (StartsWith(FText, I + 1, GluedStopRecord) || StartsWith(FText, I + 1, GluedRunningRecord))) {
      Stop = I;
      break;
    }
    if (C == '=') {
      bool Glued = false;
      for (std::string_view Record : GluedNotifyRecords)
        Glued = Glued || StartsWith(FText, I + 1, Record);
      if (Glued) {
        Stop = I;
        break;
      }
    }
    if (C == '^' && IsGluedResultRecord(FText, I)) {
      // The record starts at its token, the digits right before the caret.
      // Without a token nobody waits for it, and a bare "^error" in the
      // program's output must not pass for a fault.
      size_t TokenStart = I;
      while (TokenStart > Start + 1 && IsDigit(FText[TokenStart - 1]))
        --TokenStart;
      if (TokenStart < I) {
        Stop = TokenStart;
        break;
      }
    }
  }
  if (Start >= FText.size())
    Stop = Start;
  FPos = Stop;
  const std::string_view Line = FText.substr(Start, Stop - Start);
  return IsPromptLine(Line, EndOfLineMarker) ? std::string_view() : Line;
}

// --- Words ----------------------------------------------------------------

std::string_view TMIScanner::ReadToken() {
  const size_t Start = FPos;
  while (!AtEnd() && IsDigit(Char()))
    ++FPos;
  return FText.substr(Start, FPos - Start);
}

std::string_view TMIScanner::ReadIdentifier() {
  if (AtEnd() || !IsLetter(Char()))
    return {};
  const size_t Start = FPos;
  while (!AtEnd() && (IsLetter(Char()) || Char() == '-'))
    ++FPos;
  return FText.substr(Start, FPos - Start);
}

std::string_view TMIScanner::ReadWord() {
  if (AtEnd() || !(IsLetter(Char()) || IsDigit(Char()) || Char() == '$'))
    return {};
  const size_t Start = FPos++;
  while (!AtEnd() && (IsLetter(Char()) || IsDigit(Char())))
    ++FPos;
  return FText.substr(Start, FPos - Start);
}

std::string_view TMIScanner::ReadKey() {
  if (AtEnd() || Char() == '=')
    return {};
  const size_t Start = FPos;
  const void* Equals = std::memchr(FText.data() + FPos, '=', FText.size() - FPos);
  if (!Equals) {
    FPos = FText.size();
    return {};
  }
  FPos = static_cast<size_t>(static_cast<const char*>(Equals) - FText.data());
  return FText.substr(Start, FPos - Start);
}

// --- Values ---------------------------------------------------------------

std::string_view TMIScanner::ScanCString(bool Keep) {
  if (Char() != '"' || AtEnd())
    return {};
  const size_t Start = FPos + 1;
  bool EscapedQuote = false;
  size_t I = Start;
  // Jump from quote to quote; a quote ends the string when an even number of
  // backslashes precedes it (each backslash escapes the next character).
  for (;;) {
    const void* Quote = I < FText.size() ? std::memchr(FText.data() + I, '"', FText.size() - I) : nullptr;
    if (!Quote) {
      FPos = FText.size();
      return {};
    }
    const size_t QuotePos = static_cast<size_t>(static_cast<const char*>(Quote) - FText.data());
    size_t Backslashes = 0;
    while (QuotePos - Backslashes > Start && FText[QuotePos - Backslashes - 1] == '\\')
      ++Backslashes;
    if (Backslashes % 2 == 0) {
      I = QuotePos;
      break;
    }
    EscapedQuote = true;
    I = QuotePos + 1;
  }
  FPos = I + 1;
  const std::string_view Raw = FText.substr(Start, I - Start);
  if (!Keep || (!EscapedQuote && !HasHighOctalEscape(Raw)))
    return Raw;
  // Escapes come in pairs: a backslash-quote becomes a quote and an octal
  // escape of a byte above 0x7f becomes that byte (runs of them decoded as
  // UTF-8, with the ANSI fallback for the bytes that are not); every other
  // escape, a doubled backslash included, stays as written.
  std::string& Unescaped = FOwned.emplace_back();
  Unescaped.reserve(Raw.size());
  std::string Bytes;
  for (size_t J = 0; J < Raw.size(); ++J) {
    int Byte = Raw[J] == '\\' ? HighOctalByte(Raw.substr(J + 1)) : -1;
    if (Byte >= 0) {
      Bytes += static_cast<char>(Byte);
      J += 3;
      continue;
    }
    if (!Bytes.empty()) {
      Unescaped += DecodeUTF8OrAnsi(Bytes);
      Bytes.clear();
    }
    if (Raw[J] == '\\' && J + 1 < Raw.size()) {
      if (Raw[J + 1] != '"')
        Unescaped += '\\';
      Unescaped += Raw[++J];
    } else {
      Unescaped += Raw[J];
    }
  }
  Unescaped += DecodeUTF8OrAnsi(Bytes);
  return Unescaped;
}

std::string_view TMIScanner::ReadCString() { return ScanCString(true); }

std::string_view TMIScanner::ScanDelimited(char Open, char Close) {
  if (AtEnd() || Char() != Open)
    return {};
  const size_t Start = FPos + 1;
  const void* End = std::memchr(FText.data() + Start, Close, FText.size() - Start);
  if (!End) {
    FPos = FText.size();
    return {};
  }
  FPos = static_cast<size_t>(static_cast<const char*>(End) - FText.data()) + 1;
  return FText.substr(Start, FPos - 1 - Start);
}

std::string_view TMIScanner::ReadBraced() { return ScanDelimited('{', '}'); }

std::string_view TMIScanner::ReadParenthesized() { return ScanDelimited('(', ')'); }

void TMIScanner::SkipResult() {
  ReadKey();
  NextChar();
  SkipValue();
}

std::string_view TMIScanner::ScanContainer(char Open, char Close) {
  if (AtEnd() || Char() != Open)
    return {};
  const size_t Start = FPos + 1;
  NextChar();
  if (AtEnd())
    return {};
  if (Char() == Close) {
    NextChar();
    return {};
  }
  // A tuple holds results; a list holds results or values, as its first
  // element shows.
  const bool HoldsValues = Open == '[' && (Char() == '"' || Char() == '{' || Char() == '[');
  auto SkipElement = [&] {
    if (HoldsValues)
      SkipValue();
    else
      SkipResult();
  };
  SkipElement();
  while (!AtEnd() && Char() == ',') {
    NextChar();
    SkipElement();
  }
  if (AtEnd() || Char() != Close)
    return {};
  NextChar();
  return FText.substr(Start, FPos - 1 - Start);
}

std::string_view TMIScanner::ReadContainer(char Open, char Close) {
  const int Saved = FDepth;
  ++FDepth;
  const std::string_view Value = FDepth > MaxNesting ? std::string_view() : ScanContainer(Open, Close);
  FDepth = Saved;
  return Value;
}

std::string_view TMIScanner::ReadTuple() { return ReadContainer('{', '}'); }

std::string_view TMIScanner::ReadList() { return ReadContainer('[', ']'); }

std::string_view TMIScanner::ScanValue(bool Keep) {
  if (AtEnd())
    return {};
  switch (Char()) {
  case '"':
    return ScanCString(Keep);
  case '{':
    return ReadTuple();
  case '[':
    return ReadList();
  case ' ': {
    const char Next = PeekChar();
    if (FPos + 1 >= FText.size() || !(Next == '{' || IsLetter(Next) || IsDigit(Next)))
      return {};
    NextChar();
    return Char() == '{' ? ReadBraced() : ReadWord();
  }
  default:
    return {};
  }
}

std::string_view TMIScanner::ReadValue() { return ScanValue(true); }

std::string_view TMIScanner::FindValue(std::string_view Name) {
  const size_t Saved = FPos;
  std::string_view Key = ReadKey();
  if (Key == Name && !AtEnd()) {
    NextChar();
    const std::string_view Value = ReadValue();
    if (!AtEnd() && Char() == ',')
      NextChar();
    return Value;
  }
  std::string_view Value;
  NextChar();
  SkipValue();
  while (!AtEnd() && Char() == ',') {
    NextChar();
    Key = ReadKey();
    if (Key == Name && !AtEnd()) {
      NextChar();
      Value = ReadValue();
      break;
    }
    NextChar();
    SkipValue();
  }
  FPos = Saved;
  return Value;
}

Integer TMIScanner::FindInteger(std::string_view Name, Integer Default) {
  return MIStrToIntDef(FindValue(Name), Default);
}

UInt64 TMIScanner::FindUInt64(std::string_view Name, UInt64 Default) {
  return MIStrToUInt64Def(FindValue(Name), Default);
}

} // namespace midebug
