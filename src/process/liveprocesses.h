#pragma once
/// \file
/// The table of live processes. A delivery queued to the main thread checks,
/// under the table's lock, that its process still exists before it touches
/// it, and keeps the lock for the whole delivery.

#include "platform/types.h"

#include <cstdint>
#include <mutex>

namespace midebug {

class TGDBProcess;

/// Identifies one process object for its whole life: a later process at the
/// same address gets another serial number.
struct TLiveProcessKey {
  TGDBProcess* Process = nullptr;
  uint64_t Serial = 0;
};

/// The lock of the table. It is the outermost lock of the system: a delivery
/// holds it while it makes synchronous requests and calls the listener; the
/// output thread never takes it. Recursive, because a delivery made on the
/// main thread runs at once, also inside another delivery.
std::recursive_mutex& LiveProcessesLock();

/// Adds Process and returns its key. Takes the lock.
TLiveProcessKey AddLiveProcess(TGDBProcess* Process);
/// Removes the process of Key. Takes the lock.
void RemoveLiveProcess(const TLiveProcessKey& Key);
/// Whether the process of Key still exists. Call with the lock held.
bool IsLiveProcess(const TLiveProcessKey& Key);
/// Number of live processes. Takes the lock.
size_t LiveProcessCount();

} // namespace midebug
