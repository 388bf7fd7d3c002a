// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionInputMessagesWorker: when a session stops, cuts the time during which input ran into segments, at
// every change of the devices, and sends one summary message a segment into the session: how long was recorded, with
// which voice processing and which voice codecs.
//
// It does nothing while the session runs and keeps nothing.
//
// A message is of the category Input and the type Summary. It tells "inputrunning_seconds" (a single-precision number)
// and its bucket as "inputrunning_secondsBucketed", "vp_config_operation_mode", "vp_config_input_port" and
// "active_devices" of the segment ("unknown" where nobody told), "vocoders" as "codec:rate,codec:rate" in alphabetical
// order, the application, "msgidx" and "msgcnt".
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// A producer without a start: the session notes that it runs.
class TarnReportingSessionInputMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionInputMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionInputMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Derives with the application of the session's configuration and the minimum time of its type, and sends what came
  // out, after a line at default level. Nothing when the log is empty or nothing came out.
  void stop();

  // The summary messages of these messages, in order. `previousValues`: the values from which the walk starts. At a
  // stop they are the session's, so they are older than the first message only under keys that none of these messages
  // has; under the others they are already the last of these. `process`: the application's name; nothing comes out when
  // it is empty. Segments of `minimumRunningtime` seconds or less are left out; the codecs seen in them count for the
  // next message. Bursts of the spatial settings are folded into one message, in place. A burst is two seconds here.
  // Only a change of the devices cuts; a codec counts when it differs from the last one while input runs, unless its
  // rate begins with "0.", which is no rate of a codec in use.
  static TarnReportingSessionMessageList createInputMessages(const TarnReportingSessionMessageList& messages,
                                                             const TarnReportingSessionPreviousValues& previousValues,
                                                             std::string_view process, double minimumRunningtime);
};

}  // namespace tarn
