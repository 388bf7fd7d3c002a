#include "derived/TarnReportingSessionSystemMonitorWorker.h"

#include <mutex>
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

void handleChange(TarnReportingSession& session, const plist::Dictionary& state) {
  plist::Dictionary payload = payloadOf(state);
  if (!payload.empty()) {
    session.sendMessage(std::make_shared<TarnReportingSessionMessage>(std::move(payload), AudioEventCategory::Setup,
                                                                      AudioEventType::Setup));
  }
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
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner || !systemMonitorDictionary_) {
    return true;
  }
  for (const plist::Key& feature : featureKeys_) {
    plist::Dictionary state;
    {
      // Read and observed in one step, so that no change falls between; sent without the lock.
      const std::lock_guard guard(*systemMonitorDictionary_);
      state = systemMonitorDictionary_->state(feature);
      observe(feature);
    }
    handleChange(*owner, state);
  }
  return true;
}

void TarnReportingSessionSystemMonitorWorker::observe(const plist::Key& feature) {
  // The dictionary owns the observer; neither it nor the session may live on by it.
  observers_.push_back(systemMonitorDictionary_->addObserver(
      feature, [weakSession = std::weak_ptr(session()),
                weakDictionary = std::weak_ptr(systemMonitorDictionary_)](const plist::Key& changed) {
        const std::shared_ptr<TarnReportingSession> owner = weakSession.lock();
        const std::shared_ptr<TarnReportingSystemMonitorDictionary> dictionary = weakDictionary.lock();
        if (owner && dictionary) {
          handleChange(*owner, dictionary->state(changed));
        }
      }));
}

void TarnReportingSessionSystemMonitorWorker::stop() {
  if (!systemMonitorDictionary_) {
    return;
  }
  const std::lock_guard guard(*systemMonitorDictionary_);
  for (const auto observer : observers_) {
    systemMonitorDictionary_->removeObserver(observer);
  }
  observers_.clear();
}

}  // namespace tarn
