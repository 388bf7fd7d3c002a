// SPDX-License-Identifier: Apache-2.0
// RequestDecoder: turns one frame into a checked request. The border between untrusted clients and the service: what
// comes out of here needs no further checks.
//
// A good frame is decoded in one pass. Only when that pass meets trouble is the frame looked at again, to tell a frame
// that can be answered with an error from one that can't be read at all:
//
//   not one whole well-formed CBOR array, bytes after it, no unsigned id    Unreadable: close the connection
//   unknown operation; wrong count, kind or range of an argument; something
//   inside a dictionary argument that is no property list                    Refused: answer with the error, go on
//
//   [1, 99]                    Refused, UnknownOperation: "unknown operation"
//   [1, 1]                     Refused, BadArguments: "createReportingSession: wrong number of arguments"
//   [1, 4, {"a": null}, 42]    Refused, NotPropertyList: "setConfiguration: not a property list: a null"
//   [-1, 1, 42]                Unreadable: "no readable id"
//
// Lengths that are left open (indefinite) make a frame no less whole; inside a dictionary argument they are refused.
// Nesting deeper than a property list may have costs no stack, and little more memory than the frame itself.
//
// One decoder can serve all connections of a thread: it keeps nothing between frames but scratch space and the key
// lists seen lately, and what it makes of a frame is the same whatever came before. Threads: one at a time. Throws
// nothing: a frame that memory is missing for is refused.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "plist/PackedBuilder.h"
#include "wire/KeyShapes.h"
#include "wire/Request.h"

namespace tarn::wire {

enum class DecodeVerdict {
  Ok,
  Refused,     // the id is known, the refusal says what to answer
  Unreadable,  // the refusal's text says why
};

// The text of the error OutOfMemory: short enough for a string to hold it in itself.
inline constexpr std::string_view kOutOfMemory = "out of memory";

struct Refusal {
  // What the client is told.
  ErrorCode code = ErrorCode::BadArguments;
  // For people: the operation's name, and what was expected in the place; or what makes the frame unreadable. English,
  // and never the client's own bytes, so it may go into a log as it is.
  std::string text;
};

class RequestDecoder {
 public:
  RequestDecoder() = default;
  RequestDecoder(const RequestDecoder&) = delete;
  RequestDecoder& operator=(const RequestDecoder&) = delete;

  // `request` is whole when the verdict is Ok; its id also counts when it is Refused. `refusal` is filled in otherwise.
  // Members that the operation doesn't have are left at their defaults.
  DecodeVerdict decode(std::span<const std::byte> frame, DecodedRequest& request, Refusal& refusal);

 private:
  // Scratch space and lists for decode(); nothing of an earlier frame.
  plist::PackedBuilder builder_;
  plist::KeyListCache keyLists_;
  KeyShapes shapes_;
};

}  // namespace tarn::wire
