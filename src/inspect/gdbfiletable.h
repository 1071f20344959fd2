#pragma once
/// \file
/// The source file names of one process and their 1-based indexes.

#include "platform/types.h"

#include <mutex>
#include <string>
#include <unordered_map>

namespace midebug {

/// Hands out one index per file; 0 means no file. An index, once handed
/// out, is never reused or removed. A file keeps the index however its path
/// is written ("./a.c", "dir/../a.c", the full path): names are compared in
/// a normal form, relative names taken from the directory the process was
/// made in. The name given first is the one kept. FLock is a leaf lock.
class TGDBFileTable {
public:
  TGDBFileTable();

  /// The index of FileName, added when new; 0 for an empty name. Windows:
  /// the target's names are Windows paths, in which "/" is "\".
  Integer AddFileName(const std::string& FileName, bool Windows);
  /// The index of FileName, else of its bare name; 0 when neither is known.
  Integer GetFileIndex(const std::string& FileName, bool Windows);
  /// The name of FileIndex; empty outside 1 to the highest index.
  std::string GetFileName(Integer FileIndex);
  /// Shows FileIndex under FileName from now on; the names it was known by
  /// still find it. False outside 1 to the highest index.
  bool SetFileName(Integer FileIndex, const std::string& FileName);

  /// FileName as the debugger finds it: "." and "dir/.." steps taken out.
  static std::string DebuggerName(const std::string& FileName, bool Windows);
  /// The name after the last separator (also ":" on Windows targets).
  static std::string BareName(const std::string& FileName, bool Windows);

private:
  /// The form names are compared in.
  std::string Key(const std::string& FileName, bool Windows) const;

  const std::string FBaseDirectory;
  std::mutex FLock;
  /// The highest index handed out.
  Integer FFileNameIndex = 0;
  /// The name of index i at position i - 1.
  TStringArray FFileNameArray;
  std::unordered_map<std::string, Integer> FFileNameList;
};

} // namespace midebug
