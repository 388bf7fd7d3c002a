// SPDX-License-Identifier: Apache-2.0
// The worker that brackets a session with two samples of what the drivers count.
#include <thread>

#include "tests/diagnostics/drivers/DriverFixture.h"
#include "tests/session/WorkersOf.h"

namespace tarn {
namespace {

using namespace testing;

class DriverSnapshotWorker : public DriverFixture {
 protected:
  void count(std::int64_t value) { flume_.setChannel(simpleChannel(hapticsName("a"), value)); }
  static plist::Dictionary counted(std::int64_t value) { return {{"OxbowFoo_Haptics_Stats_Simple_a", value}}; }
  static TarnReportingSessionDriverSnapshotWorker& workerOf(TarnReportingSession& session) {
    return dynamic_cast<TarnReportingSessionDriverSnapshotWorker&>(*producersOf(session).front()->worker);
  }
  // What the session's consumers got since the last call.
  static plist::Dictionary takeCounted() {
    plist::Dictionary payload = received(AudioEventType::Simple);
    script().received.clear();
    return payload;
  }
};

TEST_F(DriverSnapshotWorker, DeclinesWhereThereAreNoReportChannels) {
  platform_.facilities().flume = nullptr;
  const auto session = makeSession();
  session->start();
  EXPECT_TRUE(producersOf(*session).empty());
  EXPECT_TRUE(lines(LogLevel::Info).empty());
}

TEST_F(DriverSnapshotWorker, MessagesOfTheStopEnterTheSessionLikeAClients) {
  count(1);
  const auto session = makeSession();
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "org.app"}};
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  count(3);
  session->stop();
  ASSERT_EQ(script().received.size(), 1U);
  const plist::Dictionary& payload = script().received[0]->message();
  EXPECT_EQ(payload["audiotag"].text(), "FlumeSimple");
  EXPECT_EQ(payload["HostApplicationDisplayID"].text(), "org.app");
  EXPECT_EQ(payload["tarnreporting_timestamp"].asDouble(), now());
  EXPECT_EQ(payload["OxbowFoo_Haptics_Stats_Simple_a"].asInt64(), 2);
  EXPECT_TRUE(script().received[0]->isSessionStarted());
}

TEST_F(DriverSnapshotWorker, EachStartTakesASnapshotOfItsOwn) {
  count(1);
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(workerOf(*session).driverSnapShot()->count("Haptics-Stats"), 1U);
  count(3);
  session->stop();
  EXPECT_FALSE(workerOf(*session).driverSnapShot());
  EXPECT_EQ(takeCounted(), counted(2));
  count(10);
  session->start();
  count(14);
  session->stop();
  EXPECT_EQ(takeCounted(), counted(4));
}

TEST_F(DriverSnapshotWorker, SessionsThatRunAtOnceKeepTheirOwnSnapshotsAndShareTheUtility) {
  count(10);
  const auto first = makeSession(1);
  first->start();
  count(15);
  const auto second = makeSession(2);
  second->start();
  count(17);
  first->stop();
  EXPECT_EQ(takeCounted(), counted(7));
  count(30);
  second->stop();
  EXPECT_EQ(takeCounted(), counted(15));
  EXPECT_EQ(platform_.log.count("creating flume driver utility"), 1U);
  EXPECT_EQ(flume_.calls(Step::CopyChannels), 9U);
}

TEST_F(DriverSnapshotWorker, GroupsAreLookedUpWithTheFirstSampleAndNeverAgain) {
  const auto early = makeSession(1);
  EXPECT_EQ(flume_.calls(Step::CopyChannels), 0U);
  early->start();
  EXPECT_EQ(flume_.calls(Step::CopyChannels), 9U);
  count(1);
  early->stop();
  const auto late = makeSession(2);
  late->start();
  count(5);
  late->stop();
  EXPECT_TRUE(script().received.empty());
  EXPECT_EQ(flume_.calls(Step::CopyChannels), 9U);
}

TEST_F(DriverSnapshotWorker, SecondStopWithoutAStartCountsAgainstNoSnapshot) {
  count(10);
  const auto session = makeSession();
  session->start();
  count(12);
  session->stop();
  EXPECT_EQ(takeCounted(), counted(2));
  workerOf(*session).stop();
  // The consumers have stopped; the session's log has it.
  ASSERT_FALSE(session->messages().empty());
  EXPECT_EQ(session->messages().back()->message()["OxbowFoo_Haptics_Stats_Simple_a"].asInt64(), 12);
}

TEST_F(DriverSnapshotWorker, StopBeforeAnyStartDoesNothing) {
  count(10);
  const auto session = makeSession();
  TarnReportingSessionDriverSnapshotWorker worker(session);
  worker.stop();
  EXPECT_TRUE(script().received.empty());
  EXPECT_EQ(flume_.calls(Step::CopyChannels), 0U);
}

TEST_F(DriverSnapshotWorker, StopBehindItsSessionDoesNothing) {
  count(10);
  auto session = makeSession();
  TarnReportingSessionDriverSnapshotWorker worker(session);
  EXPECT_TRUE(worker.start());
  session.reset();
  worker.stop();
  EXPECT_FALSE(worker.driverSnapShot());
}

TEST_F(DriverSnapshotWorker, ChannelThatAppearsDuringASessionIsNotSubscribed) {
  count(1);
  const auto session = makeSession();
  session->start();
  flume_.setChannel(simpleChannel(hapticsName("new"), 9));
  count(2);
  session->stop();
  EXPECT_EQ(takeCounted(), counted(1));
}

TEST_F(DriverSnapshotWorker, ChannelThatVanishesDuringASessionIsLeftOut) {
  count(1);
  const auto session = makeSession();
  session->start();
  flume_.removeChannel(hapticsName("a"));
  session->stop();
  EXPECT_TRUE(script().received.empty());
  EXPECT_TRUE(lines(LogLevel::Error).empty());
}

TEST_F(DriverSnapshotWorker, SameCountsInTwoRunsOfASessionAreTwoMessages) {
  count(1);
  const auto session = makeSession();
  for (const std::int64_t value : {3, 5}) {
    session->start();
    count(value);
    session->stop();
    EXPECT_EQ(takeCounted(), counted(2));
  }
}

TEST_F(DriverSnapshotWorker, FirstUsesOnManyThreadsMakeOneUtility) {
  count(1);
  std::vector<std::shared_ptr<const TarnReportingDriverUtility>> found(8);
  std::vector<std::thread> threads;
  for (auto& each : found) {
    threads.emplace_back([&each] { each = TarnReportingDriverUtility::shared(); });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  for (const auto& each : found) {
    EXPECT_EQ(each, found.front());
  }
  EXPECT_EQ(platform_.log.count("creating flume driver utility"), 1U);
}

TEST_F(DriverSnapshotWorker, AnotherInstallationLooksTheGroupsUpAnew) {
  count(1);
  const auto session = makeSession();
  session->start();
  session->stop();
  installAnew();
  session->start();
  EXPECT_EQ(flume_.calls(Step::CopyChannels), 18U);
}

}  // namespace
}  // namespace tarn
