// SPDX-License-Identifier: Apache-2.0
#include "testing/ManualWorkQueues.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "testing/ManualClock.h"
#include "testing/backends/RecordingSessionRecords.h"

namespace tarn::testing {
namespace {

using namespace std::chrono_literals;
using platform::QualityOfService;

class ManualWorkQueuesTest : public ::testing::Test {
 protected:
  std::shared_ptr<platform::WorkQueue> queue(const char* name = "queue") {
    return queues_.makeSerialQueue(name, QualityOfService::Utility);
  }
  std::shared_ptr<platform::SuspendableQueue> suspendable(const char* name = "queue") {
    return queues_.makeSuspendableQueue(name, QualityOfService::Utility);
  }
  platform::Work note(std::string text) {
    return [this, text = std::move(text)] { ran_.push_back(text); };
  }

  ManualClock clock_;
  ManualWorkQueues queues_{clock_};
  std::vector<std::string> ran_;
};

TEST_F(ManualWorkQueuesTest, NothingRunsUntilTold) {
  queue()->async(note("a"));
  EXPECT_TRUE(ran_.empty());
  EXPECT_EQ(queues_.runUntilIdle(), 1U);
  EXPECT_EQ(ran_, std::vector<std::string>{"a"});
}

TEST_F(ManualWorkQueuesTest, APieceIsWorkOfTheSessionThatHandedItOverOnEveryRoad) {
  std::vector<platform::SessionNumber> owners;
  const auto ask = [&owners] { owners.push_back(RecordingSessionRecords::current()); };
  const auto work = suspendable();
  {
    const RecordingSessionRecords::Scope session(3);
    work->async(ask);
    work->asyncAfter(1s, ask);
    work->async([&work, &ask] { work->suspend(5s, ask); });
  }
  work->async(ask);
  queues_.advance(0s);
  EXPECT_EQ(owners, std::vector<platform::SessionNumber>{3});
  {
    const RecordingSessionRecords::Scope session(4);
    work->resume();
    queues_.advance(1s);
  }
  EXPECT_EQ(owners, (std::vector<platform::SessionNumber>{3, 3, 0, 3}));
  EXPECT_EQ(RecordingSessionRecords::current(), 0);
}

TEST_F(ManualWorkQueuesTest, AllQueuesRunInTheOrderOfTheHandOver) {
  const auto first = queue("first");
  const auto second = queue("second");
  first->async(note("1a"));
  second->async(note("2a"));
  first->async(note("1b"));
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"1a", "2a", "1b"}));
}

TEST_F(ManualWorkQueuesTest, RunOneRunsThePieceThatWaitsLongest) {
  const auto work = queue();
  work->async(note("a"));
  work->async(note("b"));
  EXPECT_TRUE(queues_.runOne());
  EXPECT_EQ(ran_, std::vector<std::string>{"a"});
  EXPECT_EQ(work->waiting(), 1U);
  EXPECT_TRUE(queues_.runOne());
  EXPECT_FALSE(queues_.runOne());
}

TEST_F(ManualWorkQueuesTest, OneQueueCanBeRunAlone) {
  const auto first = queue("first");
  const auto second = queue("second");
  first->async(note("1"));
  second->async(note("2"));
  EXPECT_EQ(queues_.find("second")->runUntilIdle(), 1U);
  EXPECT_EQ(ran_, std::vector<std::string>{"2"});
  EXPECT_EQ(first->waiting(), 1U);
}

TEST_F(ManualWorkQueuesTest, WorkHandedOverByWorkRunsInTheSameRun) {
  const auto work = queue();
  work->async([&] { work->async(note("inner")); });
  EXPECT_EQ(queues_.runUntilIdle(), 2U);
  EXPECT_EQ(ran_, std::vector<std::string>{"inner"});
}

TEST_F(ManualWorkQueuesTest, QueueIsCurrentOnlyWhileItsWorkRunsOnTheRunningThread) {
  const auto first = queue("first");
  const auto second = queue("second");
  bool own = false;
  bool other = true;
  bool elsewhere = true;
  first->async([&] {
    own = first->isCurrent();
    other = second->isCurrent();
    std::thread thread([&] { elsewhere = first->isCurrent(); });
    thread.join();
  });
  queues_.runUntilIdle();
  EXPECT_TRUE(own);
  EXPECT_FALSE(other);
  EXPECT_FALSE(elsewhere);
  EXPECT_FALSE(first->isCurrent());
}

TEST_F(ManualWorkQueuesTest, ServerQueueIsCurrentOnTheMakersThreadWhileNothingRuns) {
  const auto server = queues_.makeSerialQueue("server", QualityOfService::UserInteractive);
  EXPECT_TRUE(server->isCurrent());
  bool elsewhere = true;
  std::thread thread([&] { elsewhere = server->isCurrent(); });
  thread.join();
  EXPECT_FALSE(elsewhere);
  bool inAnother = true;
  queue()->async([&] { inAnother = server->isCurrent(); });
  queues_.runUntilIdle();
  EXPECT_FALSE(inAnother);
}

TEST_F(ManualWorkQueuesTest, NestedRunLeavesTheBusyQueueAlone) {
  const auto server = queue("server");
  const auto backEnd = queue("back-end");
  server->async([&] {
    server->async(note("server behind"));
    backEnd->async([&] { ran_.emplace_back(server->isCurrent() ? "wrong" : "back-end"); });
    EXPECT_EQ(queues_.runUntilIdle(), 1U);
    ran_.emplace_back(server->isCurrent() ? "server done" : "wrong");
  });
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"back-end", "server done", "server behind"}));
}

TEST_F(ManualWorkQueuesTest, DelayedWorkRunsAtItsMomentInOrder) {
  const auto work = queue();
  std::vector<std::chrono::nanoseconds> moments;
  const auto start = clock_.monotonic();
  const auto mark = [&] { moments.push_back(clock_.monotonic() - start); };
  work->asyncAfter(3s, mark);
  work->asyncAfter(1s, mark);
  work->asyncAfter(2s, [&] {
    mark();
    work->asyncAfter(500ms, mark);
  });
  queues_.advance(10s);
  EXPECT_EQ(moments, (std::vector<std::chrono::nanoseconds>{1s, 2s, 2500ms, 3s}));
  EXPECT_EQ(clock_.monotonic() - start, 10s);
}

TEST_F(ManualWorkQueuesTest, EqualMomentsKeepTheOrderOfTheCalls) {
  const auto work = queue();
  work->asyncAfter(1s, note("a"));
  work->asyncAfter(1s, note("b"));
  queues_.advance(1s);
  EXPECT_EQ(ran_, (std::vector<std::string>{"a", "b"}));
}

TEST_F(ManualWorkQueuesTest, DelayedWorkNeverRunsEarly) {
  const auto work = queue();
  work->asyncAfter(1s, note("a"));
  queues_.advance(1s - 1ns);
  EXPECT_TRUE(ran_.empty());
  EXPECT_EQ(work->waiting(), 0U);
  EXPECT_EQ(queues_.delayed(), 1U);
  queues_.advance(1ns);
  EXPECT_EQ(ran_, std::vector<std::string>{"a"});
}

TEST_F(ManualWorkQueuesTest, DelayOfZeroKeepsItsPlaceAmongTheOthers) {
  const auto work = queue();
  work->async(note("a"));
  work->asyncAfter(0s, note("b"));
  work->asyncAfter(-1s, note("c"));
  work->async(note("d"));
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"a", "b", "c", "d"}));
}

TEST_F(ManualWorkQueuesTest, WorkDueBeforeALaterHandOverRunsBeforeIt) {
  const auto work = queue();
  work->asyncAfter(1s, note("delayed"));
  clock_.advance(1s);
  work->async(note("later"));
  EXPECT_EQ(work->waiting(), 2U);
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"delayed", "later"}));
}

TEST_F(ManualWorkQueuesTest, AdvanceRunsWorkThatIsAlreadyDueFirst) {
  const auto work = queue();
  work->async([&] { work->asyncAfter(1s, note("after")); });
  queues_.advance(1s);
  EXPECT_EQ(ran_, std::vector<std::string>{"after"});
}

TEST_F(ManualWorkQueuesTest, WorkOutlivesTheOwnersOfItsQueue) {
  queue()->async(note("a"));
  queue()->asyncAfter(1s, note("b"));
  queues_.advance(1s);
  EXPECT_EQ(ran_, (std::vector<std::string>{"a", "b"}));
  EXPECT_EQ(queues_.find("queue"), nullptr);
}

TEST_F(ManualWorkQueuesTest, DropAllDestroysWorkUncalledIncludingWhatThatHandsOver) {
  const auto work = queue();
  struct HandsOverAtItsEnd {
    std::shared_ptr<platform::WorkQueue> queue;
    std::vector<std::string>* ran;
    ~HandsOverAtItsEnd() {
      if (queue != nullptr) {
        queue->async([out = ran] { out->emplace_back("wrong"); });
      }
    }
  };
  auto holder = std::make_shared<HandsOverAtItsEnd>(HandsOverAtItsEnd{work, &ran_});
  work->async([holder] {});
  work->asyncAfter(1s, note("wrong"));
  holder.reset();
  queues_.dropAll();
  EXPECT_EQ(queues_.advance(2s), 0U);
  EXPECT_TRUE(ran_.empty());
}

TEST_F(ManualWorkQueuesTest, SuspendedQueueRunsNothingUntilItIsResumed) {
  const auto work = suspendable();
  const auto other = queue("other");
  work->async([&] { work->suspend(1h, note("next")); });
  work->async(note("behind"));
  other->async(note("other"));
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, std::vector<std::string>{"other"});
  EXPECT_EQ(work->waiting(), 1U);
  EXPECT_EQ(queues_.find("queue")->delayed(), 1U);
  work->resume();
  work->resume();
  queues_.runUntilIdle();
  EXPECT_EQ(ran_, (std::vector<std::string>{"other", "next", "behind"}));
  EXPECT_EQ(queues_.delayed(), 0U);
}

TEST_F(ManualWorkQueuesTest, SuspensionEndsAtItsMoment) {
  const auto work = suspendable();
  work->async([&] { work->suspend(3s, note("next")); });
  work->async(note("behind"));
  queues_.advance(3s - 1ns);
  EXPECT_TRUE(ran_.empty());
  queues_.advance(1ns);
  EXPECT_EQ(ran_, (std::vector<std::string>{"next", "behind"}));
}

TEST_F(ManualWorkQueuesTest, ResumingWithoutASuspensionDoesNothing) {
  const auto work = suspendable();
  work->resume();
  EXPECT_EQ(queues_.runUntilIdle(), 0U);
}

TEST_F(ManualWorkQueuesTest, DropAllDestroysWhatASuspendedQueueHolds) {
  auto work = suspendable();
  const std::weak_ptr<platform::WorkQueue> watched = work;
  work->async([work] { work->suspend(1h, [work] {}); });
  queues_.runUntilIdle();
  work.reset();
  EXPECT_FALSE(watched.expired());
  queues_.dropAll();
  EXPECT_TRUE(watched.expired());
}

TEST_F(ManualWorkQueuesTest, WorkMayBeHandedOverByManyThreadsWhileItRuns) {
  const auto work = queue();
  constexpr std::size_t kThreads = 4;
  constexpr std::size_t kPieces = 2000;
  std::vector<std::vector<std::size_t>> seen(kThreads);
  std::vector<std::thread> threads;
  for (std::size_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      for (std::size_t piece = 0; piece < kPieces; ++piece) {
        work->async([&seen, thread, piece] { seen[thread].push_back(piece); });
      }
    });
  }
  std::size_t ran = 0;
  while (ran < kThreads * kPieces) {
    ran += queues_.runUntilIdle();
    std::this_thread::yield();
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  for (const auto& pieces : seen) {
    ASSERT_EQ(pieces.size(), kPieces);
    EXPECT_TRUE(std::is_sorted(pieces.begin(), pieces.end()));
  }
}

TEST(ManualClock, AdvanceMovesEpochMonotonicAndUptimeTogether) {
  ManualClock clock;
  clock.setEpochSeconds(100);
  clock.setMonotonic(5s);
  clock.setSystemUptimeSeconds(50);
  clock.setProcessorTicks(7);
  clock.advance(1500ms);
  EXPECT_EQ(clock.epochSeconds(), 101.5);
  EXPECT_EQ(clock.monotonic(), 6500ms);
  EXPECT_EQ(clock.systemUptimeSeconds(), 51.5);
  EXPECT_EQ(clock.processorTicks(), 7);
}

TEST(ManualClock, SettersMoveOneReadingAlone) {
  ManualClock clock;
  clock.advance(10s);
  const auto monotonic = clock.monotonic();
  clock.setEpochSeconds(100);  // somebody set the wall clock
  EXPECT_EQ(clock.epochSeconds(), 100);
  EXPECT_EQ(clock.monotonic(), monotonic);
}

}  // namespace
}  // namespace tarn::testing
