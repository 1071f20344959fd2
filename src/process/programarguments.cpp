#include "process/programarguments.h"

#include "platform/quoting.h"

namespace midebug {

namespace {

/// 'text' for /bin/sh: nothing inside single quotes is special but the
/// closing quote, so a quote of the argument is written as '\''.
std::string ShellQuoted(const std::string& Argument) {
  std::string Quoted = "'";
  for (const char Character : Argument) {
    if (Character == '\'')
      Quoted += "'\\''";
    else
      Quoted += Character;
  }
  return Quoted + "'";
}

} // namespace

std::string QuoteProgramArguments(const TStringArray& Arguments, bool ForLLDB) {
  std::string Text;
  for (const std::string& Argument : Arguments) {
    if (!Text.empty())
      Text += ' ';
    Text += ForLLDB ? DoubleQuoted(Argument) : ShellQuoted(Argument);
  }
  return Text;
}

} // namespace midebug
