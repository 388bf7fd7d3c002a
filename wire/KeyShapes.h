// SPDX-License-Identifier: Apache-2.0
// KeyShapes: the keys of the dictionaries that came lately, as they stand in a frame. Internal to wire/.
//
// Which problem this solves: a client sends thousands of messages whose keys are the same in the same order. Whoever
// expects them compares bytes with bytes, and a key that is the expected one needs no look at its UTF-8, no hash, and
// no search for its list.
//
//   {"id": 1, "level": 2}    keys (id, level), bytes 62 69 64 | 65 6c 65 76 65 6c
//
// Only the shortest head of a text is expected: keys with longer ones are read like keys that never came. Owned by a
// decoder. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "plist/KeyList.h"
#include "wire/CborReader.h"

namespace tarn::wire {

// A list of keys and its bytes in a frame, without the values between them.
class KeyShape {
 public:
  // Becomes the shape of these keys. Throws std::bad_alloc, and is of no keys then.
  void set(const plist::KeyList& keys);

  const plist::KeyList& keys() const noexcept { return keys_; }
  std::size_t size() const noexcept { return ends_.size(); }
  // Head and text of a key; `index` is below size().
  std::string_view key(std::size_t index) const noexcept {
    const std::string_view before = firstKeys(index);
    return std::string_view(bytes_).substr(before.size(), ends_[index] - before.size());
  }
  // The bytes of so many keys, one after the other.
  std::string_view firstKeys(std::size_t count) const noexcept {
    return std::string_view(bytes_).substr(0, count == 0 ? 0 : ends_[count - 1]);
  }

 private:
  plist::KeyList keys_;
  std::string bytes_;
  // Where each key ends in bytes_.
  std::vector<std::size_t> ends_;
};

// The shapes of one decoder. Bounded: a new shape takes the place of the oldest one, and what is larger than a shape
// may be isn't kept. Pointers to shapes are good until remember().
class KeyShapes {
 public:
  // The most shapes, and the most keys of one and bytes of their texts.
  static constexpr std::size_t kMostShapes = 16;
  static constexpr std::size_t kMostKeys = 64;
  static constexpr std::size_t kMostBytes = 2048;

  // The shape to go on with in a dictionary of `count` entries, of which `known` were those of `shape`: one that begins
  // with the same keys and whose next one stands at the reader's place. The one that the last dictionary had is looked
  // at first. Null when there is none. `known` is below `count`.
  const KeyShape* next(const CborReader& in, std::uint64_t count, const KeyShape* shape, std::size_t known) noexcept;
  // Keeps the keys of a dictionary that had no shape. Throws std::bad_alloc, and then has one shape less or as many.
  void remember(const plist::KeyList& keys);

 private:
  std::vector<KeyShape> shapes_;
  // Places in shapes_: of the shape that the last dictionary had, and of the oldest one.
  std::size_t last_ = 0;
  std::size_t oldest_ = 0;
};

}  // namespace tarn::wire
