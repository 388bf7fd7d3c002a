// SPDX-License-Identifier: Apache-2.0
// Encoder: appends frames to a growing buffer that the owner writes out and clears when it likes.
//
// What it writes is canonical: the shortest integers and lengths, definite lengths, a float as 32 and a double as 64
// bits, a date as tag 1 over an integer when it has no fraction and over a double else, containers in their own order.
//
//   createReportingSession, id 1, reporter 42    05 00 00 00  83 01 01 18 2A
//   its reply, true                              04 00 00 00  83 01 F6 F5
//
// Owned with its buffer by one connection. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <span>
#include <string>
#include <string_view>

#include "plist/ValueView.h"
#include "wire/Request.h"

namespace tarn::wire {

// Appends the CBOR of one value. An absent value is written as null, which no property list holds; for arguments only.
void appendValue(std::string& out, const plist::ValueView& value);

// Writes straight into the buffer that goes to the socket, so a frame is never copied. Numbers are written in as few
// bytes as hold them, and a frame's length when its end is known. Nothing is checked: what lies deeper than kMaxNesting
// or is no UTF-8 is found out by whoever decodes it. Throws std::bad_alloc alone.
class Encoder {
 public:
  // Appends to what `out` holds. `out` must outlive the encoder.
  explicit Encoder(std::string& out) noexcept : out_(out) {}
  Encoder(const Encoder&) = delete;
  Encoder& operator=(const Encoder&) = delete;

  // One frame: a request of any operation, with the arguments that the table names and in its order. The client's side.
  void request(std::uint64_t id, const Request& request);
  // One frame each: [id, null, results...] and [id, [domain, code, text]].
  void reply(std::uint64_t id, std::initializer_list<plist::ValueView> results = {});
  // The frame up to its result, one array of so many numbers. Those come next, from numbers(), so many bytes in all.
  void replyWithNumbers(std::uint64_t id, std::size_t count, std::size_t bytes);
  // Numbers alone, without a head: for a long list that is encoded in pieces, into buffers of its own.
  void numbers(std::span<const std::int64_t> numbers);
  // A text that isn't UTF-8 is mended: each wrong byte becomes U+FFFD.
  void errorReply(std::uint64_t id, std::string_view domain, std::int64_t code, std::string_view text);

 private:
  // Makes room for the length and returns where it stands; endFrame fills it in, with what is still to come.
  std::size_t beginFrame();
  void endFrame(std::size_t header, std::size_t bytesToCome = 0);

  std::string& out_;
};

}  // namespace tarn::wire
