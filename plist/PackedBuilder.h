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
  class Draft;
  class Addition;

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
  // Makes entries of the values that were added so far, which are `count`, without keys: those of the list that stand
  // first, in their order. Entries may follow. The list must stay until finishDictionary.
  void nameValues(const KeyList& keys, std::size_t count);
  // Closes the open container. A dictionary with a key given twice yields nothing, and its values are dropped. An empty
  // one yields the empty dictionary, which has no block.
  std::optional<Dictionary> finishDictionary(KeyListCache& cache);
  // The same for values that were added without their keys, one for each of `keys` and in their order.
  Dictionary finishDictionary(const KeyList& keys);
  // Closes the open container as an array.
  Array finishArray();
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

// A dictionary that has no block yet: its values lie packed one after the other, so that whoever adds entries to it
// does so before the one block is made. For decoders, which make one after the other: the space is kept. No value is a
// container.
class PackedBuilder::Draft {
 public:
  // Bytes that a value takes at most beyond those of its text or data.
  static constexpr std::size_t kMostValueBytes = 9;

  Draft() = default;
  Draft(const Draft&) = delete;
  Draft& operator=(const Draft&) = delete;

  // Begins anew. The values to come take at most so many bytes together.
  void begin(std::size_t mostBytes);
  // Adds a value that is present.
  void add(const ValueView& value) noexcept;
  // The same for who knows the kind.
  void addSigned(std::int64_t value) noexcept;
  void addUnsigned(std::uint64_t value) noexcept;
  void addDouble(double value) noexcept;
  void addText(std::string_view text) noexcept;
  // A key for each value, in their order. The list stays for as long as the draft is looked at.
  void finish(const KeyList& keys) noexcept { keys_ = &keys; }

  // Only of a draft that is finished.
  const KeyList& keys() const noexcept { return *keys_; }
  // The value of a key of the list, by its place there. Walks the values before it, but for the last one.
  ValueView at(std::size_t index) const noexcept;
  Dictionary dictionary() const;

 private:
  friend class PackedBuilder::Addition;
  // Where the next value goes, which is the last one then.
  std::byte* next() noexcept {
    last_ = used_;
    return bytes_.data() + used_;
  }
  void wrote(const std::byte* end) noexcept { used_ = static_cast<std::size_t>(end - bytes_.data()); }

  std::vector<std::byte> bytes_;  // as many as were ever needed
  std::size_t used_ = 0;
  std::size_t last_ = 0;  // where the last value begins
  const KeyList* keys_ = nullptr;
};

// The same few entries for dictionary after dictionary of one list of keys, which has none of theirs: what
// Dictionary::set() of one after the other does, with nothing left to be found out for each. Its block grows once.
class PackedBuilder::Addition {
 public:
  // For no dictionary.
  Addition() = default;
  // Entries whose keys are all different, for dictionaries of these keys. For none at all when there is a key of theirs
  // among those, a value that is absent or a container, or more than is added in one step.
  Addition(const KeyList& keys, std::span<const Dictionary::Entry> entries);

  // Whether it may be added to this one.
  bool isFor(const Dictionary& dictionary) const noexcept { return !after_.empty() && dictionary.hasKeys(before_); }
  bool isFor(const Draft& draft) const noexcept { return !after_.empty() && draft.keys() == before_; }
  // In place, or in a block of its own where that is shared.
  void addTo(Dictionary& dictionary) const;
  // The draft's entries, then these.
  Dictionary addedTo(const Draft& draft) const;

 private:
  // The keys before and after, and the values as they stand in the block; nothing is after where it is for none.
  KeyList before_;
  KeyList after_;
  std::vector<std::byte> packed_;
};

}  // namespace tarn::plist
