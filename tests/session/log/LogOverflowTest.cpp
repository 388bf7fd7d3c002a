// SPDX-License-Identifier: Apache-2.0
// A session whose log has no room in memory does what any session does.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class LogOverflow : public SessionFixture {
 protected:
  LogOverflow() {
    platform_.overflow.setBounds(1, std::size_t{1} << 40U);  // nothing stays
    useWorkers<ConsumerWorker>();
  }
  plist::Dictionary stamped(plist::Dictionary payload) const {
    payload.set("tarnreporting_timestamp", now());
    return payload;
  }
  bool isRedundant(TarnReportingSession& session, plist::Dictionary payload,
                   AudioEventType type = AudioEventType::Start) const {
    const auto sent = message(stamped(std::move(payload)), AudioEventCategory::Playback, type);
    session.sendMessage(sent);
    return sent->isRedundant();
  }
};

TEST_F(LogOverflow, RepeatedMessageIsRedundantThoughTheFirstIsOnDisk) {
  const auto session = makeSession();
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.5}}));
  EXPECT_EQ(session->messages().overflowed(), 1U);
  EXPECT_TRUE(isRedundant(*session, {{"volume", 0.5}}));
  EXPECT_EQ(session->messages().size(), 1U);
}

TEST_F(LogOverflow, OtherBoundsOfTheStoreHoldForLogsThatAreThere) {
  constexpr std::size_t kMuch = std::size_t{1} << 40U;
  platform_.overflow.setBounds(kMuch, kMuch);
  const auto session = makeSession();
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.5}}));
  EXPECT_EQ(session->messages().overflowed(), 0U);
  platform_.overflow.setBounds(1, kMuch);
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.75}}));
  EXPECT_GT(session->messages().overflowed(), 0U);
}

TEST_F(LogOverflow, OnlyTheNewestOfItsKindIsComparedWith) {
  const auto session = makeSession();
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.5}}));
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.75}}));
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.5}}));
  EXPECT_FALSE(isRedundant(*session, {{"volume", 0.5}}, AudioEventType::Stop));
  EXPECT_TRUE(isRedundant(*session, {{"volume", 0.5}}));
}

TEST_F(LogOverflow, NewestIsReadBackOnceAndKept) {
  const auto session = makeSession();
  isRedundant(*session, {{"volume", 0.5}});
  for (int n = 0; n < 10; ++n) {
    EXPECT_TRUE(isRedundant(*session, {{"volume", 0.5}}));
  }
  EXPECT_EQ(platform_.overflow.blocksRead(), 1U);
}

TEST_F(LogOverflow, MoreKindsThanAreKeptAreComparedAllTheSame) {
  const auto session = makeSession();
  const auto send = [&](int kind, int value) {
    const auto sent = message(stamped({{"value", value}}), static_cast<AudioEventCategory>(1000 + kind));
    session->sendMessage(sent);
    return sent->isRedundant();
  };
  for (int kind = 0; kind < 600; ++kind) {
    EXPECT_FALSE(send(kind, kind));
  }
  for (int kind = 0; kind < 600; ++kind) {
    EXPECT_TRUE(send(kind, kind));
    EXPECT_FALSE(send(kind, -1));
  }
}

TEST_F(LogOverflow, PayloadChangedInPlaceCountsInTheComparison) {
  const auto session = makeSession();
  isRedundant(*session, {{"a", 1}});
  EXPECT_TRUE(isRedundant(*session, {{"a", 1}}));  // from here on it is kept
  session->messages().change(0, [](TarnReportingSessionMessage& record) { record.mutableMessage().set("a", 2); });
  EXPECT_FALSE(isRedundant(*session, {{"a", 1}}));
  EXPECT_EQ(session->messages().size(), 2U);
}

TEST_F(LogOverflow, NewestAfterTheStopsSortIsTheLastByTime) {
  useWorkers<ConsumerWorker, ProducerWorker>();
  const auto session = makeSession();
  session->start();
  const auto send = [&](int derived, double time) {
    session->sendMessage(
        message({{"derived", derived}, {"invalid_timestamp", "nil"}, {"tarnreporting_timestamp", time}},
                AudioEventCategory::Generic, AudioEventType::Summary));
  };
  send(4, now() + 3);  // what the producer sends, as the log has four messages then
  send(5, now() + 1);
  trail().clear();
  session->stop();
  EXPECT_EQ(std::count(trail().begin(), trail().end(), "ConsumerWorker handle"), 0);
}

TEST_F(LogOverflow, StopGivesTheDiskBackAndTheNextPeriodBeginsAfresh) {
  const auto session = makeSession();
  for (int period = 0; period < 2; ++period) {
    session->start();
    EXPECT_FALSE(isRedundant(*session, {{"volume", 0.5}}));
    EXPECT_GT(platform_.overflow.blocks(), 0U);
    session->stop();
    EXPECT_TRUE(session->messages().empty());
    EXPECT_EQ(platform_.overflow.blocks(), 0U);
  }
  EXPECT_EQ(platform_.log.count("the log has no more room in memory"), 2U);
}

TEST_F(LogOverflow, SessionThatIsDroppedGivesTheDiskBack) {
  auto session = makeSession();
  session->start();
  isRedundant(*session, {{"volume", 0.5}});
  EXPECT_GT(platform_.overflow.blocks(), 0U);
  session.reset();
  EXPECT_EQ(platform_.overflow.blocks(), 0U);
}

}  // namespace
}  // namespace tarn
