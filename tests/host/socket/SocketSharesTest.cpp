// SPDX-License-Identifier: Apache-2.0
// How connections share the service: long work gives way to others and not to its own client's next request.

#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

class SocketSharesTest : public testing::SocketFixture {
 protected:
  std::int64_t queued() {
    return running_.onQueue([this] { return static_cast<std::int64_t>(running_.loop.queue()->waiting()); });
  }
  // What comes before the one request of a client, while another's many lie in its socket already.
  std::ptrdiff_t servedBeforeTheModestOne(const wire::Request& request, int count) {
    TestClient busy(path_);
    TestClient modest(path_);
    EXPECT_TRUE(busy.status() && modest.status());
    std::string bytes;
    for (int id = 0; id < count; ++id) {
      bytes += encoded(static_cast<std::uint64_t>(id), request);
    }
    running_.onQueue([&] {
      busy.send(bytes);
      modest.request(1, requestOf(Operation::CreateReportingSession, 2));
    });
    EXPECT_TRUE(modest.reply());
    EXPECT_TRUE(eventually([&] { return events().size() == static_cast<std::size_t>(count) + 1; }));
    return placeOf("2 createReportingSession 2");
  }

  std::atomic<bool> crowded{false};  // as the recorder would say
};

TEST_F(SocketSharesTest, LongWorkOfOneClientLeavesTheOthersTheirTurns) {
  service_->slices = 1000;
  serve();
  TestClient longOne(path_);
  TestClient other(path_);
  ASSERT_TRUE(longOne.status() && other.status());
  running_.onQueue([&] {  // both are there before the loop looks at either
    longOne.request(1, requestOf(Operation::StopReportingSessionForID, 7));
    other.request(1, requestOf(Operation::CreateReportingSession, 8));
  });
  ASSERT_TRUE(other.reply());
  ASSERT_TRUE(longOne.reply());
  EXPECT_LT(placeOf("2 createReportingSession 8"), 100);
  EXPECT_GT(placeOf("1 stopped 7"), 1000);
  EXPECT_EQ(queued(), 0);
}

TEST_F(SocketSharesTest, WhatAClientSentAfterLongWorkComesAfterIt) {
  service_->slices = 300;
  serve();
  TestClient client(path_);
  client.send(encoded(1, requestOf(Operation::StopReportingSessionForID, 7)) +
              encoded(2, requestOf(Operation::CreateReportingSession, 8)));
  const auto first = client.reply();
  const auto second = client.reply();
  ASSERT_TRUE(first && second);
  EXPECT_EQ(first->id, 1U);
  EXPECT_LT(placeOf("1 stopped 7"), placeOf("1 createReportingSession 8"));
}

TEST_F(SocketSharesTest, LongWorkStopsWhileRequestsMayNotBeTaken) {
  service_->slices = 1000;
  service_->onSlice = [this](int left) { paused = left <= 500; };
  serve();
  TestClient client(path_);
  client.request(1, requestOf(Operation::StopReportingSessionForID, 7));
  ASSERT_TRUE(eventually([&] { return paused.load(); }));
  EXPECT_TRUE(TestClient(path_).status());
  EXPECT_FALSE(client.readable(0));
  EXPECT_EQ(events().size(), 500U);
  running_.onQueue([this] { service_->onSlice = nullptr; });
  resumeRequests();
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketSharesTest, TheEndOfAConnectionComesAfterItsLongWork) {
  service_->slices = 300;
  serve();
  {
    TestClient client(path_);
    client.request(1, requestOf(Operation::StopReportingSessionForID, 7));
  }
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_LT(placeOf("1 stopped 7"), placeOf("1 invalidated"));
}

TEST_F(SocketSharesTest, OfAClientThatIsGoneWhatAsksIsDroppedAndWhatTellsIsServed) {
  serve();
  paused = true;
  {
    TestClient client(path_);
    client.send(encoded(1, messageRequest({{"a", 1}})) + encoded(2, requestOf(Operation::GetAllReporters)) +
                encoded(3, requestOf(Operation::ReporterID, 7)) +
                encoded(4, requestOf(Operation::GetServiceNameForReporterID, 7)) +
                encoded(5, requestOf(Operation::Status)) + encoded(6, requestOf(Operation::CreateReportingSession, 9)));
    ASSERT_TRUE(eventually([&] { return held() == 1; }));
  }
  ASSERT_TRUE(eventually([&] { return running_.loop.progress().sample().idle; }));
  resumeRequests();
  ASSERT_TRUE(eventuallyHappens("1 invalidated"));
  EXPECT_EQ(events(), (std::vector<std::string>{"1 sendMessage {a = 1} 3 4 none", "1 createReportingSession 9",
                                                "1 invalidated"}));
  EXPECT_EQ(ledger().questionsDropped, 4U);
}

TEST_F(SocketSharesTest, AClientThatOnlyStoppedSendingIsAnswered) {
  serve();
  TestClient client(path_);
  client.send(encoded(1, requestOf(Operation::GetAllReporters)) + encoded(2, requestOf(Operation::ReporterID, 7)));
  client.shutDownSending();
  EXPECT_TRUE(client.reply());
  EXPECT_TRUE(client.reply());
  EXPECT_EQ(ledger().questionsDropped, 0U);
}

TEST_F(SocketSharesTest, AThousandRequestsOfOneClientDontHoldUpAnother) {
  serve();
  EXPECT_LE(servedBeforeTheModestOne(requestOf(Operation::GetAllReporters), 1000), 2 * FairShares::kQuantum);
}

TEST_F(SocketSharesTest, ABusyClientLeavesEachOtherItsShareOfATurn) {
  limits.gulpBytes = 64;
  serve();
  EXPECT_LT(servedBeforeTheModestOne(requestOf(Operation::CreateReportingSession, 1), 500), 50);
}

TEST_F(SocketSharesTest, WhoMadeItCrowdedStopsAndStatusIsAnswered) {
  serve();
  running_.onQueue([&] { host_->gate.setCrowdSource([this] { return crowded.load(); }); });
  TestClient client(path_);
  ASSERT_TRUE(client.ask(1, requestOf(Operation::CreateReportingSession, 1)));
  crowded = true;
  client.request(2, requestOf(Operation::CreateReportingSession, 2));
  ASSERT_TRUE(eventually([&] { return held() == 1; }));
  EXPECT_TRUE(TestClient(path_).status());
  EXPECT_FALSE(client.readable(0));
  crowded = false;
  host_->resumeRequests();
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketSharesTest, LongWorkOfWhoMadeItCrowdedStopsToo) {
  service_->slices = 1000;
  service_->onSlice = [this](int left) { crowded = left <= 500; };
  serve();
  running_.onQueue([&] { host_->gate.setCrowdSource([this] { return crowded.load(); }); });
  TestClient client(path_);
  client.request(1, requestOf(Operation::StopReportingSessionForID, 7));
  ASSERT_TRUE(eventually([&] { return crowded.load(); }));
  EXPECT_TRUE(TestClient(path_).status());
  EXPECT_FALSE(client.readable(0));
  running_.onQueue([this] { service_->onSlice = nullptr; });
  crowded = false;
  host_->resumeRequests();
  EXPECT_TRUE(client.reply());
}

TEST_F(SocketSharesTest, SettleWaitsForTheEndsOfClientsThatLeftBefore) {
  service_->slices = 300;
  serve();
  std::vector<std::string> before;
  running_.onQueue([&] {
    host_->setSettleSource([&](platform::Work done) {
      before = service_->events;
      done();
    });
  });
  TestClient leaving(path_);
  TestClient asking(path_);
  ASSERT_TRUE(leaving.status() && asking.status());
  running_.onQueue([&] {
    leaving.request(1, requestOf(Operation::StopReportingSessionForID, 7));
    leaving.close();
    asking.request(1, requestOf(Operation::Settle));
  });
  ASSERT_TRUE(asking.reply());
  EXPECT_EQ(running_.onQueue([&] { return before.empty() ? std::string() : before.back(); }), "1 invalidated");
  running_.onQueue([&] { host_->setSettleSource(nullptr); });
}

TEST_F(SocketSharesTest, SettleIsRefusedWhereMemoryIsMissingForItAlsoAfterTheEndsOfClients) {
  service_->slices = 300;
  serve();
  running_.onQueue([&] { host_->setSettleSource([](const platform::Work&) { throw std::bad_alloc(); }); });
  TestClient leaving(path_);
  TestClient asking(path_);
  ASSERT_TRUE(leaving.status() && asking.status());
  const auto expectRefusal = [&asking] {
    const auto reply = asking.reply();
    ASSERT_TRUE(reply && reply->error);
    EXPECT_EQ(reply->error->code, static_cast<std::int64_t>(wire::ErrorCode::OutOfMemory));
  };
  running_.onQueue([&] {
    leaving.request(1, requestOf(Operation::StopReportingSessionForID, 7));
    leaving.close();
    asking.request(1, requestOf(Operation::Settle));
  });
  expectRefusal();
  asking.request(2, requestOf(Operation::Settle));
  expectRefusal();
  EXPECT_TRUE(asking.status());
  running_.onQueue([&] { host_->setSettleSource(nullptr); });
}

TEST_F(SocketSharesTest, ManyNumbersAreAnsweredInPiecesAndInOrder) {
  service_->reporters.clear();
  for (std::int64_t number = 0; number < 10'000; ++number) {
    service_->reporters.push_back(number % 2 == 0 ? number * 1000 : -number);
  }
  serve();
  TestClient client(path_);
  client.send(encoded(1, requestOf(Operation::GetAllReporters)) + encoded(2, requestOf(Operation::ReporterID, 7)));
  const auto listing = client.reply();
  const auto next = client.reply();
  ASSERT_TRUE(listing && next);
  EXPECT_EQ(listing->id, 1U);
  EXPECT_EQ(next->id, 2U);
  std::vector<std::int64_t> numbers;
  for (const plist::ValueView number : listing->results.at(0).view().array()) {
    numbers.push_back(number.asInt64());
  }
  EXPECT_EQ(numbers, service_->reporters);
}

TEST_F(SocketSharesTest, AStormOfClientsIsAcceptedAFewATurn) {
  serve();
  std::vector<std::uint64_t> accepted;
  std::vector<std::unique_ptr<TestClient>> storm;
  running_.onQueue([&] {
    running_.loop.addTurnHook([&] { accepted.push_back(host_->ledger.connectionsTotal); });
    for (int i = 0; i < 40; ++i) {
      storm.push_back(std::make_unique<TestClient>(path_));
    }
  });
  ASSERT_TRUE(eventually([&] { return ledger().connectionsTotal == 40; }));
  running_.stop();
  for (std::size_t turn = 1; turn < accepted.size(); ++turn) {
    EXPECT_LE(accepted[turn] - accepted[turn - 1], 4U);
  }
}

}  // namespace
}  // namespace tarn::linux_host
