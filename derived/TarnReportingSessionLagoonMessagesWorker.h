// TarnReportingSessionLagoonMessagesWorker: when a session stops, cuts the time during which output ran inside a shared
// group-media session into segments, at every change of a watched value, and sends one summary message a segment into
// the session. Outside internal builds these go to the analytics events and the summary file alone.
//
// It does nothing while the session runs and keeps nothing.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionLagoonMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                 public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionLagoonMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionLagoonMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  void stop();

  // The summary messages of these messages, in order, addressed as stop does. `previousValues`: the latest values from
  // before the first of them. Segments of `minimumPlaytime` seconds or less are left out.
  static TarnReportingSessionMessages createLagoonMessages(const TarnReportingSessionMessages& messages,
                                                           const TarnReportingSessionPreviousValues& previousValues,
                                                           double minimumPlaytime);
};

}  // namespace tarn
