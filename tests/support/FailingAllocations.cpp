// SPDX-License-Identifier: Apache-2.0
#include "tests/support/FailingAllocations.h"

#include <atomic>
#include <cerrno>
#include <cstddef>

#include "testing/backends/OwnMemory.h"

// The C library's own names for what is replaced here.
// NOLINTBEGIN(bugprone-reserved-identifier,readability-identifier-naming)
extern "C" void* __libc_malloc(std::size_t);
extern "C" void* __libc_calloc(std::size_t, std::size_t);
extern "C" void* __libc_realloc(void*, std::size_t);
// NOLINTEND(bugprone-reserved-identifier,readability-identifier-naming)

namespace tarn::testing {

namespace {

struct Failing {
  std::uint64_t first = 0;  // 0: none
  std::uint64_t count = 0;
  std::uint64_t made = 0;
  bool happened = false;
};

constinit thread_local Failing failing;

constinit std::atomic<std::uint64_t> firstOfOthers{0};
constinit std::atomic<std::uint64_t> countOfOthers{0};
constinit std::atomic<std::uint64_t> madeByOthers{0};
constinit std::atomic<std::uint64_t> happenedToOthers{0};
constinit thread_local bool isNoOther = false;

bool failsAsAnother() noexcept {
  const std::uint64_t first = firstOfOthers.load();
  if (first == 0 || isNoOther) return false;
  const std::uint64_t ordinal = madeByOthers.fetch_add(1) + 1;
  if (ordinal < first || ordinal - first >= countOfOthers.load()) return false;
  happenedToOthers.fetch_add(1);
  errno = ENOMEM;
  return true;
}

bool failsNow() noexcept {
  if (OwnMemory::isUsed()) return false;
  if (failsAsAnother()) return true;
  if (failing.first == 0) return false;
  const std::uint64_t ordinal = ++failing.made;
  if (ordinal < failing.first || ordinal - failing.first >= failing.count) return false;
  failing.happened = true;
  errno = ENOMEM;
  return true;
}

}  // namespace

extern "C" {

void* failableMalloc(std::size_t size) __asm__("malloc");
void* failableMalloc(std::size_t size) {
  return failsNow() ? nullptr : __libc_malloc(size);
}

void* failableCalloc(std::size_t count, std::size_t size) __asm__("calloc");
void* failableCalloc(std::size_t count, std::size_t size) {
  return failsNow() ? nullptr : __libc_calloc(count, size);
}

void* failableRealloc(void* block, std::size_t size) __asm__("realloc");
void* failableRealloc(void* block, std::size_t size) {
  return failsNow() ? nullptr : __libc_realloc(block, size);
}

}  // extern "C"

FailingAllocations::FailingAllocations(std::uint64_t first, std::uint64_t count) noexcept {
  failing = {first, count, 0, false};
}

FailingAllocations::~FailingAllocations() {
  failing = {};
}

bool FailingAllocations::happened() const noexcept {
  return failing.happened;
}

FailingAllocationsOfOthers::FailingAllocationsOfOthers(std::uint64_t first, std::uint64_t count) noexcept {
  isNoOther = true;
  madeByOthers.store(0);
  countOfOthers.store(count);
  happenedToOthers.store(0);
  firstOfOthers.store(first);
}

FailingAllocationsOfOthers::~FailingAllocationsOfOthers() {
  firstOfOthers.store(0);
  isNoOther = false;
}

std::uint64_t FailingAllocationsOfOthers::happened() const noexcept {
  return happenedToOthers.load();
}

}  // namespace tarn::testing
