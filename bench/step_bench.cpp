// Stepping: from StepOver to the listener's ProcessSuspended with the call
// stack fetched (GetCallCount, GetCallHeader(1)), against a plain loop that
// sends GDB the same MI commands over pipes, interleaved step by step.

#include "benchsupport.h"
#include "midebug.h"

#include <benchmark/benchmark.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

namespace midebug {
namespace {

constexpr const char* LoopProgram = R"(int main(void) {
  volatile long total = 0;
  for (long i = 0; i < 1000000; ++i) {
    total += i;
  }
  return (int)(total & 1);
}
)";

/// Builds the stepped program in a scratch directory; empty on failure.
std::string BuildLoopProgram() {
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-step-bench";
  std::filesystem::create_directories(Dir);
  std::ofstream(Dir / "loop.c") << LoopProgram;
  const std::string Program = (Dir / "loop").string();
  const std::string Command = "gcc -g -O0 -o '" + Program + "' '" + (Dir / "loop.c").string() + "'";
  return std::system(Command.c_str()) == 0 ? Program : std::string();
}

void BM_StepOverVsRawMI(benchmark::State& State) {
  SetMainThread();
  const std::string Program = BuildLoopProgram();
  TIntfPtr<bench::TQuietListener> Listener(new bench::TQuietListener);
  TIntfPtr<IGDBProcess> Process;
  bench::TRawGdbPipes Raw;
  try {
    Process = TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", glC, gcAMD64, "gdb");
  } catch (const ENonAIRException& Error) {
    State.SkipWithError(Error.what());
    return;
  }
  Process->SetRunToMainBreakpoint();
  Process->Run();
  if (Program.empty() || !bench::AwaitStops(*Listener, 1) || !Raw.Start() || !Raw.StartProgram(Program, "main")) {
    State.SkipWithError("cannot reach main");
    return;
  }
  using TClock = std::chrono::steady_clock;
  TClock::duration LibraryTime{};
  TClock::duration RawTime{};
  for (auto _ : State) {
    const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());
    const int Stops = Listener->Stops;
    const TClock::time_point LibraryStart = TClock::now();
    Thread->StepOver();
    const bool Stopped = bench::AwaitStops(*Listener, Stops + 1);
    benchmark::DoNotOptimize(Thread->GetCallCount());
    benchmark::DoNotOptimize(Thread->GetCallHeader(1));
    const TClock::time_point RawStart = TClock::now();
    // What the library sent for the same step, as its MI log shows.
    const bool RawDone = Raw.Request("-exec-next", "*stopped") &&
                         Raw.Request("-interpreter-exec console \"show language\"") &&
                         Raw.Request("-thread-info") && Raw.Request("-stack-info-depth 512") &&
                         Raw.Request("-stack-list-frames 0 511") && Raw.Request("-stack-list-arguments 1 0 511");
    const TClock::time_point RawEnd = TClock::now();
    if (!Stopped || !RawDone) {
      State.SkipWithError("a step did not stop");
      break;
    }
    LibraryTime += RawStart - LibraryStart;
    RawTime += RawEnd - RawStart;
  }
  const double Steps = static_cast<double>(State.iterations());
  State.counters["library_us"] = std::chrono::duration<double, std::micro>(LibraryTime).count() / Steps;
  State.counters["raw_us"] = std::chrono::duration<double, std::micro>(RawTime).count() / Steps;
  State.counters["library/raw"] =
      static_cast<double>(LibraryTime.count()) / static_cast<double>(std::max<TClock::rep>(RawTime.count(), 1));
  Process->Terminate();
  ProcessPending();
}
BENCHMARK(BM_StepOverVsRawMI)->UseRealTime()->Iterations(200)->Repetitions(3)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
