// SPDX-License-Identifier: Apache-2.0
// The audio-registration worker and the accessories: when it asks for them, and what it notes of them.
#include "telemetry/registration/BaseUnit.h"
#include "tests/telemetry/registration/AudioRegistrationFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::AccessoryPart;

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

}  // namespace
}  // namespace tarn
