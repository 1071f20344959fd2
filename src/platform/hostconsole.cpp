#include "platform/hostconsole.h"

#include "platform/hostprocess.h"

#include <atomic>
#include <csignal>
#include <cstring>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

namespace midebug {

namespace {

// Written by the signal handler, read by any thread: lock-free atomics only.
std::atomic<bool> InterruptCaught{false};
std::atomic<int> TerminationCaught{0};
std::atomic<bool> TerminationTaken{false};

static_assert(std::atomic<int>::is_always_lock_free && std::atomic<bool>::is_always_lock_free);

extern "C" void OnHostSignal(int Signal) {
  if (Signal == SIGINT)
    InterruptCaught.store(true);
  else
    TerminationCaught.store(Signal);
}

constexpr size_t ReadChunk = 4096;

} // namespace

void CatchHostSignals() {
  struct sigaction Action{};
  Action.sa_handler = OnHostSignal;
  sigemptyset(&Action.sa_mask);
  // Restarted calls keep blocking reads elsewhere unaware of the signal;
  // the host looks at the flags between two bounded waits.
  Action.sa_flags = SA_RESTART;
  for (const int Signal : {SIGINT, SIGTERM, SIGHUP})
    sigaction(Signal, &Action, nullptr);
}

THostSignal TakeHostSignal() {
  if (TerminationCaught.load() != 0 && !TerminationTaken.exchange(true))
    return THostSignal::Terminate;
  if (InterruptCaught.exchange(false))
    return THostSignal::Interrupt;
  return THostSignal::None;
}

int CaughtTerminationSignal() { return TerminationCaught.load(); }

TConsoleInput::TState TConsoleInput::ReadLine(std::string& Line, int TimeoutMs) {
  for (;;) {
    if (const size_t End = FPending.find('\n'); End != std::string::npos) {
      Line = FPending.substr(0, End);
      FPending.erase(0, End + 1);
      return TState::Line;
    }
    if (FEnded) {
      if (FPending.empty())
        return TState::Ended;
      Line.swap(FPending);
      FPending.clear();
      return TState::Line;
    }
    const TPipeState Waiting = WaitForPipeData(STDIN_FILENO, TimeoutMs);
    if (Waiting == TPipeState::Empty)
      return TState::Waiting;
    char Buffer[ReadChunk];
    const Int64 Read = Waiting == TPipeState::Data ? ReadHandle(STDIN_FILENO, Buffer, sizeof Buffer) : -1;
    if (Read <= 0)
      FEnded = true;
    else
      FPending.append(Buffer, static_cast<size_t>(Read));
    // A whole chunk may have been read: look for a line before waiting again,
    // and never wait twice in one call.
    TimeoutMs = 0;
  }
}

bool IsExecutableFile(const std::string& Path) {
  struct stat Status{};
  return stat(Path.c_str(), &Status) == 0 && S_ISREG(Status.st_mode) && access(Path.c_str(), X_OK) == 0;
}

std::string SignalDescription(const std::string& Name) {
  if (!Name.starts_with("SIG"))
    return {};
  for (int Signal = 1; Signal < NSIG; ++Signal) {
    const char* Abbreviation = sigabbrev_np(Signal);
    if (Abbreviation && Name.compare(3, std::string::npos, Abbreviation) == 0) {
      const char* Description = sigdescr_np(Signal);
      return Description ? Description : "";
    }
  }
  return {};
}

} // namespace midebug
