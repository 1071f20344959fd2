#pragma once
/// \file
/// Memory and disassembly of one process: the last disassembly and the
/// memory bytes under it, the requests that fill and bypass them, and the
/// process's disassembly cursor.

#include "mi/gdbresult.h"
#include "process/gdbinterfaces.h"

#include <atomic>
#include <memory>
#include <mutex>

namespace midebug {

class TGDBProcess;
class TGDBDisassemble;

/// Reads inside the last disassembled range are answered from here. FLock
/// guards both caches and is a leaf, held while they are read or replaced,
/// never during a request to the debugger. FCursorLock guards FDisassembler;
/// the cursor's own lock is taken inside it only when the cursor is cut
/// loose, and neither is ever held together with FLock.
class TGDBMemoryCache {
public:
  explicit TGDBMemoryCache(TGDBProcess& Process);
  /// Cuts the cursor loose: an IDE that still holds it gets failures.
  ~TGDBMemoryCache();

  /// The program ran on: nothing cached still holds, and the cursor starts
  /// afresh.
  void Clear();

  /// The cached instruction at Address, or the one containing it.
  bool FindDisassembleData(UInt64 Address, TGDBDisassembleData& Data, Integer& Size);
  /// Size bytes at Address when the cached bytes hold all of them.
  bool FindMemoryData(UInt64 Address, void* Buffer, Integer Size);
  /// Replaces the cache: Data's instructions and Bytes, the memory from the
  /// first instruction up to the last.
  void SetDisassembleData(TGDBDisassembleDataArray Data, TDataByteArray Bytes);
  /// Memory at [Address, Address + Size) changed: a cache that overlaps it
  /// is dropped.
  void Invalidate(UInt64 Address, Integer Size);

  // --- Requests (src/inspect/gdbprocessmemory.cpp) -----------------------
  /// Bytes read (answered from the cache when it holds them all), or -1.
  Integer Read(UInt64 Address, void* Buffer, Integer Size);
  /// Bytes written, or -1 when the debugger refused the write.
  Integer Write(UInt64 Address, const void* Buffer, Integer Size);
  /// The instruction at Address (or containing it) from the cache, else from
  /// a new disassembly that becomes the cache; Size -1 when none decodes.
  void DisassembleAt(UInt64 Address, Integer& Size, TGDBDisassembleData& Data);
  /// Count instructions from Address (GDB), or the instructions that start
  /// in [StartAddress, EndAddress) (LLDB). Failed without a request when the
  /// address is refused.
  std::unique_ptr<TDataDisassembleResult> DataDisassemble(UInt64 Address, Integer Count);
  std::unique_ptr<TDataDisassembleResult> DataDisassemble(UInt64 StartAddress, UInt64 EndAddress);
  /// Up to Count instructions from Address, with source lines (GDB); fewer
  /// where readable memory ends. Bypasses the cache.
  TGDBDisassembleDataArray Disassemble(UInt64 Address, Integer Count);
  /// The process's one cursor, made on first use.
  TIntfPtr<IGDBDisassemble> Disassembler();

  /// Instructions in one disassembly of GDB, and the bytes LLDB is asked
  /// to decode at a time.
  static constexpr Integer GDBBlockCount = 40;
  static constexpr UInt64 LLDBBlockBytes = 160;

private:
  /// Sends the disassembly and records a failure at Start.
  std::unique_ptr<TDataDisassembleResult> SendDisassemble(UInt64 Start, const std::string& Token,
                                                          const std::string& Line);
  /// One listing request over [Start, End), leaving the failure record alone.
  std::unique_ptr<TDataDisassembleResult> AskDisassemble(UInt64 Start, UInt64 End);
  /// Reads memory without the cache; -1 on error.
  Integer ReadFromDebugger(UInt64 Address, TDataByteArray& Bytes, Integer Size);

  TGDBProcess& FProcess;
  std::mutex FLock;
  /// Decoded instructions of the last disassembly, in address order.
  TGDBDisassembleDataArray FDisassembleDataCache;
  /// The bytes from the first cached instruction's address up to the last
  /// one's.
  TDataByteArray FMemoryDataCache;
  /// Start of the last disassembly that failed (0: none); not asked again
  /// until another succeeds or the program runs.
  std::atomic<UInt64> FInvalidMemoryAddress{0};
  std::mutex FCursorLock;
  TIntfPtr<TGDBDisassemble> FDisassembler;
};

} // namespace midebug
