// SPDX-License-Identifier: Apache-2.0
// Whose work a piece of work is, on every road that it may take; run under ThreadSanitizer as well.
#include "host/loop/WorkOwner.h"

#include <gtest/gtest.h>
#include <sys/eventfd.h>

#include <atomic>
#include <future>
#include <memory>
#include <random>
#include <thread>
#include <utility>
#include <vector>

#include "host/loop/LinuxWorkQueues.h"
#include "host/loop/MainLoop.h"
#include "host/loop/ServerQueue.h"
#include "host/loop/WorkLane.h"
#include "testing/ManualClock.h"
#include "tests/host/Eventually.h"
#include "tests/host/loop/RunningLoop.h"
#include "tests/support/Seeds.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::QualityOfService;
using platform::SessionNumber;
using testing::eventually;
using Numbers = std::vector<SessionNumber>;

constexpr std::size_t kAll = 1000;

TEST(WorkOwnerTest, ScopesNestAndEachThreadHasItsOwn) {
  const WorkOwner outer(3);
  {
    const WorkOwner inner(4);
    EXPECT_EQ(WorkOwner::current(), 4);
    EXPECT_EQ(std::async(std::launch::async, [] { return WorkOwner::current(); }).get(), 0);
  }
  EXPECT_EQ(WorkOwner::current(), 3);
}

TEST(WorkOwnerTest, EnteringAnswersWhoseWorkItWas) {
  EXPECT_EQ(WorkOwner::enter(5), 0);
  EXPECT_EQ(WorkOwner::enter(0), 5);
}

class OwnedServerWork : public ::testing::Test {
 protected:
  platform::Work note() {
    return [this] { seen_.push_back(WorkOwner::current()); };
  }

  testing::ManualClock clock_;
  QueueProgress progress_;
  ServerQueue queue_{clock_, progress_};
  Numbers seen_;
};

TEST_F(OwnedServerWork, IsThatOfWhoeverHandedItOver) {
  {
    const WorkOwner session(1);
    queue_.async(note());
  }
  queue_.async(note());
  {
    const WorkOwner session(2);
    queue_.async(note());
  }
  queue_.run(kAll);
  EXPECT_EQ(seen_, (Numbers{1, 0, 2}));
  EXPECT_EQ(WorkOwner::current(), 0);
}

TEST_F(OwnedServerWork, StaysSoWhilePutOffAndForWhatItHandsOver) {
  {
    const WorkOwner session(6);
    queue_.asyncAfter(1s, [this] { queue_.async(note()); });
  }
  clock_.advance(1s);
  queue_.run(kAll);
  EXPECT_EQ(seen_, Numbers{6});
}

TEST_F(OwnedServerWork, LeavesNothingBehindWhenMemoryIsMissingForIt) {
  {
    const WorkOwner session(6);
    queue_.async([] { throw std::bad_alloc(); });
  }
  queue_.async(note());
  queue_.run(kAll);
  EXPECT_EQ(seen_, Numbers{0});
}

TEST_F(OwnedServerWork, IsThatOfWhoeverHandedItOverInALaneToo) {
  WorkLane lane(&queue_);
  lane.beginTurn(kAll);
  {
    const WorkLane::Scope scope(&lane);
    const WorkOwner session(8);
    queue_.async(note());
  }
  queue_.asyncIn(lane, note());
  queue_.runLane(lane);
  EXPECT_EQ(seen_, (Numbers{8, 0}));
}

TEST_F(OwnedServerWork, IsStillThatOfTheSessionAfterItGaveWay) {
  WorkLane lane(&queue_);
  lane.beginTurn(kAll);
  queue_.asyncIn(lane, [this] {
    const WorkOwner session(9);
    queue_.asyncNext(note());
  });
  queue_.asyncIn(lane, note());
  queue_.runLane(lane);
  EXPECT_EQ(seen_, (Numbers{9, 0}));
}

class OwnedPoolWork : public ::testing::Test {
 protected:
  std::shared_ptr<platform::SuspendableQueue> make() {
    return queues_.makeSuspendableQueue("q", QualityOfService::Utility);
  }
  // Whose work the next piece is, once it ran.
  static std::pair<platform::Work, std::future<SessionNumber>> asking() {
    auto promise = std::make_shared<std::promise<SessionNumber>>();
    auto answer = promise->get_future();
    return {[promise] { promise->set_value(WorkOwner::current()); }, std::move(answer)};
  }

  testing::RunningLoop running_;
  LinuxWorkQueues queues_{running_.clock, running_.loop.queue()};
};

TEST_F(OwnedPoolWork, IsThatOfWhoeverHandedItOver) {
  const auto queue = make();
  auto [first, ofFirst] = asking();
  auto [second, ofSecond] = asking();
  {
    const WorkOwner session(1);
    queue->async(std::move(first));
  }
  queue->asyncAtOnce(std::move(second));
  EXPECT_EQ(ofFirst.get(), 1);
  EXPECT_EQ(ofSecond.get(), 0);
}

TEST_F(OwnedPoolWork, StaysSoWhilePutOffAndForWhatItHandsOver) {
  const auto queue = make();
  const auto other = make();
  auto [work, owner] = asking();
  {
    const WorkOwner session(2);
    queue->asyncAfter(1ms, [&other, piece = std::move(work)]() mutable { other->async(std::move(piece)); });
  }
  EXPECT_EQ(owner.get(), 2);
}

TEST_F(OwnedPoolWork, GoesOnForItsSessionAfterASuspensionWhoeverEndsThat) {
  const auto queue = make();
  auto [next, owner] = asking();
  std::promise<void> suspended;
  {
    const WorkOwner session(3);
    queue->async([&, then = std::move(next)]() mutable {
      queue->suspend(60s, std::move(then));
      suspended.set_value();
    });
  }
  suspended.get_future().get();
  {
    const WorkOwner session(4);
    queue->resume();
  }
  EXPECT_EQ(owner.get(), 3);
}

TEST_F(OwnedPoolWork, StaysItsOwnOnTheThreadOfWhoeverHelps) {
  const auto queue = make();
  std::vector<std::shared_ptr<platform::SuspendableQueue>> busy;
  std::promise<void> release;
  const auto released = release.get_future().share();
  std::atomic<std::size_t> blocked{0};
  for (std::size_t thread = 0; thread < LinuxWorkQueues::kThreads; ++thread) {
    busy.push_back(make());
    busy.back()->async([released, &blocked] {
      ++blocked;
      released.wait();
    });
  }
  ASSERT_TRUE(eventually([&] { return blocked == LinuxWorkQueues::kThreads; }));
  auto [work, owner] = asking();
  {
    const WorkOwner session(5);
    queue->async(std::move(work));
  }
  const WorkOwner session(6);
  queue->help(60s);
  EXPECT_EQ(owner.get(), 5);
  EXPECT_EQ(WorkOwner::current(), 6);
  release.set_value();
}

TEST(OwnedEvents, AreNobodysWhileASessionsWorkWaitsOnPurpose) {
  class Handler : public EventHandler {
   public:
    void handleEvents(std::uint32_t) override { seen = WorkOwner::current(); }
    std::atomic<SessionNumber> seen{-1};
  };
  testing::RunningLoop running;
  const UniqueDescriptor ready(::eventfd(1, EFD_CLOEXEC));
  const auto handler = std::make_shared<Handler>();
  running.start();
  const SessionNumber after = running.onQueue([&] {
    const WorkOwner session(7);
    EXPECT_TRUE(running.loop.watch(ready.get(), EPOLLIN, handler).ok());
    running.loop.waitUntil(running.clock.monotonic() + 60s, [&] { return handler->seen != -1; });
    running.loop.unwatch(ready.get());
    return WorkOwner::current();
  });
  EXPECT_EQ(handler->seen, 0);
  EXPECT_EQ(after, 7);
}

// Sessions hand over to each other's queues, at once, later and through suspensions, from many threads: each piece is
// that of the session whose work handed it over.
class OwnedWorkStress {
 public:
  OwnedWorkStress() {
    running_.start();
    for (int i = 0; i < kQueues; ++i) {
      all_.push_back(queues_.makeSuspendableQueue("stress", QualityOfService::Utility));
    }
  }
  // A chain of so many pieces, each of which hands over the next.
  void handOver(SessionNumber session, std::uint64_t random, int pieces) {
    auto piece = [this, session, random, pieces] {
      wrong_ += WorkOwner::current() == session ? 0 : 1;
      ++ran_;
      if (pieces > 1) {
        handOver(session, random * 6364136223846793005U + 1442695040888963407U, pieces - 1);
      }
    };
    const auto road = random >> 60U;
    const auto& queue = all_[(random >> 40U) % all_.size()];
    if (road < 4) {
      running_.loop.queue()->async(piece);
    } else if (road < 6) {
      running_.loop.queue()->asyncAfter(std::chrono::microseconds(road), piece);
    } else if (road < 11) {
      queue->async(piece);
    } else if (road < 13) {
      queue->asyncAfter(std::chrono::microseconds(road), piece);
    } else {
      queue->async([queue, piece] { queue->suspend(std::chrono::microseconds(50), piece); });
    }
  }
  bool finished(int pieces) {
    return eventually([&] { return ran_ == pieces; }, 60s);
  }
  int wrong() const { return wrong_; }

 private:
  static constexpr int kQueues = 6;
  testing::RunningLoop running_;
  LinuxWorkQueues queues_{running_.clock, running_.loop.queue()};
  std::vector<std::shared_ptr<platform::SuspendableQueue>> all_;
  std::atomic<int> wrong_{0};
  std::atomic<int> ran_{0};
};

TEST(QueueStress, EveryPieceIsThatOfTheSessionThatHandedItOver) {
  constexpr int kThreads = 6;
  constexpr int kChains = 40;
  constexpr int kPieces = 50;
  for (const std::uint64_t seed : tarn::testing::testSeeds(3)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    OwnedWorkStress stress;
    std::vector<std::thread> threads;
    for (unsigned thread = 0; thread < kThreads; ++thread) {
      threads.emplace_back([&, thread] {
        std::mt19937_64 random(seed + thread);
        for (int chain = 0; chain < kChains; ++chain) {
          const auto session = static_cast<SessionNumber>(1 + thread * kChains + static_cast<unsigned>(chain));
          const WorkOwner scope(session);
          stress.handOver(session, random(), kPieces);
        }
      });
    }
    for (std::thread& thread : threads) {
      thread.join();
    }
    EXPECT_TRUE(stress.finished(kThreads * kChains * kPieces));
    EXPECT_EQ(stress.wrong(), 0);
  }
}

}  // namespace
}  // namespace tarn::linux_host
