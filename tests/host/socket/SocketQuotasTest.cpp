// SPDX-License-Identifier: Apache-2.0
// What a connection and its user may have, half frames, and `settle`.

#include <thread>

#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

class SocketQuotasTest : public testing::SocketFixture {
 protected:
  // The text of the over-quota error that answers this request; the connection goes on afterwards.
  std::string refusalOf(TestClient& client, const wire::Request& request) {
    const auto reply = client.ask(5, request);
    if (!reply || !reply->error) return "served";
    EXPECT_EQ(reply->error->domain, wire::kErrorDomain);
    EXPECT_EQ(reply->error->code, 4);
    EXPECT_TRUE(client.status());
    return reply->error->text;
  }
  std::uint64_t refused() { return ledger().requestsRefused[3]; }
  plist::Dictionary quotas() {
    return running_.onQueue([this] { return quotaStatus(host_->limits.quotas, host_->shares); });
  }
  std::int64_t ofUser(const char* what) {
    return quotas().get("users").dictionary().get(std::to_string(::getuid())).dictionary().get(what).asInt64();
  }
};

TEST_F(SocketQuotasTest, OtherBoundsHoldAtOnceAndTheLongestFrameForThoseWhoCome) {
  serve();
  TestClient client(path_);
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 1)), "served");
  linux_host::HostLimits changed = limits;
  changed.quotas.sessionsPerConnection = 1;
  changed.maxFrameBytes = 64;
  running_.onQueue([&] { host_->adopt(changed); });
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 2)), "over quota: sessions 1 of 1");
  const wire::Request large = testing::messageRequest({{"text", std::string(100, 'x')}});
  EXPECT_TRUE(client.ask(7, large));
  TestClient later(path_);
  ASSERT_TRUE(later.request(1, large));
  EXPECT_TRUE(later.ended());
}

TEST_F(SocketQuotasTest, SessionsOfAConnectionAreBounded) {
  limits.quotas.sessionsPerConnection = 2;
  serve();
  TestClient client(path_);
  TestClient other(path_);
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 1)), "served");
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 2)), "served");
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 3)), "over quota: sessions 2 of 2");
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 2)), "served");  // takes its own place
  EXPECT_EQ(refusalOf(other, requestOf(Operation::CreateReportingSession, 3)), "served");
  EXPECT_EQ(refused(), 1U);
}

TEST_F(SocketQuotasTest, SessionsOfAUserAreBoundedAndGivenBackWithTheirConnection) {
  limits.quotas.sessionsPerUser = 2;
  serve();
  TestClient client(path_);
  {
    TestClient other(path_);
    EXPECT_EQ(refusalOf(other, requestOf(Operation::CreateReportingSession, 1)), "served");
    EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 2)), "served");
    EXPECT_EQ(ofUser("sessions"), 2);
    EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 3)), "over quota: sessions 2 of 2");
  }
  ASSERT_TRUE(eventually([&] { return ledger().connectionsOpen == 1; }));
  EXPECT_EQ(ofUser("sessions"), 1);
  EXPECT_EQ(refusalOf(client, requestOf(Operation::CreateReportingSession, 3)), "served");
}

TEST_F(SocketQuotasTest, MessagesAreRefusedWhileTheLogsOfAConnectionTakeTooMuch) {
  limits.quotas.logBytesPerConnection = 1000;
  serve();
  TestClient client(path_);
  TestClient other(path_);
  EXPECT_EQ(refusalOf(client, messageRequest({{"a", 1}})), "served");
  EXPECT_EQ(refusalOf(other, messageRequest({{"a", 1}})), "served");
  running_.onQueue([this] { return service_->logBytes[1] = 999; });
  EXPECT_EQ(refusalOf(client, messageRequest({{"a", 1}})), "served");
  running_.onQueue([this] { return service_->logBytes[1] = 1000; });
  EXPECT_EQ(refusalOf(client, messageRequest({{"a", 1}})), "over quota: log_bytes 1000 of 1000");
  EXPECT_EQ(refusalOf(client, requestOf(Operation::StopReportingSessionForID, 1)), "served");
  EXPECT_EQ(refusalOf(other, messageRequest({{"a", 1}})), "served");
  EXPECT_EQ(ledger().messagesOverQuota, 1U);
  running_.onQueue([this] { return service_->logBytes[1] = 0; });
  EXPECT_EQ(refusalOf(client, messageRequest({{"a", 1}})), "served");
}

TEST_F(SocketQuotasTest, LogsOfAUserAreBoundedAndToldAsTheyAreNow) {
  limits.quotas.logBytesPerUser = 1000;
  serve();
  TestClient client(path_);
  TestClient other(path_);
  EXPECT_EQ(refusalOf(client, messageRequest({{"a", 1}})), "served");
  EXPECT_EQ(refusalOf(other, messageRequest({{"a", 1}})), "served");
  running_.onQueue([this] {
    service_->logBytes = {{1, 600}, {2, 400}};
    return 0;
  });
  const auto use = running_.onQueue([this] { return host_->quotaUse(); });
  const auto mine = use.get("users").dictionary().get(std::to_string(::getuid())).dictionary();
  EXPECT_EQ(mine.get("log_bytes").asInt64(), 1000);
  EXPECT_EQ(mine.get("log_bytes_of_one_connection").asInt64(), 600);
  EXPECT_EQ(use.get("limits").dictionary().get("log_bytes_per_user").asInt64(), 1000);
  EXPECT_EQ(refusalOf(other, messageRequest({{"a", 1}})), "over quota: log_bytes 1000 of 1000");
}

TEST_F(SocketQuotasTest, ConnectionsBeyondAUsersAreAnsweredAndBeyondTwiceThatClosed) {
  limits.quotas.connectionsPerUser = 2;
  serve();
  TestClient first(path_);
  TestClient second(path_);
  ASSERT_TRUE(first.status() && second.status());
  TestClient third(path_);
  EXPECT_EQ(refusalOf(third, messageRequest({{"a", 1}})), "over quota: connections 2 of 2");
  EXPECT_EQ(refusalOf(third, requestOf(Operation::Settle)), "over quota: connections 2 of 2");
  TestClient fourth(path_);
  ASSERT_TRUE(fourth.status());
  TestClient fifth(path_);
  EXPECT_TRUE(fifth.ended());
  EXPECT_EQ(ofUser("connections"), 4);
  third.close();
  fourth.close();
  second.close();
  ASSERT_TRUE(eventually([&] { return ofUser("connections") == 1; }));
  TestClient again(path_);
  EXPECT_EQ(refusalOf(again, messageRequest({{"a", 1}})), "served");
  EXPECT_EQ(events(), (std::vector<std::string>{"2 invalidated", "3 sendMessage {a = 1} 3 4 none"}));
}

TEST_F(SocketQuotasTest, MessagesASecondAreBoundedWhenAskedFor) {
  limits.quotas.messagesPerSecondPerConnection = 3;
  serve();
  TestClient client(path_);
  int served = 0;
  for (int i = 0; i < 100; ++i) {
    const std::string answer = refusalOf(client, messageRequest({{"a", 1}}));
    EXPECT_TRUE(answer == "served" || answer == "over quota: messages_per_second 3 of 3") << answer;
    served += answer == "served" ? 1 : 0;
  }
  EXPECT_GE(served, 3);
  EXPECT_EQ(refused(), static_cast<std::uint64_t>(100 - served));
  EXPECT_GT(refused(), 0U);
  EXPECT_EQ(ledger().messagesReceived, 100U);
  EXPECT_EQ(ledger().messagesOverQuota, refused());
  EXPECT_EQ(refusalOf(client, requestOf(Operation::GetAllReporters)), "served");
}

TEST(MessageRate, IsCountedBySeconds) {
  MessageRate rate;
  EXPECT_FALSE(beyondRate(rate, 2, 10));
  EXPECT_FALSE(beyondRate(rate, 2, 10));
  EXPECT_TRUE(beyondRate(rate, 2, 10));
  EXPECT_FALSE(beyondRate(rate, 2, 11));
  EXPECT_FALSE(beyondRate(rate, 0, 11));
  EXPECT_EQ(rate.messages, 1U);
}

TEST_F(SocketQuotasTest, WhatIsHeldUpIsBoundedByBytes) {
  const std::string request = encoded(1, messageRequest({{"text", std::string(1000, 'x')}}));
  limits.quotas.waitingBytesPerUser = 1500;
  serve();
  TestClient first(path_);
  TestClient second(path_);
  ASSERT_TRUE(first.status() && second.status());
  paused = true;
  first.send(request);
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  second.send(request);
  const auto refusal = second.reply();
  ASSERT_TRUE(refusal && refusal->error);
  const std::string use = std::to_string(request.size() - wire::kFrameHeaderBytes);
  EXPECT_EQ(refusal->error->text, "over quota: waiting_bytes " + use + " of 1500");
  resumeRequests();
  EXPECT_TRUE(first.reply());
  EXPECT_EQ(ofUser("waiting_bytes"), 0);
}

TEST_F(SocketQuotasTest, HalfAFrameIsCutOffWhenTheRestDoesNotCome) {
  limits.halfFrameTime = std::chrono::milliseconds(100);
  serve();
  TestClient client(path_);
  TestClient other(path_);
  client.send(encoded(1, messageRequest({{"a", 1}})).substr(0, 6));
  ASSERT_TRUE(client.ended());
  EXPECT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(cuts(CutReason::StaleFrame), 1U);
  EXPECT_TRUE(log_.contains("6 bytes of a frame waited too long for the rest"));
  EXPECT_EQ(ofUser("waiting_bytes"), 0);
  EXPECT_TRUE(other.status());
}

TEST_F(SocketQuotasTest, FramesThatEndInTimeMayEachBeBegunBeforeTheLastIsWhole) {
  limits.halfFrameTime = std::chrono::milliseconds(400);
  serve();
  TestClient client(path_);
  const std::string frame = encoded(1, messageRequest({{"a", 1}}));
  client.send(frame.substr(0, 5));
  for (int i = 0; i < 8; ++i) {  // never between two frames, for longer than the time
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    ASSERT_TRUE(client.send(frame.substr(5) + frame.substr(0, 5)));
    ASSERT_TRUE(client.reply());
  }
  EXPECT_EQ(cuts(CutReason::StaleFrame), 0U);
}

TEST_F(SocketQuotasTest, HalfFramesTogetherAreBoundedAndTheOldestMakesRoom) {
  limits.quotas.waitingBytes = 65536;
  serve();
  const std::string half = encoded(1, messageRequest({{"text", std::string(60000, 'x')}})).substr(0, 40000);
  TestClient first(path_);
  first.send(half);
  ASSERT_TRUE(eventually([&] { return ofUser("waiting_bytes") == 40000; }));
  TestClient second(path_);
  second.send(half);
  EXPECT_TRUE(first.ended());
  EXPECT_EQ(cuts(CutReason::StaleFrame), 1U);
  ASSERT_TRUE(eventually([&] { return ofUser("waiting_bytes") == 40000; }));
  EXPECT_TRUE(TestClient(path_).status());
}

TEST_F(SocketQuotasTest, SettleIsAnsweredAtOnceWhenNothingIsToBeCommitted) {
  serve();
  TestClient client(path_);
  const auto reply = client.ask(3, requestOf(Operation::Settle));
  ASSERT_TRUE(reply);
  EXPECT_EQ(reply->id, 3U);
  EXPECT_FALSE(reply->error);
  EXPECT_TRUE(reply->results.empty());
}

TEST_F(SocketQuotasTest, SettleIsAnsweredWhenWhatCameBeforeItIsCommitted) {
  service_->slices = 200;
  serve();
  std::vector<platform::Work> waiting;
  std::vector<std::string> before;
  running_.onQueue([&] {
    host_->setSettleSource([&](platform::Work done) {
      before = service_->events;
      waiting.push_back(std::move(done));
    });
  });
  TestClient client(path_);
  client.send(encoded(1, requestOf(Operation::StopReportingSessionForID, 7)) +
              encoded(2, requestOf(Operation::Settle)));
  const auto stopped = client.reply();
  ASSERT_TRUE(stopped);
  EXPECT_EQ(stopped->id, 1U);
  ASSERT_TRUE(eventually([&] { return running_.onQueue([&] { return waiting.size() == 1; }); }));
  EXPECT_EQ(running_.onQueue([&] { return before.back(); }), "1 stopped 7");
  EXPECT_FALSE(client.readable(0));
  running_.onQueue([&] { waiting[0](); });
  const auto settled = client.reply();
  ASSERT_TRUE(settled);
  EXPECT_EQ(settled->id, 2U);
  running_.onQueue([&] {
    waiting.clear();
    host_->setSettleSource(nullptr);
  });
}

TEST_F(SocketQuotasTest, SettleOfAConnectionThatIsGoneGoesNowhere) {
  serve();
  std::vector<platform::Work> waiting;
  running_.onQueue([&] { host_->setSettleSource([&](platform::Work done) { waiting.push_back(std::move(done)); }); });
  {
    TestClient client(path_);
    client.request(1, requestOf(Operation::Settle));
    ASSERT_TRUE(eventually([&] { return running_.onQueue([&] { return waiting.size() == 1; }); }));
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  running_.onQueue([&] {
    waiting[0]();
    waiting.clear();
    host_->setSettleSource(nullptr);
  });
  EXPECT_TRUE(TestClient(path_).status());
}

}  // namespace
}  // namespace tarn::linux_host
