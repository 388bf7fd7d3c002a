// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeNotificationCenter.h"

#include <atomic>
#include <utility>

#include "platform/WorkQueue.h"

namespace tarn::testing {

// One registration; kept alive by the deliveries that are under way.
struct FakeNotificationCenter::Listening {
  std::string name;
  std::shared_ptr<platform::WorkQueue> queue;
  Handler handler;
  std::int32_t token;
  std::atomic<bool> cancelled{false};
};

FakeNotificationCenter::FakeNotificationCenter() = default;
FakeNotificationCenter::~FakeNotificationCenter() = default;

platform::NotificationCenter::Registration FakeNotificationCenter::registerFor(
    std::string_view name, std::shared_ptr<platform::WorkQueue> queue, Handler handler) {
  const std::lock_guard lock(mutex_);
  if (const auto status = std::exchange(failNextRegistration_, std::nullopt)) return {*status, -1};
  auto listening = std::make_shared<Listening>();
  listening->name = name;
  listening->queue = std::move(queue);
  listening->handler = std::move(handler);
  listening->token = nextToken_++;
  listening_.emplace(listening->token, listening);
  return {kStatusOk, listening->token};
}

std::optional<std::uint64_t> FakeNotificationCenter::state(std::int32_t token) const {
  const std::lock_guard lock(mutex_);
  const auto listening = listening_.find(token);
  if (readsFail_ || listening == listening_.end()) return std::nullopt;
  const auto found = states_.find(listening->second->name);
  return found == states_.end() ? std::nullopt : std::optional(found->second);
}

void FakeNotificationCenter::cancel(std::int32_t token) {
  std::shared_ptr<Listening> ended;  // its handler is destroyed outside the lock
  const std::lock_guard lock(mutex_);
  cancelled_.push_back(token);
  if (const auto found = listening_.find(token); found != listening_.end()) {
    ended = std::move(found->second);
    ended->cancelled = true;
    listening_.erase(found);
  }
}

bool FakeNotificationCenter::post(std::string_view name, std::optional<std::uint64_t> state) {
  happened("post", name);
  std::vector<std::shared_ptr<Listening>> receivers;
  {
    const std::lock_guard lock(mutex_);
    if (postsFail_) return false;
    posted_.push_back({std::string(name), state});
    std::uint64_t& word = states_[std::string(name)];
    word = state.value_or(word);
    for (const auto& [token, listening] : listening_) {
      if (listening->name == name) {
        receivers.push_back(listening);
      }
    }
  }
  for (const auto& receiver : receivers) {
    receiver->queue->async([receiver] {
      if (!receiver->cancelled) {
        receiver->handler(receiver->token);
      }
    });
  }
  return true;
}

void FakeNotificationCenter::failNextRegistration(std::int32_t status) {
  const std::lock_guard lock(mutex_);
  failNextRegistration_ = status;
}

void FakeNotificationCenter::failReads(bool fail) {
  const std::lock_guard lock(mutex_);
  readsFail_ = fail;
}

void FakeNotificationCenter::failPosts(bool fail) {
  const std::lock_guard lock(mutex_);
  postsFail_ = fail;
}

void FakeNotificationCenter::setState(std::string_view name, std::uint64_t state) {
  const std::lock_guard lock(mutex_);
  states_[std::string(name)] = state;
}

std::optional<std::int32_t> FakeNotificationCenter::tokenFor(std::string_view name) const {
  const std::lock_guard lock(mutex_);
  for (const auto& [token, listening] : listening_) {
    if (listening->name == name) return token;
  }
  return std::nullopt;
}

std::vector<std::string> FakeNotificationCenter::registeredNames() const {
  const std::lock_guard lock(mutex_);
  std::vector<std::string> names;
  for (const auto& [token, listening] : listening_) {
    names.push_back(listening->name);
  }
  return names;
}

std::vector<std::int32_t> FakeNotificationCenter::cancelledTokens() const {
  const std::lock_guard lock(mutex_);
  return cancelled_;
}

std::vector<FakeNotificationCenter::Posted> FakeNotificationCenter::posted() const {
  const std::lock_guard lock(mutex_);
  return posted_;
}

}  // namespace tarn::testing
