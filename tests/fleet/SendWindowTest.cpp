// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/SendWindow.h"

#include <gtest/gtest.h>

#include <random>

#include "tests/fleet/FakePublisher.h"
#include "tests/support/Seeds.h"

namespace tarn::fleet {
namespace {

using namespace std::chrono_literals;
using testing::FakePublisher;

class FleetWindow : public ::testing::Test {
 protected:
  void add(std::int64_t event) {
    window_.add("id-" + std::to_string(event), "bytes of " + std::to_string(event), {event, 0, {}, {}});
  }
  void add(std::initializer_list<std::int64_t> events) {
    for (const std::int64_t event : events) {
      add(event);
    }
  }
  // The last id that has arrived with all before it; 0: none since the last call.
  std::int64_t settled() {
    const auto cursor = window_.settled();
    return cursor ? cursor->event : 0;
  }
  void take() {
    std::vector<Outcome> outcomes;
    publisher_.wait(0ms, outcomes);
    window_.take(outcomes, now_);
  }
  void round() {
    window_.send(now_);
    take();
  }

  FakePublisher publisher_;
  std::chrono::nanoseconds now_ = 1000s;
  SendWindow window_{publisher_, Backoff(7, {100ms, 400ms}), {4, 1000, 10s}};
};

TEST(FleetBackoff, DoublesUpToTheCapAndIsNeverTheSame) {
  Backoff backoff(1, {100ms, 1000ms});
  for (const std::int64_t step : {100, 200, 400, 800, 1000, 1000}) {
    const auto pause = backoff.next().count();
    EXPECT_GE(pause, step / 2);
    EXPECT_LE(pause, step);
  }
  backoff.succeeded();
  EXPECT_LE(backoff.next(), 100ms);
  Backoff one(1), other(2);
  bool isSame = true;
  for (int i = 0; i < 100; ++i) {
    isSame = one.next() == other.next() && isSame;
  }
  EXPECT_FALSE(isSame);
  EXPECT_LE(one.next(), 60s);
}

TEST_F(FleetWindow, TheCursorMovesBehindWhatArrivedWithAllBeforeIt) {
  publisher_.setSilent(true);
  add({1, 2, 3});
  round();
  EXPECT_EQ(settled(), 0);
  window_.take({{1, {}}, {2, {}}}, now_);
  EXPECT_EQ(settled(), 0);
  window_.take({{0, {}}}, now_);
  EXPECT_EQ(settled(), 3);
  EXPECT_TRUE(window_.isEmpty());
}

TEST_F(FleetWindow, IsBoundedByMessagesAndBytes) {
  add({1, 2, 3});
  EXPECT_TRUE(window_.hasRoom());
  add(4);
  EXPECT_FALSE(window_.hasRoom());
  round();
  EXPECT_EQ(settled(), 4);
  EXPECT_TRUE(window_.hasRoom());
  window_.add("large", std::string(1000, 'x'), {});
  EXPECT_FALSE(window_.hasRoom());
}

TEST_F(FleetWindow, WhatIsRefusedIsSentAgainAfterAPauseAsItWas) {
  publisher_.setDown(true);
  add({1, 2});
  round();
  EXPECT_EQ(publisher_.tries(), 1);
  publisher_.setDown(false);
  round();
  EXPECT_EQ(publisher_.tries(), 1);
  now_ += 100ms;
  round();  // one alone, as a trial
  EXPECT_EQ(publisher_.tries(), 2);
  round();
  EXPECT_EQ(settled(), 2);
  EXPECT_EQ(publisher_.changed(), 0);
  EXPECT_EQ(window_.counts().refused, 1);
  EXPECT_EQ(window_.counts().lastError, "down");
  EXPECT_EQ(window_.failures(), 0);
}

TEST_F(FleetWindow, ARefusalThatComesLaterIsOneToo) {
  publisher_.setSilent(true);
  add(1);
  round();
  window_.take({{0, Error{0, "full"}}}, now_);
  EXPECT_EQ(window_.counts().lastError, "full");
  EXPECT_EQ(window_.due(), now_ + std::clamp<std::chrono::nanoseconds>(*window_.due() - now_, 50ms, 100ms));
  now_ += 100ms;
  round();
  EXPECT_EQ(publisher_.tries(), 2);
}

TEST_F(FleetWindow, AnAnswerThatNeverComesIsWaitedForAndThenAskedForAgain) {
  publisher_.losesAnswers = 1;
  add(1);
  round();
  EXPECT_EQ(window_.due(), now_ + 10s);
  now_ += 10s - 1ns;
  round();
  EXPECT_EQ(publisher_.tries(), 1);
  now_ += 1ns;
  round();
  now_ += 100ms;
  publisher_.losesAnswers = 0;
  round();
  EXPECT_EQ(settled(), 1);
  EXPECT_EQ(publisher_.repeats(), 1);
  EXPECT_EQ(window_.counts().unanswered, 1);
}

TEST_F(FleetWindow, ALateWordOfAnEarlierTryCountsAndOneOfAMessageThatIsGoneDoesNot) {
  publisher_.losesAnswers = 1;
  add({1, 2});
  round();
  now_ += 10s;
  window_.send(now_);
  window_.take({{0, {}}}, now_);
  EXPECT_EQ(settled(), 1);
  window_.take({{0, {}}, {0, Error{0, "late"}}, {77, {}}}, now_);
  EXPECT_EQ(settled(), 0);
  window_.take({{1, {}}, {1, Error{0, "late"}}}, now_);
  EXPECT_EQ(settled(), 2);
  EXPECT_NE(window_.counts().lastError, "late");
}

TEST_F(FleetWindow, WhileATrialIsOnItsWayNothingElseIsDue) {
  publisher_.setDown(true);
  add({1, 2});
  round();
  publisher_.setDown(false);
  publisher_.setSilent(true);
  now_ += 100ms;
  round();
  EXPECT_EQ(publisher_.tries(), 2);
  EXPECT_EQ(window_.due(), now_ + 10s);
}

TEST_F(FleetWindow, ManyFailuresOfOneMomentAreOneStepOfThePause) {
  publisher_.setSilent(true);
  add({1, 2, 3, 4});
  round();
  window_.take({{0, Error{}}, {1, Error{}}, {2, Error{}}, {3, Error{}}}, now_);
  EXPECT_EQ(window_.failures(), 1);
}

// Whatever is refused, lost or comes in another order: everything arrives, and the cursor never stands behind what
// didn't.
TEST_F(FleetWindow, UnderEveryFaultTheCursorNeverPassesWhatHasNotArrived) {
  for (const std::uint64_t seed : testing::testSeeds(3)) {
    SCOPED_TRACE(testing::seedNote(seed));
    FakePublisher publisher(seed);
    publisher.refuses = 0.3;
    publisher.loses = 0.05;
    publisher.losesAnswers = 0.1;
    publisher.reorders = true;
    SendWindow window(publisher, Backoff(seed), {16, 1 << 20, 10s});
    constexpr std::int64_t kEvents = 2000;
    std::int64_t added = 0;
    std::int64_t settled = 0;
    for (int step = 0; settled < kEvents && step < 1'000'000; ++step) {
      while (window.hasRoom() && added < kEvents) {
        ++added;
        window.add("id-" + std::to_string(added), std::to_string(added), {added, 0, {}, {}});
      }
      window.send(now_);
      std::vector<Outcome> outcomes;
      publisher.wait(0ms, outcomes);
      window.take(outcomes, now_);
      if (const auto cursor = window.settled()) {
        ASSERT_EQ(publisher.messages().count("id-" + std::to_string(cursor->event)), 1U);
        ASSERT_GT(cursor->event, settled);
        for (; settled < cursor->event; ++settled) {
          ASSERT_EQ(publisher.messages().count("id-" + std::to_string(settled + 1)), 1U);
        }
      }
      now_ = std::max(now_, window.due().value_or(now_));
    }
    EXPECT_EQ(settled, kEvents);
    EXPECT_EQ(publisher.messages().size(), static_cast<std::size_t>(kEvents));
    EXPECT_EQ(publisher.changed(), 0);
    EXPECT_GT(publisher.repeats(), 0);
  }
}

}  // namespace
}  // namespace tarn::fleet
