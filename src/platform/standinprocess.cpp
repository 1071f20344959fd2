#include "platform/standinprocess.h"

#include <cerrno>
#include <cstring>
#include <sys/prctl.h>
#include <unistd.h>

#include <vector>

namespace midebug {

Integer CurrentProcessId() { return static_cast<Integer>(getpid()); }

void AllowAnyDebuggerToAttach() {
#ifdef PR_SET_PTRACER
  // Only where Yama restricts attaching; elsewhere the call fails harmlessly.
  prctl(PR_SET_PTRACER, PR_SET_PTRACER_ANY, 0, 0, 0);
#endif
}

std::string BecomeProgram(const TStringArray& Arguments) {
  if (Arguments.empty())
    return "no program to run";
  std::vector<char*> Argv;
  for (const std::string& Argument : Arguments)
    Argv.push_back(const_cast<char*>(Argument.c_str()));
  Argv.push_back(nullptr);
  execvp(Argv[0], Argv.data());
  return std::strerror(errno);
}

} // namespace midebug
