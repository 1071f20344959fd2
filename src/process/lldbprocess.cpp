#include "process/lldbprocess.h"

#include "platform/hostthread.h"

namespace midebug {

TLLDBProcess::TLLDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
                           const std::string& LauncherPath, Integer Pid, const std::string& CommandFile,
                           TGDBLanguage Language, TGDBCPU CPU, const std::string& Platform)
    : TGDBProcess(Listener, RemoteProfile, LauncherPath, Pid, CommandFile, Language, CPU, Platform) {
  if (Platform == "iOSDevice64") {
    FKernel->FKernelType = ktLLDB;
  } else {
    // 6 or 10: an LLDB kernel, and the language it debugs.
    Integer KernelType = Language == glCPP ? 10 : 6;
    if (Platform == "Win64" || Platform == "Win64x")
      KernelType += ktWindowsTarget;
    if (Platform == "Win64x")
      KernelType += ktWindowsX;
    FKernel->FKernelType = KernelType;
  }
  FProcessStarted = Platform != "iOSDevice64";
}

void TLLDBProcess::WaitUntilProcessStarted() {
  while (!FProcessStarted && FAlive)
    YieldAndSleep(WaitPolicy().PollMs);
}

} // namespace midebug
