#pragma once
/// \file
/// An IDE listener for process tests: records every call as a line of text
/// and answers the lost-debugger question as told.

#include "midebug.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <functional>
#include <mutex>
#include <string>
#include <vector>

namespace midebug::test {

class TTestListener : public TInterfaced<IGDBProcessListener> {
public:
  /// The answers FatalError gives, in turn; the last one repeats.
  std::vector<bool> FatalAnswers{true};
  /// The answer to SignalReceived.
  bool StopOnSignal = true;

  void ProcessSuspended(Integer ThreadId) override { Record("Suspended(" + std::to_string(ThreadId) + ")"); }
  void ProcessResumed(Integer ThreadId) override { Record("Resumed(" + std::to_string(ThreadId) + ")"); }
  void ProcessExited(Integer Code, const std::string& Signal) override {
    Record("Exited(" + std::to_string(Code) + "," + Signal + ")");
  }
  void ThreadCreated(Integer ThreadId) override { Record("ThreadCreated(" + std::to_string(ThreadId) + ")"); }
  void ThreadExited(Integer ThreadId) override { Record("ThreadExited(" + std::to_string(ThreadId) + ")"); }
  void ModuleLoaded(const TGDBModule& Module) override { Record("ModuleLoaded(" + Module.Name + ")"); }
  void ModuleUnLoaded(const TGDBModule& Module) override { Record("ModuleUnLoaded(" + Module.Name + ")"); }
  void SignalReceived(bool& ShouldStop, Integer ThreadId, const TGDBException& Signal) override {
    ShouldStop = StopOnSignal;
    Record("Signal(" + std::to_string(ThreadId) + "," + Signal.Name + ")");
  }
  void ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& Exception) override {
    ShouldStop = true;
    Record("Exception(" + std::to_string(ThreadId) + "," + Exception.Name + ")");
  }
  void LogEvent(const TGDBLogEvent& Event) override {
    Record("Log(" + std::to_string(static_cast<int>(Event.Event)) + "," + Event.Data + ")");
  }
  void InternalError(const std::string& Message) override { Record("InternalError(" + Message + ")"); }
  bool FatalError() override {
    const size_t Asked = FFatalAsks++;
    Record("FatalError");
    return FatalAnswers[std::min(Asked, FatalAnswers.size() - 1)];
  }
  void ProcessRestart() override { Record("Restart"); }

  size_t FatalAsks() const { return FFatalAsks; }

  std::vector<std::string> Calls() const {
    std::lock_guard Guard(FLock);
    return FCalls;
  }
  bool HasCall(const std::string& Prefix) const { return CountOf(Prefix) > 0; }
  size_t CountOf(const std::string& Prefix) const {
    std::lock_guard Guard(FLock);
    return static_cast<size_t>(
        std::count_if(FCalls.begin(), FCalls.end(), [&](const std::string& Call) { return Call.starts_with(Prefix); }));
  }
  bool HasCallContaining(const std::string& Text) const {
    std::lock_guard Guard(FLock);
    return std::any_of(FCalls.begin(), FCalls.end(), [&](const std::string& Call) { return Call.find(Text) != std::string::npos; });
  }
  /// Pumps the main-thread queue until Done holds or the time runs out.
  bool PumpUntil(const std::function<bool()>& Done, std::chrono::milliseconds Limit = std::chrono::seconds(30)) {
    const auto Deadline = std::chrono::steady_clock::now() + Limit;
    while (!Done()) {
      if (std::chrono::steady_clock::now() > Deadline)
        return false;
      WaitAndProcess(std::chrono::milliseconds(10));
    }
    return true;
  }
  bool PumpUntilCall(const std::string& Prefix, std::chrono::milliseconds Limit = std::chrono::seconds(30)) {
    return PumpUntil([&] { return HasCall(Prefix); }, Limit);
  }

private:
  void Record(const std::string& Call) {
    std::lock_guard Guard(FLock);
    FCalls.push_back(Call);
  }

  mutable std::mutex FLock;
  std::vector<std::string> FCalls;
  std::atomic<size_t> FFatalAsks{0};
};

} // namespace midebug::test
