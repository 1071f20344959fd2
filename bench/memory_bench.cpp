// Memory, disassembly and registers against a plain loop that sends GDB the
// same MI commands over pipes, interleaved iteration by iteration: walking
// 2,000 instructions with the disassembly cursor, reading 64 KiB in 4 KiB
// reads, and reading the general and SSE registers at a stop.

#include "benchsupport.h"
#include "midebug.h"
#include "process/gdbprocess.h"

#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

namespace midebug {
namespace {

constexpr const char* StopProgram = R"(#include <stdio.h>
int main(void) {
  puts("stopped");
  return 0;
}
)";

using bench::Hex;

/// Builds the program in a scratch directory; empty on failure.
std::string BuildStopProgram() {
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-memory-bench";
  std::filesystem::create_directories(Dir);
  std::ofstream(Dir / "stop.c") << StopProgram;
  const std::string Program = (Dir / "stop").string();
  const std::string Command = "gcc -g -O0 -o '" + Program + "' '" + (Dir / "stop.c").string() + "'";
  return std::system(Command.c_str()) == 0 ? Program : std::string();
}

/// The library's session and the raw one, both stopped at main of the same
/// program (GDB turns address randomisation off, so addresses agree).
class TSessions {
public:
  bool Start(benchmark::State& State) {
    SetMainThread();
    const std::string Program = BuildStopProgram();
    try {
      Process = TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", glC, gcAMD64, "gdb");
    } catch (const ENonAIRException& Error) {
      State.SkipWithError(Error.what());
      return false;
    }
    Process->SetRunToMainBreakpoint();
    Process->Run();
    if (Program.empty() || !bench::AwaitStops(*Listener, 1) || !Raw.Start() || !Raw.StartProgram(Program, "main")) {
      State.SkipWithError("cannot reach main");
      return false;
    }
    return true;
  }
  ~TSessions() {
    if (Process)
      Process->Terminate();
    ProcessPending();
  }

  TGDBProcess& Core() { return *static_cast<TGDBProcess*>(Process.get()); }
  UInt64 AddressOf(const std::string& Expression) {
    TDataEvaluateExpressionResult Value;
    if (!Core().Requests().Ask(Value, &TGDBCommand::CreateDataEvaluateExpressionCommand, Expression))
      return 0;
    const size_t At = Value.FValue.find("0x");
    return At == std::string::npos ? 0 : std::stoull(Value.FValue.substr(At), nullptr, 16);
  }

  /// Times Library and Raw in turn each iteration and reports their ratio.
  void Measure(benchmark::State& State, const std::function<bool()>& Library, const std::function<bool()>& Raw) {
    using TClock = std::chrono::steady_clock;
    TClock::duration LibraryTime{};
    TClock::duration RawTime{};
    for (auto _ : State) {
      const TClock::time_point LibraryStart = TClock::now();
      const bool LibraryDone = Library();
      const TClock::time_point RawStart = TClock::now();
      const bool RawDone = Raw();
      const TClock::time_point RawEnd = TClock::now();
      if (!LibraryDone || !RawDone) {
        State.SkipWithError(LibraryDone ? "the raw session failed" : "the library failed");
        return;
      }
      LibraryTime += RawStart - LibraryStart;
      RawTime += RawEnd - RawStart;
    }
    const double Iterations = static_cast<double>(State.iterations());
    State.counters["library_us"] = std::chrono::duration<double, std::micro>(LibraryTime).count() / Iterations;
    State.counters["raw_us"] = std::chrono::duration<double, std::micro>(RawTime).count() / Iterations;
    State.counters["library/raw"] =
        static_cast<double>(LibraryTime.count()) / static_cast<double>(std::max<TClock::rep>(RawTime.count(), 1));
  }

  TIntfPtr<bench::TQuietListener> Listener{new bench::TQuietListener};
  TIntfPtr<IGDBProcess> Process;
  bench::TRawGdbPipes Raw;
};

constexpr int WalkedInstructions = 2000;

/// One block as the library asks for it: 40 instructions' worth of bytes
/// with their opcodes, cut to 40, then the bytes up to the last one. Next
/// is where the following block starts; Count the instructions it held.
bool RawBlock(bench::TRawGdbPipes& Raw, UInt64& Next, int& Count) {
  std::string Reply;
  if (!Raw.Request("-data-disassemble -s " + Hex(Next) + " -e " + Hex(Next + 160) + " -- 2", {}, &Reply))
    return false;
  UInt64 First = 0;
  UInt64 Last = 0;
  size_t LastAt = 0;
  Count = 0;
  for (size_t At = Reply.find("address=\""); At != std::string::npos && Count < 40;
       At = Reply.find("address=\"", At + 1), ++Count) {
    Last = std::stoull(Reply.substr(At + 9), nullptr, 16);
    LastAt = At;
    if (Count == 0)
      First = Last;
  }
  if (Count == 0)
    return false;
  const size_t Opcodes = Reply.find("opcodes=\"", LastAt) + 9;
  const size_t OpcodesEnd = Reply.find('"', Opcodes);
  const UInt64 Size = (OpcodesEnd - Opcodes + 1) / 3;
  Next = Last + Size;
  return Last == First || Raw.Request("-data-read-memory-bytes " + Hex(First) + " " + std::to_string(Last - First));
}

void BM_CursorWalkVsRawMI(benchmark::State& State) {
  TSessions Sessions;
  if (!Sessions.Start(State))
    return;
  const UInt64 Start = Sessions.AddressOf("&malloc");
  const TIntfPtr<IGDBDisassemble> Cursor = Sessions.Process->GetDisassembler();
  Sessions.Measure(
      State,
      [&] {
        UInt64 Address = 0;
        Cursor->ToAddress(Start, Address);
        for (int Step = 1; Step < WalkedInstructions; ++Step)
          Cursor->GetNextAddress(Address);
        return Cursor->IsValid();
      },
      [&] {
        UInt64 Next = Start;
        for (int Walked = 0; Walked < WalkedInstructions;) {
          int Count = 0;
          if (!RawBlock(Sessions.Raw, Next, Count))
            return false;
          Walked += Count;
        }
        return true;
      });
}
BENCHMARK(BM_CursorWalkVsRawMI)->UseRealTime()->Iterations(20)->Repetitions(3)->ReportAggregatesOnly(true);

void BM_MemoryReadsVsRawMI(benchmark::State& State) {
  TSessions Sessions;
  if (!Sessions.Start(State))
    return;
  constexpr Integer Chunk = 4096;
  constexpr int Chunks = 16;
  const UInt64 Base = Sessions.AddressOf("&malloc") & ~UInt64{Chunk - 1};
  std::vector<Byte> Buffer(Chunk);
  Sessions.Measure(
      State,
      [&] {
        for (int Index = 0; Index < Chunks; ++Index)
          if (Sessions.Process->GetMemory(Base + static_cast<UInt64>(Index) * Chunk, Buffer.data(), Chunk) != Chunk)
            return false;
        return true;
      },
      [&] {
        for (int Index = 0; Index < Chunks; ++Index)
          if (!Sessions.Raw.Request("-data-read-memory-bytes " + Hex(Base + static_cast<UInt64>(Index) * Chunk) +
                                    " " + std::to_string(Chunk)))
            return false;
        return true;
      });
}
BENCHMARK(BM_MemoryReadsVsRawMI)->UseRealTime()->Iterations(100)->Repetitions(3)->ReportAggregatesOnly(true);

std::string ValuesCommand(const TIntegerArray& Ids) {
  std::string Line = "-data-list-register-values x";
  for (Integer Id : Ids)
    Line += " " + std::to_string(Id);
  return Line;
}

void BM_RegistersVsRawMI(benchmark::State& State) {
  TSessions Sessions;
  if (!Sessions.Start(State))
    return;
  TDataListRegisterNamesResult Names(gcAMD64, "Linux64");
  Sessions.Core().Requests().Ask(Names, [](TGDBCommand& Builder, std::string& Token) {
    return Builder.CreateDataListRegisterNames(Token, {});
  });
  const std::string General = ValuesCommand(Names.GetRegisterIds());
  const std::string XMM = ValuesCommand(Names.GetXMMRegisterIds());
  const TIntfPtr<IGDBThread> Thread = Sessions.Process->GetThread(Sessions.Process->GetSuspendedThreadId());
  Sessions.Measure(
      State,
      [&] {
        TUInt64Array Values;
        TXMMRegValueArray Vectors;
        UInt64 PC = 0;
        return Thread->GetRegisters(Values, PC) && Thread->GetXMMRegisters(Vectors);
      },
      [&] { return Sessions.Raw.Request(General) && Sessions.Raw.Request(XMM); });
}
BENCHMARK(BM_RegistersVsRawMI)->UseRealTime()->Iterations(300)->Repetitions(3)->ReportAggregatesOnly(true);

} // namespace
} // namespace midebug

int main(int argc, char** argv) { return midebug::bench::RunAndPrintRatios(argc, argv, {}); }
