// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionChronicle: what the platform's session records are told of one session: its making, its periods
// and its end; and the number under which the session's work is known.
//
// Owner: the session. Threads: the server queue.
//
//   made --> running <--> stopped         each may end; the first end that is told is the one
//
// A session without a chronicle of its own, because nobody keeps records or because no client opened it, tells nothing,
// at the cost of a branch.
#pragma once

#include <cstdint>
#include <string>

#include "platform/SessionRecords.h"

namespace tarn {

// The client that a session is made for, as the session records are told of it.
struct TarnReportingSessionOpener {
  std::int64_t connection = 0;
  std::uint32_t user = 0;
  std::string process;  // its name; empty while it isn't known
};

// What there is no memory to tell at a stop or an end is left untold, since these happen all the same; who keeps the
// records closes then what is open. All else is told before it happens or is repeated by the request that failed.
class TarnReportingSessionChronicle {
 public:
  // Of a session that nobody is told of.
  TarnReportingSessionChronicle() = default;
  // Tells of a new session; null: nobody keeps records.
  TarnReportingSessionChronicle(platform::SessionRecords* records, const platform::SessionFacts& facts);
  TarnReportingSessionChronicle(const TarnReportingSessionChronicle&) = delete;
  TarnReportingSessionChronicle& operator=(const TarnReportingSessionChronicle&) = delete;
  // A session that was neither ended nor stopped ends as destroyed: its making failed, or the service went first.
  ~TarnReportingSessionChronicle() { endUnlessStopped(platform::SessionEnd::Destroyed); }

  // While the answer lives, what the thread does is this session's work.
  [[nodiscard]] platform::SessionScope enter() const noexcept { return {records_, number_}; }
  // Whether anybody is told.
  bool isKept() const noexcept { return records_ != nullptr; }
  // Tells what the session is from now on.
  void describe(const platform::SessionFacts& facts);
  // A period begins, unless one has begun: a start that failed may be tried again.
  void start();
  // The session took a message in.
  void count() noexcept { ++messages_; }
  // The same, of one that repeats an earlier one.
  void countRepeated(const plist::Dictionary& message);
  // The period is over.
  void stop() noexcept;
  // The session is over, and with it a period that runs.
  void end(platform::SessionEnd end) noexcept;
  // The same, unless a stop was its end.
  void endUnlessStopped(platform::SessionEnd end) noexcept {
    if (state_ != State::Stopped) {
      this->end(end);
    }
  }

 private:
  enum class State : std::uint8_t { Made, Running, Stopped, Ended };

  platform::SessionRecords* const records_ = nullptr;
  const platform::SessionNumber number_ = 0;
  State state_ = State::Made;
  // Of the period: all that the intake took, what producers derived included, and those among them that repeated an
  // earlier one.
  std::uint64_t messages_ = 0;
  std::uint64_t redundant_ = 0;
};

}  // namespace tarn
