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

class PackedImageWriter {
 public:
  // `bytes` outlives the writer.
  explicit PackedImageWriter(std::string& bytes) noexcept : bytes_(bytes) {}

  void write(const Dictionary& dictionary);
  template <class Number>
  void writeNumber(Number number) {
    bytes_.append(reinterpret_cast<const char*>(&number), sizeof number);
  }

 private:
  struct Known {
    KeyList keys;
    std::uint32_t number = 0;
  };
  static constexpr std::size_t kSlots = 64;

  void writeKeys(const KeyList& keys);
  void writeValue(const std::byte* at);

  std::string& bytes_;
  std::array<Known, kSlots> known_;  // lists written lately, by their hash
  std::uint32_t lists_ = 0;
};

class PackedImageReader {
 public:
  // `bytes` outlives the reader.
  explicit PackedImageReader(std::string_view bytes) noexcept : left_(bytes) {}

  // Whether there was a whole one.
  bool read(Dictionary& dictionary);
  template <class Number>
  bool readNumber(Number& number) noexcept {
    if (left_.size() < sizeof number) return false;
    std::memcpy(&number, left_.data(), sizeof number);
    left_.remove_prefix(sizeof number);
    return true;
  }
  bool atEnd() const noexcept { return left_.empty(); }

 private:
  bool readKeys(KeyList& keys);
  bool readList();
  bool readFlat(const KeyList& keys, std::size_t size, Dictionary& dictionary);
  bool readValues(std::size_t count);
  bool readValue();

  std::string_view left_;
  std::vector<KeyList> lists_;
  PackedBuilder builder_;
};

}  // namespace tarn::plist
