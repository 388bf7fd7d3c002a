// SPDX-License-Identifier: Apache-2.0
// What each piece of long work costs and where exactly it gives way: a bound that moved would let one client hold the
// others up, or make short work slow.
#include "session/TarnReportingSessionMessage.h"
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;

class SliceBounds : public ServiceFixture {
 protected:
  SliceBounds() : client_(connect(41)), other_(connect(42)) {
    queue_ = platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server");
  }
  static std::vector<std::int64_t> idsFrom(std::int64_t first, std::int64_t count) {
    std::vector<std::int64_t> ids;
    for (std::int64_t id = first; id < first + count; ++id) {
      ids.push_back(id);
    }
    return ids;
  }
  // How many pieces the work on the queue takes, when each may spend so much.
  std::size_t pieces(std::size_t turn) {
    queue_->setTurn(turn);
    return queue_->runUntilIdle();
  }
  void handOver(platform::ReporterIDs reporterIDs) {
    client_.remote().sendMessage({{"a", 1}}, 4, 1, std::move(reporterIDs),
                                 [this](const std::optional<platform::RemoteError>&) { ++replies_; });
  }
  void createFrom(std::int64_t first, std::int64_t count) {
    for (const std::int64_t id : idsFrom(first, count)) {
      create(other_, id);
    }
  }
  // A configuration by which the session's description is so long.
  void describe(const Client& client, std::int64_t reporterID, std::size_t length) {
    const auto nameLength = [&](std::size_t bytes) {
      configure(client, {{"HostApplicationDisplayID", std::string(bytes, 'x')}}, reporterID);
      return service_->findReportingSessionForID(reporterID)->description().size();
    };
    const std::size_t other = nameLength(1) - 1;
    ASSERT_EQ(nameLength(length - other), length);
  }
  std::uint64_t counted(TarnReportingOutcome outcome) const { return service_->messageCounts().of(outcome); }

  Client client_;
  Client other_;
  Answer<bool> held_;
  int replies_ = 0;
  std::shared_ptr<ManualWorkQueue> queue_;
};

TEST_F(SliceBounds, SixteenIDsAreLookedUpForAUnitOfCost) {
  handOver(idsFrom(1000, 16));
  EXPECT_EQ(pieces(1), 1U);
  handOver(idsFrom(1000, 17));
  EXPECT_EQ(pieces(1), 2U);
  handOver(idsFrom(1000, 32));
  EXPECT_EQ(pieces(1), 2U);
  handOver(idsFrom(1000, 33));
  EXPECT_EQ(pieces(1), 3U);
  handOver(idsFrom(1000, 33));
  EXPECT_EQ(pieces(2), 2U);
  EXPECT_EQ(replies_, 5);
}

TEST_F(SliceBounds, SixteenIDsAreListedForAUnitOfCost) {
  const auto list = [this](std::size_t turn) {
    Answer<std::vector<std::int64_t>> all;
    client_.remote().getAllReporters(all.reply());
    const std::size_t count = pieces(turn);
    EXPECT_EQ(all.count, 1);
    return count;
  };
  createFrom(100, 15);
  EXPECT_EQ(list(1), 1U);
  createFrom(115, 18);
  EXPECT_EQ(list(1), 3U);
  EXPECT_EQ(list(2), 2U);
}

TEST_F(SliceBounds, AStopCostsAUnitForTwoMessagesOfItsLog) {
  create(client_, 7);
  start(client_, 7, held_);
  for (int value = 0; value < 12; ++value) {
    send(client_, {{"a", value}}, std::vector<std::int64_t>{7});
  }
  ASSERT_EQ(sessionOf(0, 7)->messages().size(), 13U);  // a worker says something at the start
  const std::size_t before = queue_->spent();
  stop(client_, 7);
  EXPECT_EQ(queue_->spent() - before, 6U);
}

TEST_F(SliceBounds, AClientWithOneSessionEndsInOnePiece) {
  createFrom(100, 1);
  start(other_, 100, held_);
  queue_->setTurn(1);
  other_.connection->invalidate();
  EXPECT_EQ(pieces(1), 1U);
  EXPECT_EQ(service_->getAllClients().size(), 1U);
}

TEST_F(SliceBounds, AClientWithTwoSessionsGivesWayAfterEachStop) {
  createFrom(100, 2);
  start(other_, 100, held_);
  start(other_, 101, held_);
  queue_->setTurn(32);
  other_.connection->invalidate();
  ASSERT_TRUE(queue_->runOne());
  EXPECT_EQ(service_->sessionIndex().runningCount(), 1U);
  ASSERT_TRUE(queue_->runOne());
  EXPECT_EQ(service_->sessionIndex().runningCount(), 0U);
  EXPECT_EQ(service_->sessionCount(), 2U);
  queue_->runUntilIdle();
  EXPECT_EQ(service_->getAllClients().size(), 1U);
}

TEST_F(SliceBounds, AStopOfAnEndingClientCostsThirtyTwoUnits) {
  createFrom(100, 2);
  start(other_, 100, held_);
  start(other_, 101, held_);
  other_.connection->invalidate();
  EXPECT_EQ(pieces(33), 2U);
}

TEST_F(SliceBounds, TheSessionsOfAnEndingClientAreReleasedByFours) {
  createFrom(100, 13);
  queue_->setTurn(4);
  other_.connection->invalidate();
  for (const std::size_t left : {9U, 5U, 1U, 0U}) {
    ASSERT_TRUE(queue_->runOne());
    EXPECT_EQ(service_->sessionCount(), left);
  }
  EXPECT_EQ(service_->getAllClients().size(), 1U);
}

TEST_F(SliceBounds, WithoutOthersToWaitForItAllIsReleasedAtOnce) {
  createFrom(100, 13);
  other_.connection->invalidate();
  EXPECT_EQ(pieces(1000), 1U);
}

TEST_F(SliceBounds, WhyAClientEndsIsToldOnceHoweverManyPiecesItTakes) {
  createFrom(100, 13);
  service_->announceEnd();
  platform_.log.clear();
  other_.connection->invalidate();
  EXPECT_EQ(pieces(4), 4U);
  EXPECT_EQ(platform_.log.count("ending client 42. reason=service-stopping"), 1U);
}

TEST_F(SliceBounds, AStartIsAnsweredOnceItsSessionHasStopped) {
  create(client_, 7);
  bool startedAtReply = true;
  client_.remote().startReportingSessionForID(
      7, [&](const std::optional<platform::RemoteError>&, bool) { startedAtReply = sessionOf(0, 7)->started(); });
  stop(client_, 7);
  EXPECT_FALSE(startedAtReply);
}

TEST_F(SliceBounds, AMessageByIDReachesASessionThatDoesNotRunAlsoInALaterPiece) {
  createFrom(100, 3);
  handOver(idsFrom(100, 3));
  EXPECT_EQ(pieces(2), 3U);
  EXPECT_EQ(sessionOf(1, 102)->previousValues().size(), sessionOf(1, 100)->previousValues().size());
  EXPECT_NE(sessionOf(1, 102)->previousValues().size(), 0U);
}

TEST_F(SliceBounds, AMessageWhoseServiceIsGoneInTheMiddleGetsNoReply) {
  createFrom(100, 3);
  handOver(idsFrom(100, 3));
  queue_->setTurn(2);
  ASSERT_TRUE(queue_->runOne());
  const std::weak_ptr<TarnReportingService> gone = service_;
  platform_.listener.setDelegate({});
  service_.reset();
  ASSERT_TRUE(gone.expired());
  queue_->runUntilIdle();
  EXPECT_EQ(replies_, 0);
}

// One worker that takes every message.
struct OnlyWorker : TarnReportingSessionWorkerProtocol, TarnReportingSessionWorkerConsumerProtocol {
  static constexpr std::string_view kClassName = "OnlyWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<OnlyWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<OnlyWorker>(session);
  }
  static bool startOnInit() { return true; }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {}
};
constexpr TarnReportingSessionWorkerClass kOnlyWorker[] = {TarnReportingSessionWorkerClass::of<OnlyWorker>()};

TEST_F(SliceBounds, AMessageThatOneWorkerGotIsDeliveredAndOneThatNoneGotIsUnwanted) {
  TarnReportingSession::setAllWorkerClasses(kOnlyWorker);
  create(client_, 7);
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{7});
  EXPECT_EQ(counted(TarnReportingOutcome::Delivered), 1U);
  TarnReportingSession::setAllWorkerClasses({});
  create(client_, 8);
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{8});
  EXPECT_EQ(counted(TarnReportingOutcome::Unwanted), 1U);
}

TEST_F(SliceBounds, AClientIsChargedForTheLogsOfItsSessions) {
  create(client_, 7);
  start(client_, 7, held_);
  const std::size_t before = client_.remote().logBytes();
  send(client_, {{"a", std::string(500, 'x')}}, std::vector<std::int64_t>{7});
  EXPECT_GE(client_.remote().logBytes(), before + 500);
  EXPECT_EQ(other_.remote().logBytes(), 0U);
}

TEST_F(SliceBounds, ALookUpOfAnUnknownIDHasItsLine) {
  create(client_, 7);
  platform_.log.clear();
  EXPECT_NE(service_->findReportingSessionForID(7), nullptr);
  EXPECT_FALSE(platform_.log.contains("failed to find"));
  EXPECT_EQ(service_->findReportingSessionForID(99), nullptr);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Error, "failed to find reporting session 99"));
}

TEST_F(SliceBounds, ListingSessionsOutsideTheServerQueueEndsTheProcess) {
  const auto other = platform_.workQueues.makeSerialQueue("other", platform::QualityOfService::Utility);
  other->async([this] { service_->logReportingSessions(); });
  EXPECT_DEATH(platform_.runUntilIdle(), "code of the server queue was called outside it");
}

TEST_F(SliceBounds, AListOfExactlyTheBytesOfACallIsWhole) {
  create(client_, 7);
  start(client_, 7, held_);
  describe(client_, 7, 32768);
  platform_.log.clear();
  service_->logReportingSessions();
  EXPECT_FALSE(platform_.log.contains("more)"));
  describe(client_, 7, 32769);
  platform_.log.clear();
  service_->logReportingSessions();
  EXPECT_EQ(platform_.log.count("(and 1 more)"), 2U);
}

TEST_F(SliceBounds, WhatComesAfterATextThatIsTooLongIsCountedOnly) {
  create(client_, 7);
  start(client_, 7, held_);
  describe(client_, 7, 32769);
  createFrom(100, 1);
  start(other_, 100, held_);
  platform_.log.clear();
  service_->logReportingSessions();
  EXPECT_EQ(lines("tarnrs").at(1), "default sessions for client 42 : (and 1 more)");
}

TEST_F(SliceBounds, OfManyClientsNoneIsListedOnceTheBytesAreUsedUp) {
  create(client_, 7);
  start(client_, 7, held_);
  createFrom(100, 1);
  start(other_, 100, held_);
  for (std::int32_t pid = 1000; pid < 1031; ++pid) {
    connect(pid);
  }
  describe(client_, 7, 32769);
  platform_.log.clear();
  service_->logReportingSessions();
  const auto told = lines("tarnrs");
  ASSERT_EQ(told.size(), 3U);
  EXPECT_EQ(told[0], "default sessions for client 41 : (and 1 more)");
  EXPECT_EQ(told[1], "default sessions of 32 more clients are not listed");
}

TEST_F(SliceBounds, TheSessionOfSingleMessagesEndsStoppedAndIsNotCheckedAnyMore) {
  const auto session = service_->findReportingSessionsForIDs(std::nullopt).at(0);
  service_->endSingleMessageSession();
  EXPECT_FALSE(session->started());
  platform_.log.clear();
  platform_.advance(std::chrono::seconds(60));
  EXPECT_FALSE(platform_.log.contains("singleMessageSession"));
}

}  // namespace
}  // namespace tarn
