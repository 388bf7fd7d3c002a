// The error of a system call as a value.
#pragma once

#include <cerrno>
#include <string>
#include <system_error>

#include "plist/Result.h"

namespace tarn::linux_host {

inline Error systemError(int number) {
  return {number, std::generic_category().message(number)};
}
// Of the call that failed last on this thread.
inline Error lastSystemError() {
  return systemError(errno);
}

// ": " and what the error says, for the end of a line.
inline std::string errorSuffix(const Error& error) {
  return ": " + error.text;
}
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
