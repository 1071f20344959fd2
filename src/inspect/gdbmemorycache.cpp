#include "inspect/gdbmemorycache.h"

namespace midebug {

void TGDBMemoryCache::Clear() {
  std::lock_guard Guard(FLock);
  FDisassembleDataCache.clear();
  FMemoryDataCache.clear();
}

} // namespace midebug
