#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "telemetry/registration/BaseUnit.h"
#include "telemetry/registration/TarnReportingRegistrationState.h"
#include "telemetry/registration/TarnReportingSessionAudioRegistrationWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::AccessoryPart;

constexpr const char* kSuite = "sys.oxbow.tarnkit";
constexpr const char* kNextKey = "AudioRegistrationNextInvocationEpoch";
constexpr const char* kCheckKey = "AudioRegistrationTSEnumerationCheckEpoch";
constexpr const char* kInfoKey = "TSRegistrationInfo";
constexpr const char* kBuds = "speaker, kbdQ ( 0f3e ) ( 7305 ), other";
constexpr double kDay = 86400;
constexpr double kWeek = 604800;

// Accessory queries that note what they are asked: "enumerate", "left 0", "case of 0".
class NotedQueries final : public platform::AccessoryQueries {
 public:
  explicit NotedQueries(std::uint16_t count) : count_(count) {}
  Result<std::uint16_t> enumerate() override {
    asked_.emplace_back("enumerate");
    return {count_, {}};
  }
  bool hasCase(std::uint16_t accessoryIndex) const override {
    asked_.push_back("case of " + std::to_string(accessoryIndex));
    return accessoryIndex == 0;
  }
  plist::Dictionary parameters(AccessoryPart part, std::uint16_t accessoryIndex) const override {
    const char* const name = part == AccessoryPart::Left ? "left " : part == AccessoryPart::Right ? "right " : "case ";
    asked_.push_back(name + std::to_string(accessoryIndex));
    return {};
  }
  const std::vector<std::string>& asked() const noexcept { return asked_; }

 private:
  const std::uint16_t count_;
  mutable std::vector<std::string> asked_;
};

// Earbuds, with their case or without.
FakeAccessoryQueries::Accessory buds(double lastConnected, bool withCase = false) {
  FakeAccessoryQueries::Accessory accessory{
      {AccessoryPart::Left, {{"lastConnectedEpoch", lastConnected}, {"serial", "L"}}},
      {AccessoryPart::Right, {{"lastConnectedEpoch", lastConnected}, {"serial", "R"}}}};
  if (withCase) {
    accessory[AccessoryPart::Case] = {{"lastConnectedEpoch", lastConnected}, {"charge", 80}};
  }
  return accessory;
}

class AudioRegistration : public SessionFixture {
 protected:
  AudioRegistration() { makeWorker(); }

  // One for the session, on the state that all workers of a test share.
  void makeWorker() { worker_ = std::make_unique<TarnReportingSessionAudioRegistrationWorker>(session_, state_); }
  // As after a restart.
  void forgetState() {
    state_ = std::make_shared<TarnReportingRegistrationState>();
    makeWorker();
  }
  void handle(const plist::ValueView& activeDevices) {
    worker_->handleMessage(message({{"active_devices", activeDevices}}));
  }
  // Lays the accessories out and has the worker see them.
  void enumerate(std::vector<FakeAccessoryQueries::Accessory> accessories) {
    for (auto& accessory : accessories) {
      platform_.accessories.add(std::move(accessory));
    }
    handle(kBuds);
    platform_.log.clear();
  }
  // A state in which a publication has been due for a second.
  void makeDue() { platform_.defaults.set(kSuite, kNextKey, now() - 1); }
  double stored(const char* key) const { return platform_.defaults.value(kSuite, key).view().asDouble(); }
  std::vector<std::string> messages() const { return platform_.log.messages(); }
  std::vector<FakeRtcReportingService::Session> backendSessions() const { return platform_.rtcReporting.sessions(); }

  std::shared_ptr<TarnReportingSession> session_ = makeSession(4711);
  std::shared_ptr<TarnReportingRegistrationState> state_ = std::make_shared<TarnReportingRegistrationState>();
  std::unique_ptr<TarnReportingSessionAudioRegistrationWorker> worker_;
};

TEST_F(AudioRegistration, ConstructionForASessionAlwaysFailsAndSaysSo) {
  platform_.log.clear();
  EXPECT_EQ(TarnReportingSessionAudioRegistrationWorker::initWithSession(session_), nullptr);
  const auto entries = platform_.log.entries();
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_EQ(entries[0].message(), "TarnReportingSessionAudioRegistrationWorker unsupported");
  EXPECT_EQ(entries[0].level, platform::LogLevel::Debug);
  EXPECT_EQ(entries[0].category, "tarnrz");
}

TEST_F(AudioRegistration, StartSaysSoAndRuns) {
  platform_.log.clear();
  EXPECT_TRUE(worker_->start());
  EXPECT_TRUE(worker_->started());
  EXPECT_EQ(messages(), (std::vector<std::string>{"Starting TarnReportingSessionAudioRegistrationWorker"}));
}

TEST_F(AudioRegistration, PayloadWithoutTheSignatureChangesNothing) {
  platform_.log.clear();
  worker_->handleMessage(message({{"other", kBuds}}));
  handle("speaker, kbdQ ( 0f3e ) ( 7306 )");
  handle(7);
  handle(plist::Dictionary());
  EXPECT_EQ(platform_.accessories.enumerations(), 0U);
  EXPECT_TRUE(platform_.defaults.writes().empty());
  EXPECT_TRUE(messages().empty());
}

TEST_F(AudioRegistration, FirstSightingEnumeratesAtOnce) {
  platform_.accessories.add(buds(1000, true));
  platform_.log.clear();
  handle(kBuds);
  EXPECT_EQ(messages(),
            (std::vector<std::string>{"Time to next BT Enumeration: 0.000000 seconds / 0.000000 days",
                                      "BTAccess initialize", "BaseUnit initialize", "Enumerate Bluetooth!"}));
  EXPECT_EQ(stored(kCheckKey), now() + 60);
  EXPECT_EQ(
      *state_->registrationInfo(),
      (plist::Dictionary{{"splunk", plist::Array{plist::Dictionary{{"lastConnectedEpoch", 1000.0},
                                                                   {"Left", plist::Dictionary{{"serial", "L"}}},
                                                                   {"Right", plist::Dictionary{{"serial", "R"}}},
                                                                   {"Case", plist::Dictionary{{"charge", 80}}}}}}}));
  EXPECT_EQ(platform_.defaults.value(kSuite, kInfoKey), plist::Value(*state_->registrationInfo()));
}

TEST_F(AudioRegistration, EveryLineHasItsLevelAndItsModule) {
  const auto lines = [this] {
    std::vector<std::string> texts;
    for (const auto& entry : platform_.log.entries()) {
      EXPECT_EQ(entry.category, "tarnrz");
      const bool isDefault = entry.level == platform::LogLevel::Default;
      EXPECT_TRUE(isDefault || entry.level == platform::LogLevel::Debug) << entry.message();
      texts.push_back((isDefault ? "default " : "debug ") + std::string(entry.module) + ": " +
                      entry.message().substr(0, 20));
    }
    platform_.log.clear();
    return texts;
  };
  platform_.accessories.add(buds(now()));
  platform_.log.clear();
  worker_->start();
  handle(kBuds);
  const std::string ours = "TarnReportingSessionAudioRegistrationWorker: ";
  EXPECT_EQ(lines(), (std::vector<std::string>{
                         "debug " + ours + "Starting TarnReporti", "debug " + ours + "Time to next BT Enum",
                         "debug BTAccess: BTAccess initialize", "debug BaseUnit: BaseUnit initialize",
                         "default BaseUnit: Enumerate Bluetooth!"}));
  platform_.defaults.set(kSuite, kNextKey, now() - 1);
  worker_->stop();
  const std::string publication = "TarnReportingRegistrationPublication: ";
  EXPECT_EQ(lines(), (std::vector<std::string>{
                         "debug " + ours + "Stopping TarnReporti", "default " + ours + "Time to next Invocat",
                         "debug " + ours + "We could publish", "debug " + ours + "At least one active ",
                         "debug " + ours + "entering rtcreportin", "default " + publication + "RTCReportingAgent fa",
                         "debug " + publication + "Message Sent->"}));
}

TEST_F(AudioRegistration, EnumerationForgetsWhatTheOneBeforeFound) {
  platform_.accessories.add(buds(1000));
  handle(kBuds);
  platform_.accessories.clear();
  platform_.advance(std::chrono::minutes(2));
  handle(kBuds);
  EXPECT_EQ(*state_->registrationInfo(), plist::Dictionary());
  platform_.accessories.add({{AccessoryPart::Right, {{"serial", "new"}}}});
  platform_.advance(std::chrono::minutes(2));
  handle(kBuds);
  EXPECT_EQ(*state_->registrationInfo(),
            (plist::Dictionary{
                {"splunk", plist::Array{plist::Dictionary{{"Right", plist::Dictionary{{"serial", "new"}}}}}}}));
}

TEST_F(AudioRegistration, RecordsStandInTheOrderOfTheAccessories) {
  platform_.accessories.add({});
  platform_.accessories.add({{AccessoryPart::Left, {{"lastConnectedEpoch", 5}, {"serial", "L"}}}});
  handle(kBuds);
  EXPECT_EQ(
      *state_->registrationInfo(),
      (plist::Dictionary{{"splunk", plist::Array{plist::Dictionary{},
                                                 plist::Dictionary{{"lastConnectedEpoch", 5},
                                                                   {"Left", plist::Dictionary{{"serial", "L"}}}}}}}));
}

TEST_F(AudioRegistration, PartWithoutATimeLeavesThatOfTheOthers) {
  platform_.accessories.add({{AccessoryPart::Left, {{"lastConnectedEpoch", 5}}}, {AccessoryPart::Right, {{"n", 1}}}});
  handle(kBuds);
  EXPECT_EQ(*state_->registrationInfo(),
            (plist::Dictionary{{"splunk", plist::Array{plist::Dictionary{{"lastConnectedEpoch", 5},
                                                                         {"Left", plist::Dictionary{}},
                                                                         {"Right", plist::Dictionary{{"n", 1}}}}}}}));
}

TEST_F(AudioRegistration, BaseUnitWithoutQueriesHasNoDevices) {
  BaseUnit unit(nullptr);
  const auto info = std::make_shared<plist::Dictionary>();
  unit.setRegistrationInfoParams(info);
  EXPECT_EQ(unit.RegistrationInfoParams(), info);
  EXPECT_TRUE(unit.enumerateBluetoothDevices().ok());
  EXPECT_EQ(unit.getDeviceCount(), 0);
  EXPECT_FALSE(unit.isDeviceWithCase(0));
  unit.loadParams(AccessoryPart::Left, 0);
  EXPECT_TRUE(info->empty());
}

TEST_F(AudioRegistration, BaseUnitAsksOnlyForDevicesThatItCounted) {
  platform_.accessories.add(buds(5, true));
  BaseUnit unit(&platform_.accessories);
  const auto info = std::make_shared<plist::Dictionary>();
  unit.setRegistrationInfoParams(info);
  ASSERT_TRUE(unit.enumerateBluetoothDevices().ok());
  EXPECT_EQ(unit.getDeviceCount(), 1);
  EXPECT_TRUE(unit.isDeviceWithCase(0));
  unit.loadParams(AccessoryPart::Left, 1);
  EXPECT_TRUE(info->empty());
  EXPECT_EQ(platform_.accessories.askedFor(), (std::vector<std::uint16_t>{}));
  unit.loadParams(AccessoryPart::Left, 0);
  EXPECT_EQ((*info)["splunk"].array().size(), 1U);
}

TEST_F(AudioRegistration, EachAccessoryIsAskedForItsLeftItsRightAndItsCaseOnce) {
  NotedQueries queries(2);
  platform_.facilities().accessories = &queries;
  handle(kBuds);
  EXPECT_EQ(queries.asked(), (std::vector<std::string>{"enumerate", "left 0", "right 0", "case of 0", "case 0",
                                                       "left 1", "right 1", "case of 1"}));
}

TEST_F(AudioRegistration, StartIsToldBeforeTheWorkerRuns) {
  std::vector<bool> running;
  platform_.order.start([&](const std::string& entry) {
    if (entry == "log Starting TarnReportingSessionAudioRegistrationWorker") {
      running.push_back(worker_->started());
    }
  });
  worker_->start();
  EXPECT_EQ(running, (std::vector<bool>{false}));
}

TEST_F(AudioRegistration, MinuteAndDayCountFromTheEndOfTheEnumeration) {
  platform_.accessories.onEnumerate([this] { platform_.clock.advance(std::chrono::seconds(7)); });
  const double before = now();
  handle(kBuds);
  EXPECT_EQ(stored(kCheckKey), before + 7 + 60);
  platform_.advance(std::chrono::minutes(2));
  platform_.accessories.failEnumeration(Error{5, "radio is off"});
  const double again = now();
  handle(kBuds);
  EXPECT_EQ(stored(kCheckKey), again + 7 + kDay);
}

TEST_F(AudioRegistration, MomentOfTheNextEnumerationIsStoredBeforeTheInfo) {
  handle(kBuds);
  const auto writes = platform_.defaults.writes();
  ASSERT_EQ(writes.size(), 2U);
  EXPECT_EQ(writes[0].key, kCheckKey);
  EXPECT_EQ(writes[1].key, kInfoKey);
  platform_.advance(std::chrono::minutes(2));
  platform_.accessories.failEnumeration(Error{5, "radio is off"});
  handle(kBuds);
  ASSERT_EQ(platform_.defaults.writes().size(), 3U);
  EXPECT_EQ(platform_.defaults.writes()[2].key, kCheckKey);
}

TEST_F(AudioRegistration, MomentsAreLoadedOnce) {
  handle(kBuds);
  platform_.defaults.set(kSuite, kCheckKey, now() + kDay);
  platform_.advance(std::chrono::seconds(60));
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 2U);
  platform_.defaults.set(kSuite, kNextKey, now() + 10);
  EXPECT_EQ(state_->nextInvocationEpoch(), now() + 10);
  platform_.defaults.set(kSuite, kNextKey, now() + 20);
  EXPECT_EQ(state_->nextInvocationEpoch(), now() + 10);
}

TEST_F(AudioRegistration, PublicationIsNotRepeatedAtTheNextStop) {
  platform_.rtcReporting.setBackends(std::nullopt);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(messages().back(), "Time to next Invocation: 86400.000000 seconds / 1.000000 days");
  EXPECT_EQ(backendSessions().size(), 1U);
}

TEST_F(AudioRegistration, WeekCountsFromTheMomentOfTheSending) {
  platform_.rtcReporting.completions().set(ReplyFault::Hold);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  platform_.advance(std::chrono::hours(3));
  platform_.rtcReporting.completions().deliverHeld();
  EXPECT_EQ(stored(kNextKey), now() + kWeek);
}

TEST_F(AudioRegistration, TimestampOfARecordIsSent) {
  worker_->setupRTCReporterInterface({plist::Dictionary{{"tarnreporting_timestamp", 5}, {"n", 1}}});
  ASSERT_EQ(backendSessions().size(), 1U);
  ASSERT_EQ(backendSessions()[0].messages.size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages[0].payload, (plist::Dictionary{{"tarnreporting_timestamp", 5}, {"n", 1}}));
}

TEST_F(AudioRegistration, CategoryIsCutToItsLowHalf) {
  const auto category = TarnReportingSessionAudioRegistrationWorker::retrieveRTCReportingCategoryFromCategory;
  EXPECT_EQ(category(AudioEventCategory{0x10000005}), 5);
  EXPECT_EQ(category(AudioEventCategory{0xFFFFFFFF}), 0xFFFF);
  worker_->setupRTCReporterInterface({});
  worker_->_sendMessage(*message({{"n", 1}}, AudioEventCategory{0x10000005}, AudioEventType{65535}));
  ASSERT_EQ(backendSessions().size(), 1U);
  ASSERT_EQ(backendSessions()[0].messages.size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages[0].category, 5);
  EXPECT_EQ(backendSessions()[0].messages[0].type, 65535);
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Default, "} : category 268435461 : type 65535"));
}

TEST_F(AudioRegistration, NothingIsSentWithoutABackendSession) {
  worker_->_sendMessage(*message({{"n", 1}}));
  platform_.rtcReporting.setMakesSessions(false);
  worker_->setupRTCReporterInterface({});
  worker_->_sendMessage(*message({{"n", 1}}));
  EXPECT_TRUE(backendSessions().empty());
  EXPECT_TRUE(platform_.defaults.writes().empty());
}

TEST_F(AudioRegistration, SignatureInsideAListOfDevicesCounts) {
  handle(plist::Array{"speaker", "kbdQ ( 0f3e ) ( 7305 )"});
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
}

TEST_F(AudioRegistration, EnumeratesAtMostOnceAMinute) {
  handle(kBuds);
  platform_.advance(std::chrono::seconds(59));
  platform_.log.clear();
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
  EXPECT_EQ(messages(), (std::vector<std::string>{"Time to next BT Enumeration: 1.000000 seconds / 0.000012 days"}));
  platform_.advance(std::chrono::seconds(1));
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 2U);
}

TEST_F(AudioRegistration, AccessoryReaderIsMadeOnceForAllWorkers) {
  handle(kBuds);
  platform_.advance(std::chrono::minutes(2));
  makeWorker();
  handle(kBuds);
  EXPECT_EQ(platform_.log.count("BTAccess initialize"), 1U);
  EXPECT_EQ(platform_.log.count("BaseUnit initialize"), 1U);
  EXPECT_EQ(platform_.log.count("Enumerate Bluetooth!"), 2U);
}

TEST_F(AudioRegistration, CheckOutlivesARestart) {
  handle(kBuds);
  forgetState();
  platform_.advance(std::chrono::seconds(30));
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
}

TEST_F(AudioRegistration, FailedEnumerationWaitsForADayAndKeepsTheInfo) {
  handle(kBuds);
  const auto before = state_->registrationInfo();
  platform_.advance(std::chrono::minutes(2));
  platform_.accessories.failEnumeration(Error{5, "radio is off"});
  platform_.log.clear();
  handle(kBuds);
  EXPECT_EQ(messages().back(), "Exception in BT gatherData : radio is off");
  EXPECT_EQ(stored(kCheckKey), now() + kDay);
  EXPECT_EQ(state_->registrationInfo(), before);
}

TEST_F(AudioRegistration, PlatformWithoutAccessoryQueriesFindsNothing) {
  platform_.facilities().accessories = nullptr;
  handle(kBuds);
  EXPECT_EQ(state_->registrationInfo(), plist::Dictionary());
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(messages(), (std::vector<std::string>{"Stopping TarnReportingSessionAudioRegistrationWorker",
                                                  "There have been no BT enumerations. Skip further processing"}));
}

TEST_F(AudioRegistration, StopBeforeAnyEnumerationEnds) {
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(messages(), (std::vector<std::string>{"Stopping TarnReportingSessionAudioRegistrationWorker",
                                                  "There have been no BT enumerations. Skip further processing"}));
  EXPECT_TRUE(platform_.defaults.writes().empty());
}

TEST_F(AudioRegistration, FirstEverStopSchedulesWithinAWeek) {
  enumerate({buds(now())});
  platform_.randomSource.push(604799);
  worker_->stop();
  EXPECT_EQ(platform_.randomSource.bounds(), (std::vector<std::uint64_t>{604800}));
  EXPECT_EQ(stored(kNextKey), now() + 604799);
  EXPECT_EQ(messages().back(), "Current Epoch: 1750000000.000000; nextInvocationEpoch is 1750604799.000000");
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, ScheduleOutlivesARestart) {
  platform_.defaults.set(kSuite, kNextKey, now() + 43200);
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(messages(), (std::vector<std::string>{"Stopping TarnReportingSessionAudioRegistrationWorker",
                                                  "Time to next Invocation: 43200.000000 seconds / 0.500000 days"}));
  EXPECT_TRUE(platform_.randomSource.bounds().empty());
}

TEST_F(AudioRegistration, NothingIsDueAtTheVeryMoment) {
  platform_.defaults.set(kSuite, kNextKey, now());
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(platform_.log.count("We could publish"), 0U);
  platform_.advance(std::chrono::milliseconds(1));
  worker_->stop();
  EXPECT_EQ(platform_.log.count("We could publish"), 1U);
}

TEST_F(AudioRegistration, PublishesARecordForEachRecentAccessory) {
  platform_.localCalendar.setSecondsEastOfUtc(3600);
  session_->updateConfigurationWithContentsOfConfiguration(nullptr);
  const plist::Dictionary configuration{
      {"HostApplicationDisplayID", "org.example.player"}, {"serviceName", "mine"}, {"extra", 5}};
  session_->updateConfigurationWithContentsOfConfiguration(&configuration);
  makeDue();
  enumerate({buds(now() - 60), buds(now() - 9 * kDay), buds(now() - kDay)});
  worker_->stop();

  ASSERT_EQ(backendSessions().size(), 1U);
  const auto backend = backendSessions()[0];
  EXPECT_EQ(backend.sessionInfo, (plist::Dictionary{{"clientType", 52},
                                                    {"clientVersion", 2.1F},
                                                    {"sessionID", 4711},
                                                    {"batchEvent", false},
                                                    {"hierarchyToken", "token-1"},
                                                    {"clientBundleID", "org.example.player"}}));
  EXPECT_EQ(backend.userInfo, (plist::Dictionary{{"clientName", "Tessels_Telemetry"},
                                                 {"serviceName", "mine"},
                                                 {"HostApplicationDisplayID", "org.example.player"},
                                                 {"extra", 5}}));
  EXPECT_FALSE(backend.frameworksToCheck);
  ASSERT_EQ(backend.messages.size(), 2U);
  EXPECT_EQ(backend.messages[0].category, 17);
  EXPECT_EQ(backend.messages[0].type, 11);
  // 2025-06-15, a Sunday, is the 166th day of a year that began on a Wednesday.
  EXPECT_EQ(backend.messages[0].payload, (plist::Dictionary{{"Left", plist::Dictionary{{"serial", "L"}}},
                                                            {"Right", plist::Dictionary{{"serial", "R"}}},
                                                            {"lastConnectedWW", 25}}));
  EXPECT_EQ(backend.flushes, 0U);
  EXPECT_FALSE(backend.released);
  EXPECT_TRUE(worker_->rtcReportingSessionStarted());
  EXPECT_EQ(stored(kNextKey), now() + kWeek);
  EXPECT_EQ(platform_.log.count("Let's publish to RTC!"), 1U);
  EXPECT_EQ(platform_.log.count("entering rtcreporting setupRTCReporterInterface"), 1U);
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Default, "RTCReportingAgent fake session 1 : message {"));
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Default, "} : category 17 : type 11"));
  EXPECT_EQ(messages().back(), "Message Sent->");
}

TEST_F(AudioRegistration, SessionWithoutConfigurationAnnouncesTheWorkersOwnNames) {
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  ASSERT_EQ(backendSessions().size(), 1U);
  EXPECT_FALSE(backendSessions()[0].sessionInfo.contains("clientBundleID"));
  EXPECT_EQ(backendSessions()[0].userInfo,
            (plist::Dictionary{{"clientName", "Tessels_Telemetry"}, {"serviceName", "Tessels_Registration"}}));
}

TEST_F(AudioRegistration, RecordOfExactlyEightDaysAgoIsKeptAndOneSecondOlderIsDropped) {
  makeDue();
  enumerate({buds(now() - 8 * kDay - 1), buds(now() - 8 * kDay), buds(now() - 8 * kDay + 1)});
  worker_->stop();
  ASSERT_EQ(backendSessions().size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages.size(), 2U);
}

TEST_F(AudioRegistration, WithoutARecentAccessoryTheNextCheckIsInAWeek) {
  makeDue();
  enumerate({buds(now() - 30 * kDay)});
  worker_->stop();
  EXPECT_EQ(messages().back(),
            "No active Bud connections detected since last publish. Skip publishing anything; check again after "
            "SamplingPeriod");
  EXPECT_EQ(stored(kNextKey), now() + kWeek);
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, WrongKindsInTheInfoAreReadAsTheyCan) {
  makeDue();
  enumerate({{{AccessoryPart::Left, {{"lastConnectedEpoch", std::to_string(static_cast<std::int64_t>(now()))}}}},
             {{AccessoryPart::Left, {{"serial", "no time"}}}},
             {{AccessoryPart::Left, {{"lastConnectedEpoch", plist::Array{1}}}}},
             // Read as 32 bits without a sign, this is now.
             {{AccessoryPart::Left, {{"lastConnectedEpoch", static_cast<std::int64_t>(now()) + (1LL << 32)}}}}});
  worker_->stop();
  ASSERT_EQ(backendSessions().size(), 1U);
  EXPECT_EQ(backendSessions()[0].messages.size(), 2U);
}

TEST_F(AudioRegistration, WithoutATokenTheCheckRepeatsTheNextDay) {
  platform_.rtcReporting.setHandsOutTokens(false);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  const auto errors = platform_.log.entries(platform::LogLevel::Error);
  ASSERT_EQ(errors.size(), 1U);
  EXPECT_EQ(errors[0].message(),
            "newHierarchyTokenFromParentToken returned nil. Will skip rtc for this session. setupRTCReporterInterface");
  EXPECT_EQ(stored(kNextKey), now() + kDay);
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, PlatformWithoutTheBackendCountsAsWithoutAToken) {
  platform_.facilities().rtcReporting = nullptr;
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(platform_.log.count("newHierarchyTokenFromParentToken returned nil"), 1U);
}

TEST_F(AudioRegistration, SessionThatCannotBeMadeIsNoHarm) {
  platform_.rtcReporting.setMakesSessions(false);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_FALSE(worker_->rtcReportingSessionStarted());
  EXPECT_EQ(stored(kNextKey), now() + kDay);
}

TEST_F(AudioRegistration, WithoutBackendsNothingIsSent) {
  platform_.rtcReporting.setBackends(std::nullopt);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_TRUE(backendSessions()[0].messages.empty());
  EXPECT_FALSE(worker_->rtcReportingSessionStarted());
  EXPECT_TRUE(platform_.log.contains(platform::LogLevel::Error,
                                     "no backends found, this session won't get sent to the server"));
  EXPECT_EQ(platform_.log.count("Message Sent->"), 0U);
  EXPECT_EQ(stored(kNextKey), now() + kDay);
}

TEST_F(AudioRegistration, AnEmptyListOfBackendsIsOneAllTheSame) {
  platform_.rtcReporting.setBackends(std::vector<std::string>{});
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(backendSessions()[0].messages.size(), 1U);
}

TEST_F(AudioRegistration, RefusedMessageIsLoggedAndNotRepeated) {
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{false, Error{3, "too large"}});
  makeDue();
  enumerate({buds(now()), buds(now())});
  worker_->stop();
  EXPECT_EQ(backendSessions()[0].attempts, 2U);
  EXPECT_EQ(platform_.log.count("error sending message too large"), 2U);
  EXPECT_EQ(stored(kNextKey), now() + kDay);
}

TEST_F(AudioRegistration, MessageThatFailsWithoutAnErrorFailsSilently) {
  platform_.rtcReporting.refuseMessages(platform::RtcReportingSession::SendResult{false, {}});
  makeDue();
  enumerate({buds(now())});
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(platform_.log.count("error sending message"), 0U);
  EXPECT_EQ(platform_.log.count("RTCReportingAgent"), 0U);
}

TEST_F(AudioRegistration, CompletionThatOutlivesTheWorkerStillSends) {
  platform_.rtcReporting.completions().set(ReplyFault::Hold);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  worker_.reset();
  session_.reset();
  platform_.rtcReporting.completions().deliverHeld();
  EXPECT_EQ(backendSessions()[0].messages.size(), 1U);
}

TEST_F(AudioRegistration, CompletionThatNeverComesLeavesTheCheckToTheNextDay) {
  platform_.rtcReporting.completions().set(ReplyFault::Drop);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(stored(kNextKey), now() + kDay);
  worker_.reset();
  EXPECT_TRUE(backendSessions()[0].released);
}

TEST_F(AudioRegistration, CompletionThatComesTwiceSendsTwice) {
  platform_.rtcReporting.completions().set(ReplyFault::Twice);
  makeDue();
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(backendSessions()[0].messages.size(), 2U);
}

TEST_F(AudioRegistration, CompletionOnAnotherThreadMeetsTheWorkersEnd) {
  platform_.rtcReporting.completions().set(ReplyFault::OtherThread);
  for (int i = 0; i < 50; ++i) {
    platform_.defaults.set(kSuite, kNextKey, now() - 1);
    state_ = std::make_shared<TarnReportingRegistrationState>();
    makeWorker();
    platform_.defaults.set(kSuite, kCheckKey, 0);
    if (i == 0) {
      platform_.accessories.add(buds(now()));
    }
    handle(kBuds);
    worker_->stop();
    worker_.reset();
    platform_.rtcReporting.completions().joinThreads();  // before the next round sets what it stores
  }
  for (const auto& backend : backendSessions()) {
    EXPECT_EQ(backend.messages.size(), 1U);
  }
  EXPECT_EQ(backendSessions().size(), 50U);
}

TEST_F(AudioRegistration, WorkerWithoutASessionPublishesNothing) {
  makeDue();
  enumerate({buds(now())});
  session_.reset();
  worker_->stop();
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, DefaultsOfOtherKindsAreReadAsNumbers) {
  platform_.defaults.set(kSuite, kNextKey, "1750000000.5 or so");
  platform_.defaults.set(kSuite, kCheckKey, plist::Array{1, 2});
  enumerate({buds(now())});
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
  worker_->stop();
  EXPECT_EQ(messages().back(), "Time to next Invocation: 0.500000 seconds / 0.000006 days");
}

TEST_F(AudioRegistration, StoreThatCannotBeWrittenIsLoggedAndTheProcessGoesOn) {
  platform_.defaults.failWrites(true);
  handle(kBuds);
  const auto errors = platform_.log.entries(platform::LogLevel::Error);
  ASSERT_EQ(errors.size(), 2U);
  EXPECT_EQ(errors[0].message(), "failed to store " + std::string(kCheckKey));
  EXPECT_EQ(errors[1].message(), "failed to store " + std::string(kInfoKey));
  EXPECT_EQ(errors[0].module, "TarnReportingRegistrationState");
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
}

TEST_F(AudioRegistration, WorkWeekOfTheEpochIsOneEastOfGreenwichAndOne) {
  EXPECT_EQ(TarnReportingSessionAudioRegistrationWorker::_convertEpochToWorkWeek(0), 1);
  platform_.localCalendar.setSecondsEastOfUtc(14 * 3600);
  EXPECT_EQ(TarnReportingSessionAudioRegistrationWorker::_convertEpochToWorkWeek(0), 1);
}

TEST_F(AudioRegistration, WorkWeekWrapsAtThirtyTwoBits) {
  using Worker = TarnReportingSessionAudioRegistrationWorker;
  EXPECT_EQ(Worker::_convertEpochToWorkWeek((1LL << 32) + 8 * 86400), Worker::_convertEpochToWorkWeek(8 * 86400));
  EXPECT_EQ(Worker::_convertEpochToWorkWeek(-1), Worker::_convertEpochToWorkWeek((1LL << 32) - 1));
  EXPECT_EQ(Worker::_convertEpochToWorkWeek("691200 or so"), 2);
}

}  // namespace
}  // namespace tarn
