#include "client/Reply.h"

namespace tarn::client {

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
  }
  return "unknown";
}

std::int64_t Reply::number() const noexcept {
  return results.empty() || !results.front().view().isNumber() ? 0 : results.front().view().asInt64();
}

plist::Dictionary Reply::dictionary() const noexcept {
  const bool isDictionary = !results.empty() && results.front().kind() == plist::Kind::Dictionary;
  return isDictionary ? results.front().view().dictionary() : plist::Dictionary();
}

std::vector<std::int64_t> Reply::numbers() const {
  std::vector<std::int64_t> numbers;
  if (!results.empty() && results.front().kind() == plist::Kind::Array) {
    for (const plist::ValueView item : results.front().view().array()) {
      numbers.push_back(item.asInt64());
    }
  }
  return numbers;
}

}  // namespace tarn::client
