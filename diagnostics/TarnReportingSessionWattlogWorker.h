// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionWattlogWorker: logs what haptics messages say about power in the device's power log, as they
// arrive: how long an engine was on, that it went on or off, and that a session left the hardware running.
//
// A message of type Wattlog says any of the three, each by a key of its own, and makes one event of each. It runs from
// the session's creation on and in single-message sessions; not where the device has no power log. Nothing is kept
// between messages.
//
// Redundant messages make no events. Owner: the session. Threads: the server queue.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// It has no start and no stop: the session notes that it runs.
class TarnReportingSessionWattlogWorker : public TarnReportingSessionWorkerProtocol,
                                          public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionWattlogWorker";

  // Nothing where the device has no power log.
  static std::unique_ptr<TarnReportingSessionWattlogWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Each of the three below, in their order. A message of another type is left alone.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

  // "EngineOnTime": without a known application or a time stamp the event goes out all the same and the lack is logged.
  // The event is "Loom_Haptics_EngineOnDuration": "EngineOnDuration", as the message has it, "ApplicationName" of the
  // session's configuration and "TimestampEnd" in epoch seconds. Each of the three does nothing without its key.
  void handleEngineOnDurationMessage(const TarnReportingSessionMessage& message) const;
  // "EngineState": whatever the application is called is taken, and a lack is not logged. The event is
  // "Loom_Haptics_ClientStatus": "Status" is 1 for the text "EngineOn" and 0 for every other value, then application
  // and time as above.
  void handleEngineStateMessage(const TarnReportingSessionMessage& message) const;
  // "Haptic_Active_Hardware_Time_Seconds": with the clients that are active, if the message names them. The event is
  // "LeakedHapticsSessionInfo", with both keys as the message has them.
  void handleLongRunningMessage(const TarnReportingSessionMessage& message) const;
};

}  // namespace tarn
