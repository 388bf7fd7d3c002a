// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/WireWriter.h"

namespace pylonmetrics {

void WireWriter::appendVarint(std::uint64_t value) {
  constexpr unsigned kMore = 0x80;
  while (value >= kMore) {
    bytes_ += static_cast<char>(static_cast<unsigned char>(value | kMore));
    value >>= kVarintBits;
  }
  bytes_ += static_cast<char>(value);
}

void WireWriter::appendTag(std::uint32_t fieldNumber, WireType type) {
  appendVarint(std::uint64_t{fieldNumber} << kWireTypeBits | static_cast<unsigned>(type));
}

void WireWriter::writeUnsigned(std::uint32_t fieldNumber, std::uint64_t value) {
  appendTag(fieldNumber, WireType::Varint);
  appendVarint(value);
}

void WireWriter::writeSigned(std::uint32_t fieldNumber, std::int32_t value) {
  writeUnsigned(fieldNumber, static_cast<std::uint64_t>(std::int64_t{value}));
}

void WireWriter::writeString(std::uint32_t fieldNumber, std::string_view bytes) {
  appendTag(fieldNumber, WireType::LengthDelimited);
  appendVarint(bytes.size());
  bytes_ += bytes;
}

}  // namespace pylonmetrics
