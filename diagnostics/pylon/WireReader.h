// SPDX-License-Identifier: Apache-2.0
// WireReader: reads values of the Protocol Buffers wire format from bytes that lie somewhere else and outlive it.
//
// Input comes from anywhere, so nothing is believed. Once something failed the reader stays failed; a read that fails
// doesn't move on. Whoever reads asks failed() before going on.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "diagnostics/pylon/WireFormat.h"

namespace pylonmetrics {

// Owner: whoever reads; it looks at the bytes and copies none but those of strings. Threads: one reader is for one
// thread at a time.
class WireReader {
 public:
  // Groups within groups beyond this depth are not skipped. Groups are an old form that no record of ours writes; the
  // bound keeps hostile input from growing a list.
  static constexpr std::size_t kDeepestGroup = 100;

  explicit WireReader(std::string_view bytes) noexcept : bytes_(bytes) {}

  // Whether all bytes are read, whether something failed, and how many bytes were read.
  bool atEnd() const noexcept { return position_ >= bytes_.size(); }
  bool failed() const noexcept { return failed_; }
  std::size_t position() const noexcept { return position_; }

  // The next varint; bits beyond the 64th are dropped. 0 when the bytes end inside it, which is a failure, and when it
  // goes on beyond its longest form, which is none: the ten bytes count as read.
  std::uint64_t readVarint();
  // The next length and so many bytes. When there are fewer, which is a failure, the text stays as it was.
  void readString(std::string& text);
  // Steps over the value of a field; `type` as it stands in the tag. A group is stepped over together with its end,
  // which must carry its number. False, and a failure, when the value is cut off or of no type that can be skipped.
  [[nodiscard]] bool skip(std::uint64_t fieldNumber, unsigned type);

 private:
  // Notes the failure; false, for the caller to return.
  bool fail() noexcept;
  // False, and a failure, when fewer are left.
  bool skipBytes(std::uint64_t count) noexcept;
  bool skipGroup(std::uint64_t fieldNumber);
  bool skipSimple(unsigned type);

  const std::string_view bytes_;
  std::size_t position_ = 0;
  bool failed_ = false;
};

}  // namespace pylonmetrics
