// SPDX-License-Identifier: Apache-2.0
// PackedBuilder: makes a dictionary or an array out of values that arrive one by one, in one allocation of just the
// right size. For decoders; the scratch space is kept between uses.
//
// Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"

namespace tarn::plist {

// Key lists seen lately, found by their texts without the process-wide lock and without interning a text. Bounded: 256
// lists of at most 64 keys each; a longer list is made again every time, so that nobody can fill the cache with huge
// ones. A list's place is its hash modulo 256, and a new one there drops the old one. One a decoder: it is for one
// thread.
class KeyListCache {
 public:
  // The list of these texts, whose combined hash is `hash` (KeyList::combineHash() over Key::hashOf()); nothing when a
  // text stands there twice. Found by the hash and then compared text by text, so a collision costs time and nothing
  // else.
  std::optional<KeyList> find(std::uint64_t hash, std::span<const std::string_view> texts);

 private:
  static constexpr std::size_t kSlots = 256;
  static constexpr std::size_t kLongestKept = 64;
  std::vector<KeyList> slots_;
};

// One a decoder. Between begin() and finish the values lie packed in `bytes_`, those of inner containers after those of
// the outer ones; finishing copies the innermost part into a block. What is open at the end of the builder is dropped.
// Throws where memory runs out, as Dictionary does.
class PackedBuilder {
 public:
  PackedBuilder() = default;
  PackedBuilder(const PackedBuilder&) = delete;
  PackedBuilder& operator=(const PackedBuilder&) = delete;
  ~PackedBuilder();

  // Opens a container inside the one that is open, or the outermost one. Whether it is a dictionary or an array shows
  // when it is finished; the finished container is added to the one around it by the caller.
  void begin();
  // Adds an entry to the open dictionary. The text of `key` must stay until finishDictionary; the value is copied, a
  // container counted. It must be present, as everywhere here.
  void add(std::string_view key, const ValueView& value);
  // Adds an item to the open array.
  void add(const ValueView& value);
  // Closes the open container. A dictionary with a key given twice yields nothing, and its values are dropped. An empty
  // one yields the empty dictionary, which has no block.
  std::optional<Dictionary> finishDictionary(KeyListCache& cache);
  // The same for values that were added without their keys, one for each of `keys` and in their order.
  Dictionary finishDictionary(const KeyList& keys);
  // Closes the open container as an array.
  Array finishArray();
  // What Dictionary::set() of one after the other does, for who adds the same few entries to every message: when none
  // of the keys is there yet, the dictionary has entries, and the values are small and no containers, its block grows
  // once. The keys are all different, and no value looks into the dictionary itself. Needs no builder.
  static void setEntries(Dictionary& dictionary, std::span<const Dictionary::Entry> entries);
  // Drops everything that is open, for a decoder that gives up in the middle. The scratch space is kept.
  void reset() noexcept;

 private:
  // An open container: where its part of `bytes_` and `keys_` begins, how many values it has, the hash of its keys so
  // far.
  struct Level {
    // Where its values and keys begin, how many there are, and what finishing needs to know of them.
    std::size_t bytesBegin;
    std::size_t keysBegin;
    std::size_t count;
    std::uint64_t hash;
    bool holdsContainers;
  };
  // A block with the bytes of the innermost container; its references go over into it.
  detail::Body* takeBody();
  // Forgets the innermost container and releases what it holds.
  void dropLevel() noexcept;

  std::vector<std::byte> bytes_;  // as many as were ever needed at once, so that adding a value fills none in
  std::size_t used_ = 0;          // of bytes_
  // Of all open containers, the innermost one's last, and the containers themselves.
  std::vector<std::string_view> keys_;
  std::vector<Level> levels_;
};

}  // namespace tarn::plist
