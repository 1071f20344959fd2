#pragma once
/// \file
/// A stand-in process: one that a debugger attaches to in its place, and
/// that then becomes the debugged program. A host uses it to run a program
/// in a terminal that it does not own (an editor's).

#include "platform/types.h"

#include <string>

namespace midebug {

/// The calling process's id.
Integer CurrentProcessId();

/// Lets a debugger that is not the caller's ancestor attach to it, where the
/// host allows only ancestors by default.
void AllowAnyDebuggerToAttach();

/// Replaces the calling process by Arguments[0] (looked up on PATH when it
/// holds no "/") with the caller's environment; returns only when that
/// failed, with the system's message.
std::string BecomeProgram(const TStringArray& Arguments);

} // namespace midebug
