// SPDX-License-Identifier: Apache-2.0
#include "recorder/LateReplies.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>
#include <vector>

#include "host/loop/LinuxWorkQueues.h"
#include "testing/ManualClock.h"
#include "testing/ManualWorkQueues.h"
#include "testing/backends/RecordingSessionRecords.h"
#include "tests/host/loop/SteadyClock.h"

namespace tarn::recorder {
namespace {

using namespace std::chrono_literals;

class LateRepliesTest : public ::testing::Test {
 protected:
  platform::Work reply(int number) {
    return [this, number] { replies_.push_back(number); };
  }

  tarn::testing::ManualClock clock_;
  tarn::testing::ManualWorkQueues queues_{clock_};
  std::vector<int> replies_;
};

TEST_F(LateRepliesTest, ComeAfterTheCallInItsOrderOnOneQueue) {
  LateReplies late(queues_, {"replies"});
  EXPECT_TRUE(queues_.names().empty());
  EXPECT_TRUE(late.add(reply(1)));
  EXPECT_TRUE(late.add(reply(2)));
  EXPECT_TRUE(replies_.empty());
  queues_.runUntilIdle();
  EXPECT_EQ(replies_, (std::vector<int>{1, 2}));
  EXPECT_EQ(queues_.names(), (std::vector<std::string>{"replies"}));
}

TEST_F(LateRepliesTest, AreWorkOfTheSessionThatAskedForThem) {
  using tarn::testing::RecordingSessionRecords;
  LateReplies late(queues_, {"replies", 1024, 20ms});
  std::vector<platform::SessionNumber> owners;
  for (const platform::SessionNumber session : {4, 9}) {
    const RecordingSessionRecords::Scope scope(session);
    EXPECT_TRUE(late.add([&owners] { owners.push_back(RecordingSessionRecords::current()); }));
  }
  queues_.advance(20ms);
  EXPECT_EQ(owners, (std::vector<platform::SessionNumber>{4, 9}));
}

TEST_F(LateRepliesTest, EachComesByItsOwnDelay) {
  LateReplies late(queues_, {"replies", 10, 5ms});
  EXPECT_TRUE(late.add(reply(1)));
  queues_.advance(3ms);
  EXPECT_TRUE(late.add(reply(2)));
  queues_.advance(2ms);
  EXPECT_EQ(replies_, (std::vector<int>{1}));
  queues_.advance(3ms);
  EXPECT_EQ(replies_, (std::vector<int>{1, 2}));
}

TEST_F(LateRepliesTest, BeyondTheBoundAReplyStaysTheCallers) {
  LateReplies late(queues_, {"replies", 2});
  int taken = 0;
  platform::Work third = reply(3);
  EXPECT_TRUE(late.add(reply(1), [&] { ++taken; }));
  EXPECT_TRUE(late.add(reply(2), [&] { ++taken; }));
  EXPECT_FALSE(late.add(std::move(third), [&] { ++taken; }));
  EXPECT_EQ(taken, 2);
  third();
  EXPECT_EQ(replies_, (std::vector<int>{3}));
  queues_.runOne();
  EXPECT_TRUE(late.add(reply(4)));
}

TEST_F(LateRepliesTest, WhatWaitsComesThoughTheirOwnerIsGone) {
  {
    LateReplies late(queues_, {"replies"});
    EXPECT_TRUE(late.add(reply(1)));
  }
  queues_.runUntilIdle();
  EXPECT_EQ(replies_, (std::vector<int>{1}));
}

TEST_F(LateRepliesTest, WhatFailsWhenAReplyIsTakenTakesItBack) {
  LateReplies late(queues_, {"replies"});
  EXPECT_THROW(static_cast<void>(late.add(reply(1), [] { throw std::bad_alloc(); })), std::bad_alloc);
  EXPECT_TRUE(late.add(reply(2)));
  queues_.runUntilIdle();
  EXPECT_EQ(replies_, (std::vector<int>{2}));
}

TEST_F(LateRepliesTest, AReplyThatRunsOutOfMemoryDoesNotHoldUpTheEnd) {
  LateReplies late(queues_, {"replies"});
  EXPECT_TRUE(late.add([] { throw std::bad_alloc(); }));
  EXPECT_THROW(queues_.runUntilIdle(), std::bad_alloc);
  late.close();
}

TEST_F(LateRepliesTest, ClosedTheyDropWhatWaitsAndTakeNoMore) {
  LateReplies late(queues_, {"replies"});
  const auto held = std::make_shared<int>(0);
  EXPECT_TRUE(late.add([held] { ADD_FAILURE(); }));
  late.close();
  EXPECT_EQ(held.use_count(), 1);
  EXPECT_FALSE(late.add(reply(2)));
  late.ifOpen([] { ADD_FAILURE(); });
  queues_.runUntilIdle();
  EXPECT_TRUE(replies_.empty());
}

TEST_F(LateRepliesTest, ClosingWaitsForTheReplyThatIsUnderWay) {
  tarn::testing::SteadyClock steady;
  linux_host::LinuxWorkQueues threads(steady, nullptr);
  LateReplies late(threads, {"replies"});
  std::promise<void> entered;
  std::promise<void> letGo;
  std::atomic<bool> finished{false};
  EXPECT_TRUE(late.add([&] {
    entered.set_value();
    letGo.get_future().wait();
    finished = true;
  }));
  entered.get_future().wait();
  std::thread releaser([&] { letGo.set_value(); });
  late.close();
  EXPECT_TRUE(finished);
  releaser.join();
}

}  // namespace
}  // namespace tarn::recorder
