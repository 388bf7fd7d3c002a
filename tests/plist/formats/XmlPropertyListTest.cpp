// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/XmlPropertyList.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>

namespace tarn::plist {
namespace {

Value read(const std::string& text) {
  const PropertyListReading reading = readXmlPropertyList(text);
  EXPECT_FALSE(reading.fault) << text << " " << reading.fault->description();
  return reading.value;
}
// The fault's description; a text that reads has none.
std::string faultOf(const std::string& text) {
  const PropertyListReading reading = readXmlPropertyList(text);
  EXPECT_NE(reading.fault.has_value(), reading.value.present());
  return reading.fault ? reading.fault->description() : "none";
}
std::string nested(std::size_t levels) {
  std::string text;
  for (std::size_t level = 0; level < levels; ++level) {
    text += "<array>";
  }
  for (std::size_t level = 0; level < levels; ++level) {
    text += "</array>";
  }
  return text;
}

TEST(XmlPropertyList, ADocumentWithItsPrologReads) {
  EXPECT_EQ(read("\xEF\xBB\xBF<?xml version=\"1.0\" encoding='UTF-8'?>\n<!-- a remark -->\n"
                 "<!DOCTYPE plist PUBLIC \"-//X//DTD\" \"http://example.invalid/a>b.dtd\">\n"
                 "<plist version=\"1.0\"><?hint x?><true/></plist>\n<!-- end -->\n"),
            Value(true));
}

TEST(XmlPropertyList, AValueNeedsNoWrapper) {
  EXPECT_EQ(read("<string>a</string>"), Value("a"));
}

TEST(XmlPropertyList, ADocumentTypesDeclarationsArePassedOverUnread) {
  EXPECT_EQ(read("<!DOCTYPE plist [ <!-- ]> --> <!ELEMENT key (#PCDATA)> <!ENTITY a \"]>\"> ]><plist><true/></plist>"),
            Value(true));
  EXPECT_EQ(faultOf("<!DOCTYPE p [<!ENTITY a \"b\">]><string>&a;</string>"), "line 1: an entity that isn't known");
  EXPECT_EQ(faultOf("<!DOCTYPE p [<!ENTITY a SYSTEM \"file:///etc/hostname\">]>\n<string>&a;</string>"),
            "line 2: an entity that isn't known");
}

TEST(XmlPropertyList, TheFiveEntitiesAndThoseByNumberAreResolved) {
  EXPECT_EQ(read("<string>&lt;&amp;&gt;&quot;&apos;&#65;&#x1F50a;&#13;</string>"), Value("<&>\"'A\U0001F50A\r"));
  for (const char* wrong : {"&#0;", "&#xD800;", "&#x110000;", "&#;", "&#x;", "&#1a;", "&#-5;", "&#99999999;"}) {
    EXPECT_EQ(faultOf("<string>" + std::string(wrong) + "</string>"), "line 1: an entity that is no character")
        << wrong;
  }
  EXPECT_EQ(faultOf("<string>a & b</string>"), "line 1: & without ;");
}

TEST(XmlPropertyList, LineEndsAreLineFeedsAndBlanksOfATextStay) {
  EXPECT_EQ(read("<string> a\r\nb\rc\n </string>"), Value(" a\nb\nc\n "));
}

TEST(XmlPropertyList, SectionsAndRemarksInsideATextRead) {
  EXPECT_EQ(read("<string>a<![CDATA[<b>&amp;]]><!-- x --> c</string>"), Value("a<b>&amp; c"));
}

TEST(XmlPropertyList, EmptyElementsRead) {
  EXPECT_EQ(read("<array><dict/><array/><string/><data/><dict></dict><true></true><false> </false></array>"),
            Value(Array{Dictionary{}, Array{}, "", DataView{""}, Dictionary{}, true, false}));
}

TEST(XmlPropertyList, AttributesArePassedOver) {
  EXPECT_EQ(read("<dict a='>' b=\"/\" ><key x='1'>k</key><integer y='2'>1</integer></dict >"),
            Value(Dictionary{{"k", 1}}));
}

TEST(XmlPropertyList, IntegersGoFromTheSmallestOf64BitsToTheLargestWithoutASign) {
  EXPECT_EQ(read("<integer> -9223372036854775808\n</integer>"), Value(INT64_MIN));
  EXPECT_EQ(read("<integer>+18446744073709551615</integer>"), Value(UINT64_MAX));
  EXPECT_EQ(read("<integer>0xFFFFFFFFFFFFFFFF</integer>"), Value(UINT64_MAX));
  EXPECT_EQ(read("<integer>-0x10</integer>"), Value(-16));
  EXPECT_EQ(read("<integer>5</integer>").kind(), Kind::Signed);
  for (const char* wrong :
       {"18446744073709551616", "-9223372036854775809", "", "-", "+", "0x", "1.0", "1 2", "--1", "-+1", "1e3", "a"}) {
    EXPECT_EQ(faultOf("<integer>" + std::string(wrong) + "</integer>"), "line 1: not a value of <integer>") << wrong;
  }
}

TEST(XmlPropertyList, RealsReadInEveryForm) {
  EXPECT_EQ(read("<real>1.5</real>"), Value(1.5));
  EXPECT_EQ(read("<real> +1e-3 </real>"), Value(0.001));
  EXPECT_EQ(read("<real>2</real>").kind(), Kind::Double);
  EXPECT_TRUE(std::isnan(read("<real>nan</real>").view().asDouble()));
  EXPECT_EQ(read("<real>-infinity</real>"), Value(-HUGE_VAL));
  EXPECT_EQ(read("<real>+infinity</real>"), Value(HUGE_VAL));
  for (const char* wrong : {"", "1e999", "1,5", "+-1", "0x1p3", "one"}) {
    EXPECT_EQ(faultOf("<real>" + std::string(wrong) + "</real>"), "line 1: not a value of <real>") << wrong;
  }
}

TEST(XmlPropertyList, DatesAreMomentsOfTheCalendarInUtc) {
  EXPECT_EQ(read("<date>1970-01-01T00:00:00Z</date>"), Value(Date{0}));
  EXPECT_EQ(read("<date>\n2026-11-20T10:00:00Z </date>"), Value(Date{1795168800}));
  EXPECT_EQ(read("<date>2024-02-29T23:59:59Z</date>"), Value(Date{1709251199}));
  for (const char* wrong :
       {"", "2026-11-20", "2026-11-20T10:00:00", "2026-11-20 10:00:00Z", "2026-13-20T10:00:00Z", "2026-02-29T10:00:00Z",
        "2026-11-20T24:00:00Z", "2026-11-20T10:60:00Z", "2026-11-20T10:00:60Z", "0000-01-01T00:00:00Z",
        "2026-11-20T10:00:00+", "2026-1a-20T10:00:00Z", "-026-11-20T10:00:00Z"}) {
    EXPECT_EQ(faultOf("<date>" + std::string(wrong) + "</date>"), "line 1: not a value of <date>") << wrong;
  }
}

TEST(XmlPropertyList, DataIsBase64WithBlanksAnywhere) {
  EXPECT_EQ(read("<data>\n\tAAE\n\tCAw==\n</data>"), Value(DataView{std::string_view("\0\1\2\3", 4)}));
  for (const char* wrong : {"A", "AAE", "AA==AA==", "A*E="}) {
    EXPECT_EQ(faultOf("<data>" + std::string(wrong) + "</data>"), "line 1: not a value of <data>") << wrong;
  }
}

TEST(XmlPropertyList, ADictionaryWantsKeysAndValuesByTurns) {
  EXPECT_EQ(faultOf("<dict>\n<string>a</string></dict>"), "line 2: <key> is wanted here");
  EXPECT_EQ(faultOf("<dict><key>a</key>\n</dict>"), "line 2: a key without a value");
  EXPECT_EQ(faultOf("<dict><key>a</key><key>b</key></dict>"), "line 1: no such element: <key>");
  EXPECT_EQ(faultOf("<array><key>a</key></array>"), "line 1: no such element: <key>");
  EXPECT_EQ(faultOf("<dict>a</dict>"), "line 1: text where an element is wanted");
}

TEST(XmlPropertyList, AKeyGivenTwiceIsAFaultWhereItsDictionaryEnds) {
  EXPECT_EQ(faultOf("<dict><key>a</key><true/>\n<key>a</key><true/>\n</dict>"),
            "line 3: a key stands twice in the dictionary that ends here");
}

TEST(XmlPropertyList, WhatIsNoPropertyListIsAFaultWithItsLine) {
  EXPECT_EQ(faultOf(""), "line 1: the end comes too early");
  EXPECT_EQ(faultOf("{\"a\": 1}"), "line 1: text where an element is wanted");
  EXPECT_EQ(faultOf("<plist/>"), "line 1: a property list without a value");
  EXPECT_EQ(faultOf("<plist>\n</plist>"), "line 2: a property list without a value");
  EXPECT_EQ(faultOf("<plist><true/><true/></plist>"), "line 1: </plist> is wanted here");
  EXPECT_EQ(faultOf("<true/>\n<true/>"), "line 2: something behind the end");
  EXPECT_EQ(faultOf("<plist><true/>"), "line 1: the end comes too early");
  EXPECT_EQ(faultOf("<html></html>"), "line 1: no such element: <html>");
  EXPECT_EQ(faultOf("<array>\n<float>1</float></array>"), "line 2: no such element: <float>");
  EXPECT_EQ(faultOf("<array></dict>"), "line 1: </array> is wanted here");
  EXPECT_EQ(faultOf("<string>a<b/></string>"), "line 1: an element inside a text");
  EXPECT_EQ(faultOf("<true>yes</true>"), "line 1: text inside a boolean");
  EXPECT_EQ(faultOf("<arr\xC3\xA9/>"), "line 1: a tag that can't be read");
  EXPECT_EQ(faultOf("< array/>"), "line 1: a tag that can't be read");
  EXPECT_EQ(faultOf("<array"), "line 1: a tag without its end");
  EXPECT_EQ(faultOf("<array a='>"), "line 1: ' without '");
  EXPECT_EQ(faultOf("<!-- a"), "line 1: <!-- without -->");
  EXPECT_EQ(faultOf("<?xml a"), "line 1: <?xml without ?>");
  EXPECT_EQ(faultOf("<!DOCTYPE a ["), "line 1: <!DOCTYPE without its end");
  EXPECT_EQ(faultOf("<string><![CDATA[a</string>"), "line 1: <![CDATA[ without ]]>");
}

TEST(XmlPropertyList, OnlyUtf8IsRead) {
  EXPECT_EQ(faultOf("<?xml version='1.0' encoding='UTF-16'?><true/>"), "line 1: the encoding is not UTF-8");
  EXPECT_EQ(read("<?xml version='1.0' encoding='us-ascii'?><true/>"), Value(true));
  for (const char* wrong : {"\xFF", "\xC3", "\xED\xA0\x80", "\xC0\x80", "\xF4\x90\x80\x80", "\x01", "\xEF\xBF\xBF"}) {
    EXPECT_EQ(faultOf("<string>" + std::string(wrong) + "</string>"), "line 1: bytes that are no text");
  }
  EXPECT_EQ(faultOf(std::string("<string>a\0b</string>", 20)), "line 1: bytes that are no text");
}

TEST(XmlPropertyList, NestingIsBounded) {
  EXPECT_TRUE(read(nested(kMaximumPropertyListNesting)).present());
  EXPECT_EQ(faultOf(nested(kMaximumPropertyListNesting + 1)), "line 1: nested too deeply");
  EXPECT_EQ(faultOf(nested(1'000'000)), "line 1: nested too deeply");
}

TEST(XmlPropertyList, CountAndSizeAreBounded) {
  std::string many = "<array>";
  for (std::size_t count = 1; count < kMaximumPropertyListValues; ++count) {
    many += "<true/>";
  }
  EXPECT_EQ(read(many + "</array>").view().array().size(), kMaximumPropertyListValues - 1);
  EXPECT_EQ(faultOf(many + "<true/></array>"), "line 1: too many values");
  const std::string longest(kMaximumPropertyListBytes - std::string("<string></string>").size(), 'x');
  EXPECT_EQ(read("<string>" + longest + "</string>").view().text().size(), longest.size());
  EXPECT_EQ(faultOf("<string>" + longest + "x</string>"), "line 1: too large");
}

}  // namespace
}  // namespace tarn::plist
