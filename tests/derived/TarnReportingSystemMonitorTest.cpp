// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSystemMonitor.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

using namespace std::chrono_literals;
using platform::LogLevel;

constexpr const char* kAccessory = "spatial-audio-accessory-feature";
constexpr const char* kAccessoryChanged = "sys.oxbow.homeshell.spatial-audio-accessory-feature.changed";
constexpr const char* kHomeshell = "sys.oxbow.homeshell";
constexpr const char* kTarnkit = "sys.oxbow.tarnkit";
constexpr const char* kServiceChanged = "sys.oxbow.tarnkit.reporting";
constexpr const char* kRinger = "ringerstate";
constexpr const char* kRingerChanged = "sys.oxbow.homeshell.ringerstate";

class TarnReportingSystemMonitorTest : public ::testing::Test {
 protected:
  void start() { TarnReportingSystemMonitor::initializeWithQueue(TarnReportingUtilityGetReportingServerQueue()); }
  plist::Dictionary state(const char* feature) {
    return TarnReportingSystemMonitor::getSystemMonitorDictionary()->state(feature);
  }
  void post(const char* notification, std::optional<std::uint64_t> word = {}) {
    ASSERT_TRUE(platform_.notifications.post(notification, word));
    platform_.runUntilIdle();
  }
  // Counts the changes of a feature.
  void observe(const char* feature) {
    static_cast<void>(TarnReportingSystemMonitor::getSystemMonitorDictionary()->addObserver(
        feature, [this](const plist::Key& key) { changes_.emplace_back(key.text()); }));
  }

  testing::FakePlatform platform_;
  std::vector<std::string> changes_;
};

TEST_F(TarnReportingSystemMonitorTest, ReadsEachPreferenceOnceAtCreation) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  platform_.defaults.set(kTarnkit, "device_name", "Kitchen");
  platform_.clock.setEpochSeconds(1700000000.5);
  platform_.clock.setSystemUptimeSeconds(99.9);
  start();
  EXPECT_EQ(
      state(kAccessory),
      (plist::Dictionary{{kAccessory, true}, {"tarnreporting_timestamp", 1700000000.5}, {"systemuptime_sec", 99}}));
  EXPECT_EQ(state("device_name").get("device_name").text(), "Kitchen");
  using Read = testing::FakeDefaultsStore::PreferenceRead;
  EXPECT_EQ(platform_.defaults.preferenceReads(),
            (std::vector<Read>{{kAccessory, kHomeshell, "mobile"}, {"device_name", kTarnkit, "mobile"}}));
}

TEST_F(TarnReportingSystemMonitorTest, StateStampsAreSecondsAndWholeSeconds) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  start();
  EXPECT_EQ(state(kAccessory).get("tarnreporting_timestamp").kind(), plist::Kind::Double);
  EXPECT_EQ(state(kAccessory).get("systemuptime_sec").kind(), plist::Kind::Signed);
}

TEST_F(TarnReportingSystemMonitorTest, PreferenceKeepsWhateverTypeItHas) {
  const plist::Dictionary value{{"left", 1}, {"right", plist::Array{1, 2}}};
  platform_.defaults.set(kHomeshell, kAccessory, value);
  start();
  EXPECT_EQ(state(kAccessory).get(kAccessory).dictionary(), value);
}

TEST_F(TarnReportingSystemMonitorTest, AbsentPreferenceLeavesTheFeatureOutOfTheDictionary) {
  start();
  EXPECT_TRUE(TarnReportingSystemMonitor::getSystemMonitorDictionary()->states().empty());
}

TEST_F(TarnReportingSystemMonitorTest, KeysAreTheThreeFeatures) {
  start();
  EXPECT_EQ(TarnReportingSystemMonitor::getSystemMonitorKeys(),
            (std::vector<plist::Key>{kAccessory, "device_name", kRinger}));
}

TEST_F(TarnReportingSystemMonitorTest, RegistersForEachNotificationAndKeepsTheToken) {
  const auto monitor = TarnReportingSystemMonitor::initWithQueue(TarnReportingUtilityGetReportingServerQueue());
  EXPECT_EQ(platform_.notifications.registeredNames(),
            (std::vector<std::string>{kAccessoryChanged, kServiceChanged, kRingerChanged}));
  EXPECT_EQ(monitor->features(), (plist::Dictionary{{kAccessory, plist::Dictionary{{"feature_domain", kAccessory},
                                                                                   {"defaults_domain", kHomeshell},
                                                                                   {"notification", kAccessoryChanged},
                                                                                   {"notify_token", 1}}},
                                                    {"device_name", plist::Dictionary{{"feature_domain", "device_name"},
                                                                                      {"defaults_domain", kTarnkit},
                                                                                      {"notification", kServiceChanged},
                                                                                      {"notify_token", 2}}},
                                                    {kRinger, plist::Dictionary{{"feature_domain", kRinger},
                                                                                {"notification", kRingerChanged},
                                                                                {"notify_token", 3}}}}));
}

TEST_F(TarnReportingSystemMonitorTest, RingerIsUnknownUntilItsFirstNotification) {
  platform_.notifications.setState(kRingerChanged, 1);
  start();
  EXPECT_TRUE(state(kRinger).empty());
  post(kRingerChanged);
  EXPECT_EQ(state(kRinger).get(kRinger), plist::ValueView(true));
}

TEST_F(TarnReportingSystemMonitorTest, RingerReadsTrueOnlyForTheStateWordOne) {
  start();
  for (const std::uint64_t word : {std::uint64_t{0}, std::uint64_t{1}, std::uint64_t{2}, UINT64_MAX}) {
    post(kRingerChanged, word);
    EXPECT_EQ(state(kRinger).get(kRinger).kind(), plist::Kind::Bool);
    EXPECT_EQ(state(kRinger).get(kRinger).boolValue(), word == 1) << word;
  }
}

TEST_F(TarnReportingSystemMonitorTest, RingerThatCannotBeReadHasNoState) {
  start();
  platform_.notifications.failReads(true);
  post(kRingerChanged, 1);
  EXPECT_TRUE(state(kRinger).empty());
}

TEST_F(TarnReportingSystemMonitorTest, FailedReadKeepsTheStateThatIsStored) {
  start();
  post(kRingerChanged, 1);
  platform_.notifications.failReads(true);
  post(kRingerChanged, 0);
  EXPECT_TRUE(state(kRinger).get(kRinger).boolValue());
}

TEST_F(TarnReportingSystemMonitorTest, RemovedPreferenceKeepsTheStateThatIsStored) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  start();
  platform_.defaults.set(kHomeshell, kAccessory, {});
  post(kAccessoryChanged);
  EXPECT_TRUE(state(kAccessory).get(kAccessory).boolValue());
}

TEST_F(TarnReportingSystemMonitorTest, ChangedPreferenceIsStoredAndObserved) {
  platform_.defaults.set(kHomeshell, kAccessory, false);
  start();
  observe(kAccessory);
  platform_.defaults.set(kHomeshell, kAccessory, true);
  platform_.advance(10s);
  post(kAccessoryChanged);
  EXPECT_TRUE(state(kAccessory).get(kAccessory).boolValue());
  EXPECT_EQ(state(kAccessory).get("tarnreporting_timestamp").asDouble(), platform_.clock.epochSeconds());
  EXPECT_EQ(changes_, std::vector<std::string>{kAccessory});
}

TEST_F(TarnReportingSystemMonitorTest, NotificationWithAnEqualStateChangesNothing) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  start();
  observe(kAccessory);
  const plist::Dictionary before = state(kAccessory);
  platform_.clock.setSystemUptimeSeconds(5000);
  platform_.advance(10s);
  post(kAccessoryChanged);
  EXPECT_EQ(state(kAccessory), before);
  EXPECT_TRUE(changes_.empty());
  EXPECT_FALSE(platform_.log.contains("Updating value"));
}

TEST_F(TarnReportingSystemMonitorTest, DeviceNameFollowsTheServicesOwnNotification) {
  start();
  observe("device_name");
  platform_.defaults.set(kTarnkit, "device_name", "Studio");
  post(kServiceChanged);
  EXPECT_EQ(state("device_name").get("device_name").text(), "Studio");
  EXPECT_EQ(changes_, std::vector<std::string>{"device_name"});
}

TEST_F(TarnReportingSystemMonitorTest, NotificationsAreHandledOnTheQueue) {
  start();
  ASSERT_TRUE(platform_.notifications.post(kRingerChanged, 1));
  EXPECT_TRUE(state(kRinger).empty());
  bool onQueue = false;
  static_cast<void>(TarnReportingSystemMonitor::getSystemMonitorDictionary()->addObserver(
      kRinger, [&](const plist::Key&) { onQueue = TarnReportingUtilityGetReportingServerQueue()->isCurrent(); }));
  platform_.runUntilIdle();
  EXPECT_TRUE(onQueue);
}

TEST_F(TarnReportingSystemMonitorTest, ObserverFindsTheNewStateAndMayAskFromAnotherThread) {
  start();
  const auto dictionary = TarnReportingSystemMonitor::getSystemMonitorDictionary();
  bool seen = false;
  static_cast<void>(dictionary->addObserver(kRinger, [&](const plist::Key& key) {
    std::thread other([&] { seen = dictionary->state(key).get(kRinger).boolValue(); });
    other.join();
  }));
  post(kRingerChanged, 1);
  EXPECT_TRUE(seen);
}

TEST_F(TarnReportingSystemMonitorTest, LogsItsCreationStepByStep) {
  TarnReportingSystemMonitor::initializeWithQueue(TarnReportingUtilityGetReportingServerQueue());
  const std::string features =
      "{spatial-audio-accessory-feature = {feature_domain = spatial-audio-accessory-feature; defaults_domain = "
      "sys.oxbow.homeshell; notification = sys.oxbow.homeshell.spatial-audio-accessory-feature.changed}; device_name = "
      "{feature_domain = device_name; defaults_domain = sys.oxbow.tarnkit; notification = "
      "sys.oxbow.tarnkit.reporting}; ringerstate = {feature_domain = ringerstate; notification = "
      "sys.oxbow.homeshell.ringerstate}}";
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{
                "populateInitialValues " + features, "getting feature spatial-audio-accessory-feature",
                "getting feature device_name", "getting feature ringerstate", "listening for features " + features,
                "notify setup result 0 token 1", "notify setup result 0 token 2", "notify setup result 0 token 3"}));
  std::vector<LogLevel> levels;
  for (const auto& entry : platform_.log.entries()) {
    levels.push_back(entry.level);
    EXPECT_EQ(entry.module, "TarnReportingSystemMonitor");
    EXPECT_EQ(entry.category, "tarnrs");
  }
  using enum LogLevel;
  EXPECT_EQ(levels, (std::vector<LogLevel>{Info, Default, Default, Default, Info, Default, Default, Default}));
}

TEST_F(TarnReportingSystemMonitorTest, LogsAChangeStepByStep) {
  start();
  platform_.log.clear();
  post(kRingerChanged, 1);
  const auto entries = platform_.log.entries();
  ASSERT_EQ(entries.size(), 3U);
  EXPECT_EQ(entries[0].message(), "feature changes featureName=ringerstate token=3");
  EXPECT_EQ(entries[0].level, LogLevel::Info);
  EXPECT_EQ(entries[1].message(), "getting feature ringerstate");
  EXPECT_EQ(entries[1].level, LogLevel::Default);
  EXPECT_EQ(entries[2].message(), "Updating value featureName=ringerstate");
  EXPECT_EQ(entries[2].level, LogLevel::Debug);
}

TEST_F(TarnReportingSystemMonitorTest, FailedRegistrationIsOnlyLogged) {
  platform_.notifications.failNextRegistration(7);
  start();
  EXPECT_TRUE(platform_.log.contains(LogLevel::Default, "notify setup result 7 token -1"));
  EXPECT_EQ(platform_.notifications.registeredNames(), (std::vector<std::string>{kServiceChanged, kRingerChanged}));
  TarnReportingSystemMonitor::reset();
  EXPECT_EQ(platform_.notifications.cancelledTokens(), (std::vector<std::int32_t>{1, 2}));
}

TEST_F(TarnReportingSystemMonitorTest, UnknownAndEmptyFeatureNamesHaveNoState) {
  const auto monitor = TarnReportingSystemMonitor::initWithQueue(TarnReportingUtilityGetReportingServerQueue());
  platform_.log.clear();
  EXPECT_TRUE(monitor->getFeatureState("loudness").empty());
  EXPECT_TRUE(monitor->getFeatureState("").empty());
  EXPECT_EQ(platform_.log.messages(), (std::vector<std::string>{"getting feature loudness", "getting feature "}));
}

TEST_F(TarnReportingSystemMonitorTest, AbsentDisableReportingYieldsZero) {
  EXPECT_EQ(TarnReportingSystemMonitor::TarnReportingDefaults(), (plist::Dictionary{{"disable_reporting", 0}}));
}

TEST_F(TarnReportingSystemMonitorTest, DefaultsHoldTheDeviceNameAndTheSwitch) {
  platform_.defaults.set(kTarnkit, "device_name", "Studio");
  platform_.defaults.set(kTarnkit, "disable_reporting", true);
  EXPECT_EQ(TarnReportingSystemMonitor::TarnReportingDefaults(),
            (plist::Dictionary{{"device_name", "Studio"}, {"disable_reporting", true}}));
}

TEST_F(TarnReportingSystemMonitorTest, DefaultsReadTextAndBooleanOffOtherKinds) {
  platform_.defaults.set(kTarnkit, "device_name", 12);
  platform_.defaults.set(kTarnkit, "disable_reporting", "1");
  EXPECT_EQ(TarnReportingSystemMonitor::TarnReportingDefaults(),
            (plist::Dictionary{{"device_name", "12"}, {"disable_reporting", true}}));
}

TEST_F(TarnReportingSystemMonitorTest, DefaultsLeaveOutADeviceNameThatIsNoText) {
  platform_.defaults.set(kTarnkit, "device_name", plist::Dictionary{{"name", "Studio"}});
  EXPECT_EQ(TarnReportingSystemMonitor::TarnReportingDefaults(), (plist::Dictionary{{"disable_reporting", 0}}));
}

TEST_F(TarnReportingSystemMonitorTest, InstanceKeepsTheDefaultsOfItsCreation) {
  const auto monitor = TarnReportingSystemMonitor::initWithQueue(TarnReportingUtilityGetReportingServerQueue());
  platform_.defaults.set(kTarnkit, "disable_reporting", true);
  EXPECT_EQ(monitor->getDefaults(), (plist::Dictionary{{"disable_reporting", 0}}));
}

TEST_F(TarnReportingSystemMonitorTest, WithoutAnInstanceThereIsNoDictionaryAndNoKey) {
  EXPECT_EQ(TarnReportingSystemMonitor::getSystemMonitorDictionary(), nullptr);
  EXPECT_TRUE(TarnReportingSystemMonitor::getSystemMonitorKeys().empty());
  TarnReportingSystemMonitor::reset();
  EXPECT_TRUE(platform_.notifications.cancelledTokens().empty());
}

TEST_F(TarnReportingSystemMonitorTest, SecondInitializationKeepsTheInstance) {
  start();
  const auto dictionary = TarnReportingSystemMonitor::getSystemMonitorDictionary();
  start();
  EXPECT_EQ(TarnReportingSystemMonitor::getSystemMonitorDictionary(), dictionary);
  EXPECT_EQ(platform_.notifications.registeredNames().size(), 3U);
}

TEST_F(TarnReportingSystemMonitorTest, ResetCancelsEveryRegistrationAndDropsTheInstance) {
  start();
  TarnReportingSystemMonitor::reset();
  EXPECT_EQ(platform_.notifications.cancelledTokens(), (std::vector<std::int32_t>{1, 2, 3}));
  EXPECT_TRUE(platform_.notifications.registeredNames().empty());
  EXPECT_EQ(TarnReportingSystemMonitor::getSystemMonitorDictionary(), nullptr);
}

TEST_F(TarnReportingSystemMonitorTest, InitializationAfterResetMakesAFreshInstance) {
  start();
  post(kRingerChanged, 1);
  const auto old = TarnReportingSystemMonitor::getSystemMonitorDictionary();
  TarnReportingSystemMonitor::reset();
  start();
  EXPECT_NE(TarnReportingSystemMonitor::getSystemMonitorDictionary(), old);
  EXPECT_TRUE(state(kRinger).empty());
}

TEST_F(TarnReportingSystemMonitorTest, TheEndOfTheInstallationCancelsEveryRegistration) {
  start();
  TarnReportingInstallFacilities(&platform_.facilities());
  EXPECT_EQ(platform_.notifications.cancelledTokens(), (std::vector<std::int32_t>{1, 2, 3}));
  EXPECT_EQ(TarnReportingSystemMonitor::getSystemMonitorDictionary(), nullptr);
}

TEST_F(TarnReportingSystemMonitorTest, DeliveryUnderWayAtResetChangesNothing) {
  start();
  const auto dictionary = TarnReportingSystemMonitor::getSystemMonitorDictionary();
  ASSERT_TRUE(platform_.notifications.post(kRingerChanged, 1));
  TarnReportingSystemMonitor::reset();
  platform_.runUntilIdle();
  EXPECT_TRUE(dictionary->states().empty());
}

}  // namespace
}  // namespace tarn
