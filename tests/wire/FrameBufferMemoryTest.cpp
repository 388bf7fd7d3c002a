// Whether a frame buffer really gives its memory back: this program counts the arrays that it holds.
#include <gtest/gtest.h>

#include <cstddef>
#include <new>

#include "wire/FrameBuffer.h"

namespace {

std::size_t arraysHeld = 0;

}  // namespace

void* operator new[](std::size_t size) {
  void* const memory = ::operator new(size);
  ++arraysHeld;
  return memory;
}

void operator delete[](void* memory) noexcept {
  if (memory != nullptr) {
    --arraysHeld;
  }
  ::operator delete(memory);
}

void operator delete[](void* memory, std::size_t /*size*/) noexcept {
  ::operator delete[](memory);
}

namespace tarn::wire {
namespace {

TEST(FrameBufferMemory, ReleaseGivesItBack) {
  const std::size_t before = arraysHeld;
  FrameBuffer buffer;
  ASSERT_FALSE(buffer.space().empty());
  ASSERT_EQ(arraysHeld, before + 1);
  buffer.release();
  EXPECT_EQ(arraysHeld, before);
}

}  // namespace
}  // namespace tarn::wire
