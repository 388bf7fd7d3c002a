// SPDX-License-Identifier: Apache-2.0
#include "wire/WellFormed.h"

#include <gtest/gtest.h>

#include "tests/wire/Bytes.h"

namespace tarn::wire {
namespace {

using testing::asBytes;
using testing::fromHex;

bool isWellFormed(std::string_view hex) {
  return checkOneItem(asBytes(fromHex(hex))) == nullptr;
}

// RFC 8949, appendix A: examples of well-formed items.
constexpr std::string_view kExamples[] = {"00",
                                          "01",
                                          "0a",
                                          "17",
                                          "1818",
                                          "1819",
                                          "1864",
                                          "1903e8",
                                          "1a000f4240",
                                          "1b000000e8d4a51000",
                                          "1bffffffffffffffff",
                                          "c249010000000000000000",
                                          "3bffffffffffffffff",
                                          "c349010000000000000000",
                                          "20",
                                          "29",
                                          "3863",
                                          "3903e7",
                                          "f90000",
                                          "f98000",
                                          "f93c00",
                                          "fb3ff199999999999a",
                                          "f93e00",
                                          "f97bff",
                                          "fa47c35000",
                                          "fa7f7fffff",
                                          "fb7e37e43c8800759c",
                                          "f90001",
                                          "f90400",
                                          "f9c400",
                                          "fbc010666666666666",
                                          "f97c00",
                                          "f97e00",
                                          "f9fc00",
                                          "fa7f800000",
                                          "fa7fc00000",
                                          "faff800000",
                                          "fb7ff0000000000000",
                                          "fb7ff8000000000000",
                                          "fbfff0000000000000",
                                          "f4",
                                          "f5",
                                          "f6",
                                          "f7",
                                          "f0",
                                          "f820",
                                          "f8ff",
                                          "c074323031332d30332d32315432303a30343a30305a",
                                          "c11a514b67b0",
                                          "c1fb41d452d9e8200000",
                                          "d74401020304",
                                          "d818456449455446",
                                          "d82076687474703a2f2f7777772e6578616d706c652e636f6d",
                                          "40",
                                          "4401020304",
                                          "60",
                                          "6161",
                                          "6449455446",
                                          "62225c",
                                          "62c3bc",
                                          "63e6b0b4",
                                          "64f0908591",
                                          "80",
                                          "83010203",
                                          "8301820203820405",
                                          "98190102030405060708090a0b0c0d0e0f101112131415161718181819",
                                          "a0",
                                          "a201020304",
                                          "a26161016162820203",
                                          "826161a161626163",
                                          "a56161614161626142616361436164614461656145",
                                          "5f42010243030405ff",
                                          "7f657374726561646d696e67ff",
                                          "9fff",
                                          "9f018202039f0405ffff",
                                          "9f01820203820405ff",
                                          "83018202039f0405ff",
                                          "83019f0203ff820405",
                                          "9f0102030405060708090a0b0c0d0e0f101112131415161718181819ff",
                                          "bf61610161629f0203ffff",
                                          "826161bf61626163ff",
                                          "bf6346756ef563416d7421ff"};

// RFC 8949, appendix F: examples that are not well-formed.
constexpr std::string_view kCounterExamples[] = {"18",
                                                 "19",
                                                 "1a",
                                                 "1b",
                                                 "1901",
                                                 "1a0102",
                                                 "1b01020304050607",
                                                 "38",
                                                 "58",
                                                 "78",
                                                 "98",
                                                 "9a01ff00",
                                                 "b8",
                                                 "d8",
                                                 "f8",
                                                 "f900",
                                                 "fa0000",
                                                 "fb000000",
                                                 "41",
                                                 "61",
                                                 "5affffffff00",
                                                 "5bffffffffffffffff010203",
                                                 "7affffffff00",
                                                 "7b7fffffffffffffff010203",
                                                 "81",
                                                 "818181818181818181",
                                                 "8200",
                                                 "a1",
                                                 "a20102",
                                                 "a100",
                                                 "a2000000",
                                                 "c0",
                                                 "5f4100",
                                                 "7f6100",
                                                 "9f",
                                                 "9f0102",
                                                 "bf",
                                                 "bf01020102",
                                                 "819f",
                                                 "9f8000",
                                                 "9f9f9f9f9fffffffff",
                                                 "9f819f819f9fffffff",
                                                 "1c",
                                                 "1d",
                                                 "1e",
                                                 "3c",
                                                 "3d",
                                                 "3e",
                                                 "5c",
                                                 "5d",
                                                 "5e",
                                                 "7c",
                                                 "7d",
                                                 "7e",
                                                 "9c",
                                                 "9d",
                                                 "9e",
                                                 "bc",
                                                 "bd",
                                                 "be",
                                                 "dc",
                                                 "dd",
                                                 "de",
                                                 "fc",
                                                 "fd",
                                                 "fe",
                                                 "f800",
                                                 "f801",
                                                 "f818ff",
                                                 "f81f",
                                                 "5f00ff",
                                                 "5f21ff",
                                                 "5f6100ff",
                                                 "5f80ff",
                                                 "5fa0ff",
                                                 "5fc000ff",
                                                 "5fe0ff",
                                                 "7f4100ff",
                                                 "5f5f4100ffff",
                                                 "7f7f6100ffff",
                                                 "ff",
                                                 "81ff",
                                                 "8200ff",
                                                 "a1ff",
                                                 "a1ff00",
                                                 "a100ff",
                                                 "a20000ff",
                                                 "9f81ff",
                                                 "9f829f819f9fffffffff",
                                                 "bf00ff",
                                                 "bf000000ff",
                                                 "1f",
                                                 "3f",
                                                 "df",
                                                 "c1ff",
                                                 "9fc1ff",
                                                 ""};

TEST(WellFormed, AcceptsTheExamplesOfTheStandard) {
  for (const std::string_view hex : kExamples) {
    EXPECT_TRUE(isWellFormed(hex)) << hex;
  }
}

TEST(WellFormed, RefusesTheCounterExamplesOfTheStandard) {
  for (const std::string_view hex : kCounterExamples) {
    EXPECT_FALSE(isWellFormed(hex)) << hex;
  }
}

TEST(WellFormed, RefusesEveryExampleCutShortOrFollowedByMore) {
  for (const std::string_view hex : kExamples) {
    EXPECT_FALSE(isWellFormed(hex.substr(0, hex.size() - 2))) << hex;
    EXPECT_STREQ(checkOneItem(asBytes(fromHex(std::string(hex) + "00"))), "bytes behind the array") << hex;
  }
}

TEST(WellFormed, SaysWhatIsWrong) {
  const std::pair<const char*, const char*> frames[] = {
      {"", "the frame ends inside an item"},
      {"19", "the frame ends inside an item"},
      {"81", "the frame ends inside an item"},
      {"6261", "the frame ends inside an item"},
      {"5f", "the frame ends inside an item"},
      {"5f41", "the frame ends inside an item"},
      {"9bffffffffffffffff", "the frame ends inside an item"},
      {"1c00", "a reserved item head"},
      {"f81f", "a reserved item head"},
      {"5f1c00", "a reserved item head"},
      {"ff", "a break outside an open container"},
      {"81ff", "a break outside an open container"},
      {"5f6100ff", "a string whose parts are no strings of its kind"}};
  for (const auto& [hex, why] : frames) {
    EXPECT_STREQ(checkOneItem(asBytes(fromHex(hex))), why) << hex;
  }
}

TEST(WellFormed, AMillionContainersInsideEachOtherAreWalkedWithoutAStack) {
  constexpr std::size_t kDepth = 1000000;
  EXPECT_EQ(checkOneItem(asBytes(std::string(kDepth, '\x81') + '\0')), nullptr);
  EXPECT_EQ(checkOneItem(asBytes(std::string(kDepth, '\x9f') + std::string(kDepth, '\xff'))), nullptr);
  EXPECT_EQ(checkOneItem(asBytes(std::string(kDepth, '\xc1') + '\0')), nullptr);
  std::string mapsInMaps;
  for (std::size_t i = 0; i < kDepth; ++i) {
    mapsInMaps += fromHex("a100");
  }
  EXPECT_EQ(checkOneItem(asBytes(mapsInMaps + '\0')), nullptr);
  EXPECT_NE(checkOneItem(asBytes(std::string(kDepth, '\x82'))), nullptr);
}

TEST(WellFormed, PromisedItemsThatCannotComeAreRefusedAtOnce) {
  EXPECT_FALSE(isWellFormed("9bffffffffffffffff"));
  EXPECT_FALSE(isWellFormed("bb8000000000000000"));
  EXPECT_FALSE(
      isWellFormed("9affffffff"
                   "0000"));
}

}  // namespace
}  // namespace tarn::wire
