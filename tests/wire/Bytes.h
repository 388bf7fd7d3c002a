// SPDX-License-Identifier: Apache-2.0
// Bytes for the tests of the wire: written in hex, as the documents of CBOR write them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "wire/RequestDecoder.h"

namespace tarn::testing {

// "82 01 f6" as bytes; blanks don't count.
inline std::string fromHex(std::string_view hex) {
  std::string bytes;
  std::string pair;
  for (const char c : hex) {
    if (c == ' ') continue;
    pair += c;
    if (pair.size() == 2) {
      bytes += static_cast<char>(std::stoi(pair, nullptr, 16));
      pair.clear();
    }
  }
  return bytes;
}

inline std::string toHex(std::string_view bytes) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string hex;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    hex += kDigits[byte >> 4U];
    hex += kDigits[byte & 0xFU];
  }
  return hex;
}

inline std::span<const std::byte> asBytes(std::string_view bytes) {
  return std::as_bytes(std::span(bytes.data(), bytes.size()));
}

struct Decoded {
  wire::DecodeVerdict verdict{};
  wire::DecodedRequest request;
  wire::Refusal refusal;

  bool ok() const { return verdict == wire::DecodeVerdict::Ok; }
  bool unreadable() const { return verdict == wire::DecodeVerdict::Unreadable; }
  // The code of the answer, 0 when the frame wasn't refused.
  int code() const { return verdict == wire::DecodeVerdict::Refused ? static_cast<int>(refusal.code) : 0; }
};

inline Decoded decodeBytes(std::string_view frame) {
  wire::RequestDecoder decoder;
  Decoded decoded;
  decoded.verdict = decoder.decode(asBytes(frame), decoded.request, decoded.refusal);
  return decoded;
}

inline Decoded decodeHex(std::string_view hex) {
  return decodeBytes(fromHex(hex));
}

// A setConfiguration request, id 7, session 1, whose dictionary is this CBOR.
inline std::string configurationFrame(std::string_view dictionary) {
  return fromHex("840704") + std::string(dictionary) + fromHex("01");
}

// The same with {"k": value}.
inline std::string valueFrame(std::string_view value) {
  return configurationFrame(fromHex("a1616b") + std::string(value));
}

inline Decoded decodeValue(std::string_view valueHex) {
  return decodeBytes(valueFrame(fromHex(valueHex)));
}

}  // namespace tarn::testing
