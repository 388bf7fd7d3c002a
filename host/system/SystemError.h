// SPDX-License-Identifier: Apache-2.0
// The error of a system call as a value, and as the end of a log line.
//
// The one place where an errno value becomes text: `Error::code` is the number, `Error::text` the system's words for
// it. Threads: any; unlike strerror(3) nothing is shared. Each call makes a text, so it stands on paths that failed.
#pragma once

#include <cerrno>
#include <string>
#include <system_error>

#include "plist/Result.h"

namespace tarn::linux_host {

// "2, No such file or directory" for ENOENT. 0 gives "Success", which no caller asks for.
inline Error systemError(int number) {
  return {number, std::generic_category().message(number)};
}
// Of the call that failed last on this thread. To be asked before anything else is called, closing a descriptor
// included.
inline Error lastSystemError() {
  return systemError(errno);
}

// ": " and what the error says, for the end of a line.
inline std::string errorSuffix(const Error& error) {
  return ": " + error.text;
}
// The same for an errno value.
inline std::string errorSuffix(int number) {
  return errorSuffix(systemError(number));
}

// The error with what it happened to or in: "SUBJECT: what the error says".
inline Error errorOf(const std::string& subject, const Error& error) {
  return {error.code, subject + errorSuffix(error)};
}
inline Error errorOf(const std::string& subject, int number) {
  return errorOf(subject, systemError(number));
}

}  // namespace tarn::linux_host
