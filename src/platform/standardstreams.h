#pragma once
/// \file
/// The host program's own standard input and output, for a host that speaks
/// a protocol over them (a debug adapter) rather than through a terminal.

#include "platform/types.h"

#include <cstddef>
#include <string_view>

namespace midebug {

/// Reads up to Count bytes of standard input, waiting for at least one: the
/// number read, 0 at its end, -1 on failure.
Int64 ReadStandardInput(void* Buffer, size_t Count);

/// Writes all of Text to standard output, unbuffered. False when the reader
/// has gone away or the write failed; a reader that went away never raises a
/// signal that ends the host.
bool WriteStandardOutput(std::string_view Text);

} // namespace midebug
