// SPDX-License-Identifier: Apache-2.0
// The worker that asks for a trace of the device at an audio overload: which overloads count, what is asked for, and
// how its settings are read.
#include "diagnostics/TarnReportingSessionDPWorker.h"

#include <cmath>

#include "diagnostics/TarnReportingDiagnosticDefaults.h"
#include "tests/diagnostics/OddValues.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using Seconds = std::chrono::duration<double>;
using Strings = std::vector<std::string>;

constexpr const char* kSuite = "sys.oxbow.tarnkit.tarnreporting";

class DPWorker : public SessionFixture {
 protected:
  DPWorker() {
    useWorkers<TarnReportingSessionDPWorker>();
    platform_.deviceProperties.set("InternalBuild", true);
    set("enable_gyre", true);
  }

  void set(const char* key, const plist::ValueView& value) { platform_.defaults.set(kSuite, key, value); }
  static std::shared_ptr<TarnReportingSession> startedSession(std::int64_t reporterID = 7) {
    auto session = makeSession(reporterID);
    session->start();
    return session;
  }
  static void sendOverload(TarnReportingSession& session, plist::Dictionary payload) {
    session.sendMessage(message(std::move(payload), AudioEventCategory::IO, AudioEventType::Error));
  }
  std::size_t gyres() const { return platform_.gyre.requests().size(); }
  // How many gyres an overload with this payload brings in a new session.
  std::size_t gyresOf(const plist::Dictionary& payload) {
    const std::size_t before = gyres();
    sendOverload(*startedSession(), payload);
    return gyres() - before;
  }
  // What the worker logged at a level.
  Strings lines(platform::LogLevel level) const {
    Strings found;
    for (const auto& entry : platform_.log.entries(level)) {
      if (entry.module == TarnReportingSessionDPWorker::kClassName) {
        EXPECT_EQ(entry.category, "tarnrl");
        found.push_back(entry.message());
      }
    }
    return found;
  }
  std::string lastLine(platform::LogLevel level) const {
    const Strings found = lines(level);
    return found.empty() ? "no line" : found.back();
  }
};

TEST_F(DPWorker, IsMadeOnAnInternalBuildWithTheSettingOn) {
  EXPECT_EQ(startedSession()->workerInstanceCount(), 1U);
  EXPECT_EQ(lines(LogLevel::Debug), (Strings{"Value of enable_gyre is 1"}));
}

TEST_F(DPWorker, IsNotMadeWhenTheSettingIsMissing) {
  set("enable_gyre", {});
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
  EXPECT_TRUE(lines(LogLevel::Debug).empty());
}

TEST_F(DPWorker, IsNotMadeWhenTheSettingIsFalse) {
  set("enable_gyre", false);
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
  EXPECT_EQ(lines(LogLevel::Debug), (Strings{"Value of enable_gyre is 0"}));
}

TEST_F(DPWorker, IsNotMadeOnOtherBuilds) {
  platform_.deviceProperties.set("InternalBuild", false);
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
  EXPECT_EQ(lines(LogLevel::Debug), (Strings{"Value of enable_gyre is 1"}));  // the setting is read first
}

TEST_F(DPWorker, IsNotMadeWhereThereIsNoSuchService) {
  platform_.facilities().gyre = nullptr;
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
}

TEST_F(DPWorker, DoesNotRunInSingleMessageSessions) {
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->start();
  EXPECT_EQ(session->workerInstanceCount(), 0U);
}

TEST_F(DPWorker, SettingsThatAreThereAreLoggedAsTheyAreRead) {
  set("io_buffer_size", 256);
  set("io_cycle", "7");
  set("wait_time", 2.5);
  startedSession();
  EXPECT_EQ(lines(LogLevel::Debug), (Strings{"Value of enable_gyre is 1", "Value of io_buffer_size is 256",
                                             "Value of io_cycle is 7", "Value of wait_time is 2.5"}));
}

TEST_F(DPWorker, WithoutASizeSettingSmallBuffersAreNotCaptured) {
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 256}}), 0U);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 511}}), 0U);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
  EXPECT_EQ(gyresOf({}), 0U);
}

TEST_F(DPWorker, ASizeSettingOfZeroMeansTheUsualSize) {
  set("io_buffer_size", 0);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 511}}), 0U);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
}

TEST_F(DPWorker, ASizeSettingMovesTheLimit) {
  set("io_buffer_size", 64);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 63}}), 0U);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 64}}), 1U);
}

TEST_F(DPWorker, ANegativeSizeSettingLetsAMessageWithoutASizePass) {
  set("io_buffer_size", -1);
  EXPECT_EQ(gyresOf({}), 1U);
}

TEST_F(DPWorker, ACycleSettingIsALimitToo) {
  set("io_cycle", 20);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 0U);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}, {"io_cycle", 19}}), 0U);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}, {"io_cycle", 20}}), 1U);
}

TEST_F(DPWorker, WithoutACycleSettingANegativeCycleIsNotCaptured) {
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}, {"io_cycle", -1}}), 0U);
}

TEST_F(DPWorker, ARequestSaysWhoAsksForWhatAndPostsTheNotification) {
  const auto session = startedSession();
  sendOverload(*session, {{"smallest_buffer_frame_size", 1024}, {"HostApplicationDisplayID", "org.example"}});
  ASSERT_EQ(gyres(), 1U);
  const auto& request = platform_.gyre.requests()[0];
  EXPECT_EQ(request.subsystem, "sys.oxbow.tarnkit");
  EXPECT_EQ(request.reason, "AudioOverloads");
  EXPECT_EQ(request.applicationIdentifier, "org.example");
  EXPECT_EQ(request.options, (std::array<std::int32_t, 5>{1, 1, 0, 0, 0}));
  EXPECT_EQ(request.payload["smallest_buffer_frame_size"].asInt64(), 1024);
  EXPECT_EQ(request.payload["audiotag"].text(), "IOError");
  EXPECT_EQ(platform_.notifications.posted(),
            (std::vector<FakeNotificationCenter::Posted>{{"sys.oxbow.tarnkit.dropped-gyre", std::nullopt}}));
  EXPECT_EQ(lines(LogLevel::Info), (Strings{"Interested in overload",
                                            "Dropping gyre " + plist::description(request.payload), "Dropped gyre"}));
}

TEST_F(DPWorker, ThePayloadIsThatOfTheMoment) {
  const auto session = startedSession();
  const auto overload = message({{"smallest_buffer_frame_size", 512}}, AudioEventCategory::IO, AudioEventType::Error);
  session->sendMessage(overload);
  overload->mutableMessage().set("smallest_buffer_frame_size", 1);
  ASSERT_EQ(gyres(), 1U);
  EXPECT_EQ(platform_.gyre.requests()[0].payload["smallest_buffer_frame_size"].asInt64(), 512);
}

TEST_F(DPWorker, ANotificationThatCannotBePostedChangesNothing) {
  platform_.notifications.failPosts(true);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
  EXPECT_EQ(lastLine(LogLevel::Info), "Dropped gyre");
}

TEST_F(DPWorker, RequestsAreMoreThanTenSecondsApart) {
  const auto session = startedSession();
  const plist::Dictionary overload{{"smallest_buffer_frame_size", 512}};
  sendOverload(*session, overload);
  platform_.clock.advance(9999ms);
  sendOverload(*session, overload);
  EXPECT_EQ(gyres(), 1U);
  platform_.clock.advance(1ms);
  sendOverload(*session, overload);
  EXPECT_EQ(gyres(), 1U);
  platform_.clock.advance(500ms);
  sendOverload(*session, overload);
  EXPECT_EQ(gyres(), 2U);
}

TEST_F(DPWorker, AnOverloadThatWasNotCapturedDoesNotPutTheNextOneOff) {
  const auto session = startedSession();
  sendOverload(*session, {{"smallest_buffer_frame_size", 8}});
  sendOverload(*session, {{"smallest_buffer_frame_size", 512}});
  EXPECT_EQ(gyres(), 1U);
}

TEST_F(DPWorker, EachSessionHasItsOwnTenSecondsAndKeepsThemOverAStop) {
  const plist::Dictionary overload{{"smallest_buffer_frame_size", 512}};
  const auto one = startedSession(1);
  const auto other = startedSession(2);
  sendOverload(*one, overload);
  sendOverload(*other, overload);
  EXPECT_EQ(gyres(), 2U);
  one->stop();
  one->start();
  sendOverload(*one, overload);
  EXPECT_EQ(gyres(), 2U);
}

TEST_F(DPWorker, TheReadingOfTheWorkerMadeLastHoldsForAll) {
  const auto first = startedSession(1);
  set("io_buffer_size", 32);
  sendOverload(*first, {{"smallest_buffer_frame_size", 64}});
  EXPECT_EQ(gyres(), 0U);
  const auto second = startedSession(2);
  sendOverload(*first, {{"smallest_buffer_frame_size", 64}});
  EXPECT_EQ(gyres(), 1U);
}

TEST_F(DPWorker, OtherMessagesAreNotOfInterest) {
  const auto session = startedSession();
  platform_.log.clear();
  session->sendMessage(message({{"smallest_buffer_frame_size", 2048}, {"io_cycle", 3}}, AudioEventCategory::Playback,
                               AudioEventType::Error));
  EXPECT_EQ(gyres(), 0U);
  EXPECT_TRUE(lines(LogLevel::Info).empty());
  EXPECT_EQ(lines(LogLevel::Debug),
            (Strings{"Did not drop gyre, right conditions not met: buffer size : 2048, time diff : 1750000000.000000, "
                     "io cycle: 3"}));
}

TEST_F(DPWorker, NeitherIsAnotherTypeNorADomainOfTheCategory) {
  const auto session = startedSession();
  const plist::Dictionary overload{{"smallest_buffer_frame_size", 2048}};
  session->sendMessage(message(overload, AudioEventCategory::IO, AudioEventType::Start));
  session->sendMessage(message(overload, static_cast<AudioEventCategory>(0x20000007U), AudioEventType::Error));
  EXPECT_EQ(gyres(), 0U);
}

TEST_F(DPWorker, AnOverloadTooEarlyTellsTheTimeSinceTheLast) {
  const auto session = startedSession();
  sendOverload(*session, {{"smallest_buffer_frame_size", 512}});
  platform_.clock.advance(10s);
  sendOverload(*session, {{"smallest_buffer_frame_size", 600}});
  EXPECT_EQ(lastLine(LogLevel::Debug),
            "Did not drop gyre, right conditions not met: buffer size : 600, time diff : 10.000000, io cycle: 0");
}

TEST_F(DPWorker, WaitsBeforeTheRequest) {
  set("wait_time", 250000);
  std::size_t waits = 0;
  platform_.conditions.onWait([&](Seconds) {
    EXPECT_EQ(gyres(), waits++);
    platform_.clock.advance(250ms);
    return WaitEnd::TimesOut;
  });
  const double begin = now();
  const auto session = startedSession();
  sendOverload(*session, {{"smallest_buffer_frame_size", 512}});
  EXPECT_EQ(gyres(), 1U);
  EXPECT_EQ(platform_.conditions.timeouts(), (std::vector<Seconds>{250ms}));
  // The ten seconds count from the overload, not from the request after the wait.
  platform_.clock.setEpochSeconds(begin + 10.125);
  sendOverload(*session, {{"smallest_buffer_frame_size", 513}});
  EXPECT_EQ(gyres(), 2U);
}

TEST_F(DPWorker, AWakeBeforeTheTimeWaitsForTheRest) {
  set("wait_time", 250000);
  platform_.conditions.onWait([this](Seconds) {
    platform_.clock.advance(100ms);
    return WaitEnd::Wakes;
  });
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
  EXPECT_EQ(platform_.conditions.timeouts(), (std::vector<Seconds>{250ms, 150ms, 50ms}));
}

TEST_F(DPWorker, NoWaitIsLongerThanTheBound) {
  struct Case {
    plist::Value setting;
    std::vector<Seconds> waits;
  };
  const double kInfinite = std::numeric_limits<double>::infinity();
  for (const Case& row : {Case{{}, {}}, Case{0, {}}, Case{-1e9, {}}, Case{std::nan(""), {}}, Case{-kInfinite, {}},
                          Case{1, {1us}}, Case{0.5, {500ns}}, Case{4'999'999, {4'999'999us}}, Case{5'000'001, {5s}},
                          Case{1e300, {5s}}, Case{kInfinite, {5s}}, Case{"1000 or so", {1ms}}}) {
    set("wait_time", row.setting);
    const std::size_t before = platform_.conditions.timeouts().size();
    EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
    auto waits = platform_.conditions.timeouts();
    waits.erase(waits.begin(), waits.begin() + static_cast<std::ptrdiff_t>(before));
    EXPECT_EQ(waits, row.waits) << plist::description(row.setting);
  }
}

// As an integer of 32 bits, cut toward zero.
double cut(double number) {
  return std::clamp(std::trunc(number), -2147483648.0, 2147483647.0);
}

TEST_F(DPWorker, AnySettingIsReadAsItsKind) {
  for (const auto& [value, number] : oddValues()) {
    set("enable_gyre", value);
    set("io_buffer_size", value);
    set("io_cycle", value);
    set("wait_time", value);
    const auto session = startedSession();
    EXPECT_EQ(session->workerInstanceCount(), number != 0 ? 1U : 0U) << plist::description(value);
    set("enable_gyre", true);
    const double size = cut(number) == 0 ? 512 : cut(number);
    EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", size}, {"io_cycle", cut(number)}}), 1U);
    if (cut(number) > -2147483648.0) {
      EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", size - 1}, {"io_cycle", cut(number)}}), 0U);
      EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", size}, {"io_cycle", cut(number) - 1}}), 0U);
    }
  }
}

TEST_F(DPWorker, AnyValueOfAMessageIsReadAsItsKind) {
  set("io_buffer_size", 100);
  for (const auto& [value, number] : oddValues()) {
    EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", value}}), number >= 100 ? 1U : 0U) << plist::description(value);
    EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 100}, {"io_cycle", value}}), cut(number) >= 0 ? 1U : 0U)
        << plist::description(value);
  }
}

TEST_F(DPWorker, AnApplicationThatIsNoTextIsGivenByItsTextForm) {
  for (const auto& [value, number] : oddValues()) {
    platform_.gyre.clear();
    EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}, {"HostApplicationDisplayID", value}}), 1U);
    EXPECT_EQ(platform_.gyre.requests().at(0).applicationIdentifier, plist::description(value));
  }
}

TEST_F(DPWorker, AStoreThatCannotBeReadMeansNoWorker) {
  platform_.defaults.failReads(true);
  EXPECT_EQ(startedSession()->workerInstanceCount(), 0U);
}

TEST_F(DPWorker, WaitsThenTellsThenAsksThenNotifiesThenTells) {
  set("wait_time", 1000);
  const auto session = startedSession();
  platform_.order.start();
  TarnReportingSessionDPWorker worker(session);
  const auto overload = message({{"smallest_buffer_frame_size", 512}}, AudioEventCategory::IO, AudioEventType::Error);
  worker.handleMessage(overload);
  EXPECT_EQ(platform_.order.entries(),
            (Strings{"log Interested in overload", "wait", "log Dropping gyre {smallest_buffer_frame_size = 512}",
                     "gyre", "post sys.oxbow.tarnkit.dropped-gyre", "log Dropped gyre"}));
}

TEST_F(DPWorker, AnOverloadThatDoesNotCountWaitsForNothing) {
  set("wait_time", 1000);
  const auto session = startedSession();
  platform_.order.start();
  TarnReportingSessionDPWorker(session).handleMessage(
      message({{"smallest_buffer_frame_size", 511}}, AudioEventCategory::IO, AudioEventType::Error));
  EXPECT_EQ(platform_.order.entries(),
            (Strings{"log Interested in overload",
                     "log Did not drop gyre, right conditions not met: buffer size : 511, time diff : "
                     "1750000000.000000, io cycle: 0"}));
}

TEST_F(DPWorker, WithoutAWaitThereIsNoCondition) {
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
  EXPECT_TRUE(platform_.conditions.made().empty());
}

TEST_F(DPWorker, TheFirstOverloadCountsWhateverTheClockSays) {
  platform_.clock.setEpochSeconds(5);
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
}

TEST_F(DPWorker, AWaitThatEndsToTheNanosecondIsOver) {
  set("wait_time", 250000);
  platform_.conditions.onWait([this](Seconds) {
    platform_.clock.advance(125ms);
    return WaitEnd::Wakes;
  });
  EXPECT_EQ(gyresOf({{"smallest_buffer_frame_size", 512}}), 1U);
  EXPECT_EQ(platform_.conditions.timeouts(), (std::vector<Seconds>{250ms, 125ms}));
}

TEST_F(DPWorker, AServiceThatGoesAwayLeavesTheNotification) {
  const auto session = startedSession();
  platform_.facilities().gyre = nullptr;
  sendOverload(*session, {{"smallest_buffer_frame_size", 512}});
  EXPECT_EQ(gyres(), 0U);
  EXPECT_EQ(platform_.notifications.posted().size(), 1U);
  EXPECT_EQ(lastLine(LogLevel::Info), "Dropped gyre");
}

TEST_F(DPWorker, TheSettingsAreOneSuiteOfTheProcess) {
  const TarnReportingDiagnosticDefaults& defaults = TarnReportingSessionDPWorker::getUserDefaults();
  EXPECT_EQ(&TarnReportingSessionDPWorker::getUserDefaults(), &defaults);
  set("io_cycle", 7);
  EXPECT_EQ(defaults.value("io_cycle"), plist::Value(7));
  EXPECT_TRUE(defaults.setValue("other", "written"));
  EXPECT_EQ(platform_.defaults.value(kSuite, "other"), plist::Value("written"));
}

TEST_F(DPWorker, ASettingIsReadAsWhatIsAskedFor) {
  using Worker = TarnReportingSessionDPWorker;
  EXPECT_FALSE(Worker::getEnableFlag("key"));
  EXPECT_EQ(Worker::getRunTimeDefaults("key"), 0);
  EXPECT_EQ(Worker::getDoubleRunTimeDefaults("key"), 0.0);
  EXPECT_TRUE(lines(LogLevel::Debug).empty());
  set("key", -2.75);
  EXPECT_TRUE(Worker::getEnableFlag("key"));
  EXPECT_EQ(Worker::getRunTimeDefaults("key"), -2);
  EXPECT_EQ(Worker::getDoubleRunTimeDefaults("key"), -2.75);
  EXPECT_EQ(lines(LogLevel::Debug), (Strings(3, "Value of key is -2.75")));
}

}  // namespace
}  // namespace tarn
