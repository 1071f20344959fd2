#pragma once
/// \file
/// Text in double quotes, the one form that MI c-strings, the host's command
/// line and LLDB's front end all read back unchanged.

#include <string>
#include <string_view>

namespace midebug {

/// Text in double quotes, every double quote and backslash in it escaped by
/// a backslash.
inline std::string DoubleQuoted(std::string_view Text) {
  std::string Quoted = "\"";
  for (const char Character : Text) {
    if (Character == '"' || Character == '\\')
      Quoted += '\\';
    Quoted += Character;
  }
  return Quoted + '"';
}

} // namespace midebug
