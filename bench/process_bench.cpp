// The synchronous request round trip through the whole stack (requesting
// thread, engine, agent, GDB, output thread, parser, woken requester) beside
// the kernel's own round trip with the same GDB command, interleaved.

#include "benchsupport.h"
#include "kernel/gdbkernel.h"
#include "midebug.h"
#include "process/gdbprocess.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <string>

namespace midebug {
namespace {

void BM_SyncRequestVsKernel(benchmark::State& State) {
  SetMainThread();
  TIntfPtr<IGDBProcess> Process;
  try {
    Process = TGDBProcessManager::CreateProcess(new bench::TQuietListener, "/bin/true", "", "", "local", "Linux64", glC,
                                                gcAMD64, "gdb");
  } catch (const ENonAIRException& Error) {
    State.SkipWithError(Error.what());
    return;
  }
  auto& Core = *static_cast<TGDBProcess*>(Process.get());
  TGDBKernel Kernel("", "");
  std::string Reply;
  if (!Kernel.Start() || !Kernel.GetReply(Reply)) {
    State.SkipWithError("cannot start gdb");
    return;
  }
  using TClock = std::chrono::steady_clock;
  TClock::duration ProcessTime{};
  TClock::duration KernelTime{};
  Cardinal KernelRequest = 0;
  for (auto _ : State) {
    const TClock::time_point ProcessStart = TClock::now();
    std::string Token;
    TGdbShowResult Show;
    const std::string Line = Core.Requests().Build(Token, &TGDBCommand::CreateGDBShowCommand, "height");
    Core.ProcessSyncRequest(Token, Line, Show);
    const TClock::time_point KernelStart = TClock::now();
    Kernel.SendRequest(std::to_string(++KernelRequest) + "-gdb-show height");
    const bool KernelRead = Kernel.GetReply(Reply);
    const TClock::time_point KernelEnd = TClock::now();
    if (Show.FError || !KernelRead) {
      State.SkipWithError("the request failed");
      break;
    }
    ProcessTime += KernelStart - ProcessStart;
    KernelTime += KernelEnd - KernelStart;
  }
  const double Iterations = static_cast<double>(State.iterations());
  State.counters["process_us"] = std::chrono::duration<double, std::micro>(ProcessTime).count() / Iterations;
  State.counters["kernel_us"] = std::chrono::duration<double, std::micro>(KernelTime).count() / Iterations;
  State.counters["process/kernel"] =
      static_cast<double>(ProcessTime.count()) / static_cast<double>(std::max<TClock::rep>(KernelTime.count(), 1));
  Core.NotifyProcessExited(0, "");
  ProcessPending();
}
BENCHMARK(BM_SyncRequestVsKernel)->UseRealTime()->MinTime(1.0)->Repetitions(5)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
