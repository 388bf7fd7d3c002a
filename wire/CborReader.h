// SPDX-License-Identifier: Apache-2.0
// CborReader: walks over the bytes of a frame, one item head at a time. Internal to wire/.
//
// A head is the first byte of an item (three bits of major type, five of information) and the argument after it. The
// reader never goes beyond the frame and allocates nothing.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string_view>

namespace tarn::wire {

// The kinds of items, by their numbers in a head:
//
//   Unsigned  the argument is the value             Array  the argument counts the items
//   Negative  the value is -1 - argument            Map    the argument counts the entries, two items each
//   Bytes     the argument counts the bytes         Tag    the argument says what the item after it means
//   Text      the same, of UTF-8                    Simple false, true, null, floats: by information and argument
enum class Major : std::uint8_t { Unsigned, Negative, Bytes, Text, Array, Map, Tag, Simple };

// Information below this is the argument itself. With this the argument is in the next byte; with 25, 26 and 27 in the
// next 2, 4 and 8, the most significant first. 28 to 30 are reserved.
inline constexpr std::uint8_t kInfoOneByte = 24;  // the argument is in the next byte; likewise 25, 26 and 27
inline constexpr std::uint8_t kInfoEightBytes = 27;
inline constexpr std::uint8_t kInfoOpen = 31;  // an indefinite length, or the break that ends one
// The whole head that ends an item of indefinite length.
inline constexpr std::uint8_t kBreak = 0xFF;

// A head as it was read, MMM being the major type and IIIII the information:
//
//   MMM IIIII [argument in 0, 1, 2, 4 or 8 bytes]
//
//   000 11000 00011000             the integer 24
//   011 11001 00000001 00101100    a text of 300 bytes, which follow
//   101 11111                      a map of indefinite length, up to the break
//
// A Simple is told by its information alone:
//
//   20 false    22 null         24 another one, in the next byte    26 a float of 32 bits, its argument
//   21 true     23 undefined    25 a float of 16 bits               27 a float of 64 bits    31 the break
//
// What it announces (bytes, items, a float's bits) is not looked at yet.
struct CborHead {
  // What the item is.
  Major major = Major::Unsigned;
  // Kept beside the argument, since bools, floats and breaks are told by it.
  std::uint8_t info = 0;
  std::uint64_t argument = 0;  // 0 when the length is left open

  // Of a break, too, which is Simple and open.
  bool open() const noexcept { return info == kInfoOpen; }
};

// A cursor in bytes that it doesn't own, copied at will to look ahead. Its owner is a decoder's pass. Threads: one at a
// time. Nothing throws; each read costs what it moves over. What it yields looks into the frame and lives as long.
//
//   if (!in.readHead(head) || head.major != Major::Text || !in.readBytes(head.argument, text)) return false;
class CborReader {
 public:
  // The bytes must stay as long as the reader and all that it yielded.
  explicit CborReader(std::span<const std::byte> bytes) noexcept
      : at_(reinterpret_cast<const unsigned char*>(bytes.data())), end_(at_ + bytes.size()) {}

  // Bytes that aren't read yet: the bound of everything that a head may promise.
  std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }
  // Whether every byte was read: what a whole frame comes to.
  bool atEnd() const noexcept { return at_ == end_; }
  // Only where an item may begin: inside bytes the same value means nothing.
  bool atBreak() const noexcept { return at_ != end_ && *at_ == kBreak; }
  // Over bytes that were looked at; there must be as many.
  void skip(std::size_t bytes) noexcept { at_ += bytes; }
  // Whether these bytes come next.
  bool startsWith(std::string_view bytes) const noexcept {
    return bytes.size() <= left() && std::memcmp(at_, bytes.data(), bytes.size()) == 0;
  }
  // Moves over these bytes; false, and nothing moved, when others come next.
  bool takeBytes(std::string_view bytes) noexcept {
    if (!startsWith(bytes)) return false;
    at_ += bytes.size();
    return true;
  }

  // False when the bytes end inside the head, or it is reserved: information 28 to 30, or an integer or a tag that
  // leaves its argument open. Arguments need not be in their shortest form. After a false the place is somewhere inside
  // the head: the caller gives up.
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

  // The next so many bytes, as they lie in the frame; false, and nothing moved, when there are fewer. `count` is a
  // head's argument, so it may be anything up to 2^64 - 1.
  bool readBytes(std::uint64_t count, std::string_view& bytes) noexcept {
    if (count > left()) [[unlikely]] {
      return false;
    }
    bytes = {reinterpret_cast<const char*>(at_), static_cast<std::size_t>(count)};
    at_ += count;
    return true;
  }

 private:
  // What follows a head's first byte, when that says that something does.
  bool readArgument(CborHead& head) noexcept {
    // The sizes are powers of two by the information; 28 to 30 fall through to the end.
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

  // Strings and containers may leave their lengths open, and the break is an open Simple.
  static bool mayBeOpen(Major major) noexcept {
    return major != Major::Unsigned && major != Major::Negative && major != Major::Tag;
  }

  // An unsigned number of so many bytes; false when there are fewer.
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

  // The next byte, and the place after the last one.
  const unsigned char* at_;
  const unsigned char* end_;
};

}  // namespace tarn::wire
