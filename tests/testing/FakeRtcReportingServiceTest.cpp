// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeRtcReportingService.h"

#include <gtest/gtest.h>

#include <atomic>

namespace tarn::testing {
namespace {

using Backends = std::optional<std::vector<std::string>>;

TEST(FakeRtcReportingService, KeepsWhatASessionIsGiven) {
  FakeRtcReportingService service;
  auto session = service.createSession({{"clientType", 19}}, {{"clientName", "tarn"}}, std::nullopt);
  ASSERT_NE(session, nullptr);

  EXPECT_TRUE(session->sendMessage(5, 7, {{"route", "a"}}).sent);
  session->flushMessages();
  EXPECT_TRUE(session->sendMessage(6, 8, {}).sent);

  const auto kept = service.sessions().at(0);
  EXPECT_EQ(kept.sessionInfo, (plist::Dictionary{{"clientType", 19}}));
  EXPECT_EQ(kept.userInfo, (plist::Dictionary{{"clientName", "tarn"}}));
  ASSERT_EQ(kept.messages.size(), 2U);
  EXPECT_EQ(kept.messages[0].category, 5);
  EXPECT_EQ(kept.messages[0].type, 7);
  EXPECT_EQ(kept.messages[0].payload, (plist::Dictionary{{"route", "a"}}));
  EXPECT_EQ(kept.flushes, 1U);
  EXPECT_EQ(kept.messagesAtLastFlush, 1U);
  EXPECT_FALSE(kept.released);
}

TEST(FakeRtcReportingService, SeesThatASessionIsReleased) {
  FakeRtcReportingService service;
  auto session = service.createSession({}, {}, std::nullopt);

  session.reset();

  EXPECT_TRUE(service.sessions().at(0).released);
}

TEST(FakeRtcReportingService, ReportsTheBackendsThatAreSet) {
  FakeRtcReportingService service;
  std::vector<Backends> reported;
  const auto session = service.createSession({}, {}, std::nullopt);
  const auto start = [&] { session->startConfiguration([&](const Backends& list) { reported.push_back(list); }); };

  start();
  service.setBackends(std::nullopt);
  start();
  service.setBackends(std::vector<std::string>{});
  start();

  ASSERT_EQ(reported.size(), 3U);
  EXPECT_EQ(reported[0], (std::vector<std::string>{"fake"}));
  EXPECT_FALSE(reported[1]);
  EXPECT_TRUE(reported[2] && reported[2]->empty());
  EXPECT_EQ(service.sessions().at(0).starts, 3U);
}

TEST(FakeRtcReportingService, HandsOutTokensUntilItRefuses) {
  FakeRtcReportingService service;
  EXPECT_EQ(service.newHierarchyToken(std::nullopt), "token-1");
  EXPECT_EQ(service.newHierarchyToken("token-1"), "token-2");

  service.setHandsOutTokens(false);

  EXPECT_EQ(service.newHierarchyToken(std::nullopt), std::nullopt);
  EXPECT_EQ(service.tokens(), 2U);
}

TEST(FakeRtcReportingService, MessagesFailWithAnErrorOrWithout) {
  FakeRtcReportingService service;
  const auto session = service.createSession({}, {}, std::nullopt);
  service.refuseMessages(platform::RtcReportingSession::SendResult{false, Error{3, "no route"}});
  const auto withError = session->sendMessage(1, 1, {});
  service.refuseMessages(platform::RtcReportingSession::SendResult{});
  const auto without = session->sendMessage(1, 1, {});

  EXPECT_FALSE(withError.sent);
  EXPECT_EQ(withError.error->text, "no route");
  EXPECT_FALSE(without.sent);
  EXPECT_TRUE(without.error.ok());
  EXPECT_TRUE(service.sessions().at(0).messages.empty());
  EXPECT_EQ(service.sessions().at(0).attempts, 2U);
}

TEST(FakeRtcReportingService, CompletionsOnOtherThreadsRaceWithSendsSafely) {
  FakeRtcReportingService service;
  std::atomic<int> completions = 0;
  service.completions().set(ReplyFault::OtherThread);

  for (int i = 0; i < 50; ++i) {
    const auto session = service.createSession({}, {}, std::nullopt);
    // The completion holds the session: the last owner may be the backend's thread.
    session->startConfiguration([&completions, session](const Backends& list) {
      static_cast<void>(session->sendMessage(2, 2, {}));
      completions += list.has_value() ? 1 : 0;
    });
    EXPECT_TRUE(session->sendMessage(1, 1, {}).sent);
  }
  service.completions().joinThreads();

  EXPECT_EQ(completions, 50);
  for (const auto& session : service.sessions()) {
    EXPECT_EQ(session.messages.size(), 2U);
    EXPECT_TRUE(session.released);
  }
}

}  // namespace
}  // namespace tarn::testing
