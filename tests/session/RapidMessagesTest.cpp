// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

#include "session/TarnReportingSessionWorkerUtility.h"
#include "tests/derived/DerivedMessages.h"

namespace tarn {
namespace {

using namespace testing;

const std::vector<plist::Key> kKeys{"A", "B", "C"};

// What is left of the messages.
TarnReportingSessionMessages combine(const TarnReportingSessionMessages& messages, double pause = 5,
                                     const std::vector<plist::Key>& keys = kKeys) {
  const FakePlatform platform;
  const TarnReportingSessionMessageList list = messageListOf(messages);
  const auto combined = TarnReportingSessionWorkerUtility::combineRapidMessages(list, keys, pause);
  TarnReportingSessionMessages left;
  for (std::size_t index = 0; index < messages.size(); ++index) {
    if (!combined.isMerged(index)) {
      left.push_back(messages[index]);
    }
  }
  return left;
}

const std::vector<std::string> kColumns{"A", "B", "C", "tarnreporting_timestamp"};

TEST(CombineRapidMessages, EmptyInputYieldsAnEmptyResult) {
  EXPECT_TRUE(combine({}).empty());
}

TEST(CombineRapidMessages, UnrelatedMessageStaysInPlaceAndDoesNotInterruptAGroup) {
  const TarnReportingSessionMessages messages{at(0, {{"A", 1}}), at(1, {{"other", 7}}), at(2, {{"B", 2}})};
  const auto result = combine(messages);
  EXPECT_EQ(rows(result, kColumns), (Rows{"1 2 (null) 2", "(null) (null) (null) 1"}));
  EXPECT_EQ(result[1]->message(), (plist::Dictionary{{"other", 7}, {"tarnreporting_timestamp", 1.0}}));
}

TEST(CombineRapidMessages, RepeatedKeyClosesTheGroupHoweverCloseInTime) {
  EXPECT_EQ(rows(combine({at(0, {{"A", 1}}), at(0.1, {{"A", 2}})}), kColumns),
            (Rows{"1 (null) (null) 0", "2 (null) (null) 0.1"}));
}

TEST(CombineRapidMessages, LateMessagesAreKeptWholeAndMeasuredAgainstTheOldHead) {
  EXPECT_EQ(rows(combine({at(0, {{"A", 1}}), at(6, {{"B", 2}}), at(7, {{"C", 3}})}), kColumns),
            (Rows{"1 (null) (null) 0", "(null) 2 (null) 6", "(null) (null) 3 7"}));
}

TEST(CombineRapidMessages, PauseOfExactlyTheLimitIsTooLong) {
  EXPECT_EQ(rows(combine({at(0, {{"A", 1}}), at(5, {{"B", 2}})}), kColumns),
            (Rows{"1 (null) (null) 0", "(null) 2 (null) 5"}));
}

TEST(CombineRapidMessages, PauseJustBelowTheLimitMerges) {
  EXPECT_EQ(rows(combine({at(0, {{"A", 1}}), at(4.999, {{"B", 2}})}), kColumns), (Rows{"1 2 (null) 4.999"}));
}

TEST(CombineRapidMessages, MessageWithSeveralKeysIsFiledUnderTheFirstOfTheList) {
  // Filed under A: the B that follows is another key of the same group, the A after it repeats.
  EXPECT_EQ(rows(combine({at(0, {{"B", 1}, {"A", 1}}), at(1, {{"B", 2}}), at(2, {{"A", 3}})}), kColumns),
            (Rows{"1 2 (null) 1", "3 (null) (null) 2"}));
}

TEST(CombineRapidMessages, NextPauseIsMeasuredFromTheLatestMergedMessage) {
  EXPECT_EQ(rows(combine({at(0, {{"A", 1}}), at(4, {{"B", 2}}), at(8, {{"C", 3}})}), kColumns), (Rows{"1 2 3 8"}));
}

TEST(CombineRapidMessages, KeyOfALateMessageCountsAsSeen) {
  EXPECT_EQ(rows(combine({at(0, {{"A", 1}}), at(6, {{"B", 2}}), at(6.5, {{"B", 3}}), at(7, {{"A", 4}})}), kColumns),
            (Rows{"1 (null) (null) 0", "(null) 2 (null) 6", "4 3 (null) 7"}));
}

TEST(CombineRapidMessages, OutOfOrderTimeMerges) {
  EXPECT_EQ(rows(combine({at(100, {{"A", 1}}), at(3, {{"B", 2}})}), kColumns), (Rows{"1 2 (null) 3"}));
}

TEST(CombineRapidMessages, EqualTimesMerge) {
  EXPECT_EQ(rows(combine({at(3, {{"A", 1}}), at(3, {{"B", 2}})}, 0.1), kColumns), (Rows{"1 2 (null) 3"}));
}

TEST(CombineRapidMessages, MissingTimeReadsAsZero) {
  EXPECT_EQ(rows(combine({unstamped({{"A", 1}}), at(4, {{"B", 2}})}), kColumns), (Rows{"1 2 (null) 4"}));
  EXPECT_EQ(rows(combine({unstamped({{"A", 1}}), at(6, {{"B", 2}})}), kColumns),
            (Rows{"1 (null) (null) (null)", "(null) 2 (null) 6"}));
  EXPECT_EQ(rows(combine({at(6, {{"A", 1}}), unstamped({{"B", 2}})}), kColumns), (Rows{"1 2 (null) 6"}));
}

TEST(CombineRapidMessages, TimeThatIsATextIsReadByItsDigits) {
  EXPECT_EQ(rows(combine({stamped("10 s", {{"A", 1}}), stamped("16", {{"B", 2}})}), kColumns),
            (Rows{"1 (null) (null) 10 s", "(null) 2 (null) 16"}));
}

TEST(CombineRapidMessages, TimesWithoutADifferenceKeepTheMessageWhole) {
  const double infinity = std::numeric_limits<double>::infinity();
  EXPECT_EQ(combine({at(std::nan(""), {{"A", 1}}), at(1, {{"B", 2}})}).size(), 2U);
  EXPECT_EQ(combine({at(infinity, {{"A", 1}}), at(infinity, {{"B", 2}})}).size(), 2U);
  EXPECT_EQ(combine({at(1e308, {{"A", 1}}), at(-1e308, {{"B", 2}})}).size(), 1U);
}

TEST(CombineRapidMessages, MergedValuesReplaceThoseOfTheHeadAndNewOnesFollow) {
  const auto result = combine({at(0, {{"A", 1}, {"x", "old"}}), at(1, {{"B", 2}, {"x", "new"}, {"y", true}})});
  EXPECT_EQ(result.at(0)->message(),
            (plist::Dictionary{{"A", 1}, {"x", "new"}, {"tarnreporting_timestamp", 1.0}, {"B", 2}, {"y", true}}));
}

TEST(CombineRapidMessages, ResultHoldsTheSameRecordsAndLeavesTheInputListAlone) {
  const TarnReportingSessionMessages messages{at(0, {{"A", 1}}), at(1, {{"B", 2}}), at(9, {{"C", 3}})};
  const auto result = combine(messages);
  ASSERT_EQ(result.size(), 2U);
  EXPECT_EQ(result[0], messages[0]);
  EXPECT_EQ(result[1], messages[2]);
  EXPECT_EQ(messages.size(), 3U);
  EXPECT_EQ(messages[0]->message().get("B").asInt64(), 2);
  EXPECT_EQ(messages[1]->message(), (plist::Dictionary{{"B", 2}, {"tarnreporting_timestamp", 1.0}}));
}

TEST(CombineRapidMessages, CopyOfAHeadsPayloadKeepsWhatItWas) {
  const auto head = at(0, {{"A", 1}});
  const plist::Dictionary before = head->message();
  combine({head, at(1, {{"B", 2}})});
  EXPECT_EQ(before, (plist::Dictionary{{"A", 1}, {"tarnreporting_timestamp", 0.0}}));
}

TEST(CombineRapidMessages, WithoutKeysEverythingPassesThrough) {
  EXPECT_EQ(combine({at(0, {{"A", 1}}), at(0, {{"B", 1}})}, 5, {}).size(), 2U);
}

TEST(IsParleyXYerrorMessage, AnyKeyWithThePrefixCounts) {
  const auto is = [](plist::Dictionary payload) {
    return TarnReportingSessionWorkerUtility::isParleyXYerrorMessage(*unstamped(std::move(payload)));
  };
  EXPECT_TRUE(is({{"other", 1}, {"plac_invalid_x", 0}}));
  EXPECT_TRUE(is({{"plac_invalid_", 0}}));
  EXPECT_FALSE(is({{"plac_invalid", 1}}));
  EXPECT_FALSE(is({{"PLAC_invalid_x", 1}}));
  EXPECT_FALSE(is({{"a_plac_invalid_x", 1}}));
  EXPECT_FALSE(is({{"key", "plac_invalid_x"}}));
  EXPECT_FALSE(is({}));
}

}  // namespace
}  // namespace tarn
