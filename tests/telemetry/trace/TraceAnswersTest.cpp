// SPDX-License-Identifier: Apache-2.0
// What the trace facility answers: answers that are awaited, missing, late, doubled, wrong or from another thread.
#include <functional>
#include <mutex>
#include <thread>

#include "telemetry/trace/TarnReportingTraceRecording.h"
#include "tests/telemetry/trace/TraceFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using platform::LogLevel;

class TraceAnswers : public TraceFixture {
 protected:
  static constexpr const char* kStartTimedOut = "timed out waiting for performance trace to start";
  static constexpr const char* kStopTimedOut =
      "timed out waiting for performance trace to stop.  No pdj file wil be generated. ";
};

TEST_F(TraceAnswers, WaitsFifteenSecondsForTheStartAndAHundredAndEightyForTheEnd) {
  answerInWaits();
  play();
  EXPECT_EQ(waits(), (std::vector<double>{15, 180}));
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceAnswers, WakeUpAtTheVeryEndOfTheTimeIsTheEnd) {
  facility().callbacks().set(ReplyFault::Hold);
  platform_.conditions.onWait([this](auto) {
    platform_.clock.advance(5s);
    return WaitEnd::Wakes;
  });
  makeTestSession()->start();
  EXPECT_EQ(waits(), (std::vector<double>{15, 10, 5}));
  EXPECT_EQ(errors(), Strings{kStartTimedOut});
}

TEST_F(TraceAnswers, WakeUpANanosecondBeforeTheEndIsNotTheEnd) {
  facility().callbacks().set(ReplyFault::Hold);
  platform_.conditions.onWait([this](auto timeout) {
    platform_.clock.advance(timeout.count() > 1 ? 15s - 1ns : 1ns);
    return WaitEnd::Wakes;
  });
  makeTestSession()->start();
  EXPECT_EQ(waits(), (std::vector<double>{15, 1e-9}));
}

TEST_F(TraceAnswers, EachAnswerWakesWhoeverWaits) {
  play();
  ASSERT_EQ(platform_.conditions.made().size(), 1U);
  EXPECT_EQ(platform_.conditions.made()[0]->signals(), 3U);  // the start, and the completion for both waits
}

TEST_F(TraceAnswers, WordsThatComeAgainAreNoWords) {
  const auto condition = std::make_shared<ManualCondition>(nullptr);
  TarnReportingTraceRecording recording(nullptr, condition);
  EXPECT_EQ(recording.eventsLeftOut(), 0U);
  for (const char* location : {"/device/traces/first", "/device/traces/second"}) {
    recording.performanceTraceDidStart({});
    recording.performanceTraceDidStop({});
    recording.performanceTraceDidComplete(location, "token", {});
  }
  EXPECT_EQ(recording.finalTraceURL(), "/device/traces/first");
  EXPECT_EQ(condition->signals(), 3U);
  EXPECT_EQ(lines(LogLevel::Info), (Strings{"Performance Trace Started", "Performance Trace Stopped",
                                            "Performance Trace Completed: /device/traces/first"}));
}

TEST_F(TraceAnswers, SessionIsLetGoBeforeItsErrorIsTold) {
  Strings told;
  platform_.order.start([&](const std::string& entry) {
    if (entry.starts_with("log performanceTraceDid")) {
      told.push_back(entry + (facility().traces().back().released ? "!" : "?"));
    }
  });
  const auto recording = [this] {
    return std::make_shared<TarnReportingTraceRecording>(facility().createSession({}),
                                                         platform_.conditions.makeCondition());
  };
  recording()->performanceTraceDidStart(Error{5, "no buffer"});
  recording()->performanceTraceDidStop(Error{5, "disk gone"});
  EXPECT_EQ(told, (Strings{"log performanceTraceDidStart no buffer!", "log performanceTraceDidStop disk gone!"}));
}

// A condition whose every wait says that the time is up.
class ImpatientCondition final : public platform::Condition {
 public:
  explicit ImpatientCondition(std::function<void()> meanwhile) : meanwhile_(std::move(meanwhile)) {}
  void lock() override { mutex_.lock(); }
  void unlock() override { mutex_.unlock(); }
  void signal() override {}
  bool waitFor(std::chrono::duration<double>) override {
    mutex_.unlock();
    meanwhile_();
    mutex_.lock();
    return false;
  }

 private:
  const std::function<void()> meanwhile_;
  std::mutex mutex_;
};

TEST_F(TraceAnswers, AnswerThatComesWhileTheTimeRunsOutCounts) {
  facility().callbacks().set(ReplyFault::Hold);
  const auto recording = std::make_shared<TarnReportingTraceRecording>(
      facility().createSession({}),
      std::make_shared<ImpatientCondition>([this] { facility().callbacks().deliverHeld(); }));
  EXPECT_TRUE(recording->start());
  EXPECT_EQ(recording->stop(), TarnReportingTraceRecording::End::Completed);
  EXPECT_TRUE(errors().empty());
}

TEST_F(TraceAnswers, WakeUpWithoutAnAnswerDoesNotProlongTheWait) {
  facility().callbacks().set(ReplyFault::Hold);
  platform_.conditions.onWait([this](auto) {
    platform_.clock.advance(4s);
    return WaitEnd::Wakes;
  });
  const auto session = makeTestSession();
  session->start();
  EXPECT_FALSE(workerOf(*session).started());
  EXPECT_EQ(waits(), (std::vector<double>{15, 11, 7, 3}));
  EXPECT_EQ(errors(), Strings{kStartTimedOut});
}

TEST_F(TraceAnswers, StartWithoutAnAnswerStopsTheTraceAndIsNotTriedAgain) {
  facility().callbacks().set(ReplyFault::Drop);
  const auto session = makeTestSession();
  session->start();
  EXPECT_FALSE(workerOf(*session).started());
  EXPECT_EQ(errors(), Strings{kStartTimedOut});
  ASSERT_EQ(facility().traces().size(), 1U);
  EXPECT_EQ(facility().traces()[0].stops, 1U);
  session->stop();
  session->start();
  session->stop();
  EXPECT_EQ(facility().traces().size(), 1U);
  EXPECT_EQ(errors().size(), 1U);
  EXPECT_EQ(waits().size(), 1U);
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceAnswers, TraceThatIsNotValidIsNotStoppedWhenItsStartTimesOut) {
  facility().failStart(Error{5, "no buffer"});
  facility().callbacks().set(ReplyFault::Drop);
  makeTestSession()->start();
  EXPECT_EQ(facility().traces().at(0).stops, 0U);
  EXPECT_EQ(errors(), Strings{kStartTimedOut});
}

TEST_F(TraceAnswers, AnswerBehindTheTimeOutIsLoggedAndChangesNothing) {
  facility().callbacks().set(ReplyFault::Hold);
  const auto session = makeTestSession();
  session->start();
  EXPECT_EQ(facility().callbacks().deliverHeld(), 2U);  // of the start, and of the stop after the time-out
  EXPECT_FALSE(workerOf(*session).started());
  EXPECT_EQ(lines(LogLevel::Info), (Strings{"Performance Trace Started", "Performance Trace Stopped",
                                            "Performance Trace Completed: /device/traces/1"}));
  session->stop();
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceAnswers, StartWithAnErrorIsLoggedAndLeavesNothingToStop) {
  facility().failStart(Error{5, "no buffer"});
  const auto session = makeTestSession();
  session->start();
  EXPECT_TRUE(workerOf(*session).started());
  EXPECT_TRUE(facility().traces().at(0).released);
  session->stop();
  EXPECT_EQ(facility().traces().at(0).stops, 0U);
  EXPECT_EQ(errors(), Strings{"performanceTraceDidStart no buffer"});
  EXPECT_TRUE(waits().empty());
}

TEST_F(TraceAnswers, SessionIsTracedAgainBehindAStartWithAnError) {
  facility().failStart(Error{5, "no buffer"});
  const auto session = makeTestSession();
  session->start();
  session->stop();
  facility().failStart({});
  session->start();
  session->stop();
  EXPECT_EQ(facility().traces().size(), 2U);
}

TEST_F(TraceAnswers, StopWithoutAnAnswerLeavesNoFile) {
  const auto session = makeTestSession();
  session->start();
  facility().callbacks().set(ReplyFault::Drop);
  session->stop();
  EXPECT_EQ(errors(), Strings{kStopTimedOut});
  EXPECT_EQ(waits(), std::vector<double>{180});
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceAnswers, StopWithAnErrorDoesNotEndTheWait) {
  const auto session = makeTestSession();
  session->start();
  facility().failStop(Error{5, "disk gone"});
  session->stop();
  EXPECT_EQ(errors(), (Strings{"performanceTraceDidStop disk gone", kStopTimedOut}));
  EXPECT_EQ(waits(), std::vector<double>{180});
  EXPECT_TRUE(facility().traces().at(0).released);
}

TEST_F(TraceAnswers, CompletionWithAnErrorLeavesNoTraceToAnalyse) {
  facility().failCompletion(Error{28, "No space left on device"});
  play();
  EXPECT_EQ(errors(),
            (Strings{"performanceTraceDidComplete No space left on device", "No traceResults at path: (null)"}));
  EXPECT_TRUE(platform_.log.contains("Starting Skein Process Trace. Path: (null)"));
  EXPECT_TRUE(facility().traces().at(0).released);
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceAnswers, CompletionTakesTheDelegateAway) {
  for (const bool fails : {false, true}) {
    if (fails) {
      facility().failCompletion(Error{28, "No space left on device"});
    }
    const auto session = makeTestSession();
    session->start();
    EXPECT_TRUE(facility().traces().back().hasDelegate);
    session->stop();
    EXPECT_FALSE(facility().traces().back().hasDelegate) << fails;
  }
}

TEST_F(TraceAnswers, LateCompletionOfOnePeriodIsNotTakenForThatOfTheNext) {
  platform_.fileSystem.putFile("/device/traces/2", "a trace");
  const auto session = makeTestSession();
  session->start();
  facility().callbacks().set(ReplyFault::Hold);
  session->stop();
  EXPECT_EQ(errors(), Strings{kStopTimedOut});
  facility().callbacks().set(ReplyFault::None);
  session->start();
  facility().callbacks().deliverHeld();
  session->stop();
  EXPECT_EQ(platform_.traceAnalysis.openedLocations(), Strings{"/device/traces/2"});
  EXPECT_EQ(errors().size(), 1U);
}

TEST_F(TraceAnswers, AnswersThatComeTwiceCountOnce) {
  facility().callbacks().set(ReplyFault::Twice);
  play();
  EXPECT_TRUE(file().closed);
  EXPECT_TRUE(errors().empty());
  EXPECT_EQ(platform_.log.count("Performance Trace Started"), 1U);
  EXPECT_EQ(platform_.log.count("Performance Trace Stopped"), 1U);
  EXPECT_EQ(platform_.log.count("Performance Trace Completed"), 1U);
}

TEST_F(TraceAnswers, AnswersBehindTheSessionsEndReachNobody) {
  facility().callbacks().set(ReplyFault::Hold);
  auto session = makeTestSession();
  session->start();
  session.reset();
  platform_.log.clear();
  facility().callbacks().deliverHeld();
  EXPECT_TRUE(lines(LogLevel::Info).empty());
  EXPECT_TRUE(errors().empty());
}

TEST_F(TraceAnswers, AnswersMayComeFromAnotherThread) {
  facility().callbacks().set(ReplyFault::OtherThread);
  platform_.conditions.onWait([this](auto) {
    facility().callbacks().joinThreads();
    return WaitEnd::TimesOut;
  });
  platform_.traceAnalysis.setIntervals({interval("a", 0.5)});
  play();
  facility().callbacks().joinThreads();
  EXPECT_EQ(file().values, (Values{{"a", 500}, {"a Total", 500}, {"a AVG", 500}}));
  EXPECT_TRUE(errors().empty());
}

// Waits that end at any moment, sessions that end while the facility calls: whatever the threads do, nothing dangles.
TEST_F(TraceAnswers, AnswersFromOtherThreadsRaceWithTimeOutsAndEnds) {
  constexpr int kSessions = 300;
  facility().callbacks().set(ReplyFault::OtherThread);
  int waited = 0;
  platform_.conditions.onWait([&waited](auto) {
    if (++waited % 3 != 0) {
      std::this_thread::yield();
    }
    return WaitEnd::TimesOut;
  });
  for (int count = 0; count < kSessions; ++count) {
    auto session = makeTestSession();
    session->start();
    if (count % 2 == 0) {
      session->stop();
    }
    session.reset();
  }
  facility().callbacks().joinThreads();
  const auto traces = facility().traces();
  EXPECT_EQ(traces.size(), std::size_t{kSessions});
  for (const auto& trace : traces) {
    EXPECT_TRUE(trace.released);
  }
}

}  // namespace
}  // namespace tarn
