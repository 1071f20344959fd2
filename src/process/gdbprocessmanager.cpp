#include "process/gdbprocessmanager.h"

#include "process/lldbprocess.h"

namespace midebug {

namespace {

/// Runs Operation on a new process; a failure destroys the process before
/// the exception reaches the IDE.
template <class TOperation>
TIntfPtr<IGDBProcess> Launch(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
                             const std::string& LauncherPath, Integer Pid, const std::string& CommandFile,
                             TGDBLanguage Language, TGDBCPU CPU, const std::string& Platform, TOperation&& Operation) {
  TIntfPtr<IGDBProcess> Holder(static_cast<IGDBProcess*>(
      new TLLDBProcess(Listener, RemoteProfile, LauncherPath, Pid, CommandFile, Language, CPU, Platform)));
  auto* Process = static_cast<TLLDBProcess*>(Holder.get());
  return Operation(*Process);
}

bool AttachesByItself(const std::string& Platform) {
  return Platform == "Android" || Platform == "Android64" || Platform == "iOSDevice64";
}

} // namespace

TIntfPtr<IGDBProcess> TGDBProcessManager::CreateProcess(const TIntfPtr<IGDBProcessListener>& Listener,
                                                        const std::string& ExeName, const std::string& Arguments,
                                                        const std::string& WorkingDir, const std::string& RemoteProfile,
                                                        const std::string& Platform, TGDBLanguage Language, TGDBCPU CPU,
                                                        const std::string& LauncherPath) {
  return Launch(Listener, RemoteProfile, LauncherPath, -1, "", Language, CPU, Platform,
                [&](TGDBProcess& Process) { return Process.CreateProcess(ExeName, Arguments, WorkingDir); });
}

TIntfPtr<IGDBProcess> TGDBProcessManager::CreateProcess(const TIntfPtr<IGDBProcessListener>& Listener,
                                                        const std::string& ExeName, const std::string& Arguments,
                                                        const std::string& WorkingDir, const std::string& RemoteProfile,
                                                        const std::string& Platform, TGDBLanguage Language, TGDBCPU CPU,
                                                        Integer PrepCommandId) {
  return Launch(Listener, RemoteProfile, "", PrepCommandId, "", Language, CPU, Platform,
                [&](TGDBProcess& Process) { return Process.CreateProcess(ExeName, Arguments, WorkingDir); });
}

TIntfPtr<IGDBProcess> TGDBProcessManager::AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener, Integer Pid,
                                                        const std::string& Platform, TGDBLanguage Language, TGDBCPU CPU,
                                                        const std::string& LauncherPath) {
  return Launch(Listener, "", LauncherPath, -1, "", Language, CPU, Platform,
                [&](TGDBProcess& Process) { return Process.AttachProcess(Pid); });
}

TIntfPtr<IGDBProcess> TGDBProcessManager::AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener,
                                                        const std::string& CommandFile, Integer Pid,
                                                        const std::string& Platform, TGDBLanguage Language, TGDBCPU CPU,
                                                        const std::string& LauncherPath) {
  return Launch(Listener, "", LauncherPath, Pid, CommandFile, Language, CPU, Platform,
                [&](TGDBProcess& Process) { return Process.AttachProcess(-1); });
}

TIntfPtr<IGDBProcess> TGDBProcessManager::AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener, Integer Pid,
                                                        const std::string& RemoteProfile, const std::string& Platform,
                                                        TGDBLanguage Language, TGDBCPU CPU) {
  return AttachProcess(Listener, Pid, RemoteProfile, Platform, Language, CPU, "");
}

TIntfPtr<IGDBProcess> TGDBProcessManager::AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener, Integer Pid,
                                                        const std::string& RemoteProfile, const std::string& Platform,
                                                        TGDBLanguage Language, TGDBCPU CPU,
                                                        const std::string& LauncherPath) {
  return Launch(Listener, RemoteProfile, LauncherPath, Pid, "", Language, CPU, Platform, [&](TGDBProcess& Process) {
    return Process.AttachProcess(AttachesByItself(Platform) ? -1 : Pid);
  });
}

} // namespace midebug
