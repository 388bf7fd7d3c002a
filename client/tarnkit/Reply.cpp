// SPDX-License-Identifier: Apache-2.0
#include <tarnkit/Reply.h>

namespace tarnkit {

std::string_view outcomeName(Outcome outcome) noexcept {
  switch (outcome) {
    case Outcome::Ok:
      return "ok";
    case Outcome::Error:
      return "error";
    case Outcome::Cancelled:
      return "cancelled";
    case Outcome::ConnectionLost:
      return "connection lost";
    case Outcome::TimedOut:
      return "timed out";
    case Outcome::Full:
      return "full";
    case Outcome::TooLarge:
      return "too large";
    case Outcome::Misuse:
      return "misuse";
  }
  return "unknown";
}

std::int64_t Reply::number() const noexcept {
  const auto* number = results.empty() ? nullptr : results.front().as<std::int64_t>();
  return number != nullptr ? *number : 0;
}

Dictionary Reply::dictionary() const {
  const auto* dictionary = results.empty() ? nullptr : results.front().as<Dictionary>();
  return dictionary != nullptr ? *dictionary : Dictionary();
}

std::vector<std::int64_t> Reply::numbers() const {
  std::vector<std::int64_t> numbers;
  if (const auto* array = results.empty() ? nullptr : results.front().as<Array>()) {
    for (const Value& item : *array) {
      if (const auto* number = item.as<std::int64_t>()) {
        numbers.push_back(*number);
      }
    }
  }
  return numbers;
}

}  // namespace tarnkit
