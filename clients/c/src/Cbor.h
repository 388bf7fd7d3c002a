// SPDX-License-Identifier: Apache-2.0
// The little of CBOR that this client needs: the heads of items, texts and numbers to write, and the front of a reply
// to read. Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>

#include "clients/c/src/Bytes.h"

namespace tarn::reporting {

// The kinds of items, by the number in the upper three bits of an item's first byte. `Simple` is also that of doubles.
enum class Major : std::uint8_t { Unsigned, Negative, Bytes, Text, Array, Map, Tag, Simple };

// The head of an item, in the shortest form: a number itself, the length of bytes or a text, the count of an array or a
// map, a tag. What the head announces is put by the calls after it. Like all of these it fails as Bytes does.
void putHead(Bytes& out, Major major, std::uint64_t argument) noexcept;
// The text must be UTF-8: nothing looks at it here. Without a length it ends at its zero.
void putText(Bytes& out, const char* text, std::size_t length) noexcept;
void putText(Bytes& out, const char* text) noexcept;
// Negative ones as the major type of their own, as CBOR wants it.
void putInteger(Bytes& out, std::int64_t value) noexcept;
// Always eight bytes, big-endian: nothing is made shorter, since the service tells floats of two widths apart.
void putDouble(Bytes& out, double value) noexcept;
void putBoolean(Bytes& out, bool value) noexcept;

// The front of a reply, [id, error, ...]: the error is null or [domain, code, text]. Results are never looked at.
struct ReplyFront {
  // That of the request which it answers.
  std::uint64_t id = 0;
  bool isError = false;
  // UTF-8 without a zero after it, valid as long as the frame is.
  const char* text = "";  // of the error, in the frame
  std::size_t textLength = 0;
};
// Whether the frame begins as a reply does. False also for one that is cut short; `reply` may be filled in part then.
// Of the service, which is trusted to be no worse than careless: nothing is read beyond `size`, whatever it says.
bool readReplyFront(const std::uint8_t* frame, std::size_t size, ReplyFront& reply) noexcept;

}  // namespace tarn::reporting
