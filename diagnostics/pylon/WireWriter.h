// SPDX-License-Identifier: Apache-2.0
// WireWriter: puts fields into bytes of the Protocol Buffers wire format (see WireFormat.h).
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include "diagnostics/pylon/WireFormat.h"

namespace pylonmetrics {

// Fields follow each other in the order of the calls; it can't fail. Owner: whoever writes. Threads: one writer is for
// one thread at a time.
class WireWriter {
 public:
  // A zero is written too.
  void writeUnsigned(std::uint32_t fieldNumber, std::uint64_t value);
  // A negative value takes ten bytes, as 64 bits.
  void writeSigned(std::uint32_t fieldNumber, std::int32_t value);
  // Any bytes; an empty text is written too.
  void writeString(std::uint32_t fieldNumber, std::string_view bytes);

  const std::string& bytes() const noexcept { return bytes_; }
  // The bytes, leaving none.
  std::string take() noexcept { return std::exchange(bytes_, {}); }

 private:
  void appendTag(std::uint32_t fieldNumber, WireType type);
  void appendVarint(std::uint64_t value);

  std::string bytes_;
};

}  // namespace pylonmetrics
