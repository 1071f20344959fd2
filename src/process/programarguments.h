#pragma once
/// \file
/// The program's arguments as the one command-line text the library passes
/// to the debugger (the Arguments of TGDBProcessManager::CreateProcess).

#include "platform/types.h"

#include <string>

namespace midebug {

/// The text that makes each of Arguments reach the program exactly as given
/// (blanks, quotes, backslashes, "$", "*", ";", an empty argument, any
/// UTF-8). GDB hands the text to /bin/sh, so each argument is single-quoted
/// for the shell; a line break inside an argument arrives too. LLDB's MI
/// front end runs no shell and splits the text itself, grouping by double
/// quotes; it has no way to carry a line break, which arrives as a blank.
std::string QuoteProgramArguments(const TStringArray& Arguments, bool ForLLDB);

} // namespace midebug
