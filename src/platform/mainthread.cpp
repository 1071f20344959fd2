#include "platform/mainthread.h"

#include <utility>

namespace midebug {

void TMainThreadQueue::SetMainThread() { FMainThread = std::this_thread::get_id(); }

bool TMainThreadQueue::IsMainThread() const { return FMainThread.load() == std::this_thread::get_id(); }

bool TMainThreadQueue::ClaimMainThread() {
  std::thread::id Expected{};
  FMainThread.compare_exchange_strong(Expected, std::this_thread::get_id());
  return IsMainThread();
}

void TMainThreadQueue::Post(std::function<void()> Delivery) {
  {
    std::lock_guard Guard(FLock);
    FQueue.push_back(std::move(Delivery));
  }
  FPosted.notify_all();
}

void TMainThreadQueue::Deliver(std::function<void()> Delivery) {
  if (IsMainThread())
    Delivery();
  else
    Post(std::move(Delivery));
}

bool TMainThreadQueue::PopFront(std::function<void()>& Delivery) {
  std::lock_guard Guard(FLock);
  if (FQueue.empty())
    return false;
  Delivery = std::move(FQueue.front());
  FQueue.pop_front();
  return true;
}

size_t TMainThreadQueue::ProcessPending() {
  if (!ClaimMainThread())
    return 0;
  // Only what is queued now: a delivery that posts again must not keep this
  // pump going for ever.
  size_t Due = PendingCount();
  size_t Ran = 0;
  std::function<void()> Delivery;
  // One at a time, so that the lock is free while a delivery runs and a
  // throwing delivery leaves the rest in the queue.
  while (Ran < Due && PopFront(Delivery)) {
    ++Ran;
    std::exchange(Delivery, nullptr)();
  }
  return Ran;
}

size_t TMainThreadQueue::WaitAndProcess(std::chrono::milliseconds Timeout) {
  if (!ClaimMainThread())
    return 0;
  {
    std::unique_lock Guard(FLock);
    if (!FPosted.wait_for(Guard, Timeout, [this] { return !FQueue.empty(); }))
      return 0;
  }
  return ProcessPending();
}

size_t TMainThreadQueue::PendingCount() const {
  std::lock_guard Guard(FLock);
  return FQueue.size();
}

TMainThreadQueue& MainThreadQueue() {
  static TMainThreadQueue Queue;
  return Queue;
}

void SetMainThread() { MainThreadQueue().SetMainThread(); }
bool IsMainThread() { return MainThreadQueue().IsMainThread(); }
void Post(std::function<void()> Delivery) { MainThreadQueue().Post(std::move(Delivery)); }
void Deliver(std::function<void()> Delivery) { MainThreadQueue().Deliver(std::move(Delivery)); }
size_t ProcessPending() { return MainThreadQueue().ProcessPending(); }
size_t WaitAndProcess(std::chrono::milliseconds Timeout) { return MainThreadQueue().WaitAndProcess(Timeout); }

} // namespace midebug
