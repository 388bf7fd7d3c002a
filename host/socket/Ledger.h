// SPDX-License-Identifier: Apache-2.0
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
  StaleFrame,       // we cut it: the rest of a frame didn't come in time, or too much of such was waiting
  Reset,            // the client went away with replies unread
  OutOfMemory,      // we cut it: there wasn't even the memory for an error reply
};
inline constexpr std::size_t kCutReasons = 7;

// What the recorder accounts for; handedOver = committed + waiting + failed.
struct RecorderCounts {
  std::uint64_t handedOver = 0;
  std::uint64_t committed = 0;
  std::uint64_t waiting = 0;
  std::uint64_t expired = 0;
  std::uint64_t failed = 0;
  std::uint64_t lostBefore = 0;  // of the run before: handed over, and not committed when it was killed
};

// What the logs of the sessions take.
struct LogCounts {
  std::uint64_t bytes = 0;          // in memory
  std::uint64_t overflowBytes = 0;  // on disk
  std::uint64_t overflowing = 0;    // that have messages there
  std::uint64_t failures = 0;       // times that there was no room
  std::uint64_t lost = 0;           // messages that couldn't be read back
};

// What the service accounts for: its sessions, and what became of the messages, by members that are told as they are.
struct ServiceCounts {
  // NOLINTNEXTLINE(google-explicit-constructor): where nothing else is counted, the number of sessions will do
  ServiceCounts(std::uint64_t sessionCount = 0) noexcept : sessions(sessionCount) {}

  std::uint64_t sessions;
  std::uint64_t delivered = 0;
  std::uint64_t redundant = 0;
  std::uint64_t unwanted = 0;
  std::uint64_t undeliverable = 0;
  std::uint64_t withoutSession = 0;
  std::uint64_t refused = 0;
  LogCounts logs;

  std::uint64_t dealtWith() const noexcept {
    return delivered + redundant + unwanted + undeliverable + withoutSession + refused;
  }
};

struct Ledger {
  std::uint64_t framesReceived = 0;    // whole ones, readable or not
  std::uint64_t messagesReceived = 0;  // good sendMessage requests; each is in one of the members of its account
  std::uint64_t messagesOverQuota = 0;
  std::uint64_t repliesSent = 0;       // handed to the system, error replies included
  std::uint64_t repliesDropped = 0;    // a second one for a request, or the connection was over
  std::uint64_t questionsDropped = 0;  // their client was gone before their turn came
  std::uint64_t connectionsOpen = 0;
  std::uint64_t connectionsTotal = 0;
  std::uint64_t acceptPauses = 0;  // times that the listener had to wait for descriptors
  std::array<std::uint64_t, wire::kErrorCodes> requestsRefused{};
  std::array<std::uint64_t, kCutReasons> connectionsCut{};

  void countRefusal(wire::ErrorCode code) noexcept { ++requestsRefused[static_cast<std::size_t>(code) - 1]; }
  void countCut(CutReason reason) noexcept { ++connectionsCut[static_cast<std::size_t>(reason)]; }

  // Everything as one dictionary, with what others count: the service, pieces of work that wait, the recorder's part.
  plist::Dictionary status(const ServiceCounts& service, std::uint64_t queued, const RecorderCounts& recorder) const;
};

}  // namespace tarn::linux_host
