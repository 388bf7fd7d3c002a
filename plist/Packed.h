// The packed form of values inside a dictionary's or an array's block. Internal to plist/.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "plist/KeyList.h"
#include "plist/ValueView.h"

namespace tarn::plist {

namespace detail {

// The counted block of an array or a dictionary; see Dictionary.h for the picture.
struct Body {
  std::atomic<std::uint32_t> references;
  std::uint32_t bytes : 31;           // packed bytes in use
  std::uint32_t holdsContainers : 1;  // whether any value is a container, which must be counted
  union {
    KeyListBody* keys;    // of a dictionary; one reference held
    std::uint64_t count;  // of an array
  };

  std::byte* data() noexcept { return reinterpret_cast<std::byte*>(this + 1); }
  const std::byte* data() const noexcept { return reinterpret_cast<const std::byte*>(this + 1); }
  std::byte* end() noexcept { return data() + bytes; }
  const std::byte* end() const noexcept { return data() + bytes; }
};
static_assert(sizeof(Body) == 16);

// Makes a block with room for `bytes` packed bytes and one reference; the caller fills it.
Body* makeBody(std::size_t bytes);
// Gives a block that nobody shares room for `bytes`; it may move. Without the memory for it it stays as it is.
Body* growBody(Body* body, std::size_t bytes);
// The same with less room.
Body* shrinkBody(Body* body, std::size_t bytes) noexcept;
void freeBody(Body* body) noexcept;
inline void retainBody(Body* body) noexcept {
  if (body != nullptr) {
    body->references.fetch_add(1, std::memory_order_relaxed);
  }
}
inline bool isShared(const Body* body) noexcept {
  return body->references.load(std::memory_order_acquire) > 1;
}
void releaseArrayBody(Body* body) noexcept;
void releaseDictionaryBody(Body* body) noexcept;
// Counts every container in the packed bytes once more, or once less.
void retainContainers(const std::byte* begin, const std::byte* end) noexcept;
void releaseContainers(const std::byte* begin, const std::byte* end) noexcept;

}  // namespace detail

enum class Tag : std::uint8_t {
  False,
  True,
  Signed8,
  Signed16,
  Signed32,
  Signed64,
  Unsigned8,
  Unsigned16,
  Unsigned32,
  Unsigned64,
  Float,
  Double,
  Date,
  Text8,   // length in one byte
  Text32,  // length in four
  Data8,
  Data32,
  Array,
  Dictionary,
};

class Packed {
 public:
  // Bytes that the value takes.
  static std::size_t sizeOf(const ValueView& value) noexcept;
  // Writes the value, counting a container once more; returns the place after it.
  static std::byte* write(std::byte* to, const ValueView& value) noexcept;
  static ValueView read(const std::byte* at) noexcept;
  static bool isContainer(const std::byte* at) noexcept { return tagAt(at) >= Tag::Array; }
  static detail::Body* bodyAt(const std::byte* at) noexcept { return load<detail::Body*>(at + 1); }

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
  static constexpr std::uint8_t kFixedSizes[] = {1, 1, 2, 3, 5, 9, 2, 3, 5, 9, 5, 9, 9, 0, 0, 0, 0, 9, 9};

  static Tag tagAt(const std::byte* at) noexcept { return static_cast<Tag>(*at); }
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
  static std::byte* writeSigned(std::byte* to, std::int64_t value) noexcept;
  static std::byte* writeUnsigned(std::byte* to, std::uint64_t value) noexcept;
  static std::byte* writeBytes(std::byte* to, Tag shortTag, Tag longTag, std::string_view bytes) noexcept;
};

}  // namespace tarn::plist
