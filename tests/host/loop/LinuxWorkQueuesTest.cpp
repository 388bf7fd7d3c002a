// SPDX-License-Identifier: Apache-2.0
#include "host/loop/LinuxWorkQueues.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <atomic>
#include <future>
#include <string>
#include <thread>
#include <vector>

#include "host/system/MemoryReserve.h"
#include "tests/host/Eventually.h"
#include "tests/host/loop/RunningLoop.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::QualityOfService;
using testing::eventually;

class LinuxWorkQueuesTest : public ::testing::Test {
 protected:
  std::shared_ptr<platform::WorkQueue> make() { return queues_.makeSerialQueue("q", QualityOfService::Utility); }
  std::shared_ptr<platform::SuspendableQueue> makeSuspendable() {
    return queues_.makeSuspendableQueue("q", QualityOfService::Utility);
  }
  static void finish(platform::WorkQueue& queue) {
    std::promise<void> done;
    queue.async([&done] { done.set_value(); });
    done.get_future().get();
  }

  testing::RunningLoop running_;
  LinuxWorkQueues queues_{running_.clock, running_.loop.queue()};
};

TEST_F(LinuxWorkQueuesTest, TheServerQueueIsTheMainLoopsAndNoOtherIs) {
  EXPECT_EQ(queues_.makeSerialQueue("sys.oxbow.tarnkit.reporting.server", QualityOfService::UserInteractive),
            running_.loop.queue());
  EXPECT_NE(queues_.makeSerialQueue("a worker's", QualityOfService::UserInteractive), running_.loop.queue());
}

TEST_F(LinuxWorkQueuesTest, OtherQueuesAreQueuesOfTheirOwn) {
  EXPECT_NE(make(), make());
}

TEST_F(LinuxWorkQueuesTest, AQueueKeepsItsOrder) {
  const auto queue = make();
  std::vector<int> ran;
  for (int i = 0; i < 1000; ++i) {
    queue->async([&ran, i] { ran.push_back(i); });
  }
  finish(*queue);
  ASSERT_EQ(ran.size(), 1000u);
  EXPECT_TRUE(std::is_sorted(ran.begin(), ran.end()));
}

TEST_F(LinuxWorkQueuesTest, IsCurrentInsideItsWorkAndNotInsideAnothers) {
  const auto queue = make();
  const auto other = make();
  std::promise<std::pair<bool, bool>> seen;
  queue->async([&] { seen.set_value({queue->isCurrent(), other->isCurrent()}); });
  EXPECT_EQ(seen.get_future().get(), std::pair(true, false));
  EXPECT_FALSE(queue->isCurrent());
}

TEST_F(LinuxWorkQueuesTest, ABlockedQueueDoesNotHoldUpAnother) {
  const auto blocked = make();
  const auto other = make();
  std::promise<void> release;
  blocked->async([future = release.get_future().share()] { future.wait(); });
  finish(*other);
  release.set_value();
  finish(*blocked);
}

TEST_F(LinuxWorkQueuesTest, WhatIsUnfinishedOnAnyQueueIsWaitedForAndNothingThatComesLater) {
  const auto running = make();
  const auto suspended = makeSuspendable();
  std::promise<void> release;
  std::atomic<int> finished{0};
  running->async([&, future = release.get_future().share()] { future.wait(); });
  running->async([&] { ++finished; });
  std::promise<void> isSuspended;
  suspended->async([&] {
    suspended->suspend(1h, [&] { ++finished; });
    isSuspended.set_value();
  });
  isSuspended.get_future().get();
  std::promise<int> seen;
  queues_.afterWhatIsUnfinished([&] { seen.set_value(finished); });
  auto after = seen.get_future();
  EXPECT_EQ(after.wait_for(20ms), std::future_status::timeout);
  release.set_value();
  EXPECT_EQ(after.wait_for(20ms), std::future_status::timeout);
  suspended->resume();
  EXPECT_EQ(after.get(), 2);
}

TEST_F(LinuxWorkQueuesTest, WhenNothingIsUnfinishedItIsAfterThatAtOnce) {
  const auto queue = make();
  finish(*queue);
  EXPECT_TRUE(eventually([&] { return queues_.unfinished() == 0; }));
  bool called = false;
  queues_.afterWhatIsUnfinished([&] { called = true; });
  EXPECT_TRUE(called);
}

// All threads of the pool are busy, so that nobody else comes to what waits.
TEST_F(LinuxWorkQueuesTest, HelpRunsWhatWaitsOnTheCallersThreadAsWorkOfTheQueue) {
  std::promise<void> release;
  const auto released = release.get_future().share();
  std::atomic<std::size_t> busy{0};
  std::vector<std::shared_ptr<platform::WorkQueue>> others;
  for (std::size_t i = 0; i < LinuxWorkQueues::kThreads; ++i) {
    others.push_back(make());
    others.back()->async([&busy, released] {
      ++busy;
      released.wait();
    });
  }
  ASSERT_TRUE(eventually([&] { return busy == LinuxWorkQueues::kThreads; }));
  const auto queue = makeSuspendable();
  std::vector<std::thread::id> threads;
  bool current = false;
  queue->asyncAtOnce([&] {
    threads.push_back(std::this_thread::get_id());
    current = queue->isCurrent();
  });
  queue->async([&] {
    threads.push_back(std::this_thread::get_id());
    queue->suspend(1h, [] {});
  });
  queue->async([&] { threads.emplace_back(); });
  queue->help(0s);
  EXPECT_EQ(threads, std::vector<std::thread::id>(2, std::this_thread::get_id()));
  EXPECT_TRUE(current);
  EXPECT_FALSE(queue->isCurrent());
  queue->help(0s);  // suspended
  EXPECT_EQ(threads.size(), 2U);
  EXPECT_EQ(queue->waiting(), 1U);
  queue->resume();
  queue->help(0s);
  EXPECT_EQ(threads.size(), 3U);
  queue->help(0s);  // nothing waits
  EXPECT_EQ(queue->waiting(), 0U);
  release.set_value();
  EXPECT_TRUE(queues_.settle(20s));
}

TEST_F(LinuxWorkQueuesTest, HelpWaitsForTheThreadThatRunsTheQueue) {
  const auto queue = makeSuspendable();
  std::promise<void> begun;
  std::promise<void> release;
  std::atomic<bool> over{false};
  queue->async([&] {
    begun.set_value();
    release.get_future().wait();
    over = true;
  });
  begun.get_future().wait();
  std::thread releaser([&] { release.set_value(); });
  queue->help(20s);
  EXPECT_TRUE(over);
  releaser.join();
}

TEST_F(LinuxWorkQueuesTest, HelpByWorkOfTheQueueItselfIsNone) {
  const auto queue = makeSuspendable();
  std::atomic<bool> helped{false};
  queue->async([&] {
    queue->help(1h);
    helped = true;
  });
  EXPECT_TRUE(eventually([&] { return helped.load(); }));
}

TEST_F(LinuxWorkQueuesTest, HelpLeavesAQueueThatAThreadRuns) {
  const auto queue = makeSuspendable();
  std::promise<void> begun;
  std::promise<void> release;
  std::atomic<bool> ran{false};
  queue->async([&] {
    begun.set_value();
    release.get_future().wait();
  });
  begun.get_future().wait();
  queue->async([&ran] { ran = true; });
  queue->help(0s);
  EXPECT_FALSE(ran);
  release.set_value();
  EXPECT_TRUE(queues_.settle(20s));
  EXPECT_TRUE(ran);
}

TEST_F(LinuxWorkQueuesTest, CountsWhatWaitsBehindRunningWork) {
  const auto queue = make();
  std::promise<void> begun;
  std::promise<void> release;
  queue->async([&begun, future = release.get_future().share()] {
    begun.set_value();
    future.wait();
  });
  begun.get_future().get();
  queue->async([] {});
  queue->async([] {});
  EXPECT_EQ(queue->waiting(), 2u);
  release.set_value();
  finish(*queue);
}

TEST_F(LinuxWorkQueuesTest, WorkOfAQueueThatNobodyHoldsAnyMoreIsRun) {
  std::atomic<int> ran{0};
  auto queue = make();
  std::promise<void> release;
  queue->async([future = release.get_future().share()] { future.wait(); });
  for (int i = 0; i < 10; ++i) {
    queue->async([&ran] { ++ran; });
  }
  queue->asyncAfter(1ms, [&ran] { ++ran; });
  queue.reset();
  release.set_value();
  EXPECT_TRUE(eventually([&] { return ran == 11; }));
}

TEST_F(LinuxWorkQueuesTest, DelayedWorkComesByItsMomentAndNeverEarly) {
  const auto queue = make();
  const auto begin = running_.clock.monotonic();
  std::string ran;
  std::promise<std::chrono::nanoseconds> last;
  queue->asyncAfter(30ms, [&] {
    ran += 'c';
    last.set_value(running_.clock.monotonic());
  });
  queue->asyncAfter(10ms, [&] { ran += 'a'; });
  queue->asyncAfter(20ms, [&] { ran += 'b'; });
  EXPECT_GE(last.get_future().get() - begin, 30ms);
  EXPECT_EQ(ran, "abc");
}

TEST_F(LinuxWorkQueuesTest, ASuspendedQueueGoesOnWithWhatIsNextAheadOfWhatWaits) {
  const auto queue = makeSuspendable();
  std::string ran;
  std::promise<void> suspended;
  queue->async([&] {
    queue->async([&ran] { ran += 'a'; });
    queue->suspend(1h, [&] { ran += queue->isCurrent() ? 'n' : '!'; });
    queue->async([&ran] { ran += 'b'; });
    suspended.set_value();
  });
  suspended.get_future().get();
  finish(*make());
  EXPECT_EQ(queue->waiting(), 2u);
  EXPECT_EQ(ran, "");
  queue->resume();
  finish(*queue);
  EXPECT_EQ(ran, "nab");
}

TEST_F(LinuxWorkQueuesTest, ASuspensionEndsByItselfAndNeverEarly) {
  const auto queue = makeSuspendable();
  std::promise<std::chrono::nanoseconds> ended;
  const auto begin = running_.clock.monotonic();
  queue->async([&] { queue->suspend(30ms, [&] { ended.set_value(running_.clock.monotonic()); }); });
  EXPECT_GE(ended.get_future().get() - begin, 30ms);
  queue->resume();  // nothing is suspended any more
  finish(*queue);
}

TEST_F(LinuxWorkQueuesTest, AQueueMayBeResumedByTheWorkThatSuspendedIt) {
  const auto queue = makeSuspendable();
  std::string ran;
  queue->async([&] {
    queue->suspend(1h, [&] {
      ran += 'n';
      queue->suspend(1h, [&ran] { ran += 'm'; });
      queue->resume();
    });
    queue->resume();
    queue->resume();
    ran += 'w';
  });
  queue->async([&ran] { ran += 'a'; });
  finish(*queue);
  EXPECT_EQ(ran, "wnma");
}

TEST_F(LinuxWorkQueuesTest, ManySuspendedQueuesHoldUpNoOther) {
  std::vector<std::shared_ptr<platform::SuspendableQueue>> waiting;
  std::atomic<int> ended{0};
  for (int i = 0; i < 100; ++i) {
    waiting.push_back(makeSuspendable());
    const auto queue = waiting.back();
    queue->async([queue, &ended] { queue->suspend(1h, [&ended] { ++ended; }); });
  }
  finish(*make());
  EXPECT_TRUE(eventually([&] { return queues_.unfinished() == 100; }));
  EXPECT_EQ(ended, 0);
  EXPECT_FALSE(queues_.settle(1ms));
  for (const auto& queue : waiting) {
    queue->resume();
  }
  EXPECT_TRUE(queues_.settle(20s));
  EXPECT_EQ(ended, 100);
}

TEST_F(LinuxWorkQueuesTest, ASuspendedQueueThatNobodyHoldsAnyMoreIsRun) {
  std::atomic<int> ran{0};
  auto queue = makeSuspendable();
  queue->async([raw = queue.get(), &ran] { raw->suspend(20ms, [&ran] { ++ran; }); });
  queue->async([&ran] { ++ran; });
  ASSERT_TRUE(eventually([&] { return queue->waiting() == 1; }));
  queue.reset();
  EXPECT_TRUE(eventually([&] { return ran == 2; }));
}

TEST_F(LinuxWorkQueuesTest, IsFullFromTheHighMarkToTheLowOneAndTellsSo) {
  std::atomic<int> told{0};
  LinuxWorkQueues queues(running_.clock, running_.loop.queue(), {.high = 10, .low = 4});
  queues.setRoomHandler([&] { told += queues.isFull() ? 100 : 1; });
  const auto queue = queues.makeSuspendableQueue("q", QualityOfService::Utility);
  std::promise<void> suspended;
  queue->async([&] {
    queue->suspend(1h, [] {});
    suspended.set_value();
  });
  suspended.get_future().get();
  EXPECT_TRUE(eventually([&] { return queues.unfinished() == 1; }));
  for (int i = 0; i < 8; ++i) {
    queue->async([] {});
  }
  EXPECT_FALSE(queues.isFull());
  queue->async([] {});
  EXPECT_TRUE(queues.isFull());
  queue->resume();
  EXPECT_TRUE(queues.settle(20s));
  EXPECT_TRUE(eventually([&] { return told == 1; }));
  EXPECT_FALSE(queues.isFull());
}

// Occupies a queue's thread until it ends.
class Blocker {
 public:
  explicit Blocker(platform::WorkQueue& queue) {
    queue.async([this] {
      begun_.set_value();
      end_.get_future().get();
    });
    begun_.get_future().get();
  }
  Blocker(const Blocker&) = delete;
  Blocker& operator=(const Blocker&) = delete;
  ~Blocker() { end(); }
  void end() {
    if (!std::exchange(ended_, true)) {
      end_.set_value();
    }
  }

 private:
  std::promise<void> begun_;
  std::promise<void> end_;
  bool ended_ = false;
};

TEST_F(LinuxWorkQueuesTest, IsCrowdedByWhatWaitsForAThreadUntilHalfOfItIsDoneAndTellsSo) {
  std::atomic<int> told{0};
  queues_.setRoomHandler([&] { told += queues_.isCrowded(10) ? 100 : 1; });
  const auto queue = make();
  Blocker blocker(*queue);  // counts too
  for (int i = 0; i < 9; ++i) {
    queue->async([] {});
  }
  EXPECT_FALSE(queues_.isCrowded(10));
  queue->async([] {});
  EXPECT_TRUE(queues_.isCrowded(10));
  EXPECT_TRUE(queues_.isCrowded(1000));  // it stays so
  EXPECT_FALSE(queues_.isFull());
  EXPECT_EQ(told, 0);
  blocker.end();
  EXPECT_TRUE(queues_.settle(20s));
  EXPECT_TRUE(eventually([&] { return told == 1; }));
  EXPECT_FALSE(queues_.isCrowded(10));
}

TEST_F(LinuxWorkQueuesTest, WhatNobodyWasToldIsCrowdedTellsNoRoom) {
  std::atomic<int> told{0};
  queues_.setRoomHandler([&] { ++told; });
  const auto queue = make();
  Blocker blocker(*queue);
  for (int i = 0; i < 100; ++i) {
    queue->async([] {});
  }
  blocker.end();
  EXPECT_TRUE(queues_.settle(20s));
  EXPECT_EQ(told, 0);
}

TEST_F(LinuxWorkQueuesTest, WhatIsSuspendedCrowdsNobodyBeforeItMayGoOn) {
  const auto queue = makeSuspendable();
  std::promise<void> suspended;
  queue->async([&] {
    queue->async([] {});
    queue->suspend(1h, [] {});
    suspended.set_value();
  });
  queue->async([] {});
  suspended.get_future().get();
  EXPECT_TRUE(eventually([&] { return queues_.unfinished() == 3; }));
  for (int i = 0; i < 20; ++i) {
    queue->async([] {});
  }
  EXPECT_FALSE(queues_.isCrowded(0));
  Blocker other(*make());
  EXPECT_FALSE(queues_.isCrowded(1));
  EXPECT_TRUE(queues_.isCrowded(0));
  other.end();
  queue->resume();
  EXPECT_TRUE(queues_.settle(20s));
  EXPECT_TRUE(eventually([&] { return !queues_.isCrowded(0); }));
}

TEST_F(LinuxWorkQueuesTest, TheEndDestroysWhatIsSuspendedDelayedOrCame) {
  const auto held = std::make_shared<int>(0);
  const std::weak_ptr<int> watched = held;
  std::shared_ptr<platform::SuspendableQueue> queue;
  {
    LinuxWorkQueues queues(running_.clock, running_.loop.queue());
    queue = queues.makeSuspendableQueue("q", QualityOfService::Utility);
    std::promise<void> suspended;
    queue->async([&suspended, queue, held] {
      queue->suspend(1h, [queue, held] { ADD_FAILURE(); });
      queue->asyncAfter(1h, [queue, held] { ADD_FAILURE(); });
      suspended.set_value();
    });
    queue->async([queue, held] { ADD_FAILURE(); });
    suspended.get_future().get();
    queue->async([queue, held] { ADD_FAILURE(); });
  }
  queue->async([queue, held] { ADD_FAILURE(); });
  queue->asyncAfter(1h, [queue, held] { ADD_FAILURE(); });
  queue->resume();
  EXPECT_EQ(watched.use_count(), 1);
  EXPECT_EQ(queue.use_count(), 1);
}

TEST_F(LinuxWorkQueuesTest, TheEndRunsWhatIsReady) {
  std::atomic<int> ran{0};
  {
    LinuxWorkQueues queues(running_.clock, running_.loop.queue());
    const auto queue = queues.makeSerialQueue("q", QualityOfService::Background);
    for (int i = 0; i < 500; ++i) {
      queue->async([&ran] { ++ran; });
    }
  }
  EXPECT_EQ(ran, 500);
}

TEST_F(LinuxWorkQueuesTest, WorkWaitsUntilTheSystemHasAThreadToGive) {
  pthread_attr_t usual;
  ::pthread_getattr_default_np(&usual);
  {
    // No address space holds stacks of this size.
    pthread_attr_t attributes;
    ::pthread_attr_init(&attributes);
    ::pthread_attr_setstacksize(&attributes, std::size_t{1} << 60U);
    ::pthread_setattr_default_np(&attributes);
    EXPECT_FALSE(queues_.start());
  }
  const auto queue = make();
  std::promise<void> ran;
  queue->async([&ran] { ran.set_value(); });
  EXPECT_EQ(queues_.unfinished(), 1u);
  ::pthread_setattr_default_np(&usual);
  EXPECT_TRUE(queues_.start());
  ran.get_future().get();
}

TEST_F(LinuxWorkQueuesTest, APieceThatRunsOutOfMemoryIsGivenUpAndTheNextRuns) {
  const auto before = MemoryReserve::counts();
  const auto queue = make();
  queue->async([] { throw std::bad_alloc(); });
  finish(*queue);
  EXPECT_TRUE(queues_.settle(10s));
  EXPECT_EQ(MemoryReserve::counts().of(MemoryReserve::Loss::Work), before.of(MemoryReserve::Loss::Work) + 1);
}

}  // namespace
}  // namespace tarn::linux_host
