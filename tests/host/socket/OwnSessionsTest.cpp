// SPDX-License-Identifier: Apache-2.0
// What a user is shown where it may see its own sessions only.
#include <gtest/gtest.h>

#include <deque>
#include <string>

#include "host/socket/OwnSessionsView.h"
#include "plist/ValueView.h"
#include "testing/ManualClock.h"
#include "testing/ManualWorkQueues.h"

namespace tarn::linux_host {
namespace {

using Identifiers = std::vector<std::int64_t>;

class FakeClient;
// All clients, in the order of connection.
using FakeService = std::deque<std::shared_ptr<FakeClient>>;

// A client's sessions, and what the service answers it for all clients.
class FakeClient final : public platform::TarnReportingServiceProtocol {
 public:
  FakeClient(const FakeService& service, std::shared_ptr<platform::WorkQueue> queue)
      : service_(service), queue_(std::move(queue)) {}

  void createReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override {
    note("create " + std::to_string(reporterID), std::move(reply));
  }
  void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, platform::Acknowledge reply) override {
    note("type " + std::to_string(serviceType) + " " + std::to_string(reporterID), std::move(reply));
  }
  void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID,
                        platform::Acknowledge reply) override {
    note("configure " + plist::description(configuration) + " " + std::to_string(reporterID), std::move(reply));
  }
  void startReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override {
    note("start " + std::to_string(reporterID), std::move(reply));
  }
  void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                   platform::ReporterIDs reporterIDs, platform::Reply<> reply) override {
    events.push_back("send " + plist::description(message) + " " + std::to_string(category) + " " +
                     std::to_string(type) + (reporterIDs ? " to " + std::to_string(reporterIDs->size()) : " to all"));
    reply(std::nullopt);
  }
  void sendMessages(platform::MessageRun&) override { events.emplace_back("run"); }
  void stopReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override {
    note("stop " + std::to_string(reporterID), std::move(reply));
  }
  void destroyReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override {
    note("destroy " + std::to_string(reporterID), std::move(reply));
  }
  void killService() override { events.emplace_back("kill"); }

  void getServiceNameForReporterID(std::int64_t reporterID, platform::Reply<std::uint16_t> reply) override {
    events.push_back("name " + std::to_string(reporterID));
    queue_->async([this, reporterID, reply = std::move(reply)]() mutable {
      reply(std::nullopt, anybodysType(reporterID).value_or(65535));
    });
  }
  void reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) override {
    events.push_back("id " + std::to_string(reporterID));
    queue_->async([this, reporterID, reply = std::move(reply)]() mutable {
      const auto type = anybodysType(reporterID);
      reply(std::nullopt, {{"reporterID", type ? reporterID : 0}, {"serviceType", type.value_or(65535)}});
    });
  }
  void getAllReporters(platform::Reply<Identifiers> reply) override {
    events.emplace_back("all");
    Identifiers all;
    for (const auto& client : service_) {
      for (const auto& [reporterID, type] : client->sessions) {
        all.push_back(reporterID);
      }
    }
    reply(std::nullopt, all);
  }
  std::size_t sessionCount() const override { return sessions.size(); }
  std::size_t logBytes() const override { return 77; }
  bool hasSession(std::int64_t reporterID) const override { return serviceTypeOf(reporterID).has_value(); }
  std::optional<std::uint16_t> serviceTypeOf(std::int64_t reporterID) const override {
    for (const auto& [id, type] : sessions) {
      if (id == reporterID) return type;
    }
    return std::nullopt;
  }
  bool listReporterIDs(std::uint64_t& from, std::size_t atMost, Identifiers& reporters) const override {
    for (; from < sessions.size() && atMost != 0; --atMost) {
      reporters.push_back(sessions[from++].first);
    }
    return atMost == 0;
  }

  std::vector<std::pair<std::int64_t, std::uint16_t>> sessions;
  std::vector<std::string> events;

 private:
  void note(std::string event, platform::Acknowledge reply) {
    events.push_back(std::move(event));
    reply(std::nullopt, true);
  }
  std::optional<std::uint16_t> anybodysType(std::int64_t reporterID) const {
    if (const auto own = serviceTypeOf(reporterID)) return own;
    for (const auto& client : service_) {
      if (const auto type = client->serviceTypeOf(reporterID)) return type;
    }
    return std::nullopt;
  }

  const FakeService& service_;
  const std::shared_ptr<platform::WorkQueue> queue_;
};

class OwnSessionsTest : public ::testing::Test {
 protected:
  using Sessions = std::vector<std::pair<std::int64_t, std::uint16_t>>;

  // A further connection, of this user; its number is its place, from 1.
  std::shared_ptr<FakeClient> connect(std::uint32_t user, Sessions sessions) {
    const auto client = std::make_shared<FakeClient>(service_, queue_);
    client->sessions = std::move(sessions);
    service_.push_back(client);
    sessions_.add(user, static_cast<std::int64_t>(service_.size()), client);
    return client;
  }
  std::shared_ptr<OwnSessionsView> viewOf(std::uint32_t user, const std::shared_ptr<FakeClient>& client) {
    return std::make_shared<OwnSessionsView>(client, sessions_, user, queue_);
  }

  std::uint16_t typeSeen(OwnSessionsView& view, std::int64_t reporterID) {
    std::optional<std::uint16_t> seen;
    view.getServiceNameForReporterID(reporterID, [&](const auto& error, std::uint16_t type) {
      EXPECT_FALSE(error);
      seen = type;
    });
    queue_->runUntilIdle();
    EXPECT_TRUE(seen);
    return seen.value_or(0);
  }
  std::string reporterSeen(OwnSessionsView& view, std::int64_t reporterID) {
    std::string seen;
    view.reporterID(reporterID, [&](const auto& error, const plist::Dictionary& answer) {
      EXPECT_FALSE(error);
      seen = plist::description(answer);
    });
    queue_->runUntilIdle();
    return seen;
  }
  Identifiers allSeen(OwnSessionsView& view) {
    std::optional<Identifiers> seen;
    view.getAllReporters([&](const auto& error, Identifiers reporters) {
      EXPECT_FALSE(error);
      seen = std::move(reporters);
    });
    queue_->runUntilIdle();
    EXPECT_TRUE(seen);
    return seen.value_or(Identifiers{-1});
  }

  testing::ManualClock clock_;
  testing::ManualWorkQueues queues_{clock_};
  const std::shared_ptr<testing::ManualWorkQueue> queue_ = std::static_pointer_cast<testing::ManualWorkQueue>(
      queues_.makeSuspendableQueue("server", platform::QualityOfService::UserInteractive));
  FakeService service_;
  UserSessions sessions_;
};

TEST_F(OwnSessionsTest, OfAnotherUsersSessionNothingIsSeen) {
  connect(1, {{7, 3}});
  const auto client = connect(2, {{8, 4}});
  const auto view = viewOf(2, client);
  EXPECT_EQ(typeSeen(*view, 7), 65535);
  EXPECT_EQ(reporterSeen(*view, 7), "{reporterID = 0; serviceType = 65535}");
  EXPECT_EQ(allSeen(*view), Identifiers{8});
}

TEST_F(OwnSessionsTest, AnUnknownSessionIsAnsweredForInTheSameWay) {
  const auto view = viewOf(2, connect(2, {}));
  EXPECT_EQ(typeSeen(*view, 7), 65535);
  EXPECT_EQ(reporterSeen(*view, 7), "{reporterID = 0; serviceType = 65535}");
  EXPECT_EQ(allSeen(*view), Identifiers{});
}

TEST_F(OwnSessionsTest, SessionsOfTheUsersOtherConnectionsAreSeen) {
  connect(2, {{7, 3}});
  const auto view = viewOf(2, connect(2, {{8, 4}}));
  connect(2, {{9, 5}});
  EXPECT_EQ(typeSeen(*view, 7), 3);
  EXPECT_EQ(typeSeen(*view, 9), 5);
  EXPECT_EQ(reporterSeen(*view, 9), "{reporterID = 9; serviceType = 5}");
  EXPECT_EQ(allSeen(*view), (Identifiers{7, 8, 9}));
}

TEST_F(OwnSessionsTest, AnIDThatOthersHaveTooIsAnsweredForByTheUsersOwnSession) {
  connect(1, {{7, 3}});
  const auto first = connect(2, {});
  connect(2, {{7, 4}});
  const auto third = connect(2, {{7, 5}});
  EXPECT_EQ(typeSeen(*viewOf(2, first), 7), 4);
  EXPECT_EQ(typeSeen(*viewOf(2, third), 7), 5);  // its own comes first
  EXPECT_EQ(reporterSeen(*viewOf(2, first), 7), "{reporterID = 7; serviceType = 4}");
}

TEST_F(OwnSessionsTest, ASessionWithoutATypeHidesNoneAndIsKnown) {
  connect(1, {{7, 65535}});
  const auto view = viewOf(2, connect(2, {{7, 65535}}));
  EXPECT_EQ(typeSeen(*view, 7), 65535);
  EXPECT_EQ(reporterSeen(*view, 7), "{reporterID = 7; serviceType = 65535}");
}

TEST_F(OwnSessionsTest, ZeroHasNoTypeButMayBeAsked) {
  const auto view = viewOf(2, connect(2, {{0, 3}}));
  EXPECT_EQ(typeSeen(*view, 0), 65535);
  EXPECT_EQ(reporterSeen(*view, 0), "{reporterID = 0; serviceType = 3}");
}

TEST_F(OwnSessionsTest, AnIDThatTwoUsersHaveIsListedOnceAndOneOfTwoConnectionsTwice) {
  connect(1, {{8, 1}, {7, 1}});
  const auto view = viewOf(2, connect(2, {{7, 1}, {8, 1}}));
  EXPECT_EQ(allSeen(*view), (Identifiers{7, 8}));
  connect(2, {{7, 1}});
  EXPECT_EQ(allSeen(*view), (Identifiers{7, 8, 7}));
}

TEST_F(OwnSessionsTest, ALongListingGivesWayAndListsEachOnce) {
  Sessions many;
  for (std::int64_t id = 0; id < 100; ++id) {
    many.emplace_back(id, 1);
  }
  connect(2, many);
  connect(1, many);
  connect(2, {});
  const auto view = viewOf(2, connect(2, {{100, 1}}));
  queue_->setTurn(1);
  Identifiers expected;
  for (std::int64_t id = 0; id <= 100; ++id) {
    expected.push_back(id);
  }
  EXPECT_EQ(allSeen(*view), expected);
  EXPECT_GE(queue_->spent(), 7u);
}

TEST_F(OwnSessionsTest, AListingGoesOnWhereAClientWentMeanwhile) {
  const auto first = connect(2, Sessions(40, {1, 1}));
  const auto view = viewOf(2, connect(2, {{2, 1}}));
  queue_->setTurn(1);
  std::optional<Identifiers> seen;
  view->getAllReporters([&](const auto&, Identifiers reporters) { seen = std::move(reporters); });
  ASSERT_TRUE(queue_->runOne());
  EXPECT_FALSE(seen);
  sessions_.remove(2, 1);
  queue_->runUntilIdle();
  Identifiers expected(16, 1);
  expected.push_back(2);
  EXPECT_EQ(seen, expected);
}

TEST_F(OwnSessionsTest, AClientThatIsGoneOrRemovedIsSeenNoMore) {
  const auto view = viewOf(2, connect(2, {}));
  connect(2, {{7, 3}});
  connect(2, {{8, 4}});
  service_.erase(service_.begin() + 1);  // nobody else holds it
  sessions_.remove(2, 3);
  sessions_.remove(2, 99);
  EXPECT_EQ(typeSeen(*view, 7), 65535);
  EXPECT_EQ(typeSeen(*view, 8), 65535);
  EXPECT_EQ(allSeen(*view), Identifiers{});
}

TEST_F(OwnSessionsTest, UsersAreToldApartToTheLastNumber) {
  connect(0, {{1, 1}});
  connect(1, {{2, 1}});
  connect(4294967295, {{3, 1}});
  const auto root = viewOf(0, service_[0]);
  const auto last = viewOf(4294967295, service_[2]);
  EXPECT_EQ(allSeen(*root), Identifiers{1});
  EXPECT_EQ(allSeen(*last), Identifiers{3});
  EXPECT_EQ(typeSeen(*root, 3), 65535);
}

TEST_F(OwnSessionsTest, TheServiceDoesWhatItAlwaysDoes) {
  const auto client = connect(2, {{7, 3}});
  const auto view = viewOf(2, client);
  int replies = 0;
  const auto acknowledge = [&](const auto& error, bool done) { replies += !error && done ? 1 : 0; };
  view->createReportingSession(1, acknowledge);
  view->setServiceType(5, 1, acknowledge);
  view->setConfiguration({{"a", 1}}, 1, acknowledge);
  view->startReportingSessionForID(1, acknowledge);
  view->stopReportingSessionForID(1, acknowledge);
  view->destroyReportingSession(1, acknowledge);
  view->sendMessage({{"b", 2}}, 3, 4, std::nullopt, [&](const auto& error) { replies += error ? 0 : 1; });
  view->sendMessage({}, 3, 4, Identifiers{1, 2}, [&](const auto& error) { replies += error ? 0 : 1; });
  EXPECT_EQ(replies, 8);
  EXPECT_EQ(client->events,
            (std::vector<std::string>{"create 1", "type 5 1", "configure {a = 1} 1", "start 1", "stop 1", "destroy 1",
                                      "send {b = 2} 3 4 to all", "send {} 3 4 to 2"}));
  typeSeen(*view, 7);
  reporterSeen(*view, 7);
  EXPECT_EQ(client->events.back(), "id 7");  // so that it logs what was asked
  EXPECT_EQ(view->sessionCount(), 1u);
  EXPECT_EQ(view->logBytes(), 77u);
  EXPECT_TRUE(view->hasSession(7));
  EXPECT_FALSE(view->hasSession(8));
  EXPECT_EQ(view->serviceTypeOf(7), 3);
  std::uint64_t from = 0;
  Identifiers listed;
  view->listReporterIDs(from, 1, listed);
  EXPECT_EQ(listed, Identifiers{7});
}

TEST_F(OwnSessionsTest, ItIsNotForKilling) {
  const auto client = connect(2, {});
  viewOf(2, client)->killService();
  EXPECT_TRUE(client->events.empty());
}

}  // namespace
}  // namespace tarn::linux_host
