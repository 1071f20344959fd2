// libFuzzer target: any bytes as a reply block, with a result object of any
// kind waiting under every token the block names.

#include "../nullprocess.h"
#include "mi/gdbcommand.h"
#include "mi/gdboutput.h"
#include "midebug.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace midebug {
namespace {

/// A result object of the class that decodes Command's reply.
std::unique_ptr<TGDBResult> CreateResultFor(TMiCommand Command, uint8_t Flags) {
  const bool Flag = (Flags & 1) != 0;
  switch (Command) {
  case ctBreakInsert: return std::make_unique<TBreakInsertResult>();
  case ctBreakWatch: return std::make_unique<TBreakWatchResult>();
  case ctSymbolListLines: return std::make_unique<TSymbolListLinesResult>(Flag);
  case ctFileListExecSourceFiles: return std::make_unique<TFileListExecSourceFilesResult>();
  case ctThreadListIds: return std::make_unique<TThreadListIdsResult>();
  case ctThreadInfo: return std::make_unique<TThreadInfoResult>(Flag);
  case ctPidInfo: return std::make_unique<TPidInfoResult>();
  case ctTargetInfoAsync: return std::make_unique<TTargetInfoAsyncResult>();
  case ctThreadSelect: return std::make_unique<TThreadSelectResult>(1);
  case ctStackInfoDepth: return std::make_unique<TStackInfoDepthResult>();
  case ctStackInfoFrame: return std::make_unique<TStackInfoFrameResult>();
  case ctStackListFrames: return std::make_unique<TStackListFramesResult>();
  case ctStackListArguments: return std::make_unique<TStackListArgumentsResult>();
  case ctStackListLocals: return std::make_unique<TStackListLocalsResult>();
  case ctCLInfoLineAddress: return std::make_unique<TCLInfoLineAddressResult>("Main.c", 12);
  case ctCLKill: return std::make_unique<TCLKillResult>();
  case ctDataInfoLine: return std::make_unique<TDataInfoLineResult>();
  case ctVarCreate: return std::make_unique<TVarCreateResult>();
  case ctVarEvaluateExpression: return std::make_unique<TVarEvaluateExpressionResult>();
  case ctVarShowAttributes: return std::make_unique<TVarShowAttributesResult>();
  case ctVarAssign: return std::make_unique<TVarAssignResult>();
  case ctVarInfoNumChildren: return std::make_unique<TVarInfoNumChildrenResult>();
  case ctVarListChildren: return std::make_unique<TVarListChildrenResult>();
  case ctVarInfoPathExpression: return std::make_unique<TVarInfoPathExpressionResult>();
  case ctVarUpdate: return std::make_unique<TVarUpdateResult>();
  case ctDataReadMemory: return std::make_unique<TDataReadMemoryResult>(false);
  case ctDataReadMemoryBytes: return std::make_unique<TDataReadMemoryResult>(true);
  case ctCLMemoryWrite: return std::make_unique<TDataWriteMemoryBytesResult>(4, true);
  case ctDataDisassemble: return std::make_unique<TDataDisassembleResult>(Flag);
  case ctDataListRegisterValues:
    return Flag ? std::make_unique<TDataListRegisterValuesResult>(TIntegerArray{0, 1, 2, 25})
                : std::make_unique<TDataListRegisterValuesResult>(1, (Flags & 2) != 0);
  case ctDataListXMMRegisterValues:
    return Flag ? std::make_unique<TDataListXMMRegisterValuesResult>(TIntegerArray{40, 41})
                : std::make_unique<TDataListXMMRegisterValuesResult>(40);
  case ctDataListFPURegisterValues:
    return Flag ? std::make_unique<TDataListFPURegisterValuesResult>(TIntegerArray{24, 25})
                : std::make_unique<TDataListFPURegisterValuesResult>(24);
  case ctDataListRegisterNames: return std::make_unique<TDataListRegisterNamesResult>(gcAMD64, "Linux64");
  case ctDataEvaluateExpression: return std::make_unique<TDataEvaluateExpressionResult>();
  case ctGdbShow: return std::make_unique<TGdbShowResult>();
  default: return std::make_unique<TGDBResult>(Command);
  }
}

/// Answers every question the parser asks, and hands out a fresh result
/// object for every key it removes.
class TFuzzProcess : public test::TNullInternalProcess {
public:
  TFuzzProcess(TMiCommand Command, uint8_t Flags) : FCommand(Command), FFlags(Flags) {}

  bool NotifyBreakpointOccurred(Integer, const TGDBLocation&, Integer) override { return (FFlags & 4) != 0; }
  TGDBResult* RemoveWaitObject(const std::string&) override {
    FResults.push_back(CreateResultFor(FCommand, FFlags));
    return FResults.back().get();
  }
  std::string GetEndOfLineMarker() override { return (FFlags & 8) ? "(gdb)\n" : "(gdb) \n"; }
  bool IsLLDB() override { return (FFlags & 8) != 0; }
  bool IsWindows() override { return (FFlags & 16) != 0; }
  bool IsAttachMode() override { return (FFlags & 32) != 0; }
  bool SupportHXConsole() override { return (FFlags & 64) != 0; }
  Integer GetModuleId(const std::string& Name) override { return static_cast<Integer>(Name.size()); }

private:
  TMiCommand FCommand;
  uint8_t FFlags;
  std::vector<std::unique_ptr<TGDBResult>> FResults;
};

} // namespace
} // namespace midebug

/// The first byte chooses the waiting result's command, the second the
/// process's answers; the rest is the reply block.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* Data, size_t Size) {
  using namespace midebug;
  constexpr int CommandCount = ctCLProcessAttach + 1;
  const auto Command = static_cast<TMiCommand>(Size > 0 ? Data[0] % CommandCount : 0);
  const uint8_t Flags = Size > 1 ? Data[1] : 0;
  const size_t Skip = Size > 2 ? 2 : Size;
  TFuzzProcess Process(Command, Flags);
  ProcessGDBOutput(std::string(reinterpret_cast<const char*>(Data) + Skip, Size - Skip), Process);
  return 0;
}
