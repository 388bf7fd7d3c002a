// The one copy of a key's text. Internal to plist/.
#pragma once

#include <atomic>
#include <cstdint>
#include <string_view>

namespace tarn::plist::detail {

struct KeyText {
  std::atomic<std::uint32_t> references;
  std::uint32_t size;
  std::uint64_t hash;
  bool hasBlank;

  char* chars() noexcept { return reinterpret_cast<char*>(this + 1); }
  std::string_view text() const noexcept { return {reinterpret_cast<const char*>(this + 1), size}; }
};

// The text, found or made, with one more reference.
KeyText* internText(std::string_view text);
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
