// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeNotificationCenter.h"

#include <gtest/gtest.h>

#include <vector>

#include "testing/ManualClock.h"
#include "testing/ManualWorkQueues.h"

namespace tarn::testing {
namespace {

class FakeNotificationCenterTest : public ::testing::Test {
 protected:
  std::int32_t listen(const char* name) {
    return center_.registerFor(name, queue_, [this](std::int32_t token) { heard_.push_back(token); }).token;
  }

  ManualClock clock_;
  ManualWorkQueues queues_{clock_};
  std::shared_ptr<platform::WorkQueue> queue_ = queues_.makeSerialQueue("queue", platform::QualityOfService::Utility);
  FakeNotificationCenter center_;
  std::vector<std::int32_t> heard_;
};

TEST_F(FakeNotificationCenterTest, PostIsDeliveredOnTheQueueToItsNameAlone) {
  const auto token = listen("a");
  listen("b");
  ASSERT_TRUE(center_.post("a", 5));
  EXPECT_TRUE(heard_.empty());
  queues_.runUntilIdle();
  EXPECT_EQ(heard_, std::vector<std::int32_t>{token});
  EXPECT_EQ(center_.state(token), 5U);
}

TEST_F(FakeNotificationCenterTest, StateCannotBeReadBeforeThereIsOne) {
  const auto token = listen("a");
  EXPECT_EQ(center_.state(token), std::nullopt);
  EXPECT_EQ(center_.state(token + 1), std::nullopt);
}

TEST_F(FakeNotificationCenterTest, PostWithoutAStateKeepsTheWordOrMakesItZero) {
  const auto token = listen("a");
  ASSERT_TRUE(center_.post("a", std::nullopt));
  EXPECT_EQ(center_.state(token), 0U);
  center_.setState("a", 3);
  ASSERT_TRUE(center_.post("a", std::nullopt));
  EXPECT_EQ(center_.state(token), 3U);
}

TEST_F(FakeNotificationCenterTest, CancelStopsADeliveryThatIsUnderWay) {
  const auto token = listen("a");
  ASSERT_TRUE(center_.post("a", 1));
  center_.cancel(token);
  queues_.runUntilIdle();
  EXPECT_TRUE(heard_.empty());
  EXPECT_EQ(center_.tokenFor("a"), std::nullopt);
}

TEST_F(FakeNotificationCenterTest, FaultSwitchesFailRegistrationsReadsAndPosts) {
  center_.failNextRegistration(9);
  EXPECT_EQ(center_.registerFor("a", queue_, [](std::int32_t) {}).status, 9);
  const auto token = listen("a");
  center_.setState("a", 1);
  center_.failReads(true);
  EXPECT_EQ(center_.state(token), std::nullopt);
  center_.failPosts(true);
  EXPECT_FALSE(center_.post("a", 1));
  EXPECT_TRUE(center_.posted().empty());
}

}  // namespace
}  // namespace tarn::testing
