// TarnReportingSessionInputMessagesWorker: when a session stops, cuts the time during which input ran into segments, at
// every change of the devices, and sends one summary message a segment into the session: how long was recorded, with
// which voice processing and which voice codecs.
//
// It does nothing while the session runs and keeps nothing.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionInputMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionInputMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionInputMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  void stop();

  // The summary messages of these messages, in order. `previousValues`: the values from which the walk starts. At a
  // stop they are the session's, so they are older than the first message only under keys that none of these messages
  // has; under the others they are already the last of these. `process`: the application's name; nothing comes out
  // when it is empty. Segments of `minimumRunningtime` seconds or less are left out; the codecs seen in them count for
  // the next message. Bursts of the spatial settings are folded into one message, in place.
  static TarnReportingSessionMessageList createInputMessages(const TarnReportingSessionMessageList& messages,
                                                             const TarnReportingSessionPreviousValues& previousValues,
                                                             std::string_view process, double minimumRunningtime);
};

}  // namespace tarn
