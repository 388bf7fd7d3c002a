// Ledger: what came in and what became of it, counted since the start. The answer to `status`.
//
// Owned by ConnectionHost; written and read on the main loop's thread only.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "plist/Dictionary.h"
#include "wire/Operation.h"

namespace tarn::linux_host {

// Why a connection did not end in order.
enum class CutReason : std::uint8_t {
  UnreadableFrame,  // we cut it: the frame was not one that can be answered
  OversizeFrame,    // we cut it: a frame was announced longer than allowed
  UnreadReplies,    // we cut it: the client doesn't read its replies
  HalfFrame,        // the client ended inside a frame
  Reset,            // the client went away with replies unread
};
inline constexpr std::size_t kCutReasons = 5;

// What the recorder accounts for; handedOver = committed + waiting + failed.
struct RecorderCounts {
  std::uint64_t handedOver = 0;
  std::uint64_t committed = 0;
  std::uint64_t waiting = 0;
  std::uint64_t expired = 0;
  std::uint64_t failed = 0;
  std::uint64_t lostBefore = 0;  // of the run before: handed over, and not committed when it was killed
};

struct Ledger {
  std::uint64_t framesReceived = 0;    // whole ones, readable or not
  std::uint64_t messagesReceived = 0;  // good sendMessage requests
  std::uint64_t repliesSent = 0;       // handed to the system, error replies included
  std::uint64_t repliesDropped = 0;    // a second one for a request, or the connection was over
  std::uint64_t connectionsOpen = 0;
  std::uint64_t connectionsTotal = 0;
  std::uint64_t acceptPauses = 0;  // times that the listener had to wait for descriptors
  std::array<std::uint64_t, 3> requestsRefused{};
  std::array<std::uint64_t, kCutReasons> connectionsCut{};

  void countRefusal(wire::ErrorCode code) noexcept { ++requestsRefused[static_cast<std::size_t>(code) - 1]; }
  void countCut(CutReason reason) noexcept { ++connectionsCut[static_cast<std::size_t>(reason)]; }

  // Everything as one dictionary, with what others count: sessions, pieces of work that wait, the recorder's part.
  plist::Dictionary status(std::uint64_t sessions, std::uint64_t queued, const RecorderCounts& recorder) const;
};

}  // namespace tarn::linux_host
