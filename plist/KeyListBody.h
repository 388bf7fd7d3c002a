// SPDX-License-Identifier: Apache-2.0
// The shared body of a key list. Internal to plist/.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <string_view>

#include "plist/Key.h"

namespace tarn::plist::detail {

// One allocation: this, then the keys. It stands in the table of lists until its last reference goes; all but the
// counts and `extended` is written before anybody else sees it.
//
//   [this][Key][Key]...    each key a pointer to its text, one reference held
struct KeyListBody {
  // Handles, dictionaries' blocks, and lists that were extended to this one. Only under the table's lock does it fall
  // to 0.
  std::atomic<std::uint32_t> references{0};
  // Keys, at least one: the empty list has no body.
  std::uint32_t count = 0;
  // Over the keys in order, as KeyList::combineHash() makes it; never changes.
  std::uint64_t hash = 0;
  // Half of the slots stay free at least; a slot that is taken sends the search to the next one.
  std::unique_ptr<std::uint32_t[]> index;  // of long lists: position + 1 by hash, 0 for a free slot
  std::size_t indexMask = 0;
  bool hasBlanks = false;
  // The first list that was made of this one by one more key, set once and held: whoever adds keys to dictionaries
  // adds the same ones in the same order, and would else make the list and drop it with every dictionary.
  std::atomic<KeyListBody*> extended{nullptr};

  // `count` of them, right after this.
  Key* keys() noexcept { return reinterpret_cast<Key*>(this + 1); }
  const Key* keys() const noexcept { return reinterpret_cast<const Key*>(this + 1); }
};

// One more holder. Whoever calls it holds one already, so the list can't vanish meanwhile.
inline void retainKeyList(KeyListBody* body) noexcept {
  if (body != nullptr) {
    body->references.fetch_add(1, std::memory_order_relaxed);
  }
}
// One holder less; the last one takes the list out of the table, under its lock, and frees it. Also what it was
// extended to, if nobody else holds that: in a loop, so that a long chain of lists doesn't recurse.
void releaseKeyList(KeyListBody* body) noexcept;
// Holds one reference.
struct ReleaseKeyList {
  void operator()(KeyListBody* body) const noexcept { releaseKeyList(body); }
};
using OwnKeyList = std::unique_ptr<KeyListBody, ReleaseKeyList>;
// The list with one more key at its end, which is not in it yet; the caller has one reference to it. Null: the empty
// list.
KeyListBody* extendKeyList(KeyListBody* body, const Key& key);
// Position of the key, KeyList::npos without one or without a list. Up to 16 keys are looked at one by one, which is
// quicker than an index; a key by its address, a text by its characters.
std::size_t indexInKeyList(const KeyListBody* body, const Key& key) noexcept;
std::size_t indexInKeyList(const KeyListBody* body, std::string_view text) noexcept;

}  // namespace tarn::plist::detail
