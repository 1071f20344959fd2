// Memory and disassembly: the memory cache's requests and the process's
// memory and disassembly operations.

#include "inspect/gdbmemorycache.h"
#include "process/gdbprocess.h"

#include <algorithm>
#include <cstring>

namespace midebug {

namespace {

/// GDB 13 answers a read that runs past readable memory with one byte more
/// than there is: the first byte of the next page, whatever it then holds.
constexpr UInt64 GDBReadPageSize = 4096;

/// x86 cannot be decoded backwards, and GDB 13 refuses "-n" with a start
/// address: a count is asked for as a range of this many bytes an
/// instruction, then cut to the count.
constexpr UInt64 GDBBytesPerInstruction = 4;

/// A listing asks for a range of this many bytes an instruction, more than
/// compiled x86 code averages, so that one request usually holds the count.
constexpr UInt64 ListingBytesPerInstruction = 6;
/// Instructions asked for in one listing request, which bounds its reply.
constexpr UInt64 ListingBlockCount = 1000;
/// The longest x86 instruction.
constexpr UInt64 LongestInstruction = 15;

/// GDB's instructions-with-opcodes mode: mode 0 gives neither size nor bytes.
constexpr Integer GDBOpcodesMode = 2;
/// GDB's source-and-instructions mode with opcodes, in address order.
constexpr Integer GDBSourceOpcodesMode = 5;
/// LLDB's plain mode gives each instruction's size.
constexpr Integer LLDBInstructionsMode = 0;

/// The instruction text as the CPU view shows it: the debugger's escaped
/// tabs become blanks.
void ShowTabsAsBlanks(TGDBDisassembleDataArray& Data) {
  for (TGDBDisassembleData& Instruction : Data) {
    if (Instruction.AsmData.find("\\t") == std::string::npos)
      continue;
    std::string Shown;
    for (size_t At = 0; At < Instruction.AsmData.size(); ++At) {
      const bool Tab = Instruction.AsmData.compare(At, 2, "\\t") == 0;
      Shown += Tab ? ' ' : Instruction.AsmData[At];
      At += Tab ? 1 : 0;
    }
    Instruction.AsmData = std::move(Shown);
  }
}

} // namespace

Integer TGDBMemoryCache::ReadFromDebugger(UInt64 Address, TDataByteArray& Bytes, Integer Size) {
  TDataReadMemoryResult Result(true);
  if (!FProcess.Requests().Ask(Result, &TGDBCommand::CreateDataReadMemoryCommand, Address, Size, true, Int64{0},
                               dvfDecimal, 1, 1, '\0'))
    return -1;
  Bytes = std::move(Result.FData);
  if (Bytes.size() > static_cast<size_t>(Size))
    Bytes.resize(static_cast<size_t>(Size));
  const UInt64 End = Address + Bytes.size();
  if (!FProcess.IsLLDB() && Bytes.size() > 1 && End % GDBReadPageSize == 1) {
    // The last byte opens a page: kept only when that byte reads on its own.
    TDataReadMemoryResult Last(true);
    if (!FProcess.Requests().Ask(Last, &TGDBCommand::CreateDataReadMemoryCommand, End - 1, 1, true, Int64{0},
                                 dvfDecimal, 1, 1, '\0') ||
        Last.FData.size() != 1)
      Bytes.pop_back();
  }
  return static_cast<Integer>(Bytes.size());
}

Integer TGDBMemoryCache::Read(UInt64 Address, void* Buffer, Integer Size) {
  if (Size < 0 || (Size > 0 && Buffer == nullptr))
    return -1;
  if (Size == 0)
    return 0;
  if (FindMemoryData(Address, Buffer, Size))
    return Size;
  TDataByteArray Bytes;
  const Integer Count = ReadFromDebugger(Address, Bytes, Size);
  if (Count > 0)
    std::memcpy(Buffer, Bytes.data(), static_cast<size_t>(Count));
  return Count;
}

Integer TGDBMemoryCache::Write(UInt64 Address, const void* Buffer, Integer Size) {
  if (Size < 0 || (Size > 0 && Buffer == nullptr))
    return -1;
  if (Size == 0)
    return 0;
  if (!FProcess.Alive() || !FProcess.Suspended())
    return -1;
  const Byte* Bytes = static_cast<const Byte*>(Buffer);
  bool Written;
  if (FProcess.IsLLDB()) {
    TDataWriteMemoryBytesResult Result(Size, true);
    Written = FProcess.Requests().Ask(Result, &TGDBCommand::CreateDataWriteMemoryBytesCommand, Address, Bytes, Size);
  } else {
    TGDBResult Result(ctDataWriteMemoryBytes);
    Written =
        FProcess.Requests().Ask(Result, &TGDBCommand::CreateGDBDataWriteMemoryBytesCommand, Address, Bytes, Size);
  }
  // Even a refused write may have changed a part.
  Invalidate(Address, Size);
  return Written ? Size : -1;
}

std::unique_ptr<TDataDisassembleResult> TGDBMemoryCache::SendDisassemble(UInt64 Start, const std::string& Token,
                                                                         const std::string& Line) {
  auto Result = std::make_unique<TDataDisassembleResult>(false);
  const bool Sent = FProcess.ProcessSyncRequest(Token, Line, *Result);
  if (!Sent || Result->FTimeOut || !Result->FAvailable)
    Result->FError = true;
  FInvalidMemoryAddress = Result->FError ? Start : 0;
  return Result;
}

std::unique_ptr<TDataDisassembleResult> TGDBMemoryCache::DataDisassemble(UInt64 Address, Integer Count) {
  // Under GDB the main program is never reported as a module, so the
  // process's base address is only the first stop's: nothing is refused
  // for lying below it. A failed start is not asked again.
  if (Count <= 0 || Address == FInvalidMemoryAddress) {
    auto Refused = std::make_unique<TDataDisassembleResult>(false);
    Refused->FError = true;
    return Refused;
  }
  std::string Token;
  const UInt64 End = Address + static_cast<UInt64>(Count) * GDBBytesPerInstruction;
  const std::string Line = FProcess.Requests().Build(
      Token, static_cast<std::string (TGDBCommand::*)(std::string&, UInt64, UInt64, Integer)>(
                 &TGDBCommand::CreateDataDisassembleCommand),
      Address, End, GDBOpcodesMode);
  auto Result = SendDisassemble(Address, Token, Line);
  if (Result->FData.size() > static_cast<size_t>(Count))
    Result->FData.resize(static_cast<size_t>(Count));
  return Result;
}

std::unique_ptr<TDataDisassembleResult> TGDBMemoryCache::DataDisassemble(UInt64 StartAddress, UInt64 EndAddress) {
  if (StartAddress < FProcess.GetBaseAddress() || StartAddress == FInvalidMemoryAddress) {
    auto Refused = std::make_unique<TDataDisassembleResult>(false);
    Refused->FError = true;
    return Refused;
  }
  std::string Token;
  const std::string Line = FProcess.Requests().Build(
      Token, static_cast<std::string (TGDBCommand::*)(std::string&, UInt64, UInt64, Integer)>(
                 &TGDBCommand::CreateDataDisassembleCommand),
      StartAddress, EndAddress, LLDBInstructionsMode);
  return SendDisassemble(StartAddress, Token, Line);
}

void TGDBMemoryCache::DisassembleAt(UInt64 Address, Integer& Size, TGDBDisassembleData& Data) {
  if (FindDisassembleData(Address, Data, Size))
    return;
  Size = -1;
  auto Reply = FProcess.IsLLDB() ? DataDisassemble(Address, Address + LLDBBlockBytes)
                                 : DataDisassemble(Address, GDBBlockCount);
  if (Reply->FError || Reply->FData.empty())
    return;
  TGDBDisassembleDataArray Instructions = std::move(Reply->FData);
  ShowTabsAsBlanks(Instructions);
  Data = Instructions.front();
  Size = Data.Size;
  // The bytes up to the last instruction, which the next block starts with.
  const UInt64 First = Instructions.front().Address;
  const UInt64 Last = Instructions.back().Address;
  TDataByteArray Bytes;
  if (Last > First && Last - First <= static_cast<UInt64>(GDBBlockCount) * 16 &&
      ReadFromDebugger(First, Bytes, static_cast<Integer>(Last - First)) != static_cast<Integer>(Last - First))
    Bytes.clear();
  SetDisassembleData(std::move(Instructions), std::move(Bytes));
}

std::unique_ptr<TDataDisassembleResult> TGDBMemoryCache::AskDisassemble(UInt64 Start, UInt64 End) {
  std::string Token;
  const std::string Line = FProcess.Requests().Build(
      Token, static_cast<std::string (TGDBCommand::*)(std::string&, UInt64, UInt64, Integer)>(
                 &TGDBCommand::CreateDataDisassembleCommand),
      Start, End, FProcess.IsLLDB() ? LLDBInstructionsMode : GDBSourceOpcodesMode);
  auto Result = std::make_unique<TDataDisassembleResult>(false);
  if (!FProcess.ProcessSyncRequest(Token, Line, *Result) || Result->FTimeOut || !Result->FAvailable)
    Result->FError = true;
  return Result;
}

TGDBDisassembleDataArray TGDBMemoryCache::Disassemble(UInt64 Address, Integer Count) {
  TGDBDisassembleDataArray Listing;
  UInt64 At = Address;
  while (Count > 0 && Listing.size() < static_cast<size_t>(Count) && FProcess.Alive()) {
    const UInt64 Left = std::min<UInt64>(static_cast<UInt64>(Count) - Listing.size(), ListingBlockCount);
    UInt64 End = At + Left * ListingBytesPerInstruction;
    if (End < At)
      break;
    auto Reply = AskDisassemble(At, End);
    if (Reply->FError) {
      // The range runs into unreadable memory, which fails the whole
      // request: the readable part is asked again, then without its last
      // instruction's worth, which may reach past it.
      TDataByteArray Bytes;
      const Integer Readable = ReadFromDebugger(At, Bytes, static_cast<Integer>(End - At));
      if (Readable <= 0)
        break;
      End = At + static_cast<UInt64>(Readable);
      Reply = AskDisassemble(At, End);
      if (Reply->FError && End - At > LongestInstruction)
        Reply = AskDisassemble(At, End - LongestInstruction);
      if (Reply->FError)
        break;
    }
    // A range that holds no instruction start, or one the debugger reads
    // differently, ends the listing rather than repeating it.
    const size_t Before = Listing.size();
    for (TGDBDisassembleData& Instruction : Reply->FData) {
      if (Instruction.Address < At || Instruction.Size <= 0 || Listing.size() >= static_cast<size_t>(Count))
        continue;
      // Only the first instruction of a source line is told its line.
      if (Instruction.Line == 0 && Listing.size() > Before) {
        Instruction.Line = Listing.back().Line;
        Instruction.Source = Listing.back().Source;
      }
      Listing.push_back(std::move(Instruction));
    }
    if (Listing.size() == Before)
      break;
    At = Listing.back().Address + static_cast<UInt64>(Listing.back().Size);
  }
  ShowTabsAsBlanks(Listing);
  return Listing;
}

// --- The process's operations ------------------------------------------------

Integer TGDBProcess::GetMemory(UInt64 Address, void* Buffer, Integer Size) {
  return FMemory->Read(Address, Buffer, Size);
}

Integer TGDBProcess::SetMemory(UInt64 Address, const void* Buffer, Integer Size) {
  return FMemory->Write(Address, Buffer, Size);
}

TIntfPtr<IGDBDisassemble> TGDBProcess::GetDisassembler() { return FMemory->Disassembler(); }

void TGDBProcess::DisassembleAt(UInt64 Address, Integer& Size, std::string& Text) {
  TGDBDisassembleData Data;
  FMemory->DisassembleAt(Address, Size, Data);
  Text = Size != -1 ? Data.AsmData : std::string();
}

TGDBDisassembleDataArray TGDBProcess::Disassemble(UInt64 Address, Integer Count) {
  return FMemory->Disassemble(Address, Count);
}

UInt64 TGDBProcess::GetFunctionStart(UInt64 Address) {
  TGDBDisassembleData Data;
  Integer Size = -1;
  FMemory->DisassembleAt(Address, Size, Data);
  if (Size == -1 || Data.FunctionOffset < 0 || Address - Data.Address >= static_cast<UInt64>(std::max(Size, 1)))
    return 0;
  return Data.Address - static_cast<UInt64>(Data.FunctionOffset);
}

} // namespace midebug
