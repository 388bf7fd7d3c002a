// SPDX-License-Identifier: Apache-2.0
// What all clients' sessions are together, and a client's own: held in step by every way in which a session comes,
// runs, stops and goes.
#include "service/TarnReportingSessionIndex.h"

#include <utility>

#include "service/TarnReportingSessionMap.h"
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;

class SessionIndex : public ServiceFixture {
 protected:
  SessionIndex()
      : first_(TarnReportingClientServerInstance::initWithPID(1, std::weak_ptr(service_))),
        second_(TarnReportingClientServerInstance::initWithPID(2, std::weak_ptr(service_))) {}

  static TarnReportingSessionMap::Session session(std::int64_t reporterID) {
    return TarnReportingSession::initWithID(reporterID, {4711});
  }
  static std::vector<std::int64_t> runningOf(const TarnReportingSessionMap& map, std::size_t most) {
    std::vector<std::int64_t> found;
    map.forEachRunning([&](const TarnReportingSessionMap::Session& running) {
      found.push_back(running->reporterID());
      return found.size() < most;
    });
    return found;
  }

  const std::shared_ptr<TarnReportingClientServerInstance> first_;
  const std::shared_ptr<TarnReportingClientServerInstance> second_;
  const std::shared_ptr<TarnReportingSessionIndex> index_ = std::make_shared<TarnReportingSessionIndex>();
};

TEST_F(SessionIndex, NamesTheFirstHolderInTheOrderOfTheClients) {
  index_->add(10, 5, *second_);
  EXPECT_EQ(index_->firstHolder(10), second_.get());
  index_->add(10, 4, *first_);
  EXPECT_EQ(index_->firstHolder(10), first_.get());
  index_->remove(10, 4);
  EXPECT_EQ(index_->firstHolder(10), second_.get());
}

TEST_F(SessionIndex, AnIDWhoseLastHolderIsGoneIsUnknown) {
  index_->add(10, 5, *second_);
  index_->add(11, 5, *second_);
  index_->remove(10, 5);
  EXPECT_EQ(index_->firstHolder(10), nullptr);
  EXPECT_EQ(index_->firstHolder(11), second_.get());
  EXPECT_EQ(index_->sessionCount(), 1U);
}

TEST_F(SessionIndex, ListsAClientWhileItHasASession) {
  index_->add(10, 5, *second_);
  index_->add(11, 5, *second_);
  index_->add(10, 4, *first_);
  EXPECT_EQ(index_->clients(), (TarnReportingSessionIndex::Clients{{4, first_.get()}, {5, second_.get()}}));
  index_->remove(10, 5);
  EXPECT_EQ(index_->clients().size(), 2U);
  index_->remove(11, 5);
  EXPECT_EQ(index_->clients(), (TarnReportingSessionIndex::Clients{{4, first_.get()}}));
  index_->add(12, 5, *second_);
  EXPECT_EQ(index_->clients().size(), 2U);
}

TEST_F(SessionIndex, CountsHowOftenItChangedWhoHasWhichSession) {
  TarnReportingSessionMap map;
  map.list(index_, 5, *second_);
  std::uint64_t before = index_->changes();
  const auto changed = [&] { return std::exchange(before, index_->changes()) != index_->changes(); };
  map.store(10, session(10));
  EXPECT_TRUE(changed());
  map.store(10, session(10));
  EXPECT_TRUE(changed());
  map.setRunning(10, true);
  EXPECT_FALSE(changed());
  map.remove(11);
  EXPECT_FALSE(changed());
  map.remove(10);
  EXPECT_TRUE(changed());
}

TEST_F(SessionIndex, RemovingWhatIsNotThereChangesNothing) {
  index_->add(10, 5, *second_);
  index_->remove(11, 5);  // no such ID
  index_->remove(10, 4);  // another client's
  EXPECT_EQ(index_->sessionCount(), 1U);
  EXPECT_EQ(index_->clients().size(), 1U);
  EXPECT_EQ(index_->firstHolder(10), second_.get());
}

TEST_F(SessionIndex, HearsOfSessionsThatRanBeforeTheirClientWasListed) {
  TarnReportingSessionMap map;
  map.store(10, session(10));
  map.store(11, session(11));
  map.setRunning(11, true);
  map.list(index_, 4, *first_);
  EXPECT_EQ(index_->sessionCount(), 2U);
  EXPECT_EQ(index_->runningCount(), 1U);
}

TEST_F(SessionIndex, ASessionThatTakesTheIDOfARunningOneDoesNotRun) {
  TarnReportingSessionMap map;
  map.list(index_, 4, *first_);
  map.store(10, session(10));
  map.setRunning(10, true);
  EXPECT_EQ(index_->runningCount(), 1U);
  map.store(10, session(10));
  EXPECT_EQ(index_->runningCount(), 0U);
  EXPECT_EQ(map.runningCount(), 0U);
  EXPECT_EQ(map.size(), 1U);
}

TEST_F(SessionIndex, ARunningSessionThatIsRemovedRunsNoMore) {
  TarnReportingSessionMap map;
  map.list(index_, 4, *first_);
  map.store(10, session(10));
  map.store(11, session(11));
  map.setRunning(10, true);
  map.setRunning(11, true);
  map.remove(10);
  EXPECT_EQ(index_->runningCount(), 1U);
  EXPECT_EQ(index_->sessionCount(), 1U);
  EXPECT_EQ(runningOf(map, 9), std::vector<std::int64_t>{11});
}

TEST_F(SessionIndex, TheRunningOfAnUnknownIDIsNoNews) {
  TarnReportingSessionMap map;
  map.list(index_, 4, *first_);
  map.store(10, session(10));
  map.setRunning(12, true);
  EXPECT_EQ(index_->runningCount(), 0U);
  EXPECT_EQ(map.firstRunning(), nullptr);
}

TEST_F(SessionIndex, RunningSessionsAreVisitedInOrderUntilTheVisitorHasEnough) {
  TarnReportingSessionMap map;
  for (std::int64_t id = 10; id < 14; ++id) {
    map.store(id, session(id));
  }
  for (const std::int64_t id : {13, 10, 12}) {
    map.setRunning(id, true);
  }
  EXPECT_EQ(runningOf(map, 9), (std::vector<std::int64_t>{10, 12, 13}));
  EXPECT_EQ(runningOf(map, 2), (std::vector<std::int64_t>{10, 12}));
  EXPECT_TRUE(map.forEachRunning([](const auto&) { return true; }));
  EXPECT_FALSE(map.forEachRunning([](const auto&) { return false; }));
}

TEST_F(SessionIndex, AClientsInstanceKnowsItsOwnSessionsAlone) {
  const Client client = connect(41);
  const Client other = connect(42);
  create(client, 7);
  EXPECT_TRUE(client.remote().hasSession(7));
  EXPECT_FALSE(other.remote().hasSession(7));
}

TEST_F(SessionIndex, AnInstanceThatOutlivesItsConnectionIsFoundByNobody) {
  const Client client = connect(41);
  const auto instance = service_->getAllClients().at(0);
  client.connection->invalidate();
  platform_.runUntilIdle();
  Answer<bool> answer;
  instance->createReportingSession(7, answer.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(answer.count, 1);
  EXPECT_EQ(service_->findReportingSessionForID(7), nullptr);
  EXPECT_EQ(service_->sessionCount(), 0U);
}

}  // namespace
}  // namespace tarn
