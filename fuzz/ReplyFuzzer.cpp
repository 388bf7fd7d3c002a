// SPDX-License-Identifier: Apache-2.0
// Feeds bytes to the reply decoder; the results that it accepts must be values that can be encoded.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "wire/Encoder.h"
#include "wire/ReplyDecoder.h"
#include "wire/WellFormed.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace tarn;
  const std::span<const std::byte> frame = std::as_bytes(std::span(data, size));
  wire::ReplyDecoder decoder;
  wire::DecodedReply reply;
  if (const Status read = decoder.decode(frame, reply); read.failed()) {
    if (read->text.empty()) {
      std::abort();
    }
    return 0;
  }
  if (wire::checkOneItem(frame) != nullptr) {
    std::abort();
  }
  std::string out;
  for (const plist::Value& result : reply.results) {
    if (!result.present()) {
      std::abort();
    }
    wire::appendValue(out, result);
  }
  return 0;
}
