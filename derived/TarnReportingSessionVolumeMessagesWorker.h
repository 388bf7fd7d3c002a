// TarnReportingSessionVolumeMessagesWorker: when a session stops, cuts the time during which output ran into segments,
// at every change of format, devices, spatialisation, ringer or volume, and sends one summary message a segment into
// the session: how long was played, and how.
//
// It does nothing while the session runs and keeps nothing.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionVolumeMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                 public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionVolumeMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionVolumeMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  void stop();

  // The summary messages of these messages, in order. `previousValues`: the values from which the walk starts. At a
  // stop they are the session's, so they are older than the first message only under keys that none of these messages
  // has; under the others they are already the last of these. `process`: the application's name; nothing comes out
  // when it is empty. Segments of `minimumPlaytime` seconds or less are left out. Bursts of the spatial settings are
  // folded into one message, in place.
  static TarnReportingSessionMessageList createVolumeMessages(const TarnReportingSessionMessageList& messages,
                                                              const TarnReportingSessionPreviousValues& previousValues,
                                                              std::string_view process, double minimumPlaytime);
};

}  // namespace tarn
