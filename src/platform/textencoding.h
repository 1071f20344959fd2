#pragma once
/// \file
/// The two encodings a debugger's output may arrive in: UTF-8, and the ANSI
/// code page (Windows-1252) as the fallback for bytes that are not UTF-8.

#include <string>
#include <string_view>

namespace midebug {

/// True when Bytes is well-formed UTF-8 (no overlong forms, surrogates or
/// code points above U+10FFFF).
bool IsValidUTF8(std::string_view Bytes);

/// The length of Bytes without a multi-byte sequence that its end cuts
/// short, so that text read in pieces is decoded whole.
size_t CompleteUTF8Length(std::string_view Bytes);
/// Windows-1252 bytes converted to UTF-8. The five bytes the code page leaves
/// undefined map to the C1 control of the same value, so no byte is lost.
std::string AnsiToUTF8(std::string_view Bytes);

/// Bytes as UTF-8 text: every valid UTF-8 sequence unchanged, every other
/// byte read as Windows-1252.
std::string DecodeUTF8OrAnsi(std::string_view Bytes);

} // namespace midebug
