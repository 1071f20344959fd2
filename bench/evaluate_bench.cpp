// Evaluation and inspectors against a plain loop that sends GDB the same MI
// commands over pipes, interleaved iteration by iteration: (a) an inspector
// on a 5,000-element array read whole in windows of 100, (b) the locals view
// of a frame of 200 locals refreshed after each step, (c) Evaluate of a
// simple expression.

#include "benchsupport.h"
#include "midebug.h"
#include "process/gdbprocess.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>

namespace midebug {
namespace {

/// A global array of 5,000 and a function with 200 locals that then loops.
std::string ValuesProgram() {
  std::string Source = "int numbers[5000];\nint counter = 7;\nint crowded(int seed) {\n";
  for (int Index = 0; Index < 200; ++Index)
    Source += "  int local" + std::to_string(Index) + " = seed + " + std::to_string(Index) + ";\n";
  Source += "  int total = 0;\n  for (int step = 0; step < 100000; ++step) {\n";
  Source += "    total += local0 + step;\n    local1 = total;\n  }\n";
  Source += "  return total;\n}\nint main(void) {\n  for (int i = 0; i < 5000; ++i)\n    numbers[i] = i;\n";
  Source += "  return crowded(1) & 1;\n}\n";
  return Source;
}

/// Builds the program in a scratch directory; empty on failure.
std::string BuildValuesProgram() {
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-evaluate-bench";
  std::filesystem::create_directories(Dir);
  std::ofstream(Dir / "values.c") << ValuesProgram();
  const std::string Program = (Dir / "values").string();
  const std::string Command = "gcc -g -O0 -o '" + Program + "' '" + (Dir / "values.c").string() + "'";
  return std::system(Command.c_str()) == 0 ? Program : std::string();
}

/// The line that sets total: every local is set, the loop comes next.
const std::string StopAt = "values.c:204";

using TClock = std::chrono::steady_clock;

/// The library and the raw session, both stopped at StopAt, each iteration
/// timing the library's work and then the same MI sent straight.
class TSessions {
public:
  bool Start(benchmark::State& State) {
    SetMainThread();
    const std::string Program = BuildValuesProgram();
    try {
      Process = TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", glC, gcAMD64, "gdb");
    } catch (const ENonAIRException& Error) {
      State.SkipWithError(Error.what());
      return false;
    }
    TGDBProcess& Core = *static_cast<TGDBProcess*>(Process.get());
    if (Program.empty() || !Core.ProcessAsyncRequest("-break-insert " + StopAt) ||
        !Core.ProcessAsyncRequest("-exec-run") || !bench::AwaitStops(*Listener, 1) || !Raw.Start() || !Raw.StartProgram(Program, StopAt)) {
      State.SkipWithError("cannot reach the locals");
      return false;
    }
    return true;
  }
  ~TSessions() {
    if (Process)
      Process->Terminate();
    ProcessPending();
  }
  TIntfPtr<IGDBThread> Thread() { return Process->GetThread(Process->GetSuspendedThreadId()); }
  /// Times Library then Raw; false when either failed.
  bool Time(const std::function<bool()>& Library, const std::function<bool()>& Raw) {
    const TClock::time_point LibraryStart = TClock::now();
    const bool LibraryDone = Library();
    const TClock::time_point RawStart = TClock::now();
    const bool RawDone = Raw();
    const TClock::time_point RawEnd = TClock::now();
    FLibraryTime += RawStart - LibraryStart;
    FRawTime += RawEnd - RawStart;
    return LibraryDone && RawDone;
  }
  void Report(benchmark::State& State) const {
    State.counters["library/raw"] =
        static_cast<double>(FLibraryTime.count()) / static_cast<double>(std::max<TClock::rep>(FRawTime.count(), 1));
  }

  TIntfPtr<bench::TQuietListener> Listener{new bench::TQuietListener};
  TIntfPtr<IGDBProcess> Process;
  bench::TRawGdbPipes Raw;

private:
  TClock::duration FLibraryTime{};
  TClock::duration FRawTime{};
};

/// Every member of Inspector from Start to Start + Count - 1.
bool ReadMembers(IGDBInspect& Inspector, Integer Count) {
  std::string Name, TypeName, Value;
  UInt64 Address = 0;
  TInspectFlags Flags = 0;
  bool Read = true;
  for (Integer Index = 0; Index < Count; ++Index)
    Read = Inspector.GetMember(Index, Name, TypeName, Value, Address, Flags) && Read;
  return Read;
}

// (a) The whole array in windows of 100: a slice per window, then each
// child's value and attributes.
void BM_ArrayInWindowsVsRawMI(benchmark::State& State) {
  TSessions Sessions;
  if (!Sessions.Start(State))
    return;
  Cardinal RawVar = 0;
  for (auto _ : State) {
    const bool Done = Sessions.Time(
        [&] {
          const TIntfPtr<IGDBInspect> Array = Sessions.Thread()->CreateInspector("numbers", 1);
          bool Read = Array->GetMemberCount() == 5000;
          for (Integer Start = 0; Start < 5000; Start += 100) {
            Array->SetInspectRange(Start, 100);
            Read = ReadMembers(*Array, 100) && Read;
          }
          return Read;
        },
        [&] {
          // A window of a large array is listed through a variable object of
          // that slice alone.
          const std::string Name = "raw" + std::to_string(++RawVar);
          bool Done = Sessions.Raw.Request("-var-create " + Name + " * \"numbers\"") &&
                      Sessions.Raw.Request("-var-show-attributes \"" + Name + "\"") &&
                      Sessions.Raw.Request("-var-info-path-expression \"" + Name + "\"");
          for (Integer Start = 0; Done && Start < 5000; Start += 100) {
            const std::string Slice = Name + "s" + std::to_string(Start);
            Done = Sessions.Raw.Request("-var-create " + Slice + " * \"(numbers)[" + std::to_string(Start) +
                                        "]@100\"") &&
                   Sessions.Raw.Request("-var-show-attributes \"" + Slice + "\"") &&
                   Sessions.Raw.Request("-var-list-children \"" + Slice + "\"");
            for (Integer Index = 0; Done && Index < 100; ++Index) {
              const std::string Child = "\"" + Slice + "." + std::to_string(Index) + "\"";
              Done = Sessions.Raw.Request("-var-evaluate-expression " + Child) &&
                     Sessions.Raw.Request("-var-show-attributes " + Child);
            }
          }
          for (Integer Start = 0; Done && Start < 5000; Start += 100)
            Done = Sessions.Raw.Request("-var-delete \"" + Name + "s" + std::to_string(Start) + "\"");
          return Done && Sessions.Raw.Request("-var-delete \"" + Name + "\"");
        });
    if (!Done) {
      State.SkipWithError("a request failed");
      return;
    }
  }
  Sessions.Report(State);
}
BENCHMARK(BM_ArrayInWindowsVsRawMI)->UseRealTime()->Iterations(3)->Repetitions(3)->ReportAggregatesOnly(true);

// (b) The locals view refreshed after each step: the step and its stop,
// then the checks of depth, count and frame and an update of each local.
void BM_LocalsAfterStepsVsRawMI(benchmark::State& State) {
  TSessions Sessions;
  if (!Sessions.Start(State))
    return;
  const TIntfPtr<IGDBInspect> Locals = Sessions.Thread()->CreateLocalVarsInspector(1);
  const Integer Count = Locals->GetMemberCount();
  ReadMembers(*Locals, Count);
  for (Integer Index = 0; Index < Count; ++Index)
    if (!Sessions.Raw.Request("-var-create rawlocal" + std::to_string(Index) + " * \"" + Locals->CreateSubInspector(iiVariable, Index)->GetExpr() + "\""))
      State.SkipWithError("the raw locals");
  for (auto _ : State) {
    const bool Done = Sessions.Time(
        [&] {
          const int Stops = Sessions.Listener->Stops;
          Sessions.Thread()->StepOver();
          return bench::AwaitStops(*Sessions.Listener, Stops + 1) && !Locals->Refresh() &&
                 ReadMembers(*Locals, Count);
        },
        [&] {
          bool Done = Sessions.Raw.Request("-exec-next", "*stopped") &&
                      Sessions.Raw.Request("-interpreter-exec console \"show language\"") &&
                      Sessions.Raw.Request("-thread-info") && Sessions.Raw.Request("-stack-info-depth 50001") &&
                      Sessions.Raw.Request("-stack-list-locals --no-values") &&
                      Sessions.Raw.Request("-stack-list-frames 0 31") &&
                      Sessions.Raw.Request("-stack-list-arguments 1 0 31");
          for (Integer Index = 0; Done && Index < Count; ++Index)
            Done = Sessions.Raw.Request("-var-update --all-values \"rawlocal" + std::to_string(Index) + "\"");
          return Done;
        });
    if (!Done) {
      State.SkipWithError("a step failed");
      return;
    }
  }
  Sessions.Report(State);
}
BENCHMARK(BM_LocalsAfterStepsVsRawMI)->UseRealTime()->Iterations(100)->Repetitions(3)->ReportAggregatesOnly(true);

// (c) Evaluate of a simple expression: the last evaluation's variable object
// deleted, a new one made and its attributes read.
void BM_EvaluateVsRawMI(benchmark::State& State) {
  TSessions Sessions;
  if (!Sessions.Start(State))
    return;
  const TIntfPtr<IGDBThread> Thread = Sessions.Thread();
  Cardinal RawVar = 0;
  for (auto _ : State) {
    const bool Done = Sessions.Time(
        [&] {
          std::string Value, TypeName;
          bool CanModify = false;
          return Thread->Evaluate("counter + local5", "", 1, Value, CanModify, TypeName) == ercOk;
        },
        [&] {
          const std::string Name = "raw" + std::to_string(++RawVar);
          return Sessions.Raw.Request("-var-delete \"raw" + std::to_string(RawVar - 1) + "\"") &&
                 Sessions.Raw.Request("-var-create " + Name + " * \"counter + local5\"") &&
                 Sessions.Raw.Request("-var-show-attributes \"" + Name + "\"");
        });
    if (!Done) {
      State.SkipWithError("an evaluation failed");
      return;
    }
  }
  Sessions.Report(State);
}
BENCHMARK(BM_EvaluateVsRawMI)->UseRealTime()->Iterations(1000)->Repetitions(3)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
