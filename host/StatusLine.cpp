// SPDX-License-Identifier: Apache-2.0
#include "host/StatusLine.h"

#include <utility>

namespace tarn::linux_host {

namespace {

// In groups of three digits.
std::string grouped(std::uint64_t number) {
  constexpr std::size_t kGroup = 3;
  std::string digits = std::to_string(number);
  for (std::size_t place = digits.size(); place > kGroup;) {
    place -= kGroup;
    digits.insert(place, 1, ',');
  }
  return digits;
}

std::string counted(std::uint64_t number, const char* one, const char* many) {
  return grouped(number) + (number == 1 ? one : many);
}

}  // namespace

std::string statusLineOf(const StatusNumbers& numbers) {
  return counted(numbers.sessions, " session", " sessions") + " of " +
         counted(numbers.clients, " client, ", " clients, ") + grouped(numbers.waiting) + " waiting, " +
         counted(numbers.messages, " message", " messages");
}

void StatusLine::start() {
  started_ = manager_.listens();
  if (started_) {
    tell();
  }
}

void StatusLine::lookLater() {
  loop_.queue()->asyncAfter(kBetween, [this] {
    lookIsDue_ = false;
    tell();
  });
  lookIsDue_ = true;
}

void StatusLine::tell() {
  const StatusNumbers numbers = source_();
  std::string line = statusLineOf(numbers);
  if (line != told_) {
    manager_.notifyStatus(line);
    told_ = std::move(line);
  }
  if (numbers.waiting > 0) {
    lookLater();  // that it is done may come without anything else
  }
}

}  // namespace tarn::linux_host
