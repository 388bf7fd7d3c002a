// SPDX-License-Identifier: Apache-2.0
// RingCounts: what came in through rings and what became of it, counted since the start. A part of the ledger.
//
// Owned by RingBoard; written and read on the main loop's thread only.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "clients/ring/RingLayout.h"
#include "plist/Dictionary.h"

namespace tarn::linux_host {

// Why a ring isn't opened, or is closed before its time. Each is a member of the ledger ("rings_refused") and a text.
enum class RingFault : std::uint8_t {
  Descriptors,  // not two, or not a memory file and an eventfd
  NotSealed,    // its file could shrink or grow
  BadSize,
  BadHeader,
  InUse,    // a connection has it open
  TooMany,  // rings of this connection, or of all
  System,   // the system couldn't map or watch it
  Broken,   // open: positions or lengths that make no sense
};
inline constexpr std::size_t kRingFaults = 8;
inline constexpr std::size_t kRingRefusals = TARNRING_ADMIN_ONLY;

struct RingCounts {
  // Rings now; the others count since the start.
  std::uint64_t open = 0;
  std::uint64_t opened = 0;
  // Mapped now, headers included.
  std::uint64_t bytesOpen = 0;
  std::uint64_t messages = 0;  // served, of both kinds
  // Places where a client says that messages found no room.
  std::uint64_t gaps = 0;
  // Messages, as clients tell it; they never came in, so no other count has them.
  std::uint64_t droppedByClients = 0;
  // Records by reason; the ring went on after each.
  std::array<std::uint64_t, kRingRefusals> refused{};
  // Rings that were refused, or closed, by reason.
  std::array<std::uint64_t, kRingFaults> faults{};

  // One more of this kind; a fault of an open ring counts here too.
  void count(RingFault fault) noexcept { ++faults[static_cast<std::size_t>(fault)]; }
  void count(tarnring_refusal refusal) noexcept { ++refused[static_cast<std::size_t>(refusal) - 1]; }

  // Adds its members to the answer to `status`, among them the dictionaries "ring_records_refused" and "rings_refused",
  // which have every reason, also those at 0.
  void describe(plist::Dictionary& status) const;
};

// What a client is answered, and what stands in the log; a constant of the program.
const char* textOf(RingFault fault) noexcept;

}  // namespace tarn::linux_host
