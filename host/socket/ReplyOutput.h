// ReplyOutput: the replies of one connection that are not sent yet, as the bytes that go out.
//
// It tells the ledger what becomes of each reply: sent when its last byte is with the system, dropped when it never
// will be.
//
// Threads: the main loop's.
//
// Bytes are kept together for one system call and sent from the front; what the system doesn't take stays. How much may
// wait is the connection's to bound. Owned by the connection, which owns the socket too.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>

#include "platform/TarnReportingServiceProtocol.h"
#include "plist/ValueView.h"

namespace tarn::linux_host {

struct Ledger;
class NumbersReply;

class ReplyOutput {
 public:
  // The ledger outlives it.
  explicit ReplyOutput(Ledger& ledger) noexcept : ledger_(ledger) {}
  ReplyOutput(const ReplyOutput&) = delete;
  ReplyOutput& operator=(const ReplyOutput&) = delete;

  // Without the memory for it nothing was appended.
  void append(std::uint64_t id, std::initializer_list<plist::ValueView> results);
  void append(std::uint64_t id, const NumbersReply& reply);
  void append(std::uint64_t id, const platform::RemoteError& error);
  // A reply that doesn't come here at all: a second one to its request, or its connection is over.
  void countDropped() noexcept;

  // Bytes that wait for the system to take them.
  std::size_t unsentBytes() const noexcept { return bytes_.size() - sentBytes_; }
  // Sends what the system takes now, never waiting. False when the peer will never take any more: it is broken from
  // then on. Replies count as sent together, when the last byte of all is with the system.
  bool sendSome(int socket);
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

  Ledger& ledger_;
  std::string bytes_;
  // Of bytes_, from its front.
  std::size_t sentBytes_ = 0;
  // In bytes_, whole or in part.
  std::uint64_t unsentReplies_ = 0;
  // Nothing is sent any more, and nothing may be appended.
  bool broken_ = false;
  bool resetSeen_ = false;
};

}  // namespace tarn::linux_host
