// The error of a system call as a value.
#pragma once

#include <cerrno>
#include <string>
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

// ": " and what the error says, for the end of a line.
inline std::string errorSuffix(const platform::PlatformError& error) {
  return ": " + error.text;
}
inline std::string errorSuffix(int number) {
  return errorSuffix(systemError(number));
}

}  // namespace tarn::linux_host
