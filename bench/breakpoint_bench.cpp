// Breakpoints against a plain loop that sends GDB the same MI commands over
// pipes, interleaved: (a) a breakpoint hit in a loop, from the resume to the
// stop delivered with its top frame; (b) setting 100 breakpoints; (c) a
// program throwing 1,000 C++ exceptions with every stop declined.

#include "benchsupport.h"
#include "midebug.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

namespace midebug {
namespace {

using TClock = std::chrono::steady_clock;

constexpr const char* LoopSource = R"(static int hits;
__attribute__((noinline)) void tick(int round) {
  hits += round;
}
int main(void) {
  for (int round = 0; round < 100000000; ++round)
    tick(round);
  return hits & 1;
}
)";
/// The line of the loop program's tick body, and the lines with code the
/// 100 breakpoints take in turn.
constexpr int TickLine = 3;
constexpr int CodeLines[] = {2, 3, 4, 6, 7, 9};

constexpr const char* ThrowSource = R"(#include <stdexcept>
int main() {
  int caught = 0;
  for (int round = 0; round < 1000; ++round) {
    try {
      throw std::runtime_error("round");
    } catch (const std::exception&) {
      ++caught;
    }
  }
  return caught == 1000 ? 0 : 1;
}
)";

/// Compiles Source (C, or C++ when Cpp) into a scratch directory; empty on
/// failure.
std::string Build(const std::string& Name, const char* Source, bool Cpp) {
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-breakpoint-bench";
  std::filesystem::create_directories(Dir);
  const std::string SourcePath = (Dir / (Name + (Cpp ? ".cpp" : ".c"))).string();
  std::ofstream(SourcePath) << Source;
  const std::string Program = (Dir / Name).string();
  const std::string Command =
      std::string(Cpp ? "g++" : "gcc") + " -g -O0 -o '" + Program + "' '" + SourcePath + "'";
  return std::system(Command.c_str()) == 0 ? Program : std::string();
}

/// Counts the exits too.
class TExitListener : public bench::TQuietListener {
public:
  std::atomic<int> Exits{0};
  void ProcessExited(Integer, const std::string&) override { ++Exits; }
  /// Pumps the main-thread queue until the program has ended; false after
  /// two minutes without.
  bool PumpUntilExit() {
    const auto Deadline = TClock::now() + std::chrono::minutes(2);
    while (Exits == 0 && TClock::now() < Deadline)
      WaitAndProcess(std::chrono::milliseconds(1));
    return Exits != 0;
  }
};

/// A breakpoint of the IDE that stops at every hit.
class TStoppingBreakpoint : public TInterfaced<IGDBBreakpointListener> {
public:
  void BreakpointHits(bool& ShouldStop, Integer, TGDBLocation&) override { ShouldStop = true; }
  void BreakpointVerified(bool, Integer, const TGDBLocation&) override {}
};

TIntfPtr<IGDBProcess> Launch(const TIntfPtr<bench::TQuietListener>& Listener, const std::string& Program,
                             TGDBLanguage Language, benchmark::State& State) {
  try {
    return TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", Language, gcAMD64, "gdb");
  } catch (const ENonAIRException& Error) {
    State.SkipWithError(Error.what());
    return nullptr;
  }
}

void ReportTimes(benchmark::State& State, TClock::duration Library, TClock::duration Raw, double Units) {
  State.counters["library_us"] = std::chrono::duration<double, std::micro>(Library).count() / Units;
  State.counters["raw_us"] = std::chrono::duration<double, std::micro>(Raw).count() / Units;
  State.counters["library/raw"] =
      static_cast<double>(Library.count()) / static_cast<double>(std::max<TClock::rep>(Raw.count(), 1));
}

void BM_BreakpointHitVsRawMI(benchmark::State& State) {
  SetMainThread();
  const std::string Program = Build("loop", LoopSource, false);
  TIntfPtr<bench::TQuietListener> Listener(new bench::TQuietListener);
  TIntfPtr<IGDBProcess> Process = Program.empty() ? nullptr : Launch(Listener, Program, glC, State);
  bench::TRawGdbPipes Raw;
  if (!Process)
    return;
  const std::string TickLocation = "loop.c:" + std::to_string(TickLine);
  Process->CreateSourceBreakpoint("loop.c", TickLine, TIntfPtr<IGDBBreakpointListener>(new TStoppingBreakpoint));
  Process->Run();
  if (!bench::AwaitStops(*Listener, 1) || !Raw.Start() || !Raw.StartProgram(Program, TickLocation)) {
    State.SkipWithError("cannot reach the breakpoint");
    return;
  }
  TClock::duration LibraryTime{}, RawTime{};
  for (auto _ : State) {
    const int Stops = Listener->Stops;
    const TClock::time_point LibraryStart = TClock::now();
    Process->Resume();
    const bool Stopped = bench::AwaitStops(*Listener, Stops + 1);
    const TIntfPtr<IGDBThread> Thread = Process->GetThread(Process->GetSuspendedThreadId());
    benchmark::DoNotOptimize(Thread->GetCallHeader(1));
    const TClock::time_point RawStart = TClock::now();
    // What the library sent for the same hit, as its MI log shows.
    const bool RawDone = Raw.Request("-exec-continue", "*stopped") &&
                         Raw.Request("-interpreter-exec console \"show language\"") && Raw.Request("-thread-info") &&
                         Raw.Request("-stack-list-frames 0 31") && Raw.Request("-stack-list-arguments 1 0 31");
    const TClock::time_point RawEnd = TClock::now();
    if (!Stopped || !RawDone) {
      State.SkipWithError("a hit did not stop");
      break;
    }
    LibraryTime += RawStart - LibraryStart;
    RawTime += RawEnd - RawStart;
  }
  ReportTimes(State, LibraryTime, RawTime, static_cast<double>(State.iterations()));
  Process->Terminate();
  ProcessPending();
}
BENCHMARK(BM_BreakpointHitVsRawMI)->UseRealTime()->Iterations(200)->Repetitions(3)->ReportAggregatesOnly(true);

void BM_SetHundredBreakpointsVsRawMI(benchmark::State& State) {
  SetMainThread();
  const std::string Program = Build("loop", LoopSource, false);
  TIntfPtr<bench::TQuietListener> Listener(new bench::TQuietListener);
  TIntfPtr<IGDBProcess> Process = Program.empty() ? nullptr : Launch(Listener, Program, glC, State);
  bench::TRawGdbPipes Raw;
  if (!Process)
    return;
  Process->SetRunToMainBreakpoint();
  Process->Run();
  if (!bench::AwaitStops(*Listener, 1) || !Raw.Start() || !Raw.StartProgram(Program, "main")) {
    State.SkipWithError("cannot reach main");
    return;
  }
  constexpr int Count = 100;
  const TIntfPtr<IGDBBreakpointListener> Breakpoint(new TStoppingBreakpoint);
  TClock::duration LibraryTime{}, RawTime{};
  for (auto _ : State) {
    const TClock::time_point LibraryStart = TClock::now();
    for (int Index = 0; Index < Count; ++Index)
      Process->CreateSourceBreakpoint("loop.c", CodeLines[Index % std::size(CodeLines)], Breakpoint);
    const TClock::time_point RawStart = TClock::now();
    bool RawDone = true;
    for (int Index = 0; Index < Count && RawDone; ++Index)
      RawDone = Raw.Request("-break-insert -f loop.c:" + std::to_string(CodeLines[Index % std::size(CodeLines)]));
    const TClock::time_point RawEnd = TClock::now();
    if (!RawDone) {
      State.SkipWithError("an insert failed");
      break;
    }
    LibraryTime += RawStart - LibraryStart;
    RawTime += RawEnd - RawStart;
  }
  ReportTimes(State, LibraryTime, RawTime, static_cast<double>(State.iterations()));
  Process->Terminate();
  ProcessPending();
}
BENCHMARK(BM_SetHundredBreakpointsVsRawMI)->UseRealTime()->Iterations(5)->Repetitions(3)->ReportAggregatesOnly(true);

/// The raw side of a declined throw and catch: the requests the library
/// makes to read each, then the resume.
bool RawThrowAndCatch(bench::TRawGdbPipes& Raw) {
  return Raw.Await("*stopped") && Raw.Request("-data-list-register-values x 5 4") &&
         Raw.Request("-stack-list-frames 1 1") && Raw.Request("-data-read-memory-bytes $rsi 8") &&
         Raw.Request("-data-read-memory-bytes $sp 64") && Raw.Request("-exec-continue") && Raw.Await("*stopped") &&
         Raw.Request("-data-list-register-values x 5") &&
         Raw.Request("-stack-list-frames 1 1") && Raw.Request("-data-read-memory-bytes $rdi 8") &&
         Raw.Request("-data-read-memory-bytes $rdi-80 8") && Raw.Request("-data-read-memory-bytes $sp 8") &&
         Raw.Request("-data-read-memory-bytes $sp 64") && Raw.Request("-exec-continue");
}

void BM_ThousandDeclinedThrowsVsRawMI(benchmark::State& State) {
  SetMainThread();
  const std::string Program = Build("throws", ThrowSource, true);
  if (Program.empty()) {
    State.SkipWithError("cannot build the program");
    return;
  }
  TClock::duration LibraryTime{}, RawTime{};
  for (auto _ : State) {
    TIntfPtr<TExitListener> Listener(new TExitListener);
    TIntfPtr<IGDBProcess> Process = Launch(Listener, Program, glCPP, State);
    if (!Process)
      return;
    Process->SetOsException("SIGUSR1", true, true);
    const TClock::time_point LibraryStart = TClock::now();
    Process->Run();
    const bool Exited = Listener->PumpUntilExit();
    const TClock::time_point LibraryEnd = TClock::now();
    Process = nullptr;
    ProcessPending();

    bench::TRawGdbPipes Raw;
    bool RawDone = Raw.Start() && Raw.Await("(gdb) \n") && Raw.Request("-file-exec-and-symbols \"" + Program + "\"") &&
                   Raw.Request("-interpreter-exec console \"handle SIGUSR1 stop print pass\"");
    for (const char* Function :
         {"_DbgExcNotify", "_CPPDbgExcNotify", "__cxa_throw", "__cxa_begin_catch", "fpc_raiseexception"})
      RawDone = RawDone && Raw.Request(std::string("-break-insert -f ") + Function);
    const TClock::time_point RawStart = TClock::now();
    RawDone = RawDone && Raw.Request("-exec-run");
    for (int Round = 0; Round < 1000 && RawDone; ++Round)
      RawDone = RawThrowAndCatch(Raw);
    RawDone = RawDone && Raw.Await("*stopped,reason=\"exited");
    const TClock::time_point RawEnd = TClock::now();
    if (!Exited || !RawDone) {
      State.SkipWithError("the program did not run to its end");
      break;
    }
    LibraryTime += LibraryEnd - LibraryStart;
    RawTime += RawEnd - RawStart;
  }
  ReportTimes(State, LibraryTime, RawTime, static_cast<double>(State.iterations()) * 2000);
}
BENCHMARK(BM_ThousandDeclinedThrowsVsRawMI)->UseRealTime()->Iterations(1)->Repetitions(3)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
