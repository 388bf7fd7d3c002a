// SPDX-License-Identifier: Apache-2.0
// How much memory the program holds, as its allocator tells. What was freed may count for a while when the pieces are
// small (about 1 KiB), so a test looks for differences that are large beside that.
#pragma once

#include <malloc.h>

#include <cstddef>

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define TARN_SANITIZED_HEAP
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer) || __has_feature(memory_sanitizer)
#define TARN_SANITIZED_HEAP
#endif
#endif

#ifdef TARN_SANITIZED_HEAP
// Of the sanitizers' runtime; g++ comes without the header that declares it.
extern "C" std::size_t __sanitizer_get_current_allocated_bytes();
#endif

namespace tarn::testing {

inline std::size_t heapBytes() {
#ifdef TARN_SANITIZED_HEAP
  return __sanitizer_get_current_allocated_bytes();
#else
  const struct mallinfo2 facts = ::mallinfo2();
  return facts.uordblks + facts.hblkhd;
#endif
}

// Bytes by which the memory in use has grown since this was made.
class HeapGrowth {
 public:
  std::ptrdiff_t bytes() const { return static_cast<std::ptrdiff_t>(heapBytes()) - before_; }

 private:
  std::ptrdiff_t before_ = static_cast<std::ptrdiff_t>(heapBytes());
};

}  // namespace tarn::testing
