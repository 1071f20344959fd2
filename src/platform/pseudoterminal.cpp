#include "platform/pseudoterminal.h"

#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <termios.h>
#include <unistd.h>

namespace midebug {

bool TPseudoTerminal::Open(std::string& Error) {
  Close();
  auto Fail = [this, &Error](const char* Step) {
    Error = std::string(Step) + ": " + SystemErrorMessage(errno);
    Close();
    return false;
  };
  if (!FWakePipe.Created()) {
    errno = EMFILE;
    return Fail("pipe");
  }
  FMaster = posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
  if (FMaster == InvalidHandle)
    return Fail("posix_openpt");
  if (grantpt(FMaster) != 0)
    return Fail("grantpt");
  if (unlockpt(FMaster) != 0)
    return Fail("unlockpt");
  char Path[PATH_MAX];
  if (ptsname_r(FMaster, Path, sizeof Path) != 0)
    return Fail("ptsname");
  FSlavePath = Path;
  // The master never blocks: the reader waits in poll, and a drain reads
  // until nothing is left.
  const int Flags = fcntl(FMaster, F_GETFL);
  if (Flags == -1 || fcntl(FMaster, F_SETFL, Flags | O_NONBLOCK) == -1)
    return Fail("fcntl");
  FSlave = ::open(Path, O_RDWR | O_NOCTTY | O_CLOEXEC);
  if (FSlave == InvalidHandle)
    return Fail("open");
  termios Modes{};
  if (tcgetattr(FSlave, &Modes) != 0)
    return Fail("tcgetattr");
  cfmakeraw(&Modes);
  if (tcsetattr(FSlave, TCSANOW, &Modes) != 0)
    return Fail("tcsetattr");
  return true;
}

void TPseudoTerminal::Close() {
  if (FSlave != InvalidHandle)
    ::close(FSlave);
  if (FMaster != InvalidHandle)
    ::close(FMaster);
  FSlave = InvalidHandle;
  FMaster = InvalidHandle;
  FSlavePath.clear();
}

Int64 TPseudoTerminal::Read(void* Buffer, size_t Count) {
  for (;;) {
    // A read that finds nothing first waits for the kernel to pass on what
    // the program has written; poll does not, so only a read tells that
    // nothing is left.
    const ssize_t Done = ::read(FMaster, Buffer, Count);
    if (Done > 0)
      return Done;
    if (Done == 0)
      return -1;
    if (errno == EAGAIN)
      return 0;
    if (errno != EINTR)
      return -1;
  }
}

bool TPseudoTerminal::WaitForOutput(int TimeoutMs) {
  pollfd Waits[2] = {{FMaster, POLLIN, 0}, {FWakePipe.ReadHandle(), POLLIN, 0}};
  const int Ready = ::poll(Waits, 2, TimeoutMs);
  if (Ready <= 0 || Waits[1].revents != 0)
    return false;
  // A hung-up or failed terminal wakes the reader too: its read fails.
  return Waits[0].revents != 0;
}

void TPseudoTerminal::Wake() {
  const char Byte = 0;
  WriteHandle(FWakePipe.WriteHandle(), &Byte, 1);
}

} // namespace midebug
