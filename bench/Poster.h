// SPDX-License-Identifier: Apache-2.0
// Poster: a client of the posting library with one session, a shape of twelve keys (those of the message that the other
// figures use) and one writer or more.
//
// The library has a thread, so this is for children of the benchmark.
#pragma once

#include <tarnreporting.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>

namespace tarn::bench {

class Poster {
 public:
  static constexpr std::uint32_t kRingBytes = 262'144;
  static constexpr std::uint32_t kTimeoutMs = 10'000;

  explicit Poster(const std::string& socketPath, std::uint32_t closeMs = kTimeoutMs);
  Poster(const Poster&) = delete;
  Poster& operator=(const Poster&) = delete;
  ~Poster();

  // One writer more, which is the one that posts from now on.
  void openWriter(std::uint32_t ringBytes);
  int post(std::size_t number) {
    values_[8].as.integer = static_cast<std::int64_t>(number);
    return tarnreporting_post(writer_, shape_, values_.data(), values_.size());
  }
  void waitUntilTaken();
  // Also until what came of it is safe on the disk.
  void waitUntilCommitted();

 private:
  const std::uint32_t closeMs_;
  tarnreporting_client* client_ = nullptr;
  tarnreporting_shape* shape_ = nullptr;
  tarnreporting_writer* writer_ = nullptr;
  std::array<tarnreporting_value, 12> values_{};
};

}  // namespace tarn::bench
