// A program that writes 200 MB to its terminal, debugged through the whole
// stack to its exit: the host's memory must stay bounded whatever the
// program prints, since the reader reads only as fast as the IDE takes the
// text. Prints the host's peak resident memory and what the IDE received.

#include "benchsupport.h"
#include "midebug.h"

#include <benchmark/benchmark.h>

#include <atomic>
#include <chrono>
#include <fstream>
#include <string>

namespace midebug {
namespace {

constexpr long long WrittenBytes = 200LL * 1024 * 1024;

/// Counts the program's output and notices the exit.
class TOutputCounter : public bench::TQuietListener {
public:
  std::atomic<long long> Received{0};
  std::atomic<bool> Exited{false};
  void LogEvent(const TGDBLogEvent& Event) override {
    if (Event.Event == etUnknown)
      Received += static_cast<long long>(Event.Data.size());
  }
  void ProcessExited(Integer, const std::string&) override { Exited = true; }
};

/// The host's peak resident memory in MiB ("VmHWM"), -1 when unknown.
double PeakResidentMiB() {
  std::ifstream Status("/proc/self/status");
  std::string Line;
  while (std::getline(Status, Line))
    if (Line.starts_with("VmHWM:"))
      return std::stod(Line.substr(6)) / 1024.0;
  return -1;
}

void BM_ProgramWrites200MBToItsTerminal(benchmark::State& State) {
  SetMainThread();
  for (auto _ : State) {
    TIntfPtr<TOutputCounter> Listener(new TOutputCounter);
    TIntfPtr<IGDBProcess> Process;
    try {
      // GDB starts the program through the shell: head writes the bytes.
      Process = TGDBProcessManager::CreateProcess(Listener, "/usr/bin/head",
                                                  "-c " + std::to_string(WrittenBytes) + " /dev/zero", "", "local",
                                                  "Linux64", glC, gcAMD64, "gdb");
    } catch (const ENonAIRException& Error) {
      State.SkipWithError(Error.what());
      return;
    }
    Process->Run();
    const auto Deadline = std::chrono::steady_clock::now() + std::chrono::minutes(5);
    while (!Listener->Exited && std::chrono::steady_clock::now() < Deadline)
      WaitAndProcess(std::chrono::milliseconds(10));
    State.counters["received_MB"] = static_cast<double>(Listener->Received) / (1024.0 * 1024.0);
    Process = nullptr;
    ProcessPending();
    if (!Listener->Exited)
      State.SkipWithError("the program did not exit");
  }
  State.counters["host_peak_MB"] = PeakResidentMiB();
}
BENCHMARK(BM_ProgramWrites200MBToItsTerminal)->UseRealTime()->Iterations(1)->Unit(benchmark::kSecond);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
