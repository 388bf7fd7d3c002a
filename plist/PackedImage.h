// SPDX-License-Identifier: Apache-2.0
// PackedImage: dictionaries as plain bytes and back, for whoever keeps them outside the memory for a while.
//
//   dictionary    [number of its key list 4][bytes 4][packed values]; bytes is kHoldsContainers where some do
//   key list      numbered from 1 as they come; a new number is followed by [count 4] and each text, [length 4][text];
//                 an empty dictionary has the number 0 and nothing else
//   containers    among packed values: the tag, then [count 4] and the items, or the dictionary
//
// Every value comes back as it was: its kind, its width, a number that is none, the order of the keys. Nothing is
// checked but that reading stays within the bytes and that tags are known: the image is this process's own.
//
// Writer and reader see the same dictionaries in the same order. Threads: one at a time.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/KeyList.h"
#include "plist/PackedBuilder.h"

namespace tarn::plist {

// Appends to a string that is the caller's. An image can only be read from its beginning, since key lists are written
// once and then named by their numbers.
class PackedImageWriter {
 public:
  // `bytes` outlives the writer.
  // An image begins where the writer does: what stands in `bytes` before is left alone.
  explicit PackedImageWriter(std::string& bytes) noexcept : bytes_(bytes) {}

  // Costs a copy of the packed bytes, and the texts of its keys when the list is new here. Throws std::bad_alloc alone.
  void write(const Dictionary& dictionary);
  // A number of the caller's own between dictionaries, in this machine's byte order; read back by readNumber() of the
  // same type.
  template <class Number>
  void writeNumber(Number number) {
    bytes_.append(reinterpret_cast<const char*>(&number), sizeof number);
  }

 private:
  // A key list that has its number in this image already. A list that was pushed out of its place gets another one.
  struct Known {
    KeyList keys;
    std::uint32_t number = 0;
  };
  // Enough for the lists that a page of messages mixes; with more, a list is now and then written a second time.
  static constexpr std::size_t kSlots = 64;

  // The number of the list, and the list itself where it is new.
  void writeKeys(const KeyList& keys);
  // A packed value as it stands, but a container in full in the place of its address.
  void writeValue(const std::byte* at);

  std::string& bytes_;
  std::array<Known, kSlots> known_;  // lists written lately, by their hash
  // The number of the last list that was written.
  std::uint32_t lists_ = 0;
};

// Reads what a writer wrote, from the front. After a false nothing more is to be read.
class PackedImageReader {
 public:
  // `bytes` outlives the reader.
  explicit PackedImageReader(std::string_view bytes) noexcept : left_(bytes) {}

  // Whether there was a whole one; `dictionary` is empty when there wasn't.
  bool read(Dictionary& dictionary);
  template <class Number>
  bool readNumber(Number& number) noexcept {
    if (left_.size() < sizeof number) return false;
    std::memcpy(&number, left_.data(), sizeof number);
    left_.remove_prefix(sizeof number);
    return true;
  }
  // Whether all bytes were read.
  bool atEnd() const noexcept { return left_.empty(); }

 private:
  // Each tells whether the bytes held it: a key list by number or in full, a dictionary without containers, whose
  // packed bytes are taken as they stand, and values one by one.
  bool readKeys(KeyList& keys);
  bool readList();
  bool readFlat(const KeyList& keys, std::size_t size, Dictionary& dictionary);
  bool readValues(std::size_t count);
  bool readValue();

  // What isn't read yet.
  std::string_view left_;
  // By their numbers, from 1.
  std::vector<KeyList> lists_;
  PackedBuilder builder_;
};

}  // namespace tarn::plist
