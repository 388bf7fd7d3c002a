// CborReader: walks over the bytes of a frame, one item head at a time. Internal to wire/.
//
// A head is the first byte of an item (three bits of major type, five of information) and the argument after it. The
// reader never goes beyond the frame and allocates nothing.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

namespace tarn::wire {

enum class Major : std::uint8_t { Unsigned, Negative, Bytes, Text, Array, Map, Tag, Simple };

inline constexpr std::uint8_t kInfoOneByte = 24;  // the argument is in the next byte; likewise 25, 26 and 27
inline constexpr std::uint8_t kInfoEightBytes = 27;
inline constexpr std::uint8_t kInfoOpen = 31;  // an indefinite length, or the break that ends one
inline constexpr std::uint8_t kBreak = 0xFF;

struct CborHead {
  Major major = Major::Unsigned;
  std::uint8_t info = 0;
  std::uint64_t argument = 0;  // 0 when the length is left open

  bool open() const noexcept { return info == kInfoOpen; }
};

class CborReader {
 public:
  explicit CborReader(std::span<const std::byte> bytes) noexcept
      : at_(reinterpret_cast<const unsigned char*>(bytes.data())), end_(at_ + bytes.size()) {}

  std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }
  bool atEnd() const noexcept { return at_ == end_; }
  bool atBreak() const noexcept { return at_ != end_ && *at_ == kBreak; }
  void skip(std::size_t bytes) noexcept { at_ += bytes; }

  // False when the bytes end inside the head, or it is reserved: information 28 to 30, or an integer or a tag that
  // leaves its argument open.
  bool readHead(CborHead& head) noexcept {
    if (at_ == end_) [[unlikely]] {
      return false;
    }
    const unsigned char first = *at_++;
    head.major = static_cast<Major>(first >> 5U);
    head.info = first & 0x1FU;
    if (head.info < kInfoOneByte) [[likely]] {
      head.argument = head.info;
      return true;
    }
    return readArgument(head);
  }

  // The next so many bytes; false when there are fewer.
  bool readBytes(std::uint64_t count, std::string_view& bytes) noexcept {
    if (count > left()) [[unlikely]] {
      return false;
    }
    bytes = {reinterpret_cast<const char*>(at_), static_cast<std::size_t>(count)};
    at_ += count;
    return true;
  }

 private:
  bool readArgument(CborHead& head) noexcept {
    switch (head.info) {
      case kInfoOneByte:
        return readBigEndian<1>(head.argument);
      case 25:
        return readBigEndian<2>(head.argument);
      case 26:
        return readBigEndian<4>(head.argument);
      case kInfoEightBytes:
        return readBigEndian<8>(head.argument);
      case kInfoOpen:
        head.argument = 0;
        return mayBeOpen(head.major);
      default:
        return false;
    }
  }

  static bool mayBeOpen(Major major) noexcept {
    return major != Major::Unsigned && major != Major::Negative && major != Major::Tag;
  }

  template <std::size_t kBytes>
  bool readBigEndian(std::uint64_t& value) noexcept {
    if (left() < kBytes) return false;
    value = 0;
    for (std::size_t i = 0; i < kBytes; ++i) {
      value = value << 8U | at_[i];
    }
    at_ += kBytes;
    return true;
  }

  const unsigned char* at_;
  const unsigned char* end_;
};

}  // namespace tarn::wire
