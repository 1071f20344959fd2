#pragma once
/// \file
/// The MI value scanner: a cursor over a reply block (or over a value taken
/// from it) and the routines that read tokens, keys, c-strings, tuples and
/// lists at that cursor. It is the one way MI results are read.
///
/// Values are returned as views into the scanned text; only a c-string that
/// holds an escaped double quote is copied (into storage the scanner keeps for
/// its own lifetime), so every view stays valid while the scanner lives and
/// the block it was made on is not changed.

#include "platform/hexdigits.h"
#include "platform/types.h"

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>

namespace midebug {

/// Reads an integer the way the protocol writes it: optional leading blanks,
/// an optional sign, then decimal digits or hexadecimal digits after "$", "0x"
/// or "0X". Anything else, an empty text or an overflow gives Default. A
/// hexadecimal text of up to 8 digits yields the full 32-bit pattern.
Integer MIStrToIntDef(std::string_view Text, Integer Default);
/// As MIStrToIntDef for 64-bit values: up to 16 hexadecimal digits yield the
/// full 64-bit pattern; a negative decimal number yields its two's complement.
UInt64 MIStrToUInt64Def(std::string_view Text, UInt64 Default);
/// Text without the blanks and tabs around it.
std::string_view TrimBlanks(std::string_view Text);

class TMIScanner {
public:
  /// The text being scanned and the cursor in it, as saved by a nested scan.
  struct TState {
    std::string_view Text;
    size_t Pos = 0;
  };

  /// Restores the cursor of the enclosing text when a nested scan ends, also
  /// when the nested work leaves early.
  class TNestedScan {
  public:
    TNestedScan(TMIScanner& Scanner, std::string_view Text);
    ~TNestedScan();
    TNestedScan(const TNestedScan&) = delete;
    TNestedScan& operator=(const TNestedScan&) = delete;

  private:
    TMIScanner& FScanner;
    TState FSaved;
  };

  explicit TMIScanner(std::string_view Text) : FText(Text) {}
  TMIScanner(const TMIScanner&) = delete;
  TMIScanner& operator=(const TMIScanner&) = delete;

  /// The current character, or 0 past the end. A NUL byte inside the text is
  /// an ordinary character: the end is decided by AtEnd, not by Char.
  char Char() const { return FPos < FText.size() ? FText[FPos] : '\0'; }
  bool AtEnd() const { return FPos >= FText.size(); }
  /// Moves one character on and returns the new current character.
  char NextChar();
  /// The character after the current one, or 0; the cursor does not move.
  char PeekChar() const;
  size_t Pos() const { return FPos; }
  std::string_view Text() const { return FText; }
  /// The text from the cursor to the end.
  std::string_view Rest() const { return FPos < FText.size() ? FText.substr(FPos) : std::string_view(); }
  TState SaveState() const { return {FText, FPos}; }
  void RestoreState(const TState& State);
  /// Moves the cursor to Pos within the current text (clamped to the end).
  void SetPos(size_t Pos) { FPos = Pos < FText.size() ? Pos : FText.size(); }

  /// Skips to the first character of the next line, or to the end.
  void SkipLine();
  /// The text from the cursor through the next LF inclusive; empty when that
  /// line is the prompt EndOfLineMarker (compared regardless of a CR before
  /// the LF).
  std::string_view ReadRestOfLine(std::string_view EndOfLineMarker);
  /// As ReadRestOfLine, but stops before an MI record glued to the end of
  /// program output that had no line end of its own, so that the record is
  /// read next. The character at the start is not examined.
  std::string_view ReadConsoleLine(std::string_view EndOfLineMarker);
  /// The run of decimal digits at the cursor.
  std::string_view ReadToken();
  /// The run of ASCII letters and "-" at the cursor, if it starts with a letter.
  std::string_view ReadIdentifier();
  /// The text up to the next "=", cursor on the "=". Empty with the cursor
  /// unmoved on "=", and empty at the end of text. Every character counts, so
  /// the first key inside a list of tuples carries the tuple's opening brace.
  std::string_view ReadKey();
  /// The raw content of the c-string at the cursor. Only a backslash-quote
  /// pair is unescaped (when present); every other escape stays as written.
  /// Unterminated: empty, cursor at the end. Not on a quote: empty, unmoved.
  std::string_view ReadCString();
  /// The raw text between "{" and the first "}" (no nesting).
  std::string_view ReadBraced();
  /// The raw text between "(" and the first ")" (no nesting).
  std::string_view ReadParenthesized();
  /// A run of letters and digits starting at a letter, digit or "$".
  std::string_view ReadWord();
  /// Skips one "name=value" result.
  void SkipResult();
  /// The inner text of the tuple at the cursor, nested structure intact.
  std::string_view ReadTuple();
  /// The inner text of the list at the cursor, nested structure intact.
  std::string_view ReadList();
  /// The value at the cursor: a c-string's content, a tuple's or a list's
  /// inner text, or the word or brace group after a blank.
  std::string_view ReadValue();
  /// The value of the result called Name among the results starting at the
  /// cursor, or empty. When Name is the first result, the cursor moves past
  /// it (and its comma), so repeated calls walk a run of same-named results;
  /// otherwise the cursor stays where it was.
  std::string_view FindValue(std::string_view Name);

  /// FindValue read as an integer / 64-bit value with a default.
  Integer FindInteger(std::string_view Name, Integer Default);
  UInt64 FindUInt64(std::string_view Name, UInt64 Default);

  /// Values deeper than this read as empty, so hostile input cannot exhaust
  /// the stack. GDB's own replies nest a handful of levels.
  static constexpr int MaxNesting = 200;

private:
  std::string_view ScanCString(bool Keep);
  std::string_view ScanDelimited(char Open, char Close);
  /// The inner text of the tuple ("{", "}") or list ("[", "]") at the
  /// cursor, or empty when it is not closed.
  std::string_view ScanContainer(char Open, char Close);
  /// ScanContainer, or empty beyond MaxNesting levels.
  std::string_view ReadContainer(char Open, char Close);
  std::string_view ScanValue(bool Keep);
  void SkipValue() { ScanValue(false); }
  bool IsPromptLine(std::string_view Line, std::string_view EndOfLineMarker) const;

  std::string_view FText;
  size_t FPos = 0;
  int FDepth = 0;
  /// Unescaped copies of c-strings; a deque so earlier views stay valid.
  std::deque<std::string> FOwned;
};

} // namespace midebug
