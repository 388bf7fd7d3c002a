// SPDX-License-Identifier: Apache-2.0
// Which workers a session makes, and in which order they start, stop and get messages.
#include "tests/session/SessionFixture.h"
#include "tests/session/WorkersOf.h"

namespace tarn {
namespace {

using namespace testing;

class WorkerSelection : public SessionFixture {
 protected:
  using Strings = std::vector<std::string>;

  static Strings namesOf(const Members& members) {
    Strings names;
    for (const auto* member : members) {
      names.emplace_back(member->workerClass->name);
    }
    return names;
  }
  static Members all(const TarnReportingSession& session) {
    return workersOf(session, [](const auto&) { return true; });
  }
  static Strings takeTrail() { return std::exchange(trail(), {}); }
};

TEST_F(WorkerSelection, RowsAreReadOffTheClasses) {
  using Row = TarnReportingSessionWorkerClass;
  constexpr Row early = Row::of<EarlyWorker>();
  EXPECT_TRUE(early.startOnInit != nullptr && early.startOnInit());
  EXPECT_TRUE(early.handleSingleMessageSession != nullptr && early.handleSingleMessageSession());
  EXPECT_TRUE(early.handleRedundantMessages != nullptr);
  EXPECT_TRUE(early.start == nullptr && early.stop == nullptr);
  EXPECT_TRUE(early.asConsumer != nullptr && !early.isProducer);
  constexpr Row both = Row::of<BothWorker>();
  EXPECT_TRUE(both.asConsumer != nullptr && both.isProducer);
  EXPECT_TRUE(both.start != nullptr && both.stop != nullptr);
  EXPECT_TRUE(both.startOnInit == nullptr && both.handleSingleMessageSession == nullptr);
  constexpr Row plain = Row::of<PlainWorker>();
  EXPECT_TRUE(plain.asConsumer == nullptr && !plain.isProducer && plain.initWithSession != nullptr);
  EXPECT_TRUE(Row::of<UnmakeableWorker>().initWithSession == nullptr);
}

TEST_F(WorkerSelection, RowOfNoClassIsNeitherConsumerNorProducer) {
  const TarnReportingSessionWorkerClass none{};
  EXPECT_TRUE(none.asConsumer == nullptr);
  EXPECT_FALSE(none.isProducer);
}

TEST_F(WorkerSelection, WorkerCanBeHandedToAnotherSession) {
  const auto first = makeSession(1);
  const auto second = makeSession(2);
  PlainWorker worker(first);
  EXPECT_EQ(worker.session(), first);
  worker.setSession(second);
  EXPECT_EQ(worker.session(), second);
}

TEST_F(WorkerSelection, ClassWithoutInitWithSessionIsLeftOutAndLogged) {
  useWorkers<UnmakeableWorker, PlainWorker>();
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(namesOf(all(*session)), (Strings{"PlainWorker"}));
  EXPECT_EQ(platform_.log.count("Worker does not implement initWithSession! UnmakeableWorker"), 1U);
}

TEST_F(WorkerSelection, CreatedAndStartedSessionHoldsTheStartOnCreationWorkersFirst) {
  useWorkers<PlainWorker, ProducerWorker, BothWorker, EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  EXPECT_EQ(namesOf(all(*session)), (Strings{"EarlyWorker"}));
  session->start();
  EXPECT_EQ(namesOf(all(*session)),
            (Strings{"EarlyWorker", "PlainWorker", "ProducerWorker", "BothWorker", "ConsumerWorker"}));
  EXPECT_EQ(namesOf(consumersOf(*session)), (Strings{"EarlyWorker", "BothWorker", "ConsumerWorker"}));
  EXPECT_EQ(namesOf(producersOf(*session)), (Strings{"ProducerWorker", "BothWorker"}));
  EXPECT_EQ(session->workerInstanceCount(), 5U);
}

TEST_F(WorkerSelection, ConsumersStartFirstAndProducersStopFirst) {
  useWorkers<PlainWorker, ProducerWorker, BothWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(takeTrail(),
            (Strings{"PlainWorker init", "ProducerWorker init", "BothWorker init", "ConsumerWorker init",
                     "BothWorker start", "ConsumerWorker start", "ProducerWorker start", "PlainWorker start"}));
  session->stop();
  EXPECT_EQ(takeTrail(), (Strings{"ProducerWorker stop", "BothWorker handle", "ConsumerWorker handle",
                                  "BothWorker stop", "ConsumerWorker stop", "PlainWorker stop"}));
}

TEST_F(WorkerSelection, MessageDerivedAtStopReachesConsumersThatStillRun) {
  useWorkers<ProducerWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  session->stop();
  ASSERT_EQ(script().received.size(), 1U);
  EXPECT_EQ(script().received[0]->message()["derived"].asInt64(), 2);  // the two markers
  EXPECT_TRUE(script().received[0]->isSessionStarted());
}

TEST_F(WorkerSelection, SingleMessageSessionHoldsOnlyWorkersThatAcceptIt) {
  useWorkers<PlainWorker, BothWorker, EarlyWorker, LateWorker>();
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->start();
  EXPECT_EQ(namesOf(all(*session)), (Strings{"EarlyWorker"}));
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug,
                                     "Skipping TarnReportingSessionWorker for single message session. action=skipped "
                                     "worker=LateWorker reporterID=1"));
}

TEST_F(WorkerSelection, SingleMessageSessionHoldsNoWorkerWhoseClassSaysNo) {
  auto row = TarnReportingSessionWorkerClass::of<EarlyWorker>();
  row.handleSingleMessageSession = [] { return false; };
  useWorkers({row});
  EXPECT_EQ(makeSession(1, TarnReportingSession::Mode::SingleMessage)->workerInstanceCount(), 0U);
  EXPECT_EQ(makeSession()->workerInstanceCount(), 1U);
}

TEST_F(WorkerSelection, DerivedListsHoldTheClassesInTheOrderOfTheTable) {
  useWorkers<UnmakeableWorker, PlainWorker, ProducerWorker, BothWorker, EarlyWorker, LateWorker>();
  const TarnReportingSessionWorkerClasses classes(TarnReportingSession::getAllWorkerClasses());
  const auto names = [](const TarnReportingSessionWorkerClasses::List& list) {
    Strings found;
    for (const auto* row : list) {
      found.emplace_back(row->name);
    }
    return found;
  };
  EXPECT_EQ(TarnReportingSession::getAllWorkerClasses().size(), 6U);
  EXPECT_EQ(names(classes.initializableWorkerClasses),
            (Strings{"PlainWorker", "ProducerWorker", "BothWorker", "EarlyWorker", "LateWorker"}));
  EXPECT_EQ(names(classes.consumerWorkerClasses), (Strings{"BothWorker", "EarlyWorker", "LateWorker"}));
  EXPECT_EQ(names(classes.producerWorkerClasses), (Strings{"ProducerWorker", "BothWorker"}));
  EXPECT_EQ(names(classes.startOnInitWorkerClasses), (Strings{"EarlyWorker", "LateWorker"}));
  EXPECT_EQ(platform_.log.entries().at(0).level, LogLevel::Debug);
  EXPECT_EQ(platform_.log.messages().at(0), "Worker does not implement initWithSession! UnmakeableWorker");
}

TEST_F(WorkerSelection, WorkersWithoutStartAndStopWriteNoLineAtStartAndOneAtStop) {
  useWorkers<EarlyWorker>();
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(platform_.log.count("action=start"), 0U);
  session->stop();
  EXPECT_EQ(platform_.log.count("TarnReportingSessionWorker action=stop worker=EarlyWorker reporterID=7"), 1U);
  session->stop();
  EXPECT_EQ(platform_.log.count("action=stop"), 1U);
}

TEST_F(WorkerSelection, WorkerThatRefusedToStartIsNotStopped) {
  useWorkers<RefusingWorker, ConsumerWorker>();
  script().startsRefusing = true;
  const auto session = makeSession();
  session->start();
  takeTrail();
  session->stop();
  EXPECT_EQ(takeTrail(), (Strings{"ConsumerWorker stop"}));
  EXPECT_EQ(platform_.log.count("action=stop worker=RefusingWorker"), 0U);
}

TEST_F(WorkerSelection, WorkerWhoseStartFailsStaysIdleAndIsOfferedStartAgain) {
  useWorkers<RefusingWorker>();
  script().startsRefusing = true;
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 1U);
  session->sendMessage(message({{"a", 1}}));
  session->stop();
  EXPECT_EQ(takeTrail(), (Strings{"RefusingWorker init", "RefusingWorker start"}));
  EXPECT_TRUE(platform_.log.contains("action=start worker=RefusingWorker started=NO reporterID=7"));
  script().startsRefusing = false;
  session->start();
  session->sendMessage(message({{"a", 2}}));
  EXPECT_EQ(takeTrail(), (Strings{"RefusingWorker start", "RefusingWorker handle"}));
}

TEST_F(WorkerSelection, ClassThatDeclinedAtCreationIsAskedAgainAtStart) {
  useWorkers<LateWorker>();
  script().lateDeclines = true;
  const auto session = makeSession();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
  EXPECT_TRUE(platform_.log.contains(LogLevel::Debug,
                                     "TarnReportingSessionWorker failed to initialize. action=failure "
                                     "worker=LateWorker reporterID=7"));
  script().lateDeclines = false;
  session->start();
  EXPECT_EQ(namesOf(all(*session)), (Strings{"LateWorker"}));
}

TEST_F(WorkerSelection, SecondStartUsesTheSameWorkers) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  session->stop();
  takeTrail();
  session->start();
  EXPECT_EQ(takeTrail(), (Strings{"ConsumerWorker start"}));
  EXPECT_EQ(platform_.log.count("TarnReportingSessionWorker already initialized. action=skipped worker=EarlyWorker"),
            2U);
}

TEST_F(WorkerSelection, StoppedSessionForwardsToNobodyButLogsAndCounts) {
  useWorkers<EarlyWorker, ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  session->stop();
  takeTrail();
  session->sendMessage(message({{"a", 1}}));
  EXPECT_EQ(takeTrail(), Strings{});
  EXPECT_EQ(session->totalMessageCount(), 1);
  EXPECT_EQ(session->messages().size(), 1U);
}

TEST_F(WorkerSelection, LogsEachStepOfAWorker) {
  useWorkers<ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"a", 1}}));
  session->stop();
  for (const char* text : {"Initializing TarnReportingSessionWorker. action=init worker=ConsumerWorker reporterID=7",
                           "TarnReportingSessionWorker action=added worker=ConsumerWorker reporterID=7",
                           "TarnReportingSessionWorker action=start worker=ConsumerWorker started=YES reporterID=7",
                           "TarnReportingSessionWorker action=handleMessage worker=ConsumerWorker reporterID=7",
                           "TarnReportingSessionWorker action=stop worker=ConsumerWorker reporterID=7"}) {
    EXPECT_TRUE(platform_.log.contains(LogLevel::Debug, text)) << text;
  }
}

}  // namespace
}  // namespace tarn
