// SPDX-License-Identifier: Apache-2.0
#include "telemetry/rtc/TarnReportingQueueSemaphore.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <vector>

#include "testing/ManualClock.h"
#include "testing/ManualWorkQueues.h"

namespace tarn {
namespace {

using namespace std::chrono_literals;
using namespace testing;

class QueueSemaphore : public ::testing::Test {
 protected:
  void waitFor(std::chrono::nanoseconds longest) {
    queue_->async([this, longest] {
      semaphore_.wait(queue_, longest, [this](bool signalled) { ran_.emplace_back(signalled ? "signal" : "timeout"); });
    });
    queue_->async([this] { ran_.emplace_back("behind"); });
    queues_.runUntilIdle();
  }

  ManualClock clock_;
  ManualWorkQueues queues_{clock_};
  std::shared_ptr<platform::SuspendableQueue> queue_ =
      queues_.makeSuspendableQueue("queue", platform::QualityOfService::Utility);
  TarnReportingQueueSemaphore semaphore_;
  std::vector<std::string> ran_;
};

TEST_F(QueueSemaphore, SignalEndsTheWaitAheadOfWhatStandsBehindIt) {
  waitFor(9s);
  EXPECT_TRUE(ran_.empty());
  semaphore_.signal();
  EXPECT_TRUE(ran_.empty());  // on the queue, not on the thread of the signal
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"signal", "behind"}));
  EXPECT_EQ(queues_.delayed(), 0U);
}

TEST_F(QueueSemaphore, TimeEndsTheWait) {
  waitFor(9s);
  queues_.advance(9s - 1ns);
  EXPECT_TRUE(ran_.empty());
  queues_.advance(1ns);
  EXPECT_EQ(ran_, (std::vector<std::string>{"timeout", "behind"}));
}

TEST_F(QueueSemaphore, EarlierSignalIsTakenAtOnce) {
  semaphore_.signal();
  waitFor(9s);
  EXPECT_EQ(ran_, (std::vector<std::string>{"signal", "behind"}));
}

TEST_F(QueueSemaphore, CountsItsSignals) {
  semaphore_.signal();
  semaphore_.signal();
  waitFor(9s);
  waitFor(9s);
  EXPECT_EQ(ran_, (std::vector<std::string>{"signal", "behind", "signal", "behind"}));
  waitFor(9s);
  EXPECT_EQ(ran_.size(), 4U);
}

TEST_F(QueueSemaphore, SignalThatEndedAWaitIsSpent) {
  waitFor(9s);
  semaphore_.signal();
  queues_.runUntilIdle();
  waitFor(9s);
  EXPECT_EQ(ran_, (std::vector<std::string>{"signal", "behind"}));
}

TEST_F(QueueSemaphore, LetsGoOfTheQueueWhenTheWaitIsOver) {
  waitFor(9s);
  queues_.advance(9s);
  const std::weak_ptr<platform::SuspendableQueue> queue = queue_;
  queue_.reset();
  EXPECT_TRUE(queue.expired());
}

TEST_F(QueueSemaphore, SignalThatComesWhileTheTimeRunsOutCounts) {
  waitFor(9s);
  clock_.advance(9s);
  semaphore_.signal();
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"signal", "behind"}));
}

TEST_F(QueueSemaphore, SignalBehindTheTimeIsKeptForTheNextWait) {
  waitFor(9s);
  queues_.advance(9s);
  semaphore_.signal();
  waitFor(9s);
  EXPECT_EQ(ran_, (std::vector<std::string>{"timeout", "behind", "signal", "behind"}));
}

}  // namespace
}  // namespace tarn
