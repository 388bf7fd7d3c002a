// SPDX-License-Identifier: Apache-2.0
// The worker that offers to file a bug report: when it prompts, with what, and when it holds back.
#include "diagnostics/TarnReportingSessionTattleWorker.h"

#include "tests/diagnostics/OddValues.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using Strings = std::vector<std::string>;

constexpr const char* kSuite = "sys.oxbow.tarnkit.tarnreporting";
constexpr const char* kBackOff = "ParleyInvalidXyBackOffSeconds";
constexpr const char* kLastRun = "ParleyInvalidXyTatlastRun";
constexpr double kHour = 3600;

class TattleWorker : public SessionFixture {
 protected:
  TattleWorker() {
    useWorkers<TarnReportingSessionTattleWorker>();
    platform_.deviceProperties.set("InternalBuild", true);
    platform_.defaults.set(kSuite, kBackOff, kHour);
  }

  static std::shared_ptr<TarnReportingSession> startedSession(std::int64_t reporterID = 7) {
    auto session = makeSession(reporterID);
    session->setClientProcessName("parleyd");
    session->start();
    return session;
  }
  // A session whose first message came at the moment; what comes 5 seconds later counts.
  std::shared_ptr<TarnReportingSession> armedSession(std::int64_t reporterID = 7) {
    auto session = startedSession(reporterID);
    send(*session, {{"call", "begins"}}, 0);
    return session;
  }
  // Sends a message of its own, stamped so many seconds from now.
  void send(TarnReportingSession& session, plist::Dictionary payload, double after) {
    payload.set("serial", ++serial_);
    payload.set("tarnreporting_timestamp", now() + after);
    session.sendMessage(message(std::move(payload)));
  }
  void sendError(TarnReportingSession& session, double after) { send(session, {{"plac_invalid_x", 1}}, after); }
  std::size_t prompts() const { return platform_.tattle.prompts().size(); }
  plist::Value lastRun() const { return platform_.defaults.value(kSuite, kLastRun); }
  // What the worker logged at a level.
  Strings lines(platform::LogLevel level) const {
    Strings found;
    for (const auto& entry : platform_.log.entries(level)) {
      if (entry.module == TarnReportingSessionTattleWorker::kClassName) {
        EXPECT_EQ(entry.category, "tarnrr");
        found.push_back(entry.message());
      }
    }
    return found;
  }
  std::string lastLine(platform::LogLevel level) const {
    const Strings found = lines(level);
    return found.empty() ? "no line" : found.back();
  }

 private:
  int serial_ = 0;
};

TEST_F(TattleWorker, ExistsOnInternalBuildsOnly) {
  EXPECT_EQ(startedSession()->workerInstanceCount(), 1U);
}

TEST_F(TattleWorker, OtherBuildsHaveNone) {
  platform_.deviceProperties.set("InternalBuild", false);
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
  EXPECT_TRUE(lines(LogLevel::Debug).empty());
}

TEST_F(TattleWorker, WithoutABackOffItIsSkippedWithALine) {
  platform_.defaults.set(kSuite, kBackOff, plist::ValueView());
  EXPECT_EQ(startedSession(12)->workerInstanceCount(), 0U);
  EXPECT_EQ(lines(LogLevel::Debug),
            (Strings{"ParleyInvalidXyBackOffSeconds default not set. Skipping worker. reporterID=12"}));
}

TEST_F(TattleWorker, ABackOffThatIsSetLaterCountsFromTheNextStart) {
  platform_.defaults.set(kSuite, kBackOff, plist::ValueView());
  const auto session = startedSession();
  session->stop();
  platform_.defaults.set(kSuite, kBackOff, 1);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 1U);
}

TEST_F(TattleWorker, WithoutThePromptServiceItIsNotMade) {
  platform_.facilities().tattle = nullptr;
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
}

TEST_F(TattleWorker, RunsInSingleMessageSessions) {
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 1U);
}

TEST_F(TattleWorker, TheFirstMessageNeverPrompts) {
  const auto session = startedSession();
  sendError(*session, 1000);
  EXPECT_EQ(prompts(), 0U);
  EXPECT_FALSE(lastRun().present());
}

TEST_F(TattleWorker, ErrorsOfTheFirstFiveSecondsAreIgnored) {
  const auto session = armedSession();
  sendError(*session, -1);
  sendError(*session, 4.999);
  sendError(*session, 5);
  EXPECT_EQ(prompts(), 0U);
  EXPECT_FALSE(lastRun().present());
  sendError(*session, 5.001);
  EXPECT_EQ(prompts(), 1U);
}

TEST_F(TattleWorker, ThePromptCarriesTheDraftTheProcessAndTheReason) {
  sendError(*armedSession(), 6);
  ASSERT_EQ(prompts(), 1U);
  const auto& prompt = platform_.tattle.prompts()[0];
  EXPECT_EQ(prompt.draft.title, "Invalid x/y coordinates during a Parley call (Tat)");
  EXPECT_EQ(prompt.draft.description,
            "Invalid coordinates were provided to the audio layer during a Parley call, making it impossible to render "
            "spatial audio correctly. Filing this docket will help determine what went wrong.");
  EXPECT_EQ(prompt.draft.component.name, "Parley Core - Dialworks");
  EXPECT_EQ(prompt.draft.component.version, "All");
  EXPECT_EQ(prompt.draft.component.identifier, 1084682);
  EXPECT_EQ(prompt.draft.reproducibility, 6);
  EXPECT_EQ(prompt.draft.classification, 7);
  EXPECT_EQ(prompt.draft.diagnosticExtensions, (Strings{"sys.oxbow.Vetch.audio"}));
  EXPECT_EQ(prompt.processName, "parleyd");
  EXPECT_EQ(prompt.displayReason, "a Parley spatial positioning error occurred");
}

TEST_F(TattleWorker, AProcessWithoutANameIsLeftOut) {
  const auto session = armedSession();
  session->setClientProcessName("");
  sendError(*session, 6);
  ASSERT_EQ(prompts(), 1U);
  EXPECT_FALSE(platform_.tattle.prompts()[0].processName);
}

TEST_F(TattleWorker, APromptIsLoggedAndItsMomentStored) {
  sendError(*armedSession(9), 6);
  EXPECT_EQ(lines(LogLevel::Debug), (Strings{"Tattle has not run. key=ParleyInvalidXyTatlastRun "
                                             "backoffSeconds=3600.000000"}));
  EXPECT_EQ(lines(LogLevel::Default), (Strings{"Starting tattle for ParleyXYerrorMessage reporterID=9"}));
  EXPECT_EQ(lines(LogLevel::Info), (Strings{"Successfully created draft"}));
  EXPECT_EQ(lastRun().view().asDouble(), now());
}

TEST_F(TattleWorker, OnlyAKeyThatBeginsSoQualifies) {
  const auto session = armedSession();
  send(*session, {{"a_plac_invalid_x", 1}, {"Plac_invalid_x", 1}, {"plac_invalid", "plac_invalid_"}}, 6);
  EXPECT_EQ(prompts(), 0U);
  EXPECT_FALSE(lastRun().present());
  send(*session, {{"other", 1}, {"plac_invalid_", false}}, 7);
  EXPECT_EQ(prompts(), 1U);
}

TEST_F(TattleWorker, ALastRunWithinTheBackOffHoldsThePromptBack) {
  const double tenMinutesAgo = now() - 600;
  platform_.defaults.set(kSuite, kLastRun, tenMinutesAgo);
  sendError(*armedSession(), 6);
  EXPECT_EQ(prompts(), 0U);
  EXPECT_EQ(lastRun(), plist::Value(tenMinutesAgo));
  EXPECT_TRUE(platform_.defaults.writes().empty());
  EXPECT_EQ(lines(LogLevel::Debug), (Strings{"Tattle has run. key=ParleyInvalidXyTatlastRun lastRun=1749999400"}));
}

TEST_F(TattleWorker, TheBackOffEndsToTheSecond) {
  struct Case {
    double ago;
    std::size_t prompts;
  };
  for (const auto& [ago, expected] : {Case{kHour - 1, 0}, Case{kHour, 1}, Case{kHour + 1, 2}, Case{-1e9, 2}}) {
    platform_.defaults.set(kSuite, kLastRun, now() - ago);
    sendError(*armedSession(), 6);
    EXPECT_EQ(prompts(), expected) << ago;
  }
}

TEST_F(TattleWorker, TwoSessionsWithinTheBackOffPromptOnce) {
  const auto one = armedSession(1);
  const auto other = armedSession(2);
  sendError(*one, 6);
  sendError(*other, 6);
  EXPECT_EQ(prompts(), 1U);
  platform_.clock.advance(3601s);
  sendError(*other, 6);
  EXPECT_EQ(prompts(), 2U);
}

TEST_F(TattleWorker, ARunPromptsOnceThoughTheBackOffIsOver) {
  const auto session = armedSession(5);
  sendError(*session, 6);
  platform_.clock.advance(3601s);
  platform_.log.clear();
  sendError(*session, 6);
  EXPECT_EQ(prompts(), 1U);
  EXPECT_EQ(lastLine(LogLevel::Debug), "Tattle has already run for ParleyXYerrorMessage reporterID=5");
  EXPECT_TRUE(lines(LogLevel::Default).empty());
  EXPECT_EQ(lastRun().view().asDouble(), now());  // asking has claimed the period
}

TEST_F(TattleWorker, TheNextRunMayPromptAgain) {
  const auto session = armedSession(5);
  sendError(*session, 6);
  session->stop();
  EXPECT_EQ(lastLine(LogLevel::Debug), "Resetting hasRun to false. reporterID=5");
  platform_.clock.advance(3601s);
  session->start();
  sendError(*session, 6);  // the worker is armed still
  EXPECT_EQ(prompts(), 2U);
}

TEST_F(TattleWorker, AStoreThatTakesNothingLetsARunPromptOnce) {
  platform_.defaults.failWrites(true);
  const auto session = armedSession();
  sendError(*session, 6);
  sendError(*session, 7);
  EXPECT_EQ(prompts(), 1U);
  EXPECT_FALSE(lastRun().present());
}

TEST_F(TattleWorker, ARefusalIsLoggedOnceAndTheSessionStops) {
  platform_.tattle.refuseWith(Error{5, "nobody is here"});
  const auto session = armedSession();
  sendError(*session, 6);
  session->stop();
  EXPECT_EQ(lines(LogLevel::Error), (Strings{"Error creating draft - nobody is here"}));
  EXPECT_TRUE(lines(LogLevel::Info).empty());
  EXPECT_EQ(prompts(), 1U);
  EXPECT_FALSE(session->started());
}

TEST_F(TattleWorker, WhateverHappensToTheAnswerTheSessionStops) {
  struct Case {
    ReplyFault fault;
    std::size_t answers;
  };
  for (const auto& [fault, answers] : {Case{ReplyFault::Drop, 0}, Case{ReplyFault::Hold, 0}, Case{ReplyFault::Twice, 2},
                                       Case{ReplyFault::OtherThread, 1}}) {
    platform_.clock.advance(3601s);
    platform_.log.clear();
    platform_.tattle.replies().set(fault);
    const auto session = armedSession();
    sendError(*session, 6);
    session->stop();
    EXPECT_FALSE(session->started());
    platform_.tattle.replies().joinThreads();
    EXPECT_EQ(lines(LogLevel::Info).size(), answers) << static_cast<int>(fault);
  }
  EXPECT_EQ(prompts(), 4U);
}

TEST_F(TattleWorker, AnAnswerAfterTheSessionsEndIsLogged) {
  platform_.tattle.replies().set(ReplyFault::Hold);
  sendError(*armedSession(), 6);
  EXPECT_EQ(platform_.tattle.replies().deliverHeld(), 1U);
  EXPECT_EQ(lines(LogLevel::Info), (Strings{"Successfully created draft"}));
}

TEST_F(TattleWorker, AnyBackOffIsReadAsANumber) {
  const double lastRunAgo = 500;
  for (const auto& [value, number] : oddValues()) {
    platform_.defaults.set(kSuite, kBackOff, value);
    platform_.defaults.set(kSuite, kLastRun, now() - lastRunAgo);
    const std::size_t before = prompts();
    sendError(*armedSession(), 6);
    EXPECT_EQ(prompts() - before, number > lastRunAgo ? 0U : 1U) << plist::description(value);
  }
}

TEST_F(TattleWorker, AnyLastRunIsReadAsANumber) {
  for (const auto& [value, number] : oddValues()) {
    platform_.defaults.set(kSuite, kLastRun, value);
    const std::size_t before = prompts();
    sendError(*armedSession(), 6);
    EXPECT_EQ(prompts() - before, number > now() - kHour ? 0U : 1U) << plist::description(value);
  }
}

TEST_F(TattleWorker, AnyValueUnderTheKeysOfAMessageIsBorne) {
  for (const auto& [value, number] : oddValues()) {
    platform_.clock.advance(3601s);
    const auto session = armedSession();
    send(*session, {{"plac_invalid_y", value}}, 6);
    session->sendMessage(message({{"plac_invalid_y", 1}, {"tarnreporting_timestamp", value}}));
    session->stop();
    EXPECT_FALSE(session->started());
  }
  EXPECT_EQ(prompts(), oddValues().size());
}

TEST_F(TattleWorker, AMomentOfZeroIsNotArmedYet) {
  const auto session = startedSession();
  TarnReportingSessionTattleWorker worker(session, kHour);
  const auto handle = [&worker](double stamp) {
    worker.handleMessage(message({{"plac_invalid_x", 1}, {"tarnreporting_timestamp", stamp}}));
  };
  EXPECT_EQ(worker.minimumMessageTime(), -1.0);
  handle(-5);  // five seconds later it is 0
  EXPECT_EQ(worker.minimumMessageTime(), 0.0);
  handle(100);  // so this one arms
  EXPECT_EQ(worker.minimumMessageTime(), 105.0);
  EXPECT_EQ(prompts(), 0U);
  handle(105.5);
  EXPECT_EQ(prompts(), 1U);
}

TEST_F(TattleWorker, AMomentOfLessThanASecondIsArmed) {
  const auto session = startedSession();
  TarnReportingSessionTattleWorker worker(session, kHour);
  const auto handle = [&worker](double stamp) {
    worker.handleMessage(message({{"plac_invalid_x", 1}, {"tarnreporting_timestamp", stamp}}));
  };
  handle(-4.5);
  EXPECT_EQ(worker.minimumMessageTime(), 0.5);
  handle(100);
  EXPECT_EQ(worker.minimumMessageTime(), 0.5);
  EXPECT_EQ(prompts(), 1U);
}

TEST_F(TattleWorker, ClaimsThePeriodThenTellsThenPrompts) {
  const auto session = armedSession(9);
  platform_.order.start();
  sendError(*session, 6);
  Strings entries = platform_.order.entries();
  std::erase_if(entries, [](const std::string& entry) { return entry.starts_with("log TarnReporting"); });
  EXPECT_EQ(entries,
            (Strings{"log Tattle has not run. key=ParleyInvalidXyTatlastRun backoffSeconds=3600.000000",
                     "store ParleyInvalidXyTatlastRun", "log Starting tattle for ParleyXYerrorMessage reporterID=9",
                     "draft", "log Successfully created draft"}));
}

TEST_F(TattleWorker, ItsRunIsTakenBeforeThePromptAndGivenBackAfterTheStopsLine) {
  const auto session = startedSession();
  TarnReportingSessionTattleWorker worker(session, kHour);
  std::vector<std::pair<std::string, bool>> runs;
  platform_.order.start([&](const std::string& entry) {
    if (entry == "draft" || entry.starts_with("log Resetting")) {
      runs.emplace_back(entry, worker.hasRun());
    }
  });
  worker.handleMessage(message({{"n", 1}, {"tarnreporting_timestamp", now()}}));
  worker.handleMessage(message({{"plac_invalid_x", 1}, {"tarnreporting_timestamp", now() + 6}}));
  worker.stop();
  EXPECT_EQ(runs, (std::vector<std::pair<std::string, bool>>{{"draft", true},
                                                             {"log Resetting hasRun to false. reporterID=7", true}}));
  EXPECT_FALSE(worker.hasRun());
}

TEST_F(TattleWorker, ABackOffThatIsOverIsAskedForWithTheTimeOfNow) {
  using Worker = TarnReportingSessionTattleWorker;
  EXPECT_FALSE(Worker::hasRunInTimeframe(60, "key"));
  EXPECT_EQ(platform_.defaults.value(kSuite, "key"), plist::Value(now()));
  EXPECT_TRUE(Worker::hasRunInTimeframe(60, "key"));
  EXPECT_FALSE(Worker::hasRunInTimeframe(60, "other key"));
  EXPECT_FALSE(Worker::hasRunInTimeframe(0, "key"));
}

TEST_F(TattleWorker, AStopBehindItsSessionNamesNoReporter) {
  auto session = startedSession();
  TarnReportingSessionTattleWorker worker(session, 1);
  session.reset();
  worker.stop();
  EXPECT_EQ(lastLine(LogLevel::Debug), "Resetting hasRun to false. reporterID=0");
}

TEST_F(TattleWorker, WithoutItsSessionOrTheServiceNothingIsPrompted) {
  auto session = startedSession();
  TarnReportingSessionTattleWorker worker(session, 1);
  const auto handle = [&](double after) {
    worker.handleMessage(message({{"plac_invalid_x", 1}, {"tarnreporting_timestamp", now() + after}}));
  };
  handle(0);
  platform_.facilities().tattle = nullptr;
  handle(6);
  platform_.facilities().tattle = &platform_.tattle;
  session.reset();
  platform_.clock.advance(10s);
  handle(6);
  EXPECT_EQ(prompts(), 0U);
  EXPECT_FALSE(worker.hasRun());
}

}  // namespace
}  // namespace tarn
