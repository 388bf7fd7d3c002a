// SPDX-License-Identifier: Apache-2.0
#include "host/system/StartWithoutMemory.h"

#include <cstdio>
#include <cstdlib>
#include <new>

namespace tarn::linux_host {

namespace {

const StartWithoutMemory kStart __attribute__((init_priority(101)));

}  // namespace

StartWithoutMemory::StartWithoutMemory() noexcept : usual_(std::set_terminate(&end)) {}

std::string StartWithoutMemory::textOf(const std::exception& shortage) {
  return dynamic_cast<const std::bad_alloc*>(&shortage) != nullptr ? "out of memory" : shortage.what();
}

void StartWithoutMemory::over() noexcept {
  std::set_terminate(kStart.usual_);
}

void StartWithoutMemory::end() noexcept {
  // Without an exception: there was no memory for one either, nor what the runtime keeps for them.
  bool isShortage = true;
  try {
    if (const std::exception_ptr reason = std::current_exception()) {
      std::rethrow_exception(reason);
    }
  } catch (const std::bad_alloc&) {
  } catch (...) {  // what the usual end tells
    isShortage = false;
  }
  if (isShortage) {
    static_cast<void>(std::fputs("tarnreportingd: out of memory\n", stderr));
    std::_Exit(EXIT_FAILURE);
  }
  kStart.usual_();
  std::abort();
}

}  // namespace tarn::linux_host
