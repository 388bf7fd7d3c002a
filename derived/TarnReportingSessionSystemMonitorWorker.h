// TarnReportingSessionSystemMonitorWorker: brings the device's settings, as the system monitor knows them, into a
// session's stream of messages: each one that is known when the session starts, and each one that changes while it
// runs.
//
// A setting is a message of category and type Setup: its value under its own name and, as "last_updated", the epoch
// seconds at which the monitor read it. To the other workers it is a message like any other.
//
// It observes the monitor's dictionary from start to stop. A worker that is dropped without a stop takes its observers
// along.
#pragma once

#include <memory>
#include <string_view>
#include <vector>

#include "derived/TarnReportingSystemMonitorDictionary.h"
#include "plist/Dictionary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionSystemMonitorWorker : public TarnReportingSessionWorkerProtocol,
                                                public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSystemMonitorWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionSystemMonitorWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // Without a dictionary there is nothing to observe.
  TarnReportingSessionSystemMonitorWorker(std::weak_ptr<TarnReportingSession> session,
                                          std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary,
                                          std::vector<plist::Key> featureKeys);
  ~TarnReportingSessionSystemMonitorWorker() override;

  // Sends the settings that are known and observes them all; always true.
  bool start();
  // Sends a setting's state into the session; nothing when the state is empty. A state that says when it was read says
  // so as "last_updated", and no longer how long the system was up.
  void handleChange(const plist::Dictionary& state);
  // After it no message is sent.
  void stop();

 private:
  void observe(const plist::Key& feature);

  const std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary_;
  const std::vector<plist::Key> featureKeys_;
  std::vector<TarnReportingSystemMonitorDictionary::ObserverToken> observers_;
};

}  // namespace tarn
