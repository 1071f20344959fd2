#pragma once
/// \file
/// Addresses as the protocol writes them: memory and instruction references
/// are hexadecimal text.

#include "midebug.h"

#include <cerrno>
#include <cstdlib>
#include <optional>
#include <sstream>
#include <string>

namespace midebug::dap {

inline std::string HexAddress(UInt64 Address) {
  std::ostringstream Stream;
  Stream << "0x" << std::hex << Address;
  return Stream.str();
}

/// The address a reference such as "0x401000" (or a decimal number) names;
/// nullopt for anything else.
inline std::optional<UInt64> ParseAddress(const std::string& Reference) {
  if (Reference.empty() || Reference.front() == '-' || Reference.front() == '+' || Reference.front() == ' ')
    return std::nullopt;
  char* End = nullptr;
  errno = 0;
  const unsigned long long Address = std::strtoull(Reference.c_str(), &End, 0);
  if (*End != '\0' || errno != 0)
    return std::nullopt;
  return static_cast<UInt64>(Address);
}

/// The address in a pointer's value as the debugger prints it
/// ("0x601040 <counter>", "(long *) 0x601040").
inline std::optional<UInt64> PointerValue(const std::string& Value) {
  const size_t Hex = Value.find("0x");
  if (Hex == std::string::npos)
    return std::nullopt;
  const size_t End = Value.find_first_not_of("0123456789abcdefABCDEF", Hex + 2);
  return ParseAddress(Value.substr(Hex, End == std::string::npos ? std::string::npos : End - Hex));
}

/// Where a value of TypeName that reads Value points, for a pointer that
/// is not null; nullopt otherwise.
inline std::optional<UInt64> PointerTarget(const std::string& TypeName, const std::string& Value) {
  if (TypeName.empty() || TypeName.back() != '*' || Value.empty() || Value.front() == '{')
    return std::nullopt;
  const auto Target = PointerValue(Value);
  return Target && *Target != 0 ? Target : std::nullopt;
}

} // namespace midebug::dap
