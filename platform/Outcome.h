// Outcome: what an operation of a facility gives that can fail. An error is a value: nothing is thrown.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace tarn::platform {

struct PlatformError {
  std::int64_t code = 0;  // the platform's own number for it: on Linux that of the system call
  std::string text;       // for a person, in a log line
};

// Nothing: it worked.
using MaybeError = std::optional<PlatformError>;

// A value, or what went wrong. Beside an error the value is empty; it may be empty without one where the operation says
// that there can be nothing.
template <class T>
struct [[nodiscard]] Outcome {
  T value{};
  MaybeError error{};
  bool failed() const noexcept { return error.has_value(); }
};

}  // namespace tarn::platform
