// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <chrono>

#include "tests/client/ScriptedServer.h"

namespace tarn::client {
namespace {

using testing::Outcomes;
using testing::Pair;
using testing::Served;
using Strings = std::vector<std::string>;

TEST(ClientConnection, SendsAreGatheredUntilFlushed) {
  Pair pair;
  for (int i = 0; i < 10; ++i) {
    ASSERT_EQ(pair.client->send(getAllReporters()), SendStatus::Sent);
  }
  EXPECT_FALSE(pair.server->hasInput());
  EXPECT_TRUE(pair.client->wantsToWrite());
  EXPECT_TRUE(pair.client->flush());
  EXPECT_FALSE(pair.client->wantsToWrite());
  for (std::uint64_t id = 1; id <= 10; ++id) {
    EXPECT_EQ(pair.server->take()->id, id);
  }
}

TEST(ClientConnection, SendsAreWrittenOnceEnoughHasGathered) {
  Options options;
  options.autoFlushBytes = 20;
  Pair pair(options);
  pair.client->send(getAllReporters());
  pair.client->send(getAllReporters());
  EXPECT_FALSE(pair.server->hasInput());
  pair.client->send(getAllReporters());
  EXPECT_TRUE(pair.server->hasInput());
}

TEST(ClientConnection, ACallDeliversOtherRepliesOnTheWay) {
  Outcomes outcomes;
  Pair pair;
  pair.client->send(createReportingSession(5), outcomes.handler("create"));
  pair.client->send(startReportingSessionForID(5), outcomes.handler("start"));
  const Served serving([&] {
    pair.server->acknowledge(1);
    const auto start = pair.server->take();
    const auto stop = pair.server->take();
    pair.server->reply(start->id, {true});
    pair.server->reply(stop->id, {true});
  });
  EXPECT_TRUE(pair.client->call(stopReportingSessionForID(5)).ok());
  EXPECT_EQ(outcomes.heard(), (Strings{"create ok", "start ok"}));
}

TEST(ClientConnection, AStartThatCanNeverBeAnsweredIsCancelled) {
  Outcomes outcomes;
  Pair pair;
  pair.client->send(createReportingSession(5));
  pair.client->send(startReportingSessionForID(5), outcomes.handler("start"));
  pair.client->send(startReportingSessionForID(5), outcomes.handler("again"));
  EXPECT_TRUE(outcomes.heard().empty());
  pair.client->dispatch();
  EXPECT_EQ(outcomes.heard(), Strings{"again cancelled"});
  const Served serving([&] {
    pair.server->acknowledge(1);
    pair.server->take();
    pair.server->take();
    pair.server->acknowledge(1);
  });
  EXPECT_TRUE(pair.client->call(destroyReportingSession(5)).ok());
  EXPECT_EQ(outcomes.heard(), (Strings{"again cancelled", "start cancelled"}));
}

TEST(ClientConnection, ErrorsReachTheHandlerWithDomainCodeAndText) {
  Pair pair;
  const Served serving([&] { pair.server->fail(pair.server->take()->id, 3, "no"); });
  const Reply reply = pair.client->call(setConfiguration({}, 5));
  EXPECT_EQ(reply.outcome, Outcome::Error);
  EXPECT_EQ(reply.error.domain, "domain");
  EXPECT_EQ(reply.error.code, 3);
  EXPECT_EQ(reply.error.text, "no");
}

TEST(ClientConnection, ACallThatTimesOutDropsItsLateReply) {
  Pair pair;
  EXPECT_EQ(pair.client->call(getAllReporters(), std::chrono::milliseconds(1)).outcome, Outcome::TimedOut);
  pair.server->acknowledge(1);
  const Served serving([&] { pair.server->acknowledge(1); });
  const Reply reply = pair.client->call(getAllReporters(), std::chrono::seconds(5));
  EXPECT_TRUE(reply.ok());
  EXPECT_EQ(pair.client->outstanding(), 0U);
}

TEST(ClientConnection, RepliesThatNobodyWaitsForAreCountedAndDropped) {
  Pair pair;
  pair.server->reply(77);
  pair.client->wait(std::chrono::seconds(5));
  EXPECT_EQ(pair.client->unmatchedReplies(), 1U);
  EXPECT_TRUE(pair.client->connected());
}

TEST(ClientConnection, ARequestOfTheLargestFrameIsSentAndOneByteMoreIsNot) {
  Options options;
  options.maxFrameBytes = 1000;
  Pair pair(options);
  const auto requestOf = [](std::size_t bytes) {
    return setConfiguration({{"k", std::string(bytes, 'x')}}, 1);  // 10 bytes around the text
  };
  EXPECT_EQ(pair.client->send(requestOf(990)), SendStatus::Sent);
  EXPECT_EQ(pair.client->send(requestOf(991)), SendStatus::TooLarge);
  EXPECT_EQ(pair.client->call(requestOf(991)).outcome, Outcome::TooLarge);
  EXPECT_EQ(pair.client->outstanding(), 1U);
  pair.client->flush();
  EXPECT_EQ(pair.server->take()->dictionary.get("k").text().size(), 990U);
}

TEST(ClientConnection, TrySendSaysFullInsteadOfWaiting) {
  Options options;
  options.maxOutgoingBytes = 100000;
  Pair pair(options);
  const Request large = setConfiguration({{"k", std::string(10000, 'x')}}, 1);
  std::size_t sent = 0;
  while (pair.client->trySend(large) == SendStatus::Sent) {
    ++sent;
  }
  EXPECT_GE(sent, 10U);
  EXPECT_EQ(pair.client->outstanding(), sent);
  const Served serving([&] { pair.server->acknowledge(sent); });
  while (pair.client->outstanding() > 0) {
    pair.client->wait(std::chrono::seconds(5));
  }
  EXPECT_EQ(pair.client->trySend(large), SendStatus::Sent);
}

TEST(ClientConnection, SendWaitsUntilTheServiceHasTakenEnough) {
  Options options;
  options.maxOutgoingBytes = 50000;
  Pair pair(options);
  constexpr std::size_t kCount = 500;
  const Request large = setConfiguration({{"k", std::string(10000, 'x')}}, 1);
  const Served serving([&] { pair.server->acknowledge(kCount); });
  std::size_t acknowledged = 0;
  for (std::size_t i = 0; i < kCount; ++i) {
    ASSERT_EQ(pair.client->send(large, [&](Reply&& reply) { acknowledged += reply.ok() ? 1U : 0U; }), SendStatus::Sent);
  }
  pair.client->flush();
  while (pair.client->outstanding() > 0) {
    pair.client->wait(std::chrono::seconds(5));
  }
  EXPECT_EQ(acknowledged, kCount);
}

TEST(ClientConnection, TheNumberOfOutstandingRequestsIsBounded) {
  Options options;
  options.maxOutstanding = 3;
  Pair pair(options);
  for (int i = 0; i < 3; ++i) {
    ASSERT_EQ(pair.client->trySend(getAllReporters()), SendStatus::Sent);
    ASSERT_EQ(pair.client->trySend(startReportingSessionForID(9)), SendStatus::Sent);
  }
  EXPECT_EQ(pair.client->trySend(getAllReporters()), SendStatus::Full);
  EXPECT_EQ(pair.client->send(startReportingSessionForID(9)), SendStatus::Full);  // waiting could be for ever
  EXPECT_EQ(pair.client->outstanding(), 6U);
}

TEST(ClientConnection, AHandlerMaySendTheNextRequest) {
  Pair pair;
  int rounds = 0;
  std::function<void(Reply &&)> next = [&](Reply&&) {
    if (++rounds < 100) {
      pair.client->send(getAllReporters(), next);
    }
  };
  pair.client->send(getAllReporters(), next);
  const Served serving([&] { pair.server->acknowledge(100); });
  while (rounds < 100) {
    pair.client->wait(std::chrono::seconds(5));
  }
  EXPECT_EQ(pair.client->outstanding(), 0U);
}

}  // namespace
}  // namespace tarn::client
