// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Texts.h"

#include <gtest/gtest.h>

#include <limits>

#include "tests/report/Rows.h"
#include "tools/report/Scale.h"
#include "tools/report/Thinning.h"

namespace tarn::report {
namespace {

TEST(ReportTexts, NumbersHaveAtMostThreeDecimals) {
  EXPECT_EQ(numberText(20.0), "20");
  EXPECT_EQ(numberText(0.125), "0.125");
  EXPECT_EQ(numberText(0.0004), "0");
  EXPECT_EQ(numberText(-0.0004), "0");
  EXPECT_EQ(numberText(1200.5), "1200.5");
  EXPECT_EQ(numberText(1e20), "1e+20");
  EXPECT_EQ(numberText(std::numeric_limits<double>::infinity()), "inf");
  EXPECT_EQ(numberText(std::int64_t{-5}), "-5");
}

TEST(ReportTexts, TimesAreOfUtc) {
  EXPECT_EQ(timeText(kStart + 0.4), "2026-11-20 10:00:00");
  EXPECT_EQ(timeText(kStart + 0.6), "2026-11-20 10:00:01");
  EXPECT_EQ(preciseTimeText(kStart + 0.125), "2026-11-20 10:00:00.125");
  EXPECT_EQ(preciseTimeText(kStart + 0.9996), "2026-11-20 10:00:01.000");
  EXPECT_EQ(dayText(kStart), "2026-11-20");
  EXPECT_EQ(timeText(1e15), "1000000000000000");
}

TEST(ReportTexts, DurationsHaveTheirTwoLargestUnits) {
  EXPECT_EQ(durationText(0.254), "0.25 s");
  EXPECT_EQ(durationText(20), "20 s");
  EXPECT_EQ(durationText(59.9), "59.9 s");
  EXPECT_EQ(durationText(60), "1 min 0 s");
  EXPECT_EQ(durationText(3599), "59 min 59 s");
  EXPECT_EQ(durationText(7500), "2 h 5 min");
  EXPECT_EQ(durationText(90000), "1 d 1 h");
}

TEST(ReportTexts, ShortenedTextHasWholeCharacters) {
  EXPECT_EQ(shortened("abc", 3), "abc");
  EXPECT_EQ(shortened("abcd", 3), "abc\u2026");
  EXPECT_EQ(shortened("\u00e4\u00f6\u00fc\u00df", 2), "\u00e4\u00f6\u2026");
  EXPECT_EQ(shortened("\xff\xff\xff", 2), "\xff\xff\u2026");
}

TEST(ReportScale, PlacesAreInProportionAndHeldToTheEnds) {
  const Scale scale{10, 20, 100, 200};
  EXPECT_EQ(scale.at(10), 100);
  EXPECT_EQ(scale.at(15), 200);
  EXPECT_EQ(scale.at(20), 300);
  EXPECT_EQ(scale.at(5), 100);
  EXPECT_EQ(scale.at(25), 300);
  EXPECT_EQ((Scale{10, 10, 100, 200}).at(10), 100);
}

std::vector<std::string> textsOf(const std::vector<Tick>& ticks) {
  std::vector<std::string> texts;
  for (const Tick& tick : ticks) {
    texts.push_back(tick.text);
  }
  return texts;
}

TEST(ReportScale, ValueTicksAreRoundAndReachTheHighest) {
  using Texts = std::vector<std::string>;
  EXPECT_EQ(textsOf(valueTicks(9.5, 4)), (Texts{"0", "5", "10"}));
  EXPECT_EQ(textsOf(valueTicks(0.07, 4)), (Texts{"0", "0.02", "0.04", "0.06", "0.08"}));
  EXPECT_EQ(textsOf(valueTicks(0, 4)), (Texts{"0", "1"}));
}

TEST(ReportScale, TimeTicksAreRoundMomentsOfTheStretch) {
  using Texts = std::vector<std::string>;
  EXPECT_EQ(textsOf(timeTicks(kStart + 1, kStart + 100, 7)),
            (Texts{"10:00:15", "10:00:30", "10:00:45", "10:01:00", "10:01:15", "10:01:30"}));
  EXPECT_EQ(textsOf(timeTicks(kStart, kStart + 7200, 4)), (Texts{"10:00", "10:30", "11:00", "11:30", "12:00"}));
  EXPECT_EQ(textsOf(timeTicks(kStart, kStart + 3 * 86400.0, 4)), (Texts{"2026-11-21", "2026-11-22", "2026-11-23"}));
  EXPECT_TRUE(timeTicks(kStart, kStart, 4).empty());
}

TEST(ReportScale, TicksOfAnyStretchAreFew) {
  for (const double length : {1e-9, 0.01, 3.0, 1e5, 1e9, 1e18}) {
    EXPECT_LE(timeTicks(kStart, kStart + length, 7).size(), 8U) << length;
    EXPECT_LE(valueTicks(length, 4).size(), 5U) << length;
    EXPECT_GE(valueTicks(length, 4).back().value, length * 0.999) << length;
  }
}

TEST(ReportThinning, FewItemsStayAsTheyAre) {
  const std::vector<Mark> marks{{1, "a", 1}, {2, "b", 1}};
  EXPECT_EQ(joined(marks, 2), marks);
}

TEST(ReportThinning, JoinedMarksKeepTheirCountAndTheFirstTime) {
  std::vector<Mark> marks;
  for (int index = 0; index < 1000; ++index) {
    marks.push_back({static_cast<double>(index), std::to_string(index), 1});
  }
  const std::vector<Mark> fewer = joined(marks, 10);
  ASSERT_EQ(fewer.size(), 10U);
  EXPECT_EQ(fewer[0], (Mark{0, "0", 100}));
  EXPECT_EQ(fewer[9].count, 100);
}

TEST(ReportThinning, MarksOfOneMomentBecomeOne) {
  EXPECT_EQ(joined(std::vector<Mark>(5, Mark{3, "x", 1}), 2), (std::vector<Mark>{{3, "x", 5}}));
}

TEST(ReportThinning, ThinnedStepsEndWithTheLast) {
  std::vector<Step> steps;
  for (int index = 0; index < 1000; ++index) {
    steps.push_back({static_cast<double>(index), index / 1000.0});
  }
  const std::vector<Step> fewer = thinned(steps, 10);
  ASSERT_EQ(fewer.size(), 10U);
  EXPECT_EQ(fewer.back(), steps.back());
}

TEST(ReportThinning, LongestSpansStayInTheOrderOfTime) {
  const std::vector<Span> spans{{0, 5, "a"}, {5, 6, "b"}, {6, 20, "c"}, {20, 25, "d"}};
  EXPECT_EQ(longest(spans, 2), (std::vector<Span>{{0, 5, "a"}, {6, 20, "c"}}));
}

}  // namespace
}  // namespace tarn::report
