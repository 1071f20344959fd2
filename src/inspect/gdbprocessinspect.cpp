// The inspection operations of a process that are not built yet: each
// reports failure or nothing.

#include "process/gdbprocess.h"

namespace midebug {

void TGDBProcess::CreateSourceBreakpoint(const std::string&, Integer, const TIntfPtr<IGDBBreakpointListener>&) {}
void TGDBProcess::CreateAddressBreakpoint(UInt64, const TIntfPtr<IGDBBreakpointListener>&) {}
void TGDBProcess::CreateWatchBreakpoint(UInt64, bool, bool, const TIntfPtr<IGDBBreakpointListener>&) {}
void TGDBProcess::DeleteBreakpoint(Integer) {}
void TGDBProcess::EnableBreakpoint(Integer) {}
void TGDBProcess::DisableBreakpoint(Integer) {}

} // namespace midebug
