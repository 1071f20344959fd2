#include "inspect/gdbmemorycache.h"

#include "inspect/gdbdisassemble.h"

#include <cstring>

namespace midebug {

TGDBMemoryCache::TGDBMemoryCache(TGDBProcess& Process) : FProcess(Process) {}

TGDBMemoryCache::~TGDBMemoryCache() {
  std::lock_guard Guard(FCursorLock);
  if (FDisassembler)
    FDisassembler->Detach();
}

void TGDBMemoryCache::Clear() {
  {
    std::lock_guard Guard(FLock);
    FDisassembleDataCache.clear();
    FMemoryDataCache.clear();
  }
  FInvalidMemoryAddress = 0;
  TIntfPtr<TGDBDisassemble> Cursor;
  {
    std::lock_guard Guard(FCursorLock);
    Cursor = FDisassembler;
  }
  if (Cursor)
    Cursor->ClearCache();
}

bool TGDBMemoryCache::FindDisassembleData(UInt64 Address, TGDBDisassembleData& Data, Integer& Size) {
  std::lock_guard Guard(FLock);
  for (size_t Index = 0; Index < FDisassembleDataCache.size(); ++Index) {
    const TGDBDisassembleData& Instruction = FDisassembleDataCache[Index];
    if (Instruction.Address == Address) {
      Data = Instruction;
      Size = Instruction.Size;
      return true;
    }
    if (Instruction.Address < Address)
      continue;
    if (Index == 0)
      return false;
    // Address lies inside the instruction before, unless the two are apart:
    // answering with an instruction that ends before Address would send a
    // cursor back to where it came from.
    const TGDBDisassembleData& Before = FDisassembleDataCache[Index - 1];
    if (Address - Before.Address >= static_cast<UInt64>(std::max(Before.Size, 0)))
      return false;
    Data = Before;
    Size = Before.Size;
    return true;
  }
  return false;
}

bool TGDBMemoryCache::FindMemoryData(UInt64 Address, void* Buffer, Integer Size) {
  std::lock_guard Guard(FLock);
  if (FMemoryDataCache.empty() || FDisassembleDataCache.empty() || Size < 0)
    return false;
  const UInt64 Offset = Address - FDisassembleDataCache.front().Address;
  const Int64 Spare = static_cast<Int64>(FMemoryDataCache.size()) - Size;
  if (Spare < 0 || Offset > static_cast<UInt64>(Spare))
    return false;
  if (Size > 0)
    std::memcpy(Buffer, FMemoryDataCache.data() + Offset, static_cast<size_t>(Size));
  return true;
}

void TGDBMemoryCache::SetDisassembleData(TGDBDisassembleDataArray Data, TDataByteArray Bytes) {
  std::lock_guard Guard(FLock);
  FDisassembleDataCache = std::move(Data);
  FMemoryDataCache = std::move(Bytes);
}

void TGDBMemoryCache::Invalidate(UInt64 Address, Integer Size) {
  std::lock_guard Guard(FLock);
  if (FDisassembleDataCache.empty() || Size <= 0)
    return;
  const UInt64 Start = FDisassembleDataCache.front().Address;
  const UInt64 End = FDisassembleDataCache.back().Address +
                     static_cast<UInt64>(std::max(FDisassembleDataCache.back().Size, 0));
  if (Address >= End || Address + static_cast<UInt64>(Size) <= Start)
    return;
  FDisassembleDataCache.clear();
  FMemoryDataCache.clear();
}

TIntfPtr<IGDBDisassemble> TGDBMemoryCache::Disassembler() {
  std::lock_guard Guard(FCursorLock);
  if (!FDisassembler)
    FDisassembler = TIntfPtr<TGDBDisassemble>(new TGDBDisassemble(this));
  return FDisassembler;
}

} // namespace midebug
