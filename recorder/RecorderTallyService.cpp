// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderTallyService.h"

#include <algorithm>
#include <utility>

#include "recorder/Recorder.h"
#include "recorder/store/GlobPattern.h"

namespace tarn::recorder {

RecorderTallyService::RecorderTallyService(Recorder& recorder, const platform::Clock& clock,
                                           std::vector<std::string> inUse)
    : recorder_(recorder), clock_(clock) {
  setInUse(std::move(inUse));
}

void RecorderTallyService::setInUse(std::vector<std::string> inUse) {
  inUse_ = std::move(inUse);
  all_ = std::find(inUse_.begin(), inUse_.end(), "*") != inUse_.end();
  remembered_.clear();
}

bool RecorderTallyService::matchesAny(std::string_view name) const noexcept {
  return std::any_of(inUse_.begin(), inUse_.end(),
                     [name](const std::string& pattern) { return globMatches(pattern, name); });
}

bool RecorderTallyService::eventIsInUse(std::string_view name) {
  if (all_ || inUse_.empty()) return all_;
  if (name.size() > kLongestRememberedName) return matchesAny(name);
  if (const auto known = remembered_.find(name); known != remembered_.end()) return known->second;
  if (remembered_.size() >= kRememberedNames) {
    remembered_.clear();
  }
  return remembered_.emplace(name, matchesAny(name)).first->second;
}

void RecorderTallyService::sendEventLazy(std::string_view name, PayloadCallback payload) {
  recorder_.record("tally", name, payload(), plist::Dictionary(), clock_.epochSeconds());
}

}  // namespace tarn::recorder
