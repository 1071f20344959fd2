#pragma once
/// \file
/// The breakpoints of one process, by the debugger's breakpoint number.

#include "process/gdbinterfaces.h"

#include <array>
#include <map>
#include <mutex>
#include <vector>

namespace midebug {

/// Who set a breakpoint, which decides how its hits are reported.
enum TBreakpointKind : uint8_t {
  bkUser = 0,      ///< the IDE's
  bkTemporary = 1, ///< the process's run-to-main one; GDB deletes it at its hit
  bkException = 2, ///< a language-exception breakpoint of the process
};

/// A listener that hears a hit, and why it was set.
struct TBreakpointHit {
  TIntfPtr<IGDBBreakpointListener> Listener;
  TBreakpointKind Kind = bkUser;
};

/// The listener of every breakpoint the debugger reported, the IDE's and the
/// process's own, with where each stands. FLock guards the table and is a
/// leaf lock: listeners are called only after it is let go.
class TGDBBreakpointTable {
public:
  void Add(Integer Breakpoint, const TIntfPtr<IGDBBreakpointListener>& Listener, TBreakpointKind Kind = bkUser,
           const TAddressArray& Addresses = {});
  void Remove(Integer Breakpoint);
  /// The breakpoint's listener; null when the table does not hold it.
  TIntfPtr<IGDBBreakpointListener> Find(Integer Breakpoint);
  void SetEnabled(Integer Breakpoint, bool Enabled);
  /// Records where the debugger now places the breakpoint (no address while
  /// it is pending); true when it held the breakpoint and the verdict or an
  /// address changed.
  bool Relocate(Integer Breakpoint, const TAddressArray& Addresses);
  /// The listeners of a hit the debugger reported for Breakpoint at Address:
  /// its own first, then every other enabled breakpoint placed there, since
  /// the debugger names only one. A temporary one is dropped: the debugger
  /// deleted it.
  std::vector<TBreakpointHit> Hit(Integer Breakpoint, UInt64 Address);
  /// The process's exception breakpoints, by their order of installation.
  TIntfPtr<IGDBBreakpointListener>& ExceptionSlot(size_t Index) { return FExceptionSlots.at(Index); }

private:
  struct TEntry {
    TIntfPtr<IGDBBreakpointListener> Listener;
    TBreakpointKind Kind = bkUser;
    bool Enabled = true;
    /// Where it is placed; empty while pending.
    TAddressArray Addresses;
  };
  std::mutex FLock;
  std::map<Integer, TEntry> FBreakpointList;
  std::array<TIntfPtr<IGDBBreakpointListener>, 5> FExceptionSlots;
};

} // namespace midebug
