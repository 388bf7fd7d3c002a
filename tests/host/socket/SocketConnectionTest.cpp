// SPDX-License-Identifier: Apache-2.0
// Connections in order: requests, replies, and the end.

#include <filesystem>
#include <thread>

#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

class SocketConnectionTest : public testing::SocketFixture {
 protected:
  void SetUp() override { serve(); }
  // The events of client 1 after this request was answered.
  std::string eventOf(const wire::Request& request) {
    TestClient client(path_);
    reply_ = client.ask(9, request);
    const auto all = events();
    return all.empty() ? "none" : all.front();
  }
  std::optional<wire::DecodedReply> reply_;
};

TEST_F(SocketConnectionTest, CarriesCreateReportingSession) {
  EXPECT_EQ(eventOf(requestOf(Operation::CreateReportingSession, -7)), "1 createReportingSession -7");
  ASSERT_TRUE(reply_ && reply_->results.size() == 1);
  EXPECT_EQ(reply_->id, 9u);
  EXPECT_FALSE(reply_->error);
  EXPECT_TRUE(reply_->results[0].view().boolValue());
}

TEST_F(SocketConnectionTest, CarriesSetServiceType) {
  auto request = requestOf(Operation::SetServiceType, 7);
  request.serviceType = 11;
  EXPECT_EQ(eventOf(request), "1 setServiceType 11 7");
  EXPECT_TRUE(reply_ && !reply_->error && reply_->results.size() == 1);
}

TEST_F(SocketConnectionTest, CarriesGetServiceNameForReporterID) {
  EXPECT_EQ(eventOf(requestOf(Operation::GetServiceNameForReporterID, 7)), "1 getServiceNameForReporterID 7");
  ASSERT_TRUE(reply_ && reply_->results.size() == 1);
  EXPECT_EQ(reply_->results[0].view(), plist::ValueView(65535));
}

TEST_F(SocketConnectionTest, CarriesSetConfiguration) {
  auto request = requestOf(Operation::SetConfiguration, 7);
  request.dictionary = {{"a", 1}, {"b", "x"}};
  EXPECT_EQ(eventOf(request), "1 setConfiguration {a = 1; b = x} 7");
  EXPECT_TRUE(reply_ && !reply_->error && reply_->results.size() == 1);
}

TEST_F(SocketConnectionTest, CarriesSendMessageWithoutReporterIDs) {
  EXPECT_EQ(eventOf(messageRequest({{"a", 1}})), "1 sendMessage {a = 1} 3 4 none");
  EXPECT_TRUE(reply_ && !reply_->error && reply_->results.empty());
}

TEST_F(SocketConnectionTest, CarriesSendMessageWithReporterIDs) {
  auto request = messageRequest({{"a", 1}});
  request.reporterIDs = std::vector<std::int64_t>{5, -6};
  EXPECT_EQ(eventOf(request), "1 sendMessage {a = 1} 3 4 ids 5 -6");
}

TEST_F(SocketConnectionTest, CarriesStopReportingSessionForID) {
  EXPECT_EQ(eventOf(requestOf(Operation::StopReportingSessionForID, 7)), "1 stopReportingSessionForID 7");
  EXPECT_TRUE(reply_ && !reply_->error && reply_->results.size() == 1);
}

TEST_F(SocketConnectionTest, CarriesAnErrorOfTheService) {
  EXPECT_EQ(eventOf(requestOf(Operation::DestroyReportingSession, 7)), "1 destroyReportingSession 7");
  ASSERT_TRUE(reply_ && reply_->error);
  EXPECT_EQ(reply_->error->domain, "sys.oxbow.audio.reporting");
  EXPECT_EQ(reply_->error->code, 1);
  EXPECT_EQ(reply_->error->text, "refused");
  EXPECT_TRUE(reply_->results.empty());
}

TEST_F(SocketConnectionTest, CarriesReporterID) {
  EXPECT_EQ(eventOf(requestOf(Operation::ReporterID, 7)), "1 reporterID 7");
  ASSERT_TRUE(reply_ && reply_->results.size() == 1);
  EXPECT_EQ(reply_->results[0].view().dictionary().get("reporterID"), plist::ValueView(7));
}

TEST_F(SocketConnectionTest, CarriesGetAllReporters) {
  EXPECT_EQ(eventOf(requestOf(Operation::GetAllReporters)), "1 getAllReporters");
  ASSERT_TRUE(reply_ && reply_->results.size() == 1);
  EXPECT_EQ(plist::description(reply_->results[0].view()), "(1, -2, 3)");
}

TEST_F(SocketConnectionTest, KillServiceHasNoReply) {
  TestClient client(path_);
  client.request(1, requestOf(Operation::KillService));
  EXPECT_TRUE(eventuallyHappens("1 killService"));
  EXPECT_EQ(ledger().repliesSent, 0u);
}

TEST_F(SocketConnectionTest, AHeldStartReplyComesLaterAndOutOfOrder) {
  TestClient client(path_);
  client.request(1, requestOf(Operation::StartReportingSessionForID, 7));
  const auto stop = client.ask(2, requestOf(Operation::StopReportingSessionForID, 7));
  ASSERT_TRUE(stop);
  EXPECT_EQ(stop->id, 2u);
  running_.onQueue([this] { service_->heldStarts.at(0).reply(std::nullopt, true); });
  const auto start = client.reply();
  ASSERT_TRUE(start);
  EXPECT_EQ(start->id, 1u);
}

TEST_F(SocketConnectionTest, ServesManyRequestsOfOneWriteInTheirOrder) {
  TestClient client(path_);
  std::string bytes;
  for (std::uint64_t id = 0; id < 3000; ++id) {
    bytes += encoded(id, requestOf(Operation::CreateReportingSession, static_cast<std::int64_t>(id)));
  }
  std::thread sender([&] { EXPECT_TRUE(client.send(bytes)); });
  for (std::uint64_t id = 0; id < 3000; ++id) {
    const auto reply = client.reply();
    ASSERT_TRUE(reply);
    ASSERT_EQ(reply->id, id);
  }
  sender.join();
}

TEST_F(SocketConnectionTest, ServesAFrameThatComesByteByByte) {
  TestClient client(path_);
  for (const char byte : encoded(4, messageRequest({{"key", "value"}}))) {
    ASSERT_TRUE(client.send({&byte, 1}));
  }
  const auto reply = client.reply();
  ASSERT_TRUE(reply);
  EXPECT_EQ(reply->id, 4u);
}

TEST_F(SocketConnectionTest, ServesAFrameOfTheLargestSize) {
  TestClient client(path_);
  const auto empty = encoded(1, messageRequest({{"text", std::string(70000, 'x')}}));
  const std::string text(70000 + limits.maxFrameBytes + wire::kFrameHeaderBytes - empty.size(), 'x');
  const auto largest = encoded(1, messageRequest({{"text", text}}));
  ASSERT_EQ(largest.size(), limits.maxFrameBytes + wire::kFrameHeaderBytes);
  ASSERT_TRUE(client.send(largest));
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketConnectionTest, TellsItsNumberAndThePeersUser) {
  TestClient first(path_);
  first.status();
  TestClient second(path_);
  second.status();
  const std::vector<std::pair<std::int64_t, std::uint32_t>> expected{{1, ::getuid()}, {2, ::getuid()}};
  EXPECT_EQ(running_.onQueue([this] { return service_->openers; }), expected);
}

TEST_F(SocketConnectionTest, KnowsThePeersProcess) {
  TestClient client(path_);
  client.status();
  EXPECT_EQ(running_.onQueue([this] { return service_->processIdentifiers.at(0); }), ::getpid());
  EXPECT_EQ(running_.onQueue([this] { return service_->descriptions.at(0); }),
            "connection 1 of process " + std::to_string(::getpid()) + ", uid " + std::to_string(::getuid()) + ", " +
                std::filesystem::canonical("/proc/self/exe").string());
}

TEST_F(SocketConnectionTest, StatusIsAnsweredByTheHost) {
  TestClient client(path_);
  client.ask(1, messageRequest({{"a", 1}}));
  const auto status = client.status();
  ASSERT_TRUE(status);
  EXPECT_EQ(status->get("frames_received").asInt64(), 2);
  EXPECT_EQ(status->get("messages_received").asInt64(), 1);
  EXPECT_EQ(status->get("replies_sent").asInt64(), 1);
  EXPECT_EQ(status->get("connections_open").asInt64(), 1);
  EXPECT_EQ(status->get("connections_total").asInt64(), 1);
  EXPECT_EQ(status->get("queued").asInt64(), 0);
  EXPECT_EQ(events().size(), 1u);
}

TEST_F(SocketConnectionTest, StatusIsWhatTheStatusSourceComposes) {
  running_.onQueue([this] { host_->setStatusSource([](auto) { return plist::Dictionary{{"sessions", 42}}; }); });
  TestClient client(path_);
  const auto status = client.status();
  ASSERT_TRUE(status);
  EXPECT_EQ(status->get("sessions").asInt64(), 42);
}

TEST_F(SocketConnectionTest, ASecondReplyToOneRequestIsDropped) {
  running_.onQueue([this] { service_->replyTwice = true; });
  TestClient client(path_);
  client.ask(1, messageRequest({{"a", 1}}));
  const auto next = client.ask(2, requestOf(Operation::GetAllReporters));
  ASSERT_TRUE(next);
  EXPECT_EQ(next->id, 2u);
  EXPECT_EQ(ledger().repliesDropped, 1u);
}

TEST_F(SocketConnectionTest, AHeldReplyAfterTheCloseGoesNowhere) {
  {
    TestClient client(path_);
    client.request(1, requestOf(Operation::StartReportingSessionForID, 7));
    ASSERT_TRUE(eventuallyHappens("1 startReportingSessionForID 7"));
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  running_.onQueue([this] { service_->heldStarts.at(0).reply(std::nullopt, true); });
  TestClient other(path_);
  EXPECT_TRUE(other.status());
}

TEST_F(SocketConnectionTest, AReplyThatDiesUncalledLeavesTheConnectionAsItIs) {
  TestClient client(path_);
  client.request(1, requestOf(Operation::StartReportingSessionForID, 7));
  ASSERT_TRUE(eventuallyHappens("1 startReportingSessionForID 7"));
  running_.onQueue([this] { service_->heldStarts.clear(); });
  EXPECT_TRUE(client.status());
}

TEST_F(SocketConnectionTest, WholeFramesSentBeforeTheCloseAreServedThenTheConnectionIsInvalidated) {
  {
    TestClient client(path_);
    std::string bytes;
    for (std::int64_t id = 1; id <= 3; ++id) {
      bytes += encoded(1, requestOf(Operation::StartReportingSessionForID, id));
    }
    client.send(bytes);
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  const std::vector<std::string> expected{"1 startReportingSessionForID 1", "1 startReportingSessionForID 2",
                                          "1 startReportingSessionForID 3", "1 invalidated"};
  EXPECT_EQ(events(), expected);
  EXPECT_EQ(errorLines(), 0u);
}

TEST_F(SocketConnectionTest, AHalfCloseBehindWholeFramesIsTheEndAfterTheirReplies) {
  TestClient client(path_);
  client.send(encoded(1, messageRequest({{"a", 1}})) + encoded(2, messageRequest({{"a", 2}})));
  client.shutDownSending();
  const auto first = client.reply();
  const auto second = client.reply();
  ASSERT_TRUE(first && second);
  EXPECT_EQ(second->id, 2u);
  EXPECT_TRUE(client.ended());
  EXPECT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(events().size(), 3u);  // two messages, no interruption
}

TEST_F(SocketConnectionTest, APeerThatGoesAwayWithRepliesUnreadIsAnInterruption) {
  {
    TestClient client(path_);
    client.request(1, messageRequest({{"a", 1}}));
    ASSERT_TRUE(client.readable(20000));
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  const std::vector<std::string> expected{"1 sendMessage {a = 1} 3 4 none", "1 interrupted", "1 invalidated"};
  EXPECT_EQ(events(), expected);
  EXPECT_EQ(cuts(CutReason::Reset), 1u);
}

TEST_F(SocketConnectionTest, CountsWhatIsOpen) {
  TestClient first(path_);
  first.status();
  {
    TestClient second(path_);
    EXPECT_EQ(second.status()->get("connections_open").asInt64(), 2);
  }
  ASSERT_TRUE(eventuallyHappens("2 invalidated"));
  const auto status = first.status();
  ASSERT_TRUE(status);
  EXPECT_EQ(status->get("connections_open").asInt64(), 1);
  EXPECT_EQ(status->get("connections_total").asInt64(), 2);
}

}  // namespace
}  // namespace tarn::linux_host
