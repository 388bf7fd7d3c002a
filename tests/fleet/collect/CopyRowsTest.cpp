// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/CopyRows.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "fleet/collect/CleanText.h"

namespace tarn::fleet {
namespace {

constexpr std::size_t kHead = 19;

std::string bodyOf(CopyRows rows) {
  const std::string all = rows.finish();
  return all.substr(kHead, all.size() - kHead - 2);
}

std::string cleanTextOf(std::string_view text) {
  std::string made;
  return std::string(cleanText(text, made));
}

std::string cleanJsonOf(std::string_view text) {
  std::string made;
  return std::string(cleanJson(text, made));
}

TEST(FleetCopyRows, BeginAndEndAsTheDatabaseSaysAlsoWithoutRows) {
  CopyRows rows;
  EXPECT_EQ(rows.finish(), std::string("PGCOPY\n\xff\r\n\0\0\0\0\0\0\0\0\0\xff\xff", 21));
}

TEST(FleetCopyRows, NumbersHaveTheHighestByteFirst) {
  CopyRows rows;
  rows.begin(3);
  rows.small(0x0102);
  rows.integer(-2);
  rows.number(0x0102030405060708);
  EXPECT_EQ(bodyOf(std::move(rows)),
            std::string("\0\3\0\0\0\2\1\2\0\0\0\4\xff\xff\xff\xfe\0\0\0\10\1\2\3\4\5\6\7\10", 28));
}

TEST(FleetCopyRows, WhatIsNullHasNoBytesAndWhatIsEmptyHasNone) {
  CopyRows rows;
  rows.begin(2);
  rows.null();
  rows.text("");
  EXPECT_EQ(bodyOf(std::move(rows)), std::string("\0\2\xff\xff\xff\xff\0\0\0\0", 10));
}

TEST(FleetCopyRows, WhatWouldBeAnEscapeElsewhereIsBytesHere) {
  CopyRows rows;
  rows.begin(1);
  rows.text("a\tb\\N\n");
  EXPECT_EQ(bodyOf(std::move(rows)), std::string("\0\1\0\0\0\6a\tb\\N\n", 12));
}

TEST(FleetCopyRows, JsonSaysItsVersionFirst) {
  CopyRows rows;
  rows.begin(1);
  rows.json("{}");
  EXPECT_EQ(bodyOf(std::move(rows)), std::string("\0\1\0\0\0\3\1{}", 9));
}

TEST(FleetCopyRows, TimesAreMicrosecondsSince2000) {
  CopyRows rows;
  rows.begin(1);
  rows.time(946684800.000001);
  EXPECT_EQ(bodyOf(std::move(rows)), std::string("\0\1\0\0\0\10\0\0\0\0\0\0\0\1", 14));
}

TEST(FleetCopyRows, ATimeThatCannotBeIsTheNearestThatCan) {
  EXPECT_EQ(microsecondsOf(1795000000.25), 1'795'000'000'250'000);
  EXPECT_EQ(microsecondsOf(0), 0);
  EXPECT_EQ(microsecondsOf(-1), 0);
  EXPECT_EQ(microsecondsOf(std::nan("")), 0);
  EXPECT_EQ(microsecondsOf(-std::numeric_limits<double>::infinity()), 0);
  EXPECT_EQ(microsecondsOf(std::numeric_limits<double>::infinity()), 4'102'444'799'000'000);
  EXPECT_EQ(microsecondsOf(4'102'444'799.0), 4'102'444'799'000'000);
  EXPECT_EQ(microsecondsOf(4'102'444'800.0), 4'102'444'799'000'000);
}

TEST(FleetCleanText, WhatTheDatabaseTakesStaysAsItIs) {
  EXPECT_EQ(cleanTextOf(""), "");
  EXPECT_EQ(cleanTextOf("plain\t\n\x01"), "plain\t\n\x01");
  EXPECT_EQ(cleanTextOf("\xC3\xA4\xE2\x82\xAC\xF0\x9F\x8E\xB5"), "\xC3\xA4\xE2\x82\xAC\xF0\x9F\x8E\xB5");
}

TEST(FleetCleanText, EachByteThatItDoesNotTakeIsReplaced) {
  EXPECT_EQ(cleanTextOf(std::string_view("a\0b", 3)),
            "a\xEF\xBF\xBD"
            "b");
  EXPECT_EQ(cleanTextOf("\xff"
                        "a\xc3"),
            "\xEF\xBF\xBD"
            "a\xEF\xBF\xBD");
  // Half of a pair, as it were in UTF-8, is three of them.
  EXPECT_EQ(cleanTextOf("\xED\xA0\x80"), "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
}

TEST(FleetCleanText, EscapesOfJsonAreReplacedOnlyWhereTheDatabaseDoesNotTakeThem) {
  EXPECT_EQ(cleanJsonOf(R"({"a":"\u0000"})"), R"({"a":"\ufffd"})");
  EXPECT_EQ(cleanJsonOf(R"("\ud83c\udfb5 \uD83C\uDFB5")"), R"("\ud83c\udfb5 \uD83C\uDFB5")");
  EXPECT_EQ(cleanJsonOf(R"("\ud83c \udfb5")"), R"("\ufffd \ufffd")");
  EXPECT_EQ(cleanJsonOf(R"("\ud83c\ud83c\udfb5")"), R"("\ufffd\ud83c\udfb5")");
  EXPECT_EQ(cleanJsonOf(R"("\u00000 \ud7ff \ue000")"), R"("\ufffd0 \ud7ff \ue000")");
  EXPECT_EQ(cleanJsonOf(R"("\ud83c)"), R"("\ufffd)");
  EXPECT_EQ(cleanJsonOf(R"("\u000)"), R"("\u000)");
}

TEST(FleetCleanText, ABackslashThatIsEscapedBeginsNoEscape) {
  EXPECT_EQ(cleanJsonOf(R"("\\u0000")"), R"("\\u0000")");
  EXPECT_EQ(cleanJsonOf(R"("\\\u0000")"), R"("\\\ufffd")");
  EXPECT_EQ(cleanJsonOf("\"\xff\\u0000\""), "\"\xEF\xBF\xBD\\ufffd\"");
}

}  // namespace
}  // namespace tarn::fleet
