// SPDX-License-Identifier: Apache-2.0
// RingReader: one open ring: its memory, what was read of it, and how far the recorder has come with that.
//
//   taken    -> asked_: on its way through the server queue
//            -> done_:  handed on; the recorder may still get events of it from private queues
//            -> marks_: handed over; safe once the recorder has committed so many events
//            -> committed, in the ring's header, for the client
//
// Owned by a connection's rings; held by the loop as well while its eventfd is watched. Threads: the main loop's.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "clients/ring/RingConsumer.h"
#include "host/loop/MainLoop.h"
#include "host/ring/RingMemory.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/UniqueFunction.h"

namespace tarn::linux_host {

// How far the recorder is, as counts of events since the start. With equal counts everything is on the disk.
struct CommitPoint {
  std::uint64_t handedOver = 0;
  std::uint64_t committed = 0;
  bool settled = true;  // whether all that was asked of it so far is handed over
};

class RingReader final : public EventHandler {
 public:
  using WakeHandler = platform::UniqueFunction<void(RingReader&)>;

  // The memory is mapped; memory and descriptor are this object's from here on. `firstSleep` is as the consumer wants
  // it: no number that an earlier reader of the ring had. The handler is called when the client wakes us.
  RingReader(RingMemory memory, UniqueDescriptor wake, std::uint64_t firstSleep, WakeHandler onWake);
  RingReader(const RingReader&) = delete;
  RingReader& operator=(const RingReader&) = delete;

  // For the loop, by the edge. Never read from: the client could have emptied it meanwhile, and the loop would stand
  // still.
  int wakeDescriptor() const noexcept { return wake_.get(); }
  // Calls the wake handler; which events there were doesn't matter.
  void handleEvents(std::uint32_t events) override;

  // The reading itself; what it gives was copied out of the shared memory.
  ring::RingConsumer<>& consumer() noexcept { return consumer_; }
  const RingIdentity& identity() const noexcept { return memory_.identity(); }
  // That the mapping takes, header included.
  std::size_t bytes() const noexcept { return TARNRING_HEADER_BYTES + memory_.dataBytes(); }

  // The messages that the client dropped since the last call, as far as it can be believed: a number that no client
  // could reach between two looks, one that fell among them, counts as none.
  std::uint64_t newlyDropped() noexcept;

  // Reading is to end at what is published now, because the connection does; a client that goes on posting doesn't keep
  // it from ending.
  void endAtHead() noexcept;
  // Everything up to that end was taken.
  bool isAtEnd() const noexcept { return end_ && static_cast<std::int64_t>(consumer_.taken() - *end_) >= 0; }
  bool ending() const noexcept { return end_.has_value(); }

  // What was taken by now is asked for, and is done once the server queue comes to noteDone(). Between the two the
  // recorder can't have got it.
  void noteAsked() noexcept { ++asked_; }
  void noteDone(std::uint64_t position, std::uint64_t messages) noexcept {
    --asked_;
    done_ = Mark{.position = position, .messages = messages};
  }
  // Tells the client how much of it is safe: the newest mark all of whose events are committed. What is done becomes a
  // mark only when the recorder says that all that was asked of it is handed over, private queues' share included.
  void follow(const CommitPoint& point) noexcept;
  // Whether something was taken of which the client wasn't told yet that it is safe.
  bool awaitsCommit() const noexcept { return asked_ != 0 || done_ || !marks_.empty(); }

  // Kept by the rings: whether the client was told to wake us, whether reading is over, and when the last record came,
  // on the monotonic clock.
  bool asleep = false;
  bool finished = false;                  // nothing more is read of it
  std::chrono::nanoseconds lastRecord{};  // when it last had one

 private:
  // A position in the ring, and the count of the recorder's events that makes it safe.
  struct Mark {
    std::uint64_t position = 0;
    std::uint64_t messages = 0;
    std::uint64_t handedOver = 0;  // complete once so many events are committed
  };
  // Beyond these the newest mark moves on instead: the client learns of its commits in larger steps, and nothing grows.
  static constexpr std::size_t kMostMarks = 64;

  RingMemory memory_;
  UniqueDescriptor wake_;
  ring::RingConsumer<> consumer_;
  WakeHandler onWake_;
  std::uint64_t dropped_ = 0;  // as the header last told it
  // Where reading ends; nothing while the connection goes on.
  std::optional<std::uint64_t> end_;
  // Notices on the queue that haven't come to noteDone().
  std::size_t asked_ = 0;
  std::optional<Mark> done_;  // not handed over yet, as far as is known
  std::vector<Mark> marks_;   // with room for all that may be there
};

}  // namespace tarn::linux_host
