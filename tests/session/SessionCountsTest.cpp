// SPDX-License-Identifier: Apache-2.0
// What a session tells of itself in numbers.
#include <gtest/gtest.h>

#include <memory>

#include "service/vocabulary/ProcessState.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class SessionCounts : public SessionFixture {};

TEST_F(SessionCounts, SendTellsHowManyWorkersGotTheMessage) {
  useWorkers<ConsumerWorker, PlainWorker, EarlyWorker>();
  const auto session = makeSession();
  EXPECT_EQ(session->sendMessage(message({{"a", 1}})), 1U);
  session->start();
  EXPECT_EQ(session->sendMessage(message({{"a", 2}})), 2U);
}

TEST_F(SessionCounts, WithoutWorkersNobodyGetsTheMessage) {
  EXPECT_EQ(makeSession()->sendMessage(message({{"a", 1}})), 0U);
}

TEST_F(SessionCounts, OwnersAccountHasTheLogsMemory) {
  const auto account = std::make_shared<TarnReportingSessionLogAccount>();
  auto session = makeSession();
  session->sendMessage(message({{"a", 1}}));
  session->setLogAccount(account);
  session->sendMessage(message({{"a", 2}}));
  EXPECT_GT(account->bytes, 0U);
  EXPECT_EQ(account->bytes, ProcessState::of<TarnReportingSessionLogMemory>()->usage().bytes);
  session.reset();
  EXPECT_EQ(account->bytes, 0U);
}

}  // namespace
}  // namespace tarn
