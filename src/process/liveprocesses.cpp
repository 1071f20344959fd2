#include "process/liveprocesses.h"

#include <unordered_map>

namespace midebug {

namespace {

struct TLiveProcessTable {
  std::recursive_mutex Lock;
  std::unordered_map<TGDBProcess*, uint64_t> Serials;
  uint64_t LastSerial = 0;
};

TLiveProcessTable& Table() {
  // Never destroyed: deliveries may still check it while the host exits.
  static auto* Instance = new TLiveProcessTable;
  return *Instance;
}

} // namespace

std::recursive_mutex& LiveProcessesLock() { return Table().Lock; }

TLiveProcessKey AddLiveProcess(TGDBProcess* Process) {
  std::lock_guard Guard(Table().Lock);
  const uint64_t Serial = ++Table().LastSerial;
  Table().Serials[Process] = Serial;
  return TLiveProcessKey{Process, Serial};
}

void RemoveLiveProcess(const TLiveProcessKey& Key) {
  std::lock_guard Guard(Table().Lock);
  const auto Found = Table().Serials.find(Key.Process);
  if (Found != Table().Serials.end() && Found->second == Key.Serial)
    Table().Serials.erase(Found);
}

bool IsLiveProcess(const TLiveProcessKey& Key) {
  const auto Found = Table().Serials.find(Key.Process);
  return Found != Table().Serials.end() && Found->second == Key.Serial;
}

size_t LiveProcessCount() {
  std::lock_guard Guard(Table().Lock);
  return Table().Serials.size();
}

} // namespace midebug
