// SPDX-License-Identifier: Apache-2.0
// How what a connection's rings ask for stands among its other work and that of other connections.

#include <algorithm>

#include "tests/host/ring/ClientRing.h"
#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

class SocketRingsTest : public testing::SocketFixture {
 protected:
  bool open(TestClient& client) {
    if (!client.requestWith(1, requestOf(Operation::OpenRing), ring_.memory(), ring_.wake())) return false;
    const auto reply = client.reply();
    return reply && !reply->error;
  }
  bool post(const wire::Request& request) {
    return ring_.post(TARNRING_FRAME, encoded(1, request).substr(wire::kFrameHeaderBytes));
  }

  // Messages of this shape are for this session.
  static bool declare(TestClient& client, std::int64_t shape, std::int64_t reporterID) {
    wire::Request request = requestOf(Operation::DeclareShape);
    request.dictionary = {{"shape", shape},
                          {"category", 4},
                          {"type", 1},
                          {"reporterIDs", plist::Array{reporterID}},
                          {"keys", plist::Array{"number"}},
                          {"kinds", plist::Array{"integer"}}};
    client.request(2, request);
    const auto reply = client.reply();
    return reply && !reply->error;
  }
  std::size_t runs() {
    const auto all = events();
    return static_cast<std::size_t>(std::count(all.begin(), all.end(), "1 run"));
  }

  // Messages, of runs and alone.
  std::ptrdiff_t handedOver() {
    const auto all = events();
    return std::count_if(all.begin(), all.end(), [](const std::string& event) {
      return event.starts_with("1 message ") || event.starts_with("1 sendMessage ");
    });
  }

  testing::ClientRing ring_;
};

TEST_F(SocketRingsTest, WhatIsPostedAfterLongWorkComesAfterIt) {
  service_->slices = 300;
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client));
  running_.onQueue([this] {  // all of it is there before the loop looks
    post(requestOf(Operation::StopReportingSessionForID, 7));
    post(requestOf(Operation::CreateReportingSession, 8));
    post(requestOf(Operation::CreateReportingSession, 9));
  });
  ASSERT_TRUE(eventuallyHappens("1 createReportingSession 9"));
  EXPECT_LT(placeOf("1 stopped 7"), placeOf("1 createReportingSession 8"));
  EXPECT_LT(placeOf("1 createReportingSession 8"), placeOf("1 createReportingSession 9"));
}

TEST_F(SocketRingsTest, AMessageThatIsPostedAfterLongWorkComesAfterIt) {
  service_->slices = 300;
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7));
  running_.onQueue([this] {
    post(requestOf(Operation::StopReportingSessionForID, 7));
    ring_.message(5, {1});
    post(requestOf(Operation::CreateReportingSession, 8));
  });
  ASSERT_TRUE(eventuallyHappens("1 createReportingSession 8"));
  EXPECT_EQ(handedOver(), 1);
  const auto all = events();
  const auto message = std::find_if(all.begin(), all.end(), [](const std::string& event) {
    return event.starts_with("1 message ") || event.starts_with("1 sendMessage ");
  });
  EXPECT_LT(placeOf("1 stopped 7"), message - all.begin());
  EXPECT_LT(message - all.begin(), placeOf("1 createReportingSession 8"));
}

TEST_F(SocketRingsTest, LongWorkFromARingLeavesTheOthersTheirTurns) {
  service_->slices = 1000;
  serve();
  TestClient client(path_);
  TestClient other(path_);
  ASSERT_TRUE(open(client) && other.status());
  running_.onQueue([&] {
    post(requestOf(Operation::StopReportingSessionForID, 7));
    other.request(1, requestOf(Operation::CreateReportingSession, 8));
  });
  ASSERT_TRUE(other.reply());
  EXPECT_LT(placeOf("2 createReportingSession 8"), 150);
  EXPECT_TRUE(eventuallyHappens("1 stopped 7"));
}

TEST_F(SocketRingsTest, MessagesForOneSessionAreOnePieceOfWork) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7));
  running_.onQueue([this] {
    for (std::uint64_t number = 0; number < 40; ++number) {
      ring_.message(5, {number});
    }
  });
  ASSERT_TRUE(eventuallyHappens("1 message 39 to 7"));
  EXPECT_EQ(runs(), 1U);
  EXPECT_EQ(ledger().messagesReceived, 40U);
  EXPECT_EQ(placeOf("1 message 39 to 7") - placeOf("1 message 0 to 7"), 39);
}

TEST_F(SocketRingsTest, EachMessageOfARunIsReceivedWhenItIsHandedOver) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7));
  running_.onQueue([this] {
    service_->received = [this] { return host_->ledger.messagesReceived; };
    for (std::uint64_t number = 0; number < 3; ++number) {
      ring_.message(5, {number});
    }
  });
  ASSERT_TRUE(eventuallyHappens("1 message 2 to 7"));
  running_.onQueue([this] { EXPECT_EQ(service_->receivedThen, (std::vector<std::uint64_t>{1, 2, 3})); });
}

TEST_F(SocketRingsTest, WhatIsPostedBetweenMessagesComesBetweenThem) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7));
  running_.onQueue([this] {
    ring_.message(5, {1});
    post(requestOf(Operation::StopReportingSessionForID, 7));
    ring_.message(5, {2});
  });
  ASSERT_TRUE(eventuallyHappens("1 message 2 to 7"));
  EXPECT_LT(placeOf("1 message 1 to 7"), placeOf("1 stopReportingSessionForID 7"));
  EXPECT_LT(placeOf("1 stopReportingSessionForID 7"), placeOf("1 message 2 to 7"));
}

TEST_F(SocketRingsTest, ARunThatCostsMuchIsCutAndLeavesTheOthersTheirTurns) {
  service_->runCost = 8;
  serve();
  TestClient client(path_);
  TestClient other(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7) && other.status());
  running_.onQueue([&] {
    for (std::uint64_t number = 0; number < 100; ++number) {
      ring_.message(5, {number});
    }
    other.request(1, requestOf(Operation::CreateReportingSession, 8));
  });
  ASSERT_TRUE(other.reply());
  ASSERT_TRUE(eventually([&] { return handedOver() == 100; }));
  EXPECT_EQ(ledger().messagesReceived, 100U);
  const auto all = events();
  // After four messages what may be done ahead of the turn was spent.
  const auto run = std::find(all.begin(), all.end(), "1 run") + 1;
  EXPECT_EQ(
      std::find_if_not(run, all.end(), [](const std::string& event) { return event.starts_with("1 message "); }) - run,
      4);
}

TEST_F(SocketRingsTest, WhatARunHasNoMemoryForIsGivenUpAlone) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7));
  running_.onQueue([this] {
    service_->shortOfMemory = testing::RecordingService::Short::Working;
    ring_.message(5, {1});
    ring_.message(5, {2});
  });
  ASSERT_TRUE(eventuallyHappens("1 message 2 to 7"));
  EXPECT_EQ(runs(), 2U);
  EXPECT_EQ(ledger().messagesReceived, 2U);
  const auto all = events();
  EXPECT_EQ(std::count(all.begin(), all.end(), "1 message 1 to 7"), 1);
}

TEST_F(SocketRingsTest, ARunWaitsWhileNothingIsTaken) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client) && declare(client, 5, 7));
  running_.onQueue([this] {
    service_->received = [this] {
      paused = true;  // with the first message
      return host_->ledger.messagesReceived;
    };
    for (std::uint64_t number = 0; number < 3; ++number) {
      ring_.message(5, {number});
    }
  });
  ASSERT_TRUE(eventuallyHappens("1 message 0 to 7"));
  EXPECT_EQ(ledger().messagesReceived, 1U);
  running_.onQueue([this] { service_->received = nullptr; });
  resumeRequests();
  ASSERT_TRUE(eventually([&] { return handedOver() == 3; }));
  EXPECT_EQ(ledger().messagesReceived, 3U);
}

TEST_F(SocketRingsTest, WhenTheServiceEndsAMessageWithoutItsShapeIsLeftToTheNextOne) {
  serve();
  TestClient client(path_);
  ASSERT_TRUE(open(client));
  ASSERT_TRUE(ring_.message(5, {1}));
  running_.onQueue([this] { host_->endInputs(); });
  EXPECT_TRUE(eventually([this] { return ledger().connectionsOpen == 0; }));
  EXPECT_EQ(ring::SharedWords::loadAcquire(&ring_.header()->taken), 0U);
  EXPECT_EQ(ring::SharedWords::loadAcquire(&ring_.header()->refused), 0U);
}

}  // namespace
}  // namespace tarn::linux_host
