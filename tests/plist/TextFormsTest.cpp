// SPDX-License-Identifier: Apache-2.0
// The text forms that everything else is put together from: bytes in hexadecimal, moments in UTC.
#include <gtest/gtest.h>

#include <cstdint>
#include <random>
#include <string>
#include <string_view>

#include "plist/CalendarDate.h"
#include "plist/EscapedText.h"
#include "plist/Hex.h"
#include "tests/support/Seeds.h"

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

// The same, one character after the other.
std::string printableOneByOne(std::string_view text) {
  std::string shown;
  while (!text.empty()) {
    std::size_t length = 1;
    while (length < text.size() && (static_cast<unsigned char>(text[length]) & 0xC0U) == 0x80) {
      ++length;
    }
    const bool isPlain = length == 1 && text[0] >= 0x20 && text[0] < 0x7F;
    shown += isPlain ? std::string(text.substr(0, 1)) : printable(text.substr(0, length));
    text.remove_prefix(length);
  }
  return shown;
}

TEST(Printable, EveryByteAtEveryPlaceOfALongText) {
  for (std::size_t length = 1; length < 20; ++length) {
    for (std::size_t at = 0; at < length; ++at) {
      for (int byte = 0; byte < 256; ++byte) {
        std::string text(length, ' ');
        text[at] = static_cast<char>(byte);
        ASSERT_EQ(printable(text), printableOneByOne(text)) << byte << " at " << at << " of " << length;
      }
    }
  }
}

TEST(Printable, LongTextsAreAsTheirCharactersAre) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937 random(seed);
    for (int round = 0; round < 20'000; ++round) {
      // Mostly plain characters, and those beside the bounds.
      constexpr std::string_view kBeside("\0\x01\x1f\x20\x21\"\\\x7e\x7f\x80\xa0\xc2\xe2\xff\n", 15);
      const auto unusualIn = std::uniform_int_distribution<int>(1, 40)(random);
      std::string text(std::uniform_int_distribution<std::size_t>(0, 70)(random), ' ');
      for (char& character : text) {
        const bool isUnusual = std::uniform_int_distribution<int>(0, unusualIn)(random) == 0;
        character = isUnusual ? kBeside[std::uniform_int_distribution<std::size_t>(0, kBeside.size() - 1)(random)]
                              : static_cast<char>(std::uniform_int_distribution<int>(0x20, 0x7E)(random));
      }
      ASSERT_EQ(printable(text), printableOneByOne(text));
    }
  }
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
