#include "process/gdbrequestengine.h"

#include "platform/hostthread.h"

#include <cassert>
#include <chrono>
#include <thread>

namespace midebug {

namespace {

/// How long a requester looks for its reply before it goes to sleep.
constexpr int ReplySpinMicroseconds = 100;

bool IsDeviceTimeoutPlatform(const std::string& Platform) {
  return Platform == "iOSDevice64" || Platform == "iOSSimARM64" || Platform == "Android" || Platform == "Android64";
}

} // namespace

TWaitPolicy& DefaultWaitPolicy() {
  static TWaitPolicy Policy;
  return Policy;
}

TGDBRequestEngine::TGDBRequestEngine(TGDBKernel& Kernel, TGDBCPU CPU, const std::string& Platform,
                                     const std::atomic<bool>& Alive, const std::atomic<bool>& Resuming,
                                     std::function<void()> AskIDE)
    : FKernel(Kernel), FPlatform(Platform), FAlive(Alive), FResuming(Resuming), FAskIDE(std::move(AskIDE)), FPolicy(DefaultWaitPolicy()),
      FSyncTimeout(FPolicy.StartupTimeoutMs), FCommand(CPU) {}

bool TGDBRequestEngine::Send(const std::string& Line) {
  if (!FAlive)
    return false;
  std::lock_guard Guard(FSendLock);
  return FKernel.SendRequest(Line);
}

bool TGDBRequestEngine::SendAndWait(const std::string& Key, const std::string& Line, TGDBResult& Result) {
  // The reader would wait for a reply only it can read.
  assert(std::this_thread::get_id() != FReader.load());
  if (FResuming) {
    Result.FError = true;
    Result.SetErrorMessage(NotSuspendedMessage);
    return false;
  }
  AddWaitObject(Key, Result);
  if (Send(Line)) {
    WaitForReply(Key, Result);
    return true;
  }
  RemoveWaitObject(Key);
  Result.FError = true;
  std::string Reason = FKernel.GetLastError(false);
  if (Reason.empty())
    Reason = FKernel.GetLastError(true);
  Result.SetErrorMessage(Reason);
  return false;
}

void TGDBRequestEngine::AddWaitObject(const std::string& Key, TGDBResult& Result) {
  if (!FAlive)
    return;
  std::lock_guard Guard(FWaitObjectLock);
  FWaitObjects[Key] = &Result;
}

TGDBResult* TGDBRequestEngine::RemoveWaitObject(const std::string& Key) {
  if (!FAlive)
    return nullptr;
  std::lock_guard Guard(FWaitObjectLock);
  const auto Found = FWaitObjects.find(Key);
  if (Found == FWaitObjects.end())
    return nullptr;
  TGDBResult* Result = Found->second;
  FWaitObjects.erase(Found);
  return Result;
}

void TGDBRequestEngine::NotifyWaitObjects() {
  std::lock_guard Guard(FWaitObjectLock);
  for (const auto& [Key, Result] : FWaitObjects)
    Result->Pulse();
  FWaitObjects.clear();
}

void TGDBRequestEngine::WaitForReply(const std::string& Key, TGDBResult& Result) {
  bool GaveUp = false;
  {
    std::unique_lock Monitor(Result.Monitor());
    if (FFatalError) {
      GaveUp = true;
    } else {
      // Most replies arrive within a few dozen microseconds: looking again
      // for that long, giving the processor away in between, saves the sleep
      // and the wake-up of the thread.
      const auto SpinEnd = std::chrono::steady_clock::now() + std::chrono::microseconds(ReplySpinMicroseconds);
      while (!Result.FAvailable && FAlive && std::chrono::steady_clock::now() < SpinEnd) {
        Monitor.unlock();
        std::this_thread::yield();
        Monitor.lock();
      }
      Integer Timeout = FSyncTimeout;
      while (!Result.FAvailable && FAlive) {
        std::this_thread::yield();
        if (FPolicy.WaitObserver)
          FPolicy.WaitObserver(Timeout);
        const bool Woken = Result.MonitorSignal().wait_for(Monitor, std::chrono::milliseconds(Timeout),
                                                           [&] { return Result.FAvailable || !FAlive; });
        if (Woken)
          continue;
        if (FFatalError) {
          GaveUp = true;
          break;
        }
        // The IDE is asked without the monitor held, so that a reply that
        // arrives meanwhile can still complete the result.
        Monitor.unlock();
        AskFatalError();
        Monitor.lock();
        if (FFatalError) {
          GaveUp = true;
          break;
        }
        if (Timeout < FPolicy.MaxTimeoutMs)
          Timeout += FPolicy.TimeoutStepMs;
      }
    }
  }
  // The key leaves the table after the monitor is released: the exit handling
  // takes the table's lock before each result's monitor.
  if (GaveUp && !RemoveWaitObject(Key) && FAlive) {
    // The parser took the object out already and is completing it; it must
    // be done with it before the requester may free it.
    std::unique_lock Monitor(Result.Monitor());
    Result.MonitorSignal().wait(Monitor, [&] { return Result.FAvailable || !FAlive; });
  }
  std::lock_guard Monitor(Result.Monitor());
  if (!Result.FAvailable && FAlive) {
    Result.FError = true;
    Result.SetErrorMessage(GetTimeOutMessage());
    Result.FTimeOut = true;
  }
}

void TGDBRequestEngine::AskFatalError() {
  FFatalErrorAnswered = false;
  FAskIDE();
  std::this_thread::yield();
  // A process that ends meanwhile answers no more questions.
  while (!FFatalErrorAnswered && FAlive)
    YieldAndSleep(FPolicy.PollMs);
}

void TGDBRequestEngine::AnswerFatalError(bool GiveUp) {
  FFatalError = GiveUp;
  FFatalErrorAnswered = true;
}

bool TGDBRequestEngine::WaitForReplyTimeOut(Integer& TimeOutMs, bool FatalOnExpiry) {
  TimeOutMs -= FPolicy.PollMs;
  if (TimeOutMs >= 0) {
    YieldAndSleep(FPolicy.PollMs);
    return false;
  }
  if (!FatalOnExpiry || FFatalError)
    return true;
  AskFatalError();
  if (FFatalError)
    return true;
  TimeOutMs = FSyncTimeout;
  return false;
}

std::string TGDBRequestEngine::GetTimeOutMessage() const {
  return IsDeviceTimeoutPlatform(FPlatform) ? "Connection device timeout" : "debug kernel timeout";
}

} // namespace midebug
