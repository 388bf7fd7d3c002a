// SPDX-License-Identifier: Apache-2.0
// Handles are made and freed without the C++ runtime, which would end the process where memory runs out, and which a
// program in C needn't have. Their types need a constructor without arguments that doesn't throw. Stateless. Threads:
// any.
#pragma once

#include <cstdlib>
#include <new>

namespace tarn::reporting {

// Null when there is no memory.
// Allocates and makes one by its default constructor. Null when there is no memory.
template <class Handle>
Handle* makeHandle() noexcept {
  void* const memory = std::malloc(sizeof(Handle));
  return memory != nullptr ? ::new (memory) Handle : nullptr;
}

// Ends and frees one that makeHandle() made.
template <class Handle>
void freeHandle(Handle* handle) noexcept {
  handle->~Handle();
  std::free(handle);
}

}  // namespace tarn::reporting
