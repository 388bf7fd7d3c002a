// How connections share the service: long work gives way to others and not to its own client's next request.

#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

using testing::encoded;
using testing::eventually;
using testing::messageRequest;
using testing::requestOf;
using testing::TestClient;
using wire::Operation;

class SocketSharesTest : public testing::SocketFixture {
 protected:
  // The place of an event among all; the end when it didn't happen.
  std::ptrdiff_t placeOf(const std::string& event) {
    const auto all = events();
    return std::find(all.begin(), all.end(), event) - all.begin();
  }
  std::int64_t queued() {
    return running_.onQueue([this] { return static_cast<std::int64_t>(running_.loop.queue()->waiting()); });
  }
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
    ASSERT_TRUE(eventually([&] { return running_.onQueue([this] { return host_->gate.heldCount() == 1; }); }));
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
  TestClient busy(path_);
  TestClient modest(path_);
  ASSERT_TRUE(busy.status() && modest.status());
  std::string bytes;
  for (std::uint64_t id = 0; id < 1000; ++id) {
    bytes += encoded(id, requestOf(Operation::GetAllReporters));
  }
  running_.onQueue([&] {
    busy.send(bytes);
    modest.request(1, requestOf(Operation::CreateReportingSession, 2));
  });
  ASSERT_TRUE(modest.reply());
  ASSERT_TRUE(eventually([&] { return events().size() == 1001; }));
  EXPECT_LE(placeOf("2 createReportingSession 2"), 2 * FairShares::kQuantum);
}

}  // namespace
}  // namespace tarn::linux_host
