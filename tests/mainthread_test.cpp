// Delivery to the IDE's main thread: order, run-at-once on the main thread,
// queueing from other threads, waking a waiting pump.

#include "midebug.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <thread>
#include <vector>

namespace midebug {
namespace {

using namespace std::chrono_literals;

/// Long enough never to expire on a sound run; a hang shows as a failure.
constexpr auto GenerousWait = 30s;

TEST(MainThreadQueue, TheFirstThreadToPumpBecomesMainAndNoOtherRunsDeliveries) {
  TMainThreadQueue Queue;
  EXPECT_FALSE(Queue.IsMainThread());
  bool Ran = false;
  // Nobody is main yet: even a delivery raised here is queued.
  Queue.Deliver([&] { Ran = true; });
  EXPECT_FALSE(Ran);
  EXPECT_EQ(Queue.ProcessPending(), 1u);
  EXPECT_TRUE(Ran);
  EXPECT_TRUE(Queue.IsMainThread());

  Queue.Post([] {});
  size_t RanElsewhere = 1;
  std::thread Other([&] { RanElsewhere = Queue.ProcessPending() + Queue.WaitAndProcess(0ms); });
  Other.join();
  EXPECT_EQ(RanElsewhere, 0u);
  EXPECT_EQ(Queue.PendingCount(), 1u);
}

TEST(MainThreadQueue, KeepsEachPostingThreadsOrder) {
  TMainThreadQueue Queue;
  Queue.SetMainThread();
  constexpr int Threads = 4;
  constexpr int PerThread = 200;
  std::vector<std::vector<int>> Seen(Threads);
  std::vector<std::thread> Posters;
  for (int Thread = 0; Thread < Threads; ++Thread)
    Posters.emplace_back([&, Thread] {
      for (int Index = 0; Index < PerThread; ++Index)
        Queue.Post([&, Thread, Index] { Seen[Thread].push_back(Index); });
    });
  // Pump while they post, as a host's loop would.
  size_t Ran = 0;
  while (Ran < Threads * PerThread)
    Ran += Queue.WaitAndProcess(GenerousWait);
  for (std::thread& Poster : Posters)
    Poster.join();
  for (const std::vector<int>& ThreadSeen : Seen) {
    ASSERT_EQ(ThreadSeen.size(), static_cast<size_t>(PerThread));
    for (int Index = 0; Index < PerThread; ++Index)
      EXPECT_EQ(ThreadSeen[Index], Index);
  }
}

TEST(MainThreadQueue, ADeliveryMayPostAndThatDeliveryWaitsForTheNextPump) {
  // The queue's lock is free while a delivery runs: posting from it, or
  // from a thread it waits for, does not deadlock.
  TMainThreadQueue Queue;
  Queue.SetMainThread();
  int Runs = 0;
  std::function<void()> Again = [&] {
    ++Runs;
    std::thread Poster([&] { Queue.Post(Again); });
    Poster.join();
  };
  Queue.Post(Again);
  EXPECT_EQ(Queue.ProcessPending(), 1u);
  EXPECT_EQ(Queue.ProcessPending(), 1u);
  EXPECT_EQ(Runs, 2);
  EXPECT_EQ(Queue.PendingCount(), 1u);
}

TEST(MainThreadQueue, AThrowingDeliveryLeavesTheRestQueued) {
  TMainThreadQueue Queue;
  Queue.SetMainThread();
  bool LaterRan = false;
  Queue.Post([] { throw std::runtime_error("listener failed"); });
  Queue.Post([&] { LaterRan = true; });
  EXPECT_THROW(Queue.ProcessPending(), std::runtime_error);
  EXPECT_FALSE(LaterRan);
  EXPECT_EQ(Queue.ProcessPending(), 1u);
  EXPECT_TRUE(LaterRan);
}

} // namespace
} // namespace midebug
