// SPDX-License-Identifier: Apache-2.0
// The Rtc worker on a service that answers late, twice, never, or when nobody is there any more.
#include <chrono>

#include "telemetry/rtc/TarnReportingRtcMirror.h"
#include "testing/backends/ReplyFaults.h"
#include "tests/telemetry/rtc/RtcFixture.h"

namespace tarn {
namespace {

using namespace std::chrono_literals;
using namespace testing;

class RtcFaults : public RtcFixture {
 protected:
  ReplyFaults& completions() { return platform_.rtcReporting.completions(); }
  std::size_t delayed() const { return platform_.workQueues.delayed(); }
};

TEST_F(RtcFaults, WithoutATokenTheSessionIsSkipped) {
  platform_.rtcReporting.setHandsOutTokens(false);
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  platform_.runUntilIdle();
  EXPECT_TRUE(platform_.rtcReporting.sessions().empty());
  EXPECT_EQ(lines(),
            (Texts{"debug entering rtcreporting start",
                   "error newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. start",
                   "default Session never started. handleMessage", "default Session never started. stop"}));
  EXPECT_EQ(delayed(), 0U);
}

TEST_F(RtcFaults, WithoutAListTheSessionIsDropped) {
  platform_.rtcReporting.setBackends({});
  const auto session = startSession();
  EXPECT_TRUE(onlySession().released);
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(lines(), (Texts{"debug entering rtcreporting start",
                            "error no backends found, this session won't get sent to the server",
                            "default waiting to find backends", "default failed to find backend",
                            "default Session never started. handleMessage", "default Session never started. stop"}));
  EXPECT_EQ(onlySession().attempts, 0U);
  EXPECT_EQ(onlySession().flushes, 0U);
}

TEST_F(RtcFaults, AMessageToAWorkerWithoutASessionWaitsForNothing) {
  platform_.rtcReporting.setBackends({});
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));  // nothing runs on the private queue
  EXPECT_EQ(lines().back(), "default Session never started. handleMessage");
  EXPECT_EQ(count("default Session never started. handleMessage"), 1U);
  platform_.runUntilIdle();
  EXPECT_EQ(count("default Session never started. handleMessage"), 1U);
}

TEST_F(RtcFaults, AMessageWaitsForAStartThatIsStillAhead) {
  platform_.rtcReporting.setHandsOutTokens(false);
  const auto mirror = std::make_shared<TarnReportingRtcMirror>(platform_.rtcReporting, 1000);
  mirror->setStarting();
  mirror->setStarting();  // after a stop that came before the first had run
  mirror->start({});
  EXPECT_TRUE(mirror->isStarting());
  EXPECT_FALSE(mirror->isInert());
  mirror->start({});
  EXPECT_FALSE(mirror->isStarting());
  EXPECT_TRUE(mirror->isInert());
}

TEST_F(RtcFaults, AnEmptyListIsAList) {
  platform_.rtcReporting.setBackends(std::vector<std::string>{});
  const auto session = startSession();
  EXPECT_EQ(count("default list of backends ()"), 1U);
  EXPECT_EQ(count("default continuing with backends!"), 1U);
  session->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 1U);
}

TEST_F(RtcFaults, AListOfManyIsLoggedWhole) {
  platform_.rtcReporting.setBackends(std::vector<std::string>{"one", "two"});
  startSession();
  EXPECT_EQ(count("default list of backends (one, two)"), 1U);
}

TEST_F(RtcFaults, MessagesAndStopWaitBehindTheStart) {
  completions().set(ReplyFault::Hold);
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->sendMessage(message({{"n", 2}}));
  session->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().attempts, 0U);
  EXPECT_EQ(lines().back(), "default waiting to find backends");
  platform_.advance(8s);
  completions().deliverHeld();
  platform_.runUntilIdle();
  const RtcSession made = onlySession();
  ASSERT_EQ(made.messages.size(), 3U);
  EXPECT_EQ(made.messages[0].payload["n"].asInt64(), 1);
  EXPECT_EQ(made.messages[1].payload["n"].asInt64(), 2);
  EXPECT_EQ(made.messages[2].payload["n"].text(), "1,2");
  EXPECT_EQ(made.flushes, 1U);
  EXPECT_TRUE(made.released);
  EXPECT_EQ(delayed(), 0U);
}

TEST_F(RtcFaults, OneSessionThatWaitsHoldsUpNoOther) {
  completions().set(ReplyFault::Hold);
  const auto waiting = startSession();
  completions().set(ReplyFault::None);
  const auto other = makeSession(8);
  other->start();
  other->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(platform_.rtcReporting.sessions().at(1).messages.size(), 1U);
  EXPECT_EQ(platform_.rtcReporting.sessions().at(0).messages.size(), 0U);
}

TEST_F(RtcFaults, WaitEndsAfterNineSecondsAndNotBefore) {
  completions().set(ReplyFault::Drop);
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  platform_.advance(9s - 1ns);
  EXPECT_EQ(lines().back(), "default waiting to find backends");
  EXPECT_FALSE(onlySession().released);
  platform_.advance(1ns);
  EXPECT_EQ(lines(), (Texts{"debug entering rtcreporting start", "default waiting to find backends",
                            "default timed out waiting for backends", "default Session never started. handleMessage",
                            "default Session never started. stop"}));
  EXPECT_TRUE(onlySession().released);
  EXPECT_EQ(onlySession().attempts, 0U);
  EXPECT_EQ(onlySession().flushes, 0U);
}

TEST_F(RtcFaults, GivingUpIsToldBeforeTheSessionIsLetGo) {
  std::vector<std::pair<std::string, bool>> released;
  platform_.order.start([&](const std::string& entry) {
    if (entry == "log timed out waiting for backends" || entry == "log failed to find backend") {
      released.emplace_back(entry, platform_.rtcReporting.sessions().back().released);
    }
  });
  completions().set(ReplyFault::Drop);
  const auto late = startSession();
  platform_.advance(9s);
  completions().set(ReplyFault::None);
  platform_.rtcReporting.setBackends({});
  const auto refused = startSession();
  EXPECT_EQ(released, (std::vector<std::pair<std::string, bool>>{{"log timed out waiting for backends", false},
                                                                 {"log failed to find backend", false}}));
  for (const RtcSession& made : platform_.rtcReporting.sessions()) {
    EXPECT_TRUE(made.released);
  }
}

TEST_F(RtcFaults, SessionThatCantBeMadeTimesOut) {
  platform_.rtcReporting.setMakesSessions(false);
  startSession();
  platform_.advance(9s);
  EXPECT_EQ(lines().back(), "default timed out waiting for backends");
}

TEST_F(RtcFaults, CompletionBehindTheDeadlineSetsTheFlagsAndMessagesGoNowhere) {
  completions().set(ReplyFault::Hold);
  const auto session = startSession();
  platform_.advance(9s);
  EXPECT_FALSE(workerOf(*session).getRTCReportingStartedState());
  completions().deliverHeld();
  EXPECT_TRUE(workerOf(*session).getRTCReportingStartedState());
  EXPECT_TRUE(workerOf(*session).started());
  EXPECT_EQ(lines().back(), "default list of backends (fake)");
  const std::size_t before = lines().size();
  session->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().attempts, 0U);
  const Texts all = lines();
  EXPECT_EQ(Texts(all.begin() + static_cast<std::ptrdiff_t>(before), all.end()),
            (Texts{"debug entering rtcreporting _sendMessage"}));
}

TEST_F(RtcFaults, StopBehindALateCompletionClearsTheFlag) {
  completions().set(ReplyFault::Hold);
  const auto session = startSession();
  platform_.advance(9s);
  completions().deliverHeld();
  session->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(count("default sending rtc summary event. reporterID=7"), 1U);
  EXPECT_EQ(lines().back(), "debug stopping and setting session to nil");
  EXPECT_FALSE(workerOf(*session).getRTCReportingStartedState());
  EXPECT_EQ(onlySession().attempts, 0U);
  EXPECT_EQ(onlySession().flushes, 0U);
}

TEST_F(RtcFaults, LateCompletionWithoutAListLeavesTheWorkerInert) {
  completions().set(ReplyFault::Hold);
  platform_.rtcReporting.setBackends({});
  const auto session = startSession();
  platform_.advance(9s);
  completions().deliverHeld();
  session->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(lines().back(), "default Session never started. handleMessage");
}

TEST_F(RtcFaults, CompletionWithoutAListTakesBackWhatAnEarlierOneFound) {
  completions().set(ReplyFault::Hold);
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  worker->start();
  platform_.advance(9s);  // the first completion will be late
  platform_.rtcReporting.setBackends({});
  worker->start();
  platform_.runUntilIdle();
  EXPECT_EQ(completions().deliverHeld(), 2U);
  EXPECT_FALSE(worker->getRTCReportingStartedState());
  EXPECT_TRUE(worker->started());  // tells alone that there was a list once
  platform_.runUntilIdle();
  EXPECT_EQ(lines().back(), "default failed to find backend");
  EXPECT_TRUE(platform_.rtcReporting.sessions().at(1).released);
}

TEST_F(RtcFaults, SignalOfALateCompletionIsKeptForTheNextStart) {
  completions().set(ReplyFault::Hold);
  const auto session = startSession();
  platform_.advance(9s);
  completions().deliverHeld();
  session->stop();
  platform_.runUntilIdle();
  completions().set(ReplyFault::Drop);
  session->start();
  platform_.runUntilIdle();
  EXPECT_EQ(lines().back(), "default failed to find backend");  // at once: the wait took the old signal
  EXPECT_EQ(delayed(), 0U);
}

TEST_F(RtcFaults, CompletionBehindTheStopKeepsTheWorkerOutOfTheNextStart) {
  completions().set(ReplyFault::Hold);
  const auto session = startSession();
  session->stop();
  EXPECT_FALSE(workerOf(*session).started());
  completions().deliverHeld();
  platform_.runUntilIdle();
  EXPECT_TRUE(workerOf(*session).started());
  session->start();
  session->sendMessage(message({{"n", 1}}));
  platform_.runUntilIdle();
  EXPECT_EQ(platform_.rtcReporting.sessions().size(), 1U);
  EXPECT_EQ(lines().back(), "default Session never started. handleMessage");
  session->stop();  // from here on it is as before
  session->start();
  platform_.runUntilIdle();
  EXPECT_EQ(platform_.rtcReporting.sessions().size(), 2U);
}

TEST_F(RtcFaults, CompletionThatComesTwiceIsBorne) {
  completions().set(ReplyFault::Twice);
  const auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(count("default list of backends (fake)"), 2U);
  EXPECT_EQ(count("default continuing with backends!"), 1U);
  EXPECT_EQ(onlySession().messages.size(), 2U);
  EXPECT_EQ(onlySession().flushes, 1U);
}

TEST_F(RtcFaults, CompletionOnAnotherThreadEndsTheWait) {
  completions().set(ReplyFault::OtherThread);
  const auto session = startSession();
  completions().joinThreads();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 2U);
  EXPECT_EQ(onlySession().flushes, 1U);
}

TEST_F(RtcFaults, StopRightBehindAStartStillMirrorsTheSession) {
  const auto session = makeTyped(AudioServiceType::Haptics);
  session->start();
  session->stop();
  platform_.runUntilIdle();
  const RtcSession made = onlySession();
  ASSERT_EQ(made.messages.size(), 1U);
  EXPECT_EQ(made.messages[0].payload, (plist::Dictionary{{"Tarn_Session_Summary_Event", "3"}}));
  EXPECT_EQ(made.flushes, 1U);
  EXPECT_TRUE(made.released);
}

// A start that is still to come would complete after the stop, and keep the worker out of the next period.
TEST_F(RtcFaults, StopHelpsAStartThatNoThreadHasComeTo) {
  platform_.workQueues.setHelps(true);
  const auto session = makeTyped(AudioServiceType::Haptics);
  for (int period = 0; period < 3; ++period) {
    session->start();
    session->sendMessage(message({{"n", period}}));
    EXPECT_EQ(platform_.rtcReporting.sessions().size(), static_cast<std::size_t>(period));
    session->stop();
    ASSERT_EQ(platform_.rtcReporting.sessions().size(), static_cast<std::size_t>(period) + 1);
    EXPECT_FALSE(workerOf(*session).started());
    EXPECT_EQ(platform_.rtcReporting.sessions().back().flushes, 0U);  // the stop itself is for the queue
  }
  platform_.runUntilIdle();
  for (const auto& made : platform_.rtcReporting.sessions()) {
    EXPECT_EQ(made.messages.size(), 2U);
    EXPECT_EQ(made.flushes, 1U);
  }
}

TEST_F(RtcFaults, StopOfALiveMirrorHelpsNothing) {
  const auto session = startSession();
  platform_.workQueues.setHelps(true);
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  EXPECT_TRUE(onlySession().messages.empty());
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 2U);
}

TEST_F(RtcFaults, StopOfAWorkerThatWasNeverStartedHelpsNothing) {
  platform_.workQueues.setHelps(true);
  const auto session = makeTyped(AudioServiceType::Haptics);
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  worker->handleMessage(message({{"n", 1}}));
  worker->stop();
  EXPECT_TRUE(lines().empty());
  platform_.runUntilIdle();
  EXPECT_EQ(lines(), (Texts{"default Session never started. handleMessage", "default Session never started. stop"}));
}

TEST_F(RtcFaults, WorkerMayBeGoneWhileItsQueueWorks) {
  auto session = makeTyped(AudioServiceType::Haptics);
  session->start();
  session->sendMessage(message({{"n", 1}}));
  session.reset();  // without a stop
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 1U);
  EXPECT_EQ(onlySession().flushes, 0U);
  EXPECT_TRUE(onlySession().released);
}

TEST_F(RtcFaults, WorkerMayBeGoneWhenTheCompletionComes) {
  completions().set(ReplyFault::Hold);
  auto session = startSession();
  session->sendMessage(message({{"n", 1}}));
  session->stop();
  session.reset();
  EXPECT_EQ(completions().deliverHeld(), 1U);
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().messages.size(), 2U);
  EXPECT_TRUE(onlySession().released);
}

TEST_F(RtcFaults, WorkerMayBeGoneWhenTheCompletionComesBehindItsDeadline) {
  completions().set(ReplyFault::Hold);
  auto session = startSession();
  session->stop();
  session.reset();
  platform_.advance(9s);
  EXPECT_EQ(completions().deliverHeld(), 1U);
  platform_.runUntilIdle();
  EXPECT_EQ(onlySession().attempts, 0U);
  EXPECT_TRUE(onlySession().released);
}

TEST_F(RtcFaults, NothingIsKeptWhenTheCompletionNeverComes) {
  completions().set(ReplyFault::Drop);
  auto session = startSession();
  const std::weak_ptr<platform::WorkQueue> queue = workerOf(*session).rtcReportingQueue();
  session->stop();
  session.reset();
  platform_.advance(9s);
  EXPECT_TRUE(onlySession().released);
  EXPECT_TRUE(queue.expired());
}

// A thousand sessions while the service is slow: each is mirrored whole and in order, and what one waits for is
// nothing to another.
TEST_F(RtcFaults, AThousandSessionsKeepTheirOrderWhileTheServiceIsSlow) {
  completions().delayOn(platform_.workQueues.makeSerialQueue("service", platform::QualityOfService::Utility), 5s);
  platform_.log.setThreshold(LogLevel::Error);
  constexpr std::int64_t kSessions = 1000;
  std::vector<std::shared_ptr<TarnReportingSession>> sessions;
  for (std::int64_t i = 0; i < kSessions; ++i) {
    sessions.push_back(makeSession(i + 1));
    sessions.back()->start();
    for (int n = 0; n < 3; ++n) {
      sessions.back()->sendMessage(message({{"n", n}}));
    }
    if (i % 2 == 0) {
      sessions.back()->stop();
    }
    if (i % 3 == 0) {
      sessions.back().reset();
    }
  }
  platform_.advance(5s);
  const auto made = platform_.rtcReporting.sessions();
  ASSERT_EQ(made.size(), 1000U);
  for (std::size_t i = 0; i < made.size(); ++i) {
    ASSERT_EQ(made[i].messages.size(), i % 2 == 0 ? 4U : 3U);
    for (std::size_t n = 0; n < 3; ++n) {
      ASSERT_EQ(made[i].messages[n].payload["n"].asUInt64(), n);
    }
    ASSERT_EQ(made[i].released, i % 2 == 0 || i % 3 == 0) << i;
  }
  EXPECT_EQ(delayed(), 0U);
}

}  // namespace
}  // namespace tarn
