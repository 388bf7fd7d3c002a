#include "session/TarnReportingSessionPreviousValues.h"

#include <algorithm>

namespace tarn {

void TarnReportingSessionPreviousValues::merge(const plist::Dictionary& payload) {
  if (payload.empty()) {
    return;
  }
  const auto sameKeys = std::find_if(recent_.rbegin(), recent_.rend(),
                                     [&](const plist::Dictionary& other) { return other.sharesKeysWith(payload); });
  if (sameKeys != recent_.rend()) {
    *sameKeys = payload;
    std::rotate(std::prev(sameKeys.base()), sameKeys.base(), recent_.end());
    return;
  }
  if (recent_.size() == kRecentLimit) {
    for (const plist::Dictionary::Entry& entry : recent_.front()) {
      older_.insert_or_assign(entry.key, plist::Value(entry.value));
    }
    recent_.erase(recent_.begin());
  }
  recent_.push_back(payload);
}

void TarnReportingSessionPreviousValues::merge(const TarnReportingSessionPreviousValues& other) {
  merge(other.dictionary());
}

plist::ValueView TarnReportingSessionPreviousValues::get(const plist::Key& key) const noexcept {
  for (auto payload = recent_.rbegin(); payload != recent_.rend(); ++payload) {
    if (const plist::ValueView value = payload->get(key)) {
      return value;
    }
  }
  const auto found = older_.find(key);
  return found == older_.end() ? plist::ValueView() : found->second.view();
}

plist::Dictionary TarnReportingSessionPreviousValues::dictionary() const {
  std::vector<plist::Dictionary::Entry> entries;
  entries.reserve(older_.size());
  for (const auto& [key, value] : older_) {
    entries.push_back({key, value.view()});
  }
  plist::Dictionary all = plist::Dictionary::fromEntries(entries);
  for (const plist::Dictionary& payload : recent_) {
    all.merge(payload);
  }
  return all;
}

}  // namespace tarn
