// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/DataSerialize.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>

#include "plist/Dictionary.h"

namespace tarn {
namespace {

// The document around this body.
std::string document(const std::string& body) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" + body + "</plist>\n";
}

TEST(DataSerialize, WritesADictionaryInItsOwnOrderWithTabs) {
  const plist::Dictionary value{{"zebra", 1}, {"alpha", plist::Array{true, false, "text"}}};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<dict>\n"
                                                         "\t<key>zebra</key>\n"
                                                         "\t<integer>1</integer>\n"
                                                         "\t<key>alpha</key>\n"
                                                         "\t<array>\n"
                                                         "\t\t<true/>\n"
                                                         "\t\t<false/>\n"
                                                         "\t\t<string>text</string>\n"
                                                         "\t</array>\n"
                                                         "</dict>\n"));
}

TEST(DataSerialize, WritesNumbersByTheirKind) {
  const plist::Array value{-5, 18446744073709551615ULL, 2.5, 0.1F, 10.0};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<array>\n"
                                                         "\t<integer>-5</integer>\n"
                                                         "\t<integer>18446744073709551615</integer>\n"
                                                         "\t<real>2.5</real>\n"
                                                         "\t<real>0.1</real>\n"
                                                         "\t<real>10</real>\n"
                                                         "</array>\n"));
}

TEST(DataSerialize, WritesNumbersThatAreNotFinite) {
  const double infinity = std::numeric_limits<double>::infinity();
  const plist::Array value{std::numeric_limits<double>::quiet_NaN(), infinity, -infinity};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<array>\n"
                                                         "\t<real>nan</real>\n"
                                                         "\t<real>+infinity</real>\n"
                                                         "\t<real>-infinity</real>\n"
                                                         "</array>\n"));
}

TEST(DataSerialize, WritesDatesInWholeSecondsOfUtc) {
  const plist::Array value{plist::Date{0}, plist::Date{1795168800.9}, plist::Date{-0.5}};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<array>\n"
                                                         "\t<date>1970-01-01T00:00:00Z</date>\n"
                                                         "\t<date>2026-11-20T10:00:00Z</date>\n"
                                                         "\t<date>1969-12-31T23:59:59Z</date>\n"
                                                         "</array>\n"));
}

TEST(DataSerialize, WritesTheFirstAndTheLastSecondOfTheCalendar) {
  const plist::Array value{plist::Date{-62135596800.0}, plist::Date{253402300799.5}};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<array>\n"
                                                         "\t<date>0001-01-01T00:00:00Z</date>\n"
                                                         "\t<date>9999-12-31T23:59:59Z</date>\n"
                                                         "</array>\n"));
}

TEST(DataSerialize, OneValueThatXmlCannotHoldYieldsNothingAtAnyDepth) {
  const plist::Array broken{1, "\x1B", 2};
  EXPECT_EQ(DataSerialize::getPlistBlob(plist::Dictionary{{"a", plist::Array{broken}}, {"b", 1}}), std::nullopt);
}

TEST(DataSerialize, WritesDataInBase64) {
  const plist::Array value{plist::DataView{"hello"}};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<array>\n\t<data>aGVsbG8=</data>\n</array>\n"));
}

TEST(DataSerialize, WritesEmptyContainers) {
  const plist::Dictionary value{{"a", plist::Array{}}, {"d", plist::Dictionary{}}};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<dict>\n"
                                                         "\t<key>a</key>\n"
                                                         "\t<array/>\n"
                                                         "\t<key>d</key>\n"
                                                         "\t<dict/>\n"
                                                         "</dict>\n"));
  EXPECT_EQ(DataSerialize::getPlistBlob(plist::Dictionary{}), document("<dict/>\n"));
}

TEST(DataSerialize, EscapesMarkupInKeysAndTexts) {
  const plist::Dictionary value{{"<a&b>", "1 < 2 & 3 > 2 \"quoted\"\r"}};
  EXPECT_EQ(DataSerialize::getPlistBlob(value), document("<dict>\n"
                                                         "\t<key>&lt;a&amp;b&gt;</key>\n"
                                                         "\t<string>1 &lt; 2 &amp; 3 &gt; 2 \"quoted\"&#13;</string>\n"
                                                         "</dict>\n"));
}

TEST(DataSerialize, AbsentValueYieldsNothing) {
  EXPECT_EQ(DataSerialize::getPlistBlob({}), std::nullopt);
  EXPECT_EQ(DataSerialize::getXMLInfo({}), std::nullopt);
  EXPECT_EQ(DataSerialize::getDataXMLInfo({}), std::nullopt);
  EXPECT_EQ(DataSerialize::getBase64XMLBlob({}), std::nullopt);
}

TEST(DataSerialize, TextsThatXmlCannotHoldYieldNothing) {
  for (const std::string_view text :
       {std::string_view("\0", 1), std::string_view("\x1B[0m"), std::string_view("\xFF"), std::string_view("cut \xC3"),
        std::string_view("\xC0\x80"), std::string_view("\xED\xA0\x80"), std::string_view("\xEF\xBF\xBF"),
        std::string_view("\xF4\x90\x80\x80"), std::string_view("\xE0\x80\x80")}) {
    EXPECT_EQ(DataSerialize::getPlistBlob(plist::Array{text}), std::nullopt);
    EXPECT_EQ(DataSerialize::getPlistBlob(plist::Dictionary{{text, 1}}), std::nullopt);
  }
}

TEST(DataSerialize, DatesOutsideTheCalendarYieldNothing) {
  for (const double seconds :
       {-62135596800.5, -62135596801.0, 253402300800.0, std::numeric_limits<double>::quiet_NaN(), 1e300}) {
    EXPECT_EQ(DataSerialize::getPlistBlob(plist::Array{plist::Date{seconds}}), std::nullopt) << seconds;
  }
}

TEST(DataSerialize, AsciiFormIsTheXmlWhenItIsAscii) {
  const plist::Dictionary value{{"key", "text"}};
  EXPECT_EQ(DataSerialize::getXMLInfo(value), DataSerialize::getPlistBlob(value));
}

TEST(DataSerialize, AsciiFormOfOtherTextYieldsNothing) {
  EXPECT_EQ(DataSerialize::getXMLInfo(plist::Dictionary{{"key", "Caf\xC3\xA9"}}), std::nullopt);
}

TEST(DataSerialize, Utf8FormKeepsEveryCharacter) {
  const plist::Array value{"Caf\xC3\xA9 \xE2\x88\x9E \xF0\x9F\x8E\xB5"};
  EXPECT_EQ(DataSerialize::getDataXMLInfo(value),
            document("<array>\n\t<string>Caf\xC3\xA9 \xE2\x88\x9E \xF0\x9F\x8E\xB5</string>\n</array>\n"));
}

TEST(DataSerialize, Base64FormHasNoLineBreaks) {
  const plist::Dictionary value{{"key", std::string(500, 'x')}};
  const auto base64 = DataSerialize::getBase64XMLBlob(value);
  ASSERT_TRUE(base64.has_value());
  EXPECT_EQ(base64->find('\n'), std::string::npos);
  EXPECT_EQ(base64->size(), (DataSerialize::getPlistBlob(value)->size() + 2) / 3 * 4);
  EXPECT_EQ(base64->substr(0, 28), "PD94bWwgdmVyc2lvbj0iMS4wIiBl");
}

}  // namespace
}  // namespace tarn
