// SPDX-License-Identifier: Apache-2.0
// Lanes of the server queue: their order, their turns, and work that gives way.
#include "host/loop/WorkLane.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "host/loop/ServerQueue.h"
#include "tests/host/loop/SteadyClock.h"

namespace tarn::linux_host {
namespace {

class WorkLaneTest : public ::testing::Test {
 protected:
  platform::Work note(std::string what) {
    return [this, what = std::move(what)] { done_.push_back(what); };
  }
  // So many slices of this cost, each giving way when it is told to.
  void slices(int left, std::size_t cost) {
    done_.push_back("slice");
    if (left == 1) return;
    if (queue_.spend(cost)) {
      queue_.asyncNext([this, left, cost] { slices(left - 1, cost); });
    } else {
      slices(left - 1, cost);
    }
  }
  void turn(std::int64_t credit) {
    lane_.beginTurn(credit);
    queue_.runLane(lane_);
  }

  testing::SteadyClock clock_;
  QueueProgress progress_;
  ServerQueue queue_{clock_, progress_};
  WorkLane lane_{&queue_};
  std::vector<std::string> done_;
  using Done = std::vector<std::string>;
};

TEST_F(WorkLaneTest, WorkOfAScopeGoesToItsLaneAndOtherWorkToTheQueue) {
  {
    const WorkLane::Scope scope(&lane_);
    queue_.async(note("lane"));
  }
  queue_.async(note("queue"));
  EXPECT_EQ(queue_.ready(), 1U);
  EXPECT_EQ(queue_.waiting(), 2U);
  queue_.run(10);
  EXPECT_EQ(done_, Done{"queue"});
  turn(1);
  EXPECT_EQ(done_, (Done{"queue", "lane"}));
  EXPECT_EQ(queue_.waiting(), 0U);
}

TEST_F(WorkLaneTest, AnInnerScopeOfNoLaneIsTheQueuesOwn) {
  const WorkLane::Scope scope(&lane_);
  {
    const WorkLane::Scope nobodys(nullptr);
    queue_.async(note("queue"));
  }
  queue_.async(note("lane"));
  EXPECT_EQ(queue_.ready(), 1U);
  EXPECT_FALSE(lane_.empty());
}

TEST_F(WorkLaneTest, OtherThreadsAndOtherQueuesAreNotMeant) {
  ServerQueue other(clock_, progress_);
  const WorkLane::Scope scope(&lane_);
  std::thread([this] { queue_.async(note("thread")); }).join();
  other.async(note("other"));
  EXPECT_EQ(queue_.ready(), 1U);
  EXPECT_EQ(other.ready(), 1U);
  EXPECT_TRUE(lane_.empty());
}

TEST_F(WorkLaneTest, ItsWorkRunsAsTheQueuesAndWhatThatHandsOverComesLast) {
  queue_.asyncIn(lane_, [this] {
    EXPECT_TRUE(queue_.isCurrent());
    queue_.async(note("handed over"));
    done_.push_back("first");
  });
  queue_.asyncIn(lane_, note("second"));
  turn(1);
  EXPECT_EQ(done_, (Done{"first", "second", "handed over"}));
  EXPECT_FALSE(queue_.isCurrent());
}

TEST_F(WorkLaneTest, LongWorkGivesWayWhenItsCreditIsSpentAndStaysAheadOfWhatCameAfterIt) {
  queue_.asyncIn(lane_, [this] { slices(5, 10); });
  queue_.asyncIn(lane_, note("next request"));
  turn(20);
  EXPECT_EQ(done_.size(), 2U);
  EXPECT_EQ(lane_.spent(), 20);
  EXPECT_EQ(queue_.waiting(), 2U);
  turn(20);
  turn(20);
  turn(20);
  EXPECT_EQ(done_, (Done{"slice", "slice", "slice", "slice", "slice", "next request"}));
}

TEST_F(WorkLaneTest, LongWorkGivesWayAtOnceWhenWhatItMakesCannotBeTakenIn) {
  bool full = true;
  queue_.setPauseSource([&full] { return full; });
  queue_.asyncIn(lane_, [this] { slices(3, 1); });
  turn(1000);
  EXPECT_EQ(done_.size(), 1U);
  full = false;
  turn(1000);
  EXPECT_EQ(done_.size(), 3U);
}

TEST_F(WorkLaneTest, WorkOfTheQueueItselfIsNeverAskedToGiveWay) {
  queue_.setPauseSource([] { return true; });
  queue_.async([this] { slices(5, 1000000); });
  queue_.run(10);
  EXPECT_EQ(done_.size(), 5U);
}

}  // namespace
}  // namespace tarn::linux_host
