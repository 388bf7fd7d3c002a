// SPDX-License-Identifier: Apache-2.0
#include "host/system/Heap.h"

#include <gtest/gtest.h>
#include <malloc.h>

#include <vector>

#include "tests/support/HeapUse.h"

namespace tarn::linux_host {
namespace {

// The sanitizers have an allocator of their own.
#ifndef TARN_SANITIZED_HEAP

TEST(Heap, LargeBlocksAreMappingsHoweverManyWereFreedBefore) {
  shapeHeap();
  const std::size_t before = ::mallinfo2().hblks;
  for (int i = 0; i < 3; ++i) {
    const std::vector<char> large(std::size_t{24} << 20);  // more than lies free in the heap
    EXPECT_EQ(::mallinfo2().hblks, before + 1) << i;
  }
}

#endif

}  // namespace
}  // namespace tarn::linux_host
