#pragma once
/// \file
/// Running benchmarks and printing the ratio of one to a baseline measured in
/// the same run.

#include "midebug.h"
#include "platform/hostprocess.h"

#include <atomic>
#include <string>
#include <utility>
#include <vector>

namespace midebug::bench {

/// The IDE side of a benchmark: it counts stops and answers that a silent
/// debugger is lost; everything else it ignores.
class TQuietListener : public TInterfaced<IGDBProcessListener> {
public:
  std::atomic<int> Stops{0};
  void ProcessSuspended(Integer) override { ++Stops; }
  void ProcessResumed(Integer) override {}
  void ProcessExited(Integer, const std::string&) override {}
  void ThreadCreated(Integer) override {}
  void ThreadExited(Integer) override {}
  void ModuleLoaded(const TGDBModule&) override {}
  void ModuleUnLoaded(const TGDBModule&) override {}
  void SignalReceived(bool&, Integer, const TGDBException&) override {}
  void ExceptionRaised(bool&, Integer, const TGDBException&) override {}
  void LogEvent(const TGDBLogEvent&) override {}
  void InternalError(const std::string&) override {}
  bool FatalError() override { return true; }
  void ProcessRestart() override {}
};

/// GDB in MI mode on two plain pipes, the baseline a benchmark compares the
/// library with. Killed and reaped on destruction.
class TRawGdbPipes {
public:
  TRawGdbPipes() = default;
  TRawGdbPipes(const TRawGdbPipes&) = delete;
  TRawGdbPipes& operator=(const TRawGdbPipes&) = delete;
  ~TRawGdbPipes();

  bool Start();
  /// Writes the whole of Line.
  bool Write(const std::string& Line);
  /// One blocking read into Buffer; the count read, 0 or less at the end.
  Int64 Read(char* Buffer, size_t Count);
  /// Sends Command under a fresh token and reads until its result record
  /// and, when given, Also; Reply (when given) receives the result record's
  /// line after its "^".
  bool Request(const std::string& Command, const std::string& Also = {}, std::string* Reply = nullptr);
  /// Loads Program, breaks at Location and runs to it.
  bool StartProgram(const std::string& Program, const std::string& Location);
  /// Reads until Text has arrived; what came before it (after the line
  /// start the last search left) goes to Before when given.
  bool Await(const std::string& Text, std::string* Before = nullptr);

private:
  Cardinal FToken = 0;
  std::string FPending = "\n";
  TPipe FStdIn;
  TPipe FStdOut;
  Integer FPid = -1;
};

/// Address as the library writes it into MI: "0x" and 16 upper-case hex
/// digits.
std::string Hex(UInt64 Address);

/// Runs every registered benchmark (honouring the command-line options), then
/// prints, for each pair, the first's mean real time per iteration divided by
/// the second's. Returns the process exit code.
int RunAndPrintRatios(int argc, char** argv, const std::vector<std::pair<std::string, std::string>>& Ratios);

/// Pumps the main-thread queue until the listener has seen Count stops;
/// false after 30 seconds without them.
bool AwaitStops(const TQuietListener& Listener, int Count);

} // namespace midebug::bench
