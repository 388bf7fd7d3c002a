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

// Key lists seen lately, found by their texts without the process-wide lock. Bounded: 256 lists of at most 64 keys
// each; a longer list is made again every time, so that nobody can fill the cache with huge ones.
class KeyListCache {
 public:
  // The list of these texts, whose combined hash is `hash`; nothing when a text stands there twice.
  std::optional<KeyList> find(std::uint64_t hash, std::span<const std::string_view> texts);

 private:
  static constexpr std::size_t kSlots = 256;
  static constexpr std::size_t kLongestKept = 64;
  std::vector<KeyList> slots_;
};

class PackedBuilder {
 public:
  PackedBuilder() = default;
  PackedBuilder(const PackedBuilder&) = delete;
  PackedBuilder& operator=(const PackedBuilder&) = delete;
  ~PackedBuilder();

  // Opens a container inside the one that is open, or the outermost one.
  void begin();
  // Adds an entry to the open dictionary. The text of `key` must stay until finishDictionary; the value is copied.
  void add(std::string_view key, const ValueView& value);
  // Adds an item to the open array.
  void add(const ValueView& value);
  // Closes the open container. A dictionary with a key given twice yields nothing.
  std::optional<Dictionary> finishDictionary(KeyListCache& cache);
  // The same for values that were added without their keys, one for each of `keys` and in their order.
  Dictionary finishDictionary(const KeyList& keys);
  Array finishArray();
  // Drops everything that is open.
  void reset() noexcept;

 private:
  struct Level {
    std::size_t bytesBegin;
    std::size_t keysBegin;
    std::size_t count;
    std::uint64_t hash;
    bool holdsContainers;
  };
  detail::Body* takeBody();
  void dropLevel() noexcept;

  std::vector<std::byte> bytes_;  // as many as were ever needed at once, so that adding a value fills none in
  std::size_t used_ = 0;          // of bytes_
  std::vector<std::string_view> keys_;
  std::vector<Level> levels_;
};

}  // namespace tarn::plist
