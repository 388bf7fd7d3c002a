// NumbersReply: a reply of many numbers on its way to being bytes. So many may be a millisecond's work, so it is done a
// piece at a time, aside from what goes out meanwhile.
//
// The numbers are encoded into a text of their own, which goes into the connection's output in one piece once it is
// whole: replies to other requests may overtake it, and never cut it. Owned by the work that does the next piece.
// Threads: one.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "wire/Encoder.h"

namespace tarn::linux_host {

class NumbersReply {
 public:
  // The reply to request `id`. Nothing is encoded yet.
  NumbersReply(std::uint64_t id, std::vector<std::int64_t> numbers) noexcept : id_(id), numbers_(std::move(numbers)) {}

  std::uint64_t id() const noexcept { return id_; }
  std::size_t count() const noexcept { return numbers_.size(); }
  // The numbers as the wire has them, without the head of the reply; looks into this object.
  std::string_view encoded() const noexcept { return encoded_; }
  // Whether all numbers are bytes.
  bool whole() const noexcept { return done_ == numbers_.size(); }
  // Encodes up to so many more, in their order. With none left it does nothing.
  void encode(std::size_t most) {
    const auto next = std::span(numbers_).subspan(done_, std::min(most, numbers_.size() - done_));
    wire::Encoder(encoded_).numbers(next);
    done_ += next.size();
  }

 private:
  std::uint64_t id_;
  std::vector<std::int64_t> numbers_;
  // Numbers that are bytes already.
  std::size_t done_ = 0;
  // Grows as it goes on.
  std::string encoded_;
};

}  // namespace tarn::linux_host
