#pragma once
/// \file
/// The value of a hexadecimal digit: the one digit reader behind the MI
/// number readers and the parser of interface identifiers, which runs at
/// compile time.

namespace midebug {

/// The value of one hexadecimal digit of either case, or -1.
constexpr int HexDigitValue(char Digit) {
  if (Digit >= '0' && Digit <= '9')
    return Digit - '0';
  if (Digit >= 'a' && Digit <= 'f')
    return Digit - 'a' + 10;
  if (Digit >= 'A' && Digit <= 'F')
    return Digit - 'A' + 10;
  return -1;
}

} // namespace midebug
