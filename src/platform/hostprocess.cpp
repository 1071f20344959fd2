#include "platform/hostprocess.h"

#include <cerrno>
#include <csignal>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <spawn.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <unistd.h>

extern char** environ;

namespace midebug {

TPipe::TPipe() {
  int Ends[2];
  if (pipe2(Ends, O_CLOEXEC) == 0) {
    FReadHandle = Ends[0];
    FWriteHandle = Ends[1];
  }
}

TPipe::~TPipe() {
  CloseRead();
  CloseWrite();
}

void TPipe::CloseRead() {
  if (FReadHandle != InvalidHandle)
    close(FReadHandle);
  FReadHandle = InvalidHandle;
}

void TPipe::CloseWrite() {
  if (FWriteHandle != InvalidHandle)
    close(FWriteHandle);
  FWriteHandle = InvalidHandle;
}

TPipeState WaitForPipeData(THandle Handle, int TimeoutMs) {
  pollfd Poll{Handle, POLLIN, 0};
  const int Ready = poll(&Poll, 1, TimeoutMs);
  if (Ready < 0)
    return errno == EINTR ? TPipeState::Empty : TPipeState::Failed;
  if (Ready == 0)
    return TPipeState::Empty;
  if (Poll.revents & POLLIN)
    return TPipeState::Data;
  // POLLHUP without POLLIN: the writer closed and the pipe is drained.
  if (Poll.revents & POLLHUP)
    return TPipeState::Closed;
  return TPipeState::Failed;
}

Int64 ReadHandle(THandle Handle, void* Buffer, size_t Count) {
  for (;;) {
    const ssize_t Read = read(Handle, Buffer, Count);
    if (Read >= 0 || errno != EINTR)
      return Read;
  }
}

namespace {

/// Keeps SIGPIPE from this thread while it writes, and swallows the one a
/// broken pipe raises, so that the write reports EPIPE instead of ending the
/// host. The host's own signal disposition stays untouched; when the thread
/// already blocked SIGPIPE, the signal is the host's to collect.
class TSigPipeGuard {
public:
  TSigPipeGuard() {
    sigemptyset(&FPipeSet);
    sigaddset(&FPipeSet, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &FPipeSet, &FOldMask);
  }
  ~TSigPipeGuard() {
    // The caller reads errno of the failed write after this has run.
    const int WriteError = errno;
    if (FBroken && sigismember(&FOldMask, SIGPIPE) == 0) {
      const timespec NoWait{0, 0};
      while (sigtimedwait(&FPipeSet, nullptr, &NoWait) < 0 && errno == EINTR) {
      }
    }
    pthread_sigmask(SIG_SETMASK, &FOldMask, nullptr);
    errno = WriteError;
  }
  TSigPipeGuard(const TSigPipeGuard&) = delete;
  TSigPipeGuard& operator=(const TSigPipeGuard&) = delete;
  void SetBroken() { FBroken = true; }

private:
  sigset_t FPipeSet;
  sigset_t FOldMask;
  bool FBroken = false;
};

} // namespace

Int64 WriteHandle(THandle Handle, const void* Buffer, size_t Count) {
  TSigPipeGuard Guard;
  const char* Next = static_cast<const char*>(Buffer);
  size_t Left = Count;
  while (Left > 0) {
    const ssize_t Written = write(Handle, Next, Left);
    if (Written < 0) {
      if (errno == EINTR)
        continue;
      if (errno == EPIPE)
        Guard.SetBroken();
      return -1;
    }
    Next += Written;
    Left -= static_cast<size_t>(Written);
  }
  return static_cast<Int64>(Count);
}

TStringArray SplitCommandLine(const std::string& CommandLine) {
  TStringArray Words;
  std::string Word;
  bool InWord = false;
  bool Quoted = false;
  for (size_t I = 0; I < CommandLine.size(); ++I) {
    const char C = CommandLine[I];
    if (C == '\\' && I + 1 < CommandLine.size() && (CommandLine[I + 1] == '"' || CommandLine[I + 1] == '\\')) {
      Word += CommandLine[++I];
      InWord = true;
    } else if (C == '"') {
      Quoted = !Quoted;
      InWord = true;
    } else if ((C == ' ' || C == '\t') && !Quoted) {
      if (InWord)
        Words.push_back(std::move(Word));
      Word.clear();
      InWord = false;
    } else {
      Word += C;
      InWord = true;
    }
  }
  if (InWord)
    Words.push_back(std::move(Word));
  return Words;
}

bool StartChildProcess(const TStringArray& Arguments, const std::string& WorkingDir, THandle StdIn,
                       THandle StdOut, TChildProcess& Child, std::string& Error) {
  if (Arguments.empty()) {
    Error = SystemErrorMessage(ENOENT);
    return false;
  }
  std::vector<char*> Argv;
  for (const std::string& Argument : Arguments)
    Argv.push_back(const_cast<char*>(Argument.c_str()));
  Argv.push_back(nullptr);

  posix_spawn_file_actions_t Actions;
  posix_spawnattr_t Attributes;
  posix_spawn_file_actions_init(&Actions);
  posix_spawnattr_init(&Attributes);
  posix_spawn_file_actions_adddup2(&Actions, StdIn, STDIN_FILENO);
  posix_spawn_file_actions_adddup2(&Actions, StdOut, STDOUT_FILENO);
  posix_spawn_file_actions_adddup2(&Actions, StdOut, STDERR_FILENO);
  // Descriptors the host opened without close-on-exec must not leak either.
  posix_spawn_file_actions_addclosefrom_np(&Actions, STDERR_FILENO + 1);
  if (!WorkingDir.empty())
    posix_spawn_file_actions_addchdir_np(&Actions, WorkingDir.c_str());
  // The child starts with default signal handling and an empty mask, whatever
  // the host's threads have blocked or ignored.
  sigset_t AllSignals;
  sigset_t NoSignals;
  sigfillset(&AllSignals);
  sigemptyset(&NoSignals);
  posix_spawnattr_setsigdefault(&Attributes, &AllSignals);
  posix_spawnattr_setsigmask(&Attributes, &NoSignals);
  posix_spawnattr_setpgroup(&Attributes, 0);
  posix_spawnattr_setflags(&Attributes, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETPGROUP);

  pid_t Pid = -1;
  const int Status = posix_spawnp(&Pid, Argv[0], &Actions, &Attributes, Argv.data(), environ);
  posix_spawn_file_actions_destroy(&Actions);
  posix_spawnattr_destroy(&Attributes);
  if (Status != 0) {
    Error = SystemErrorMessage(Status);
    return false;
  }
  Child.Pid = Pid;
  return true;
}

bool KillProcess(Integer Pid) { return Pid > 0 && kill(Pid, SIGKILL) == 0; }

bool InterruptProcess(Integer Pid) { return Pid > 0 && kill(Pid, SIGINT) == 0; }

bool ChildProcessEnded(Integer Pid) {
  if (Pid <= 0)
    return true;
  siginfo_t Info{};
  if (waitid(P_PID, static_cast<id_t>(Pid), &Info, WEXITED | WNOHANG | WNOWAIT) != 0)
    return errno == ECHILD;
  return Info.si_pid == Pid;
}

Integer ReapChildProcess(Integer Pid) {
  if (Pid <= 0)
    return -1;
  int Status = 0;
  for (;;) {
    if (waitpid(Pid, &Status, 0) >= 0)
      break;
    if (errno != EINTR)
      return -1;
  }
  if (WIFEXITED(Status))
    return WEXITSTATUS(Status);
  if (WIFSIGNALED(Status))
    return 128 + WTERMSIG(Status);
  return -1;
}

std::string SystemErrorMessage(int ErrorNumber) {
  char Buffer[256];
  // The GNU strerror_r returns the message, which need not be in Buffer.
  return strerror_r(ErrorNumber, Buffer, sizeof Buffer);
}

} // namespace midebug
