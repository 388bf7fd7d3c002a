// SPDX-License-Identifier: Apache-2.0
// SendWindow: messages on their way, in their order. Each is published until it is acknowledged; what is acknowledged
// leaves the window only behind all that came before it.
//
//   oldest [acked][acked][sent ][acked][waits] newest        settled(): the first two
//
// After a failure nothing is sent until a pause is over, and then one message alone, as a trial; when that arrives the
// others follow. Threads: one; time is the caller's monotonic one.
#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <vector>

#include "fleet/cursor/CursorFile.h"
#include "fleet/publish/Backoff.h"
#include "fleet/publish/Publisher.h"

namespace tarn::fleet {

struct WindowLimits {
  std::size_t messages = 64;
  std::size_t bytes = std::size_t{8} << 20U;
  std::chrono::milliseconds patience{10'000};  // for an acknowledgement
};

// What became of messages since the program began.
struct WindowCounts {
  std::int64_t arrived = 0;     // messages
  std::int64_t refused = 0;     // tries that weren't taken or were answered by an error
  std::int64_t unanswered = 0;  // tries that nobody answered
  std::string lastError;
};

class SendWindow {
 public:
  using Time = std::chrono::nanoseconds;

  SendWindow(Publisher& publisher, Backoff backoff, WindowLimits limits = {})
      : publisher_(publisher), backoff_(std::move(backoff)), limits_(limits) {}

  bool hasRoom() const noexcept { return entries_.size() < limits_.messages && bytes_ < limits_.bytes; }
  bool isEmpty() const noexcept { return entries_.empty(); }
  // A message, and where the cursor stands when it and all before it have arrived.
  void add(std::string id, std::string bytes, Cursor after);

  // Publishes what is due, once the pause is over.
  void send(Time now);
  // Takes what became of tries.
  void take(const std::vector<Outcome>& outcomes, Time now);
  // Lets go of what has arrived with all before it; where the cursor stands then. Nothing when that is none.
  std::optional<Cursor> settled();
  // When send() is due again, at the latest; nothing when only an outcome can change anything.
  std::optional<Time> due() const;

  const WindowCounts& counts() const noexcept { return counts_; }
  // Failures since the last message that arrived.
  int failures() const noexcept { return backoff_.failures(); }

 private:
  enum class State : std::uint8_t { Waits, Sent, Arrived };
  struct Entry {
    std::string id, bytes;
    Cursor after;
    State state = State::Waits;
    Time until{};  // while it is sent: when patience ends
  };

  void failed(const std::string& why, Time now);
  void giveUpOn(Entry& entry);

  Publisher& publisher_;
  Backoff backoff_;
  const WindowLimits limits_;
  std::deque<Entry> entries_;
  std::uint64_t first_ = 0;  // the number of the oldest
  std::size_t bytes_ = 0;
  std::size_t sent_ = 0;  // of them
  Time pausedUntil_{};
  WindowCounts counts_;
};

}  // namespace tarn::fleet
