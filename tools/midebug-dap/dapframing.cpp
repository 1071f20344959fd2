// The adapter's framing of messages, both ways.

#include "dapframing.h"

#include <cctype>

namespace midebug::dap {

namespace {

constexpr std::string_view LengthField = "Content-Length:";
constexpr std::string_view HeaderEnd = "\r\n\r\n";

/// Where the next length field starts at or after From; npos when none does.
size_t FindHeader(const std::string& Buffer, size_t From) { return Buffer.find(LengthField, From); }

/// Where a whole header line ("Content-Length: N" and a line break) starts
/// at or after From; npos when none does. Such a line cannot be part of a
/// JSON body: JSON escapes line breaks inside strings, and the field's name
/// outside a string is no JSON.
size_t FindHeaderLine(const std::string& Buffer, size_t From) {
  for (size_t At = Buffer.find(LengthField, From); At != std::string::npos; At = Buffer.find(LengthField, At + 1)) {
    size_t Digit = At + LengthField.size();
    while (Digit < Buffer.size() && Buffer[Digit] == ' ')
      ++Digit;
    const size_t Digits = Digit;
    while (Digit < Buffer.size() && std::isdigit(static_cast<unsigned char>(Buffer[Digit])))
      ++Digit;
    if (Digit > Digits && Buffer.compare(Digit, 2, "\r\n") == 0)
      return At;
  }
  return std::string::npos;
}

/// The value of the length field in Header; false when it is missing or
/// not a plain decimal number within Limit.
bool ParseLength(std::string_view Header, size_t Limit, size_t& Length) {
  std::string_view Value = Header.substr(LengthField.size());
  Value = Value.substr(0, Value.find('\r'));
  while (!Value.empty() && Value.front() == ' ')
    Value.remove_prefix(1);
  while (!Value.empty() && Value.back() == ' ')
    Value.remove_suffix(1);
  if (Value.empty() || Value.size() > 12)
    return false;
  Length = 0;
  for (const char Digit : Value) {
    if (!std::isdigit(static_cast<unsigned char>(Digit)))
      return false;
    Length = Length * 10 + static_cast<size_t>(Digit - '0');
  }
  return Length <= Limit;
}

} // namespace

TDapFrameReader::TNext TDapFrameReader::Drop(size_t Count, const std::string& Why, std::string& Body) {
  FBuffer.erase(0, Count);
  Body = Why;
  return TNext::Garbage;
}

TDapFrameReader::TNext TDapFrameReader::Next(std::string& Body) {
  const size_t Header = FindHeader(FBuffer, 0);
  if (Header == std::string::npos) {
    // Keep what could be the start of a length field cut by the read.
    const size_t Keep = LengthField.size() - 1;
    if (FBuffer.size() <= Keep)
      return TNext::NeedMore;
    const size_t Cut = FBuffer.size() - Keep;
    if (FBuffer.find_first_not_of(" \t\r\n") >= Cut) {
      FBuffer.erase(0, Cut);
      return TNext::NeedMore;
    }
    return Drop(Cut, "bytes that are not a message", Body);
  }
  if (Header > 0) {
    // Blank lines between messages are harmless.
    if (FBuffer.find_first_not_of(" \t\r\n") >= Header) {
      FBuffer.erase(0, Header);
      return Next(Body);
    }
    return Drop(Header, "bytes that are not a message", Body);
  }
  const size_t End = FBuffer.find(HeaderEnd);
  if (End == std::string::npos || End > MaxHeaderBytes) {
    if (End == std::string::npos && FBuffer.size() <= MaxHeaderBytes)
      return TNext::NeedMore;
    return Drop(LengthField.size(), "a header block without its end", Body);
  }
  size_t Length = 0;
  if (!ParseLength(std::string_view(FBuffer).substr(0, End), MaxBodyBytes, Length))
    return Drop(End + HeaderEnd.size(), "a header with a bad Content-Length", Body);
  const size_t BodyStart = End + HeaderEnd.size();
  // A header line inside the awaited bytes means the length lied: the
  // message ends where the next one starts.
  const size_t NextHeader = FindHeaderLine(FBuffer, BodyStart);
  if (NextHeader != std::string::npos && NextHeader < BodyStart + Length) {
    Body = FBuffer.substr(BodyStart, NextHeader - BodyStart);
    FBuffer.erase(0, NextHeader);
    return TNext::Message;
  }
  if (FBuffer.size() < BodyStart + Length)
    return TNext::NeedMore;
  Body = FBuffer.substr(BodyStart, Length);
  FBuffer.erase(0, BodyStart + Length);
  return TNext::Message;
}

TDapFrameReader::TNext TDapFrameReader::Finish(std::string& Body) {
  const TNext Result = Next(Body);
  if (Result != TNext::NeedMore)
    return Result;
  const size_t End = FBuffer.find(HeaderEnd);
  if (FindHeader(FBuffer, 0) == 0 && End != std::string::npos) {
    Body = FBuffer.substr(End + HeaderEnd.size());
    FBuffer.clear();
    return TNext::Message;
  }
  FBuffer.clear();
  return TNext::NeedMore;
}

std::string FrameMessage(std::string_view Body) {
  std::string Framed = "Content-Length: " + std::to_string(Body.size()) + "\r\n\r\n";
  Framed.append(Body);
  return Framed;
}

} // namespace midebug::dap
