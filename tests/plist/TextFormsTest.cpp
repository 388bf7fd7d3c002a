// SPDX-License-Identifier: Apache-2.0
// The text forms that everything else is put together from: bytes in hexadecimal, moments in UTC.
#include <gtest/gtest.h>

#include "plist/CalendarDate.h"
#include "plist/EscapedText.h"
#include "plist/Hex.h"

namespace tarn::plist {
namespace {

std::string dateAndTime(double epochSeconds) {
  const auto date = calendarDate(epochSeconds);
  std::string text;
  if (date) {
    appendDateAndTime(text, *date, 'T');
  }
  return text;
}

TEST(Hex, AByteIsTwoSmallDigits) {
  std::string text = "x";
  appendHex(text, std::string_view("\x00\x0A\x9F\xFF", 4));
  appendHex(text, '\x7E');
  EXPECT_EQ(text, "x000a9fff7e");
}

std::string printable(std::string_view text, LineEnds lineEnds = LineEnds::Escaped) {
  std::string shown;
  appendPrintable(shown, text, lineEnds);
  return shown;
}

TEST(Printable, PlainTextStaysAsItIs) {
  EXPECT_EQ(printable(""), "");
  EXPECT_EQ(printable(" ~\\\"{}"), " ~\\\"{}");
  EXPECT_EQ(printable("\u00a0\u00e9\u4e2d\U0001f600"), "\u00a0\u00e9\u4e2d\U0001f600");
}

TEST(Printable, ControlsAreWrittenOut) {
  EXPECT_EQ(printable(std::string_view("\0\x1f\x20\x7e\x7f", 5)), "\\u0000\\u001f ~\\u007f");
  EXPECT_EQ(printable("\u0080\u009f\u00a0"), "\\u0080\\u009f\u00a0");
}

TEST(Printable, WhatTurnsOrEndsALineIsWrittenOut) {
  EXPECT_EQ(printable("\u061b\u061c\u061d"), "\u061b\\u061c\u061d");
  EXPECT_EQ(printable("\u200d\u200e\u200f\u2010"), "\u200d\\u200e\\u200f\u2010");
  EXPECT_EQ(printable("\u2027\u2028\u2029\u202a\u202e\u202f"), "\u2027\\u2028\\u2029\\u202a\\u202e\u202f");
  EXPECT_EQ(printable("\u2065\u2066\u2069\u206a"), "\u2065\\u2066\\u2069\u206a");
}

TEST(Printable, BytesThatAreNoCharacterAreWrittenOut) {
  EXPECT_EQ(printable("a\x9b\xff\xc3"), "a\\u009b\\u00ff\\u00c3");
  EXPECT_EQ(printable("\xe2\x80z"), "\\u00e2\\u0080z");
}

TEST(Printable, LineEndsAreAsAskedFor) {
  EXPECT_EQ(printable("a\n\nb\r\n"), "a\\u000a\\u000ab\\u000d\\u000a");
  EXPECT_EQ(printable("a\n\nb\r\n", LineEnds::Indented), "a\n\t\n\tb\\u000d\n\t");
  EXPECT_EQ(printable("a\n\nb\r\n", LineEnds::Kept), "a\n\nb\\u000d\n");
}

TEST(CalendarDate, MomentsOfTheYears1To9999HaveOne) {
  EXPECT_EQ(dateAndTime(1763632800), "2025-11-20T10:00:00");
  EXPECT_EQ(dateAndTime(951782399), "2000-02-28T23:59:59");
  EXPECT_EQ(dateAndTime(951782400), "2000-02-29T00:00:00");
  EXPECT_EQ(dateAndTime(-1), "1969-12-31T23:59:59");
  EXPECT_EQ(dateAndTime(-62135596800.0), "0001-01-01T00:00:00");
  EXPECT_EQ(dateAndTime(253402300799.0), "9999-12-31T23:59:59");
  EXPECT_EQ(dateAndTime(-62135596801.0), "");
  EXPECT_EQ(dateAndTime(253402300800.0), "");
}

TEST(CalendarDate, FractionIsRoundedToMicrosecondsIntoTheNextSecond) {
  EXPECT_EQ(calendarDate(0.125)->microsecond, 125000);
  EXPECT_EQ(calendarDate(0.9999999)->microsecond, 0);
  EXPECT_EQ(dateAndTime(0.9999999), "1970-01-01T00:00:01");
}

TEST(CalendarDate, CompactFormIsThatOfFileNames) {
  std::string text;
  appendCompactDateAndTime(text, *calendarDate(1763632805));
  EXPECT_EQ(text, "20251120-100005");
}

}  // namespace
}  // namespace tarn::plist
