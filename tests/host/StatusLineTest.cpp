// SPDX-License-Identifier: Apache-2.0
// The line that the service manager shows: its text, when it is told, and that an idle service isn't woken for it.
#include "host/StatusLine.h"

#include <gtest/gtest.h>

#include <limits>
#include <vector>

#include "testing/ManualClock.h"

namespace tarn::linux_host {
namespace {

class ToldManager final : public ServiceManager {
 public:
  void notifyStatus(const std::string& line) override { told.push_back(line); }
  bool listens() const override { return isThere; }

  bool isThere = true;
  std::vector<std::string> told;
};

class StatusLineTest : public ::testing::Test {
 protected:
  void pass(std::chrono::nanoseconds time) {
    clock_.advance(time);
    loop_.queue()->run(std::numeric_limits<std::size_t>::max());
  }
  // Whether nothing would end a sleep of the loop.
  bool sleepsForEver() {
    const auto timeout = loop_.queue()->prepareToSleep();
    loop_.queue()->awake();
    return !timeout;
  }

  testing::ManualClock clock_;
  ToldManager manager_;
  MainLoop loop_{clock_};
  StatusNumbers numbers_;
  StatusLine line_{loop_, manager_, [this] { return numbers_; }};
};

TEST(StatusLineText, TellsSessionsClientsTheQueueAndMessages) {
  EXPECT_EQ(statusLineOf({12, 3, 0, 1234}), "12 sessions of 3 clients, 0 waiting, 1,234 messages");
  EXPECT_EQ(statusLineOf({1, 1, 1, 1}), "1 session of 1 client, 1 waiting, 1 message");
  EXPECT_EQ(statusLineOf({0, 999, 1000, 1234567}), "0 sessions of 999 clients, 1,000 waiting, 1,234,567 messages");
}

TEST_F(StatusLineTest, IsToldAtTheStartAndSomeSecondsAfterAChange) {
  line_.start();
  ASSERT_EQ(manager_.told.size(), 1U);
  numbers_.messages = 7;
  line_.look(1);
  numbers_.messages = 8;
  line_.look(2);
  pass(StatusLine::kBetween - std::chrono::milliseconds(1));
  EXPECT_EQ(manager_.told.size(), 1U);
  pass(std::chrono::milliseconds(1));
  ASSERT_EQ(manager_.told.size(), 2U);
  EXPECT_EQ(manager_.told[1], "0 sessions of 0 clients, 0 waiting, 8 messages");
}

TEST_F(StatusLineTest, IsNotToldAgainUnchanged) {
  line_.start();
  line_.look(1);
  pass(StatusLine::kBetween);
  EXPECT_EQ(manager_.told.size(), 1U);
}

TEST_F(StatusLineTest, NobodyIsWokenWhileNothingComesIn) {
  line_.start();
  line_.look(1);
  pass(StatusLine::kBetween);
  line_.look(1);
  EXPECT_TRUE(sleepsForEver());
}

TEST_F(StatusLineTest, WhatWaitedIsLookedAtAgainUntilItIsDone) {
  line_.start();
  numbers_.waiting = 2;
  line_.look(1);
  pass(StatusLine::kBetween);
  numbers_.waiting = 0;
  pass(StatusLine::kBetween);
  ASSERT_EQ(manager_.told.size(), 3U);
  EXPECT_EQ(manager_.told[2], "0 sessions of 0 clients, 0 waiting, 0 messages");
  EXPECT_TRUE(sleepsForEver());
}

TEST_F(StatusLineTest, WithoutAManagerNothingIsDone) {
  manager_.isThere = false;
  line_.start();
  line_.look(1);
  EXPECT_TRUE(sleepsForEver());
  EXPECT_TRUE(manager_.told.empty());
}

}  // namespace
}  // namespace tarn::linux_host
