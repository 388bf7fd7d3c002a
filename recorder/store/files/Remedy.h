// SPDX-License-Identifier: Apache-2.0
// Remedy: what helps against a failure of the store. The code of a store's error is SQLite's result code; it alone
// decides. Threads: any.
#pragma once

#include <cstdint>

namespace tarn::recorder {

// From the mildest on. Which of them helps decides what becomes of the file, so it rests on the code alone, never on a
// text.
enum class Remedy : std::uint8_t {
  Wait,      // a passing fault (a full disk, a lock): the same again later
  Reopen,    // a fault that a new connection may heal: open again later
  Moved,     // the file at the path isn't the open one any more
  SetAside,  // the file can't be used: damaged, no database, or somebody else's; to be proven by a second look
};

// What helps against this code. An error that says nothing about the file (no memory, a read that failed) never sets
// one aside.
Remedy remedyFor(std::int64_t code) noexcept;
// Whether it failed for want of memory.
bool isShortage(std::int64_t code) noexcept;

}  // namespace tarn::recorder
