// SPDX-License-Identifier: Apache-2.0
#include "host/loop/LinuxConditions.h"

#include <gtest/gtest.h>

#include <limits>
#include <thread>

#include "tests/host/Eventually.h"
#include "tests/host/loop/RunningLoop.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;

class LinuxConditionsTest : public ::testing::Test {
 protected:
  testing::RunningLoop running_;
  LinuxConditions conditions_{running_.loop};
};

TEST_F(LinuxConditionsTest, AWaitWithoutASignalEndsWhenTheTimeIsUp) {
  const auto condition = conditions_.makeCondition();
  const auto begin = running_.clock.monotonic();
  condition->lock();
  EXPECT_FALSE(condition->waitFor(20ms));
  condition->unlock();
  EXPECT_GE(running_.clock.monotonic() - begin, 20ms);
}

TEST_F(LinuxConditionsTest, ATimeoutThatIsNoPositiveNumberDoesNotWait) {
  const auto condition = conditions_.makeCondition();
  condition->lock();
  EXPECT_FALSE(condition->waitFor(0s));
  EXPECT_FALSE(condition->waitFor(-1s));
  EXPECT_FALSE(condition->waitFor(std::chrono::duration<double>(std::numeric_limits<double>::quiet_NaN())));
  condition->unlock();
}

TEST_F(LinuxConditionsTest, ASignalFromAnotherThreadEndsAnEndlessWait) {
  const auto condition = conditions_.makeCondition();
  bool flag = false;
  condition->lock();
  std::thread signaller([&] {
    condition->lock();
    flag = true;
    condition->signal();
    condition->unlock();
  });
  bool signalled = true;
  while (!flag && signalled) {
    signalled = condition->waitFor(std::chrono::duration<double>(std::numeric_limits<double>::infinity()));
  }
  condition->unlock();
  signaller.join();
  EXPECT_TRUE(signalled);
}

TEST_F(LinuxConditionsTest, AWaitOnTheServerQueueIsToldAsDeliberate) {
  running_.start();
  const auto condition = conditions_.makeCondition();
  bool flag = false;
  running_.loop.queue()->async([&] {
    condition->lock();
    while (!flag) {
      condition->waitFor(60s);
    }
    condition->unlock();
  });
  EXPECT_TRUE(testing::eventually([&] { return running_.loop.progress().sample().waitingSince.has_value(); }));
  condition->lock();
  flag = true;
  condition->signal();
  condition->unlock();
  running_.onQueue([] {});  // after the work that waited
  EXPECT_FALSE(running_.loop.progress().sample().waitingSince.has_value());
}

TEST_F(LinuxConditionsTest, ABlockOfTheServerQueueIsToldAsDeliberateWhileItIsHeld) {
  running_.start();
  const auto waitingSince = [this] { return running_.loop.progress().sample().waitingSince; };
  running_.onQueue([&] {
    const auto begin = running_.clock.monotonic();
    const std::uint64_t steps = running_.loop.progress().sample().steps;
    auto block = conditions_.blockOnPurpose();
    ASSERT_TRUE(waitingSince().has_value());
    EXPECT_GE(*waitingSince(), begin);
    block.reset();
    EXPECT_FALSE(waitingSince().has_value());
    EXPECT_GT(running_.loop.progress().sample().steps, steps);
  });
}

TEST_F(LinuxConditionsTest, ABlockOfAnotherThreadIsNotTold) {
  const auto block = conditions_.blockOnPurpose();
  EXPECT_FALSE(running_.loop.progress().sample().waitingSince.has_value());
}

TEST_F(LinuxConditionsTest, AWaitOnAnotherThreadIsNotTold) {
  const auto condition = conditions_.makeCondition();
  std::atomic<bool> told{false};
  std::atomic<bool> done{false};
  std::thread watcher([&] {
    while (!done) {
      told = told || running_.loop.progress().sample().waitingSince.has_value();
    }
  });
  condition->lock();
  condition->waitFor(10ms);
  condition->unlock();
  done = true;
  watcher.join();
  EXPECT_FALSE(told);
}

}  // namespace
}  // namespace tarn::linux_host
