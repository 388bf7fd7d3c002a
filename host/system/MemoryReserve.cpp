// SPDX-License-Identifier: Apache-2.0
#include "host/system/MemoryReserve.h"

#include <poll.h>

#include <atomic>
#include <cstdlib>
#include <cstring>

namespace tarn::linux_host {

namespace {

constexpr std::chrono::milliseconds kPause{1};

// The allocator is one for the process, and so is what stands behind it.
struct Reserve {
  std::array<std::atomic<void*>, MemoryReserve::kBlocks> blocks{};
  std::atomic<std::size_t> missing{MemoryReserve::kBlocks};
  std::atomic<bool> isHeld{false};
  std::atomic<std::int64_t> longestWait{0};
  std::atomic<std::int64_t> waitsLeft{0};  // pauses
  std::array<std::atomic<std::uint64_t>, MemoryReserve::kLosses> given{};
  std::atomic<std::uint64_t> blocksUsed{0};
};

constinit Reserve reserve;

bool giveOneBack() noexcept {
  for (auto& place : reserve.blocks) {
    if (void* const block = place.exchange(nullptr)) {
      reserve.missing.fetch_add(1);
      reserve.blocksUsed.fetch_add(1, std::memory_order_relaxed);
      std::free(block);
      return true;
    }
  }
  return false;
}

}  // namespace

bool MemoryReserve::hold(std::chrono::milliseconds longestWait) noexcept {
  std::set_new_handler(&handleShortage);
  reserve.isHeld.store(true);
  reserve.longestWait.store(longestWait / kPause);
  reserve.waitsLeft.store(longestWait / kPause);
  return refill();
}

bool MemoryReserve::isWhole() noexcept {
  return reserve.missing.load(std::memory_order_relaxed) == 0 || !reserve.isHeld.load() || refill();
}

// Takes blocks for the empty places. With malloc(), whose failure calls no handler; written to, so that the system has
// really given them.
bool MemoryReserve::refill() noexcept {
  for (auto& place : reserve.blocks) {
    if (place.load() != nullptr) continue;
    void* const block = std::malloc(kBlockBytes);
    if (block == nullptr) return false;
    std::memset(block, 1, kBlockBytes);
    void* none = nullptr;
    if (place.compare_exchange_strong(none, block)) {
      reserve.missing.fetch_sub(1);
    } else {
      std::free(block);  // another thread was faster
    }
  }
  reserve.waitsLeft.store(reserve.longestWait.load());
  return true;
}

void MemoryReserve::handleShortage() {
  if (refusable_) throw std::bad_alloc();
  if (giveOneBack()) return;
  if (reserve.waitsLeft.fetch_sub(1) <= 0) {
    reserve.waitsLeft.store(0);
    throw std::bad_alloc();
  }
  static_cast<void>(::poll(nullptr, 0, static_cast<int>(kPause.count())));
}

void MemoryReserve::count(Loss loss) noexcept {
  reserve.given[static_cast<std::size_t>(loss)].fetch_add(1, std::memory_order_relaxed);
}

MemoryReserve::Counts MemoryReserve::counts() noexcept {
  Counts counts;
  for (std::size_t i = 0; i < kLosses; ++i) {
    counts.given[i] = reserve.given[i].load(std::memory_order_relaxed);
  }
  counts.blocksUsed = reserve.blocksUsed.load(std::memory_order_relaxed);
  return counts;
}

}  // namespace tarn::linux_host
