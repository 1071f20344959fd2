#include "process/programterminal.h"

#include "platform/hostthread.h"
#include "platform/textencoding.h"

namespace midebug {

namespace {

/// The most one read takes from the terminal.
constexpr size_t ReadChunkBytes = 64 * 1024;
/// The most one drain reads: a program stopped cannot fill the terminal
/// faster than it is drained, one that runs on could keep a drain for ever.
constexpr size_t MaxDrainBytes = 4 * 1024 * 1024;

} // namespace

bool TProgramTerminal::Open(std::string& Error) {
  if (FOpen)
    return true;
  if (!FTerminal.Open(Error))
    return false;
  FStopping = false;
  FReadBuffer.resize(ReadChunkBytes);
  FReader = std::thread([this] { ReaderExecute(); });
  FOpen = true;
  return true;
}

void TProgramTerminal::Close() {
  FStopping = true;
  {
    // Taken so that a reader between its test and its wait is woken.
    std::lock_guard Guard(FLock);
  }
  FDelivered.notify_all();
  FTerminal.Wake();
  if (FReader.joinable())
    FReader.join();
  FOpen = false;
  FTerminal.Close();
}

Int64 TProgramTerminal::ReadOnce() {
  const Int64 Count = FTerminal.Read(FReadBuffer.data(), FReadBuffer.size());
  if (Count <= 0)
    return Count;
  std::string Bytes = std::move(FHeldBytes);
  Bytes.append(FReadBuffer.data(), static_cast<size_t>(Count));
  const size_t Complete = CompleteUTF8Length(Bytes);
  FHeldBytes.assign(Bytes, Complete);
  Bytes.resize(Complete);
  FPending += DecodeUTF8OrAnsi(Bytes);
  return Count;
}

bool TProgramTerminal::NeedsDelivery() {
  if (FPending.empty() || FDeliveryQueued)
    return false;
  FDeliveryQueued = true;
  return true;
}

void TProgramTerminal::ReaderExecute() {
  SetCurrentThreadName("Terminal");
  while (!FStopping) {
    {
      std::unique_lock Guard(FLock);
      FDelivered.wait(Guard, [this] { return FStopping || FPending.size() < MaxPendingBytes; });
    }
    if (FStopping || !FTerminal.WaitForOutput(-1))
      continue;
    Int64 Count = 0;
    bool Queue = false;
    {
      std::lock_guard Guard(FLock);
      Count = ReadOnce();
      Queue = NeedsDelivery();
    }
    if (Queue)
      FDefer([this] { DeliverPending(); });
    // A terminal that failed tells nothing more; the drains find it empty.
    if (Count < 0)
      return;
  }
}

void TProgramTerminal::Drain(bool Final) {
  if (!FOpen)
    return;
  {
    std::lock_guard Guard(FLock);
    size_t Drained = 0;
    for (Int64 Count = 0; Drained < MaxDrainBytes && (Count = ReadOnce()) > 0;)
      Drained += static_cast<size_t>(Count);
    if (Final) {
      FPending += DecodeUTF8OrAnsi(FHeldBytes);
      FHeldBytes.clear();
    }
    if (FPending.empty())
      return;
    // Queued even when the reader has queued a delivery: on the main thread
    // this one runs at once, the reader's only after the caller's stop.
    FDeliveryQueued = true;
  }
  FDefer([this] { DeliverPending(); });
}

void TProgramTerminal::DeliverPending() {
  std::string Text;
  {
    std::lock_guard Guard(FLock);
    Text.swap(FPending);
    FDeliveryQueued = false;
  }
  FDelivered.notify_all();
  if (!Text.empty())
    FTell(Text);
}

} // namespace midebug
