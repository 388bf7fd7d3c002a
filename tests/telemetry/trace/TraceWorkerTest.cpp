// The trace worker and its trace: when there is one, how it begins and ends, and what comes of a facility that errs.
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

class TraceWorker : public TraceFixture {
 protected:
  static constexpr const char* kStartTimedOut = "timed out waiting for performance trace to start";
  static constexpr const char* kStopTimedOut =
      "timed out waiting for performance trace to stop.  No pdj file wil be generated. ";

  FakePerformanceTraceService& facility() { return platform_.performanceTrace; }
  // The facility answers while somebody waits.
  void answerInWaits() {
    facility().callbacks().set(ReplyFault::Hold);
    platform_.conditions.onWait([this](auto) {
      facility().callbacks().deliverHeld();
      return WaitEnd::TimesOut;  // unless that signalled
    });
  }
};

TEST_F(TraceWorker, IsForInternalBuilds) {
  EXPECT_TRUE(TarnReportingSessionTraceWorker::internalOnly());
}

TEST_F(TraceWorker, TestSessionIsTracedFromStartToStop) {
  const auto session = makeTestSession();
  EXPECT_TRUE(facility().traces().empty());
  session->start();
  EXPECT_TRUE(workerOf(*session).started());
  ASSERT_EQ(facility().traces().size(), 1U);
  EXPECT_EQ(facility().traces()[0].starts, 1U);
  EXPECT_EQ(facility().traces()[0].stops, 0U);
  session->stop();
  EXPECT_FALSE(workerOf(*session).started());
  EXPECT_EQ(facility().traces()[0].stops, 1U);
  EXPECT_TRUE(facility().traces()[0].released);
  EXPECT_TRUE(errors().empty());
  EXPECT_EQ(lines(LogLevel::Info).at(0), "Performance Trace Started");
  EXPECT_EQ(lines(LogLevel::Info).at(1), "Performance Trace Stopped");
  EXPECT_EQ(lines(LogLevel::Info).at(2), "Performance Trace Completed: /device/traces/1");
}

TEST_F(TraceWorker, SessionOfAnotherServiceTypeIsNotTraced) {
  const auto session = makeTestSession();
  session->setServiceType(AudioServiceType::Generic);
  session->start();
  EXPECT_FALSE(workerOf(*session).started());
  session->stop();
  EXPECT_TRUE(facility().traces().empty());
  EXPECT_TRUE(errors().empty());
}

TEST_F(TraceWorker, BuildThatIsNotInternalTracesNothing) {
  platform_.deviceProperties.set("InternalBuild", false);
  const auto session = makeTestSession();
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 2U);
  EXPECT_FALSE(workerOf(*session).started());
  session->stop();
  EXPECT_TRUE(facility().traces().empty());
}

TEST_F(TraceWorker, PlatformThatLacksAFacilityHasNoWorker) {
  const platform::Facilities whole = platform_.facilities();
  for (const int lacking : {0, 1, 2}) {
    auto& facilities = platform_.facilities();
    facilities.performanceTrace = lacking == 0 ? nullptr : whole.performanceTrace;
    facilities.traceAnalysis = lacking == 1 ? nullptr : whole.traceAnalysis;
    facilities.perfDataWriters = lacking == 2 ? nullptr : whole.perfDataWriters;
    EXPECT_EQ(TarnReportingSessionTraceWorker::initWithSession(makeTestSession()), nullptr) << lacking;
  }
}

TEST_F(TraceWorker, SingleMessageSessionHasNoWorker) {
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->setServiceType(AudioServiceType::Test);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
}

TEST_F(TraceWorker, ProfilesHaveATemplateOfTheirOwnAndEverythingElseTheOtherUncompressed) {
  const std::vector<std::pair<plist::Dictionary, int>> cases{
      {{}, 2},
      {{{"TarnReportingTraceType", "sktrace_profile"}}, 3},
      {{{"TarnReportingTraceType", "sktrace"}}, 2},
      {{{"TarnReportingTraceType", "ktrace"}}, 2},
      {{{"TarnReportingTraceType", 3}}, 2},
      {{{"TarnReportingTraceType", plist::Array{"sktrace_profile"}}}, 2},
  };
  for (const auto& [configuration, number] : cases) {
    makeTestSession(configuration)->start();
  }
  ASSERT_EQ(facility().traces().size(), cases.size());
  for (std::size_t at = 0; at < cases.size(); ++at) {
    EXPECT_EQ(facility().traces()[at].configuration.templateNumber, cases[at].second) << at;
    EXPECT_FALSE(facility().traces()[at].configuration.compressWhenFinished);
  }
}

TEST_F(TraceWorker, WithoutAFileOfDescriptionsNothingIsTraced) {
  const std::vector<std::pair<plist::Dictionary, std::string>> cases{
      {{{"TarnReportingSkeinPlistFilePath", "/device/none"}}, "/device/none"},
      {{{"TarnReportingSkeinPlistFilePath", ""}}, ""},
      {{{"TarnReportingSkeinPlistFilePath", 5}}, "5"},
      {{{"TarnReportingSkeinPlistFilePath", true}}, "1"},
      {{{"TarnReportingSkeinPlistFilePath", plist::Array{kDescriptions}}}, "(/device/probes.plist)"},
      {{{"TarnReportingSkeinPlistFilePath", plist::Dictionary{{"a", 1}}}}, "{a = 1}"},
  };
  for (const auto& [configuration, path] : cases) {
    platform_.log.clear();
    const auto session = makeTestSession(configuration);
    session->start();
    EXPECT_FALSE(workerOf(*session).started());
    session->stop();
    EXPECT_EQ(errors(), (Strings{"Could not start PerformanceTrace. TarnReportingSkeinPlistFilePath: " + path +
                                 " is not a valid path"}));
  }
  EXPECT_TRUE(facility().traces().empty());
}

TEST_F(TraceWorker, WithoutTheKeyOfDescriptionsNothingIsTraced) {
  const auto session = makeSession();
  session->setServiceType(AudioServiceType::Test);
  session->start();
  EXPECT_EQ(errors(), (Strings{"Could not start PerformanceTrace. TarnReportingSkeinPlistFilePath: (null) is not a "
                               "valid path"}));
}

TEST_F(TraceWorker, WaitsFifteenSecondsForTheStartAndAHundredAndEightyForTheEnd) {
  answerInWaits();
  play();
  EXPECT_EQ(waits(), (std::vector<double>{15, 180}));
  EXPECT_TRUE(file().closed);
}

TEST_F(TraceWorker, WakeUpAtTheVeryEndOfTheTimeIsTheEnd) {
  facility().callbacks().set(ReplyFault::Hold);
  platform_.conditions.onWait([this](auto) {
    platform_.clock.advance(5s);
    return WaitEnd::Wakes;
  });
  makeTestSession()->start();
  EXPECT_EQ(waits(), (std::vector<double>{15, 10, 5}));
  EXPECT_EQ(errors(), Strings{kStartTimedOut});
}

TEST_F(TraceWorker, WakeUpANanosecondBeforeTheEndIsNotTheEnd) {
  facility().callbacks().set(ReplyFault::Hold);
  platform_.conditions.onWait([this](auto timeout) {
    platform_.clock.advance(timeout.count() > 1 ? 15s - 1ns : 1ns);
    return WaitEnd::Wakes;
  });
  makeTestSession()->start();
  EXPECT_EQ(waits(), (std::vector<double>{15, 1e-9}));
}

TEST_F(TraceWorker, EachAnswerWakesWhoeverWaits) {
  play();
  ASSERT_EQ(platform_.conditions.made().size(), 1U);
  EXPECT_EQ(platform_.conditions.made()[0]->signals(), 3U);  // the start, and the completion for both waits
}

TEST_F(TraceWorker, WordsThatComeAgainAreNoWords) {
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

TEST_F(TraceWorker, SessionIsLetGoBeforeItsErrorIsTold) {
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

TEST_F(TraceWorker, AnswerThatComesWhileTheTimeRunsOutCounts) {
  facility().callbacks().set(ReplyFault::Hold);
  const auto recording = std::make_shared<TarnReportingTraceRecording>(
      facility().createSession({}),
      std::make_shared<ImpatientCondition>([this] { facility().callbacks().deliverHeld(); }));
  EXPECT_TRUE(recording->start());
  EXPECT_EQ(recording->stop(), TarnReportingTraceRecording::End::Completed);
  EXPECT_TRUE(errors().empty());
}

TEST_F(TraceWorker, WakeUpWithoutAnAnswerDoesNotProlongTheWait) {
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

TEST_F(TraceWorker, StartWithoutAnAnswerStopsTheTraceAndIsNotTriedAgain) {
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

TEST_F(TraceWorker, TraceThatIsNotValidIsNotStoppedWhenItsStartTimesOut) {
  facility().failStart(Error{5, "no buffer"});
  facility().callbacks().set(ReplyFault::Drop);
  makeTestSession()->start();
  EXPECT_EQ(facility().traces().at(0).stops, 0U);
  EXPECT_EQ(errors(), Strings{kStartTimedOut});
}

TEST_F(TraceWorker, AnswerBehindTheTimeOutIsLoggedAndChangesNothing) {
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

TEST_F(TraceWorker, StartWithAnErrorIsLoggedAndLeavesNothingToStop) {
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

TEST_F(TraceWorker, SessionIsTracedAgainBehindAStartWithAnError) {
  facility().failStart(Error{5, "no buffer"});
  const auto session = makeTestSession();
  session->start();
  session->stop();
  facility().failStart({});
  session->start();
  session->stop();
  EXPECT_EQ(facility().traces().size(), 2U);
}

TEST_F(TraceWorker, FacilityWithoutSuchATraceIsAskedAgainAtTheNextStart) {
  facility().setMakesSessions(false);
  const auto session = makeTestSession();
  session->start();
  EXPECT_FALSE(workerOf(*session).started());
  EXPECT_EQ(errors(), Strings{"Could not start PerformanceTrace. There is no trace of template 2"});
  EXPECT_TRUE(waits().empty());
  session->stop();
  facility().setMakesSessions(true);
  session->start();
  EXPECT_TRUE(workerOf(*session).started());
}

TEST_F(TraceWorker, StopWithoutAnAnswerLeavesNoFile) {
  const auto session = makeTestSession();
  session->start();
  facility().callbacks().set(ReplyFault::Drop);
  session->stop();
  EXPECT_EQ(errors(), Strings{kStopTimedOut});
  EXPECT_EQ(waits(), std::vector<double>{180});
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceWorker, StopWithAnErrorDoesNotEndTheWait) {
  const auto session = makeTestSession();
  session->start();
  facility().failStop(Error{5, "disk gone"});
  session->stop();
  EXPECT_EQ(errors(), (Strings{"performanceTraceDidStop disk gone", kStopTimedOut}));
  EXPECT_EQ(waits(), std::vector<double>{180});
  EXPECT_TRUE(facility().traces().at(0).released);
}

TEST_F(TraceWorker, CompletionWithAnErrorLeavesNoTraceToAnalyse) {
  facility().failCompletion(Error{28, "No space left on device"});
  play();
  EXPECT_EQ(errors(),
            (Strings{"performanceTraceDidComplete No space left on device", "No traceResults at path: (null)"}));
  EXPECT_TRUE(platform_.log.contains("Starting Skein Process Trace. Path: (null)"));
  EXPECT_TRUE(facility().traces().at(0).released);
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceWorker, CompletionTakesTheDelegateAway) {
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

TEST_F(TraceWorker, SecondStartLeavesTheTraceThatRuns) {
  const auto session = makeTestSession();
  session->start();
  auto& worker = dynamic_cast<TarnReportingSessionTraceWorker&>(workerOf(*session));
  EXPECT_TRUE(worker.start());
  EXPECT_EQ(facility().traces().size(), 1U);
  EXPECT_EQ(facility().traces()[0].starts, 1U);
}

TEST_F(TraceWorker, SessionThatIsNoTestAnyMoreIsNotStopped) {
  const auto session = makeTestSession();
  session->start();
  session->setServiceType(AudioServiceType::Generic);
  session->stop();
  EXPECT_EQ(facility().traces().at(0).stops, 0U);
  EXPECT_TRUE(platform_.perfDataWriters.files().empty());
}

TEST_F(TraceWorker, WorkerWithoutItsSessionDoesNothing) {
  auto session = makeTestSession();
  const auto idle = TarnReportingSessionTraceWorker::initWithSession(session);
  const auto tracing = TarnReportingSessionTraceWorker::initWithSession(session);
  ASSERT_TRUE(tracing->start());
  session.reset();
  EXPECT_FALSE(idle->start());
  tracing->stop();
  EXPECT_EQ(facility().traces().size(), 1U);
  EXPECT_EQ(facility().traces()[0].stops, 0U);
}

TEST_F(TraceWorker, EvaluationIsAnnouncedAsABlockOnPurposeAndTheWaitsAreNotPartOfIt) {
  bool blockedWhileWaiting = false;
  answerInWaits();
  const auto session = makeTestSession();
  session->start();
  platform_.conditions.onWait([&](auto) {
    blockedWhileWaiting = platform_.conditions.isBlockedOnPurpose();
    facility().callbacks().deliverHeld();
    return WaitEnd::TimesOut;
  });
  bool blockedWhileReading = false;
  platform_.traceAnalysis.onLoad([&] { blockedWhileReading = platform_.conditions.isBlockedOnPurpose(); });
  EXPECT_EQ(platform_.conditions.blocks(), 0U);
  session->stop();
  EXPECT_FALSE(blockedWhileWaiting);
  EXPECT_TRUE(blockedWhileReading);
  EXPECT_EQ(platform_.conditions.blocks(), 1U);
  EXPECT_FALSE(platform_.conditions.isBlockedOnPurpose());
}

TEST_F(TraceWorker, EachPeriodHasATraceAndAFileOfItsOwn) {
  platform_.fileSystem.putFile("/device/traces/2", "a trace");
  const auto session = makeTestSession();
  for (int period = 0; period < 2; ++period) {
    platform_.traceAnalysis.setProbes({probe("p", {0.001})});
    putTemporaryFile();
    session->start();
    session->stop();
  }
  EXPECT_EQ(platform_.traceAnalysis.openedLocations(), (Strings{"/device/traces/1", "/device/traces/2"}));
  ASSERT_EQ(platform_.perfDataWriters.files().size(), 2U);
  for (const auto& written : platform_.perfDataWriters.files()) {
    EXPECT_EQ(written->values, (Values{{"p", 1}, {"p Total", 1}, {"p AVG", 1}}));
  }
}

TEST_F(TraceWorker, LateCompletionOfOnePeriodIsNotTakenForThatOfTheNext) {
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

TEST_F(TraceWorker, AnswersThatComeTwiceCountOnce) {
  facility().callbacks().set(ReplyFault::Twice);
  play();
  EXPECT_TRUE(file().closed);
  EXPECT_TRUE(errors().empty());
  EXPECT_EQ(platform_.log.count("Performance Trace Started"), 1U);
  EXPECT_EQ(platform_.log.count("Performance Trace Stopped"), 1U);
  EXPECT_EQ(platform_.log.count("Performance Trace Completed"), 1U);
}

TEST_F(TraceWorker, SessionThatGoesAwayTakesItsTraceAlong) {
  auto session = makeTestSession();
  session->start();
  session.reset();
  EXPECT_TRUE(facility().traces().at(0).released);
}

TEST_F(TraceWorker, AnswersBehindTheSessionsEndReachNobody) {
  facility().callbacks().set(ReplyFault::Hold);
  auto session = makeTestSession();
  session->start();
  session.reset();
  platform_.log.clear();
  facility().callbacks().deliverHeld();
  EXPECT_TRUE(lines(LogLevel::Info).empty());
  EXPECT_TRUE(errors().empty());
}

TEST_F(TraceWorker, AnswersMayComeFromAnotherThread) {
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
TEST_F(TraceWorker, AnswersFromOtherThreadsRaceWithTimeOutsAndEnds) {
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
