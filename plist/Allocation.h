// SPDX-License-Identifier: Apache-2.0
// Memory of the C library's allocator, whose blocks can grow in place, under the rules of operator new: where there is
// none, the installed handler may find some; else std::bad_alloc.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <new>

namespace tarn::plist::detail {

// `bytes` bytes: new ones, or those of `block`, which may move and stays as it is when there is no memory.
inline void* allocate(std::size_t bytes, void* block = nullptr) {
  for (;;) {
    if (void* const memory = std::realloc(block, bytes)) return memory;
    const std::new_handler handler = std::get_new_handler();
    if (handler == nullptr) throw std::bad_alloc();
    handler();
  }
}

// Owns such a block.
struct Release {
  void operator()(void* block) const noexcept { std::free(block); }
};

}  // namespace tarn::plist::detail
