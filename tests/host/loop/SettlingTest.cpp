// SPDX-License-Identifier: Apache-2.0
#include "host/loop/Settling.h"

#include <gtest/gtest.h>

#include <deque>
#include <future>
#include <utility>
#include <vector>

#include "host/loop/LinuxWorkQueues.h"
#include "tests/host/Eventually.h"
#include "tests/host/loop/SteadyClock.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using testing::eventually;

// Queues of which each wait leaves what the test says; 0 is settled.
class ScriptedQueues {
 public:
  ScriptedQueues(std::size_t unfinished, std::deque<std::size_t> afterEachWait)
      : unfinished_(unfinished), afterEachWait_(std::move(afterEachWait)) {}
  std::size_t unfinished() const { return unfinished_; }
  bool settle(std::chrono::nanoseconds longest) {
    waits_.push_back(longest);
    if (!afterEachWait_.empty()) {
      unfinished_ = afterEachWait_.front();
      afterEachWait_.pop_front();
    }
    return unfinished_ == 0;
  }
  const std::vector<std::chrono::nanoseconds>& waits() const { return waits_; }

 private:
  std::size_t unfinished_;
  std::deque<std::size_t> afterEachWait_;
  std::vector<std::chrono::nanoseconds> waits_;
};

TEST(Settling, AsksIdleQueuesOnce) {
  ScriptedQueues queues(0, {});
  EXPECT_EQ(settleWhileShrinking(queues, 3s), 0U);
  EXPECT_EQ(queues.waits(), (std::vector<std::chrono::nanoseconds>{3s}));
}

TEST(Settling, WaitsAgainWheneverAWaitLeavesLess) {
  ScriptedQueues queues(9, {8, 5, 1, 0});
  EXPECT_EQ(settleWhileShrinking(queues, 3s), 0U);
  EXPECT_EQ(queues.waits(), (std::vector<std::chrono::nanoseconds>(4, 3s)));
}

TEST(Settling, GivesUpWhenAWaitFinishesNothing) {
  ScriptedQueues queues(9, {8, 8, 0});
  EXPECT_EQ(settleWhileShrinking(queues, 3s), 8U);
  EXPECT_EQ(queues.waits().size(), 2U);
}

TEST(Settling, GivesUpWhenTheQueuesGrow) {
  ScriptedQueues queues(2, {1, 7, 0});
  EXPECT_EQ(settleWhileShrinking(queues, 3s), 7U);
}

// The pool's queues, of which each wait lets one piece of work end and then times out.
class SteppedQueues {
 public:
  SteppedQueues(LinuxWorkQueues& queues, std::vector<std::promise<void>>& letGo) : queues_(queues), letGo_(letGo) {}
  std::size_t unfinished() const { return queues_.unfinished(); }
  bool settle(std::chrono::nanoseconds /*longest*/) {
    const std::size_t before = queues_.unfinished();
    if (waits_ < letGo_.size()) {
      letGo_[waits_++].set_value();
    }
    EXPECT_TRUE(eventually([&] { return queues_.unfinished() < before; }));
    return queues_.settle(0ns);
  }
  std::size_t waits() const { return waits_; }

 private:
  LinuxWorkQueues& queues_;
  std::vector<std::promise<void>>& letGo_;
  std::size_t waits_ = 0;
};

TEST(Settling, WaitsUntilThePoolsQueuesHaveShrunkToNothing) {
  const testing::SteadyClock clock;
  std::vector<std::promise<void>> letGo(3 * LinuxWorkQueues::kThreads);
  LinuxWorkQueues pool(clock, nullptr);
  for (auto& piece : letGo) {
    pool.makeSerialQueue("own", platform::QualityOfService::Utility)->async([&piece] { piece.get_future().wait(); });
  }
  SteppedQueues queues(pool, letGo);
  EXPECT_EQ(settleWhileShrinking(queues, 1ms), 0U);
  EXPECT_EQ(queues.waits(), letGo.size());
}

}  // namespace
}  // namespace tarn::linux_host
