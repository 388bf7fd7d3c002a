// ReplyDecoder: turns one frame from the service into a reply. The client's side of the wire.
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

struct ReplyError {
  std::string domain;
  std::int64_t code = 0;
  std::string text;
};

struct DecodedReply {
  std::uint64_t id = 0;
  std::optional<ReplyError> error;
  std::vector<plist::Value> results;
};

class ReplyDecoder {
 public:
  ReplyDecoder() = default;
  ReplyDecoder(const ReplyDecoder&) = delete;
  ReplyDecoder& operator=(const ReplyDecoder&) = delete;

  // Whether the frame is a reply: [id, null or [domain, code, text], results...] with property-list values as results.
  // The error says why it is not; its number is 0.
  Status decode(std::span<const std::byte> frame, DecodedReply& reply);

 private:
  plist::PackedBuilder builder_;
  plist::KeyListCache keyLists_;
};

}  // namespace tarn::wire
