#pragma once
/// \file
/// The request engine of one process: it builds command lines, writes them
/// to the debugger one at a time, and lets a requester sleep until the
/// output thread has read the reply that completes its result object.
///
/// Locks, in the order they may be taken:
///   1. the wait-object table's lock, held for one table operation; the exit
///      handling pulses each waiting result while it holds it;
///   2. a result object's monitor, held by its waiter, who lets it go before
///      taking the table's lock;
///   the builder lock and the send lock are leaves, each held for building
///   or writing one line.

#include "kernel/gdbkernel.h"
#include "mi/gdbcommand.h"
#include "mi/gdbresult.h"

#include <atomic>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <unordered_map>

namespace midebug {

/// The answer to a request made while the program runs.
inline constexpr const char* NotSuspendedMessage = "process not suspended";

/// How long synchronous requests wait. Production uses the defaults; tests
/// shorten them so that time-out behaviour takes milliseconds.
struct TWaitPolicy {
  /// The first wait of a request during start-up (GDB_WAITTIMEOUT replaces it).
  Integer StartupTimeoutMs = 40000;
  /// The first wait of a request after start-up.
  Integer RunningTimeoutMs = 6000;
  /// After each expiry that the IDE answers with "keep waiting", the wait
  /// grows by this much while it is below MaxTimeoutMs.
  Integer TimeoutStepMs = 3000;
  Integer MaxTimeoutMs = 15000;
  /// The wait while a program is terminated or detached.
  Integer TerminateTimeoutMs = 5000;
  /// The polling step while the IDE answers, and of WaitForReplyTimeOut.
  Integer PollMs = 2;
  /// Told the length of every wait for a reply before it starts (tests).
  std::function<void(Integer TimeoutMs)> WaitObserver;
};

/// The policy new processes take. Not thread-safe: set it before creating
/// processes.
TWaitPolicy& DefaultWaitPolicy();

class TGDBRequestEngine {
public:
  /// AskIDE posts the question "is the debugger lost?" to the IDE, whose
  /// answer comes back through AnswerFatalError. Alive is the process's
  /// flag: once it drops, no wait goes on.
  /// While Resuming is set, requests that wait are refused ("process not
  /// suspended"): the debugger answers none until the program stops.
  TGDBRequestEngine(TGDBKernel& Kernel, TGDBCPU CPU, const std::string& Platform, const std::atomic<bool>& Alive,
                    const std::atomic<bool>& Resuming, std::function<void()> AskIDE);
  /// The thread that reads the replies; it must never wait for one.
  void SetReaderThread(std::thread::id Reader) { FReader = Reader; }

  /// Builds one command line: Create is a builder method (or a callable
  /// taking the builder and the token); Token receives the line's token.
  template <class TCreate, class... TArgs>
  std::string Build(std::string& Token, TCreate&& Create, TArgs&&... Args) {
    std::lock_guard Guard(FBuilderLock);
    return std::invoke(std::forward<TCreate>(Create), FCommand, Token, std::forward<TArgs>(Args)...);
  }
  TGDBCPU CPU() const { return FCommand.FCPUType; }
  /// The target platform name ("Win64", "Linux64", ...).
  const std::string& Platform() const { return FPlatform; }
  /// Builds a command and writes it without waiting; true when written.
  template <class TCreate, class... TArgs>
  bool Fire(TCreate&& Create, TArgs&&... Args) {
    std::string Token;
    return Send(Build(Token, std::forward<TCreate>(Create), std::forward<TArgs>(Args)...));
  }
  /// Builds a command, writes it and waits for Result; true when the reply
  /// came and is no error.
  template <class TCreate, class... TArgs>
  bool Ask(TGDBResult& Result, TCreate&& Create, TArgs&&... Args) {
    std::string Token;
    const std::string Line = Build(Token, std::forward<TCreate>(Create), std::forward<TArgs>(Args)...);
    return SendAndWait(Token, Line, Result) && !Result.FError && Result.FAvailable;
  }

  /// Writes one command line; true when it was written.
  bool Send(const std::string& Line);
  /// Registers Result under Key, writes Line and waits for the reply; true
  /// when the line was written (Result's FError and FTimeOut tell the rest).
  bool SendAndWait(const std::string& Key, const std::string& Line, TGDBResult& Result);
  void AddWaitObject(const std::string& Key, TGDBResult& Result);
  TGDBResult* RemoveWaitObject(const std::string& Key);
  /// Wakes every waiting request and empties the table.
  void NotifyWaitObjects();
  void WaitForReply(const std::string& Key, TGDBResult& Result);
  /// One step of a polling wait: false while TimeOutMs lasts (after a sleep),
  /// true once it has run out for good. With FatalOnExpiry the IDE is asked
  /// first and may extend the wait.
  bool WaitForReplyTimeOut(Integer& TimeOutMs, bool FatalOnExpiry);
  /// "debug kernel timeout", or the device's form of it.
  std::string GetTimeOutMessage() const;

  /// Records the IDE's answer to the question AskIDE posted.
  void AnswerFatalError(bool GiveUp);
  bool FatalError() const { return FFatalError; }

  const TWaitPolicy& Policy() const { return FPolicy; }
  Integer SyncTimeout() const { return FSyncTimeout; }
  void SetSyncTimeout(Integer TimeoutMs) { FSyncTimeout = TimeoutMs; }

private:
  /// Asks the IDE whether the debugger is lost and waits for the answer.
  void AskFatalError();

  TGDBKernel& FKernel;
  const std::string FPlatform;
  const std::atomic<bool>& FAlive;
  const std::atomic<bool>& FResuming;
  std::atomic<std::thread::id> FReader;
  const std::function<void()> FAskIDE;
  const TWaitPolicy FPolicy;
  std::atomic<Integer> FSyncTimeout;
  std::atomic<bool> FFatalError{false};
  std::atomic<bool> FFatalErrorAnswered{false};

  /// Guards the builder's request counter.
  std::mutex FBuilderLock;
  TGDBCommand FCommand;
  /// One command line at a time reaches the debugger.
  std::mutex FSendLock;
  /// Guards FWaitObjects.
  std::mutex FWaitObjectLock;
  std::unordered_map<std::string, TGDBResult*> FWaitObjects;
};

} // namespace midebug
