// Parser throughput on large realistic reply blocks, beside a plain scan of
// the same bytes for line ends.

#include "benchsupport.h"
#include "mi/gdboutput.h"
#include "midebug.h"
#include "nullprocess.h"

#include <benchmark/benchmark.h>

#include <cstring>
#include <map>
#include <memory>
#include <string>

namespace midebug {
namespace {

constexpr const char* FramesToken = "0320000000001";
constexpr const char* ArgumentsToken = "0310000000002";
constexpr const char* ChildrenToken = "0400000000003";

std::string StackFramesReply(int Count) {
  std::string Reply = std::string(FramesToken) + "^done,stack=[";
  for (int Level = 0; Level < Count; ++Level) {
    if (Level > 0)
      Reply += ",";
    Reply += "frame={level=\"" + std::to_string(Level) + "\",addr=\"0x00005555555551" + std::to_string(40 + Level % 50) +
             "\",func=\"recurse\",file=\"recurse.c\",fullname=\"/home/user/src/recurse.c\",line=\"" +
             std::to_string(10 + Level % 7) + "\",arch=\"i386:x86-64\"}";
  }
  return Reply + "]\n";
}

std::string StackArgumentsReply(int Count) {
  std::string Reply = std::string(ArgumentsToken) + "^done,stack-args=[";
  for (int Level = 0; Level < Count; ++Level) {
    if (Level > 0)
      Reply += ",";
    Reply += "frame={level=\"" + std::to_string(Level) + "\",args=[{name=\"depth\",value=\"" + std::to_string(Level) +
             "\"},{name=\"name\",value=\"0x5555555592a0 \\\"node\\\"\"}]}";
  }
  return Reply + "]\n";
}

std::string ChildrenReply() {
  std::string Reply = std::string(ChildrenToken) + "^done,numchild=\"5000\",children=[";
  for (int Index = 0; Index < 5000; ++Index) {
    if (Index > 0)
      Reply += ",";
    const std::string Number = std::to_string(Index);
    Reply += "child={name=\"var1." + Number + "\",exp=\"" + Number + "\",numchild=\"0\",value=\"" +
             std::to_string(Index * 3) + "\",type=\"int\",thread-id=\"1\"}";
  }
  return Reply + "],has_more=\"0\"\n";
}

/// 10 MB of a program's output lines with records among them, one of them
/// glued to a partial line as GDB leaves it.
std::string OutputMixedWithRecords() {
  std::string Block;
  Block.reserve(10 * 1024 * 1024 + 4096);
  int Line = 0;
  while (Block.size() < 10 * 1024 * 1024) {
    Block += "worker " + std::to_string(Line % 8) + ": processed item " + std::to_string(Line) +
             " of the batch, checksum 0x5f3a9c\n";
    if (++Line % 50 == 0)
      Block += "=thread-created,id=\"" + std::to_string(Line % 64) + "\",group-id=\"i1\"\n~\"[New Thread 0x7ffff7d89640 (LWP " +
               std::to_string(1000 + Line) + ")]\\n\"\n";
    if (Line % 997 == 0)
      Block += "partial line=thread-exited,id=\"3\",group-id=\"i1\"\n";
  }
  return Block;
}

/// Counts and ignores what the parser reports; hands out the waiting result
/// of each request the block answers.
class TSinkProcess : public test::TNullInternalProcess {
public:
  std::map<std::string, std::unique_ptr<TGDBResult>> WaitObjects;
  size_t Events = 0;

  void NotifyLogEvent(const TGDBLogEvent&) override { ++Events; }
  void NotifyThreadCreated(Integer, Integer) override { ++Events; }
  void NotifyThreadExited(Integer) override { ++Events; }
  TGDBResult* RemoveWaitObject(const std::string& Key) override {
    const auto Found = WaitObjects.find(Key);
    return Found == WaitObjects.end() ? nullptr : Found->second.get();
  }
};

/// Parses Block again and again, each time with fresh results waiting under
/// the tokens it answers.
void ParseBlock(benchmark::State& State, const std::string& Block) {
  TSinkProcess Process;
  for (auto _ : State) {
    State.PauseTiming();
    Process.WaitObjects[FramesToken] = std::make_unique<TStackListFramesResult>();
    Process.WaitObjects[ArgumentsToken] = std::make_unique<TStackListArgumentsResult>();
    Process.WaitObjects[ChildrenToken] = std::make_unique<TVarListChildrenResult>();
    State.ResumeTiming();
    ProcessGDBOutput(Block, Process);
  }
  State.SetBytesProcessed(static_cast<int64_t>(State.iterations() * Block.size()));
}

void ScanLineEnds(benchmark::State& State, const std::string& Block) {
  for (auto _ : State) {
    size_t Lines = 0;
    for (const char* Next = Block.data(); (Next = static_cast<const char*>(
                                                std::memchr(Next, '\n', Block.data() + Block.size() - Next)));
         ++Next)
      ++Lines;
    benchmark::DoNotOptimize(Lines);
  }
  State.SetBytesProcessed(static_cast<int64_t>(State.iterations() * Block.size()));
}

const std::string& Frames() {
  static const std::string Block = StackFramesReply(512) + StackArgumentsReply(512);
  return Block;
}

/// Eight times the frames: the time per byte must stay the same.
const std::string& ManyFrames() {
  static const std::string Block = StackFramesReply(4096) + StackArgumentsReply(4096);
  return Block;
}
const std::string& Children() {
  static const std::string Block = ChildrenReply();
  return Block;
}
const std::string& Output() {
  static const std::string Block = OutputMixedWithRecords();
  return Block;
}

void BM_ParseStackFrames(benchmark::State& State) { ParseBlock(State, Frames()); }
void BM_ScanStackFrames(benchmark::State& State) { ScanLineEnds(State, Frames()); }
void BM_ParseManyStackFrames(benchmark::State& State) { ParseBlock(State, ManyFrames()); }
void BM_ParseChildren(benchmark::State& State) { ParseBlock(State, Children()); }
void BM_ScanChildren(benchmark::State& State) { ScanLineEnds(State, Children()); }
void BM_ParseProgramOutput(benchmark::State& State) { ParseBlock(State, Output()); }
void BM_ScanProgramOutput(benchmark::State& State) { ScanLineEnds(State, Output()); }

BENCHMARK(BM_ParseStackFrames);
BENCHMARK(BM_ScanStackFrames);
BENCHMARK(BM_ParseManyStackFrames);
BENCHMARK(BM_ParseChildren);
BENCHMARK(BM_ScanChildren);
BENCHMARK(BM_ParseProgramOutput)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_ScanProgramOutput)->Unit(benchmark::kMillisecond);

} // namespace
} // namespace midebug

int main(int argc, char** argv) {
  return midebug::bench::RunAndPrintRatios(argc, argv,
                                           {{"BM_ParseStackFrames", "BM_ScanStackFrames"},
                                            {"BM_ParseManyStackFrames", "BM_ParseStackFrames"},
                                            {"BM_ParseChildren", "BM_ScanChildren"},
                                            {"BM_ParseProgramOutput", "BM_ScanProgramOutput"}});
}
