// Source lines of a 5,000-line program: (a) the line table of its file, and
// (b) the line of the stop address at each step through it, each against
// GDB sent the same MI over pipes, interleaved.

#include "benchsupport.h"
#include "midebug.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

namespace midebug {
namespace {

constexpr int StatementLines = 4996;

/// Writes and builds a program whose main is 5,000 lines long; the source's
/// path, empty on failure. The program is the source without ".c".
std::string BuildLongProgram() {
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-sourcelines-bench";
  std::filesystem::create_directories(Dir);
  const std::filesystem::path Source = Dir / "long.c";
  {
    std::ofstream Out(Source);
    Out << "int main(void) {\n  volatile int total = 0;\n";
    for (int Line = 0; Line < StatementLines; ++Line)
      Out << "  total += " << Line % 7 << ";\n";
    Out << "  return total & 1;\n}\n";
  }
  const std::string Command = "gcc -g -O0 -o '" + (Dir / "long").string() + "' '" + Source.string() + "'";
  return std::system(Command.c_str()) == 0 ? Source.string() : std::string();
}

std::string AddressText(UInt64 Address) {
  char Text[24];
  std::snprintf(Text, sizeof Text, "0x%016llX", static_cast<unsigned long long>(Address));
  return Text;
}

/// The library and the raw pipes, both stopped at main of the long program.
struct TBoth {
  TIntfPtr<bench::TQuietListener> Listener{new bench::TQuietListener};
  TIntfPtr<IGDBProcess> Process;
  bench::TRawGdbPipes Raw;
  std::string Source;

  /// Empty on success, else why not.
  std::string Start() {
    SetMainThread();
    Source = BuildLongProgram();
    if (Source.empty())
      return "cannot build the program";
    const std::string Program = Source.substr(0, Source.size() - 2);
    try {
      Process = TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", glC, gcAMD64, "gdb");
    } catch (const ENonAIRException& Error) {
      return Error.what();
    }
    Process->SetRunToMainBreakpoint();
    Process->Run();
    if (!bench::AwaitStops(*Listener, 1) || !Raw.Start() || !Raw.StartProgram(Program, "main") ||
        !Raw.Request("-gdb-set filename-display absolute"))
      return "cannot reach main";
    return {};
  }
  ~TBoth() {
    if (Process)
      Process->Terminate();
    ProcessPending();
  }
};

using TClock = std::chrono::steady_clock;

void Report(benchmark::State& State, TClock::duration LibraryTime, TClock::duration RawTime) {
  const double Count = static_cast<double>(State.iterations());
  State.counters["library_us"] = std::chrono::duration<double, std::micro>(LibraryTime).count() / Count;
  State.counters["raw_us"] = std::chrono::duration<double, std::micro>(RawTime).count() / Count;
  State.counters["library/raw"] =
      static_cast<double>(LibraryTime.count()) / static_cast<double>(std::max<TClock::rep>(RawTime.count(), 1));
}

void BM_LineTableVsRawMI(benchmark::State& State) {
  TBoth Both;
  if (const std::string Why = Both.Start(); !Why.empty()) {
    State.SkipWithError(Why.c_str());
    return;
  }
  TClock::duration LibraryTime{};
  TClock::duration RawTime{};
  for (auto _ : State) {
    TIntegerArray Lines;
    const TClock::time_point LibraryStart = TClock::now();
    Both.Process->GetSourceLines(Both.Source, Lines);
    const TClock::time_point RawStart = TClock::now();
    const bool RawDone = Both.Raw.Request("-symbol-list-lines " + Both.Source);
    const TClock::time_point RawEnd = TClock::now();
    if (Lines.size() < StatementLines || !RawDone) {
      State.SkipWithError("no line table");
      break;
    }
    LibraryTime += RawStart - LibraryStart;
    RawTime += RawEnd - RawStart;
  }
  Report(State, LibraryTime, RawTime);
}
BENCHMARK(BM_LineTableVsRawMI)->UseRealTime()->Iterations(100)->Repetitions(3)->ReportAggregatesOnly(true);

/// A step and two look-ups of the line it stopped on (the second answered
/// from the cache), 500 times: 1,000 look-ups while stepping through the
/// program, against GDB sent the same MI, as the library's log shows it.
void BM_LineOfStopVsRawMI(benchmark::State& State) {
  TBoth Both;
  if (const std::string Why = Both.Start(); !Why.empty()) {
    State.SkipWithError(Why.c_str());
    return;
  }
  TClock::duration LibraryTime{};
  TClock::duration RawTime{};
  for (auto _ : State) {
    const int Stops = Both.Listener->Stops;
    UInt64 Start = 0;
    Integer Size = 0, FileIndex = 0, Line = 0;
    const TClock::time_point LibraryStart = TClock::now();
    Both.Process->GetThread(Both.Process->GetSuspendedThreadId())->StepOver();
    const bool Stopped = bench::AwaitStops(*Both.Listener, Stops + 1);
    const UInt64 Pc = Both.Process->GetSuspendedLocation().Address;
    const bool Found = Both.Process->FindSourceLine(Pc, Start, Size, FileIndex, Line) &&
                       Both.Process->FindSourceLine(Start + Size - 1, Start, Size, FileIndex, Line);
    const TClock::time_point RawStart = TClock::now();
    const bool RawDone = Both.Raw.Request("-exec-next", "*stopped") &&
                         Both.Raw.Request("-interpreter-exec console \"show language\"") &&
                         Both.Raw.Request("-thread-info") && Both.Raw.Request("info line *" + AddressText(Pc));
    const TClock::time_point RawEnd = TClock::now();
    if (!Stopped || !Found || !RawDone) {
      State.SkipWithError("a step did not stop on a line");
      break;
    }
    LibraryTime += RawStart - LibraryStart;
    RawTime += RawEnd - RawStart;
  }
  Report(State, LibraryTime, RawTime);
}
BENCHMARK(BM_LineOfStopVsRawMI)->UseRealTime()->Iterations(500)->Repetitions(3)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
