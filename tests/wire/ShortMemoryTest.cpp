// SPDX-License-Identifier: Apache-2.0
// What becomes of a frame that memory is missing for.
#include <gtest/gtest.h>

#include "tests/support/FailingAllocations.h"
#include "tests/wire/Bytes.h"
#include "wire/Encoder.h"
#include "wire/RequestDecoder.h"

namespace tarn::wire {
namespace {

using testing::asBytes;
using testing::FailingAllocations;

// A message with values of many kinds, whose keys nobody has used before.
std::string message(std::uint64_t id) {
  Request request = makeRequest<Operation::SendMessage>(
      plist::Dictionary{{"a text", std::string(400, 't')},
                        {"inner", plist::Dictionary{{"list", plist::Array{1, 2.5, "three"}}}}},
      std::uint32_t{4}, std::uint16_t{1}, ReporterIDs({1, 2, 3}));
  std::string frame;
  Encoder(frame).request(id, request);
  return frame.substr(kFrameHeaderBytes);
}

TEST(RequestDecoderShortMemory, TheRequestIsRefusedAndTheNextOneIsRead) {
  RequestDecoder decoder;
  const std::string frame = message(77);
  int refused = 0;
  for (std::uint64_t ordinal = 1;; ++ordinal) {
    DecodedRequest request;
    Refusal refusal;
    DecodeVerdict verdict = DecodeVerdict::Ok;
    bool happened = false;
    {
      const FailingAllocations failing(ordinal);
      verdict = decoder.decode(asBytes(frame), request, refusal);
      happened = failing.happened();
    }
    if (!happened) break;
    ++refused;
    ASSERT_EQ(verdict, DecodeVerdict::Refused) << ordinal;
    EXPECT_EQ(refusal.code, ErrorCode::OutOfMemory);
    EXPECT_EQ(refusal.text, "out of memory");
    EXPECT_EQ(request.id, 77U);
    ASSERT_EQ(decoder.decode(asBytes(frame), request, refusal), DecodeVerdict::Ok) << ordinal;
    EXPECT_EQ(request.dictionary.size(), 2U);
  }
  EXPECT_GT(refused, 2);
}

// Dictionaries inside others push every list out of the lists seen lately; the keys of the message are expected all the
// same, and only the block of its values is new.
TEST(RequestDecoderShortMemory, KeysThatCameBeforeNeedNoMemory) {
  RequestDecoder decoder;
  DecodedRequest request;
  Refusal refusal;
  const auto frameOf = [](const plist::Dictionary& dictionary) {
    std::string frame;
    Encoder(frame).request(7, makeRequest<Operation::SetConfiguration>(dictionary, std::int64_t{1}));
    return frame.substr(kFrameHeaderBytes);
  };
  const std::string frame = frameOf({{"expected", 1}, {"again", "and again"}});
  ASSERT_EQ(decoder.decode(asBytes(frame), request, refusal), DecodeVerdict::Ok);
  plist::Array others;
  for (int i = 0; i < 10'000; ++i) {
    others.append(plist::Dictionary{{"other" + std::to_string(i), i}});
  }
  ASSERT_EQ(decoder.decode(asBytes(frameOf({{"others", others}})), request, refusal), DecodeVerdict::Ok);
  request = {};
  {
    const FailingAllocations failing(2, FailingAllocations::kAll);
    ASSERT_EQ(decoder.decode(asBytes(frame), request, refusal), DecodeVerdict::Ok);
    EXPECT_FALSE(failing.happened());
  }
  EXPECT_EQ(request.dictionary, (plist::Dictionary{{"expected", 1}, {"again", "and again"}}));
}

TEST(KeyShapesShortMemory, KeysThatMemoryWasMissingForAreRememberedLater) {
  std::string bytes;
  plist::Dictionary dictionary;
  for (int i = 0; i < 20; ++i) {
    dictionary.set(plist::Key("a key of some length " + std::to_string(i)), i);
  }
  appendValue(bytes, (*dictionary.begin()).key.text());
  const plist::KeyList keys = dictionary.keys();
  KeyShapes shapes;
  int failed = 0;
  for (std::uint64_t ordinal = 1;; ++ordinal) {
    bool happened = false;
    {
      const FailingAllocations failing(ordinal);
      try {
        shapes.remember(keys);
      } catch (const std::bad_alloc&) {
        ++failed;
      }
      happened = failing.happened();
    }
    if (!happened) break;
    ASSERT_EQ(shapes.next(CborReader(asBytes(bytes)), keys.size(), nullptr, 0), nullptr) << ordinal;
  }
  EXPECT_GT(failed, 2);
  const KeyShape* const shape = shapes.next(CborReader(asBytes(bytes)), keys.size(), nullptr, 0);
  ASSERT_NE(shape, nullptr);
  EXPECT_EQ(shape->keys(), keys);
  EXPECT_EQ(shape->size(), keys.size());
}

// Whichever allocation fails while keys are remembered: the decoder goes on to make of the next frames what they say.
TEST(RequestDecoderShortMemory, KeysAreRememberedWholeOrNotAtAll) {
  for (std::uint64_t ordinal = 1;; ++ordinal) {
    RequestDecoder decoder;
    DecodedRequest request;
    Refusal refusal;
    bool happened = false;
    const std::string first = message(1);
    {
      const FailingAllocations failing(ordinal);
      decoder.decode(asBytes(first), request, refusal);
      happened = failing.happened();
    }
    for (const std::uint64_t id : {2U, 3U}) {
      ASSERT_EQ(decoder.decode(asBytes(message(id)), request, refusal), DecodeVerdict::Ok) << ordinal;
      std::string again;
      Encoder(again).request(request.id, request);
      EXPECT_EQ(again.substr(kFrameHeaderBytes), message(id)) << ordinal;
    }
    if (!happened) break;
  }
}

}  // namespace
}  // namespace tarn::wire
