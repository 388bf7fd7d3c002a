// SPDX-License-Identifier: Apache-2.0
#include "host/system/JsonValues.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace tarn::linux_host {
namespace {

using plist::Kind;

std::string faultOf(std::string_view text) {
  const JsonReading reading = readJson(text);
  EXPECT_FALSE(reading.value.present());
  return reading.fault ? reading.fault->description() : "no fault";
}

TEST(JsonValues, ReadsIntegersAsIntegersAndOtherNumbersAsDoubles) {
  const JsonReading reading =
      readJson(R"({"a": 1, "b": -9223372036854775808, "c": 18446744073709551615, "d": 1.0, "e": 1e2})");
  ASSERT_FALSE(reading.fault);
  const plist::Dictionary read = reading.value.view().dictionary();
  EXPECT_EQ(read["a"].kind(), Kind::Signed);
  EXPECT_EQ(read["b"].signedValue(), std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(read["c"].unsignedValue(), std::numeric_limits<std::uint64_t>::max());
  EXPECT_EQ(read["d"].kind(), Kind::Double);
  EXPECT_EQ(read["e"].doubleValue(), 100.0);
}

TEST(JsonValues, ReadsTextsBooleansAndContainersInTheirOrder) {
  const JsonReading reading = readJson(R"({"z": "text", "a": [true, false, []], "m": {}})");
  ASSERT_FALSE(reading.fault);
  EXPECT_EQ(plist::description(reading.value), "{z = text; a = (1, 0, ()); m = {}}");
}

TEST(JsonValues, ReadsTheDateAndDataForms) {
  const JsonReading reading =
      readJson(R"({"when": {"$date": 1.5}, "whole": {"$date": 2}, "bytes": {"$data": "Cht/"}})");
  ASSERT_FALSE(reading.fault);
  const plist::Dictionary read = reading.value.view().dictionary();
  EXPECT_EQ(read["when"].dateValue().epochSeconds, 1.5);
  EXPECT_EQ(read["whole"].dateValue().epochSeconds, 2.0);
  EXPECT_EQ(read["bytes"].data(), "\x0a\x1b\x7f");
}

TEST(JsonValues, ObjectWithADollarMemberAmongOthersIsADictionary) {
  const JsonReading reading = readJson(R"({"$date": 1, "other": 2})");
  ASSERT_FALSE(reading.fault);
  EXPECT_EQ(reading.value.kind(), Kind::Dictionary);
}

TEST(JsonValues, TellsTheLineOfEachMemberOfTheOutermostObject) {
  const JsonReading reading = readJson("{\"a\": 1,\n\n\"b\": {\"x\":\n1}, \"c\": 2}");
  ASSERT_FALSE(reading.fault);
  EXPECT_EQ(reading.memberLines, (std::vector<std::size_t>{1, 3, 4}));
}

TEST(JsonValues, NullIsAFaultWithItsPlace) {
  EXPECT_EQ(faultOf("{\n  \"a\": null\n}"), "2:11: null is not allowed here");
}

TEST(JsonValues, NullMemberIsAbsentToThoseWhoWantIt) {
  const auto read = [](std::string_view text) { return readJson(text, kMaximumJsonNesting, JsonNull::Absent); };
  const JsonReading reading = read("{\"a\": null,\n\"b\": {\"c\": null, \"d\": 1},\n\"e\": null,\n\"f\": 2}");
  ASSERT_FALSE(reading.fault);
  EXPECT_EQ(reading.value, plist::Value(plist::Dictionary{{"b", plist::Dictionary{{"d", 1}}}, {"f", 2}}));
  EXPECT_EQ(reading.memberLines, (std::vector<std::size_t>{2, 4}));
  EXPECT_EQ(read("{\"a\": null}").value, plist::Value(plist::Dictionary()));
  for (const char* text : {"null", "[null]", R"({"a": [null]})"}) {
    ASSERT_TRUE(read(text).fault) << text;
    EXPECT_EQ(read(text).fault->text, "null is not allowed here");
  }
}

TEST(JsonValues, MemberGivenTwiceIsAFault) {
  EXPECT_EQ(faultOf(R"({"a": 1, "a": 2})"), "1:16: a member stands twice in the object that ends here");
}

TEST(JsonValues, WrongDateAndDataFormsAreFaults) {
  EXPECT_EQ(faultOf(R"({"a": {"$date": "now"}})"), "1:22: $date wants a number of seconds");
  EXPECT_EQ(faultOf(R"({"a": {"$date": true}})"), "1:21: $date wants a number of seconds");
  EXPECT_EQ(faultOf(R"({"a": {"$data": "?"}})"), "1:20: $data wants a base64 text");
  EXPECT_EQ(faultOf(R"({"a": {"$data": 5}})"), "1:18: $data wants a base64 text");
}

TEST(JsonValues, SyntaxErrorNamesLineColumnAndReason) {
  EXPECT_EQ(faultOf("{\n  \"a\": 1,\n}"),
            "3:1: syntax error while parsing object key - unexpected '}'; expected string literal");
}

TEST(JsonValues, NulBehindTheValueIsAFault) {
  using namespace std::string_view_literals;
  EXPECT_EQ(faultOf("{\"a\": 1}\0 and more"sv), "1:9: a NUL is not allowed here");
  EXPECT_EQ(faultOf("{}\n\0"sv), "2:1: a NUL is not allowed here");
}

TEST(JsonValues, EmptyTextAndEarlyEndAreFaults) {
  EXPECT_NE(faultOf("").find("unexpected end of input"), std::string::npos);
  EXPECT_NE(faultOf("{\"a\": [1,").find("unexpected end of input"), std::string::npos);
}

TEST(JsonValues, TextBehindTheValueIsAFault) {
  EXPECT_EQ(faultOf("{} {}").substr(0, 5), "1:4: ");
}

TEST(JsonValues, NumbersBeyondTheirRangeAreFaults) {
  EXPECT_EQ(faultOf("{\"a\": 18446744073709551616}").substr(5), " the integer is outside -2^63 to 2^64-1");
  EXPECT_EQ(faultOf("{\n\"a\": 1e999}"), "2:10: number overflow parsing '1e999'");
}

TEST(JsonValues, TextThatIsNoUtf8IsAFaultWhoseDescriptionIsPlainText) {
  const std::string fault = faultOf("{\"a\": \"\xff\"}");
  EXPECT_NE(fault.find("ill-formed UTF-8"), std::string::npos);
  for (const char c : fault) {
    EXPECT_GE(c, ' ');
  }
}

TEST(JsonValues, NestingIsReadToItsLimitAndRefusedBehindIt) {
  const std::string atLimit = std::string(64, '[') + std::string(64, ']');
  EXPECT_FALSE(readJson(atLimit).fault);
  EXPECT_EQ(faultOf(std::string(65, '[') + std::string(65, ']')), "1:65: nested deeper than 64 levels");
  EXPECT_FALSE(readJson("[" + atLimit + "]", 65).fault);
}

TEST(JsonValues, WhatIsWrittenReadsBackEqualAndOfTheSameKind) {
  const plist::Dictionary value{{"bool", true},
                                {"negative", -5},
                                {"large", std::numeric_limits<std::uint64_t>::max()},
                                {"whole", 10.0},
                                {"tenth", 0.1},
                                {"huge", 1e300},
                                {"date", plist::Date{1795168800.25}},
                                {"data", plist::DataView{std::string_view("\0\xff", 2)}},
                                {"text", "line\nquote\" \xc3\xa9"},
                                {"array", plist::Array{1, "two", plist::Dictionary()}}};
  for (const JsonLayout layout : {JsonLayout::OneLine, JsonLayout::Indented}) {
    const std::optional<std::string> text = jsonText(value, layout);
    ASSERT_TRUE(text);
    const JsonReading reading = readJson(*text);
    ASSERT_FALSE(reading.fault) << reading.fault->description();
    EXPECT_EQ(reading.value, plist::Value(value));
    EXPECT_EQ(reading.value.view().dictionary()["whole"].kind(), Kind::Double);
  }
}

TEST(JsonValues, LayoutsAreOneLineAndIndented) {
  const plist::Dictionary value{{"a", 1}, {"b", plist::Array{1.0, plist::Array()}}, {"d", plist::Date{5}}};
  EXPECT_EQ(jsonText(value), R"({"a": 1, "b": [1.0, []], "d": {"$date": 5.0}})");
  EXPECT_EQ(jsonText(value, JsonLayout::Indented),
            "{\n  \"a\": 1,\n  \"b\": [\n    1.0,\n    []\n  ],\n  \"d\": {\"$date\": 5.0}\n}\n");
}

TEST(JsonValues, WhatWouldNotReadBackEqualIsNotWritten) {
  EXPECT_FALSE(jsonText(plist::ValueView()));
  EXPECT_FALSE(jsonText(std::numeric_limits<double>::infinity()));
  EXPECT_FALSE(jsonText(plist::Date{std::nan("")}));
  EXPECT_FALSE(jsonText("\xff"));
  EXPECT_FALSE(jsonText(plist::Dictionary{{"$date", 5}}));
  EXPECT_FALSE(jsonText(plist::Dictionary{{"inner", plist::Dictionary{{"$data", "eA=="}}}}));
  // Braces around an array alone would be a copy of it to some compilers.
  const auto nested = [](plist::Array inner, int levels) {
    for (int level = 0; level < levels; ++level) {
      plist::Array outer;
      outer.append(inner);
      inner = outer;
    }
    return inner;
  };
  EXPECT_FALSE(jsonText(nested({}, 64)));
  const plist::Array atLimit = nested(plist::Array{plist::Date{1}}, 62);
  EXPECT_TRUE(jsonText(atLimit));
  EXPECT_FALSE(jsonText(nested(atLimit, 1)));  // the form of the date is a level of its own
}

}  // namespace
}  // namespace tarn::linux_host
