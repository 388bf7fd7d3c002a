// SPDX-License-Identifier: Apache-2.0
#include "wire/Encoder.h"

#include <gtest/gtest.h>

#include <limits>

#include "plist/Value.h"
#include "tests/wire/Bytes.h"

namespace tarn::wire {
namespace {

using testing::fromHex;
using testing::toHex;

std::string hexOf(const plist::ValueView& value) {
  std::string out;
  appendValue(out, value);
  return toHex(out);
}

TEST(Encoder, IntegersTakeTheFewestBytes) {
  const std::pair<std::int64_t, const char*> integers[] = {
      {0, "00"},
      {23, "17"},
      {24, "1818"},
      {255, "18ff"},
      {256, "190100"},
      {65535, "19ffff"},
      {65536, "1a00010000"},
      {4294967295, "1affffffff"},
      {4294967296, "1b0000000100000000"},
      {-1, "20"},
      {-24, "37"},
      {-25, "3818"},
      {-256, "38ff"},
      {-257, "390100"},
      {-1000, "3903e7"},
      {std::numeric_limits<std::int64_t>::min(), "3b7fffffffffffffff"}};
  for (const auto& [value, hex] : integers) {
    EXPECT_EQ(hexOf(value), hex);
  }
  EXPECT_EQ(hexOf(std::numeric_limits<std::uint64_t>::max()), "1bffffffffffffffff");
}

TEST(Encoder, FloatsKeepTheirWidth) {
  EXPECT_EQ(hexOf(100000.0F), "fa47c35000");
  EXPECT_EQ(hexOf(1.1), "fb3ff199999999999a");
  EXPECT_EQ(hexOf(1.0), "fb3ff0000000000000");
}

TEST(Encoder, DatesAreIntegersWhenTheyHaveNoFraction) {
  EXPECT_EQ(hexOf(plist::Date{1363896240.0}), "c11a514b67b0");
  EXPECT_EQ(hexOf(plist::Date{1363896240.5}), "c1fb41d452d9ec200000");
  EXPECT_EQ(hexOf(plist::Date{-1.0}), "c120");
  EXPECT_EQ(hexOf(plist::Date{-0.0}), "c1fb8000000000000000");
  EXPECT_EQ(hexOf(plist::Date{0x1p53}), "c11b0020000000000000");
  EXPECT_EQ(hexOf(plist::Date{-0x1p53}), "c13b001fffffffffffff");
  EXPECT_EQ(hexOf(plist::Date{0x1p54}), "c1fb4350000000000000");
  EXPECT_EQ(hexOf(plist::Date{-0x1p54}), "c1fbc350000000000000");
  EXPECT_EQ(hexOf(plist::Date{1e300}), "c1fb7e37e43c8800759c");
  EXPECT_EQ(hexOf(plist::Date{std::numeric_limits<double>::infinity()}), "c1fb7ff0000000000000");
}

TEST(Encoder, TextsDataAndBoolsAreAsTheStandardWritesThem) {
  EXPECT_EQ(hexOf("IETF"), "6449455446");
  EXPECT_EQ(hexOf(""), "60");
  EXPECT_EQ(hexOf(plist::DataView{fromHex("01020304")}), "4401020304");
  EXPECT_EQ(hexOf(false), "f4");
  EXPECT_EQ(hexOf(true), "f5");
}

TEST(Encoder, ContainersKeepTheirOrder) {
  const plist::Array inner{2, 3};
  EXPECT_EQ(hexOf(plist::Array{1, inner}), "8201820203");
  EXPECT_EQ(hexOf(plist::Dictionary{{"z", 1}, {"a", inner}}), "a2617a016161820203");
  EXPECT_EQ(hexOf(plist::Array()), "80");
  EXPECT_EQ(hexOf(plist::Dictionary()), "a0");
}

TEST(Encoder, RepliesAreNullAndResultsBehindTheID) {
  std::string out;
  Encoder encoder(out);
  encoder.reply(7, {true});
  encoder.reply(300);
  const std::int64_t numbers[] = {1, -1};
  std::string encoded;
  Encoder(encoded).numbers(numbers);
  encoder.replyWithNumbers(8, 2, encoded.size());
  out += encoded;
  EXPECT_EQ(toHex(out),
            "04000000"
            "8307f6f5"
            "05000000"
            "8219012cf6"
            "06000000"
            "8308f6820120");
}

TEST(Encoder, ErrorRepliesHaveDomainCodeAndMendedText) {
  std::string out;
  Encoder(out).errorReply(7, "d", -2, "a\xFF");
  EXPECT_EQ(toHex(out),
            "0b000000"
            "820783"
            "6164"
            "21"
            "6461efbfbd");
}

TEST(Encoder, EveryRequestDecodesToWhatItWas) {
  Request request;
  request.serviceType = 13;
  request.dictionary = {{"volume", 0.5F}, {"name", "player"}};
  request.category = 0x10000004;
  request.type = 2;
  request.reporterID = -5;
  request.reporterIDs = std::vector<std::int64_t>{9, -9};
  for (std::uint64_t number = 1; number <= 103; number = number == 11 ? 100 : number + 1) {
    request.operation = operationFromNumber(number).value();
    std::string out;
    Encoder(out).request(number, request);
    const testing::Decoded decoded = testing::decodeBytes(std::string_view(out).substr(kFrameHeaderBytes));
    ASSERT_TRUE(decoded.ok()) << decoded.refusal.text;
    EXPECT_EQ(decoded.request.id, number);
    EXPECT_EQ(decoded.request.operation, request.operation);
    std::string again;
    Encoder(again).request(number, decoded.request);
    EXPECT_EQ(again, out) << operationName(request.operation);
  }
}

TEST(Encoder, NoReporterIDsAreNull) {
  Request request;
  request.operation = Operation::SendMessage;
  std::string out;
  Encoder(out).request(1, request);
  EXPECT_EQ(toHex(out),
            "07000000"
            "860106a00000f6");
}

TEST(Encoder, AnAbsentValueIsNull) {
  std::string out;
  appendValue(out, plist::ValueView());
  EXPECT_EQ(toHex(out), "f6");
}

}  // namespace
}  // namespace tarn::wire
