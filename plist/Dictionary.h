// SPDX-License-Identifier: Apache-2.0
// Dictionary and Array: property-list containers with value semantics and cheap copies.
//
// Which problem: a session keeps up to millions of messages, hands each to many workers, and must never let one holder
// see another's change. How: a container is one counted block, shared by copies and copied on the first write to a
// shared one ("a deep copy" costs a reference count). A dictionary's block holds its values packed, the keys lie in a
// shared KeyList:
//
//   [references 4][bytes 4][key list 8][tag value][tag value]...
//
//   tag           1 byte: the kind and the width (bools have no value bytes)
//   integers      1, 2, 4 or 8 bytes, as few as hold the value; float 4; double and date 8
//   text, data    length in 1 or 4 bytes, then the bytes
//   containers    8 bytes: the block, one reference held
//
// Lookup finds the key's position, then walks the tags before it. An array is the same with a count for the key list.
//
// Threads: different copies may be used on different threads at will; one object is for one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <iterator>
#include <span>
#include <string_view>
#include <utility>

#include "plist/KeyList.h"
#include "plist/ValueView.h"

namespace tarn::plist {

// A sequence of values. An empty one has no block, so it costs a null pointer and allocates nothing. Where memory runs
// out std::bad_alloc is thrown, and std::length_error for more than 2 GiB in one container; nothing else throws.
class Array {
 public:
  Array() noexcept : body_(nullptr) {}
  // In the order given; absent values are left out.
  Array(std::initializer_list<ValueView> items);
  Array(const Array& other) noexcept;
  Array(Array&& other) noexcept : body_(other.body_) { other.body_ = nullptr; }
  Array& operator=(Array other) noexcept;
  ~Array();

  std::size_t size() const noexcept;
  bool empty() const noexcept { return body_ == nullptr; }
  ValueView operator[](std::size_t index) const noexcept;  // walks the items before it; absent beyond the end
  // Stores a value after all others, in a block of its own: the whole block is copied each time, so to make a long
  // array use PackedBuilder. An absent value is not stored. `value` may look into this very array.
  void append(const ValueView& value);
  std::size_t storageBytes() const noexcept;  // as of a dictionary

  // Views of the items in their order; each step costs a look at a tag. They end with the next change of this array.
  class Iterator;
  Iterator begin() const noexcept;
  Iterator end() const noexcept;

 private:
  friend class ValueView;
  friend class PackedBuilder;
  friend class Packed;
  friend class PackedImageReader;
  friend class PackedImageWriter;
  // Takes over one reference; null is the empty array.
  explicit Array(detail::Body* body) noexcept : body_(body) {}
  // One reference held.
  detail::Body* body_;
};

// Values under keys that are all different, in the order in which the keys came. An empty one has no block. Writing to
// a block that nobody shares changes it in place. Throws as Array does, and nothing else.
class Dictionary {
 public:
  // As a walk gives it: the key lives as long as the dictionary's key list, the value as its block.
  struct Entry {
    const Key& key;
    ValueView value;
  };
  // As a literal gives it; the text is interned, the value copied.
  struct Member {
    std::string_view key;
    ValueView value;
  };

  // Empty, without a block.
  Dictionary() noexcept : body_(nullptr) {}
  // In the order given; of a key given twice the later value stands at the earlier place. Absent values are left out.
  Dictionary(std::initializer_list<Member> members);
  // The same of entries whose keys are all different and whose values are all present, in one allocation. Entries with
  // a key twice make an empty dictionary.
  static Dictionary fromEntries(std::span<const Entry> entries);
  Dictionary(const Dictionary& other) noexcept;
  Dictionary(Dictionary&& other) noexcept : body_(other.body_) { other.body_ = nullptr; }
  Dictionary& operator=(Dictionary other) noexcept;
  ~Dictionary();

  // Costs a load, as empty() does.
  std::size_t size() const noexcept;
  bool empty() const noexcept { return body_ == nullptr; }
  // A handle on the shared list, for the price of a count.
  KeyList keys() const noexcept;
  // Whether any key holds a U+0020: known of the key list, so it costs a load.
  bool hasKeyWithBlank() const noexcept;
  // Whether any key starts with `prefix`. Looks at the keys alone, which is much quicker than walking the entries.
  bool hasKeyWithPrefix(std::string_view prefix) const noexcept;

  // The value under the key, Kind::None when there is none. The view ends with the next change of this dictionary. It
  // costs the search of the key list (an index where that has over 16 keys) and a walk over the tags before the value.
  // A Key is found by its address; a text is compared or hashed, and nothing is interned for it.
  ValueView get(const Key& key) const noexcept;
  ValueView get(std::string_view key) const noexcept;
  ValueView get(const char* key) const noexcept { return get(std::string_view(key)); }
  template <class AnyKey>
  ValueView operator[](const AnyKey& key) const noexcept {
    return get(key);
  }
  // The same without the walk.
  bool contains(const Key& key) const noexcept;
  bool contains(std::string_view key) const noexcept;
  bool contains(const char* key) const noexcept { return contains(std::string_view(key)); }

  // An entry that a pass over the values stops at: so many entries after the one before it, and the slot that gets its
  // value.
  struct Pick {
    std::size_t skipped;
    std::size_t slot;
  };
  // Reads these values in one pass, for who goes through many dictionaries of known shapes. The entries exist: the
  // picks were made of the very key list that this has. The views end as those of get() do; slots without a pick stay.
  void pick(std::span<const Pick> picks, std::span<ValueView> slots) const noexcept;

  // Stores a value: in the place that the key has, else after all others. An absent value is not stored. `value` may
  // look into this very dictionary. It moves what lies after the value; a shared block is copied first.
  void set(const Key& key, const ValueView& value);
  // Takes the entry away; the order of the others stays.
  // A shared block is copied without the entry. The last entry takes the block with it.
  bool remove(const Key& key);  // whether it was there
  // Sets every entry of `other`, in its order, in one new block. Where this is empty, or both have the same keys, it
  // only shares the other's block.
  void merge(const Dictionary& other);
  void clear() noexcept { *this = Dictionary(); }

  // Entries in the order of the keys. They end with the next change of this dictionary.
  class Iterator;
  Iterator begin() const noexcept;
  Iterator end() const noexcept;

  // Equality of the entries whose keys are not in `ignored`: as many of them on both sides, and equal key by key,
  // whatever their order. Values of ignored keys are never looked at. With one key list on both sides it is mostly a
  // comparison of bytes.
  bool equalsIgnoring(const Dictionary& other, std::span<const Key> ignored) const noexcept;

  // Whether both are the same shared block: equal for sure, without looking.
  bool sharesStorageWith(const Dictionary& other) const noexcept { return body_ == other.body_; }
  // Whether both have the same keys in the same order. Costs a comparison of two addresses.
  bool sharesKeysWith(const Dictionary& other) const noexcept;
  // Whether its keys are exactly these in this order. Costs a comparison of two addresses, so shapes that are known
  // before are cheap to recognise.
  bool hasKeys(const KeyList& keys) const noexcept;
  // The hash of its key list (KeyList::hash), 0 of an empty one. The same for the same keys in the same order, in one
  // run.
  std::uint64_t keysHash() const noexcept;
  // Bytes held by this dictionary and, counted at each place, by the containers in it; without the key lists, and
  // without what the allocator adds. A block that is shared counts in full for each holder.
  std::size_t storageBytes() const noexcept;

 private:
  friend class ValueView;
  friend class PackedBuilder;
  friend class Packed;
  friend class PackedImageReader;
  friend class PackedImageWriter;
  // Takes over one reference; null is the empty dictionary.
  explicit Dictionary(detail::Body* body) noexcept : body_(body) {}
  detail::Body* body_;
};

// As values are compared: see ValueView.h.
inline bool operator==(const Dictionary& a, const Dictionary& b) noexcept {
  return ValueView(a) == ValueView(b);
}
inline bool operator==(const Array& a, const Array& b) noexcept {
  return ValueView(a) == ValueView(b);
}

// One address in the block. It doesn't keep the block: the array must stay.
class Array::Iterator {
 public:
  using value_type = ValueView;
  using reference = ValueView;
  using pointer = void;
  using difference_type = std::ptrdiff_t;
  using iterator_category = std::input_iterator_tag;
  ValueView operator*() const noexcept;
  Iterator& operator++() noexcept;
  void operator++(int) noexcept { ++*this; }
  friend bool operator==(const Iterator& a, const Iterator& b) noexcept { return a.at_ == b.at_; }

 private:
  friend class Array;
  const std::byte* at_ = nullptr;
};

// The same with the key that belongs to the value.
class Dictionary::Iterator {
 public:
  using value_type = Entry;
  using reference = Entry;
  using pointer = void;
  using difference_type = std::ptrdiff_t;
  using iterator_category = std::input_iterator_tag;
  Entry operator*() const noexcept;
  Iterator& operator++() noexcept;
  void operator++(int) noexcept { ++*this; }
  friend bool operator==(const Iterator& a, const Iterator& b) noexcept { return a.at_ == b.at_; }

 private:
  friend class Dictionary;
  const std::byte* at_ = nullptr;
  const Key* key_ = nullptr;
};

}  // namespace tarn::plist
