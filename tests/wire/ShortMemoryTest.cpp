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

}  // namespace
}  // namespace tarn::wire
