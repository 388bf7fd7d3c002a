// SPDX-License-Identifier: Apache-2.0
// The one copy of a key's text. Internal to plist/.
#pragma once

#include <atomic>
#include <cstdint>
#include <string_view>

namespace tarn::plist::detail {

// One allocation: this, then the characters, without a zero at their end. All but the count never changes.
//
//   [references 4][size 4][hash 8][blank 1, room 7][characters]
struct KeyText {
  // Keys of this text. Only under the table's lock does it fall to 0, so whoever finds it in the table may count it up.
  std::atomic<std::uint32_t> references;
  // In bytes; keys come out of frames and files, which are far shorter than this can count.
  std::uint32_t size;
  // Key::hashOf() of the text, and whether it holds a U+0020: found out once, asked for every message.
  std::uint64_t hash;
  bool hasBlank;

  // To be filled by whoever makes it.
  char* chars() noexcept { return reinterpret_cast<char*>(this + 1); }
  std::string_view text() const noexcept { return {reinterpret_cast<const char*>(this + 1), size}; }
};

// The text, found or made, with one more reference, under the lock of the table of texts. Throws std::bad_alloc.
KeyText* internText(std::string_view text);
// Drops one reference; the last one takes the text out of the table, under its lock, and frees it. Null is ignored: a
// key that was moved from holds nothing.
void releaseText(KeyText* text) noexcept;

// Drops one reference unless it is the last one; whether it is the last one. Objects that a table finds by value drop
// their last reference under the table's lock.
inline bool releaseUnlessLast(std::atomic<std::uint32_t>& references) noexcept {
  std::uint32_t seen = references.load(std::memory_order_relaxed);
  while (seen > 1) {
    if (references.compare_exchange_weak(seen, seen - 1, std::memory_order_release, std::memory_order_relaxed)) {
      return false;
    }
  }
  return true;
}

}  // namespace tarn::plist::detail
