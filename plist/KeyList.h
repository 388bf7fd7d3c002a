// SPDX-License-Identifier: Apache-2.0
// KeyList: the ordered, repeat-free list of a dictionary's keys, shared by every dictionary that has just these keys in
// this order.
//
// A client sends thousands of messages with one and the same key list. Sharing it leaves a logged message with its
// values alone, and lets two messages be compared without looking at a key.
//
// Threads: any; a key list never changes. Making one takes a lock, reading does not.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "plist/Key.h"

namespace tarn::plist {

namespace detail {
struct KeyListBody;
}

// A handle of eight bytes on the list, which knows its hash, whether a key has a blank and, beyond 16 keys, an index.
// Two lists with the same keys in the same order are one, so comparing them compares addresses. Throws std::bad_alloc.
class KeyList {
 public:
  // Of indexOf(): not in the list.
  static constexpr std::size_t npos = static_cast<std::size_t>(-1);

  KeyList() noexcept : body_(nullptr) {}  // the empty list
  KeyList(const KeyList& other) noexcept;
  KeyList(KeyList&& other) noexcept : body_(other.body_) { other.body_ = nullptr; }
  KeyList& operator=(KeyList other) noexcept;
  ~KeyList();

  // The list of these keys, or nothing when one of them stands there twice; none make the empty list. Found or made
  // under the lock of the table of lists. Texts are interned first; where keys are at hand already, they cost a count
  // each, and only when the list is new.
  static std::optional<KeyList> make(std::span<const std::string_view> texts);
  static std::optional<KeyList> make(std::span<const Key> keys);
  static std::optional<KeyList> make(std::span<const Key* const> keys);

  std::size_t size() const noexcept;
  bool empty() const noexcept { return body_ == nullptr; }
  // `index` must be below size().
  const Key& operator[](std::size_t index) const noexcept;
  // Position of the key, npos when it is not in the list. Constant time for long lists.
  std::size_t indexOf(const Key& key) const noexcept;
  std::size_t indexOf(std::string_view text) const noexcept;
  std::size_t indexOf(const char* text) const noexcept { return indexOf(std::string_view(text)); }
  // Whether any key holds a blank; found out when the list was made.
  bool hasBlanks() const noexcept;
  // Whether the list is exactly these texts in this order. Compares the texts themselves: for whoever has found the
  // list by its hash and wants to be sure.
  bool equals(std::span<const std::string_view> texts) const noexcept;
  // Hash over the keys in order; 0 of the empty list. combineHash() takes the hash so far and the next key's
  // (Key::hashOf), so whoever reads texts one by one knows the list's hash without a list.
  std::uint64_t hash() const noexcept;
  static std::uint64_t combineHash(std::uint64_t hash, std::uint64_t keyHash) noexcept;

  // This list with one more key at its end (the key is not in it yet), or without the key at `index`. A list remembers
  // the first list that it was extended to, so a burst of the same additions takes no lock.
  KeyList appending(const Key& key) const;
  KeyList removing(std::size_t index) const;

  friend bool operator==(const KeyList& a, const KeyList& b) noexcept { return a.body_ == b.body_; }

 private:
  friend class Dictionary;
  friend class PackedBuilder;
  friend class PackedImageReader;
  // Takes over one reference; null is the empty list.
  explicit KeyList(detail::KeyListBody* body) noexcept : body_(body) {}
  // Whether any key starts with `prefix`.
  static bool hasPrefix(const detail::KeyListBody& body, std::string_view prefix) noexcept;

  // One reference held; null: the empty list.
  detail::KeyListBody* body_;
};

}  // namespace tarn::plist
