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

class Array {
 public:
  Array() noexcept : body_(nullptr) {}
  Array(std::initializer_list<ValueView> items);
  Array(const Array& other) noexcept;
  Array(Array&& other) noexcept : body_(other.body_) { other.body_ = nullptr; }
  Array& operator=(Array other) noexcept;
  ~Array();

  std::size_t size() const noexcept;
  bool empty() const noexcept { return body_ == nullptr; }
  ValueView operator[](std::size_t index) const noexcept;  // walks the items before it; absent beyond the end
  // Stores a value after all others, in a block of its own; to make a long array use PackedBuilder.
  void append(const ValueView& value);
  std::size_t storageBytes() const noexcept;  // as of a dictionary

  class Iterator;
  Iterator begin() const noexcept;
  Iterator end() const noexcept;

 private:
  friend class ValueView;
  friend class PackedBuilder;
  friend class Packed;
  friend class PackedImageReader;
  friend class PackedImageWriter;
  explicit Array(detail::Body* body) noexcept : body_(body) {}
  detail::Body* body_;
};

class Dictionary {
 public:
  struct Entry {
    const Key& key;
    ValueView value;
  };
  struct Member {
    std::string_view key;
    ValueView value;
  };

  Dictionary() noexcept : body_(nullptr) {}
  // In the order given; of a key given twice the later value stands at the earlier place. Absent values are left out.
  Dictionary(std::initializer_list<Member> members);
  // The same of entries whose keys are all different and whose values are all present.
  static Dictionary fromEntries(std::span<const Entry> entries);
  Dictionary(const Dictionary& other) noexcept;
  Dictionary(Dictionary&& other) noexcept : body_(other.body_) { other.body_ = nullptr; }
  Dictionary& operator=(Dictionary other) noexcept;
  ~Dictionary();

  std::size_t size() const noexcept;
  bool empty() const noexcept { return body_ == nullptr; }
  KeyList keys() const noexcept;
  bool hasKeyWithBlank() const noexcept;
  // Whether any key starts with `prefix`. Looks at the keys alone, which is much quicker than walking the entries.
  bool hasKeyWithPrefix(std::string_view prefix) const noexcept;

  // The value under the key, Kind::None when there is none. The view ends with the next change of this dictionary.
  ValueView get(const Key& key) const noexcept;
  ValueView get(std::string_view key) const noexcept;
  ValueView get(const char* key) const noexcept { return get(std::string_view(key)); }
  template <class AnyKey>
  ValueView operator[](const AnyKey& key) const noexcept {
    return get(key);
  }
  bool contains(const Key& key) const noexcept;
  bool contains(std::string_view key) const noexcept;
  bool contains(const char* key) const noexcept { return contains(std::string_view(key)); }

  // Stores a value: in the place that the key has, else after all others. An absent value is not stored.
  // `value` may look into this very dictionary.
  void set(const Key& key, const ValueView& value);
  bool remove(const Key& key);  // whether it was there
  // Sets every entry of `other`, in its order.
  void merge(const Dictionary& other);
  void clear() noexcept { *this = Dictionary(); }

  class Iterator;
  Iterator begin() const noexcept;
  Iterator end() const noexcept;

  // Equality of the entries whose keys are not in `ignored`: as many of them on both sides, and equal key by key.
  bool equalsIgnoring(const Dictionary& other, std::span<const Key> ignored) const noexcept;

  // Whether both are the same shared block: equal for sure, without looking.
  bool sharesStorageWith(const Dictionary& other) const noexcept { return body_ == other.body_; }
  // Whether both have the same keys in the same order.
  bool sharesKeysWith(const Dictionary& other) const noexcept;
  // Whether its keys are exactly these in this order.
  bool hasKeys(const KeyList& keys) const noexcept;
  // The hash of its key list (KeyList::hash), 0 of an empty one.
  std::uint64_t keysHash() const noexcept;
  // Bytes held by this dictionary and, counted at each place, by the containers in it; without the key lists.
  std::size_t storageBytes() const noexcept;

 private:
  friend class ValueView;
  friend class PackedBuilder;
  friend class Packed;
  friend class PackedImageReader;
  friend class PackedImageWriter;
  explicit Dictionary(detail::Body* body) noexcept : body_(body) {}
  detail::Body* body_;
};

inline bool operator==(const Dictionary& a, const Dictionary& b) noexcept {
  return ValueView(a) == ValueView(b);
}
inline bool operator==(const Array& a, const Array& b) noexcept {
  return ValueView(a) == ValueView(b);
}

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
