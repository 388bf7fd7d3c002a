// SPDX-License-Identifier: Apache-2.0
// Allocations: lets allocations of a running program fail, one or several in a row, by their number since the campaign
// began to count.
#include <cerrno>
#include <cstddef>
#include <cstdint>

#include "tests/campaigns/shim/Control.h"

// The C library's own names for what is interposed: looking them up would allocate.
// NOLINTBEGIN(bugprone-reserved-identifier,readability-identifier-naming)
extern "C" void* __libc_malloc(std::size_t);
extern "C" void* __libc_calloc(std::size_t, std::size_t);
extern "C" void* __libc_realloc(void*, std::size_t);
extern "C" void* __libc_memalign(std::size_t, std::size_t);
// NOLINTEND(bugprone-reserved-identifier,readability-identifier-naming)

namespace tarn::campaigns {

namespace {

bool fails() noexcept {
  Words* const words = controlWords();
  if (words == nullptr) return false;
  const std::uint64_t failing = word(words, Word::FailingAllocation).load();
  if (failing == 0) return false;
  const std::uint64_t ordinal = word(words, Word::Allocations).fetch_add(1) + 1;
  const std::uint64_t inARow = word(words, Word::FailuresInARow).load();
  if (ordinal < failing || ordinal - failing >= (inARow == 0 ? 1 : inARow)) return false;
  word(words, Word::Fired).fetch_add(1);
  errno = ENOMEM;
  return true;
}

}  // namespace

extern "C" {

void* tarnMalloc(std::size_t size) __asm__("malloc");
void* tarnMalloc(std::size_t size) {
  return fails() ? nullptr : __libc_malloc(size);
}

void* tarnCalloc(std::size_t count, std::size_t size) __asm__("calloc");
void* tarnCalloc(std::size_t count, std::size_t size) {
  return fails() ? nullptr : __libc_calloc(count, size);
}

void* tarnRealloc(void* block, std::size_t size) __asm__("realloc");
void* tarnRealloc(void* block, std::size_t size) {
  return fails() ? nullptr : __libc_realloc(block, size);
}

void* tarnAlignedAlloc(std::size_t alignment, std::size_t size) __asm__("aligned_alloc");
void* tarnAlignedAlloc(std::size_t alignment, std::size_t size) {
  return fails() ? nullptr : __libc_memalign(alignment, size);
}

int tarnPosixMemalign(void** block, std::size_t alignment, std::size_t size) __asm__("posix_memalign");
int tarnPosixMemalign(void** block, std::size_t alignment, std::size_t size) {
  if (fails()) return ENOMEM;
  *block = __libc_memalign(alignment, size);
  return *block == nullptr ? ENOMEM : 0;
}

}  // extern "C"

}  // namespace tarn::campaigns
