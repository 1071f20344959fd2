// Run control. Until the run-control commands are built, the program is
// driven by raw MI lines sent through ProcessAsyncRequest.

#include "process/gdbprocess.h"

namespace midebug {

void TGDBProcess::Run() {}
bool TGDBProcess::SetRunToMainBreakpoint() { return false; }
void TGDBProcess::RunToFirstSource() {}
void TGDBProcess::RunToEntryPoint() {}
void TGDBProcess::Pause() {}
void TGDBProcess::Resume() {}
void TGDBProcess::Terminate() {}
void TGDBProcess::Detach() {}
void TGDBProcess::SetOsException(const std::string& /*Signal*/, bool /*Stop*/, bool /*Pass*/) {}

} // namespace midebug
