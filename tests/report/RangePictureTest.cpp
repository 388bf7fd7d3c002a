// SPDX-License-Identifier: Apache-2.0
#include "tools/report/RangePicture.h"

#include <gtest/gtest.h>

#include <numeric>

#include "tests/report/Rows.h"

namespace tarn::report {
namespace {

constexpr double kHour = 3600;
constexpr double kDay = 24 * kHour;
constexpr const char* kOverload = R"("issue_type":"overload")";

TimeRange rangeOf(double since, double until) {
  return {kStart + since, kStart + until};
}

TEST(RangePicture, PeriodCountsAsFarAsItLiesInTheRange) {
  RangeBuilder builder(rangeOf(50, 80), kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  builder.add(periodRow(1, 10, 60, 5, 1));
  builder.add(periodRow(1, 70, 90, 6, 2));
  builder.add(periodRow(1, 91, 95, 100));
  const RangePicture picture = builder.picture();
  EXPECT_EQ(picture.totals.activeSeconds, 20);
  EXPECT_EQ(picture.totals.messages, 11);
  EXPECT_EQ(picture.totals.redundant, 3);
}

TEST(RangePicture, EventsCountFromTheFirstMomentUpToWithoutTheLast) {
  RangeBuilder builder(rangeOf(50, 80), kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  for (const double at : {49.9, 50.0, 79.9, 80.0}) {
    builder.add(messageRow(1, at, "IO.Error", kOverload));
  }
  EXPECT_EQ(builder.picture().totals.overloads, 2);
}

TEST(RangePicture, RowsOfOtherSessionsDoNotCount) {
  RangeBuilder builder({}, kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  builder.add(periodRow(2, 0, 100, 7));
  builder.add(messageRow(2, 50, "IO.Error", kOverload));
  const RangePicture picture = builder.picture();
  EXPECT_EQ(picture.totals.activeSeconds, 0);
  EXPECT_EQ(picture.totals.overloads, 0);
}

TEST(RangePicture, OpenPeriodEndsWithItsSessionOrNow) {
  RangeBuilder builder({}, kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  builder.add(sessionRow(2, 0, std::nullopt));
  builder.add(periodRow(1, 40, std::nullopt));
  builder.add(periodRow(2, 900, std::nullopt));
  const RangePicture picture = builder.picture();
  ASSERT_EQ(picture.sessions.size(), 2U);
  EXPECT_EQ(picture.sessions[0].activeSeconds, 100);
  EXPECT_EQ(picture.sessions[1].activeSeconds, 60);
}

TEST(RangePicture, GroupsAreByApplicationAndTypeTheMostSessionsFirst) {
  RangeBuilder builder({}, kStart + 1000);
  SessionRow call = sessionRow(1, 0, 100);
  call.serviceName = "telephony";
  builder.add(call);
  builder.add(sessionRow(2, 0, 100));
  builder.add(sessionRow(3, 0, 100));
  builder.add(periodRow(1, 0, 80));
  builder.add(periodRow(2, 0, 30));
  builder.add(periodRow(3, 0, 40));
  builder.add(messageRow(3, 5, "Error.Error", ""));
  const RangePicture picture = builder.picture();
  ASSERT_EQ(picture.groups.size(), 2U);
  EXPECT_EQ(picture.groups[0].serviceName, "longformaudio");
  EXPECT_EQ(picture.groups[0].sessions, 2);
  EXPECT_EQ(picture.groups[0].activeSeconds, 70);
  EXPECT_EQ(picture.groups[0].errors, 1);
  EXPECT_EQ(picture.groups[1].serviceName, "telephony");
}

TEST(RangePicture, ActiveTimeIsSharedAmongTheDaysAtMidnight) {
  RangeBuilder builder({}, kStart + 2 * kDay);
  builder.add(sessionRow(1, 13 * kHour, 15 * kHour));  // from 23:00 to 01:00
  builder.add(periodRow(1, 13 * kHour, 15 * kHour));
  builder.add(messageRow(1, 13.5 * kHour, "IO.Error", kOverload));
  const RangePicture picture = builder.picture();
  ASSERT_EQ(picture.days.size(), 2U);
  EXPECT_EQ(picture.days[0].from, kStart - 10 * kHour);
  EXPECT_EQ(picture.days[0].activeSeconds, kHour);
  EXPECT_EQ(picture.days[1].activeSeconds, kHour);
  EXPECT_EQ(picture.days[0].overloads, 1);
  EXPECT_EQ(picture.days[1].overloads, 0);
}

TEST(RangePicture, OverloadsAreByTheHourUpToThreeDays) {
  for (const auto& [days, length] : {std::pair(3.0, kHour), std::pair(3.01, kDay)}) {
    RangeBuilder builder({}, kStart);
    builder.add(sessionRow(1, 0, days * kDay));
    const RangePicture picture = builder.picture();
    ASSERT_FALSE(picture.hours.empty());
    EXPECT_EQ(picture.hours[0].to - picture.hours[0].from, length);
  }
}

TEST(RangePicture, LongRangesHaveFewBinsThatStillHoldEverything) {
  RangeBuilder builder({}, kStart + 20'000 * kDay);
  builder.add(sessionRow(1, 0, 20'000 * kDay));
  builder.add(periodRow(1, 0, 20'000 * kDay));
  const RangePicture picture = builder.picture();
  EXPECT_LE(picture.days.size(), 121U);
  const double sum = std::accumulate(picture.days.begin(), picture.days.end(), 0.0,
                                     [](double total, const TimeBin& bin) { return total + bin.activeSeconds; });
  EXPECT_NEAR(sum, 20'000 * kDay, 0.001);
}

TEST(RangePicture, PlayIsCountedByTheNearestSixteenth) {
  RangeBuilder builder({}, kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  for (const auto& [volume, seconds] :
       {std::pair("0.5", 20), std::pair("0.53", 3), std::pair("0.54", 4), std::pair("1", 5), std::pair("7", 6)}) {
    builder.add(messageRow(1, 90, "Volume.Summary",
                           std::string(R"("msgidx":1,"msgcnt":1,"KvSessionVolume":)") + volume + R"(,"play_seconds":)" +
                               std::to_string(seconds)));
  }
  const RangePicture picture = builder.picture();
  EXPECT_EQ(picture.playSeconds[8], 23);
  EXPECT_EQ(picture.playSeconds[9], 4);
  EXPECT_EQ(picture.playSeconds[16], 11);
}

TEST(RangePicture, NonsenseOfASegmentDoesNotCount) {
  RangeBuilder builder({}, kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  for (const char* const members : {R"("KvSessionVolume":-1,"play_seconds":5)", R"("KvSessionVolume":0.5)",
                                    R"("KvSessionVolume":0.5,"play_seconds":-5)"}) {
    builder.add(messageRow(1, 90, "Volume.Summary", std::string(R"("msgidx":1,"msgcnt":1,)") + members));
  }
  const RangePicture picture = builder.picture();
  EXPECT_EQ(std::accumulate(picture.playSeconds.begin(), picture.playSeconds.end(), 0.0), 0);
}

TEST(RangePicture, WorstAreTheTenWithTheMostOverloadsAndErrors) {
  RangeBuilder builder({}, kStart + 1000);
  for (std::int64_t id = 1; id <= 12; ++id) {
    builder.add(sessionRow(id, 0, 100));
    for (std::int64_t count = 1; count < id; ++count) {
      builder.add(messageRow(id, 50, "IO.Error", count % 2 == 0 ? kOverload : ""));
    }
  }
  const RangePicture picture = builder.picture();
  ASSERT_EQ(picture.worst.size(), 10U);
  EXPECT_EQ(picture.sessions[picture.worst[0]].session.id, 12);
  EXPECT_EQ(picture.sessions[picture.worst[0]].overloads, 5);
  EXPECT_EQ(picture.sessions[picture.worst[0]].errors, 6);
  EXPECT_EQ(picture.sessions[picture.worst[9]].session.id, 3);
}

TEST(RangePicture, SessionWithoutFaultsIsNoneOfTheWorst) {
  RangeBuilder builder({}, kStart + 1000);
  builder.add(sessionRow(1, 0, 100));
  builder.add(messageRow(1, 50, "Performance.IssueDetector", R"("issue_type":"Silence")"));
  const RangePicture picture = builder.picture();
  EXPECT_EQ(picture.totals.issues, 1);
  EXPECT_TRUE(picture.worst.empty());
}

TEST(RangePicture, NoSessionsMakeAnEmptyPicture) {
  RangeBuilder builder({}, kStart);
  const RangePicture picture = builder.picture();
  EXPECT_TRUE(picture.sessions.empty());
  EXPECT_TRUE(picture.days.empty());
  EXPECT_EQ(picture.from, kStart);
}

}  // namespace
}  // namespace tarn::report
