// Queues under many threads at once; run under ThreadSanitizer as well.

#include <gtest/gtest.h>

#include <atomic>
#include <random>
#include <thread>
#include <vector>

#include "platform/linux/LinuxWorkQueues.h"
#include "tests/linux/Eventually.h"
#include "tests/linux/RunningLoop.h"

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
  const auto seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
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
