#pragma once
/// \file
/// Delivery of work to the IDE's main thread. The host designates its main
/// thread and pumps the queue from its loop; everything the library reports
/// to the IDE arrives there, in the order it was raised.

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>

namespace midebug {

/// A queue of deliveries for one main thread. Any thread may post; only the
/// main thread runs deliveries.
///
/// FLock guards the queue and nothing else. It is a leaf lock: no other lock
/// is taken while it is held, and it is never held while a delivery runs, so
/// a delivery may post, deliver or take any lock of its own.
class TMainThreadQueue {
public:
  /// Makes the calling thread the main thread.
  void SetMainThread();
  /// True on the designated main thread (false while none is designated).
  bool IsMainThread() const;

  /// Queues Delivery; it runs at the main thread's next pump.
  void Post(std::function<void()> Delivery);
  /// Runs Delivery at once when called on the main thread, else queues it.
  void Deliver(std::function<void()> Delivery);

  /// Runs, in order, the deliveries queued when it was called; those queued
  /// meanwhile wait for the next pump. The first thread to pump becomes the
  /// main thread when none was designated; on any other thread nothing runs.
  /// Returns the number run. Should a delivery throw, the ones after it stay
  /// queued and the exception passes to the caller.
  size_t ProcessPending();
  /// Waits up to Timeout for at least one delivery, then runs what is
  /// queued as ProcessPending does. Returns the number run (0 when the time
  /// passed, or when called off the main thread).
  size_t WaitAndProcess(std::chrono::milliseconds Timeout);

  /// Number of deliveries waiting.
  size_t PendingCount() const;

private:
  /// Designates the caller when no main thread is known; true when the
  /// caller is the main thread.
  bool ClaimMainThread();
  bool PopFront(std::function<void()>& Delivery);

  std::atomic<std::thread::id> FMainThread{};
  mutable std::mutex FLock;
  std::condition_variable FPosted;
  std::deque<std::function<void()>> FQueue;
};

/// The process-wide queue the library delivers to the IDE through.
TMainThreadQueue& MainThreadQueue();

/// The process-wide queue's operations, for the host's loop and the library.
void SetMainThread();
bool IsMainThread();
void Post(std::function<void()> Delivery);
void Deliver(std::function<void()> Delivery);
size_t ProcessPending();
size_t WaitAndProcess(std::chrono::milliseconds Timeout);

} // namespace midebug
