// SPDX-License-Identifier: Apache-2.0
// How what a connection's rings ask for stands among its other work and that of other connections.

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
