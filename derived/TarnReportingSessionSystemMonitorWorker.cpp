// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSessionSystemMonitorWorker.h"

#include <utility>

#include "derived/TarnReportingSystemMonitor.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

// The monitor's stamp moves aside: the intake stamps the message with the time at which it was sent.
plist::Dictionary payloadOf(const plist::Dictionary& state) {
  static const plist::Key kLastUpdated("last_updated");
  plist::Dictionary payload = state;
  if (const plist::ValueView updated = state.get(keys::kTimestamp)) {
    payload.set(kLastUpdated, updated);
    payload.remove(keys::kTimestamp);
    payload.remove(keys::kSystemUptime);
  }
  return payload;
}

}  // namespace

std::unique_ptr<TarnReportingSessionSystemMonitorWorker> TarnReportingSessionSystemMonitorWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionSystemMonitorWorker>(
      session, TarnReportingSystemMonitor::getSystemMonitorDictionary(),
      TarnReportingSystemMonitor::getSystemMonitorKeys());
}

TarnReportingSessionSystemMonitorWorker::TarnReportingSessionSystemMonitorWorker(
    std::weak_ptr<TarnReportingSession> session,
    std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary, std::vector<plist::Key> featureKeys)
    : TarnReportingSessionWorkerProtocol(std::move(session)),
      systemMonitorDictionary_(std::move(systemMonitorDictionary)),
      featureKeys_(std::move(featureKeys)) {}

TarnReportingSessionSystemMonitorWorker::~TarnReportingSessionSystemMonitorWorker() {
  stop();
}

bool TarnReportingSessionSystemMonitorWorker::start() {
  if (!systemMonitorDictionary_) return true;
  observers_.reserve(featureKeys_.size());  // one that couldn't be kept would never be removed
  for (const plist::Key& feature : featureKeys_) {
    plist::Dictionary state;
    {
      // Read and observed in one step, so that no change falls between; sent without the lock.
      const MutexLock guard(*systemMonitorDictionary_);
      state = systemMonitorDictionary_->state(feature);
      observe(feature);
    }
    handleChange(state);
  }
  return true;
}

void TarnReportingSessionSystemMonitorWorker::observe(const plist::Key& feature) {
  // The dictionary owns the observer, so the session may not live on by it; the session owns this worker, and with it
  // a share of the dictionary.
  observers_.push_back(systemMonitorDictionary_->addObserver(
      feature, [this, weakSession = std::weak_ptr(session())](const plist::Key& changed) {
        if (const std::shared_ptr<TarnReportingSession> owner = weakSession.lock()) {
          handleChange(systemMonitorDictionary_->state(changed));
        }
      }));
}

void TarnReportingSessionSystemMonitorWorker::handleChange(const plist::Dictionary& state) {
  const std::shared_ptr<TarnReportingSession> owner = session();
  plist::Dictionary payload = payloadOf(state);
  if (owner && !payload.empty()) {
    owner->sendMessage(std::make_shared<TarnReportingSessionMessage>(std::move(payload), AudioEventCategory::Setup,
                                                                     AudioEventType::Setup));
  }
}

void TarnReportingSessionSystemMonitorWorker::stop() {
  if (!systemMonitorDictionary_) return;
  const MutexLock guard(*systemMonitorDictionary_);
  for (const auto observer : std::exchange(observers_, {})) {
    systemMonitorDictionary_->removeObserver(observer);
  }
}

}  // namespace tarn
