// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingUtility.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <thread>
#include <vector>

#include "platform/Condition.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "testing/FakePlatform.h"

namespace tarn {
namespace {

using testing::WaitEnd;

class TarnReportingUtilityTest : public ::testing::Test {
 protected:
  bool wait(double timeoutSeconds) {
    return TarnReportingUtilityWait(*condition_, timeoutSeconds, flag_, "waiting for the answer", "no answer came",
                                    TarnReportingTraceCategory());
  }

  testing::FakePlatform platform_;
  std::shared_ptr<platform::Condition> condition_ = platform_.conditions.makeCondition();
  bool flag_ = false;
};

TEST_F(TarnReportingUtilityTest, WaitWithFlagSetReturnsAtOnceWithoutLogging) {
  flag_ = true;
  EXPECT_TRUE(wait(5));
  EXPECT_TRUE(platform_.log.texts().empty());
  EXPECT_TRUE(platform_.conditions.timeouts().empty());
}

TEST_F(TarnReportingUtilityTest, WaitWithTimeoutZeroLogsTheTimeoutTextAndReturnsFalse) {
  EXPECT_FALSE(wait(0));
  const auto entries = platform_.log.entries();
  ASSERT_EQ(entries.size(), 2U);
  EXPECT_EQ(entries[0].message(), "waiting for the answer");
  EXPECT_EQ(entries[0].level, LogLevel::Info);
  EXPECT_EQ(entries[0].category, "tarnrt");
  EXPECT_EQ(entries[0].module, "TarnReportingUtility");
  EXPECT_EQ(entries[1].message(), "no answer came");
  EXPECT_EQ(entries[1].level, LogLevel::Error);
  EXPECT_EQ(platform_.conditions.timeouts().front().count(), 0);
}

TEST_F(TarnReportingUtilityTest, WaitReturnsTrueOnceTheBackEndSignals) {
  platform_.conditions.onWait([this](auto) {
    TarnReportingUtilitySignal(*condition_, flag_);
    return WaitEnd::TimesOut;
  });
  EXPECT_TRUE(wait(5));
  EXPECT_EQ(platform_.log.messages(), (std::vector<std::string>{"waiting for the answer", "continuing"}));
  EXPECT_EQ(platform_.log.entries()[1].level, LogLevel::Info);
}

TEST_F(TarnReportingUtilityTest, WaitThatTimedOutIsFalseEvenWhenTheFlagWasSetMeanwhile) {
  platform_.conditions.onWait([this](auto) {
    flag_ = true;  // and nobody signalled
    return WaitEnd::TimesOut;
  });
  EXPECT_FALSE(wait(5));
  EXPECT_EQ(platform_.log.messages(), (std::vector<std::string>{"waiting for the answer", "no answer came"}));
}

TEST_F(TarnReportingUtilityTest, WakeUpWithoutTheFlagWaitsTheWholeTimeAnew) {
  int waits = 0;
  platform_.conditions.onWait([&](auto) { return ++waits < 3 ? WaitEnd::Wakes : WaitEnd::TimesOut; });
  EXPECT_FALSE(wait(2.5));
  const std::vector<std::chrono::duration<double>> whole(3, std::chrono::duration<double>(2.5));
  EXPECT_EQ(platform_.conditions.timeouts(), whole);
  EXPECT_EQ(platform_.log.messages(),
            (std::vector<std::string>{"waiting for the answer", "continuing", "waiting for the answer", "continuing",
                                      "waiting for the answer", "no answer came"}));
}

TEST_F(TarnReportingUtilityTest, WaitLeavesTheConditionUnlockedEitherWay) {
  EXPECT_FALSE(wait(0));
  TarnReportingUtilitySignal(*condition_, flag_);  // would not return if the wait had kept the lock
  EXPECT_TRUE(wait(0));
  TarnReportingUtilitySignal(*condition_, flag_);
  EXPECT_TRUE(flag_);
}

TEST_F(TarnReportingUtilityTest, SilentWaitReturnsTheFlagAndLogsNothing) {
  EXPECT_FALSE(TarnReportingUtilityWait(*condition_, std::chrono::seconds(2), flag_));
  EXPECT_EQ(platform_.conditions.timeouts(), (std::vector<std::chrono::duration<double>>{std::chrono::seconds(2)}));
  flag_ = true;
  EXPECT_TRUE(TarnReportingUtilityWait(*condition_, std::chrono::seconds(2), flag_));
  EXPECT_EQ(platform_.conditions.timeouts().size(), 1U);
  EXPECT_TRUE(platform_.log.texts().empty());
}

TEST_F(TarnReportingUtilityTest, SilentWaitIsNotProlongedByAWakeUpWithoutTheFlag) {
  platform_.conditions.onWait([this](auto) {
    platform_.clock.advance(std::chrono::seconds(1));
    return WaitEnd::Wakes;
  });
  EXPECT_FALSE(TarnReportingUtilityWait(*condition_, std::chrono::seconds(2), flag_));
  EXPECT_EQ(platform_.conditions.timeouts(),
            (std::vector<std::chrono::duration<double>>{std::chrono::seconds(2), std::chrono::seconds(1)}));
}

TEST_F(TarnReportingUtilityTest, SilentWaitCountsAFlagThatIsSetWhileTheTimeRunsOut) {
  platform_.conditions.onWait([this](auto) {
    flag_ = true;  // and nobody signalled
    return WaitEnd::TimesOut;
  });
  EXPECT_TRUE(TarnReportingUtilityWait(*condition_, std::chrono::seconds(2), flag_));
}

TEST_F(TarnReportingUtilityTest, SilentWaitOfNoTimeAsksTheFlagAlone) {
  EXPECT_FALSE(TarnReportingUtilityWait(*condition_, std::chrono::seconds(0), flag_));
  EXPECT_TRUE(platform_.conditions.timeouts().empty());
}

TEST_F(TarnReportingUtilityTest, SignalSetsTheFlagAndWakesOneWaiter) {
  TarnReportingUtilitySignal(*condition_, flag_);
  EXPECT_TRUE(flag_);
  EXPECT_EQ(platform_.conditions.made().front()->signals(), 1U);
}

TEST_F(TarnReportingUtilityTest, SignalFromAnotherThreadIsSeenByTheWaiter) {
  platform_.conditions.onWait([this](auto) {
    std::thread backEnd([this] { TarnReportingUtilitySignal(*condition_, flag_); });
    backEnd.join();
    return WaitEnd::TimesOut;
  });
  EXPECT_TRUE(wait(5));
}

TEST_F(TarnReportingUtilityTest, InternalBuildIsAskedOnceAndKept) {
  platform_.deviceProperties.set("InternalBuild", true);
  EXPECT_TRUE(TarnReportingUtilityIsInternalBuild());
  platform_.deviceProperties.set("InternalBuild", false);
  EXPECT_TRUE(TarnReportingUtilityIsInternalBuild());
  EXPECT_EQ(platform_.deviceProperties.asked(), std::vector<std::string>{"InternalBuild"});
}

TEST_F(TarnReportingUtilityTest, InternalBuildIsFalseWhenTheDeviceDoesNotTell) {
  EXPECT_FALSE(TarnReportingUtilityIsInternalBuild());
}

TEST_F(TarnReportingUtilityTest, AppNameIsTheMessagesOwnOrUnknown) {
  EXPECT_EQ(TarnReportingUtilityRetrieveAppName({{"HostApplicationDisplayID", "com.example.player"}}),
            "com.example.player");
  EXPECT_EQ(TarnReportingUtilityRetrieveAppName({{"HostApplicationDisplayID", ""}}), "");
  EXPECT_EQ(TarnReportingUtilityRetrieveAppName({{"hostapplicationdisplayid", "x"}}), "Unknown");
  EXPECT_EQ(TarnReportingUtilityRetrieveAppName({}), "Unknown");
}

TEST_F(TarnReportingUtilityTest, AddDatesStampsACopyAndReplacesOlderStamps) {
  platform_.clock.setEpochSeconds(1700000000.25);
  platform_.clock.setSystemUptimeSeconds(100.5);
  platform_.clock.setProcessorTicks(2'500'400);
  const plist::Dictionary message{{"tarnreporting_timestamp", "old"}, {"volume", 0.5}};
  const plist::Dictionary stamped = TarnReportingUtilityAddDates(message);
  EXPECT_EQ(stamped, (plist::Dictionary{{"tarnreporting_timestamp", 1700000000.25},
                                        {"volume", 0.5},
                                        {"systemuptime_sec", 101},
                                        {"processuptime_ms", 2500}}));
  EXPECT_EQ(stamped.get("tarnreporting_timestamp").kind(), plist::Kind::Double);
  EXPECT_EQ(stamped.get("systemuptime_sec").kind(), plist::Kind::Signed);
  EXPECT_EQ(stamped.get("processuptime_ms").kind(), plist::Kind::Signed);
  EXPECT_EQ(message, (plist::Dictionary{{"tarnreporting_timestamp", "old"}, {"volume", 0.5}}));
}

TEST_F(TarnReportingUtilityTest, AddDatesAppendsItsStampsInTheirOrder) {
  const plist::Dictionary expected{
      {"volume", 0.5}, {"tarnreporting_timestamp", 0}, {"systemuptime_sec", 0}, {"processuptime_ms", 0}};
  EXPECT_TRUE(TarnReportingUtilityAddDates({{"volume", 0.5}}).sharesKeysWith(expected));
}

TEST_F(TarnReportingUtilityTest, ProcessorTimeIsComputedInSinglePrecision) {
  platform_.clock.setProcessorTicks(100'000'001'000);  // 100000001 ms, which single precision can't hold
  EXPECT_EQ(TarnReportingUtilityAddDates({}).get("processuptime_ms").asInt64(), 100'000'000);
}

TEST_F(TarnReportingUtilityTest, ProcessorTimeBeyondThirtyTwoBitsIsHeldToThem) {
  platform_.clock.setProcessorTicks(INT64_MAX);
  EXPECT_EQ(TarnReportingUtilityAddDates({}).get("processuptime_ms").asInt64(), INT32_MAX);
}

TEST_F(TarnReportingUtilityTest, UptimeIsRoundedToTheNearestSecondAndHeldToThirtyTwoBits) {
  const std::pair<double, std::int64_t> uptimes[] = {{100.49, 100},    {100.5, 101},      {-0.5, -1},
                                                     {3e9, INT32_MAX}, {-3e9, INT32_MIN}, {std::nan(""), 0}};
  for (const auto& [uptime, seconds] : uptimes) {
    platform_.clock.setSystemUptimeSeconds(uptime);
    EXPECT_EQ(TarnReportingUtilityAddDates({}).get("systemuptime_sec").asInt64(), seconds) << uptime;
  }
}

TEST_F(TarnReportingUtilityTest, LogsDirectoryLiesUnderTheDiagnosticLogs) {
  EXPECT_EQ(TarnReportingLogsDirectory(),
            platform_.fileSystem.wellKnownDirectory(platform::WellKnownDirectory::DiagnosticLogs) + "/Audio/Reporting");
}

TEST_F(TarnReportingUtilityTest, ServerQueueIsMadeOnceWithItsNameAndTheHighestQuality) {
  const auto& queue = TarnReportingUtilityGetReportingServerQueue();
  EXPECT_EQ(TarnReportingUtilityGetReportingServerQueue(), queue);
  EXPECT_EQ(platform_.workQueues.names(), std::vector<std::string>{"sys.oxbow.tarnkit.reporting.server"});
  const auto made = platform_.workQueues.find("sys.oxbow.tarnkit.reporting.server");
  EXPECT_EQ(made, queue);
  EXPECT_EQ(made->quality(), platform::QualityOfService::UserInteractive);
}

TEST_F(TarnReportingUtilityTest, RunOnceAnswersAreTheSameForManyThreads) {
  platform_.deviceProperties.set("InternalBuild", true);
  std::vector<std::shared_ptr<platform::WorkQueue>> queues(8);
  std::vector<char> answers(8);
  std::vector<std::thread> threads;
  for (std::size_t index = 0; index < queues.size(); ++index) {
    threads.emplace_back([&, index] {
      queues[index] = TarnReportingUtilityGetReportingServerQueue();
      answers[index] = TarnReportingUtilityIsInternalBuild() ? 1 : 0;
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(queues, std::vector(8, queues.front()));
  EXPECT_EQ(answers, std::vector<char>(8, 1));
  EXPECT_EQ(platform_.deviceProperties.asked().size(), 1U);
}

TEST(TarnReportingUtilityRounding, RoundsToPlacesHalvesAwayFromZero) {
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(-1.5, 0), -2);
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(2.5, 0), 3);
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(0.125, 2), 0.13);
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(-0.125, 2), -0.13);
}

TEST(TarnReportingUtilityRounding, RoundsAsFarAsTheDoubleAllows) {
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(2.345, 2), 2.35);
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(1.005, 2), 1.0);  // times 100 it falls just short of the half
}

TEST(TarnReportingUtilityRounding, NegativePlacesRoundToTensAndHundreds) {
  EXPECT_DOUBLE_EQ(TarnReportingUtilityRoundWithPlaces(1234, -1), 1230);
  EXPECT_DOUBLE_EQ(TarnReportingUtilityRoundWithPlaces(1250, -2), 1300);
  EXPECT_EQ(TarnReportingUtilityRoundWithPlaces(4, -1), 0);
}

std::optional<std::string> bucketLabel(double number, std::vector<double> buckets, std::int32_t places) {
  return TarnReportingUtilityBucketNumberToString(number, buckets, places);
}

TEST(TarnReportingUtilityBuckets, NoBucketsYieldNothing) {
  EXPECT_EQ(bucketLabel(1, {}, 0), std::nullopt);
}

TEST(TarnReportingUtilityBuckets, NumberBetweenTwoBucketsYieldsTheLarger) {
  EXPECT_EQ(bucketLabel(7.5, {0, 5, 10}, 0), "10");
  EXPECT_EQ(bucketLabel(7, {0, 5, 10}, 0), "5");
  EXPECT_EQ(bucketLabel(2.5, {0, 5, 10}, 0), "5");
}

TEST(TarnReportingUtilityBuckets, NumberBeyondTheEndsYieldsTheEndBucket) {
  EXPECT_EQ(bucketLabel(1e9, {0, 5, 10}, 0), "10");
  EXPECT_EQ(bucketLabel(-1e9, {0, 5, 10}, 0), "0");
}

TEST(TarnReportingUtilityBuckets, WalkStopsAtTheFirstBucketThatIsFartherAway) {
  EXPECT_EQ(bucketLabel(3, {2, 10, 3}, 0), "2");  // buckets that don't ascend are not searched to the end
}

TEST(TarnReportingUtilityBuckets, PlacesOtherThanZeroShowAtLeastOneDecimal) {
  EXPECT_EQ(bucketLabel(5, {5}, 1), "5.0");
  EXPECT_EQ(bucketLabel(5, {5}, 3), "5.0");
  EXPECT_EQ(bucketLabel(5, {5}, 0), "5");
}

TEST(TarnReportingUtilityBuckets, ShowsNoMoreDecimalsThanAskedFor) {
  EXPECT_EQ(bucketLabel(0, {0.0625}, 4), "0.0625");
  EXPECT_EQ(bucketLabel(0, {0.0625}, 3), "0.062");
  EXPECT_EQ(bucketLabel(0, {0.1875}, 3), "0.188");
  EXPECT_EQ(bucketLabel(0, {0.0625}, 1), "0.1");
  EXPECT_EQ(bucketLabel(0, {0.04}, 1), "0.0");
}

TEST(TarnReportingUtilityBuckets, HalvesGoToTheEvenDigitOfTheDecimalValue) {
  EXPECT_EQ(bucketLabel(0, {0.5}, 0), "0");
  EXPECT_EQ(bucketLabel(0, {1.5}, 0), "2");
  EXPECT_EQ(bucketLabel(0, {2.5}, 0), "2");
  EXPECT_EQ(bucketLabel(0, {0.25}, 1), "0.2");
  EXPECT_EQ(bucketLabel(0, {0.35}, 1), "0.4");  // the double lies below the half, its decimal form on it
  EXPECT_EQ(bucketLabel(0, {2.345}, 2), "2.34");
  EXPECT_EQ(bucketLabel(0, {0.2501}, 1), "0.3");
}

TEST(TarnReportingUtilityBuckets, RoundingCarriesIntoNewDigits) {
  EXPECT_EQ(bucketLabel(0, {9.96}, 1), "10.0");
  EXPECT_EQ(bucketLabel(0, {99.99}, 0), "100");
  EXPECT_EQ(bucketLabel(0, {0.999}, 2), "1.0");
}

TEST(TarnReportingUtilityBuckets, LargeNumbersAreNotGrouped) {
  EXPECT_EQ(bucketLabel(0, {18000}, 0), "18000");
  EXPECT_EQ(bucketLabel(0, {1234567.5}, 1), "1234567.5");
  EXPECT_EQ(bucketLabel(0, {1e21}, 0), "1000000000000000000000");
}

TEST(TarnReportingUtilityBuckets, NegativeNumbersKeepTheirSign) {
  EXPECT_EQ(bucketLabel(0, {-12.5}, 1), "-12.5");
  EXPECT_EQ(bucketLabel(-100, {-10, 0}, 0), "-10");
}

TEST(TarnReportingUtilityBuckets, NegativePlacesCountAsOneDecimal) {
  EXPECT_EQ(bucketLabel(0, {12.34}, -2), "12.3");
}

TEST(TarnReportingUtilityBuckets, NumbersThatAreNotFiniteHaveTheirSigns) {
  const double infinity = std::numeric_limits<double>::infinity();
  EXPECT_EQ(bucketLabel(0, {std::nan("")}, 1), "NaN");
  EXPECT_EQ(bucketLabel(0, {infinity}, 1), "\xE2\x88\x9E");
  EXPECT_EQ(bucketLabel(0, {-infinity}, 1), "-\xE2\x88\x9E");
  EXPECT_EQ(bucketLabel(std::nan(""), {0, 5, 10}, 0), "10");  // no distance is ever greater
}

TEST(TarnReportingUtilityBuckets, SmallestNumberShowsAllItsPlaces) {
  EXPECT_EQ(bucketLabel(0, {5e-324}, 330), "0." + std::string(323, '0') + "5");
  EXPECT_EQ(bucketLabel(0, {5e-324}, 323), "0.0");
}

TEST(TarnReportingUtilityKeyChange, NeedsBothDictionariesAndTheKeyInBoth) {
  const plist::Dictionary with{{"volume", 1}};
  const plist::Dictionary without{{"other", 1}};
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", nullptr, &with));
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", &with, nullptr));
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", nullptr, nullptr));
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", &with, &without));
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", &without, &with));
}

TEST(TarnReportingUtilityKeyChange, TellsValuesThatDiffer) {
  const plist::Dictionary before{{"volume", 1}, {"route", "Speaker"}};
  const plist::Dictionary after{{"volume", 2}, {"route", "Speaker"}};
  EXPECT_TRUE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", &before, &after));
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("route", &before, &after));
}

TEST(TarnReportingUtilityKeyChange, IntegerOneAndDoubleOneAreEqual) {
  const plist::Dictionary before{{"volume", 1}};
  const plist::Dictionary after{{"volume", 1.0}};
  EXPECT_FALSE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", &before, &after));
}

TEST(TarnReportingUtilityKeyChange, NumberAndTextDiffer) {
  const plist::Dictionary before{{"volume", 1}};
  const plist::Dictionary after{{"volume", "1"}};
  EXPECT_TRUE(TarnReportingUtilityKeyIsPresentAndHasChanged("volume", &before, &after));
}

}  // namespace
}  // namespace tarn
