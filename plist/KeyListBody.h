// The shared body of a key list. Internal to plist/.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string_view>

#include "plist/Key.h"

namespace tarn::plist::detail {

struct KeyListBody {
  std::atomic<std::uint32_t> references{0};
  std::uint32_t count = 0;
  std::uint64_t hash = 0;
  std::unique_ptr<std::uint32_t[]> index;  // of long lists: position + 1 by hash, 0 for a free slot
  std::size_t indexMask = 0;
  bool hasBlanks = false;
  // The first list that was made of this one by one more key, set once and held: whoever adds keys to dictionaries
  // adds the same ones in the same order, and would else make the list and drop it with every dictionary.
  std::atomic<KeyListBody*> extended{nullptr};

  Key* keys() noexcept { return reinterpret_cast<Key*>(this + 1); }
  const Key* keys() const noexcept { return reinterpret_cast<const Key*>(this + 1); }
};

inline void retainKeyList(KeyListBody* body) noexcept {
  if (body != nullptr) {
    body->references.fetch_add(1, std::memory_order_relaxed);
  }
}
void releaseKeyList(KeyListBody* body) noexcept;
std::size_t indexInKeyList(const KeyListBody* body, const Key& key) noexcept;
std::size_t indexInKeyList(const KeyListBody* body, std::string_view text) noexcept;

}  // namespace tarn::plist::detail
