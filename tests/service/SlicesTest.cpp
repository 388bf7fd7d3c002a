// SPDX-License-Identifier: Apache-2.0
// Long work in slices: what others may do in between, and that its own client sees no difference.
#include <numeric>
#include <random>

#include "service/TarnReportingSessionIndex.h"
#include "tests/service/ServiceFixture.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

class Slices : public ServiceFixture {
 protected:
  Slices() : client_(connect(41)), other_(connect(42)) {
    queue_ = platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server");
  }
  // So many running sessions of the other client, from 100 up.
  void runSessions(std::int64_t count) {
    for (std::int64_t id = 100; id < 100 + count; ++id) {
      create(other_, id);
      start(other_, id, held_);
    }
  }
  std::int64_t messagesOf(std::int64_t reporterID) const { return sessionOf(1, reporterID)->totalMessageCount(); }
  std::int64_t sessionsWithAMessage(std::int64_t count) const {
    std::int64_t with = 0;
    for (std::int64_t id = 100; id < 100 + count; ++id) {
      const auto session = sessionOf(1, id);
      with += session && session->totalMessageCount() != 0 ? 1 : 0;
    }
    return with;
  }
  void handOver(platform::ReporterIDs reporterIDs) {
    client_.remote().sendMessage({{"a", 1}}, 4, 1, std::move(reporterIDs),
                                 [this](const std::optional<platform::RemoteError>&) { ++replies_; });
  }
  static std::vector<std::int64_t> idsFrom(std::int64_t first, std::int64_t count) {
    std::vector<std::int64_t> ids;
    for (std::int64_t id = first; id < first + count; ++id) {
      ids.push_back(id);
    }
    return ids;
  }
  std::uint64_t counted(TarnReportingOutcome outcome) const { return service_->messageCounts().of(outcome); }

  Client client_;
  Client other_;
  Answer<bool> held_;
  int replies_ = 0;
  std::shared_ptr<ManualWorkQueue> queue_;
};

// A service of its own for each seed.
class AccountRound : public Slices {
 public:
  void TestBody() override {}
  void play(std::uint64_t seed);

 private:
  std::uint64_t all() const {
    const auto& counts = service_->messageCounts().counts;
    return std::accumulate(counts.begin(), counts.end(), std::uint64_t{0});
  }
};

TEST_F(Slices, ABroadcastReachesEverySessionAndIsAnsweredAtItsEnd) {
  runSessions(20);
  queue_->setTurn(8);
  handOver(std::nullopt);
  ASSERT_TRUE(queue_->runOne());
  EXPECT_EQ(sessionsWithAMessage(20), 2);
  EXPECT_EQ(replies_, 0);
  queue_->runUntilIdle();
  EXPECT_EQ(sessionsWithAMessage(20), 20);
  EXPECT_EQ(messagesOf(100), 1);
  EXPECT_EQ(messagesOf(119), 1);
  EXPECT_EQ(replies_, 1);
}

TEST_F(Slices, ABroadcastGoesToWhoeverRanWhenItsTurnCame) {
  runSessions(6);
  create(other_, 200);
  queue_->setTurn(2);
  handOver(std::nullopt);
  Answer<bool> answer;
  other_.remote().startReportingSessionForID(200, held_.reply());
  other_.remote().stopReportingSessionForID(103, answer.reply());
  ASSERT_TRUE(queue_->runOne());  // the first has it
  EXPECT_EQ(sessionsWithAMessage(6), 1);
  queue_->runUntilIdle();
  EXPECT_EQ(messagesOf(200), 0);  // began after it
  EXPECT_EQ(messagesOf(103), 0);  // ended before its turn in it
  EXPECT_EQ(messagesOf(105), 1);
  EXPECT_EQ(replies_, 1);
}

TEST_F(Slices, AMessageToManySessionsGoesToEachAsOftenAsItIsNamed) {
  runSessions(10);
  auto ids = idsFrom(100, 10);
  ids.push_back(100);
  queue_->setTurn(2);
  handOver(ids);
  queue_->runUntilIdle();
  EXPECT_EQ(messagesOf(100), 2);
  EXPECT_EQ(messagesOf(109), 1);
  EXPECT_EQ(replies_, 1);
}

TEST_F(Slices, ALongListOfIDsIsLookedUpInParts) {
  queue_->setTurn(1);
  handOver(idsFrom(1000, 100));
  ASSERT_TRUE(queue_->runOne());
  EXPECT_EQ(replies_, 0);
  queue_->runUntilIdle();
  EXPECT_EQ(replies_, 1);
  EXPECT_EQ(counted(TarnReportingOutcome::WithoutSession), 1U);
}

TEST_F(Slices, OfUnknownIDsTheFirstEightAreToldAndTheRestCounted) {
  queue_->setTurn(1);
  platform_.log.clear();
  handOver(idsFrom(1000, 100));
  queue_->runUntilIdle();
  const auto told = lines("tarnrs");
  ASSERT_EQ(told.size(), 9U);
  EXPECT_EQ(told[0], "error failed to find reporting session 1000");
  EXPECT_EQ(told[7], "error failed to find reporting session 1007");
  EXPECT_EQ(told[8], "error failed to find 92 more reporting sessions");
}

TEST_F(Slices, EightUnknownIDsAreToldAsTheyAre) {
  platform_.log.clear();
  handOver(idsFrom(1000, 8));
  queue_->runUntilIdle();
  EXPECT_EQ(lines("tarnrs").size(), 8U);
}

TEST_F(Slices, AListingNamesEverySessionOnceWhateverOthersDoMeanwhile) {
  for (std::int64_t id = 100; id < 400; ++id) {
    create(other_, id);
  }
  create(client_, 7);
  queue_->setTurn(1);
  Answer<std::vector<std::int64_t>> all;
  client_.remote().getAllReporters(all.reply());
  Answer<bool> done;
  other_.remote().destroyReportingSession(100, done.reply());  // listed already
  other_.remote().setServiceType(3, 399, done.reply());        // replaced, in its place
  ASSERT_TRUE(queue_->runOne());
  EXPECT_EQ(all.count, 0);
  queue_->runUntilIdle();
  ASSERT_EQ(all.count, 1);
  auto expected = idsFrom(100, 300);
  expected.insert(expected.begin(), 7);
  EXPECT_EQ(all.result, expected);
  EXPECT_EQ(sessionOf(1, 100), nullptr);
}

TEST_F(Slices, TheEndOfAClientStopsItsSessionsOneAfterTheOtherAndThenReleasesThem) {
  runSessions(12);
  queue_->setTurn(32);
  platform_.log.clear();
  other_.connection->invalidate();
  ASSERT_TRUE(queue_->runOne());
  EXPECT_EQ(sessionOf(1, 100)->started(), false);
  EXPECT_EQ(sessionOf(1, 111)->started(), true);
  EXPECT_EQ(platform_.log.count("deallocing this session"), 0U);
  EXPECT_EQ(service_->sessionIndex().runningCount(), 11U);
  queue_->runUntilIdle();
  EXPECT_EQ(service_->getAllClients().size(), 1U);
  EXPECT_EQ(platform_.log.count("deallocing this session"), 12U);
  EXPECT_EQ(platform_.log.count("removing 42 from the server client list"), 1U);
  EXPECT_EQ(service_->sessionCount(), 0U);
}

TEST_F(Slices, OfManyClientsTheFirstWithSessionsAreListedAndTheRestCounted) {
  for (std::int32_t pid = 1000; pid < 1100; ++pid) {
    const Client client = connect(pid);
    if (pid % 2 == 0) {
      create(client, pid);
    }
  }
  platform_.log.clear();
  service_->logReportingSessions();
  const auto told = lines("tarnrs");
  ASSERT_EQ(told.size(), 34U);
  EXPECT_EQ(told[0], "default sessions for client 1000 : ()");
  EXPECT_EQ(told[31], "default sessions for client 1062 : ()");
  EXPECT_EQ(told[32], "default sessions of 70 more clients are not listed");
  EXPECT_EQ(told[33], "default 0 active reporting session(s) ()");
}

TEST_F(Slices, SessionsThatAreThereBeforeTheirClientIsListedAreFoundLater) {
  TarnReportingSessionIndex* const index = const_cast<TarnReportingSessionIndex*>(&service_->sessionIndex());
  const auto early = TarnReportingClientServerInstance::initWithPID(77, std::weak_ptr(service_));
  early->createReportingSession(500, [](const std::optional<platform::RemoteError>&, bool) {});
  platform_.runUntilIdle();
  EXPECT_EQ(service_->findReportingSessionForID(500), nullptr);
  early->listSessions(std::shared_ptr<TarnReportingSessionIndex>(std::shared_ptr<void>(), index), 900);
  EXPECT_NE(service_->findReportingSessionForID(500), nullptr);
  EXPECT_EQ(service_->sessionCount(), 1U);
}

TEST_F(Slices, ThirtyTwoClientsAreListedAsTheyAre) {
  for (std::int32_t pid = 1000; pid < 1030; ++pid) {
    connect(pid);
  }
  platform_.log.clear();
  service_->logReportingSessions();
  EXPECT_EQ(lines("tarnrs").size(), 33U);
  EXPECT_FALSE(platform_.log.contains("are not listed"));
}

TEST_F(Slices, ListsOfOneCallAreBoundedByTheirBytes) {
  const plist::Dictionary large{{"HostApplicationDisplayID", std::string(9000, 'x')}};
  runSessions(5);
  for (std::int64_t id = 100; id < 105; ++id) {
    configure(other_, large, id);
  }
  platform_.log.clear();
  service_->logReportingSessions();
  const auto told = lines("tarnrs");
  ASSERT_EQ(told.size(), 3U);
  EXPECT_TRUE(told[1].ends_with("and 2 more)")) << told[1].substr(told[1].size() - 40);
  EXPECT_LT(told[1].size(), 33000U);
  EXPECT_TRUE(told[2].ends_with("and 2 more)"));
}

TEST_F(Slices, EachMessageIsInOneMemberOfTheAccount) {
  create(client_, 10);
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{10});  // news, and the analytics worker isn't made yet
  EXPECT_EQ(counted(TarnReportingOutcome::Unwanted) + counted(TarnReportingOutcome::Delivered), 1U);
  start(client_, 10, held_);
  send(client_, {{"a", 2}}, std::vector<std::int64_t>{10});
  send(client_, {{"a", 2}}, std::vector<std::int64_t>{10});
  EXPECT_EQ(counted(TarnReportingOutcome::Redundant), 1U);
  send(client_, {{"a", 2}}, std::vector<std::int64_t>{99});
  EXPECT_EQ(counted(TarnReportingOutcome::WithoutSession), 1U);
  service_->setReportingEnabled(false);
  send(client_, {{"a", 3}}, std::nullopt);
  EXPECT_EQ(counted(TarnReportingOutcome::Refused), 1U);
  const auto& counts = service_->messageCounts().counts;
  EXPECT_EQ(std::accumulate(counts.begin(), counts.end(), std::uint64_t{0}), 5U);
}

// Messages of every kind, in slices, while sessions and clients come and go: when all is done the account is closed,
// and until then nothing is in it that didn't come in.
void AccountRound::play(std::uint64_t seed) {
  std::mt19937_64 random(seed);
  const auto pick = [&random](std::uint64_t below) { return static_cast<std::int64_t>(random() % below); };
  std::vector<Client> clients{client_, other_};
  queue_->setTurn(3);
  std::uint64_t sent = 0;
  std::uint64_t replies = 0;
  const auto ignore = [](const std::optional<platform::RemoteError>&, bool) {};
  for (int step = 0; step < 2000; ++step) {
    auto& service = clients[static_cast<std::size_t>(pick(clients.size()))].remote();
    switch (pick(9)) {
      case 0:
        service.createReportingSession(1 + pick(6), ignore);
        break;
      case 1:
        service.startReportingSessionForID(1 + pick(6), ignore);
        break;
      case 2:
        service.stopReportingSessionForID(1 + pick(6), ignore);
        break;
      case 3:
        service.destroyReportingSession(1 + pick(6), ignore);
        break;
      case 4:
        service_->setReportingEnabled(pick(4) != 0);
        break;
      default: {
        platform::ReporterIDs ids;
        for (std::int64_t left = pick(5); left != 0; --left) {
          ids = ids.value_or(std::vector<std::int64_t>());
          ids->push_back(pick(8));
        }
        ++sent;
        service.sendMessage({{"a", pick(3)}}, 4, 1, std::move(ids),
                            [&replies](const std::optional<platform::RemoteError>&) { ++replies; });
      }
    }
    for (std::int64_t left = pick(3); left != 0; --left) {
      queue_->runOne();
    }
    ASSERT_EQ(all(), replies);  // each is counted when it is answered
    ASSERT_LE(all(), sent);
  }
  queue_->runUntilIdle();
  EXPECT_EQ(all(), sent);
  EXPECT_GT(counted(TarnReportingOutcome::Delivered), 0U);
  EXPECT_GT(counted(TarnReportingOutcome::Redundant), 0U);
  EXPECT_GT(counted(TarnReportingOutcome::WithoutSession), 0U);
  EXPECT_GT(counted(TarnReportingOutcome::Refused), 0U);
}

TEST(MessageAccount, IsClosedOverARandomStream) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    AccountRound().play(seed);
  }
}

TEST_F(Slices, ABroadcastWhoseSessionsEndedMeanwhileIsStillDelivered) {
  runSessions(2);
  queue_->setTurn(2);
  handOver(std::nullopt);
  other_.connection->invalidate();
  ASSERT_TRUE(queue_->runOne());
  queue_->runUntilIdle();
  EXPECT_EQ(counted(TarnReportingOutcome::Delivered), 1U);
  EXPECT_EQ(replies_, 1);
}

}  // namespace
}  // namespace tarn
