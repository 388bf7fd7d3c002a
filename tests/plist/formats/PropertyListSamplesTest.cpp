// SPDX-License-Identifier: Apache-2.0
// Property-list files written by another program (samples/make_samples.py), in both formats.
#include <gtest/gtest.h>

#include <fstream>
#include <sstream>
#include <string>

#include "plist/formats/PropertyList.h"

namespace tarn::plist {
namespace {

class PropertyListSample : public ::testing::TestWithParam<const char*> {
 protected:
  static std::string bytesOf(const std::string& file) {
    std::ostringstream content;
    content << std::ifstream(std::string(TARN_SAMPLES) + "/" + file, std::ios::binary).rdbuf();
    return content.str();
  }
  static Value read(const std::string& name) {
    const std::string bytes = bytesOf(name + "." + GetParam() + ".plist");
    EXPECT_FALSE(bytes.empty());
    const PropertyListReading reading = readPropertyList(bytes);
    EXPECT_FALSE(reading.fault) << reading.fault->description();
    return reading.value;
  }
};

TEST_P(PropertyListSample, EveryKindOfValueReadsAsItWasWritten) {
  std::string everyByte;
  for (int byte = 0; byte < 256; ++byte) {
    everyByte += static_cast<char>(byte);
  }
  const Value value = read("kinds");
  ASSERT_EQ(value.kind(), Kind::Dictionary);
  const Dictionary kinds = value.view().dictionary();
  EXPECT_EQ(kinds.size(), 13U);
  EXPECT_EQ(kinds["true"].kind(), Kind::Bool);
  EXPECT_TRUE(kinds["true"].asBool());
  EXPECT_EQ(kinds["false"].kind(), Kind::Bool);
  EXPECT_EQ(kinds["integers"].array(),
            (Array{0, 1, -1, 127, 128, 255, 256, 65535, 65536, INT64_C(2147483648), INT64_C(4294967296), INT64_MAX,
                   INT64_MIN, UINT64_C(9223372036854775808), UINT64_MAX}));
  EXPECT_EQ(kinds["reals"].array(), (Array{0.0, -0.5, 0.1, 1e300, 2.5}));
  EXPECT_EQ(kinds["reals"].array()[0].kind(), Kind::Double);
  EXPECT_EQ(kinds["date"], Date{1795168800});
  EXPECT_EQ(kinds["early"], Date{-14182940});
  EXPECT_EQ(kinds["data"], DataView{everyByte});
  EXPECT_EQ(kinds["no data"], DataView{""});
  EXPECT_EQ(kinds["text"], "plain");
  EXPECT_EQ(kinds["no text"], "");
  EXPECT_EQ(kinds["marks"], "<&>\"'\t\n");
  EXPECT_EQ(kinds["letters"], "\u00e9\u20ac\U0001f50a");
  EXPECT_EQ(kinds["\u00fcber"].dictionary(), (Dictionary{{"empty", Dictionary{}}, {"none", Array{}}}));
}

TEST_P(PropertyListSample, DictionariesKeepTheirOrder) {
  const Value value = read("kinds");
  EXPECT_EQ((*value.view().dictionary().begin()).key.text(), "true");
}

TEST_P(PropertyListSample, ArraysOfDictionariesRead) {
  EXPECT_EQ(read("probes"),
            Value(Array{Dictionary{{"name", "messages"}, {"children", Array{Dictionary{{"name", "inner"}}}}},
                        Dictionary{{"name", "starts"}}}));
}

TEST_P(PropertyListSample, CountsThatDoNotFitAMarkRead) {
  const Value value = read("long");
  const Array items = value.view().array();
  ASSERT_EQ(items.size(), 300U);
  EXPECT_EQ(items[0], "item 0");
  EXPECT_EQ(items[299], "item 299");
}

TEST_P(PropertyListSample, ATextAloneIsAPropertyList) {
  EXPECT_EQ(read("root_text"), Value("a text alone"));
}

TEST_P(PropertyListSample, CutOffAtAnyByteItIsAFaultWithItsPlace) {
  const std::string whole = bytesOf(std::string("kinds.") + GetParam() + ".plist");
  const bool isXml = GetParam() == std::string("xml");
  // What stands after the last mark of XML is a line end.
  const std::size_t last = whole.size() - (isXml ? 1 : 0);
  for (std::size_t size = 0; size < last; ++size) {
    const PropertyListReading reading = readPropertyList(whole.substr(0, size));
    ASSERT_TRUE(reading.fault) << size;
    ASSERT_FALSE(reading.value.present());
    ASSERT_FALSE(reading.fault->text.empty());
    ASSERT_LE(reading.fault->number, size + 1);
  }
}

INSTANTIATE_TEST_SUITE_P(Formats, PropertyListSample, ::testing::Values("xml", "binary"),
                         [](const auto& format) { return std::string(format.param); });

TEST(PropertyListSamples, UidsReadAsTheirFormInXml) {
  std::ostringstream content;
  content << std::ifstream(std::string(TARN_SAMPLES) + "/uid.binary.plist", std::ios::binary).rdbuf();
  EXPECT_EQ(readPropertyList(content.str()).value,
            Value(Array{Dictionary{{"CF$UID", 5}}, Dictionary{{"CF$UID", 70000}}}));
}

}  // namespace
}  // namespace tarn::plist
