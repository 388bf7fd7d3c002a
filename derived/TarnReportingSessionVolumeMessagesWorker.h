// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionVolumeMessagesWorker: when a session stops, cuts the time during which output ran into segments,
// at every change of format, devices, spatialisation, ringer or volume, and sends one summary message a segment into
// the session: how long was played, and how.
//
// It does nothing while the session runs and keeps nothing.
//
// A message is of the category Volume and the type Summary. It tells "play_seconds" (a single-precision number) and its
// bucket as "play_secondsBucketed", "KvSessionVolume" (0 to 1) and its bucket as "KvSessionVolumeBucketed", the
// application, "msgidx", "msgcnt", and as they were while the segment lasted: "session_selected_format",
// "active_devices" and "mFormatID" ("unknown" where nobody told), "spatial-audio-accessory-feature",
// "spatializationEnabled" and "ringerstate" (false), "mChannelsPerFrame" (-1).
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
class TarnReportingSessionVolumeMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                 public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionVolumeMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionVolumeMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Derives with the application of the session's configuration and the minimum time of its type, and sends what came
  // out, after a line at default level. Nothing when the log is empty or nothing came out.
  void stop();

  // The summary messages of these messages, in order. `previousValues`: the values from which the walk starts. At a
  // stop they are the session's, so they are older than the first message only under keys that none of these messages
  // has; under the others they are already the last of these. `process`: the application's name; nothing comes out when
  // it is empty. Segments of `minimumPlaytime` seconds or less are left out. Bursts of the spatial settings are folded
  // into one message, in place. A burst is five seconds here. A segment whose volume nobody told is left out. Output
  // that ran before the first message counts as not running, and so makes no message of its own.
  static TarnReportingSessionMessageList createVolumeMessages(const TarnReportingSessionMessageList& messages,
                                                              const TarnReportingSessionPreviousValues& previousValues,
                                                              std::string_view process, double minimumPlaytime);
};

}  // namespace tarn
