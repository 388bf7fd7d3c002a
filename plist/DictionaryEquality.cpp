// SPDX-License-Identifier: Apache-2.0
// The comparison of dictionaries that leaves out some keys: of every message with the one before it.
#include <algorithm>
#include <cstring>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/KeyListBody.h"
#include "plist/Packed.h"

namespace tarn::plist {

namespace {

using detail::Body;

// Offsets of all values, for readers that jump about in a long dictionary.
std::vector<std::uint32_t> offsetsOf(const Body& body) {
  std::vector<std::uint32_t> offsets;
  for (const std::byte* at = body.data(); at != body.end(); at += Packed::sizeAt(at)) {
    offsets.push_back(static_cast<std::uint32_t>(at - body.data()));
  }
  return offsets;
}

// Where the two runs of bytes first differ, `size` when they don't.
std::size_t firstDifference(const std::byte* a, const std::byte* b, std::size_t size) noexcept {
  std::size_t at = 0;
  for (; at + 8 <= size; at += 8) {
    std::uint64_t wordA = 0;
    std::uint64_t wordB = 0;
    std::memcpy(&wordA, a + at, 8);
    std::memcpy(&wordB, b + at, 8);
    if (wordA != wordB) return at + static_cast<std::size_t>(__builtin_ctzll(wordA ^ wordB)) / 8;
  }
  while (at < size && a[at] == b[at]) {
    ++at;
  }
  return at;
}

bool isIgnored(const Key& key, std::span<const Key> ignored) noexcept {
  return std::find(ignored.begin(), ignored.end(), key) != ignored.end();
}

// Two values whose bytes differ, though their tags may not.
bool equalValues(const std::byte* a, const std::byte* b) noexcept {
  if (Packed::isPlain(a) && *a == *b) return false;
  return Packed::read(a) == Packed::read(b);
}

// Two dictionaries of one key list: equal bytes are passed over many at a time, and only the values that hold a
// difference are looked at, their keys too. Values that are equal byte for byte end together, so a difference lies
// before either end.
bool equalWithSameKeys(const Body& a, const Body& b, std::span<const Key> ignored) noexcept {
  const Key* key = a.keys->keys();
  const std::byte* atA = a.data();
  const std::byte* atB = b.data();
  while (atA != a.end()) {
    const auto left = static_cast<std::size_t>(std::min(a.end() - atA, b.end() - atB));
    const std::byte* const differing = atA + firstDifference(atA, atB, left);
    if (differing == a.end()) return true;
    std::size_t size = Packed::sizeAt(atA);
    for (; atA + size <= differing; size = Packed::sizeAt(atA)) {
      atA += size;
      atB += size;
      ++key;
    }
    if (!isIgnored(*key, ignored) && !equalValues(atA, atB)) return false;
    atA += size;
    atB += Packed::sizeAt(atB);
    ++key;
  }
  return true;
}

bool equalWithOtherKeys(const Body& a, const Body& b, std::span<const Key> ignored) {
  const auto counted = [&](const detail::KeyListBody& list) {
    std::size_t count = list.count;
    for (const Key& key : ignored) {
      if (detail::indexInKeyList(&list, key) != KeyList::npos) {
        --count;
      }
    }
    return count;
  };
  if (counted(*a.keys) != counted(*b.keys)) return false;
  const std::vector<std::uint32_t> offsets = offsetsOf(b);
  std::size_t index = 0;
  for (const std::byte* at = a.data(); at != a.end(); at += Packed::sizeAt(at)) {
    const Key& key = a.keys->keys()[index++];
    if (isIgnored(key, ignored)) continue;
    const std::size_t position = detail::indexInKeyList(b.keys, key);
    if (position == KeyList::npos || !(Packed::read(at) == Packed::read(b.data() + offsets[position]))) return false;
  }
  return true;
}

}  // namespace

bool Dictionary::equalsIgnoring(const Dictionary& other, std::span<const Key> ignored) const noexcept {
  if (body_ == other.body_) return true;
  if (body_ == nullptr || other.body_ == nullptr) {
    const Dictionary& one = body_ == nullptr ? other : *this;
    return std::all_of(one.begin(), one.end(), [&](const Entry& entry) { return isIgnored(entry.key, ignored); });
  }
  return body_->keys == other.body_->keys ? equalWithSameKeys(*body_, *other.body_, ignored)
                                          : equalWithOtherKeys(*body_, *other.body_, ignored);
}

}  // namespace tarn::plist
