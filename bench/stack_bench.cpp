// A stop on a deep stack against the same stop on a shallow one: StepOver to
// the listener's ProcessSuspended with the top frame's header fetched, as an
// IDE showing the stop would, on a 1,000-frame and a 20-frame stack, step by
// step in turn. The frames are fetched a window at a time, so the ratio
// should stay near 1 whatever the depth.

#include "benchsupport.h"
#include "midebug.h"
#include "process/gdbprocess.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

namespace midebug {
namespace {

/// spin runs under recurse(N) called from main: N + 3 frames. Its breakpoint
/// is on a line run once, so stepping through the loop meets no breakpoint.
constexpr const char* RecursionProgram = R"(#include <stdlib.h>
int spin(void) {
  volatile long total = 0;
  for (long i = 0; i < 100000000; ++i) {
    total += i;
  }
  return (int)(total & 1);
}
int recurse(int left) {
  if (left == 0)
    return spin();
  return recurse(left - 1) + 1;
}
int main(int argc, char** argv) { return recurse(atoi(argv[1])) & 1; }
)";

/// The program under the library, stopped in spin on a stack Frames deep.
class TStoppedStack {
public:
  bool Start(const std::string& Program, int Frames) {
    FProcess = TGDBProcessManager::CreateProcess(FListener, Program, std::to_string(Frames - 3), "", "local",
                                                 "Linux64", glC, gcAMD64, "gdb");
    if (!static_cast<TGDBProcess*>(FProcess.get())->ProcessAsyncRequest("-break-insert spin"))
      return false;
    FProcess->Run();
    return bench::AwaitStops(*FListener, 1);
  }
  /// One stop as the IDE sees it; false when the step did not stop.
  bool Step() {
    const TIntfPtr<IGDBThread> Thread = FProcess->GetThread(FProcess->GetSuspendedThreadId());
    const int Stops = FListener->Stops;
    Thread->StepOver();
    if (!bench::AwaitStops(*FListener, Stops + 1))
      return false;
    benchmark::DoNotOptimize(Thread->GetCallHeader(1));
    return true;
  }
  ~TStoppedStack() {
    if (FProcess)
      FProcess->Terminate();
    ProcessPending();
  }

private:
  TIntfPtr<bench::TQuietListener> FListener{new bench::TQuietListener};
  TIntfPtr<IGDBProcess> FProcess;
};

void BM_StopOnDeepVsShallowStack(benchmark::State& State) {
  SetMainThread();
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-stack-bench";
  std::filesystem::create_directories(Dir);
  const std::string Source = (Dir / "recursion.c").string();
  const std::string Program = (Dir / "recursion").string();
  std::ofstream(Source) << RecursionProgram;
  const std::string Build = "gcc -g -O0 -o '" + Program + "' '" + Source + "'";
  TStoppedStack Deep;
  TStoppedStack Shallow;
  try {
    if (std::system(Build.c_str()) != 0 || !Deep.Start(Program, 1000) || !Shallow.Start(Program, 20)) {
      State.SkipWithError("cannot stop in spin");
      return;
    }
  } catch (const ENonAIRException& Error) {
    State.SkipWithError(Error.what());
    return;
  }
  using TClock = std::chrono::steady_clock;
  TClock::duration DeepTime{};
  TClock::duration ShallowTime{};
  /// Times one stop of Stack into Total; false when it did not stop.
  auto TimedStep = [](TStoppedStack& Stack, TClock::duration& Total) {
    const TClock::time_point Start = TClock::now();
    const bool Stopped = Stack.Step();
    Total += TClock::now() - Start;
    return Stopped;
  };
  bool DeepFirst = true;
  for (auto _ : State) {
    // Taking turns at going first keeps whatever the first step of a pair
    // pays out of the ratio.
    const bool Stopped = DeepFirst ? TimedStep(Deep, DeepTime) && TimedStep(Shallow, ShallowTime)
                                   : TimedStep(Shallow, ShallowTime) && TimedStep(Deep, DeepTime);
    DeepFirst = !DeepFirst;
    if (!Stopped) {
      State.SkipWithError("a step did not stop");
      break;
    }
  }
  const double Steps = static_cast<double>(State.iterations());
  State.counters["deep_us"] = std::chrono::duration<double, std::micro>(DeepTime).count() / Steps;
  State.counters["shallow_us"] = std::chrono::duration<double, std::micro>(ShallowTime).count() / Steps;
  State.counters["deep/shallow"] =
      static_cast<double>(DeepTime.count()) / static_cast<double>(std::max<TClock::rep>(ShallowTime.count(), 1));
}
BENCHMARK(BM_StopOnDeepVsShallowStack)->UseRealTime()->Iterations(100)->Repetitions(5)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
