#pragma once
/// \file
/// Facts about the host the library runs on.

namespace midebug {

#ifdef _WIN32
constexpr bool HostEndsLinesWithCRLF = true;
constexpr const char* DefaultDebuggerProgram = "gdb.exe";
constexpr const char* LLDBFrontEndFileName = "lldb-mi.exe";
#else
/// Debuggers on POSIX hosts end their lines with LF alone.
constexpr bool HostEndsLinesWithCRLF = false;
/// A bare name: found on PATH.
constexpr const char* DefaultDebuggerProgram = "gdb";
/// LLDB's MI front end is recognised by this exact file name.
constexpr const char* LLDBFrontEndFileName = "lldb-mi";
#endif

} // namespace midebug
