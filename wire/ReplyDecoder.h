// SPDX-License-Identifier: Apache-2.0
// ReplyDecoder: turns one frame from the service into a reply. The client's side of the wire.
//
//   [7, null, true]                                  id 7, no error, one result
//   [8, ["sys.oxbow.audio.reporting.ipc", 2, "..."]] id 8, an error, no result
//
// Which request an id belongs to, and what results it should have, is the connection's to know.
//
// Owned by one client connection. Threads: one at a time. Throws nothing.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "plist/PackedBuilder.h"
#include "plist/Result.h"
#include "plist/Value.h"

namespace tarn::wire {

// What went wrong, as the service tells it: who says so, by which number, and for people why. UTF-8 was checked.
struct ReplyError {
  // The wire's own (kErrorDomain) or the service's.
  std::string domain;
  // By its domain; wire::ErrorCode for the wire's own.
  std::int64_t code = 0;
  // For people.
  std::string text;
};

// A reply with values of its own: nothing in it looks into the frame.
struct DecodedReply {
  // That of the request which it answers.
  std::uint64_t id = 0;
  // With an error there are no results, but that isn't checked.
  std::optional<ReplyError> error;
  // In the reply's order; how many there should be, the operation's row tells (Result).
  std::vector<plist::Value> results;
};

// Keeps scratch space and the key lists seen lately from reply to reply, so a stream of alike replies allocates little.
// The service is trusted no further than anybody: whatever the bytes are, decoding ends with a reply or an error.
class ReplyDecoder {
 public:
  ReplyDecoder() = default;
  ReplyDecoder(const ReplyDecoder&) = delete;
  ReplyDecoder& operator=(const ReplyDecoder&) = delete;

  // Whether the frame is a reply: [id, null or [domain, code, text], results...] with property-list values as results,
  // no deeper than kMaxNesting, and nothing after it. The error says why it is not; its number is 0, and `reply` may be
  // filled in part then. What an earlier reply left in `reply` is dropped first. Lengths must be definite.
  Status decode(std::span<const std::byte> frame, DecodedReply& reply);

 private:
  // Scratch space and lists for decode(); nothing of an earlier reply.
  plist::PackedBuilder builder_;
  plist::KeyListCache keyLists_;
};

}  // namespace tarn::wire
