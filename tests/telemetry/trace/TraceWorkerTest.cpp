// SPDX-License-Identifier: Apache-2.0
// The trace worker: which sessions are traced, with what, from when to when.
#include "tests/telemetry/trace/TraceFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::LogLevel;

class TraceWorker : public TraceFixture {};

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

TEST_F(TraceWorker, SessionThatGoesAwayTakesItsTraceAlong) {
  auto session = makeTestSession();
  session->start();
  session.reset();
  EXPECT_TRUE(facility().traces().at(0).released);
}

}  // namespace
}  // namespace tarn
