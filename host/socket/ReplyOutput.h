// SPDX-License-Identifier: Apache-2.0
// ReplyOutput: the replies of one connection that are not sent yet, as the bytes that go out.
//
// It tells the ledger what becomes of each reply: sent when its last byte is with the system, dropped when it never
// will be.
//
//   [text: what is sent | replies][text: replies][text: replies <- appended here]
//
// Bytes are sent from the front; what the system doesn't take stays. They lie in texts of some 32 KiB, so that
// megabytes that nobody reads come and go a text at a time: nothing is moved to make room, and sending, growing or
// dropping never holds the thread up for long. How much may wait is the connection's to bound. Owned by the connection,
// which owns the socket too.
//
// Threads: the main loop's.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <limits>
#include <list>
#include <string>
#include <utility>

#include "platform/TarnReportingServiceProtocol.h"
#include "plist/ValueView.h"

namespace tarn::linux_host {

struct Ledger;
class NumbersReply;

class ReplyOutput {
 public:
  // For sendSome().
  static constexpr std::size_t kEverything = std::numeric_limits<std::size_t>::max();

  // The ledger outlives it.
  explicit ReplyOutput(Ledger& ledger) noexcept : ledger_(ledger) {}
  ReplyOutput(const ReplyOutput&) = delete;
  ReplyOutput& operator=(const ReplyOutput&) = delete;

  // Without the memory for it nothing was appended.
  void append(std::uint64_t id, std::initializer_list<plist::ValueView> results);
  void append(std::uint64_t id, const platform::RemoteError& error);
  // Takes the numbers' texts over.
  void append(std::uint64_t id, NumbersReply& reply);
  // A reply that doesn't come here at all: a second one to its request, or its connection is over.
  void countDropped() noexcept;

  // Bytes that wait for the system to take them.
  std::size_t unsentBytes() const noexcept { return unsentBytes_; }
  // Whether it took no more at the last attempt.
  bool stalled() const noexcept { return stalled_; }
  // Sends what the system takes now, `most` bytes at the most, never waiting. False when the peer will never take
  // any more: it is broken from then on. Replies count as sent together, when the last byte of all is with the system.
  bool sendSome(int socket, std::size_t most = kEverything);
  // Bytes that the system took since the last call, for whoever charges them.
  std::size_t takeSentBytes() noexcept { return std::exchange(sentBytes_, 0); }
  // Whatever was to be sent isn't any more, and counts as dropped; new replies may still come. Room beyond 64 KiB is
  // given back.
  void drop() noexcept;
  // The same, and nothing more can be.
  void breakOff() noexcept;
  bool broken() const noexcept { return broken_; }
  // Whether sending ended with a reset (ECONNRESET): what the peer sent before is still there to be read, and then its
  // end.
  bool resetSeen() const noexcept { return resetSeen_; }

 private:
  template <class Encode>
  void appendWhole(const Encode& encode);
  // So many bytes of the first text are with the system.
  void take(std::size_t bytes) noexcept;

  Ledger& ledger_;
  std::list<std::string> texts_;
  // Of the first text, from its front.
  std::size_t sentOfFirst_ = 0;
  std::size_t unsentBytes_ = 0;
  std::size_t sentBytes_ = 0;
  bool stalled_ = false;
  // In the texts, whole or in part.
  std::uint64_t unsentReplies_ = 0;
  // Nothing is sent any more, and nothing may be appended.
  bool broken_ = false;
  bool resetSeen_ = false;
};

}  // namespace tarn::linux_host
