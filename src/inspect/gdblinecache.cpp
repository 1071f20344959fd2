#include "inspect/gdblinecache.h"

namespace midebug {

void TGDBLineCache::ForgetInfoLine() {
  std::lock_guard Guard(FLock);
  FInfoLineCache = TInfoLine();
}

void TGDBLineCache::ForgetLineAddresses() {
  std::lock_guard Guard(FLock);
  FFileLineAddressIndexCache = 0;
  FFileLineAddressCache.clear();
}

} // namespace midebug
