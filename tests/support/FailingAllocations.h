// SPDX-License-Identifier: Apache-2.0
// FailingAllocations: lets allocations of the calling thread fail, by their number since it was made.
//
// What a fake keeps for itself (testing/backends/OwnMemory.h) doesn't count and never fails.
//
// A test program has what needs it by tarn_short_memory_tests(), and not under a sanitizer, whose allocator can't fail.
#pragma once

#include <cstdint>
#include <limits>
#include <new>

namespace tarn::testing {

class FailingAllocations {
 public:
  static constexpr std::uint64_t kAll = std::numeric_limits<std::uint64_t>::max();

  // While it lives, `count` allocations of this thread fail from the one with this number on, counted from 1.
  explicit FailingAllocations(std::uint64_t first, std::uint64_t count = 1) noexcept;
  FailingAllocations(const FailingAllocations&) = delete;
  FailingAllocations& operator=(const FailingAllocations&) = delete;
  ~FailingAllocations();

  // Whether one did.
  bool happened() const noexcept;
};

// The same with the allocations of all other threads together. One at a time.
class FailingAllocationsOfOthers {
 public:
  explicit FailingAllocationsOfOthers(std::uint64_t first, std::uint64_t count = 1) noexcept;
  FailingAllocationsOfOthers(const FailingAllocationsOfOthers&) = delete;
  FailingAllocationsOfOthers& operator=(const FailingAllocationsOfOthers&) = delete;
  ~FailingAllocationsOfOthers();

  // How many failed.
  std::uint64_t happened() const noexcept;
};

// Calls attempt() with its first allocation failing, then with its second, until one has no more. Where one ended in
// std::bad_alloc, check() follows. How many did.
template <class Attempt, class Check>
int failEachAllocation(const Attempt& attempt, const Check& check) {
  int failed = 0;
  for (std::uint64_t ordinal = 1;; ++ordinal) {
    bool threw = false;
    bool happened = false;
    {
      const FailingAllocations failing(ordinal);
      try {
        attempt();
      } catch (const std::bad_alloc&) {
        threw = true;
      }
      happened = failing.happened();
    }
    if (!happened) return failed;
    if (threw) {
      ++failed;
      check();
    }
  }
}

}  // namespace tarn::testing
