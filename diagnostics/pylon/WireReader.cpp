// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/WireReader.h"

#include <algorithm>
#include <vector>

namespace pylonmetrics {

namespace {

constexpr unsigned kMore = 0x80;
constexpr unsigned kPayload = 0x7f;

}  // namespace

bool WireReader::fail() noexcept {
  failed_ = true;
  return false;
}

std::uint64_t WireReader::readVarint() {
  const std::size_t end = std::min(bytes_.size(), position_ + kLongestVarint);
  std::uint64_t value = 0;
  unsigned shift = 0;
  for (std::size_t at = position_; at < end; ++at) {
    const auto byte = static_cast<unsigned char>(bytes_[at]);
    value |= std::uint64_t{byte & kPayload} << shift;
    shift += kVarintBits;
    if ((byte & kMore) == 0) {
      position_ = at + 1;
      return value;
    }
  }
  if (end - position_ < kLongestVarint) {
    fail();
  } else {
    position_ = end;
  }
  return 0;
}

void WireReader::readString(std::string& text) {
  const std::size_t start = position_;
  const std::uint64_t size = readVarint();
  const std::size_t from = position_;
  if (failed_ || !skipBytes(size)) {
    position_ = start;
    return;
  }
  text.assign(bytes_.substr(from, position_ - from));
}

bool WireReader::skipBytes(std::uint64_t count) noexcept {
  if (count > bytes_.size() - position_) return fail();
  position_ += static_cast<std::size_t>(count);
  return true;
}

bool WireReader::skipSimple(unsigned type) {
  switch (static_cast<WireType>(type)) {
    case WireType::Varint:
      readVarint();
      return !failed_;
    case WireType::Fixed64:
      return skipBytes(8);
    case WireType::LengthDelimited: {
      const std::uint64_t size = readVarint();
      return !failed_ && skipBytes(size);
    }
    case WireType::Fixed32:
      return skipBytes(4);
    case WireType::GroupStart:
    case WireType::GroupEnd:
      break;
  }
  return fail();
}

// With a list of the open groups in place of recursion: the input decides how deep they go.
bool WireReader::skipGroup(std::uint64_t fieldNumber) {
  std::vector<std::uint64_t> open{fieldNumber};
  while (!open.empty()) {
    const std::uint64_t tag = readVarint();
    const auto type = static_cast<unsigned>(tag & kWireTypeMask);
    const std::uint64_t number = tag >> kWireTypeBits;
    if (failed_) return false;
    if (type == static_cast<unsigned>(WireType::GroupStart)) {
      if (open.size() == kDeepestGroup) return fail();
      open.push_back(number);
    } else if (type == static_cast<unsigned>(WireType::GroupEnd)) {
      if (open.back() != number) return fail();
      open.pop_back();
    } else if (!skipSimple(type)) {
      return false;
    }
  }
  return true;
}

bool WireReader::skip(std::uint64_t fieldNumber, unsigned type) {
  const std::size_t start = position_;
  const bool skipped = type == static_cast<unsigned>(WireType::GroupStart) ? skipGroup(fieldNumber) : skipSimple(type);
  if (!skipped) {
    position_ = start;
  }
  return skipped;
}

}  // namespace pylonmetrics
