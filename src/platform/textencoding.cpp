#include "platform/textencoding.h"

#include <cstdint>

namespace midebug {

namespace {

/// The length of the UTF-8 sequence at Next, or 0 when none starts there
/// (a stray byte, a cut sequence, an overlong form, a surrogate).
size_t SequenceLength(const unsigned char* Next, const unsigned char* End) {
  const unsigned char Lead = *Next;
  if (Lead < 0x80)
    return 1;
  int Trail;
  uint32_t CodePoint;
  uint32_t Minimum;
  if ((Lead & 0xE0) == 0xC0) {
    Trail = 1, CodePoint = Lead & 0x1F, Minimum = 0x80;
  } else if ((Lead & 0xF0) == 0xE0) {
    Trail = 2, CodePoint = Lead & 0x0F, Minimum = 0x800;
  } else if ((Lead & 0xF8) == 0xF0) {
    Trail = 3, CodePoint = Lead & 0x07, Minimum = 0x10000;
  } else {
    return 0;
  }
  if (End - Next <= Trail)
    return 0;
  for (int I = 1; I <= Trail; ++I) {
    if ((Next[I] & 0xC0) != 0x80)
      return 0;
    CodePoint = (CodePoint << 6) | (Next[I] & 0x3F);
  }
  if (CodePoint < Minimum || CodePoint > 0x10FFFF || (CodePoint >= 0xD800 && CodePoint <= 0xDFFF))
    return 0;
  return static_cast<size_t>(Trail) + 1;
}

} // namespace

bool IsValidUTF8(std::string_view Bytes) {
  const auto* Next = reinterpret_cast<const unsigned char*>(Bytes.data());
  const auto* End = Next + Bytes.size();
  while (Next < End) {
    const size_t Length = SequenceLength(Next, End);
    if (Length == 0)
      return false;
    Next += Length;
  }
  return true;
}

namespace {

/// Code points of the bytes 0x80 to 0x9F in Windows-1252; the rest of the
/// upper half equals Latin-1.
constexpr uint16_t Windows1252High[32] = {
    0x20AC, 0x0081, 0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021, 0x02C6, 0x2030, 0x0160,
    0x2039, 0x0152, 0x008D, 0x017D, 0x008F, 0x0090, 0x2018, 0x2019, 0x201C, 0x201D, 0x2022,
    0x2013, 0x2014, 0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0x009D, 0x017E, 0x0178};

void AppendUTF8(std::string& Text, uint32_t CodePoint) {
  if (CodePoint < 0x80) {
    Text += static_cast<char>(CodePoint);
  } else if (CodePoint < 0x800) {
    Text += static_cast<char>(0xC0 | (CodePoint >> 6));
    Text += static_cast<char>(0x80 | (CodePoint & 0x3F));
  } else {
    Text += static_cast<char>(0xE0 | (CodePoint >> 12));
    Text += static_cast<char>(0x80 | ((CodePoint >> 6) & 0x3F));
    Text += static_cast<char>(0x80 | (CodePoint & 0x3F));
  }
}

/// Appends the Windows-1252 character of Byte.
void AppendAnsi(std::string& Text, unsigned char Byte) {
  AppendUTF8(Text, Byte >= 0x80 && Byte < 0xA0 ? Windows1252High[Byte - 0x80] : Byte);
}

} // namespace

std::string AnsiToUTF8(std::string_view Bytes) {
  std::string Text;
  Text.reserve(Bytes.size() + Bytes.size() / 4);
  for (const char Byte : Bytes)
    AppendAnsi(Text, static_cast<unsigned char>(Byte));
  return Text;
}

size_t CompleteUTF8Length(std::string_view Bytes) {
  // A sequence is at most 4 bytes: its lead byte is among the last 3 when
  // the end cuts it short.
  constexpr size_t MaxTailBytes = 3;
  for (size_t Back = 1; Back <= MaxTailBytes && Back <= Bytes.size(); ++Back) {
    const auto Byte = static_cast<unsigned char>(Bytes[Bytes.size() - Back]);
    if ((Byte & 0xC0) == 0x80)
      continue;
    const size_t Length = Byte >= 0xF0 ? 4 : Byte >= 0xE0 ? 3 : Byte >= 0xC0 ? 2 : 1;
    return Length > Back ? Bytes.size() - Back : Bytes.size();
  }
  return Bytes.size();
}

std::string DecodeUTF8OrAnsi(std::string_view Bytes) {
  if (IsValidUTF8(Bytes))
    return std::string(Bytes);
  // Only the bytes that are no UTF-8 are read as Windows-1252: a stray byte
  // must not turn the valid text around it into mojibake.
  std::string Text;
  Text.reserve(Bytes.size() + Bytes.size() / 4);
  const auto* Next = reinterpret_cast<const unsigned char*>(Bytes.data());
  const auto* End = Next + Bytes.size();
  while (Next < End) {
    const size_t Length = SequenceLength(Next, End);
    if (Length != 0) {
      Text.append(reinterpret_cast<const char*>(Next), Length);
      Next += Length;
      continue;
    }
    AppendAnsi(Text, *Next++);
  }
  return Text;
}

} // namespace midebug
