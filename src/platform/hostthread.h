#pragma once
/// \file
/// Small thread services: a debug name for the calling thread, yield and sleep.

#include <string>

namespace midebug {

/// Names the calling thread for debuggers and process listings (the system
/// keeps the first 15 bytes).
void SetCurrentThreadName(const std::string& Name);

/// Gives up the processor, then sleeps Milliseconds.
void YieldAndSleep(int Milliseconds);

} // namespace midebug
