// TarnReportingSessionWattlogWorker: logs what haptics messages say about power in the device's power log, as they
// arrive: how long an engine was on, that it went on or off, and that a session left the hardware running.
//
// A message of type Wattlog says any of the three, each by a key of its own, and makes one event of each. It runs from
// the session's creation on and in single-message sessions; not where the device has no power log. Nothing is kept
// between messages.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionWattlogWorker : public TarnReportingSessionWorkerProtocol,
                                          public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionWattlogWorker";

  static std::unique_ptr<TarnReportingSessionWattlogWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Each of the three below, in their order. A message of another type is left alone.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

  // "EngineOnTime": without a known application or a time stamp the event goes out all the same and the lack is logged.
  void handleEngineOnDurationMessage(const TarnReportingSessionMessage& message) const;
  // "EngineState": whatever the application is called is taken, and a lack is not logged.
  void handleEngineStateMessage(const TarnReportingSessionMessage& message) const;
  // "Haptic_Active_Hardware_Time_Seconds": with the clients that are active, if the message names them.
  void handleLongRunningMessage(const TarnReportingSessionMessage& message) const;
};

}  // namespace tarn
