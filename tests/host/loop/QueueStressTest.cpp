// SPDX-License-Identifier: Apache-2.0
// Queues under many threads at once; run under ThreadSanitizer as well.

#include <gtest/gtest.h>

#include <atomic>
#include <random>
#include <thread>
#include <vector>

#include "host/loop/LinuxWorkQueues.h"
#include "tests/host/Eventually.h"
#include "tests/host/loop/RunningLoop.h"
#include "tests/support/Seeds.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using testing::eventually;

constexpr int kThreads = 8;
constexpr int kPieces = 20000;

// Posts kPieces from each of kThreads and demands that each thread's pieces ran in its order, none overlapping.
void expectOrderUnderStress(platform::WorkQueue& queue) {
  std::vector<int> next(kThreads, 0);  // touched by the queue's work alone: a race would show here
  std::atomic<int> wrong{0};
  std::atomic<int> ran{0};
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      for (int piece = 0; piece < kPieces; ++piece) {
        queue.async([&, thread, piece] {
          if (next[static_cast<std::size_t>(thread)]++ != piece) {
            ++wrong;
          }
          ++ran;
        });
      }
    });
  }
  for (auto& thread : threads) {
    thread.join();
  }
  EXPECT_TRUE(eventually([&] { return ran == kThreads * kPieces; }, 60s));
  EXPECT_EQ(wrong, 0);
  EXPECT_TRUE(eventually([&] { return queue.waiting() == 0; }));
}

TEST(QueueStress, TheServerQueueKeepsEveryThreadsOrder) {
  testing::RunningLoop running;
  running.start();
  expectOrderUnderStress(*running.loop.queue());
}

TEST(QueueStress, APooledQueueKeepsEveryThreadsOrder) {
  testing::RunningLoop running;
  LinuxWorkQueues queues(running.clock, running.loop.queue());
  expectOrderUnderStress(*queues.makeSerialQueue("stress", platform::QualityOfService::Utility));
}

void expectDelaysUnderStress(platform::WorkQueue& queue, const platform::Clock& clock) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::atomic<int> ran{0};
    std::atomic<int> early{0};
    std::vector<std::thread> threads;
    for (unsigned thread = 0; thread < kThreads; ++thread) {
      threads.emplace_back([&, thread] {
        std::mt19937 random(seed + thread);
        for (int piece = 0; piece < 300; ++piece) {
          const std::chrono::nanoseconds delay(random() % 20000000);
          const auto moment = clock.monotonic() + delay;
          queue.asyncAfter(delay, [&, moment] {
            if (clock.monotonic() < moment) {
              ++early;
            }
            ++ran;
          });
        }
      });
    }
    for (auto& thread : threads) {
      thread.join();
    }
    EXPECT_TRUE(eventually([&] { return ran == kThreads * 300; }));
    EXPECT_EQ(early, 0);
  }
}

TEST(QueueStress, TheServerQueueRunsDelayedWorkNeverEarlyAndAllOfIt) {
  testing::RunningLoop running;
  running.start();
  expectDelaysUnderStress(*running.loop.queue(), running.clock);
}

TEST(QueueStress, APooledQueueRunsDelayedWorkNeverEarlyAndAllOfIt) {
  testing::RunningLoop running;
  LinuxWorkQueues queues(running.clock, running.loop.queue());
  const auto queue = queues.makeSerialQueue("stress", platform::QualityOfService::Utility);
  expectDelaysUnderStress(*queue, running.clock);
}

// Queues that suspend themselves over and over, resumed by others or by their time, while all hand over to each other:
// nothing is lost, nothing overlaps, nothing runs while its queue is suspended.
TEST(QueueStress, SuspensionsLoseNothingAndLetNothingThrough) {
  testing::RunningLoop running;
  LinuxWorkQueues queues(running.clock, running.loop.queue());
  struct Counted {
    std::shared_ptr<platform::SuspendableQueue> queue;
    int rounds = 0;
    bool suspended = false;
  };
  constexpr int kRounds = 2000;
  std::vector<Counted> all(16);
  std::atomic<int> wrong{0};
  std::atomic<int> ran{0};
  for (Counted& each : all) {
    each.queue = queues.makeSuspendableQueue("stress", platform::QualityOfService::Utility);
    for (int round = 0; round < kRounds; ++round) {
      each.queue->async([&, round] {
        wrong += each.suspended || each.rounds++ != round ? 1 : 0;
        each.suspended = true;
        each.queue->suspend(std::chrono::microseconds(round % 3 == 0 ? 100 : 10'000'000), [&] {
          each.suspended = false;
          ++ran;
        });
      });
    }
  }
  std::atomic<bool> over{false};
  std::thread resumer([&] {
    while (!over) {
      for (Counted& each : all) {
        each.queue->resume();
      }
    }
  });
  EXPECT_TRUE(eventually([&] { return ran == kRounds * static_cast<int>(all.size()); }, 60s));
  over = true;
  resumer.join();
  EXPECT_EQ(wrong, 0);
  EXPECT_TRUE(queues.settle(20s));
}

// Pieces that come one by one, each when the pool has just fallen asleep, is about to, or looks again.
TEST(QueueStress, ASleepingPoolMissesNoWakeUp) {
  testing::RunningLoop running;
  LinuxWorkQueues queues(running.clock, running.loop.queue());
  const auto queue = queues.makeSerialQueue("stress", platform::QualityOfService::Utility);
  const auto delayed = queues.makeSerialQueue("delayed", platform::QualityOfService::Utility);
  for (const std::uint64_t seed : tarn::testing::testSeeds(2)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    std::mt19937 random(seed);
    for (int round = 0; round < 1000; ++round) {
      std::atomic<int> ran{0};
      queue->async([&ran] { ++ran; });
      delayed->asyncAfter(std::chrono::nanoseconds(random() % 1'000'000), [&ran] { ++ran; });
      ASSERT_TRUE(eventually([&] { return ran == 2; })) << round;
    }
  }
}

TEST(QueueStress, ASleepingServerMissesNoWakeUp) {
  testing::RunningLoop running;
  running.start();
  // Each round finds the loop asleep or just about to be.
  for (int round = 0; round < 5000; ++round) {
    EXPECT_EQ(running.onQueue([round] { return round; }), round);
  }
}

TEST(QueueStress, AStopIsNeverLost) {
  for (int round = 0; round < 200; ++round) {
    testing::RunningLoop running;
    running.start();
    running.stop();  // hangs the test when it is
  }
}

}  // namespace
}  // namespace tarn::linux_host
