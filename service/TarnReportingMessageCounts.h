// SPDX-License-Identifier: Apache-2.0
// TarnReportingMessageCounts: what became of the messages that clients sent. Each message that was dealt with is in
// exactly one of the members; of several sessions' outcomes the best counts, in the order of TarnReportingOutcome.
// Plain data.
//
// The service holds one and `status` tells it, so that an operator sees whether what clients send arrives anywhere.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace tarn {

// From best to worst: a smaller number is the better outcome, and so the lesser of two is what a message with several
// sessions counts as.
enum class TarnReportingOutcome : std::uint8_t {
  Delivered,       // a session took it as news and a worker got it
  Redundant,       // it said what the session's last one of its kind had said
  Unwanted,        // no worker of its sessions was there to get it
  Undeliverable,   // its sessions ended before their turn came
  WithoutSession,  // nobody has a session under its IDs
  Refused,         // reporting is disabled, or memory was missing in the middle of it
};

// Of a session that took the message, which so many of its workers got.
constexpr TarnReportingOutcome TarnReportingOutcomeOf(bool isRedundant, std::size_t workers) noexcept {
  if (isRedundant) return TarnReportingOutcome::Redundant;
  return workers != 0 ? TarnReportingOutcome::Delivered : TarnReportingOutcome::Unwanted;
}

// Counts since the process began; they never go down. Threads: the server queue.
struct TarnReportingMessageCounts {
  // By the number of the outcome.
  std::array<std::uint64_t, 6> counts{};

  // One message more with this outcome, and how many there were.
  void add(TarnReportingOutcome outcome) noexcept { ++counts[static_cast<std::size_t>(outcome)]; }
  std::uint64_t of(TarnReportingOutcome outcome) const noexcept { return counts[static_cast<std::size_t>(outcome)]; }
};

}  // namespace tarn
