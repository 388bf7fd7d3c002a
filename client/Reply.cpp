// SPDX-License-Identifier: Apache-2.0
#include "client/Reply.h"

#include <utility>

namespace tarn::client {

Reply failure(Outcome outcome, std::string text) {
  Reply reply;
  reply.outcome = outcome;
  reply.error.text = std::move(text);
  return reply;
}

Reply misuse() {
  return failure(Outcome::Misuse, "used inside a reply handler, or by two threads at the same time");
}

Reply notSent(tarnkit::SendStatus status) {
  switch (status) {
    case tarnkit::SendStatus::Full:
      return failure(Outcome::Full, "too many requests are outstanding");
    case tarnkit::SendStatus::TooLarge:
      return failure(Outcome::TooLarge, "the request is longer than a frame may be");
    case tarnkit::SendStatus::Misuse:
      return misuse();
    default:
      return failure(Outcome::ConnectionLost, "the connection has ended");
  }
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
