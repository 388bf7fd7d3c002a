// SPDX-License-Identifier: Apache-2.0
#include "clients/c/src/Cbor.h"

#include <cstring>

namespace tarn::reporting {

namespace {

constexpr std::uint8_t kOneByte = 24;
constexpr std::uint8_t kTrue = 0xF5;
constexpr std::uint8_t kFalse = 0xF4;
constexpr std::uint8_t kNull = 0xF6;
constexpr std::uint8_t kDouble = 0xFB;

void putBigEndian(Bytes& out, std::uint64_t value, unsigned bytes) noexcept {
  for (unsigned left = bytes; left > 0; --left) {
    out.append(static_cast<std::uint8_t>(value >> (8U * (left - 1))));
  }
}

class Reader {
 public:
  Reader(const std::uint8_t* at, std::size_t size) noexcept : at_(at), end_(at + size) {}

  bool head(Major& major, std::uint64_t& argument) noexcept {
    if (at_ == end_) return false;
    const std::uint8_t first = *at_++;
    major = static_cast<Major>(first >> 5U);
    const unsigned info = first & 0x1FU;
    if (info < kOneByte) {
      argument = info;
      return true;
    }
    if (info > kOneByte + 3U) return false;
    const auto bytes = std::size_t{1} << (info - kOneByte);
    if (left() < bytes) return false;
    argument = 0;
    for (std::size_t i = 0; i < bytes; ++i) {
      argument = argument << 8U | *at_++;
    }
    return true;
  }
  bool text(const char*& text, std::size_t& length) noexcept {
    Major major = Major::Simple;
    std::uint64_t bytes = 0;
    if (!head(major, bytes) || major != Major::Text || bytes > left()) return false;
    text = reinterpret_cast<const char*>(at_);
    length = static_cast<std::size_t>(bytes);
    at_ += length;
    return true;
  }
  bool atNull() const noexcept { return at_ != end_ && *at_ == kNull; }

 private:
  std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }

  const std::uint8_t* at_;
  const std::uint8_t* end_;
};

}  // namespace

void putHead(Bytes& out, Major major, std::uint64_t argument) noexcept {
  const auto first = static_cast<std::uint8_t>(static_cast<unsigned>(major) << 5U);
  if (argument < kOneByte) {
    out.append(static_cast<std::uint8_t>(first | argument));
    return;
  }
  unsigned power = 0;
  while (power < 3 && argument >> (8U << power) != 0) {
    ++power;
  }
  out.append(static_cast<std::uint8_t>(first | (kOneByte + power)));
  putBigEndian(out, argument, 1U << power);
}

void putText(Bytes& out, const char* text, std::size_t length) noexcept {
  putHead(out, Major::Text, length);
  out.append(text, length);
}

void putText(Bytes& out, const char* text) noexcept {
  putText(out, text, std::strlen(text));
}

void putInteger(Bytes& out, std::int64_t value) noexcept {
  if (value >= 0) {
    putHead(out, Major::Unsigned, static_cast<std::uint64_t>(value));
  } else {
    putHead(out, Major::Negative, ~static_cast<std::uint64_t>(value));
  }
}

void putDouble(Bytes& out, double value) noexcept {
  std::uint64_t bits = 0;
  std::memcpy(&bits, &value, sizeof bits);
  out.append(kDouble);
  putBigEndian(out, bits, sizeof bits);
}

void putBoolean(Bytes& out, bool value) noexcept {
  out.append(value ? kTrue : kFalse);
}

bool readReplyFront(const std::uint8_t* frame, std::size_t size, ReplyFront& reply) noexcept {
  Reader in(frame, size);
  Major major = Major::Simple;
  std::uint64_t argument = 0;
  if (!in.head(major, argument) || major != Major::Array || argument < 2) return false;
  if (!in.head(major, reply.id) || major != Major::Unsigned) return false;
  reply.isError = !in.atNull();
  if (!reply.isError) return true;
  const char* domain = nullptr;
  std::size_t domainLength = 0;
  return in.head(major, argument) && major == Major::Array && argument == 3 && in.text(domain, domainLength) &&
         in.head(major, argument) && in.text(reply.text, reply.textLength);
}

}  // namespace tarn::reporting
