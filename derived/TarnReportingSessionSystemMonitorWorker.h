// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionSystemMonitorWorker: brings the device's settings, as the system monitor knows them, into a
// session's stream of messages: each one that is known when the session starts, and each one that changes while it
// runs.
//
// A setting is a message of category and type Setup: its value under its own name and, as "last_updated", the epoch
// seconds at which the monitor read it. To the other workers it is a message like any other.
//
// It observes the monitor's dictionary from start to stop. A worker that is dropped without a stop takes its observers
// along.
//
// Owner: the session. Threads: the server queue, on which the monitor tells of changes.
#pragma once

#include <memory>
#include <string_view>
#include <vector>

#include "derived/TarnReportingSystemMonitorDictionary.h"
#include "plist/Dictionary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// As a producer it starts after all consumers, which so get the first settings too.
class TarnReportingSessionSystemMonitorWorker : public TarnReportingSessionWorkerProtocol,
                                                public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSystemMonitorWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionSystemMonitorWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // Without a dictionary there is nothing to observe. `featureKeys`: the settings to observe, by their names in the
  // dictionary.
  TarnReportingSessionSystemMonitorWorker(std::weak_ptr<TarnReportingSession> session,
                                          std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary,
                                          std::vector<plist::Key> featureKeys);
  // Stops, so that the monitor's dictionary doesn't keep observers of sessions that are gone.
  ~TarnReportingSessionSystemMonitorWorker() override;

  // Sends the settings that are known and observes them all; always true. Reading and observing a setting are one step
  // under the dictionary's lock, so no change falls between them and none is told twice.
  bool start();
  // Sends a setting's state into the session; nothing when the state is empty. A state that says when it was read says
  // so as "last_updated", and no longer how long the system was up. Nothing when the session is gone.
  void handleChange(const plist::Dictionary& state);
  // After it no message is sent. Without a start nothing happens.
  void stop();

 private:
  // The observer holds the session weakly, since the dictionary that owns it outlives sessions.
  void observe(const plist::Key& feature);

  const std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary_;
  const std::vector<plist::Key> featureKeys_;
  std::vector<TarnReportingSystemMonitorDictionary::ObserverToken> observers_;
};

}  // namespace tarn
