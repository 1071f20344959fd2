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
void TGDBProcess::GetSourceLines(const std::string&, TIntegerArray& Lines) { Lines.clear(); }
bool TGDBProcess::FindSourceLine(UInt64, UInt64&, Integer&, Integer&, Integer&) { return false; }
TAddressArray TGDBProcess::FindSourceAddress(Integer, Integer) { return {}; }
bool TGDBProcess::FindSourceLocation(const std::string&, Integer, TGDBLocation&) { return false; }
bool TGDBProcess::SetNewEip(UInt64) { return false; }
Integer TGDBProcess::GetFileIndex(const std::string&) { return 0; }
std::string TGDBProcess::GetFileName(Integer) { return {}; }
bool TGDBProcess::SetFileName(Integer, const std::string&) { return false; }

} // namespace midebug
