#pragma once
/// \file
/// The process's own breakpoints on the language runtimes: a hit becomes an
/// exception the IDE hears of, read from the argument registers and memory
/// of the stopped call.

#include "process/gdbinterfaces.h"

#include <string>

namespace midebug {

class TGDBProcess;

/// The runtimes' notifier functions "_DbgExcNotify" (Pascal) and
/// "_CPPDbgExcNotify" (C++), called with (kind, object, name, address,
/// fallback address). The process, not BreakpointHits, reports a hit.
class TExceptionBreakpoint : public TInterfaced<IGDBBreakpointListener> {
public:
  TExceptionBreakpoint(TGDBProcess& Process, TGDBLanguage Language) : FProcess(Process), FLanguage(Language) {}
  void BreakpointHits(bool& ShouldStop, Integer /*ThreadId*/, TGDBLocation& /*Location*/) override {
    ShouldStop = false;
  }
  void BreakpointVerified(bool /*Verified*/, Integer /*Breakpoint*/, const TGDBLocation& /*Location*/) override {}
  /// Fills E (E.Location.Source is the stop's); false when the hit is not to
  /// be reported.
  virtual bool GetExceptionInfo(TGDBException& E);

protected:
  /// The first Count integer arguments of the stopped call; false when the
  /// registers could not be read.
  bool ReadArguments(TUInt64Array& Values, size_t Count);
  /// The zero-terminated string at Address, read in chunks; empty when
  /// unreadable.
  std::string ReadPChar(UInt64 Address);
  /// The length-prefixed string at Address; empty when unreadable.
  std::string ReadString(UInt64 Address);
  /// The 64-bit little-endian word at Address; false when unreadable.
  bool ReadWord(UInt64 Address, UInt64& Value);
  /// The location of the caller of the stopped function.
  bool CallerLocation(TGDBLocation& Location);

  TGDBProcess& FProcess;
  const TGDBLanguage FLanguage;
};

/// "__cxa_throw": the type thrown, as its mangled name, and where.
class TCXAThrowBreakpoint : public TExceptionBreakpoint {
public:
  using TExceptionBreakpoint::TExceptionBreakpoint;
  bool GetExceptionInfo(TGDBException& E) override;
};

/// "__cxa_begin_catch": where the exception is caught.
class TCXACatchBreakpoint : public TExceptionBreakpoint {
public:
  using TExceptionBreakpoint::TExceptionBreakpoint;
  bool GetExceptionInfo(TGDBException& E) override;
};

/// Free Pascal's "fpc_raiseexception": the class raised and its message.
class TFPCRaiseBreakpoint : public TExceptionBreakpoint {
public:
  using TExceptionBreakpoint::TExceptionBreakpoint;
  bool GetExceptionInfo(TGDBException& E) override;
};

/// The kinds of exception the process reports, by who found them.
enum : Integer { ExceptionKindCatch = 1, ExceptionKindRaise = 8, ExceptionKindThrow = 16 };

} // namespace midebug
