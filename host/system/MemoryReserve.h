// SPDX-License-Identifier: Apache-2.0
// MemoryReserve: what the process keeps for the moment in which the system has no memory to give, and what it gave up
// in such moments.
//
// Which problem: nearly everything allocates, and most of that can't be refused any more once it is begun: the end of a
// client, a timer, a commit. How: blocks are held from the start on. When an allocation fails, one of them goes back to
// the allocator and it is tried again; when none is left, whoever needs memory waits a moment for what others free.
// What may be refused doesn't get that far: in the scope of a Refusable it fails at once, so that the blocks are there
// for the rest.
//
//   request -> Refusable: decode, hand over      fails at once: the request is refused, and the next while blocks miss
//           -> its work, timers, ends, writers   blocks, then a wait, then std::bad_alloc
//
// std::bad_alloc ends at the next boundary: a request, a piece of work, a handler of an event. That is given up,
// counted here and told; whatever comes next is served.
//
// For the whole process, as operator new is. Threads: any.
#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <new>
#include <utility>

namespace tarn::linux_host {

class MemoryReserve {
 public:
  static constexpr std::size_t kBlocks = 32;
  // Small enough to lie on the heap and not in mappings of their own, so that what is given back is there to be used.
  static constexpr std::size_t kBlockBytes = 16384;

  // While it lives, what this thread fails to allocate is refused.
  class Refusable {
   public:
    Refusable() noexcept : previous_(std::exchange(refusable_, true)) {}
    Refusable(const Refusable&) = delete;
    Refusable& operator=(const Refusable&) = delete;
    ~Refusable() { refusable_ = previous_; }

   private:
    const bool previous_;
  };

  // What is given up for want of memory.
  enum class Loss : std::uint8_t {
    Request,     // refused with an error
    Connection,  // closed or not taken: not even the error could be sent
    Work,        // a piece of work, a timer, an event's handler
  };
  static constexpr std::size_t kLosses = 3;
  struct Counts {
    std::array<std::uint64_t, kLosses> given{};
    std::uint64_t blocksUsed = 0;
    std::uint64_t of(Loss loss) const noexcept { return given[static_cast<std::size_t>(loss)]; }
    bool operator==(const Counts&) const = default;
  };

  // Takes the blocks and holds them until the process ends. False: there isn't even so much memory. A later call takes
  // what is missing. `longestWait`: for what others free, in all, until the blocks are whole again.
  [[nodiscard]] static bool hold(std::chrono::milliseconds longestWait = std::chrono::milliseconds(100)) noexcept;
  // Whether all blocks are there, after getting back those that were given when there is memory. True before hold().
  static bool isWhole() noexcept;

  // One more was given up.
  static void count(Loss loss) noexcept;
  // Since the process began.
  static Counts counts() noexcept;

  // Does `work`; what memory is missing for in it is given up there and counted. Whether it came to its end.
  template <class Work>
  static bool orGiveUp(Loss loss, Work&& work) {
    try {
      std::forward<Work>(work)();
      return true;
    } catch (const std::bad_alloc&) {
      count(loss);
      return false;
    }
  }

 private:
  // The handler of operator new: returns when it is worth another try.
  static void handleShortage();
  // Whether all blocks are there again.
  static bool refill() noexcept;

  static inline thread_local bool refusable_ = false;
};

}  // namespace tarn::linux_host
