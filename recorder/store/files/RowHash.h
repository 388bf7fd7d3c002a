// SPDX-License-Identifier: Apache-2.0
// RowHash: checksums of recorded rows, against bits that flip on a disk. Not against people.
//
// Each step is a bijection of what was hashed so far, so two texts that differ within eight bytes never hash alike.
// What it gives is written into files: it never changes, on no machine. It takes eight bytes a step, as it stands in
// the way of every event. Owner: whoever hashes one row. Threads: one at a time.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace tarn::recorder {

class RowHash {
 public:
  // What follows is hashed on what came before, so the order counts.
  void add(std::uint64_t value) noexcept {
    state_ = (state_ ^ value) * 0x9E3779B97F4A7C15ULL;
    state_ ^= state_ >> 32U;
  }
  // By its bits, but for what SQLite doesn't keep: a negative zero becomes zero, and what isn't a number nothing, which
  // reads as zero.
  void add(double value) noexcept { add(std::bit_cast<std::uint64_t>(value == 0 || value != value ? 0.0 : value)); }
  // Its length first, so that two texts in a row aren't the same as one.
  void add(std::string_view text) noexcept {
    add(std::uint64_t{text.size()});
    std::size_t at = 0;
    for (; at + sizeof(std::uint64_t) <= text.size(); at += sizeof(std::uint64_t)) {
      add(word(text.data() + at));
    }
    if (at < text.size()) {
      add(chunk(text.substr(at)));
    }
  }
  // Of all that was added so far.
  std::uint64_t value() const noexcept { return state_; }

 private:
  // Eight bytes; of a size that the compiler knows they are one load.
  static std::uint64_t word(const char* bytes) noexcept {
    if constexpr (std::endian::native == std::endian::little) {
      std::uint64_t value = 0;
      std::memcpy(&value, bytes, sizeof value);
      return value;
    }
    return chunk({bytes, sizeof(std::uint64_t)});
  }
  // Little-endian, as all machines read what one wrote.
  static std::uint64_t chunk(std::string_view bytes) noexcept {
    std::uint64_t value = 0;
    if constexpr (std::endian::native == std::endian::little) {
      std::memcpy(&value, bytes.data(), bytes.size());
      return value;
    }
    for (std::size_t i = bytes.size(); i-- > 0;) {
      value = value << 8U | static_cast<unsigned char>(bytes[i]);
    }
    return value;
  }

  // The digits of pi, as a beginning that nobody chose.
  std::uint64_t state_ = 0x243F6A8885A308D3ULL;
};

}  // namespace tarn::recorder
