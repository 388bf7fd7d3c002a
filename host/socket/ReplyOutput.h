// ReplyOutput: the replies of one connection that are not sent yet, as the bytes that go out.
//
// It tells the ledger what becomes of each reply: sent when its last byte is with the system, dropped when it never
// will be.
//
// Threads: the main loop's.
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
  void countDropped() noexcept;

  std::size_t unsentBytes() const noexcept { return bytes_.size() - sentBytes_; }
  // Sends what the system takes now. False when the peer will never take any more: it is broken from then on.
  bool sendSome(int socket);
  // Whatever was to be sent isn't any more.
  void drop() noexcept;
  // The same, and nothing more can be.
  void breakOff() noexcept;
  bool broken() const noexcept { return broken_; }
  // Whether sending ended with a reset: what the peer sent before is still there to be read, and then its end.
  bool resetSeen() const noexcept { return resetSeen_; }

 private:
  template <class Encode>
  void appendWhole(const Encode& encode);

  Ledger& ledger_;
  std::string bytes_;
  std::size_t sentBytes_ = 0;
  std::uint64_t unsentReplies_ = 0;
  bool broken_ = false;
  bool resetSeen_ = false;
};

}  // namespace tarn::linux_host
