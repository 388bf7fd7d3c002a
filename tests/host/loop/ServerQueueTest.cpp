// SPDX-License-Identifier: Apache-2.0
#include "host/loop/ServerQueue.h"

#include <gtest/gtest.h>
#include <poll.h>

#include <string>

#include "host/system/MemoryReserve.h"
#include "testing/ManualClock.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;

constexpr std::size_t kAll = 1000;

class ServerQueueTest : public ::testing::Test {
 protected:
  platform::Work note(char letter) {
    return [this, letter] { ran_ += letter; };
  }
  bool wakeWritten() const {
    pollfd descriptor{queue_.wakeDescriptor(), POLLIN, 0};
    return ::poll(&descriptor, 1, 0) == 1;
  }

  testing::ManualClock clock_;
  QueueProgress progress_;
  ServerQueue queue_{clock_, progress_};
  std::string ran_;
};

TEST_F(ServerQueueTest, RunsWorkInTheOrderOfHandOver) {
  queue_.async(note('a'));
  queue_.async(note('b'));
  queue_.async(note('c'));
  EXPECT_EQ(queue_.run(kAll), 3u);
  EXPECT_EQ(ran_, "abc");
}

TEST_F(ServerQueueTest, RunsWorkHandedOverByWorkBehindWhatWaits) {
  queue_.async([this] {
    ran_ += 'a';
    queue_.async(note('c'));
  });
  queue_.async(note('b'));
  queue_.run(kAll);
  EXPECT_EQ(ran_, "abc");
}

TEST_F(ServerQueueTest, APieceThatRunsOutOfMemoryIsGivenUpAndTheNextRuns) {
  const auto before = MemoryReserve::counts();
  queue_.async(note('a'));
  queue_.async([] { throw std::bad_alloc(); });
  queue_.async(note('b'));
  EXPECT_EQ(queue_.run(kAll), 3u);
  EXPECT_EQ(ran_, "ab");
  EXPECT_EQ(MemoryReserve::counts().of(MemoryReserve::Loss::Work), before.of(MemoryReserve::Loss::Work) + 1);
}

TEST_F(ServerQueueTest, RunsNoMoreThanTheLimitAndKeepsTheRest) {
  queue_.async(note('a'));
  queue_.async(note('b'));
  queue_.async(note('c'));
  EXPECT_EQ(queue_.run(2), 2u);
  queue_.async(note('d'));
  EXPECT_EQ(queue_.waiting(), 2u);
  EXPECT_EQ(queue_.run(kAll), 2u);
  EXPECT_EQ(ran_, "abcd");
}

TEST_F(ServerQueueTest, WorkThatHandsItselfOverAgainEndsWithTheLimit) {
  struct Again {
    ServerQueue* queue;
    void operator()() const { queue->async(Again{queue}); }
  };
  queue_.async(Again{&queue_});
  EXPECT_EQ(queue_.run(kAll), kAll);
  EXPECT_EQ(queue_.waiting(), 1u);
}

TEST_F(ServerQueueTest, RunsDelayedWorkAtItsMomentAndNotBefore) {
  queue_.asyncAfter(10ms, note('a'));
  clock_.advance(10ms - 1ns);
  EXPECT_EQ(queue_.run(kAll), 0u);
  clock_.advance(1ns);
  EXPECT_EQ(queue_.run(kAll), 1u);
}

TEST_F(ServerQueueTest, RunsDelayedWorkByItsMomentNotByTheOrderOfTheCalls) {
  queue_.asyncAfter(30ms, note('c'));
  queue_.asyncAfter(10ms, note('a'));
  queue_.asyncAfter(20ms, note('b'));
  clock_.advance(30ms);
  queue_.run(kAll);
  EXPECT_EQ(ran_, "abc");
}

TEST_F(ServerQueueTest, RunsDelayedWorkOfEqualMomentsInTheOrderOfTheCalls) {
  for (char letter = 'a'; letter <= 'z'; ++letter) {
    queue_.asyncAfter(5ms, note(letter));
  }
  clock_.advance(5ms);
  queue_.run(kAll);
  EXPECT_EQ(ran_, "abcdefghijklmnopqrstuvwxyz");
}

TEST_F(ServerQueueTest, TreatsADelayOfZeroOrLessAsNone) {
  queue_.async(note('a'));
  queue_.asyncAfter(0ns, note('b'));
  queue_.asyncAfter(-5s, note('c'));
  queue_.async(note('d'));
  queue_.run(kAll);
  EXPECT_EQ(ran_, "abcd");
}

TEST_F(ServerQueueTest, AnEndlessDelayNeverComesDue) {
  queue_.asyncAfter(std::chrono::nanoseconds::max(), note('a'));
  clock_.advance(1000h);
  EXPECT_EQ(queue_.run(kAll), 0u);
}

TEST_F(ServerQueueTest, CountsDelayedWorkAsWaitingFromItsMomentOn) {
  queue_.asyncAfter(10ms, note('a'));
  queue_.asyncAfter(20ms, note('b'));
  EXPECT_EQ(queue_.waiting(), 0u);
  clock_.advance(10ms);
  EXPECT_EQ(queue_.waiting(), 1u);
}

TEST_F(ServerQueueTest, DoesNotCountRunningWorkAsWaiting) {
  std::size_t seen = 99;
  queue_.async([&] { seen = queue_.waiting(); });
  queue_.async(note('b'));
  queue_.run(kAll);
  EXPECT_EQ(seen, 1u);
}

TEST_F(ServerQueueTest, IsCurrentOnlyInsideItsWork) {
  bool inside = false;
  queue_.async([&] { inside = queue_.isCurrent(); });
  queue_.run(kAll);
  EXPECT_TRUE(inside);
  EXPECT_FALSE(queue_.isCurrent());
}

TEST_F(ServerQueueTest, DestroysWorkRightAfterItRan) {
  auto token = std::make_shared<int>(1);
  std::weak_ptr<int> watched = token;
  bool goneForTheNext = false;
  queue_.async([token = std::move(token)] {});
  queue_.async([&] { goneForTheNext = watched.expired(); });
  queue_.run(kAll);
  EXPECT_TRUE(goneForTheNext);
}

TEST_F(ServerQueueTest, EveryPieceOfWorkIsAStepOfProgress) {
  const auto before = progress_.sample().steps;
  queue_.async(note('a'));
  queue_.async(note('b'));
  queue_.run(kAll);
  EXPECT_EQ(progress_.sample().steps, before + 2);
}

TEST_F(ServerQueueTest, ServerMustNotSleepWhileWorkWaits) {
  queue_.async(note('a'));
  EXPECT_EQ(queue_.prepareToSleep(), 0ns);
}

TEST_F(ServerQueueTest, ServerMaySleepUntilTheEarliestDeadline) {
  EXPECT_EQ(queue_.prepareToSleep(), std::nullopt);
  queue_.awake();
  queue_.asyncAfter(30ms, note('b'));
  queue_.asyncAfter(10ms, note('a'));
  clock_.advance(4ms);
  EXPECT_EQ(queue_.prepareToSleep(), 6ms);
}

TEST_F(ServerQueueTest, WorkForAnAwakeServerCostsNoSystemCall) {
  queue_.async(note('a'));
  queue_.asyncAfter(1ms, note('b'));
  EXPECT_FALSE(wakeWritten());
}

TEST_F(ServerQueueTest, WorkWakesASleepingServer) {
  queue_.prepareToSleep();
  queue_.async(note('a'));
  EXPECT_TRUE(wakeWritten());
  queue_.awake();
  queue_.drainWake();
  EXPECT_FALSE(wakeWritten());
}

TEST_F(ServerQueueTest, DelayedWorkWakesASleepingServerOnlyWhenItIsTheEarliest) {
  queue_.asyncAfter(10ms, note('a'));
  queue_.prepareToSleep();
  queue_.asyncAfter(20ms, note('b'));
  EXPECT_FALSE(wakeWritten());
  queue_.asyncAfter(5ms, note('c'));
  EXPECT_TRUE(wakeWritten());
}

TEST_F(ServerQueueTest, AWakeThatComesJustBeforeTheSleepIsNotLost) {
  queue_.wake();
  EXPECT_EQ(queue_.prepareToSleep(), 0ns);
  EXPECT_EQ(queue_.prepareToSleep(), std::nullopt);
}

TEST_F(ServerQueueTest, AWaitInTheMiddleOfWorkIsEndedByWorkAndByAWakeButNotByDelayedWork) {
  queue_.async(note('a'));
  ASSERT_TRUE(queue_.prepareToWait());  // although work waits
  queue_.asyncAfter(1ns, note('b'));
  EXPECT_FALSE(wakeWritten());
  queue_.async(note('c'));
  EXPECT_TRUE(wakeWritten());
  queue_.drainWake();
  queue_.awake();
  ASSERT_TRUE(queue_.prepareToWait());
  queue_.wake();
  EXPECT_TRUE(wakeWritten());
}

TEST_F(ServerQueueTest, AWakeBeforeTheWaitIsNotLost) {
  queue_.wake();
  EXPECT_FALSE(queue_.prepareToWait());
  EXPECT_TRUE(queue_.prepareToWait());
  queue_.awake();
  queue_.async(note('a'));
  EXPECT_FALSE(wakeWritten());  // nobody sleeps
}

}  // namespace
}  // namespace tarn::linux_host
