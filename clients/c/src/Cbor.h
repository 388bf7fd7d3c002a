// The little of CBOR that this client needs: the heads of items, texts and numbers to write, and the front of a reply
// to read. Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>

#include "clients/c/src/Bytes.h"

namespace tarn::reporting {

enum class Major : std::uint8_t { Unsigned, Negative, Bytes, Text, Array, Map, Tag, Simple };

void putHead(Bytes& out, Major major, std::uint64_t argument) noexcept;
void putText(Bytes& out, const char* text, std::size_t length) noexcept;
void putText(Bytes& out, const char* text) noexcept;
void putInteger(Bytes& out, std::int64_t value) noexcept;
void putDouble(Bytes& out, double value) noexcept;
void putBoolean(Bytes& out, bool value) noexcept;

// [id, error, ...]
struct ReplyFront {
  std::uint64_t id = 0;
  bool isError = false;
  const char* text = "";  // of the error, in the frame
  std::size_t textLength = 0;
};
// Whether the frame begins as a reply does.
bool readReplyFront(const std::uint8_t* frame, std::size_t size, ReplyFront& reply) noexcept;

}  // namespace tarn::reporting
