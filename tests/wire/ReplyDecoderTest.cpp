// SPDX-License-Identifier: Apache-2.0
#include "wire/ReplyDecoder.h"

#include <gtest/gtest.h>

#include "tests/support/HeapUse.h"
#include "tests/wire/Bytes.h"

namespace tarn::wire {
namespace {

using testing::asBytes;
using testing::fromHex;

struct Decoded {
  bool good = false;
  DecodedReply reply;
  std::string reason;
};

Decoded decode(std::string_view hex) {
  ReplyDecoder decoder;
  Decoded decoded;
  const Status read = decoder.decode(asBytes(fromHex(hex)), decoded.reply);
  decoded.good = read.ok();
  decoded.reason = read.text();
  return decoded;
}

TEST(ReplyDecoder, ReadsIDNullAndResults) {
  const Decoded decoded = decode(
      "851907d0f6f5"
      "8201820203"
      "a161610b");
  ASSERT_TRUE(decoded.good) << decoded.reason;
  EXPECT_EQ(decoded.reply.id, 2000U);
  EXPECT_FALSE(decoded.reply.error.has_value());
  ASSERT_EQ(decoded.reply.results.size(), 3U);
  EXPECT_EQ(decoded.reply.results[0], plist::Value(true));
  EXPECT_EQ(decoded.reply.results[1], plist::Value(plist::Array{1, plist::Array{2, 3}}));
  EXPECT_EQ(decoded.reply.results[2], plist::Value(plist::Dictionary{{"a", 11}}));
}

TEST(ReplyDecoder, RefusedDictionariesLeaveNoMemoryBehind) {
  for (const char* hex : {"8307f6a2616b01616b02", "8307f6a1616bf6"}) {
    const std::string frame = fromHex(hex);
    ReplyDecoder decoder;
    DecodedReply reply;
    const testing::HeapGrowth heap;
    for (int i = 0; i < 20'000; ++i) {
      ASSERT_TRUE(decoder.decode(asBytes(frame), reply).failed());
    }
    EXPECT_LT(heap.bytes(), 16'384) << hex;
  }
}

TEST(ReplyDecoder, ReadsErrors) {
  const Decoded decoded = decode(
      "82"
      "07"
      "83"
      "6161"
      "21"
      "6162");
  ASSERT_TRUE(decoded.good) << decoded.reason;
  ASSERT_TRUE(decoded.reply.error.has_value());
  EXPECT_EQ(decoded.reply.error->domain, "a");
  EXPECT_EQ(decoded.reply.error->code, -2);
  EXPECT_EQ(decoded.reply.error->text, "b");
}

TEST(ReplyDecoder, RefusesWhatIsNoReplyAndSaysWhy) {
  const std::pair<const char*, const char*> frames[] = {
      {"", "not a reply array"},
      {"00", "not a reply array"},
      {"8107", "not a reply array"},
      {"9f07f6ff", "not a reply array"},
      {"8220f6", "not a reply array"},
      {"a207f6", "not a reply array"},
      {"6207f6", "not a reply array"},
      {"82", "not a reply array"},
      {"8207f5", "an error that is neither null nor [domain, code, text]"},
      {"82078261610"
       "1",
       "an error that is neither null nor [domain, code, text]"},
      {"820783616101f6", "an error that is neither null nor [domain, code, text]"},
      {"820783616161610161", "an error that is neither null nor [domain, code, text]"},
      {"8207a3616101"
       "6162",
       "an error that is neither null nor [domain, code, text]"},
      {"820784616101"
       "616200",
       "an error that is neither null nor [domain, code, text]"},
      {"820783"
       "01016162",
       "an error that is neither null nor [domain, code, text]"},
      {"820783"
       "616161616162",
       "an error that is neither null nor [domain, code, text]"},
      {"82078361611b8000000000000000"
       "6162",
       "an error that is neither null nor [domain, code, text]"},
      {"820783"
       "61618001",
       "an error that is neither null nor [domain, code, text]"},
      {"8307f6c1", "a result that is no property-list value"},
      {"8307f6c11c", "a result that is no property-list value"},
      {"8307f6", "a result that is no property-list value"},
      {"8307f6f6", "a result that is no property-list value"},
      {"8307f6a26161016161"
       "02",
       "a result that is no property-list value"},
      {"8307f681f7", "a result that is no property-list value"},
      {"8207", "an error that is neither null nor [domain, code, text]"},
      {"8307f6a10102", "a result that is no property-list value"},
      {"8307f6a1616181f6", "a result that is no property-list value"},
      {"8307f6bf", "a result that is no property-list value"},
      {"8207f600", "bytes behind the array"}};
  for (const auto& [hex, reason] : frames) {
    const Decoded decoded = decode(hex);
    EXPECT_FALSE(decoded.good) << hex;
    EXPECT_EQ(decoded.reason, reason) << hex;
  }
}

TEST(ReplyDecoder, AnUnreadableReplyLeavesNothingForTheNext) {
  ReplyDecoder decoder;
  DecodedReply reply;
  const std::string bad = fromHex(
      "8407f6"
      "05"
      "8281a1616105f6");
  EXPECT_TRUE(decoder.decode(asBytes(bad), reply).failed());
  const std::string good = fromHex(
      "8308f6"
      "8101");
  ASSERT_TRUE(decoder.decode(asBytes(good), reply).ok());
  EXPECT_EQ(reply.id, 8U);
  ASSERT_EQ(reply.results.size(), 1U);
  EXPECT_EQ(reply.results[0], plist::Value(plist::Array{1}));
}

TEST(ReplyDecoder, NothingOfAnEarlierReplyRemains) {
  ReplyDecoder decoder;
  DecodedReply reply;
  ASSERT_TRUE(decoder
                  .decode(asBytes(fromHex("8307"
                                          "83616101616205")),
                          reply)
                  .ok());
  ASSERT_TRUE(decoder.decode(asBytes(fromHex("8208f6")), reply).ok());
  EXPECT_EQ(reply.id, 8U);
  EXPECT_FALSE(reply.error.has_value());
  EXPECT_TRUE(reply.results.empty());
}

TEST(ReplyDecoder, WhatWasNotDecodedHasNoNumberAndNoCode) {
  EXPECT_EQ(DecodedReply{}.id, 0U);
  EXPECT_EQ(ReplyError{}.code, 0);
}

TEST(ReplyDecoder, ResultsNestAsDeepAsArgumentsAndNoDeeper) {
  std::string maps;
  for (std::size_t i = 0; i + 1 < kMaxNesting; ++i) {
    maps += "a1616b";
  }
  std::string arrays;
  for (std::size_t i = 0; i + 1 < kMaxNesting; ++i) {
    arrays += "81";
  }
  EXPECT_TRUE(decode("8307f6" + arrays + "80").good);
  EXPECT_FALSE(decode("8307f6" + arrays + "8180").good);
  EXPECT_TRUE(decode("8307f6" + maps + "a0").good);
  EXPECT_FALSE(decode("8307f6" + maps + "a1616ba0").good);
}

}  // namespace
}  // namespace tarn::wire
