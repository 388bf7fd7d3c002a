// SPDX-License-Identifier: Apache-2.0
#include "recorder/NewestMessages.h"

#include <array>
#include <utility>

namespace tarn::recorder {

namespace {

const plist::Key kTag("audiotag");

// What the redundancy rule of the sessions leaves out.
const std::array<plist::Key, 3> kTimes{plist::Key("processuptime_ms"), plist::Key("systemuptime_sec"),
                                       plist::Key("tarnreporting_timestamp")};

}  // namespace

void NewestMessages::begin() noexcept {
  for (; !changes_.empty(); changes_.pop_back()) {
    Message& message = *changes_.back().message;
    bytes_ -= message.payload.storageBytes();
    message = std::move(changes_.back().before);
    bytes_ += message.payload.storageBytes();
  }
  ended_.clear();
}

void NewestMessages::commit() noexcept {
  changes_.clear();
  for (; !ended_.empty(); ended_.pop_back()) {
    const auto found = sessions_.find(ended_.back());
    if (found == sessions_.end()) continue;
    for (const auto& [tag, message] : found->second) {
      bytes_ -= message.payload.storageBytes();
    }
    count_ -= found->second.size();
    sessions_.erase(found);
  }
}

void NewestMessages::note(platform::SessionNumber session, std::int64_t event, const plist::Dictionary& payload) {
  const plist::ValueView tag = payload.get(kTag);
  if (session == 0 || !tag.isText()) return;
  if (count_ >= kMost || bytes_ >= kMostBytes) {
    forget();
  }
  Kinds& kinds = sessions_[session];
  auto found = kinds.find(tag.text());
  if (found == kinds.end()) {
    found = kinds.emplace(tag.text(), Message()).first;
    ++count_;
  }
  Message& message = found->second;
  if (message.event != 0 && message.payload.sharesStorageWith(payload)) return;
  changes_.push_back({&message, message});
  bytes_ -= message.payload.storageBytes();
  bytes_ += payload.storageBytes();
  message = {event, payload};
}

std::int64_t NewestMessages::find(platform::SessionNumber session, const plist::Dictionary& message) const {
  const plist::ValueView tag = message.get(kTag);
  const auto kinds = sessions_.find(session);
  if (kinds == sessions_.end() || !tag.isText()) return 0;
  const auto found = kinds->second.find(tag.text());
  if (found == kinds->second.end() || found->second.event == 0) return 0;
  return message.equalsIgnoring(found->second.payload, kTimes) ? found->second.event : 0;
}

void NewestMessages::forget() noexcept {
  sessions_.clear();
  changes_.clear();
  count_ = bytes_ = 0;
}

}  // namespace tarn::recorder
