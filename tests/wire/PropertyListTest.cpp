// SPDX-License-Identifier: Apache-2.0
// What a dictionary argument may hold, rule by rule.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "plist/Value.h"
#include "tests/wire/Bytes.h"

namespace tarn::wire {
namespace {

using testing::configurationFrame;
using testing::decodeBytes;
using testing::Decoded;
using testing::decodeValue;
using testing::fromHex;
using testing::valueFrame;

// The value under "k" of an accepted dictionary; absent when it was refused.
plist::Value valueOf(std::string_view hex) {
  const Decoded decoded = decodeValue(hex);
  return decoded.ok() ? plist::Value(decoded.request.dictionary.get("k")) : plist::Value();
}

void expectRefused(std::string_view hex, std::string_view why) {
  const Decoded decoded = decodeValue(hex);
  EXPECT_EQ(decoded.code(), 3) << hex;
  EXPECT_EQ(decoded.request.id, 7U) << hex;
  EXPECT_EQ(decoded.refusal.text, "setConfiguration: not a property list: " + std::string(why)) << hex;
}

TEST(PropertyList, TakesEveryKindOfValue) {
  EXPECT_EQ(valueOf("63e6b0b4").view().text(), "\xE6\xB0\xB4");
  EXPECT_EQ(valueOf("f5").kind(), plist::Kind::Bool);
  EXPECT_TRUE(valueOf("f5").view().boolValue());
  EXPECT_FALSE(valueOf("f4").view().boolValue());
  EXPECT_EQ(valueOf("fa47c35000").kind(), plist::Kind::Float);
  EXPECT_EQ(valueOf("fa47c35000").view().floatValue(), 100000.0F);
  EXPECT_EQ(valueOf("fb3ff199999999999a").kind(), plist::Kind::Double);
  EXPECT_EQ(valueOf("fb3ff199999999999a").view().doubleValue(), 1.1);
  EXPECT_EQ(valueOf("4401020304").view().data(), fromHex("01020304"));
  EXPECT_EQ(valueOf("8301820203820405").kind(), plist::Kind::Array);
  EXPECT_EQ(valueOf("a16161a0").view().dictionary().get("a").kind(), plist::Kind::Dictionary);
}

TEST(PropertyList, IntegersReachFromMinusTwoToThe63ToTwoToThe64LessOne) {
  EXPECT_EQ(valueOf("3b7fffffffffffffff").view().signedValue(), std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(valueOf("1b7fffffffffffffff").view().signedValue(), std::numeric_limits<std::int64_t>::max());
  EXPECT_EQ(valueOf("1b7fffffffffffffff").kind(), plist::Kind::Signed);
  EXPECT_EQ(valueOf("1b8000000000000000").kind(), plist::Kind::Unsigned);
  EXPECT_EQ(valueOf("1bffffffffffffffff").view().unsignedValue(), std::numeric_limits<std::uint64_t>::max());
}

TEST(PropertyList, IntegersBelowMinusTwoToThe63AreRefused) {
  expectRefused("3b8000000000000000", "an integer below -2^63");
  expectRefused("3bffffffffffffffff", "an integer below -2^63");
  expectRefused("c13b8000000000000000", "an integer below -2^63");
}

TEST(PropertyList, HalfFloatsReadAs32Bit) {
  const std::pair<const char*, float> halves[] = {{"f90000", 0.0F},
                                                  {"f93c00", 1.0F},
                                                  {"f93e00", 1.5F},
                                                  {"f97bff", 65504.0F},
                                                  {"f90001", 5.960464477539063e-8F},
                                                  {"f903ff", 1023.0F / 16777216.0F},
                                                  {"f90400", 0.00006103515625F},
                                                  {"f9c400", -4.0F},
                                                  {"f97c00", std::numeric_limits<float>::infinity()},
                                                  {"f9fc00", -std::numeric_limits<float>::infinity()}};
  for (const auto& [hex, expected] : halves) {
    EXPECT_EQ(valueOf(hex).kind(), plist::Kind::Float) << hex;
    EXPECT_EQ(valueOf(hex).view().floatValue(), expected) << hex;
  }
  EXPECT_TRUE(std::signbit(valueOf("f98000").view().floatValue()));
  EXPECT_TRUE(std::isnan(valueOf("f97e00").view().floatValue()));
}

TEST(PropertyList, TagOneOverAnyNumberIsADate) {
  const std::pair<const char*, double> dates[] = {{"c11a514b67b0", 1363896240.0},
                                                  {"c1fb41d452d9ec200000", 1363896240.5},
                                                  {"c120", -1.0},
                                                  {"c1f93e00", 1.5},
                                                  {"c1fa47c35000", 100000.0},
                                                  {"c11bffffffffffffffff", 18446744073709551616.0},
                                                  {"d80100", 0.0}};
  for (const auto& [hex, seconds] : dates) {
    ASSERT_EQ(valueOf(hex).kind(), plist::Kind::Date) << hex;
    EXPECT_EQ(valueOf(hex).view().dateValue().epochSeconds, seconds) << hex;
  }
}

TEST(PropertyList, TagOneOverAnythingElseIsRefused) {
  for (const char* hex : {"c16130", "c1f5", "c1f6", "c1c100", "c180", "c140"}) {
    expectRefused(hex, "a date that is no number");
  }
}

TEST(PropertyList, OtherTagsAreRefused) {
  for (const char* hex : {"c074323031332d30332d32315432303a30343a30305a", "c249010000000000000000", "d818456449455446",
                          "d9d9f700", "dbffffffffffffffff00"}) {
    expectRefused(hex, "a tag other than that of a date");
  }
}

TEST(PropertyList, NullUndefinedAndSimpleValuesAreRefused) {
  expectRefused("f6", "a null");
  expectRefused("f7", "an undefined value");
  for (const char* hex : {"e0", "f0", "f3", "f820", "f8ff"}) {
    expectRefused(hex, "a simple value other than true and false");
  }
  expectRefused("81f6", "a null");
  expectRefused("a16161f7", "an undefined value");
}

TEST(PropertyList, KeysThatAreNoTextAreRefused) {
  for (const char* hex : {"a10102", "a1416102", "a1f502", "a18002", "a1c10002", "a1f602"}) {
    expectRefused(hex, "a key that is no text");
  }
  EXPECT_EQ(decodeBytes(configurationFrame(fromHex("a10102"))).code(), 3);
}

TEST(PropertyList, AKeyGivenTwiceIsRefusedAtEveryLevel) {
  expectRefused("a2616101616102", "a key given twice");
  EXPECT_EQ(decodeBytes(configurationFrame(fromHex("a2616b01616b02"))).code(), 3);
  std::string many = fromHex("b828");  // 40 entries, the last key being the first again
  for (int i = 0; i < 40; ++i) {
    many += fromHex("61") + static_cast<char>('A' + i % 39) + fromHex("00");
  }
  EXPECT_EQ(decodeBytes(configurationFrame(many)).code(), 3);
  // A key written with a longer length is the same key.
  EXPECT_EQ(decodeBytes(configurationFrame(fromHex("a2616b0178016b02"))).code(), 3);
}

TEST(PropertyList, BadUTF8IsRefusedInTextsAndKeys) {
  for (const char* hex : {"61ff", "62c080", "63eda080", "64f4908080", "61c3"}) {
    expectRefused(hex, "a text that is not UTF-8");
    expectRefused("81" + std::string(hex), "a text that is not UTF-8");
    expectRefused("a1" + std::string(hex) + "00", "a key that is not UTF-8");
  }
}

TEST(PropertyList, IndefiniteLengthsAreRefused) {
  expectRefused("9fff", "a container of indefinite length");
  expectRefused("bfff", "a container of indefinite length");
  expectRefused("819f01ff", "a container of indefinite length");
  expectRefused("7f6161ff", "a text of indefinite length");
  expectRefused("5f4161ff", "data of indefinite length");
  expectRefused("a17f6161ff00", "a text of indefinite length");
  EXPECT_EQ(decodeBytes(configurationFrame(fromHex("bf616b01ff"))).code(), 3);
  EXPECT_EQ(decodeBytes(configurationFrame(fromHex("bfff"))).code(), 3);
}

TEST(PropertyList, NestingReaches64LevelsAndNoFurther) {
  // The dictionary argument is level 1, so 63 arrays inside it are the most.
  EXPECT_TRUE(decodeBytes(valueFrame(std::string(62, '\x81') + '\x80')).ok());
  EXPECT_EQ(decodeBytes(valueFrame(std::string(63, '\x81') + '\x80')).code(), 3);
  EXPECT_TRUE(decodeBytes(valueFrame(std::string(63, '\x81') + '\x05')).ok());
  std::string maps;
  for (int i = 0; i < 62; ++i) {
    maps += fromHex("a1616b");
  }
  EXPECT_TRUE(decodeBytes(valueFrame(maps + fromHex("a0"))).ok());
  EXPECT_EQ(decodeBytes(valueFrame(maps + fromHex("a1616ba0"))).code(), 3);
  expectRefused(testing::toHex(std::string(64, '\x81') + '\x05'), "nested too deep");
}

TEST(PropertyList, NULInTextsAndKeysIsFine) {
  EXPECT_EQ(valueOf("63610062").view().text(), std::string_view("a\0b", 3));
  const Decoded decoded =
      decodeBytes(configurationFrame(fromHex("a163610062"
                                             "05")));
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.dictionary.get(std::string_view("a\0b", 3)).signedValue(), 5);
}

TEST(PropertyList, KeysKeepTheirOrder) {
  const Decoded decoded = decodeBytes(configurationFrame(fromHex("a3617a01616102616d03")));
  std::string order;
  for (const plist::Dictionary::Entry entry : decoded.request.dictionary) {
    order += entry.key.text();
  }
  EXPECT_EQ(order, "zam");
}

TEST(PropertyList, LongerLengthsThanNeededAreFine) {
  EXPECT_EQ(valueOf("7b0000000000000001"
                    "61")
                .view()
                .text(),
            "a");
  EXPECT_EQ(valueOf("1b0000000000000005").view().signedValue(), 5);
  EXPECT_EQ(valueOf("9a00000001"
                    "05")
                .view()
                .array()
                .size(),
            1U);
  EXPECT_EQ(valueOf("b90001"
                    "6161"
                    "05")
                .view()
                .dictionary()
                .size(),
            1U);
}

TEST(PropertyList, TheFirstTroubleInTheOrderOfArgumentsIsTheAnswer) {
  EXPECT_EQ(testing::decodeHex("860706a1616bf66131"
                               "0080")
                .code(),
            3);
  EXPECT_EQ(testing::decodeHex("850706a1616bf6"
                               "0000")
                .code(),
            2);  // one argument too few comes before all
}

}  // namespace
}  // namespace tarn::wire
