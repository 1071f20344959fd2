#include "inspect/gdblinecache.h"

namespace midebug {

void TGDBLineCache::ForgetInfoLine() {
  std::lock_guard Guard(FLock);
  ++FInfoLineEpoch;
  FInfoLineCache = TInfoLine();
}

void TGDBLineCache::ForgetLineAddresses() {
  std::lock_guard Guard(FLock);
  ++FLineAddressEpoch;
  FFileLineAddressIndexCache = 0;
  FFileLineAddressCache.clear();
}

bool TGDBLineCache::FindInfoLine(UInt64 Address, TInfoLine& Line) {
  std::lock_guard Guard(FLock);
  if (Address < FInfoLineCache.StartAddr || Address >= FInfoLineCache.EndAddr)
    return false;
  Line = FInfoLineCache;
  return true;
}

void TGDBLineCache::SetInfoLine(const TInfoLine& Line, UInt64 Epoch) {
  std::lock_guard Guard(FLock);
  if (Epoch == FInfoLineEpoch)
    FInfoLineCache = Line;
}

void TGDBLineCache::SetLineAddress(Integer FileIndex, const TIntegerArray& Lines, const TAddressArray& Addresses,
                                   UInt64 Epoch) {
  std::lock_guard Guard(FLock);
  if (Epoch != FLineAddressEpoch)
    return;
  FFileLineAddressIndexCache = FileIndex;
  FFileLineAddressCache.clear();
  for (size_t Index = 0; Index < Lines.size() && Index < Addresses.size(); ++Index)
    FFileLineAddressCache[Lines[Index]].push_back(Addresses[Index]);
}

bool TGDBLineCache::FindLineAddress(Integer FileIndex, Integer Line, TAddressArray& Addresses) {
  std::lock_guard Guard(FLock);
  if (FileIndex == 0 || FileIndex != FFileLineAddressIndexCache)
    return false;
  const auto Found = FFileLineAddressCache.find(Line);
  Addresses = Found == FFileLineAddressCache.end() ? TAddressArray() : Found->second;
  return true;
}

} // namespace midebug
