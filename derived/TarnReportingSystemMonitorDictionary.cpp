// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSystemMonitorDictionary.h"

#include <algorithm>
#include <utility>

namespace tarn {

void TarnReportingSystemMonitorDictionary::lock() const {
  mutex_.lock();
}

void TarnReportingSystemMonitorDictionary::unlock() const {
  mutex_.unlock();
}

plist::Dictionary TarnReportingSystemMonitorDictionary::state(const plist::Key& feature) const {
  const MutexLock guard(mutex_);
  const plist::ValueView state = states_.get(feature);
  return state.kind() == plist::Kind::Dictionary ? state.dictionary() : plist::Dictionary();
}

plist::Dictionary TarnReportingSystemMonitorDictionary::states() const {
  const MutexLock guard(mutex_);
  return states_;
}

TarnReportingSystemMonitorDictionary::ObserverToken TarnReportingSystemMonitorDictionary::addObserver(
    const plist::Key& feature, Observer observer) {
  const MutexLock guard(mutex_);
  const ObserverToken token{++lastToken_};
  observations_.push_back(std::make_shared<Observation>(Observation{token, feature, std::move(observer)}));
  return token;
}

void TarnReportingSystemMonitorDictionary::removeObserver(ObserverToken token) {
  std::shared_ptr<Observation> removed;  // dies after the lock: what it holds may be anything
  const MutexLock guard(mutex_);
  const auto found = std::find_if(observations_.begin(), observations_.end(),
                                  [token](const auto& observation) { return observation->token == token; });
  if (found != observations_.end()) {
    removed = std::move(*found);
    removed->removed = true;
    observations_.erase(found);
  }
}

void TarnReportingSystemMonitorDictionary::store(const plist::Key& feature, const plist::Dictionary& state) {
  const MutexLock guard(mutex_);
  states_.set(feature, state);
}

void TarnReportingSystemMonitorDictionary::notifyObservers(const plist::Key& feature) {
  std::vector<std::shared_ptr<Observation>> observations;
  {
    const MutexLock guard(mutex_);
    std::copy_if(observations_.begin(), observations_.end(), std::back_inserter(observations),
                 [&feature](const auto& observation) { return observation->feature == feature; });
  }
  const auto stillWanted = [this](const Observation& observation) {
    const MutexLock guard(mutex_);
    return !observation.removed;
  };
  for (const auto& observation : observations) {
    if (stillWanted(*observation)) {
      observation->observer(feature);
    }
  }
}

}  // namespace tarn
