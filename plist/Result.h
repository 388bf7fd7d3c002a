// SPDX-License-Identifier: Apache-2.0
// Status and Result: what an operation gives that can fail. An error is a value: nothing is thrown.
//
//   if (const Status written = writeAll(file, bytes); written.failed()) log(written->text);
//   Result<std::string> read = readSmallFile(path, limit);
//
// This is the one shape of failure on every floor: no empty text, error number or flag stands for it. A function whose
// answer may just be missing, which is no failure, gives an optional. Threads: plain data.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>

namespace tarn {

struct Error {
  // For a program: the number by which whoever failed tells its failures apart. On Linux that of the system call
  // (errno); 0 where there is none to tell. What else it is, the operation says.
  std::int64_t code = 0;
  // For a person, in a log line or on stderr: what failed and why, without a line end.
  std::string text;

  friend bool operator==(const Error&, const Error&) = default;
};

// Success, or an error. There is no conversion to bool: whether that were the success or the failure, half of the
// readers would take it for the other.
class [[nodiscard]] Status {
 public:
  // Success.
  Status() noexcept = default;
  // NOLINTNEXTLINE(google-explicit-constructor): `return Error{...}` is how an operation fails
  Status(Error error) : error_(std::move(error)) {}

  bool ok() const noexcept { return !error_.has_value(); }
  bool failed() const noexcept { return error_.has_value(); }

  // The error; only after a failure.
  const Error& operator*() const noexcept { return *error_; }
  const Error* operator->() const noexcept { return &*error_; }

  // The error's number, 0 after a success.
  std::int64_t code() const noexcept { return error_ ? error_->code : 0; }
  // The error's text, empty after a success.
  std::string text() const { return error_ ? error_->text : std::string(); }

  friend bool operator==(const Status&, const Status&) = default;

 private:
  std::optional<Error> error_;
};

// A value, or what went wrong. Beside an error the value is as its type makes it (empty, null, zero), unless the
// operation says what it leaves there; it may be that without an error where the operation says that there can be
// nothing.
template <class T>
struct [[nodiscard]] Result {
  T value{};
  Status error{};

  bool ok() const noexcept { return error.ok(); }
  bool failed() const noexcept { return error.failed(); }
};

}  // namespace tarn
