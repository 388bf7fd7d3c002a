// SPDX-License-Identifier: Apache-2.0
// Control: the page that a campaign and the interposed calls of the service share, by which it says what is to go wrong
// and learns what did.
//
// Which problem: a fault has to come at a certain call of a running program, and be taken back. A file of 64-bit words,
// named in TARN_SHIM_CONTROL, is mapped by both sides; tests/campaigns/control.py holds the same places. Without the
// variable nothing is interfered with. Threads: any; each word is an atomic.
#pragma once

#include <dlfcn.h>

#include <atomic>
#include <cstddef>
#include <cstdint>

namespace tarn::campaigns {

enum class Word : std::size_t {
  FaultKind = 0,          // 1 + the kind of call that fails once; 0: none
  FaultOrdinal = 1,       // which call of that kind, counted from 1
  FaultAction = 2,        // the errno value it fails with, or kShort
  Fired = 3,              // faults that came to pass, failed allocations included
  StickyKinds = 4,        // kinds (a bit each) of which every call fails
  StickyError = 5,        // with this errno value
  FailingAllocation = 6,  // which allocation fails, counted from 1; 0: none, and none is counted
  Allocations = 7,        // allocations counted
  ClockOffset = 8,        // nanoseconds that the wall clock is ahead of the real one, signed
  Sequence = 9,           // entries of the journal of writes
  SyncDelay = 10,         // milliseconds that the next synchronisation takes longer; taken back by it
  Delays = 11,            // synchronisations that were delayed
  FaultSite = 12,         // the call that fails is counted among those from this site alone; 0: among all of its kind
  SiteCalls = 13,         // calls from that site
  FailuresInARow = 14,    // allocations that fail from that one on; 0: that one alone
  FirstCounter = 16,      // calls of each kind
};

// In the place of an errno value: the call does half of what it was asked for.
inline constexpr std::uint64_t kShort = 65536;
inline constexpr std::size_t kWords = 64;

using Words = std::atomic<std::uint64_t>;
static_assert(Words::is_always_lock_free && sizeof(Words) == sizeof(std::uint64_t), "both sides see plain words");

// The page, or null when no campaign asked for anything. Made by the first call, which the loader makes.
Words* controlWords() noexcept;

inline Words& word(Words* words, Word place, std::size_t more = 0) noexcept {
  return words[static_cast<std::size_t>(place) + more];
}

// The function that would have been called without the shim.
template <typename Function>
Function* nextFunction(const char* name) noexcept {
  return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

}  // namespace tarn::campaigns
