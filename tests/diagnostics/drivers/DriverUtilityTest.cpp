// SPDX-License-Identifier: Apache-2.0
// What driver report channels become: keys, numbers, texts and log lines.
#include <limits>

#include "tests/diagnostics/drivers/DriverFixture.h"

namespace tarn {
namespace {

using namespace testing;
using platform::FlumeBucket;
using platform::FlumeState;
using Lines = std::vector<std::string>;
using Utility = TarnReportingDriverUtility;

constexpr std::int64_t kLowest = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kHighest = std::numeric_limits<std::int64_t>::max();

class DriverUtility : public DriverFixture {
 protected:
  static plist::Dictionary simple(const FlumeChannel& channel) {
    plist::Dictionary stats;
    Utility::processSimpleData(channel, stats);
    return stats;
  }
  static plist::Dictionary histogram(const FlumeChannel& channel) {
    plist::Dictionary stats;
    Utility::processHistogramData(channel, stats);
    return stats;
  }
  static plist::Dictionary state(const FlumeChannel& channel) {
    plist::Dictionary stats;
    Utility::processStateData(channel, stats);
    return stats;
  }
  // A session that starts, has the test change the channels, and stops.
  template <class Change>
  void runSession(Change change) {
    const auto session = makeSession();
    session->start();
    change();
    session->stop();
  }
};

TEST_F(DriverUtility, DescribesADriverByBothNames) {
  EXPECT_EQ(TarnReportingDriver::driverWithGroupName("Haptics", "Stats").description(), "Haptics-Stats");
  EXPECT_EQ(TarnReportingDriver::driverWithGroupName({}, "MCA").description(), "(null)-MCA");
  EXPECT_EQ(TarnReportingDriver::driverWithGroupName("Rx", {}).description(), "Rx-(null)");
  EXPECT_EQ(TarnReportingDriver::driverWithGroupName({}, {}).description(), "(null)-(null)");
}

TEST_F(DriverUtility, KeyJoinsTheNamesThatThereAre) {
  EXPECT_EQ(Utility::getDriverStatsKey(hapticsName("Engine On"), "Simple"), "OxbowFoo_Haptics_Stats_Simple_EngineOn");
  EXPECT_EQ(Utility::getDriverStatsKey({{}, "Rx", {}, "Frames"}, "Histogram"), "Rx_Histogram_Frames");
  EXPECT_EQ(Utility::getDriverStatsKey({{}, {}, "MCA", "Frames"}, "State"), "MCA_State_Frames");
  EXPECT_EQ(Utility::getDriverStatsKey({"Foo", {}, {}, {}}, "State"), "Foo_State_");
  EXPECT_EQ(Utility::getDriverStatsKey({}, "Simple"), "Simple_");
}

TEST_F(DriverUtility, KeyDropsUnderscoresAndBlanksInsideNamesButKeepsOtherPunctuation) {
  EXPECT_EQ(Utility::getDriverStatsKey({"_My Driver-2", "a_b c", " d.e_", "f/g <h>_i"}, "Simple"),
            "MyDriver-2_abc_d.e_Simple_f/g<h>i");
}

TEST_F(DriverUtility, KeyTakesTheDriverUpToItsFirstAngleBracket) {
  EXPECT_EQ(Utility::getDriverStatsKey({"Foo<a><b>", {}, {}, "x"}, "Simple"), "Foo_Simple_x");
  EXPECT_EQ(Utility::getDriverStatsKey({"<0x12>", {}, {}, "x"}, "Simple"), "_Simple_x");
  EXPECT_EQ(Utility::getDriverStatsKey({"", "", "", ""}, "Simple"), "___Simple_");
}

TEST_F(DriverUtility, SimpleCounterBelowOneAddsNothing) {
  for (const std::int64_t value : {kLowest, std::int64_t{-1}, std::int64_t{0}}) {
    EXPECT_TRUE(simple(simpleChannel(hapticsName("a"), value)).empty()) << value;
  }
  for (const std::int64_t value : {std::int64_t{1}, kHighest}) {
    EXPECT_EQ(simple(simpleChannel(hapticsName("a"), value)),
              (plist::Dictionary{{"OxbowFoo_Haptics_Stats_Simple_a", value}}));
  }
}

TEST_F(DriverUtility, HistogramTellsItsRangeAndTheBucketsWithHits) {
  EXPECT_EQ(histogram(histogramChannel(hapticsName("Latency"), {{1, 5, 2}, {5, 10, 0}, {10, 20, 7}})),
            (plist::Dictionary{{"OxbowFoo_Haptics_Stats_Histogram_Latency",
                                "count=3,lower=0,upper=20,min=3,max=17,unit=us::1-5:2;10-20:7"}}));
}

TEST_F(DriverUtility, HistogramRangeAlwaysHoldsZero) {
  EXPECT_EQ(histogram(histogramChannel({{}, {}, {}, "x"}, {{-20, -10, 1}, {-10, -5, 1}})),
            (plist::Dictionary{{"Histogram_x", "count=2,lower=-20,upper=0,min=3,max=17,unit=us::-20--10:1;-10--5:1"}}));
  auto extreme = histogramChannel({{}, {}, {}, "x"}, {{kLowest, kHighest, kHighest}});
  extreme.minimum = kLowest;
  extreme.maximum = kHighest;
  EXPECT_EQ(histogram(extreme)["Histogram_x"].text(),
            "count=1,lower=-9223372036854775808,upper=9223372036854775807,min=-9223372036854775808,"
            "max=9223372036854775807,unit=us::-9223372036854775808-9223372036854775807:9223372036854775807");
}

TEST_F(DriverUtility, HistogramWithoutAUnitSaysSo) {
  auto channel = histogramChannel({{}, {}, {}, "x"}, {{0, 1, 1}});
  channel.unit.reset();
  EXPECT_EQ(histogram(channel)["Histogram_x"].text(), "count=1,lower=0,upper=1,min=3,max=17,unit=(null)::0-1:1");
}

TEST_F(DriverUtility, HistogramWithoutHitsAddsNothing) {
  EXPECT_TRUE(histogram(histogramChannel(hapticsName("a"), {{0, 1, 0}, {1, 2, 0}})).empty());
  EXPECT_TRUE(histogram(histogramChannel(hapticsName("a"), {})).empty());
}

TEST_F(DriverUtility, BucketWhoseBoundsFailIsLoggedAndUsedAllTheSame) {
  EXPECT_EQ(histogram(histogramChannel({{}, {}, {}, "x"}, {{0, 1, 1}, {7, 9, 4, -5}}))["Histogram_x"].text(),
            "count=2,lower=0,upper=9,min=3,max=17,unit=us::0-1:1;7-9:4");
  EXPECT_EQ(lines(LogLevel::Info), (Lines{"Error in getting the bucket bounds : -5"}));
}

TEST_F(DriverUtility, StateTextTellsTheStatesThatWereHeld) {
  EXPECT_EQ(state(stateChannel(hapticsName("Engine"), {{"on", 2, 1500, 0.25}, {"off", 9, 0, 0.5}, {"idle", 0, 1, 1}})),
            (plist::Dictionary{{"OxbowFoo_Haptics_Stats_State_Engine",
                                "name:on,transition:2,residency:1500,duty_cycle:0.250000;"
                                "name:idle,transition:0,residency:1,duty_cycle:1.000000;"}}));
  EXPECT_EQ(lines(LogLevel::Debug),
            (Lines{"the current reported data is : name:on,transition:2,residency:1500,duty_cycle:0.250000;"
                   "name:idle,transition:0,residency:1,duty_cycle:1.000000;"}));
}

TEST_F(DriverUtility, StateNumbersReachTheirLimits) {
  constexpr std::uint64_t kMost = std::numeric_limits<std::uint64_t>::max();
  const auto text = [](double dutyCycle) {
    return std::string(state(stateChannel({{}, {}, {}, "x"}, {{"", kMost, kMost, dutyCycle}}))["State_x"].text());
  };
  const std::string begin = "name:,transition:18446744073709551615,residency:18446744073709551615,duty_cycle:";
  EXPECT_EQ(text(-0.0000004), begin + "-0.000000;");
  EXPECT_EQ(text(std::numeric_limits<double>::infinity()), begin + "inf;");
  EXPECT_EQ(text(1e300).size(), begin.size() + 301 + 7 + 1);
}

TEST_F(DriverUtility, StatesThatWereNotHeldAddNothingAndLogNothing) {
  EXPECT_TRUE(state(stateChannel(hapticsName("a"), {{"on", 5, 0, 1}})).empty());
  EXPECT_TRUE(state(stateChannel(hapticsName("a"), {})).empty());
  EXPECT_TRUE(lines(LogLevel::Debug).empty());
}

TEST_F(DriverUtility, SubscribesToTheGroupsThatThereAreInTheirOrder) {
  flume_.setChannel(simpleChannel({"d", "Tx", {}, "a"}, 1));
  flume_.setChannel(simpleChannel({"d", {}, "MCA", "b"}, 1));
  flume_.setChannel(simpleChannel({"d", "Speaker", "Left", "c"}, 1));
  flume_.setChannel(simpleChannel({"d", "Haptics", "Other", "e"}, 1));
  Utility utility(flume_);
  utility.init();
  ASSERT_EQ(utility.ioChannelSubscriptions().size(), 3U);
  EXPECT_EQ(utility.ioChannelSubscriptions()[0].driver.description(), "Speaker-(null)");
  EXPECT_EQ(utility.ioChannelSubscriptions()[1].driver.description(), "(null)-MCA");
  EXPECT_EQ(utility.ioChannelSubscriptions()[2].driver.description(), "Tx-(null)");
  EXPECT_EQ(utility.ioChannelSubscriptions()[2].subscribedChannels, (platform::FlumeChannelSet{{"d", "Tx", {}, "a"}}));
  EXPECT_EQ(lines(LogLevel::Info),
            (Lines{"creating flume driver utility", "couldn't find any channels for driver group OxbowAE2MCA-(null)",
                   "subscribed to group group Speaker-(null)", "subscribed to group group (null)-MCA",
                   "couldn't find any channels for driver group Haptics-Stats",
                   "couldn't find any channels for driver group StateTransitionTimes_ms-(null)",
                   "couldn't find any channels for driver group Rx-(null)", "subscribed to group group Tx-(null)",
                   "couldn't find any channels for driver group (null)-Tympan2",
                   "couldn't find any channels for driver group pdm-(null)"}));
  EXPECT_TRUE(lines(LogLevel::Error).empty());
}

TEST_F(DriverUtility, GroupsThatCanNotBeLookedUpAreLoggedAndSkipped) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  flume_.fail(Step::CopyChannels, -536870212);
  Utility utility(flume_);
  utility.init();
  EXPECT_TRUE(utility.ioChannelSubscriptions().empty());
  const Lines errors = lines(LogLevel::Error);
  ASSERT_EQ(errors.size(), 9U);
  EXPECT_EQ(errors[2], "error -536870212 getting channels for driver (null)-MCA");
  EXPECT_EQ(errors[3], "error -536870212 getting channels for driver Haptics-Stats");
  EXPECT_EQ(platform_.log.count("couldn't find any channels for driver group "), 9U);
  EXPECT_EQ(flume_.calls(Step::Subscribe), 0U);
}

TEST_F(DriverUtility, GroupsWithoutAChannelSetAreSkippedWithoutAnError) {
  flume_.fail(Step::CopyChannels, std::nullopt);
  Utility utility(flume_);
  utility.init();
  EXPECT_TRUE(lines(LogLevel::Error).empty());
  EXPECT_EQ(platform_.log.count("couldn't find any channels for driver group "), 9U);
}

TEST_F(DriverUtility, SubscriptionsThatFailAreLoggedAndLeftOut) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  flume_.fail(Step::Subscribe, 5);
  Utility(flume_).init();
  flume_.fail(Step::Subscribe, std::nullopt);
  Utility last(flume_);
  last.init();
  EXPECT_TRUE(last.ioChannelSubscriptions().empty());
  EXPECT_EQ(lines(LogLevel::Error), (Lines{"error 5 creating subscription for Haptics-Stats",
                                           "error 0 creating subscription for Haptics-Stats"}));
}

TEST_F(DriverUtility, WithoutAnyOfTheGroupsNothingIsSampledAndNothingSent) {
  flume_.setChannel(simpleChannel({"d", "Elsewhere", {}, "a"}, 1));
  runSession([&] { flume_.setChannel(simpleChannel({"d", "Elsewhere", {}, "a"}, 9)); });
  EXPECT_TRUE(script().received.empty());
  EXPECT_EQ(flume_.calls(Step::CreateSamples), 0U);
}

TEST_F(DriverUtility, SendsWhatWasCountedByKindInOrder) {
  flume_.setChannel(stateChannel(hapticsName("s"), {{"on", 1, 100, 0.1}}));
  flume_.setChannel(histogramChannel({"Bar", "Rx", {}, "h"}, {{0, 9, 5}}));
  flume_.setChannel(simpleChannel(hapticsName("Engine On"), 10));
  flume_.setChannel(simpleChannel({"Bar", "Rx", {}, "fell"}, 10));
  flume_.setChannel(simpleChannel({"Bar", "Rx", {}, "same"}, 10));
  runSession([&] {
    flume_.setChannel(stateChannel(hapticsName("s"), {{"on", 4, 350, 0.5}}));
    flume_.setChannel(histogramChannel({"Bar", "Rx", {}, "h"}, {{0, 9, 7}}));
    flume_.setChannel(simpleChannel(hapticsName("Engine On"), 13));
    flume_.setChannel(simpleChannel({"Bar", "Rx", {}, "fell"}, 9));
  });
  EXPECT_EQ(receivedTypes(), (std::vector{AudioEventType::Simple, AudioEventType::Histogram, AudioEventType::State}));
  EXPECT_EQ(received(AudioEventType::Simple), (plist::Dictionary{{"OxbowFoo_Haptics_Stats_Simple_EngineOn", 3}}));
  EXPECT_EQ(received(AudioEventType::Histogram),
            (plist::Dictionary{{"Bar_Rx_Histogram_h", "count=1,lower=0,upper=9,min=3,max=17,unit=us::0-9:2"}}));
  EXPECT_EQ(received(AudioEventType::State),
            (plist::Dictionary{
                {"OxbowFoo_Haptics_Stats_State_s", "name:on,transition:3,residency:250,duty_cycle:0.500000;"}}));
}

TEST_F(DriverUtility, SendsNoMessageOfAnEmptyKind) {
  flume_.setChannel(histogramChannel(hapticsName("h"), {{0, 9, 5}}));
  flume_.setChannel(simpleChannel(hapticsName("c"), 1));
  runSession([&] { flume_.setChannel(histogramChannel(hapticsName("h"), {{0, 9, 6}})); });
  EXPECT_EQ(receivedTypes(), (std::vector{AudioEventType::Histogram}));
}

TEST_F(DriverUtility, LogsEachSampling) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  flume_.setChannel(simpleChannel({"d", {}, "MCA", "b"}, 1));
  const auto session = makeSession();
  session->start();
  platform_.log.clear();
  session->stop();
  session->start();
  EXPECT_EQ(lines(LogLevel::Info),
            (Lines{"getting latest samples", "done getting latest samples", "getting latest samples",
                   "done getting latest samples", "sampling driver (null)-MCA", "sampling driver Haptics-Stats"}));
}

TEST_F(DriverUtility, DriverThatCanNotBeSampledAtStartCountsAgainstNothing) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 40));
  flume_.fail(Step::CreateSamples, 3);
  runSession([&] {
    flume_.restore(Step::CreateSamples);
    flume_.setChannel(simpleChannel(hapticsName("a"), 42));
  });
  EXPECT_EQ(lines(LogLevel::Error), (Lines{"FlumeCreateSamples error 3"}));
  EXPECT_EQ(received(AudioEventType::Simple), (plist::Dictionary{{"OxbowFoo_Haptics_Stats_Simple_a", 42}}));
}

TEST_F(DriverUtility, DriverThatCanNotBeSampledAtStopIsLoggedAndSkipped) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 40));
  runSession([&] { flume_.fail(Step::CreateSamples, -9); });
  EXPECT_EQ(lines(LogLevel::Error), (Lines{"FlumeCreateSamples error -9"}));
  EXPECT_TRUE(script().received.empty());
  EXPECT_EQ(flume_.calls(Step::CreateDelta), 0U);
}

TEST_F(DriverUtility, DifferenceThatFailsIsLoggedAsASamplingThatFails) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 40));
  runSession([&] { flume_.fail(Step::CreateDelta, 11); });
  EXPECT_EQ(lines(LogLevel::Error), (Lines{"FlumeCreateSamples error 11"}));
  EXPECT_TRUE(script().received.empty());
}

TEST_F(DriverUtility, FailuresWithoutACodeAreSkippedInSilence) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 40));
  flume_.fail(Step::CreateSamples, std::nullopt);
  runSession([] {});
  flume_.restore(Step::CreateSamples);
  flume_.fail(Step::CreateDelta, std::nullopt);
  runSession([] {});
  EXPECT_TRUE(lines(LogLevel::Error).empty());
  EXPECT_TRUE(script().received.empty());
}

TEST_F(DriverUtility, OtherFormatsAreDroppedAndUnknownOnesAreErrors) {
  for (const int format : {0, 4, 5, 255}) {
    auto channel = simpleChannel(hapticsName("f" + std::to_string(format)), 1);
    channel.format = static_cast<FlumeFormat>(format);
    channel.name.subGroup = "MCA";
    flume_.setChannel(channel);
  }
  auto bare = simpleChannel({"d", {}, "Tympan2", "x"}, 1);
  bare.format = FlumeFormat::SimpleArray;
  flume_.setChannel(bare);
  flume_.setChannel(simpleChannel({"d", {}, "Tympan2", "y"}, 1));
  runSession([&] { flume_.setChannel(simpleChannel({"d", {}, "Tympan2", "y"}, 2)); });
  EXPECT_EQ(lines(LogLevel::Debug), (Lines{"Dropping sample of type : 0 for group : Haptics subgroup : MCA",
                                           "Dropping sample of type : 4 for group : Haptics subgroup : MCA",
                                           "Dropping sample of type : 4 for group : (null) subgroup : Tympan2"}));
  EXPECT_EQ(lines(LogLevel::Error), (Lines{"The FlumeFormat 5 is not supported group : Haptics subgroup : MCA",
                                           "The FlumeFormat 255 is not supported group : Haptics subgroup : MCA"}));
  EXPECT_EQ(received(AudioEventType::Simple), (plist::Dictionary{{"d_Tympan2_Simple_y", 1}}));
}

TEST_F(DriverUtility, ChannelsOfOneKeyShareOneEntryTheLastOneWins) {
  flume_.setChannel(simpleChannel(hapticsName("a b"), 1));
  flume_.setChannel(simpleChannel(hapticsName("a_b"), 1));
  runSession([&] {
    flume_.setChannel(simpleChannel(hapticsName("a b"), 5));
    flume_.setChannel(simpleChannel(hapticsName("a_b"), 3));
  });
  EXPECT_EQ(received(AudioEventType::Simple), (plist::Dictionary{{"OxbowFoo_Haptics_Stats_Simple_ab", 2}}));
}

TEST_F(DriverUtility, OnlyChannelsThatWereSubscribedAreKeptAndSampled) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  flume_.setChannel(simpleChannel(hapticsName("b"), 1));
  flume_.refuseSubscription(hapticsName("a"));
  Utility utility(flume_);
  utility.init();
  ASSERT_EQ(utility.ioChannelSubscriptions().size(), 1U);
  EXPECT_EQ(utility.ioChannelSubscriptions()[0].subscribedChannels, (platform::FlumeChannelSet{hapticsName("b")}));
  const auto samples = utility.getSnapShot().at("Haptics-Stats");
  ASSERT_EQ(samples->size(), 1U);
  EXPECT_EQ(samples->at(0).name, hapticsName("b"));
}

TEST_F(DriverUtility, EachDriverIsSampledByItsOwnSubscription) {
  flume_.setChannel(simpleChannel({"d", "Rx", {}, "a"}, 1));
  flume_.setChannel(simpleChannel({"d", "Tx", {}, "b"}, 1));
  runSession([&] {
    flume_.setChannel(simpleChannel({"d", "Rx", {}, "a"}, 2));
    flume_.setChannel(simpleChannel({"d", "Tx", {}, "b"}, 4));
  });
  EXPECT_EQ(received(AudioEventType::Simple), (plist::Dictionary{{"d_Rx_Simple_a", 1}, {"d_Tx_Simple_b", 3}}));
}

TEST_F(DriverUtility, ASubscriptionWithoutAHandleOrWithoutChannelsIsNone) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  flume_.withholdHandle();
  Utility withoutHandle(flume_);
  withoutHandle.init();
  EXPECT_TRUE(withoutHandle.ioChannelSubscriptions().empty());
  FakeFlumeService other;
  other.setChannel(simpleChannel(hapticsName("a"), 1));
  other.withholdChannels();
  Utility withoutChannels(other);
  withoutChannels.init();
  EXPECT_TRUE(withoutChannels.ioChannelSubscriptions().empty());
  EXPECT_EQ(lines(LogLevel::Error), Lines(2, "error 0 creating subscription for Haptics-Stats"));
}

TEST_F(DriverUtility, TellsOfASamplingBeforeItAndOfTheLatestSamplesAroundIt) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  Utility utility(flume_);
  platform_.order.start();
  utility.init();
  const Lines subscribing = platform_.order.entries();
  ASSERT_EQ(subscribing.size(), 1U + 9U * 2U + 1U);
  EXPECT_EQ(subscribing[0], "log creating flume driver utility");
  EXPECT_EQ(subscribing[1], "flume channels");
  EXPECT_EQ(Lines(subscribing.begin() + 7, subscribing.begin() + 10),
            (Lines{"flume channels", "flume subscribe", "log subscribed to group group Haptics-Stats"}));
  platform_.order.start();
  const auto snapShot = utility.getSnapShot();
  EXPECT_EQ(platform_.order.entries(), (Lines{"log sampling driver Haptics-Stats", "flume samples"}));
  const auto session = makeSession();
  platform_.order.start();
  utility.sendDriverLogsForSession(*session, snapShot);
  EXPECT_EQ(platform_.order.entries(),
            (Lines{"log getting latest samples", "flume samples", "log done getting latest samples", "flume delta"}));
}

TEST_F(DriverUtility, ASamplingThatFailsIsDoneBeforeItsErrorIsTold) {
  flume_.setChannel(simpleChannel(hapticsName("a"), 1));
  Utility utility(flume_);
  utility.init();
  const auto session = makeSession();
  flume_.fail(Step::CreateSamples, -9);
  platform_.order.start();
  utility.sendDriverLogsForSession(*session, {});
  EXPECT_EQ(platform_.order.entries(), (Lines{"log getting latest samples", "flume samples",
                                              "log done getting latest samples", "log FlumeCreateSamples error -9"}));
}

TEST_F(DriverUtility, BoundsThatFailWithAnyCodeAreLoggedAndHitsBelowZeroAreHits) {
  EXPECT_EQ(histogram(histogramChannel({{}, {}, {}, "x"}, {{0, 1, -2}, {1, 2, 0, 5}}))["Histogram_x"].text(),
            "count=2,lower=0,upper=2,min=3,max=17,unit=us::0-1:-2");
  EXPECT_EQ(lines(LogLevel::Info), (Lines{"Error in getting the bucket bounds : 5"}));
}

TEST_F(DriverUtility, EveryBucketWidensTheRange) {
  EXPECT_EQ(histogram(histogramChannel({{}, {}, {}, "x"}, {{-5, 9, 0}, {-7, 3, 0}, {-6, 8, 1}}))["Histogram_x"].text(),
            "count=3,lower=-7,upper=9,min=3,max=17,unit=us::-6-8:1");
}

TEST_F(DriverUtility, DutyCycleThatIsNoNumberHasNoSign) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  for (const double dutyCycle : {nan, -nan}) {
    EXPECT_EQ(state(stateChannel({{}, {}, {}, "x"}, {{"on", 1, 1, dutyCycle}}))["State_x"].text(),
              "name:on,transition:1,residency:1,duty_cycle:nan;");
  }
}

TEST_F(DriverUtility, AgainstNoSnapshotAllOfItIsSent) {
  flume_.setChannel(histogramChannel(hapticsName("h"), {{0, 9, 5}}));
  flume_.setChannel(stateChannel(hapticsName("s"), {{"on", 1, 1, 0}}));
  const auto session = makeSession();
  Utility utility(flume_);
  utility.init();
  session->start();
  utility.sendDriverLogsForSession(*session, {});
  EXPECT_EQ(receivedTypes(), (std::vector{AudioEventType::Histogram, AudioEventType::State}));
}

}  // namespace
}  // namespace tarn
