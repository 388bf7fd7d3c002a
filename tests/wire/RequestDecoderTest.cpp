// SPDX-License-Identifier: Apache-2.0
#include "wire/RequestDecoder.h"

#include <gtest/gtest.h>

#include <limits>

#include "tests/support/HeapUse.h"
#include "tests/wire/Bytes.h"
#include "wire/Encoder.h"

namespace tarn::wire {
namespace {

using testing::asBytes;
using testing::decodeBytes;
using testing::Decoded;
using testing::decodeHex;
using testing::fromHex;

TEST(RequestDecoder, OperationsOnOneSessionTakeItsID) {
  for (const char* number : {"01", "03", "05", "07", "08", "09"}) {
    const Decoded decoded = decodeHex(std::string("8307") + number + "182a");
    ASSERT_TRUE(decoded.ok()) << number;
    EXPECT_EQ(decoded.request.id, 7U);
    EXPECT_EQ(static_cast<int>(decoded.request.operation), std::stoi(number));
    EXPECT_EQ(decoded.request.reporterID, 42);
  }
}

TEST(RequestDecoder, OperationsWithoutArgumentsTakeNone) {
  for (const char* number : {"0a", "0b", "1864"}) {
    EXPECT_TRUE(decodeHex(std::string("8207") + number).ok()) << number;
    EXPECT_EQ(decodeHex(std::string("8307") + number + "00").code(), 2) << number;
  }
}

TEST(RequestDecoder, WhatAnOperationDoesNotTakeIsZero) {
  const Decoded decoded = decodeHex("82070a");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.serviceType, 0);
  EXPECT_EQ(decoded.request.category, 0U);
  EXPECT_EQ(decoded.request.type, 0);
  EXPECT_EQ(decoded.request.reporterID, 0);
}

TEST(RequestDecoder, SetServiceTypeTakesTheTypeBeforeTheReporterID) {
  const Decoded decoded = decodeHex("8407020b19ffff");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.serviceType, 11);
  EXPECT_EQ(decoded.request.reporterID, 65535);
}

TEST(RequestDecoder, SetConfigurationTakesTheDictionaryBeforeTheReporterID) {
  const Decoded decoded = decodeHex("840704a1616b0516");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.dictionary, (plist::Dictionary{{"k", 5}}));
  EXPECT_EQ(decoded.request.reporterID, 22);
}

TEST(RequestDecoder, SendMessageTakesDictionaryCategoryTypeAndIDs) {
  const Decoded decoded = decodeHex("860706a1616b051affffffff19ffff82013903e7");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.dictionary, (plist::Dictionary{{"k", 5}}));
  EXPECT_EQ(decoded.request.category, 0xFFFFFFFFU);
  EXPECT_EQ(decoded.request.type, 65535);
  EXPECT_EQ(decoded.request.reporterIDs, (std::vector<std::int64_t>{1, -1000}));
}

TEST(RequestDecoder, NullStandsForNoReporterIDsAndAnEmptyArrayForAnEmptyOne) {
  EXPECT_FALSE(decodeHex("860706a00000f6").request.reporterIDs.has_value());
  const Decoded empty = decodeHex("860706a0000080");
  ASSERT_TRUE(empty.ok());
  ASSERT_TRUE(empty.request.reporterIDs.has_value());
  EXPECT_TRUE(empty.request.reporterIDs->empty());
}

// A message to so many sessions, all of ID 7; `open`: with a list of indefinite length.
std::string messageTo(std::size_t count, bool open) {
  std::string frame = testing::fromHex("860706a00000");
  frame += testing::fromHex(open ? "9f" : "9a");
  for (int shift = 24; !open && shift >= 0; shift -= 8) {
    frame += static_cast<char>(count >> static_cast<unsigned>(shift));
  }
  frame += std::string(count, '\x07');
  return open ? frame + '\xff' : frame;
}

TEST(RequestDecoder, AListOfIDsHasAtMost65536Entries) {
  for (const bool open : {false, true}) {
    const Decoded most = testing::decodeBytes(messageTo(65536, open));
    ASSERT_TRUE(most.ok());
    EXPECT_EQ(most.request.reporterIDs->size(), 65536U);
    const Decoded more = testing::decodeBytes(messageTo(65537, open));
    EXPECT_EQ(more.code(), 2);
    EXPECT_EQ(more.refusal.text, "sendMessage: reporter IDs: at most 65536 expected");
  }
}

TEST(RequestDecoder, NothingOfAnEarlierRequestRemains) {
  RequestDecoder decoder;
  DecodedRequest request;
  Refusal refusal;
  const std::string full = fromHex("860706a1616b05010281182a");
  ASSERT_EQ(decoder.decode(asBytes(full), request, refusal), DecodeVerdict::Ok);
  const std::string bare = fromHex("82080a");
  ASSERT_EQ(decoder.decode(asBytes(bare), request, refusal), DecodeVerdict::Ok);
  EXPECT_TRUE(request.dictionary.empty());
  EXPECT_EQ(request.category, 0U);
  EXPECT_FALSE(request.reporterIDs.has_value());
}

TEST(RequestDecoder, IDsReachToTheLargestUnsignedInteger) {
  const Decoded decoded = decodeHex("821bffffffffffffffff0a");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.id, std::numeric_limits<std::uint64_t>::max());
}

TEST(RequestDecoder, LongerIntegersThanNeededAreFine) {
  const Decoded decoded = decodeHex(
      "9b0000000000000003"
      "1b0000000000000007"
      "190001"
      "1a0000002a");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.id, 7U);
  EXPECT_EQ(decoded.request.operation, Operation::CreateReportingSession);
  EXPECT_EQ(decoded.request.reporterID, 42);
}

TEST(RequestDecoder, AnOpenEndedFrameIsAsGoodAsOneOfKnownLength) {
  const Decoded decoded = decodeHex("9f0706a0000081182aff");
  ASSERT_TRUE(decoded.ok());
  EXPECT_EQ(decoded.request.reporterIDs, (std::vector<std::int64_t>{42}));
  EXPECT_TRUE(decodeHex("860706a000009f182aff").ok());
  EXPECT_EQ(decodeHex("9f0701ff").code(), 2);
  EXPECT_EQ(decodeHex("9f0701"
                      "0102030405060708090aff")
                .code(),
            2);
  EXPECT_TRUE(decodeHex("9f07012a").unreadable());
  EXPECT_TRUE(decodeHex("9fff").unreadable());
}

// Answered with code 1.

TEST(RequestDecoder, UnknownOperationsAreAnsweredWithTheirID) {
  for (const char* number : {"00", "0c", "1863", "1868", "1bffffffffffffffff", "20", "6161", "f6", "80"}) {
    const Decoded decoded = decodeHex(std::string("831864") + number + "01");
    EXPECT_EQ(decoded.code(), 1) << number;
    EXPECT_EQ(decoded.request.id, 100U);
    EXPECT_EQ(decoded.refusal.text, "unknown operation");
  }
}

// Answered with code 2.

TEST(RequestDecoder, WrongCountsOfArgumentsAreBadArguments) {
  for (const char* hex : {"8107", "820701", "8407010102",
                          "830702"
                          "01",
                          "8407"
                          "06a000",
                          "8707"
                          "06a0000080"
                          "00"}) {
    EXPECT_EQ(decodeHex(hex).code(), 2) << hex;
  }
  for (const char* hex : {"820701", "9f0701ff", "9f07010203ff", "9f0701020304050607ff"}) {
    EXPECT_EQ(decodeHex(hex).refusal.text, "createReportingSession: wrong number of arguments") << hex;
  }
  // One more than the operation with the most arguments takes.
  EXPECT_EQ(decodeHex("9f0706a000008000ff").refusal.text, "sendMessage: wrong number of arguments");
}

TEST(RequestDecoder, WrongKindsInAnArgumentsPlaceAreBadArguments) {
  const char* const frames[] = {
      "830701f93c00",
      "8307016131",
      "830701f6",
      "83070180",
      "830701c101",
      "830701f5",  // reporter ID
      "84070261"
      "6101",
      "84070220"
      "01",  // service type
      "840704f601",
      "8407048001",
      "840704617801",
      "840704c1a001",  // dictionary
      "860706a0"
      "61310080",
      "860706a0"
      "006131"
      "80",  // category, type
      "860706a00000a0",
      "860706a0000001",
      "860706a00000f7",
      "860706a0000081f6",
      "860706a0000081fa3f800000",  // IDs
  };
  for (const char* hex : frames) {
    EXPECT_EQ(decodeHex(hex).code(), 2) << hex;
  }
}

TEST(RequestDecoder, ReporterIDsReachFromMinToMaxAndNoFurther) {
  EXPECT_EQ(decodeHex("8307011b7fffffffffffffff").request.reporterID, std::numeric_limits<std::int64_t>::max());
  EXPECT_EQ(decodeHex("8307013b7fffffffffffffff").request.reporterID, std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(decodeHex("8307011b8000000000000000").code(), 2);
  EXPECT_EQ(decodeHex("8307013b8000000000000000").code(), 2);
  EXPECT_EQ(decodeHex("860706a00000811b8000000000000000").code(), 2);
}

TEST(RequestDecoder, TypesAndCategoriesReachTheirLargestAndNoFurther) {
  EXPECT_TRUE(decodeHex("84070219ffff01").ok());
  EXPECT_EQ(decodeHex("8407021a0001000001").code(), 2);
  EXPECT_TRUE(decodeHex("860706a01affffffff19ffff80").ok());
  EXPECT_EQ(decodeHex("860706a01b00000001000000000080").code(), 2);
  EXPECT_EQ(decodeHex("860706a0001a0001000080").code(), 2);
}

TEST(RequestDecoder, BadUTF8OutsideADictionaryIsAWrongKindOnly) {
  EXPECT_EQ(decodeHex("83070161ff").code(), 2);
}

TEST(RequestDecoder, RefusalsSayWhatWasExpected) {
  const std::pair<const char*, const char*> frames[] = {
      {"8107", "an operation is missing"},
      {"8307016131", "createReportingSession: reporter ID: a signed 64-bit integer expected"},
      {"840702613101", "setServiceType: type: 0 to 65535 expected"},
      {"840704f601", "setConfiguration: a dictionary expected"},
      {"860706a061310080", "sendMessage: category: 0 to 4294967295 expected"},
      {"860706a000613180", "sendMessage: type: 0 to 65535 expected"},
      {"860706a00000a0", "sendMessage: reporter IDs: an array of signed 64-bit integers or null expected"},
      {"860706a0000081f6", "sendMessage: reporter IDs: an array of signed 64-bit integers or null expected"}};
  for (const auto& [hex, text] : frames) {
    EXPECT_EQ(decodeHex(hex).refusal.text, text) << hex;
  }
}

// Closing the connection.

TEST(RequestDecoder, AFrameThatIsNoArrayIsCalledSo) {
  for (const char* hex : {"00", "a0", "6161"}) {
    EXPECT_EQ(decodeHex(hex).refusal.text, "not a CBOR array") << hex;
  }
}

TEST(RequestDecoder, FramesThatAreNoArrayAreUnreadable) {
  for (const char* hex : {"", "00", "a0", "6161", "f6", "c18107",
                          "820701"
                          "00"}) {
    EXPECT_TRUE(decodeHex(hex).unreadable()) << hex;
  }
}

TEST(RequestDecoder, FramesWithoutAReadableIDAreUnreadable) {
  for (const char* hex : {"80", "822001", "82613101", "82f601", "82c10701", "82fa0000000001", "828001"}) {
    const Decoded decoded = decodeHex(hex);
    EXPECT_TRUE(decoded.unreadable()) << hex;
    EXPECT_EQ(decoded.refusal.text, "no readable id") << hex;
  }
}

TEST(RequestDecoder, TrailingBytesAreUnreadable) {
  const Decoded decoded = decodeHex("82070a00");
  EXPECT_TRUE(decoded.unreadable());
  EXPECT_EQ(decoded.refusal.text, "bytes behind the array");
  EXPECT_TRUE(decodeHex("9f070aff00").unreadable());
}

TEST(RequestDecoder, EveryCutOfAGoodFrameIsUnreadable) {
  const std::string frame = fromHex(
      "860706a2616b056264"
      "6ec1f93c001affffffff19ffff82013903e7");
  ASSERT_TRUE(decodeBytes(frame).ok());
  for (std::size_t size = 0; size < frame.size(); ++size) {
    EXPECT_TRUE(decodeBytes(frame.substr(0, size)).unreadable()) << size;
  }
}

TEST(RequestDecoder, WhatIsNotWellFormedIsUnreadableHoweverDeepAndWhateverElseIsWrong) {
  for (const char* hex : {
           "840704a1616b1c01",              // reserved head as a value
           "840704a1616bf81401",            // a simple value written too long
           "840704a1616b5f6161ff01",        // text inside open-ended data
           "840704a1616b818181ff01",        // a break where a value must be
           "840704bf616bff01",              // a key without a value
           "840704a2616bf6616a1c01",        // null first, then a reserved head
           "8307ff01", "830718ff", "8218",  // in the frame itself
           "83070cfe",                      // after an unknown operation
           "84070102fc",                    // after a wrong count
       }) {
    EXPECT_TRUE(decodeHex(hex).unreadable()) << hex;
  }
}

TEST(RequestDecoder, AListThatClaimsMoreThanTheFrameHoldsMakesNoRoom) {
  for (const char* hex :
       {"860706a1616b0501029bffffffffffffffff", "860706a1616b0501029affffffff", "860706a1616b05010299ffff07"}) {
    const testing::HeapGrowth heap;
    const Decoded decoded = decodeHex(hex);
    EXPECT_TRUE(decoded.unreadable()) << hex;
    EXPECT_LT(heap.bytes(), 4096) << hex;
  }
}

TEST(RequestDecoder, ABreakAfterATaggedItemEndsItsArray) {
  EXPECT_EQ(decodeHex("840704a1616b9fc105ff01").code(), 3);  // readable: lists of open length are just not taken
}

TEST(RequestDecoder, AKeyGivenTwiceIsCalledSo) {
  const Decoded decoded = decodeHex("840704a2616b01616b0201");
  EXPECT_EQ(decoded.code(), 3);
  EXPECT_EQ(decoded.refusal.text, "setConfiguration: not a property list: a key given twice");
}

TEST(RequestDecoder, RefusedDictionariesLeaveNoMemoryBehind) {
  for (const char* hex : {"840704a2616b01616b0201", "840704a1616bf601"}) {
    const std::string frame = fromHex(hex);
    RequestDecoder decoder;
    DecodedRequest request;
    Refusal refusal;
    const testing::HeapGrowth heap;
    for (int i = 0; i < 20'000; ++i) {
      ASSERT_EQ(decoder.decode(asBytes(frame), request, refusal), DecodeVerdict::Refused);
    }
    EXPECT_LT(heap.bytes(), 16'384) << hex;
  }
}

TEST(RequestDecoder, HostileNestingIsAnsweredOrCutOffWithoutRecursion) {
  constexpr std::size_t kDepth = 900000;
  EXPECT_EQ(decodeBytes(testing::valueFrame(std::string(kDepth, '\x81') + '\0')).code(), 3);
  EXPECT_TRUE(decodeBytes(testing::valueFrame(std::string(kDepth, '\x81'))).unreadable());
  EXPECT_EQ(decodeBytes(fromHex("830701") + std::string(kDepth, '\x81') + '\0').code(), 2);
  EXPECT_TRUE(decodeBytes(std::string(kDepth, '\x9f')).unreadable());
}

TEST(RequestDecoder, ARefusedDictionaryLeavesNothingForTheNextRequest) {
  RequestDecoder decoder;
  DecodedRequest request;
  Refusal refusal;
  const std::string bad = testing::valueFrame(fromHex("8301a1616d02f6"));
  ASSERT_EQ(decoder.decode(asBytes(bad), request, refusal), DecodeVerdict::Refused);
  const std::string good = testing::valueFrame(fromHex("05"));
  ASSERT_EQ(decoder.decode(asBytes(good), request, refusal), DecodeVerdict::Ok);
  EXPECT_EQ(request.dictionary, (plist::Dictionary{{"k", 5}}));
}

}  // namespace
}  // namespace tarn::wire
