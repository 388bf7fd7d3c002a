// SPDX-License-Identifier: Apache-2.0
// Feeds a byte stream, in pieces whose sizes it picks itself, through the frame buffer and the request decoder; what
// was accepted must encode and decode to the same again, and a decoder that has seen nothing must make the same of it.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "wire/Encoder.h"
#include "wire/FrameBuffer.h"
#include "wire/RequestDecoder.h"
#include "wire/WellFormed.h"

namespace {

using namespace tarn::wire;

constexpr std::size_t kMaxFrameBytes = 4096;

void check(bool holds) {
  if (!holds) {
    std::abort();
  }
}

// What a decoder makes of a frame, the error included.
std::string outcome(RequestDecoder& decoder, std::span<const std::byte> frame) {
  DecodedRequest request;
  Refusal refusal;
  const DecodeVerdict verdict = decoder.decode(frame, request, refusal);
  std::string text = std::to_string(static_cast<int>(verdict)) + ' ' + std::to_string(request.id) + ' ';
  if (verdict == DecodeVerdict::Ok) {
    Encoder(text).request(request.id, request);
  } else {
    text += std::to_string(static_cast<int>(refusal.code)) + refusal.text;
  }
  return text;
}

void checkFrame(RequestDecoder& decoder, std::span<const std::byte> frame) {
  RequestDecoder fresh;
  const std::string expected = outcome(fresh, frame);
  // Also when its own keys are those that came last.
  check(outcome(decoder, frame) == expected && outcome(decoder, frame) == expected);
  DecodedRequest request;
  Refusal refusal;
  const DecodeVerdict verdict = decoder.decode(frame, request, refusal);
  if (verdict != DecodeVerdict::Unreadable) {
    check(checkOneItem(frame) == nullptr);
  }
  if (verdict != DecodeVerdict::Ok) {
    check(!refusal.text.empty());
    return;
  }
  std::string once;
  Encoder(once).request(request.id, request);
  DecodedRequest again;
  check(decoder.decode(std::as_bytes(std::span(once)).subspan(kFrameHeaderBytes), again, refusal) == DecodeVerdict::Ok);
  std::string twice;
  Encoder(twice).request(again.id, again);
  check(once == twice);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  RequestDecoder decoder;
  // The bytes as one frame, and as a stream of frames.
  checkFrame(decoder, std::as_bytes(std::span(data, size)));
  FrameBuffer buffer(kMaxFrameBytes);
  std::size_t piece = size > 0 ? 1 + data[0] : 1;
  for (std::size_t at = 0; at < size;) {
    const std::span<std::byte> space = buffer.space();
    const std::size_t count = std::min({piece, size - at, space.size()});
    check(count > 0);
    check(space.size() <= kMaxFrameBytes + FrameBuffer::kGulpBytes);
    std::memcpy(space.data(), data + at, count);
    buffer.received(count);
    at += count;
    piece = piece * 7 % 257 + 1;
    std::span<const std::byte> frame;
    FrameBuffer::Next next = buffer.next(frame);
    for (; next == FrameBuffer::Next::Frame; next = buffer.next(frame)) {
      check(frame.size() <= kMaxFrameBytes);
      checkFrame(decoder, frame);
    }
    if (next == FrameBuffer::Next::Oversize) break;
  }
  return 0;
}
