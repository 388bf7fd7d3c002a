// SPDX-License-Identifier: Apache-2.0
// SharedWords: how producer and consumer of a ring touch its memory. A test gives them another one that stops at each
// of these steps.
//
// Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tarn::ring {

// Everything that either side does to the shared memory goes through these. The other side is another process that may
// write anything at any moment, so words are loaded and stored atomically, and content is copied out before it is
// looked at. Nothing here locks, allocates or fails.
struct SharedWords {
  // Of a word whose value stands alone: nothing else in the memory is concluded from it.
  static std::uint64_t load(const std::uint64_t* word) noexcept { return __atomic_load_n(word, __ATOMIC_RELAXED); }
  // What the other side wrote before its storeRelease() of the value that is loaded is seen after this.
  static std::uint64_t loadAcquire(const std::uint64_t* word) noexcept {
    return __atomic_load_n(word, __ATOMIC_ACQUIRE);
  }
  // The builtins write through the pointer, which the check doesn't see: NOLINTBEGIN(readability-non-const-parameter)
  // storeRelease() publishes: whoever loads the value by loadAcquire() sees all that was written before it.
  static void store(std::uint64_t* word, std::uint64_t value) noexcept {
    __atomic_store_n(word, value, __ATOMIC_RELAXED);
  }
  static void storeRelease(std::uint64_t* word, std::uint64_t value) noexcept {
    __atomic_store_n(word, value, __ATOMIC_RELEASE);
  }
  // NOLINTEND(readability-non-const-parameter)
  // Orders a store before it against a load after it.
  static void fence() noexcept {
#ifdef __SANITIZE_THREAD__  // which doesn't know fences
    std::uint64_t word = 0;
    __atomic_exchange_n(&word, 1, __ATOMIC_SEQ_CST);
#else
    __atomic_thread_fence(__ATOMIC_SEQ_CST);
#endif
  }
  // Content, word by word in any order. An honest other side doesn't touch it meanwhile: copyIn() goes to what isn't
  // published yet, copyOut() comes from what isn't given back yet. A dishonest one spoils the content and nothing else.
  static void copyIn(std::byte* ring, const void* from, std::size_t bytes) noexcept {
    std::memcpy(ring, from, bytes);
  }
  static void copyOut(void* to, const std::byte* ring, std::size_t bytes) noexcept {
    std::memcpy(to, ring, bytes);
  }
};

}  // namespace tarn::ring
