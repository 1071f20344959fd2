#pragma once
/// \file
/// The services an interactive host program needs from its console: the
/// signals a person or the system sends it, caught instead of ending it;
/// its standard input read a line at a time without blocking the main
/// thread; a file checked for being a program; the words of a signal.

#include "platform/types.h"

#include <string>

namespace midebug {

/// What a caught signal asks of the host.
enum class THostSignal : uint8_t {
  None,
  /// Ctrl-C at the terminal (SIGINT).
  Interrupt,
  /// SIGTERM or SIGHUP: end at once, cleanly.
  Terminate,
};

/// From now on SIGINT, SIGTERM and SIGHUP set a flag instead of ending the
/// host; TakeHostSignal collects it. Call once, from the main thread.
void CatchHostSignals();

/// The signal caught since the last call, a termination before an
/// interrupt; None when there was none. Any thread.
THostSignal TakeHostSignal();

/// The number of the terminating signal caught (SIGTERM, SIGHUP), or 0.
int CaughtTerminationSignal();

/// Standard input read line by line. Waiting is bounded, so that the caller
/// can deliver events and look at caught signals between two waits.
class TConsoleInput {
public:
  enum class TState { Line, Waiting, Ended };
  /// Waits at most TimeoutMs for a whole line. Line with the line (without
  /// its line end) in Line; Waiting when none is complete yet; Ended at the
  /// end of the input (a last line without line end comes first as Line).
  TState ReadLine(std::string& Line, int TimeoutMs);

private:
  std::string FPending;
  bool FEnded = false;
};

/// True when Path names a regular file this process may execute.
bool IsExecutableFile(const std::string& Path);

/// The system's description of a signal named like "SIGSEGV"
/// ("Segmentation fault"); empty for a name it does not know.
std::string SignalDescription(const std::string& Name);

} // namespace midebug
