#pragma once
/// \file
/// The last disassembly of one process and the memory bytes under it.

#include "mi/gdbresult.h"

#include <mutex>

namespace midebug {

/// Reads inside the last disassembled range are answered from here. FLock
/// guards both caches and is a leaf, held while they are read or replaced,
/// never during a request to the debugger.
class TGDBMemoryCache {
public:
  /// The program ran on (or memory was written): nothing cached still holds.
  void Clear();

private:
  std::mutex FLock;
  /// Decoded instructions of the last disassembly, in address order.
  TGDBDisassembleDataArray FDisassembleDataCache;
  /// The bytes from the first cached instruction's address up to the last
  /// one's.
  TDataByteArray FMemoryDataCache;
};

} // namespace midebug
