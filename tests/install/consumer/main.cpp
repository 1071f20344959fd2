// Built against the installed midebug only: the boundary header, the
// library, and what the package says they need. It touches the library
// through the boundary in two cheap ways and prints one line the install
// check looks for.

#include "midebug.h"

#include <cstdio>
#include <string>

namespace {

// The IDE's side of the boundary, implemented outside the library: the
// method tables of the installed headers must match the library's.
class TQuietListener : public midebug::TInterfaced<midebug::IGDBProcessListener> {
public:
  void ProcessSuspended(midebug::Integer) override {}
  void ProcessResumed(midebug::Integer) override {}
  void ProcessExited(midebug::Integer, const std::string&) override {}
  void ThreadCreated(midebug::Integer) override {}
  void ThreadExited(midebug::Integer) override {}
  void ModuleLoaded(const midebug::TGDBModule&) override {}
  void ModuleUnLoaded(const midebug::TGDBModule&) override {}
  void SignalReceived(bool&, midebug::Integer, const midebug::TGDBException&) override {}
  void ExceptionRaised(bool&, midebug::Integer, const midebug::TGDBException&) override {}
  void LogEvent(const midebug::TGDBLogEvent&) override {}
  void InternalError(const std::string&) override {}
  bool FatalError() override { return true; }
  void ProcessRestart() override {}
};

} // namespace

int main() {
  // The library registers the profile "local" at the registry's first use.
  auto Profiles = midebug::VantageIDEServices().Service<midebug::IRemoteProfileServices>();
  if (!Profiles || !Profiles->GetProfile(midebug::LocalProfileName)) {
    std::fprintf(stderr, "consumer: no remote profile service with the profile \"local\"\n");
    return 1;
  }

  // A debugger that does not exist: the failure must cross the library's
  // boundary as the exception type the header declares.
  midebug::TIntfPtr<midebug::IGDBProcessListener> Listener(new TQuietListener);
  try {
    midebug::TGDBProcessManager::CreateProcess(Listener, "/bin/true", "", "", "", "Linux64", midebug::glC,
                                               midebug::gcAMD64, "/nonexistent/midebug-consumer/lldb-mi");
    std::fprintf(stderr, "consumer: a process was created with a debugger that does not exist\n");
    return 1;
  } catch (const midebug::ENonAIRException& Error) {
    std::printf("midebug consumer ok: %s\n", Error.what());
  }
  return 0;
}
