// SPDX-License-Identifier: Apache-2.0
// The comparisons, the bounds and all the labels that the walks share.
#include "derived/TarnReportingSegments.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "testing/FakePlatform.h"
#include "tests/derived/DerivedMessages.h"

namespace tarn {
namespace {

using namespace testing;
using Bounds = std::vector<double>;

constexpr double kInfinity = std::numeric_limits<double>::infinity();

Bounds listOf(std::span<const double> bounds) {
  return {bounds.begin(), bounds.end()};
}

// A label, and the least number that has it.
struct Label {
  double from;
  const char* text;
};

// Each label from its least number on, and the one before it just below.
template <class LabelOf>
void expectLabels(const std::vector<Label>& labels, const LabelOf& labelOf) {
  const char* before = labels.front().text;
  for (const Label& label : labels) {
    EXPECT_EQ(labelOf(label.from), label.text) << label.from;
    EXPECT_EQ(labelOf(std::nextafter(label.from, -kInfinity)), before) << label.from;
    before = label.text;
  }
  EXPECT_EQ(labelOf(1e300), before);
}

TEST(Segments, BoundsOfLengthsAreSecondsUpToFiveHours) {
  EXPECT_EQ(listOf(TarnReportingUtilityBucketNumberToStringTimes()),
            (Bounds{0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000}));
}

TEST(Segments, BoundsOfVolumesAreSixteenths) {
  EXPECT_EQ(listOf(TarnReportingUtilityBucketNumberToStringVolumes()),
            (Bounds{0, 0.0625, 0.125, 0.1875, 0.25, 0.3125, 0.375, 0.4375, 0.5, 0.5625, 0.625, 0.6875, 0.75, 0.8125,
                    0.875, 0.9375, 1}));
}

TEST(Segments, EveryLengthHasTheNearestLabelAndTheLargerOfTwo) {
  expectLabels({{0, "0"},
                {0.5, "1"},
                {3, "5"},
                {7.5, "10"},
                {20, "30"},
                {45, "60"},
                {180, "300"},
                {1050, "1800"},
                {2700, "3600"},
                {5400, "7200"},
                {12600, "18000"}},
               TarnReportingSegmentLengthLabel);
}

TEST(Segments, EveryVolumeHasTheNearestLabelAndTheLargerOfTwo) {
  expectLabels({{0, "0.0"},
                {0.03125, "0.0625"},
                {0.09375, "0.125"},
                {0.15625, "0.1875"},
                {0.21875, "0.25"},
                {0.28125, "0.3125"},
                {0.34375, "0.375"},
                {0.40625, "0.4375"},
                {0.46875, "0.5"},
                {0.53125, "0.5625"},
                {0.59375, "0.625"},
                {0.65625, "0.6875"},
                {0.71875, "0.75"},
                {0.78125, "0.8125"},
                {0.84375, "0.875"},
                {0.90625, "0.9375"},
                {0.96875, "1.0"}},
               TarnReportingVolumeLabel);
}

TEST(Segments, NumbersDifferByTheirExactValueAndOthersAsNumbers) {
  EXPECT_TRUE(TarnReportingNumbersDiffer(std::int64_t{9007199254740993}, std::int64_t{9007199254740992}));
  EXPECT_FALSE(TarnReportingNumbersDiffer(1, 1.0));
  EXPECT_FALSE(TarnReportingNumbersDiffer("1.5 of all", 1.5));
  EXPECT_FALSE(TarnReportingNumbersDiffer(1.5, "1.5"));
  EXPECT_FALSE(TarnReportingNumbersDiffer("1.5", "1.50"));
  EXPECT_TRUE(TarnReportingNumbersDiffer("1.5", 1));
}

TEST(Segments, TextsDifferByTheirBytesAndOthersByTheirDescription) {
  EXPECT_TRUE(TarnReportingTextsDiffer("a", "A"));
  EXPECT_FALSE(TarnReportingTextsDiffer("a", std::string("a")));
  EXPECT_FALSE(TarnReportingTextsDiffer(5, "5"));
  EXPECT_FALSE(TarnReportingTextsDiffer("5", 5));
  EXPECT_TRUE(TarnReportingTextsDiffer(5, 6));
}

TEST(Segments, ClockCountsFromItsStartAndAbsentTimesAsZero) {
  TarnReportingSegmentClock clock;
  EXPECT_FALSE(clock.started());
  EXPECT_EQ(clock.secondsUntil(7), 7);
  clock.startAt(3);
  EXPECT_TRUE(clock.started());
  EXPECT_EQ(clock.secondsUntil(10), 7);
  EXPECT_EQ(clock.secondsUntil({}), -3);
  clock.clear();
  EXPECT_FALSE(clock.started());
  clock.startAt({});
  EXPECT_FALSE(clock.started());
}

TEST(Segments, NumberingTellsEachMessageHowManyTheyAre) {
  const FakePlatform platform;
  const TarnReportingSessionMessageList messages = messageListOf({at(0), at(1), at(2)});
  TarnReportingNumberMessages(messages);
  EXPECT_EQ(rows(messages, {"msgcnt"}), (Rows{"3", "3", "3"}));
}

}  // namespace
}  // namespace tarn
