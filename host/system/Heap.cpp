// SPDX-License-Identifier: Apache-2.0
#include "host/system/Heap.h"

#include <malloc.h>

namespace tarn::linux_host {

namespace {

// Well above what messages take, so that none of them costs a mapping; what the allocator begins with itself.
constexpr int kLargeBytes = 128 * 1024;
// What may lie free at the heap's end before it goes back: as much as a busy second may take and give.
constexpr int kFreeBytes = 4 * 1024 * 1024;

}  // namespace

void shapeHeap() noexcept {
  ::mallopt(M_MMAP_THRESHOLD, kLargeBytes);
  ::mallopt(M_TRIM_THRESHOLD, kFreeBytes);
}

}  // namespace tarn::linux_host
