// The debug adapter against GDB driven straight over pipes, interleaved on
// the same program: (a) from starting the adapter (or GDB) to the first stop
// at main; (b) 200 times a step over a line, its stop and a stack trace of
// 20 frames; (c) a 5,000-element array evaluated and read through
// `variables` in pages of 100; (d) 64 KiB of a global array read through
// `readMemory` in 16 requests of 4 KiB, each answered before the next is
// sent; (e) 200 instructions of a long function through `disassemble`.
// (a) to (c) are measured in 5 rounds, (d) and (e) in 21; the medians and
// their ratios are printed. GDB over pipes is sent the MI lines the
// adapter's debugger log shows each request costing.

#include "benchsupport.h"
#include "dapframing.h"
#include "midebug.h"
#include "platform/hostprocess.h"

#include <nlohmann/json.hpp>

#include <algorithm>
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

using TClock = std::chrono::steady_clock;
using TMilliseconds = std::chrono::duration<double, std::milli>;

constexpr int Rounds = 5;
constexpr int StepsPerRound = 200;
constexpr int TraceLevels = 20;
constexpr int ArraySize = 5000;
constexpr int PageSize = 100;

/// Reads and listings take milliseconds: more rounds keep their medians
/// steady on a busy machine at little cost.
constexpr int ShortRounds = 21;
constexpr int MemoryChunk = 4096;
constexpr int MemoryChunks = 16;
constexpr int DisassembledInstructions = 200;
/// The adapter asks GDB for this many bytes of code per instruction wanted.
constexpr int BytesPerInstruction = 6;

/// 20 calls deep, a long loop to step through, an array to read, 64 KiB of
/// page-aligned memory (so no 4 KiB read ends one byte into a page) and a
/// function long enough that the 1,200 bytes after its start are all its
/// own code.
constexpr const char* SteppedProgram = R"(int numbers[5000] = {1, 2, 3};
unsigned char memory[65536] __attribute__((aligned(4096))) = {1, 2, 3};
static void spin(void) {
  volatile long total = 0;
  for (long i = 0; i < 100000000; ++i) {
    total += i;
  }
}
static void descend(int left) {
  if (left == 0) {
    spin();
    return;
  }
  descend(left - 1);
}
int main(void) {
  descend(18);
  return 0;
}
)";

std::string BuildSteppedProgram() {
  const std::filesystem::path Dir = std::filesystem::temp_directory_path() / "midebug-dap-bench";
  std::filesystem::create_directories(Dir);
  // The long function, one statement a line as a user's code reads: about
  // 29 bytes of code a line unoptimised, so 64 lines pass 1,200 bytes.
  std::string Mix = "int mix(int a, int b) {\n";
  for (int Line = 0; Line < 64; ++Line)
    Mix += "  a = a * 31 + b; b ^= a >> 3;\n";
  Mix += "  return a + b;\n}\n";
  std::ofstream(Dir / "stepped.c") << SteppedProgram << Mix;
  const std::string Program = (Dir / "stepped").string();
  const std::string Command = "gcc -g -O0 -o '" + Program + "' '" + (Dir / "stepped.c").string() + "'";
  return std::system(Command.c_str()) == 0 ? Program : std::string();
}

/// A client of the adapter on two pipes, reading with blocking reads.
class TDapClient {
public:
  TDapClient() = default;
  TDapClient(const TDapClient&) = delete;
  TDapClient& operator=(const TDapClient&) = delete;
  ~TDapClient() {
    if (FPid == -1)
      return;
    FStdIn.CloseWrite();
    KillProcess(FPid);
    ReapChildProcess(FPid);
  }

  bool Start() {
    TChildProcess Child;
    std::string Error;
    if (!StartChildProcess({MIDEBUG_DAP}, {}, FStdIn.ReadHandle(), FStdOut.WriteHandle(), Child, Error))
      return false;
    FPid = Child.Pid;
    FStdIn.CloseRead();
    FStdOut.CloseWrite();
    return true;
  }
  /// Sends a request; the seq it went under.
  int Send(const std::string& Command, const nlohmann::json& Arguments = nlohmann::json::object()) {
    const std::string Body =
        nlohmann::json{{"seq", ++FSeq}, {"type", "request"}, {"command", Command}, {"arguments", Arguments}}.dump();
    const std::string Framed = dap::FrameMessage(Body);
    WriteHandle(FStdIn.WriteHandle(), Framed.data(), Framed.size());
    return FSeq;
  }
  /// Reads messages until Wanted accepts one, which it returns; null when
  /// the adapter ended.
  nlohmann::json Await(const std::function<bool(const nlohmann::json&)>& Wanted) {
    for (;;) {
      std::string Body;
      while (FReader.Next(Body) == dap::TDapFrameReader::TNext::Message) {
        nlohmann::json Message = nlohmann::json::parse(Body, nullptr, false);
        if (Wanted(Message))
          return Message;
      }
      char Buffer[65536];
      const Int64 Read = ReadHandle(FStdOut.ReadHandle(), Buffer, sizeof Buffer);
      if (Read <= 0)
        return nullptr;
      FReader.Feed(std::string_view(Buffer, static_cast<size_t>(Read)));
    }
  }
  nlohmann::json Response(int Seq) {
    return Await([Seq](const nlohmann::json& M) { return M.value("request_seq", -1) == Seq; });
  }
  nlohmann::json Event(const std::string& Name) {
    return Await([&Name](const nlohmann::json& M) { return M.value("event", "") == Name; });
  }

private:
  TPipe FStdIn;
  TPipe FStdOut;
  Integer FPid = -1;
  int FSeq = 0;
  dap::TDapFrameReader FReader;
};

/// The adapter from its start to the stop at main; false when it failed.
bool AdapterToMain(TDapClient& Client, const std::string& Program, int& ThreadId) {
  if (!Client.Start())
    return false;
  Client.Response(Client.Send("initialize", {{"adapterID", "bench"}}));
  Client.Event("initialized");
  const int Launch = Client.Send("launch", {{"program", Program}, {"stopAtEntry", true}});
  Client.Send("configurationDone");
  if (!Client.Response(Launch).value("success", false))
    return false;
  const nlohmann::json Stopped = Client.Event("stopped");
  if (Stopped.is_null())
    return false;
  ThreadId = Stopped["body"].value("threadId", 1);
  return true;
}

bool RawToMain(bench::TRawGdbPipes& Raw, const std::string& Program) {
  return Raw.Start() && Raw.StartProgram(Program, "main");
}

/// The whole number Expression gives in the adapter's session; 0 when it
/// gives none.
UInt64 AdapterNumber(TDapClient& Client, const std::string& Expression) {
  const nlohmann::json Value =
      Client.Response(Client.Send("evaluate", {{"expression", Expression}, {"context", "watch"}}));
  if (Value.is_null() || !Value.value("success", false))
    return 0;
  return std::strtoull(Value["body"].value("result", "").c_str(), nullptr, 0);
}

/// The whole number Expression gives in the raw session; 0 when it gives
/// none.
UInt64 RawNumber(bench::TRawGdbPipes& Raw, const std::string& Expression) {
  std::string Reply;
  if (!Raw.Request("-data-evaluate-expression \"" + Expression + "\"", {}, &Reply))
    return 0;
  const size_t At = Reply.find("value=\"");
  return At == std::string::npos ? 0 : std::strtoull(Reply.c_str() + At + 7, nullptr, 0);
}

/// One 4 KiB read through the adapter; false unless every byte came back.
bool AdapterRead(TDapClient& Client, UInt64 Address) {
  const nlohmann::json Read =
      Client.Response(Client.Send("readMemory", {{"memoryReference", bench::Hex(Address)}, {"count", MemoryChunk}}));
  if (Read.is_null() || !Read.value("success", false) || Read["body"].contains("unreadableBytes"))
    return false;
  // Base64 of 4,096 bytes.
  return Read["body"].value("data", "").size() == (MemoryChunk + 2) / 3 * 4;
}

/// The same read as the library sends it to GDB; false unless every byte
/// came back.
bool RawRead(bench::TRawGdbPipes& Raw, UInt64 Address) {
  std::string Reply;
  if (!Raw.Request("-data-read-memory-bytes " + bench::Hex(Address) + " " + std::to_string(MemoryChunk), {}, &Reply))
    return false;
  const size_t Contents = Reply.find("contents=\"");
  return Contents != std::string::npos && Reply.find('"', Contents + 10) == Contents + 10 + 2 * MemoryChunk;
}

/// How an adapter's disassemble request went.
enum class TDisassembled { Done, Unknown, Failed };

/// Last receives the address of the last instruction listed.
TDisassembled AdapterDisassemble(TDapClient& Client, UInt64 Address, UInt64& Last) {
  const nlohmann::json Reply = Client.Response(Client.Send(
      "disassemble", {{"memoryReference", bench::Hex(Address)}, {"instructionOffset", 0},
                      {"instructionCount", DisassembledInstructions}, {"resolveSymbols", true}}));
  if (Reply.is_null())
    return TDisassembled::Failed;
  if (!Reply.value("success", false))
    return Reply.value("message", "").find("does not know the request") != std::string::npos ? TDisassembled::Unknown
                                                                                            : TDisassembled::Failed;
  const nlohmann::json& Instructions = Reply["body"]["instructions"];
  if (!Instructions.is_array() || Instructions.size() != DisassembledInstructions ||
      std::strtoull(Instructions.front().value("address", "").c_str(), nullptr, 0) != Address)
    return TDisassembled::Failed;
  Last = std::strtoull(Instructions.back().value("address", "").c_str(), nullptr, 0);
  return TDisassembled::Done;
}

/// The MI the adapter's disassemble costs: source and opcodes for 6 bytes
/// per instruction wanted, and again from where the reply ended while
/// fewer came back. Last receives the address of the last instruction
/// wanted.
bool RawDisassemble(bench::TRawGdbPipes& Raw, UInt64 Address, UInt64& Last) {
  UInt64 Next = Address;
  for (int Decoded = 0; Decoded < DisassembledInstructions;) {
    const UInt64 Wanted = static_cast<UInt64>(DisassembledInstructions - Decoded);
    std::string Reply;
    if (!Raw.Request("-data-disassemble -s " + bench::Hex(Next) + " -e " +
                         bench::Hex(Next + Wanted * BytesPerInstruction) + " -- 5",
                     {}, &Reply))
      return false;
    size_t LastAt = std::string::npos;
    int Count = 0;
    for (size_t At = Reply.find("address=\""); At != std::string::npos; At = Reply.find("address=\"", At + 1)) {
      LastAt = At;
      if (Decoded + Count++ == DisassembledInstructions - 1)
        Last = std::strtoull(Reply.c_str() + At + 9, nullptr, 16);
    }
    if (Count == 0)
      return false;
    const size_t Opcodes = Reply.find("opcodes=\"", LastAt) + 9;
    const size_t OpcodesEnd = Reply.find('"', Opcodes);
    Next = std::strtoull(Reply.c_str() + LastAt + 9, nullptr, 16) + (OpcodesEnd - Opcodes + 1) / 3;
    Decoded += Count;
  }
  return true;
}

double Median(std::vector<double> Values) {
  std::sort(Values.begin(), Values.end());
  return Values[Values.size() / 2];
}

int Run() {
  SetMainThread();
  const std::string Program = BuildSteppedProgram();
  if (Program.empty()) {
    std::fprintf(stderr, "dap_bench: cannot build the stepped program\n");
    return 1;
  }
  // (a) Start-up, interleaved.
  std::vector<double> AdapterStart, RawStart;
  for (int Round = 0; Round < Rounds; ++Round) {
    TClock::time_point Begin = TClock::now();
    {
      TDapClient Client;
      int ThreadId = 0;
      if (!AdapterToMain(Client, Program, ThreadId)) {
        std::fprintf(stderr, "dap_bench: the adapter did not stop at main\n");
        return 1;
      }
      AdapterStart.push_back(TMilliseconds(TClock::now() - Begin).count());
    }
    Begin = TClock::now();
    {
      bench::TRawGdbPipes Raw;
      if (!RawToMain(Raw, Program)) {
        std::fprintf(stderr, "dap_bench: GDB did not stop at main\n");
        return 1;
      }
      RawStart.push_back(TMilliseconds(TClock::now() - Begin).count());
    }
  }

  // (b) Steps, both sessions stopped in the loop 20 frames deep.
  TDapClient Client;
  bench::TRawGdbPipes Raw;
  int ThreadId = 0;
  if (!AdapterToMain(Client, Program, ThreadId) || !RawToMain(Raw, Program) || !Raw.Request("-break-insert -t spin") ||
      !Raw.Request("-exec-continue", "*stopped")) {
    std::fprintf(stderr, "dap_bench: cannot reach the loop\n");
    return 1;
  }
  for (int Step = 0; Step < 40; ++Step) {
    Client.Send("stepIn", {{"threadId", ThreadId}});
    Client.Event("stopped");
    const nlohmann::json Trace = Client.Response(Client.Send("stackTrace", {{"threadId", ThreadId}, {"levels", 1}}));
    if (Trace["body"]["stackFrames"][0].value("name", "").starts_with("spin"))
      break;
  }
  std::vector<double> AdapterSteps, RawSteps;
  for (int Round = 0; Round < Rounds; ++Round) {
    TClock::duration AdapterTime{}, RawTime{};
    for (int Step = 0; Step < StepsPerRound; ++Step) {
      TClock::time_point Begin = TClock::now();
      Client.Send("next", {{"threadId", ThreadId}});
      Client.Event("stopped");
      const nlohmann::json Trace =
          Client.Response(Client.Send("stackTrace", {{"threadId", ThreadId}, {"startFrame", 0}, {"levels", TraceLevels}}));
      if (Trace.is_null() || Trace["body"]["stackFrames"].size() != TraceLevels) {
        std::fprintf(stderr, "dap_bench: a stack trace came short\n");
        return 1;
      }
      AdapterTime += TClock::now() - Begin;
      Begin = TClock::now();
      // The same MI the adapter's step and stack trace cost, as the
      // debugger's log shows.
      if (!Raw.Request("-exec-next", "*stopped") || !Raw.Request("-interpreter-exec console \"show language\"") ||
          !Raw.Request("-thread-info") || !Raw.Request("-stack-info-depth 50001") ||
          !Raw.Request("-stack-list-frames 0 31") || !Raw.Request("-stack-list-arguments 1 0 31")) {
        std::fprintf(stderr, "dap_bench: GDB did not step\n");
        return 1;
      }
      RawTime += TClock::now() - Begin;
    }
    AdapterSteps.push_back(TMilliseconds(AdapterTime).count());
    RawSteps.push_back(TMilliseconds(RawTime).count());
  }

  // (c) The array, evaluated then read page by page, both sessions stopped
  // in the loop.
  std::vector<double> AdapterPages, RawPages;
  int RawVar = 0;
  for (int Round = 0; Round < Rounds; ++Round) {
    TClock::time_point Begin = TClock::now();
    const nlohmann::json Value =
        Client.Response(Client.Send("evaluate", {{"expression", "numbers"}, {"context", "watch"}}));
    const int Reference = Value["body"].value("variablesReference", 0);
    for (int Start = 0; Start < ArraySize; Start += PageSize) {
      const nlohmann::json Page = Client.Response(
          Client.Send("variables", {{"variablesReference", Reference}, {"start", Start}, {"count", PageSize}}));
      if (Page.is_null() || Page["body"]["variables"].size() != PageSize) {
        std::fprintf(stderr, "dap_bench: a page of the array came short\n");
        return 1;
      }
    }
    AdapterPages.push_back(TMilliseconds(TClock::now() - Begin).count());
    Begin = TClock::now();
    // The same MI the adapter's evaluation and pages cost, as the
    // debugger's log shows: a value, an inspector, then per page a slice
    // and each element's value, attributes and path.
    const std::string Value1 = "raw" + std::to_string(++RawVar), Value2 = "raw" + std::to_string(++RawVar);
    bool Done = Raw.Request("-var-create " + Value1 + " * \"numbers\"") &&
                Raw.Request("-var-show-attributes \"" + Value1 + "\"") &&
                Raw.Request("-var-create " + Value2 + " * \"numbers\"") &&
                Raw.Request("-var-show-attributes \"" + Value2 + "\"") &&
                Raw.Request("-var-info-path-expression \"" + Value2 + "\"");
    for (int Start = 0; Done && Start < ArraySize; Start += PageSize) {
      const std::string Slice = "raw" + std::to_string(++RawVar);
      Done = Raw.Request("-var-create " + Slice + " * \"(numbers)[" + std::to_string(Start) + "]@" +
                         std::to_string(PageSize) + "\"") &&
             Raw.Request("-var-show-attributes \"" + Slice + "\"") &&
             Raw.Request("-var-list-children \"" + Slice + "\"");
      for (int Index = 0; Done && Index < PageSize; ++Index) {
        const std::string Child = "\"" + Slice + "." + std::to_string(Index) + "\"";
        Done = Raw.Request("-var-evaluate-expression " + Child) && Raw.Request("-var-show-attributes " + Child) &&
               Raw.Request("-var-info-path-expression " + Child);
      }
    }
    if (!Done) {
      std::fprintf(stderr, "dap_bench: GDB did not read the array\n");
      return 1;
    }
    RawPages.push_back(TMilliseconds(TClock::now() - Begin).count());
  }

  // (d) 64 KiB of the array, a 4 KiB read at a time.
  const UInt64 AdapterMemory = AdapterNumber(Client, "(unsigned long)&memory");
  const UInt64 RawMemory = RawNumber(Raw, "(unsigned long)&memory");
  if (AdapterMemory == 0 || RawMemory == 0 || AdapterMemory % MemoryChunk != 0) {
    std::fprintf(stderr, "dap_bench: cannot find the memory to read\n");
    return 1;
  }
  std::vector<double> AdapterReads, RawReads;
  for (int Round = 0; Round < ShortRounds; ++Round) {
    TClock::time_point Begin = TClock::now();
    for (int Chunk = 0; Chunk < MemoryChunks; ++Chunk)
      if (!AdapterRead(Client, AdapterMemory + static_cast<UInt64>(Chunk) * MemoryChunk)) {
        std::fprintf(stderr, "dap_bench: the adapter did not read 4 KiB\n");
        return 1;
      }
    AdapterReads.push_back(TMilliseconds(TClock::now() - Begin).count());
    Begin = TClock::now();
    for (int Chunk = 0; Chunk < MemoryChunks; ++Chunk)
      if (!RawRead(Raw, RawMemory + static_cast<UInt64>(Chunk) * MemoryChunk)) {
        std::fprintf(stderr, "dap_bench: GDB did not read 4 KiB\n");
        return 1;
      }
    RawReads.push_back(TMilliseconds(TClock::now() - Begin).count());
  }

  // (e) 200 instructions from the start of the long function; skipped by an
  // adapter that does not serve disassembly yet.
  const UInt64 AdapterMix = AdapterNumber(Client, "(unsigned long)&mix");
  const UInt64 RawMix = RawNumber(Raw, "(unsigned long)&mix");
  if (AdapterMix == 0 || RawMix == 0) {
    std::fprintf(stderr, "dap_bench: cannot find the function to disassemble\n");
    return 1;
  }
  std::vector<double> AdapterListings, RawListings;
  bool Disassembles = true;
  for (int Round = 0; Disassembles && Round < ShortRounds; ++Round) {
    TClock::time_point Begin = TClock::now();
    UInt64 AdapterLast = 0, RawLast = 0;
    const TDisassembled Listing = AdapterDisassemble(Client, AdapterMix, AdapterLast);
    if (Listing == TDisassembled::Failed) {
      std::fprintf(stderr, "dap_bench: the adapter did not disassemble %d instructions\n", DisassembledInstructions);
      return 1;
    }
    Disassembles = Listing == TDisassembled::Done;
    AdapterListings.push_back(TMilliseconds(TClock::now() - Begin).count());
    Begin = TClock::now();
    if (!RawDisassemble(Raw, RawMix, RawLast)) {
      std::fprintf(stderr, "dap_bench: GDB did not disassemble\n");
      return 1;
    }
    RawListings.push_back(TMilliseconds(TClock::now() - Begin).count());
    // Both listings end at the same instruction of the function.
    if (Disassembles && AdapterLast - AdapterMix != RawLast - RawMix) {
      std::fprintf(stderr, "dap_bench: the adapter's listing ends at +%llu, GDB's at +%llu\n",
                   static_cast<unsigned long long>(AdapterLast - AdapterMix),
                   static_cast<unsigned long long>(RawLast - RawMix));
      return 1;
    }
  }
  Client.Response(Client.Send("disconnect"));

  const double A = Median(AdapterStart), AR = Median(RawStart);
  const double B = Median(AdapterSteps), BR = Median(RawSteps);
  const double C = Median(AdapterPages), CR = Median(RawPages);
  std::printf("(a) launch to the stop at main: adapter %.1f ms, GDB over pipes %.1f ms (median of %d)\n", A, AR, Rounds);
  std::printf("(b) %d x (next, stopped, stackTrace of %d frames): adapter %.1f ms, GDB over pipes %.1f ms "
              "(median of %d)\n", StepsPerRound, TraceLevels, B, BR, Rounds);
  std::printf("ratio (a) adapter / GDB = %.3f\n", A / AR);
  std::printf("(c) evaluate and %d pages of %d array elements: adapter %.1f ms, GDB over pipes %.1f ms (median of %d)\n",
              ArraySize / PageSize, PageSize, C, CR, Rounds);
  std::printf("ratio (b) adapter / GDB = %.3f\n", B / BR);
  std::printf("ratio (c) adapter / GDB = %.3f\n", C / CR);
  const double D = Median(AdapterReads), DR = Median(RawReads);
  std::printf("(d) readMemory of %d KiB in %d requests of %d bytes: adapter %.1f ms, GDB over pipes %.1f ms "
              "(median of %d)\n", MemoryChunk * MemoryChunks / 1024, MemoryChunks, MemoryChunk, D, DR, ShortRounds);
  std::printf("ratio (d) adapter / GDB = %.3f\n", D / DR);
  if (!Disassembles) {
    std::printf("(e) disassemble of %d instructions: skipped: the adapter has no disassemble\n",
                DisassembledInstructions);
    return 0;
  }
  const double E = Median(AdapterListings), ER = Median(RawListings);
  std::printf("(e) disassemble of %d instructions: adapter %.1f ms, GDB over pipes %.1f ms (median of %d)\n",
              DisassembledInstructions, E, ER, ShortRounds);
  std::printf("ratio (e) adapter / GDB = %.3f\n", E / ER);
  return 0;
}

} // namespace
} // namespace midebug

int main() { return midebug::Run(); }
