// SPDX-License-Identifier: Apache-2.0
// The worker that writes the output of two memory tools to the log: who may ask, how often, and how the tools are run.
#include "diagnostics/TarnReportingMemoryLogLimiter.h"
#include "tests/diagnostics/MemoryLogFixture.h"
#include "tests/diagnostics/OddValues.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;

class MemoryLogWorker : public MemoryLogFixture {};

TEST_F(MemoryLogWorker, IsMadeForTestSessionsAndOnInternalBuildsForAll) {
  EXPECT_EQ(startedSession(AudioServiceType::Test)->workerInstanceCount(), 2U);
  EXPECT_EQ(startedSession(AudioServiceType::Haptics)->workerInstanceCount(), 1U);
}

TEST_F(MemoryLogWorker, OnAnInternalBuildItRunsFromTheSessionsCreationOn) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = makeSession();
  request(*session);
  EXPECT_EQ(runs(), 2U);
}

TEST_F(MemoryLogWorker, DoesNotRunInSingleMessageSessions) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->start();
  request(*session);
  EXPECT_EQ(runs(), 0U);
}

TEST_F(MemoryLogWorker, OtherMessagesDoNothing) {
  const auto session = startedSession();
  for (std::uint16_t type = 0; type < 30; ++type) {
    if (type != 19) {
      session->sendMessage(message({}, AudioEventCategory::Generic, static_cast<AudioEventType>(type)));
    }
  }
  EXPECT_EQ(runs(), 0U);
  EXPECT_TRUE(lines().empty());
  request(*session);
  EXPECT_EQ(runs(), 2U);  // nor did they count for the limiter
}

TEST_F(MemoryLogWorker, RunsBothToolsForAMinuteAtMostAndClosesThem) {
  request(*startedSession());
  const auto found = platform_.commandRunner.runs();
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].commandText, kZones);
  EXPECT_EQ(found[1].commandText, kResources);
  for (const auto& run : found) {
    EXPECT_EQ(run.timeLimit, 60s);
    EXPECT_TRUE(run.closed);
  }
}

TEST_F(MemoryLogWorker, TheToolsRunOnQueuesOfTheirOwnAndBothBeforeTheWaitEnds) {
  std::size_t waiting = 0;
  platform_.conditions.onWait([&](auto) {
    waiting = platform_.workQueues.waiting();
    platform_.runUntilIdle();
    return WaitEnd::TimesOut;
  });
  request(*startedSession());
  EXPECT_EQ(waiting, 2U);
  EXPECT_EQ(platform_.workQueues.names(),
            (Strings{"sys.oxbow.tarnkit.reporting.server", "sys.oxbow.tarnkit.reporting.memorylog.zones",
                     "sys.oxbow.tarnkit.reporting.memorylog.resources"}));
}

TEST_F(MemoryLogWorker, LogsTheZonesFirstEachToolsBlocksCountedFromOne) {
  describe(kZones, "zone a\n");
  describe(kResources, "1 phys_mem 5\n");
  request(*startedSession());
  EXPECT_EQ(lines(),
            (Strings{"wiredlog: requesting '/usr/bin/zonetally -l'", "wiredlog: request /usr/bin/zonetally -l captured",
                     "wiredlog: requesting '/usr/local/bin/restop'", "wiredlog: request /usr/local/bin/restop captured",
                     "WIRED LOG BLOCK 1\nwiredlog: zone a\n", "WIRED LOG BLOCK 1\nwiredlog: 1 phys_mem 5\n"}));
}

TEST_F(MemoryLogWorker, ToolsThatDoNotExistAreToldAndLeaveNoBlock) {
  request(*startedSession());
  EXPECT_EQ(
      lines(),
      (Strings{"wiredlog: requesting '/usr/bin/zonetally -l'", "wiredlog: unable to execute '/usr/bin/zonetally -l'",
               "wiredlog: requesting '/usr/local/bin/restop'", "wiredlog: unable to execute '/usr/local/bin/restop'"}));
}

TEST_F(MemoryLogWorker, AFileThatIsNoProgramIsNotExecutableEither) {
  describe(kZones, "", {CommandEnd::Kind::Exited, 126});
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: unable to execute '/usr/bin/zonetally -l'");
}

TEST_F(MemoryLogWorker, AToolThatPrintedWasExecutedWhateverItsStatus) {
  describe(kZones, "zone\n", {CommandEnd::Kind::Exited, 127});
  describe(kResources, "dropped\n", {CommandEnd::Kind::Exited, 126});
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: request /usr/bin/zonetally -l captured");
  EXPECT_EQ(notes()[3], "wiredlog: request /usr/local/bin/restop captured");
  EXPECT_EQ(blocks(), (Strings{"WIRED LOG BLOCK 1\nwiredlog: zone\n"}));
}

TEST_F(MemoryLogWorker, AToolThatFailsSilentlyIsCapturedAndLeavesNoBlock) {
  describe(kZones, "", {CommandEnd::Kind::Exited, 1});
  describe(kResources, "", {CommandEnd::Kind::Signalled, 127});
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: request /usr/bin/zonetally -l captured");
  EXPECT_EQ(notes()[3], "wiredlog: request /usr/local/bin/restop captured");
  EXPECT_TRUE(blocks().empty());
}

TEST_F(MemoryLogWorker, AToolThatCannotBeStartedIsTold) {
  platform_.commandRunner.describe(kZones, {"never read", {}, Error{11, "no more processes"}});
  describe(kResources, "RESOURCE\n");
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: unable to execute '/usr/bin/zonetally -l'");
  EXPECT_EQ(notes().size(), 4U);
  EXPECT_EQ(blocks(), (Strings{"WIRED LOG BLOCK 1\nwiredlog: RESOURCE\n"}));
}

TEST_F(MemoryLogWorker, AToolThatDiesOrHangsCountsForWhatItPrinted) {
  describe(kZones, "half a li", {CommandEnd::Kind::Signalled, 9});
  platform_.commandRunner.describeHanging(kResources, "RESOURCE\nanother RESOURCE");
  request(*startedSession());
  EXPECT_EQ(blocks(), (Strings{"WIRED LOG BLOCK 1\nwiredlog: half a li",
                               "WIRED LOG BLOCK 1\nwiredlog: RESOURCE\nwiredlog: another RESOURCE"}));
}

TEST_F(MemoryLogWorker, TwoRequestsThreeSecondsApartRunTheToolsOnce) {
  const auto one = startedSession(AudioServiceType::Test, 1);
  const auto other = startedSession(AudioServiceType::Test, 2);
  request(*one);
  platform_.clock.advance(3s);
  request(*other);
  EXPECT_EQ(runs(), 2U);
}

TEST_F(MemoryLogWorker, FiveSecondsAreNotEnoughAndANanosecondMoreIs) {
  const auto session = startedSession();
  request(*session);
  platform_.clock.advance(5s);
  request(*session);
  EXPECT_EQ(runs(), 2U);
  platform_.clock.advance(1ns);
  request(*session);
  EXPECT_EQ(runs(), 4U);
}

TEST_F(MemoryLogWorker, ARequestThatIsRefusedDoesNotPutTheNextOneOff) {
  const auto session = startedSession();
  for (int i = 0; i < 4; ++i) {  // at 0, 3, 6 and 9 seconds
    request(*session);
    platform_.clock.advance(3s);
  }
  EXPECT_EQ(runs(), 4U);
}

TEST_F(MemoryLogWorker, ARequestThatRepeatsTheOneBeforeIsARequest) {
  const auto session = startedSession();
  request(*session, {{"a", 1}});
  platform_.clock.advance(6s);
  request(*session, {{"a", 1}});
  EXPECT_EQ(script().received.size(), 1U);  // to others it is a repetition
  EXPECT_EQ(runs(), 4U);
}

TEST_F(MemoryLogWorker, AWallClockThatIsSetChangesNothing) {
  const auto session = startedSession();
  request(*session);
  platform_.clock.setEpochSeconds(now() + 100);
  request(*session);
  EXPECT_EQ(runs(), 2U);
}

TEST_F(MemoryLogWorker, AnyPayloadIsARequest) {
  for (const auto& [value, number] : oddValues()) {
    platform_.clock.advance(6s);
    const std::size_t before = runs();
    request(*startedSession(), {{"anything", value}});
    EXPECT_EQ(runs() - before, 2U);
  }
}

TEST_F(MemoryLogWorker, ToolsThatGetNoThreadAreGivenUpAndTheSessionStops) {
  platform_.conditions.onWait([this](std::chrono::duration<double> timeout) {
    EXPECT_LE(timeout, Worker::kPatience);
    platform_.clock.advance(80s);
    return WaitEnd::TimesOut;
  });
  describe(kZones, "zone\n");
  auto session = startedSession();
  request(*session);
  EXPECT_EQ(platform_.conditions.timeouts().size(), 1U);  // one deadline for both
  EXPECT_EQ(lines(), (Strings{"wiredlog: gave up waiting for '/usr/bin/zonetally -l'",
                              "wiredlog: gave up waiting for '/usr/local/bin/restop'"}));
  session->stop();
  EXPECT_FALSE(session->started());
  session.reset();
  platform_.runUntilIdle();  // the tools find nobody who waits
  EXPECT_EQ(runs(), 2U);
  EXPECT_TRUE(blocks().empty());
}

TEST_F(MemoryLogWorker, AWakeWithoutAResultWaitsOn) {
  int waits = 0;
  platform_.conditions.onWait([&](auto) {
    if (++waits == 3) {
      platform_.runUntilIdle();
    }
    return WaitEnd::Wakes;
  });
  describe(kZones, "zone\n");
  request(*startedSession());
  EXPECT_EQ(blocks().size(), 1U);
  EXPECT_EQ(waits, 3);
}

TEST_F(MemoryLogWorker, BoundsAreAsDocumented) {
  EXPECT_EQ(Worker::kToolTimeLimit, 60s);
  EXPECT_EQ(Worker::kPatience, 75s);
  EXPECT_EQ(Worker::kMostBytesRead, 16'777'216U);
  EXPECT_EQ(Worker::kMostBytesKept, 1'048'576U);
}

TEST_F(MemoryLogWorker, EachToolSignalsOnceThatItIsDone) {
  request(*startedSession());
  ASSERT_EQ(platform_.conditions.made().size(), 2U);
  EXPECT_EQ(platform_.conditions.made()[0]->signals(), 1U);
  EXPECT_EQ(platform_.conditions.made()[1]->signals(), 1U);
  EXPECT_EQ(platform_.conditions.timeouts(), (std::vector<std::chrono::duration<double>>{75s}));
}

TEST_F(MemoryLogWorker, AWaitThatTimesOutIsNotRepeated) {
  std::size_t waits = 0;
  platform_.conditions.onWait([&](auto) {
    if (++waits > 2) {
      platform_.clock.advance(80s);  // or it would wait for ever
    }
    return WaitEnd::TimesOut;
  });
  request(*startedSession());
  EXPECT_EQ(waits, 2U);  // one for each tool
  EXPECT_EQ(platform_.log.count("gave up waiting for"), 2U);
}

TEST_F(MemoryLogWorker, WhenThePatienceIsOverToTheNanosecondNothingIsWaitedFor) {
  platform_.conditions.onWait([this](auto) {
    platform_.clock.advance(75s);
    return WaitEnd::Wakes;
  });
  request(*startedSession());
  EXPECT_EQ(platform_.conditions.timeouts().size(), 1U);
}

TEST_F(MemoryLogWorker, AToolIsToldThenRunThenClosedThenToldAndTheBlocksComeLast) {
  describe(kZones, "zone\n");
  const auto session = startedSession();
  platform_.order.start();
  Worker(session).handleMessage(message({}, AudioEventCategory::Generic, AudioEventType::MemoryLog));
  EXPECT_EQ(platform_.order.entries(),
            (Strings{"wait", "log wiredlog: requesting '/usr/bin/zonetally -l'", "run /usr/bin/zonetally -l",
                     "close /usr/bin/zonetally -l", "log wiredlog: request /usr/bin/zonetally -l captured",
                     "log wiredlog: requesting '/usr/local/bin/restop'", "run /usr/local/bin/restop",
                     "close /usr/local/bin/restop", "log wiredlog: unable to execute '/usr/local/bin/restop'",
                     "log WIRED LOG BLOCK 1\nwiredlog: zone\n"}));
}

TEST(MemoryLogLimiter, TheFirstIsAlwaysLetThrough) {
  for (const auto now : {-1h, 0h, 1h}) {
    EXPECT_TRUE(TarnReportingMemoryLogLimiter().claim(now));
  }
}

TEST(MemoryLogLimiter, LetsOneThroughInMoreThanFiveSeconds) {
  TarnReportingMemoryLogLimiter limiter;
  EXPECT_TRUE(limiter.claim(0s));
  EXPECT_FALSE(limiter.claim(0s));
  EXPECT_FALSE(limiter.claim(5s - 1ns));
  EXPECT_FALSE(limiter.claim(5s));
  EXPECT_TRUE(limiter.claim(5s + 1ns));
  EXPECT_FALSE(limiter.claim(10s + 1ns));
  EXPECT_TRUE(limiter.claim(10s + 2ns));
}

}  // namespace
}  // namespace tarn
