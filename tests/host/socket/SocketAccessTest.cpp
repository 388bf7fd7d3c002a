// SPDX-License-Identifier: Apache-2.0
// Two sockets: one whose clients see their own user's sessions and don't end the service, one for everything.
#include <unistd.h>

#include "tests/host/ring/ClientRing.h"
#include "tests/host/socket/SocketFixture.h"

namespace tarn::linux_host {
namespace {

class SocketAccessTest : public testing::SocketFixture {
 protected:
  void SetUp() override {
    access = Access::OwnSessions;
    serve();
    auto socket = testing::bindTo(adminPath_, ListenSocket::kAdminMode);
    ASSERT_EQ(socket.error.text(), "");
    running_.onQueue([&] {
      admin_ = std::make_shared<SocketListener>(*host_, std::move(socket.value));
      admin_->setDelegate(service_);
      admin_->resume();
    });
  }
  void TearDown() override {
    SocketFixture::TearDown();
    admin_->close();
  }

  const std::string adminPath_ = folder_.file("admin");
  std::shared_ptr<SocketListener> admin_;
};

TEST_F(SocketAccessTest, KillIsRefusedCountedAndTheConnectionStays) {
  TestClient client(path_);
  const auto reply = client.ask(5, requestOf(Operation::KillService));
  ASSERT_TRUE(reply && reply->error);
  EXPECT_EQ(reply->id, 5u);
  EXPECT_EQ(reply->error->domain, wire::kErrorDomain);
  EXPECT_EQ(reply->error->code, 6);
  EXPECT_EQ(reply->error->text, "only over the admin socket");
  EXPECT_EQ(ledger().requestsRefused[5], 1u);
  EXPECT_TRUE(client.ask(6, requestOf(Operation::CreateReportingSession, 1)));
  EXPECT_EQ(events(), std::vector<std::string>{"1 createReportingSession 1"});
}

TEST_F(SocketAccessTest, KillOverTheAdminSocketReachesTheService) {
  TestClient client(adminPath_);
  client.request(5, requestOf(Operation::KillService));
  EXPECT_TRUE(eventuallyHappens("1 killService"));
  EXPECT_EQ(ledger().requestsRefused[5], 0u);
}

TEST_F(SocketAccessTest, KillIsRefusedAlsoWhileTheServiceTakesNothing) {
  paused = true;
  TestClient client(path_);
  const auto reply = client.ask(5, requestOf(Operation::KillService));
  ASSERT_TRUE(reply && reply->error);
  EXPECT_EQ(reply->error->code, 6);
  resumeRequests();
}

TEST_F(SocketAccessTest, KillThroughARingIsRefusedAndTheRingGoesOn) {
  testing::ClientRing ring;
  TestClient client(path_);
  ASSERT_TRUE(client.requestWith(1, requestOf(Operation::OpenRing), ring.memory(), ring.wake()));
  ASSERT_TRUE(client.reply());
  const auto post = [&](const wire::Request& request) {
    return ring.post(TARNRING_FRAME, encoded(1, request).substr(wire::kFrameHeaderBytes));
  };
  ASSERT_TRUE(post(requestOf(Operation::KillService)) && post(requestOf(Operation::CreateReportingSession, 1)));
  EXPECT_TRUE(eventuallyHappens("1 createReportingSession 1"));
  EXPECT_EQ(events(), std::vector<std::string>{"1 createReportingSession 1"});
  EXPECT_EQ(running_.onQueue([this] { return host_->rings.counts.refused[TARNRING_ADMIN_ONLY - 1]; }), 1u);
  EXPECT_EQ(ring::SharedWords::loadAcquire(&ring.header()->last_refusal), std::uint64_t{TARNRING_ADMIN_ONLY});
}

TEST_F(SocketAccessTest, KillThroughARingOfTheAdminSocketReachesTheService) {
  testing::ClientRing ring;
  TestClient client(adminPath_);
  ASSERT_TRUE(client.requestWith(1, requestOf(Operation::OpenRing), ring.memory(), ring.wake()));
  ASSERT_TRUE(client.reply());
  ASSERT_TRUE(ring.post(TARNRING_FRAME, encoded(1, requestOf(Operation::KillService)).substr(wire::kFrameHeaderBytes)));
  EXPECT_TRUE(eventuallyHappens("1 killService"));
}

TEST_F(SocketAccessTest, ConnectionsOfBothSocketsAreNumberedTogether) {
  TestClient first(path_);
  ASSERT_TRUE(first.status());
  TestClient second(adminPath_);
  ASSERT_TRUE(second.status());
  TestClient third(path_);
  ASSERT_TRUE(third.status());
  const auto openers = running_.onQueue([this] { return service_->openers; });
  ASSERT_EQ(openers.size(), 3u);
  EXPECT_EQ(openers[0].first, 1);
  EXPECT_EQ(openers[1].first, 2);
  EXPECT_EQ(openers[2].first, 3);
}

TEST_F(SocketAccessTest, ListingIsTheServicesOverTheAdminSocketAndTheUsersOverTheOther) {
  TestClient admin(adminPath_);
  TestClient client(path_);
  ASSERT_TRUE(client.ask(1, requestOf(Operation::CreateReportingSession, 12)));
  ASSERT_TRUE(admin.ask(1, requestOf(Operation::CreateReportingSession, 13)));
  const auto all = admin.ask(2, requestOf(Operation::GetAllReporters));
  const auto own = client.ask(2, requestOf(Operation::GetAllReporters));
  ASSERT_TRUE(all && own && all->results.size() == 1 && own->results.size() == 1);
  EXPECT_EQ(plist::description(all->results[0].view()), "(1, -2, 3)");
  EXPECT_EQ(plist::description(own->results[0].view()), "(13, 12)");  // the admin's client is of the same user
}

TEST_F(SocketAccessTest, SessionsOfAConnectionThatEndedAreSeenNoMore) {
  TestClient client(path_);
  {
    TestClient gone(path_);
    ASSERT_TRUE(gone.ask(1, requestOf(Operation::CreateReportingSession, 12)));
  }
  ASSERT_TRUE(eventually([this] { return ledger().connectionsOpen == 1; }));
  const auto own = client.ask(2, requestOf(Operation::GetAllReporters));
  ASSERT_TRUE(own && own->results.size() == 1);
  EXPECT_EQ(plist::description(own->results[0].view()), "()");
}

TEST_F(SocketAccessTest, StatusIsAskedForTheUserAloneOverTheOrdinarySocket) {
  running_.onQueue([this] {
    host_->setStatusSource([](std::optional<std::uint32_t> onlyUser) {
      return plist::Dictionary{{"only", onlyUser ? static_cast<std::int64_t>(*onlyUser) : -1}};
    });
  });
  TestClient client(path_);
  TestClient admin(adminPath_);
  const auto own = client.status();
  const auto all = admin.status();
  ASSERT_TRUE(own && all);
  EXPECT_EQ(own->get("only").asInt64(), static_cast<std::int64_t>(::getuid()));
  EXPECT_EQ(all->get("only").asInt64(), -1);
}

TEST_F(SocketAccessTest, QuotasNameOneUserWhereOneIsAskedFor) {
  TestClient client(path_);
  ASSERT_TRUE(client.status());
  const auto usersOf = [this](std::optional<std::uint32_t> onlyUser) {
    return running_.onQueue([&] {
      const auto other = host_->shares.partyOf(::getuid() + 1);  // whoever has connections
      return host_->quotaUse(onlyUser).get("users").dictionary().size();
    });
  };
  EXPECT_EQ(usersOf(std::nullopt), 2u);
  EXPECT_EQ(usersOf(::getuid()), 1u);
  EXPECT_EQ(usersOf(::getuid() + 7), 0u);
}

}  // namespace
}  // namespace tarn::linux_host
