// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionPreviousValues.h"

#include <algorithm>

namespace tarn {

namespace {

template <class Values>
plist::Dictionary dictionaryOf(const Values& values) {
  std::vector<plist::Dictionary::Entry> entries;
  entries.reserve(values.size());
  for (const auto& [key, value] : values) {
    entries.push_back({key, plist::ValueView(value)});
  }
  return plist::Dictionary::fromEntries(entries);
}

}  // namespace

void TarnReportingSessionPreviousValues::merge(const plist::Dictionary& payload) {
  const auto sameKeys = std::find_if(recent_.rbegin(), recent_.rend(),
                                     [&](const plist::Dictionary& other) { return other.sharesKeysWith(payload); });
  if (sameKeys != recent_.rend()) {
    *sameKeys = payload;
    std::rotate(std::prev(sameKeys.base()), sameKeys.base(), recent_.end());
  } else if (recent_.size() != kRecentLimit) {
    recent_.push_back(payload);
  } else {
    if (older_ == nullptr) {
      older_ = std::make_unique<std::unordered_map<plist::Key, plist::Value>>();
    }
    for (const plist::Dictionary::Entry& entry : recent_.front()) {
      older_->insert_or_assign(entry.key, plist::Value(entry.value));
    }
    recent_.front() = payload;
    std::rotate(recent_.begin(), std::next(recent_.begin()), recent_.end());
  }
}

void TarnReportingSessionPreviousValues::merge(const TarnReportingSessionPreviousValues& other) {
  if (other.older_ != nullptr) {
    merge(dictionaryOf(*other.older_));
  }
  for (const plist::Dictionary& payload : other.recent_) {
    merge(payload);
  }
}

plist::ValueView TarnReportingSessionPreviousValues::get(const plist::Key& key) const noexcept {
  for (auto payload = recent_.rbegin(); payload != recent_.rend(); ++payload) {
    if (const plist::ValueView value = payload->get(key)) return value;
  }
  if (older_ == nullptr) return {};
  const auto found = older_->find(key);
  return found == older_->end() ? plist::ValueView() : found->second.view();
}

// In one pass: merging shape by shape would walk all that was gathered so far once for each.
plist::Dictionary TarnReportingSessionPreviousValues::dictionary() const {
  std::unordered_map<plist::Key, plist::ValueView> latest;
  for (auto payload = recent_.rbegin(); payload != recent_.rend(); ++payload) {
    for (const plist::Dictionary::Entry& entry : *payload) {
      latest.emplace(entry.key, entry.value);
    }
  }
  if (older_ != nullptr) {
    for (const auto& [key, value] : *older_) {
      latest.emplace(key, value.view());
    }
  }
  return dictionaryOf(latest);
}

}  // namespace tarn
