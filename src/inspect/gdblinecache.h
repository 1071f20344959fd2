#pragma once
/// \file
/// The caches between source lines and code addresses of one process.

#include "platform/types.h"

#include <atomic>
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
/// request to the debugger. A request's answer is kept only when nothing
/// was forgotten while it was asked: each cache counts its resets, and a
/// fill names the count it began under.
class TGDBLineCache {
public:
  /// The program ran on: the line an address was in may have moved.
  void ForgetInfoLine();
  /// A module came or went: the addresses of the cached file's lines may
  /// have changed.
  void ForgetLineAddresses();

  UInt64 InfoLineEpoch() const { return FInfoLineEpoch; }
  UInt64 LineAddressEpoch() const { return FLineAddressEpoch; }

  /// The cached line when Address lies in its range.
  bool FindInfoLine(UInt64 Address, TInfoLine& Line);
  void SetInfoLine(const TInfoLine& Line, UInt64 Epoch);
  /// Caches the lines of FileIndex: each line gets the addresses listed for
  /// it, in the order given.
  void SetLineAddress(Integer FileIndex, const TIntegerArray& Lines, const TAddressArray& Addresses, UInt64 Epoch);
  /// The addresses of Line when FileIndex is the cached file (empty for a
  /// line without code); false for another file.
  bool FindLineAddress(Integer FileIndex, Integer Line, TAddressArray& Addresses);

  /// GDB has been told to name files by their full paths.
  std::atomic<bool> FFullFileNames{false};

private:
  std::mutex FLock;
  TInfoLine FInfoLineCache;
  /// The file index whose lines are cached; 0 for none.
  Integer FFileLineAddressIndexCache = 0;
  std::map<Integer, TAddressArray> FFileLineAddressCache;
  std::atomic<UInt64> FInfoLineEpoch{0};
  std::atomic<UInt64> FLineAddressEpoch{0};
};

} // namespace midebug
