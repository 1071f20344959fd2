#include "kernel/lldbkernel.h"

#include "platform/hostinfo.h"

namespace midebug {

TLLDBKernel::TLLDBKernel(const std::string& LauncherPath, const std::string& CommandFile)
    : TGDBKernel(LauncherPath, CommandFile) {
  FLauncherParams = "--interpreter";
  FCapabilities = (FCapabilities | capIsLLDB | capPidNotification | capThreadNotification) & ~Int64{capPidInfoCommand};
  // LLDB's front end prints its prompt without the blank.
  SetEndOfLineMarker(HostEndsLinesWithCRLF ? "(gdb)\r\n" : "(gdb)\n");
}

std::string TLLDBKernel::GetCommandFileOption() { return "--source"; }

bool TLLDBKernel::TimeOutExpired(TDateTime& Start) {
  const TDateTime Now = std::chrono::steady_clock::now();
  if (Start == TDateTime{}) {
    Start = Now;
    return false;
  }
  return Now - Start >= std::chrono::milliseconds(UnfinishedReplyTimeoutMs);
}

} // namespace midebug
