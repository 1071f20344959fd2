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

} // namespace midebug::dap
