// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/Ranking.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <string>
#include <vector>

namespace tarn::fleet {
namespace {

constexpr double kHour = 3600;

Played played(std::string name, double hours, std::int64_t overloads) {
  return {std::move(name), 1, hours * kHour, overloads};
}

std::vector<std::string> namesOf(const std::vector<Rated>& worst) {
  std::vector<std::string> names;
  for (const Rated& each : worst) {
    names.push_back(each.played.name);
  }
  return names;
}

// chi2(p; 2k) / 2, by adding the terms of the sum that it stands for, in the widest arithmetic there is.
long double atMost(std::int64_t count, long double expected) {
  long double sum = 0;
  for (std::int64_t i = 0; i <= count; ++i) {
    sum += std::exp(static_cast<long double>(i) * std::log(expected) - expected -
                    std::lgamma(static_cast<long double>(i) + 1));
  }
  return sum;
}

TEST(FleetRanking, TheIntervalIsTheExactOneOfPublishedTables) {
  struct Row {
    std::int64_t count;
    double low, high;
  };
  // Garwood's limits, as tables of them have them.
  for (const Row& row :
       {Row{0, 0, 3.689}, Row{1, 0.0253, 5.572}, Row{2, 0.2422, 7.225}, Row{3, 0.6187, 8.767}, Row{5, 1.623, 11.668},
        Row{10, 4.795, 18.390}, Row{20, 12.217, 30.888}, Row{50, 37.111, 65.919}, Row{100, 81.364, 121.627}}) {
    const Interval interval = poissonInterval(row.count);
    EXPECT_NEAR(interval.low, row.low, 0.0006) << row.count;
    EXPECT_NEAR(interval.high, row.high, 0.0006) << row.count;
  }
}

TEST(FleetRanking, EachTailOfTheExactIntervalIsTwoAndAHalfPercent) {
  for (const std::int64_t count : {1, 2, 7, 33, 150, 600, 1000}) {
    const Interval interval = poissonInterval(count);
    EXPECT_NEAR(static_cast<double>(1 - atMost(count - 1, interval.low)), 0.025, 1e-10) << count;
    EXPECT_NEAR(static_cast<double>(atMost(count, interval.high)), 0.025, 1e-10) << count;
  }
}

TEST(FleetRanking, BeyondTheExactCountsTheApproximationGoesOnWithoutAStep) {
  const Interval last = poissonInterval(kMostExact);
  const Interval next = poissonInterval(kMostExact + 1);
  // What one more adds to the ends, of the exact ones before.
  const Interval before = poissonInterval(kMostExact - 1);
  EXPECT_NEAR(next.low - last.low, last.low - before.low, 0.01);
  EXPECT_NEAR(next.high - last.high, last.high - before.high, 0.01);
  // And the tails are still what they are to be.
  EXPECT_NEAR(static_cast<double>(1 - atMost(kMostExact, next.low)), 0.025, 1e-5);
  EXPECT_NEAR(static_cast<double>(atMost(kMostExact + 1, next.high)), 0.025, 1e-5);
}

TEST(FleetRanking, MoreOverloadsNeverMeanALowerEnd) {
  Interval before{-1, -1};
  for (std::int64_t count = 0; count < 2500; ++count) {
    const Interval interval = poissonInterval(count);
    ASSERT_GT(interval.low, before.low) << count;
    ASSERT_GT(interval.high, before.high) << count;
    ASSERT_LE(interval.low, static_cast<double>(count));
    ASSERT_GT(interval.high, static_cast<double>(count));
    before = interval;
  }
}

TEST(FleetRanking, ACountThatIsNoneIsTakenAsNone) {
  EXPECT_EQ(poissonInterval(-3).low, 0);
  EXPECT_NEAR(poissonInterval(-3).high, 3.689, 0.0006);
}

TEST(FleetRanking, ACountOfBillionsHasAnIntervalToo) {
  const Interval interval = poissonInterval(4'000'000'000);
  // The normal distribution's there: 1.96 times the root.
  EXPECT_NEAR(interval.low, 4e9 - 1.959964 * std::sqrt(4e9), 3);
  EXPECT_NEAR(interval.high, 4e9 + 1.959964 * std::sqrt(4e9), 3);
}

TEST(FleetRanking, ARateIsByTheHourOfPlay) {
  const auto rate = rateOf(played("speaker", 4, 10));
  ASSERT_TRUE(rate);
  EXPECT_DOUBLE_EQ(rate->value, 2.5);
  EXPECT_NEAR(rate->between.low, 4.795 / 4, 0.0002);
  EXPECT_NEAR(rate->between.high, 18.390 / 4, 0.0002);
}

TEST(FleetRanking, WithoutPlayThereIsNoRate) {
  EXPECT_FALSE(rateOf(played("a", 0, 5)));
  EXPECT_FALSE(rateOf(played("a", -1, 5)));
  EXPECT_FALSE(rateOf(played("a", std::numeric_limits<double>::infinity(), 5)));
  EXPECT_FALSE(rateOf(played("a", std::numeric_limits<double>::quiet_NaN(), 5)));
}

TEST(FleetRanking, LittlePlayDoesNotComeFirstByChance) {
  // Two seconds with one overload are 1800 an hour, and at least 45; an hour with a hundred is at least 81.
  EXPECT_EQ(namesOf(worstOf({played("two seconds", 2 / kHour, 1), played("an hour", 1, 100)}, 10)),
            (std::vector<std::string>{"an hour", "two seconds"}));
}

TEST(FleetRanking, TheOrderIsByTheLowerEndThenByTheRateThenByPlayThenByName) {
  const std::vector<Played> all{played("quiet, little play", 1, 0), played("quiet, much play", 9, 0),
                                played("b", 2, 10), played("a", 2, 10), played("worse", 1, 10)};
  EXPECT_EQ(namesOf(worstOf(all, 10)),
            (std::vector<std::string>{"worse", "a", "b", "quiet, much play", "quiet, little play"}));
}

TEST(FleetRanking, WhatHasNoPlayComesLastThoseWithOverloadsFirst) {
  const auto worst = worstOf({played("none", 0, 0), played("odd", 0, 7), played("quiet", 1, 0)}, 10);
  EXPECT_EQ(namesOf(worst), (std::vector<std::string>{"quiet", "odd", "none"}));
  EXPECT_TRUE(worst[0].rate);
  EXPECT_FALSE(worst[1].rate);
}

TEST(FleetRanking, NoMoreThanAskedAndTheWorstOfThem) {
  std::vector<Played> all;
  for (int i = 0; i < 500; ++i) {
    all.push_back(played(std::to_string(i), i * 37 % 11, i * 7919 % 1500));
  }
  const auto whole = worstOf(all, all.size());
  ASSERT_EQ(whole.size(), all.size());
  const auto few = namesOf(worstOf(all, 7));
  const auto ordered = namesOf(whole);
  EXPECT_TRUE(std::equal(few.begin(), few.end(), ordered.begin()));
  EXPECT_EQ(few.size(), 7U);
  EXPECT_TRUE(worstOf({}, 7).empty());
  EXPECT_TRUE(worstOf(all, 0).empty());
}

TEST(FleetRanking, ARateHasThreeDigits) {
  EXPECT_EQ(rateText(0), "0");
  EXPECT_EQ(rateText(0.02532), "0.0253");
  EXPECT_EQ(rateText(1.2345), "1.23");
  EXPECT_EQ(rateText(99.97), "100");
  EXPECT_EQ(rateText(1234.5), "1234");
  EXPECT_EQ(rateText(12'345'678), "12345678");
}

}  // namespace
}  // namespace tarn::fleet
