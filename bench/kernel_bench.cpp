// The kernel's round trip (write a command, read its reply block) against the
// real GDB, beside a minimal loop doing the same with blocking pipe I/O.

#include "benchsupport.h"
#include "kernel/gdbkernel.h"
#include "midebug.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <string>

namespace midebug {
namespace {

/// A cheap command: GDB answers it at once with one short result record.
constexpr const char* CheapCommand = "-gdb-show height";

void BM_KernelRoundTrip(benchmark::State& State) {
  TGDBKernel Kernel("", "");
  if (!Kernel.Start()) {
    State.SkipWithError(Kernel.GetLastError(false).c_str());
    return;
  }
  std::string Reply;
  Kernel.GetReply(Reply);
  Cardinal Request = 0;
  for (auto _ : State) {
    Kernel.SendRequest(std::to_string(++Request) + CheapCommand);
    if (!Kernel.GetReply(Reply)) {
      State.SkipWithError("the debugger went away");
      return;
    }
    benchmark::DoNotOptimize(Reply);
  }
}
BENCHMARK(BM_KernelRoundTrip)->UseRealTime()->MinTime(2.0);

/// GDB on two pipes, read with plain blocking reads until the prompt ends the
/// bytes read so far.
class TRawGdb : public bench::TRawGdbPipes {
public:
  bool ReadBlock(std::string& Block) {
    static const std::string Prompt = "(gdb) \n";
    Block.clear();
    char Buffer[4096];
    while (!Block.ends_with(Prompt)) {
      const Int64 BytesRead = Read(Buffer, sizeof Buffer);
      if (BytesRead <= 0)
        return false;
      Block.append(Buffer, static_cast<size_t>(BytesRead));
    }
    return true;
  }
};

void BM_RawRoundTrip(benchmark::State& State) {
  TRawGdb Gdb;
  if (!Gdb.Start()) {
    State.SkipWithError("cannot start gdb");
    return;
  }
  std::string Block;
  Gdb.ReadBlock(Block);
  Cardinal Request = 0;
  for (auto _ : State) {
    Gdb.Write(std::to_string(++Request) + CheapCommand + "\n");
    if (!Gdb.ReadBlock(Block)) {
      State.SkipWithError("gdb went away");
      return;
    }
    benchmark::DoNotOptimize(Block);
  }
}
BENCHMARK(BM_RawRoundTrip)->UseRealTime()->MinTime(2.0);

/// Both round trips in turn, each timed on its own: a load that comes and
/// goes on a shared machine then falls on both alike.
void BM_InterleavedRoundTrips(benchmark::State& State) {
  TGDBKernel Kernel("", "");
  TRawGdb Gdb;
  if (!Kernel.Start() || !Gdb.Start()) {
    State.SkipWithError("cannot start gdb");
    return;
  }
  std::string Reply;
  Kernel.GetReply(Reply);
  Gdb.ReadBlock(Reply);
  using TClock = std::chrono::steady_clock;
  TClock::duration KernelTime{};
  TClock::duration RawTime{};
  Cardinal Request = 0;
  bool Failed = false;
  auto KernelRoundTrip = [&](const std::string& Line) {
    const TClock::time_point Start = TClock::now();
    Kernel.SendRequest(Line);
    Failed |= !Kernel.GetReply(Reply);
    KernelTime += TClock::now() - Start;
  };
  auto RawRoundTrip = [&](const std::string& Line) {
    const TClock::time_point Start = TClock::now();
    Gdb.Write(Line + "\n");
    Failed |= !Gdb.ReadBlock(Reply);
    RawTime += TClock::now() - Start;
  };
  for (auto _ : State) {
    const std::string Line = std::to_string(++Request) + CheapCommand;
    // Which goes first alternates, so that neither always follows the other.
    if (Request % 2 == 0) {
      KernelRoundTrip(Line);
      RawRoundTrip(Line);
    } else {
      RawRoundTrip(Line);
      KernelRoundTrip(Line);
    }
    if (Failed) {
      State.SkipWithError("gdb went away");
      return;
    }
  }
  const double Iterations = static_cast<double>(State.iterations());
  State.counters["kernel_us"] = std::chrono::duration<double, std::micro>(KernelTime).count() / Iterations;
  State.counters["raw_us"] = std::chrono::duration<double, std::micro>(RawTime).count() / Iterations;
  State.counters["kernel/raw"] = static_cast<double>(KernelTime.count()) / static_cast<double>(RawTime.count());
}
BENCHMARK(BM_InterleavedRoundTrips)->UseRealTime()->MinTime(1.0)->Repetitions(5)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) {
  return midebug::bench::RunAndPrintRatios(argc, argv, {{"BM_KernelRoundTrip", "BM_RawRoundTrip"}});
}
