// The error of a system call as a value.
#pragma once

#include <cerrno>
#include <system_error>

#include "platform/Outcome.h"

namespace tarn::linux_host {

inline platform::PlatformError systemError(int number) {
  return {number, std::generic_category().message(number)};
}
// Of the call that failed last on this thread.
inline platform::PlatformError lastSystemError() {
  return systemError(errno);
}

}  // namespace tarn::linux_host
