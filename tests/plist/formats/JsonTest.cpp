// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/Json.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "plist/Dictionary.h"

namespace tarn::plist {
namespace {

std::string json(const ValueView& value) {
  std::string out;
  appendJson(out, value);
  return out;
}

TEST(Json, NumbersKeepTheirKind) {
  EXPECT_EQ(json(Array{true, false, 1, -2, UINT64_MAX, 1.0, 2.5F, 1e20}),
            "[true,false,1,-2,18446744073709551615,1.0,2.5,1e+20]");
}

TEST(Json, NotFiniteNumbersAreTexts) {
  EXPECT_EQ(json(Array{std::nan(""), HUGE_VAL, -HUGE_VALF}), R"(["nan","inf","-inf"])");
}

TEST(Json, DatesAreIsoTextsWithTheDecimalsTheyHave) {
  EXPECT_EQ(json(Date{1795168800.0}), R"("2026-11-20T10:00:00Z")");
  EXPECT_EQ(json(Date{1795168800.25}), R"("2026-11-20T10:00:00.25Z")");
  EXPECT_EQ(json(Date{-62135596800.0}), R"("0001-01-01T00:00:00Z")");
  EXPECT_EQ(json(Date{253402300799.0}), R"("9999-12-31T23:59:59Z")");
}

TEST(Json, DatesOutsideTheCalendarAreSeconds) {
  EXPECT_EQ(json(Date{253402300800.0}), "253402300800.0");
  EXPECT_EQ(json(Date{-62135596801.0}), "-62135596801.0");
  EXPECT_EQ(json(Date{HUGE_VAL}), R"("inf")");
}

TEST(Json, DataIsBase64) {
  EXPECT_EQ(json(DataView{""}), R"("")");
  EXPECT_EQ(json(DataView{"f"}), R"("Zg==")");
  EXPECT_EQ(json(DataView{"fo"}), R"("Zm8=")");
  EXPECT_EQ(json(DataView{"foo"}), R"("Zm9v")");
  EXPECT_EQ(json(DataView{"foob"}), R"("Zm9vYg==")");
  EXPECT_EQ(json(DataView{"\xff\xfe\xfd"}), R"("//79")");
}

TEST(Json, TextsAreEscaped) {
  EXPECT_EQ(json("a\"b\\c\n\x01\x7f\xc3\xa9/"), "\"a\\\"b\\\\c\\n\\u0001\x7f\xc3\xa9/\"");
}

// Texts are looked at eight characters at a time, so each character is put at each place of short and long ones.
TEST(Json, EachCharacterIsEscapedAtEachPlaceOfAText) {
  for (std::size_t size = 1; size <= 26; ++size) {
    for (std::size_t at = 0; at < size; ++at) {
      for (int code = 0; code < 256; ++code) {
        const char character = static_cast<char>(code);
        const bool isEscaped = code < 0x20 || character == '"' || character == '\\';
        const std::string before(at, '\xc3');
        const std::string after(size - at - 1, '!');
        const std::string written = json(before + character + after);
        ASSERT_EQ(written.starts_with('"' + before + '\\'), isEscaped) << code << " at " << at << " of " << size;
        if (!isEscaped) {
          ASSERT_EQ(written, '"' + before + character + after + '"');
        }
      }
    }
  }
}

TEST(Json, ContainersKeepTheirOrder) {
  EXPECT_EQ(json(Dictionary{{"b", Array{}}, {"a", Dictionary{{"x", "y"}}}}), R"({"b":[],"a":{"x":"y"}})");
}

TEST(Json, AbsentValuesAreNull) {
  EXPECT_EQ(json(ValueView()), "null");
}

TEST(Json, BackspaceAndFormFeedHaveShortEscapes) {
  EXPECT_EQ(json("\b\f"), R"("\b\f")");
}

TEST(Json, ADateJustBeforeASecondIsThatSecond) {
  EXPECT_EQ(json(Date{1795168799.9999998}), R"("2026-11-20T10:00:00Z")");
  EXPECT_EQ(json(Date{1795168799.999999}), R"("2026-11-20T09:59:59.999999Z")");
}

}  // namespace
}  // namespace tarn::plist
