#pragma once
/// \file
/// The breakpoints of one process, by the debugger's breakpoint number.

#include "process/gdbinterfaces.h"

#include <map>
#include <mutex>

namespace midebug {

/// The listener of every breakpoint the debugger reported, the IDE's and the
/// process's own. FLock guards the table and is a leaf lock: listeners are
/// called only after it is let go.
class TGDBBreakpointTable {
public:
  void Add(Integer Breakpoint, const TIntfPtr<IGDBBreakpointListener>& Listener);
  void Remove(Integer Breakpoint);
  /// The breakpoint's listener; null when the table does not hold it.
  TIntfPtr<IGDBBreakpointListener> Find(Integer Breakpoint);

private:
  std::mutex FLock;
  std::map<Integer, TIntfPtr<IGDBBreakpointListener>> FBreakpointList;
};

} // namespace midebug
