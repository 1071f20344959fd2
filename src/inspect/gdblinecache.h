#pragma once
/// \file
/// The caches between source lines and code addresses of one process.

#include "platform/types.h"

#include <map>
#include <mutex>

namespace midebug {

/// One line's code range, as the debugger answered an address.
struct TInfoLine {
  UInt64 StartAddr = 0;
  /// The end of the range, exclusive.
  UInt64 EndAddr = 0;
  Integer Size = 0;
  Integer Line = 0;
  Integer FileIndex = 0;
};

/// The last line an address was looked up in, and the code addresses of the
/// lines of one file. FLock guards both and is a leaf, never held during a
/// request to the debugger.
class TGDBLineCache {
public:
  /// The program ran on: the line an address was in may have moved.
  void ForgetInfoLine();
  /// A module came or went: the addresses of the cached file's lines may
  /// have changed.
  void ForgetLineAddresses();

private:
  std::mutex FLock;
  TInfoLine FInfoLineCache;
  /// The file index whose lines are cached; 0 for none.
  Integer FFileLineAddressIndexCache = 0;
  std::map<Integer, TAddressArray> FFileLineAddressCache;
};

} // namespace midebug
