// SPDX-License-Identifier: Apache-2.0
// NumbersReply: a reply of many numbers on its way to being bytes. So many may be a millisecond's work, so it is done a
// piece at a time, aside from what goes out meanwhile.
//
// The numbers are encoded into texts of their own, which go into the connection's output as they are once all are
// there: replies to other requests may overtake it, and never cut it; nothing of it is moved or copied again. Owned by
// the work that does the next piece. Threads: one.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <list>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "wire/Encoder.h"

namespace tarn::linux_host {

class NumbersReply {
 public:
  using Texts = std::list<std::string>;

  // The reply to request `id`. Nothing is encoded yet.
  NumbersReply(std::uint64_t id, std::vector<std::int64_t> numbers) noexcept : id_(id), numbers_(std::move(numbers)) {}

  std::uint64_t id() const noexcept { return id_; }
  std::size_t count() const noexcept { return numbers_.size(); }
  // The numbers as the wire has them, one text after the other, and how many bytes they are.
  Texts& encoded() noexcept { return encoded_; }
  std::size_t bytes() const noexcept { return bytes_; }
  // Whether all numbers are bytes.
  bool whole() const noexcept { return done_ == numbers_.size(); }
  // Encodes up to so many more, in their order. With none left it does nothing.
  void encode(std::size_t most) {
    const auto next = std::span(numbers_).subspan(done_, std::min(most, numbers_.size() - done_));
    if (encoded_.empty() || encoded_.back().size() >= kTextBytes) {
      encoded_.emplace_back().reserve(kTextBytes + next.size() * kMostNumberBytes);
    }
    std::string& text = encoded_.back();
    const std::size_t before = text.size();
    wire::Encoder(text).numbers(next);
    bytes_ += text.size() - before;
    done_ += next.size();
  }

 private:
  // A text that has so many gets no more.
  static constexpr std::size_t kTextBytes = 16384;
  static constexpr std::size_t kMostNumberBytes = 9;

  std::uint64_t id_;
  std::vector<std::int64_t> numbers_;
  // Numbers that are bytes already, and how many bytes.
  std::size_t done_ = 0;
  std::size_t bytes_ = 0;
  Texts encoded_;
};

}  // namespace tarn::linux_host
