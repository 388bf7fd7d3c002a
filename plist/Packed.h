// SPDX-License-Identifier: Apache-2.0
// The packed form of values inside a dictionary's or an array's block. Internal to plist/.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "plist/KeyList.h"
#include "plist/ValueView.h"

namespace tarn::plist {

namespace detail {

// The counted block of an array or a dictionary; see Dictionary.h for the picture.
// How many handles and packed values hold it; at 0 it is freed. Counted without ordering when it grows, with ordering
// when it falls.
struct Body {
  std::atomic<std::uint32_t> references;
  std::uint32_t bytes : 31;           // packed bytes in use
  std::uint32_t holdsContainers : 1;  // whether any value is a container, which must be counted
  union {
    KeyListBody* keys;    // of a dictionary; one reference held
    std::uint64_t count;  // of an array
  };

  // The packed values; end() is where they end, which need not be where the allocation does.
  std::byte* data() noexcept { return reinterpret_cast<std::byte*>(this + 1); }
  const std::byte* data() const noexcept { return reinterpret_cast<const std::byte*>(this + 1); }
  std::byte* end() noexcept { return data() + bytes; }
  const std::byte* end() const noexcept { return data() + bytes; }
};
static_assert(sizeof(Body) == 16);

// Makes a block with room for `bytes` packed bytes and one reference; the caller fills it, key list or count included.
// Throws std::bad_alloc, and std::length_error beyond 2 GiB, which 31 bits can't tell.
Body* makeBody(std::size_t bytes);
// Gives a block that nobody shares room for `bytes`; it may move, and the packed bytes with it. Allocations go in steps
// of 16 bytes, so a growing dictionary is often resized in place. Throws as makeBody(), and the block stays as it is.
Body* growBody(Body* body, std::size_t bytes);
// The same with less room. Needs no memory: where the allocator has none to move it to, it keeps its room.
Body* shrinkBody(Body* body, std::size_t bytes) noexcept;
// Frees the memory alone: containers and key list are the caller's to release.
void freeBody(Body* body) noexcept;
inline void retainBody(Body* body) noexcept {
  if (body != nullptr) {
    body->references.fetch_add(1, std::memory_order_relaxed);
  }
}
// Whether another holder could see a change. Ordered after what holders that are gone did with the block.
inline bool isShared(const Body* body) noexcept {
  return body->references.load(std::memory_order_acquire) > 1;
}
// Drops one reference; the last one releases what the block holds and frees it. Null is ignored.
void releaseArrayBody(Body* body) noexcept;
void releaseDictionaryBody(Body* body) noexcept;
// Counts every container in the packed bytes once more, or once less: whoever copies or drops packed bytes does this,
// unless holdsContainers says that there are none.
void retainContainers(const std::byte* begin, const std::byte* end) noexcept;
void releaseContainers(const std::byte* begin, const std::byte* end) noexcept;

}  // namespace detail

// The first byte of a packed value: its kind, and the width of what follows. Part of no format that leaves the process.
// The order counts: containers come last.
enum class Tag : std::uint8_t {
  // Bools have no value bytes: the tag is the value.
  False,
  True,
  // Integers, as few bytes as hold the value. Signed and unsigned are kept apart, whatever their value.
  Signed8,
  Signed16,
  Signed32,
  Signed64,
  Unsigned8,
  Unsigned16,
  Unsigned32,
  Unsigned64,
  // IEEE 754, as they came: 4 bytes, 8, and a date's seconds since 1970 UTC in 8.
  Float,
  Double,
  Date,
  Text8,   // length in one byte
  Text32,  // length in four
  Data8,
  Data32,
  // A block's address in 8 bytes, with one reference held.
  Array,
  Dictionary,
};

// Values in their packed form, one after the other without padding, in this machine's byte order. Nothing is checked:
// the bytes are our own. Only the values' kinds and widths are remembered, so what is read is what was written.
// Stateless.
//
//   true     01              42, signed                   02 2A             an array    11, then its block's address
//   "abc"    0D 03 61 62 63  0.5 as a float of 32 bits    0A 00 00 00 3F
class Packed {
 public:
  // Bytes that the value takes; 0 of an absent one, which can't be stored.
  static std::size_t sizeOf(const ValueView& value) noexcept;
  // Writes the value, counting a container once more; returns the place after it. `to` must have sizeOf() bytes.
  static std::byte* write(std::byte* to, const ValueView& value) noexcept;
  // The same for who knows the kind.
  static std::byte* writeSigned(std::byte* to, std::int64_t value) noexcept;
  static std::byte* writeUnsigned(std::byte* to, std::uint64_t value) noexcept;
  static std::byte* writeDouble(std::byte* to, double value) noexcept { return store(to, Tag::Double, value); }
  static std::byte* writeText(std::byte* to, std::string_view text) noexcept {
    return writeBytes(to, Tag::Text8, Tag::Text32, text);
  }
  // The value as a view into the block; containers aren't counted for it.
  static ValueView read(const std::byte* at) noexcept;
  static bool isContainer(const std::byte* at) noexcept { return tagAt(at) >= Tag::Array; }
  // Of a kind whose values under one tag are equal only when all their bytes are: a bool, an integer, a text, data.
  static bool isPlain(const std::byte* at) noexcept {
    const Tag tag = tagAt(at);
    return tag < Tag::Float || (tag >= Tag::Text8 && tag <= Tag::Data32);
  }
  // Only of a container; null for an empty one.
  static detail::Body* bodyAt(const std::byte* at) noexcept { return load<detail::Body*>(at + 1); }

  // Bytes that the value at this place takes: what a walk adds to come to the next one. The innermost loop of every
  // look-up.
  static std::size_t sizeAt(const std::byte* at) noexcept {
    const Tag tag = tagAt(at);
    const std::size_t fixed = kFixedSizes[static_cast<std::size_t>(tag)];
    if (fixed != 0) [[likely]] {
      return fixed;
    }
    return tag == Tag::Text8 || tag == Tag::Data8 ? 2 + std::to_integer<std::size_t>(at[1])
                                                  : 5 + load<std::uint32_t>(at + 1);
  }

 private:
  // By tag, the tag byte included; 0: the length stands after the tag.
  static constexpr std::uint8_t kFixedSizes[] = {1, 1, 2, 3, 5, 9, 2, 3, 5, 9, 5, 9, 9, 0, 0, 0, 0, 9, 9};

  static Tag tagAt(const std::byte* at) noexcept { return static_cast<Tag>(*at); }
  // Bytes in the block have no alignment, so they are copied out and in.
  template <class T>
  static T load(const std::byte* at) noexcept {
    T value;
    std::memcpy(&value, at, sizeof value);
    return value;
  }
  template <class T>
  static std::byte* store(std::byte* to, Tag tag, T value) noexcept {
    *to = static_cast<std::byte>(tag);
    std::memcpy(to + 1, &value, sizeof value);
    return to + 1 + sizeof value;
  }
  // Lengths in one byte up to 255.
  static std::byte* writeBytes(std::byte* to, Tag shortTag, Tag longTag, std::string_view bytes) noexcept;
};

}  // namespace tarn::plist
