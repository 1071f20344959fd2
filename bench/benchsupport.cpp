#include "benchsupport.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdio>
#include <map>

namespace midebug::bench {

namespace {

/// The console report, plus the real time per iteration of every run kept by
/// benchmark name (the part of the name before the first "/").
class TRecordingReporter : public benchmark::ConsoleReporter {
public:
  void ReportRuns(const std::vector<Run>& Runs) override {
    for (const Run& Each : Runs) {
      if (Each.error_occurred || Each.run_type != Run::RT_Iteration)
        continue;
      std::string Name = Each.benchmark_name();
      Name = Name.substr(0, Name.find('/'));
      FTimes[Name] = Each.GetAdjustedRealTime();
    }
    ConsoleReporter::ReportRuns(Runs);
  }
  const std::map<std::string, double>& Times() const { return FTimes; }

private:
  std::map<std::string, double> FTimes;
};

} // namespace

int RunAndPrintRatios(int argc, char** argv, const std::vector<std::pair<std::string, std::string>>& Ratios) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv))
    return 1;
  TRecordingReporter Reporter;
  benchmark::RunSpecifiedBenchmarks(&Reporter);
  benchmark::Shutdown();
  for (const auto& [Measured, Baseline] : Ratios) {
    const auto MeasuredTime = Reporter.Times().find(Measured);
    const auto BaselineTime = Reporter.Times().find(Baseline);
    if (MeasuredTime == Reporter.Times().end() || BaselineTime == Reporter.Times().end() || BaselineTime->second <= 0)
      continue;
    std::printf("ratio %s / %s = %.3f\n", Measured.c_str(), Baseline.c_str(),
                MeasuredTime->second / BaselineTime->second);
  }
  return 0;
}

std::string Hex(UInt64 Address) {
  char Text[24];
  std::snprintf(Text, sizeof Text, "0x%016llX", static_cast<unsigned long long>(Address));
  return Text;
}

TRawGdbPipes::~TRawGdbPipes() {
  if (FPid == -1)
    return;
  KillProcess(FPid);
  ReapChildProcess(FPid);
}

bool TRawGdbPipes::Start() {
  TChildProcess Child;
  std::string Error;
  if (!StartChildProcess(SplitCommandLine("gdb --nw --nx  --interpreter=mi2"), {}, FStdIn.ReadHandle(),
                         FStdOut.WriteHandle(), Child, Error))
    return false;
  FPid = Child.Pid;
  FStdIn.CloseRead();
  FStdOut.CloseWrite();
  return true;
}

bool TRawGdbPipes::Write(const std::string& Line) {
  return WriteHandle(FStdIn.WriteHandle(), Line.data(), Line.size()) == static_cast<Int64>(Line.size());
}

Int64 TRawGdbPipes::Read(char* Buffer, size_t Count) { return ReadHandle(FStdOut.ReadHandle(), Buffer, Count); }

bool TRawGdbPipes::Request(const std::string& Command, const std::string& Also, std::string* Reply) {
  const std::string Token = std::to_string(++FToken);
  return Write(Token + Command + "\n") && Await("\n" + Token + "^") && (!Reply || Await("\n", Reply)) &&
         (Also.empty() || Await(Also));
}

bool TRawGdbPipes::StartProgram(const std::string& Program, const std::string& Location) {
  return Await("(gdb) \n") && Request("-file-exec-and-symbols \"" + Program + "\"") &&
         Request("-break-insert -f " + Location) && Request("-exec-run", "*stopped");
}

bool TRawGdbPipes::Await(const std::string& Text, std::string* Before) {
  char Buffer[4096];
  // The line start a search leaves in front is not part of what follows.
  const size_t From = Before ? 1 : 0;
  for (;;) {
    const size_t Found = FPending.find(Text, From);
    if (Found != std::string::npos) {
      if (Before)
        *Before = FPending.substr(From, Found - From);
      // What follows starts a line as far as later searches go.
      FPending = "\n" + FPending.substr(Found + Text.size());
      return true;
    }
    const Int64 BytesRead = Read(Buffer, sizeof Buffer);
    if (BytesRead <= 0)
      return false;
    FPending.append(Buffer, static_cast<size_t>(BytesRead));
  }
}

bool AwaitStops(const TQuietListener& Listener, int Count) {
  const auto Deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  while (Listener.Stops < Count) {
    if (std::chrono::steady_clock::now() > Deadline)
      return false;
    WaitAndProcess(std::chrono::milliseconds(1));
  }
  return true;
}

} // namespace midebug::bench
