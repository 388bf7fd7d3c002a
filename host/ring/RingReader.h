// RingReader: one open ring: its memory, what was read of it, and how far the recorder has come with that.
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

// How far the recorder is, as counts of events since the start.
struct CommitPoint {
  std::uint64_t handedOver = 0;
  std::uint64_t committed = 0;
  bool settled = true;  // whether all that was asked of it so far is handed over
};

class RingReader final : public EventHandler {
 public:
  using WakeHandler = platform::UniqueFunction<void(RingReader&)>;

  // The memory is mapped. `firstSleep` is as the consumer wants it; the handler is called when the client wakes us.
  RingReader(RingMemory memory, UniqueDescriptor wake, std::uint64_t firstSleep, WakeHandler onWake);
  RingReader(const RingReader&) = delete;
  RingReader& operator=(const RingReader&) = delete;

  // Never read from: the client could have emptied it meanwhile, and the loop would stand still.
  int wakeDescriptor() const noexcept { return wake_.get(); }
  void handleEvents(std::uint32_t events) override;

  ring::RingConsumer<>& consumer() noexcept { return consumer_; }
  const RingIdentity& identity() const noexcept { return memory_.identity(); }
  std::size_t bytes() const noexcept { return TARNRING_HEADER_BYTES + memory_.dataBytes(); }

  // The messages that the client dropped since the last call, as far as it can be believed.
  std::uint64_t newlyDropped() noexcept;

  // Reading is to end at what is published now, because the connection does.
  void endAtHead() noexcept;
  bool isAtEnd() const noexcept { return end_ && static_cast<std::int64_t>(consumer_.taken() - *end_) >= 0; }
  bool ending() const noexcept { return end_.has_value(); }

  // What was taken by now is asked for, and is done once the server queue comes to noteDone().
  void noteAsked() noexcept { ++asked_; }
  void noteDone(std::uint64_t position, std::uint64_t messages) noexcept {
    --asked_;
    done_ = Mark{.position = position, .messages = messages};
  }
  // Tells the client how much of it is safe.
  void follow(const CommitPoint& point) noexcept;
  bool awaitsCommit() const noexcept { return asked_ != 0 || done_ || !marks_.empty(); }

  bool asleep = false;
  bool finished = false;                  // nothing more is read of it
  std::chrono::nanoseconds lastRecord{};  // when it last had one

 private:
  struct Mark {
    std::uint64_t position = 0;
    std::uint64_t messages = 0;
    std::uint64_t handedOver = 0;  // complete once so many events are committed
  };
  static constexpr std::size_t kMostMarks = 64;

  RingMemory memory_;
  UniqueDescriptor wake_;
  ring::RingConsumer<> consumer_;
  WakeHandler onWake_;
  std::uint64_t dropped_ = 0;  // as the header last told it
  std::optional<std::uint64_t> end_;
  std::size_t asked_ = 0;
  std::optional<Mark> done_;  // not handed over yet, as far as is known
  std::vector<Mark> marks_;   // with room for all that may be there
};

}  // namespace tarn::linux_host
