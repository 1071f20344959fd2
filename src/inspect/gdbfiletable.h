#pragma once
/// \file
/// The source file names of one process and their 1-based indexes.

#include "platform/types.h"

#include <mutex>
#include <string>
#include <unordered_map>

namespace midebug {

/// Hands out one index per file name; 0 means no file. An index, once handed
/// out, is never reused or removed. FLock is a leaf lock.
class TGDBFileTable {
public:
  /// Guards the fields below; the operations that read and fill them come
  /// with the services that need them.
  std::mutex FLock;
  /// The highest index handed out.
  Integer FFileNameIndex = 0;
  /// The name of index i at position i - 1.
  TStringArray FFileNameArray;
  std::unordered_map<std::string, Integer> FFileNameList;
};

} // namespace midebug
