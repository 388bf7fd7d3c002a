// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionLagoonMessagesWorker: when a session stops, cuts the time during which output ran inside a shared
// group-media session into segments, at every change of a watched value, and sends one summary message a segment into
// the session. Outside internal builds these go to the analytics events and the summary file alone.
//
// It does nothing while the session runs and keeps nothing.
//
// A message is of the category Lagoon and the type Summary. It tells "play_seconds" (a single-precision number) and its
// bucket as "play_secondsBucketed", "session_selected_format", "active_devices" and "mFormatID" ("unknown" where nobody
// told), "mChannelsPerFrame" (-1 where nobody told), "msgidx" and "msgcnt".
//
// Unlike the other walks it starts with output that runs already, folds no bursts, and has its clock run only while
// output and group session both last. Owner: the session. Threads: the server queue.
#pragma once

#include <cstddef>
#include <initializer_list>
#include <memory>
#include <string_view>

#include "derived/TarnReportingMessageFields.h"
#include "plist/ValueView.h"
#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// A producer without a start: the session notes that it runs.
class TarnReportingSessionLagoonMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                 public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionLagoonMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionLagoonMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Derives with the minimum time of the session's type and sends what came out, after a line at default level. Nothing
  // when the log is empty or nothing came out.
  void stop();

  // The summary messages of these messages, in order, addressed as stop does. `previousValues`: the values from which
  // the walk starts. At a stop they are the session's, so they are older than the first message only under keys that
  // none of these messages has; under the others they are already the last of these: output that they say still runs
  // counts from the last time stamp. Segments of `minimumPlaytime` seconds or less are left out. A message with a
  // duration ends a segment too. What still runs at the end of the log makes no message.
  static TarnReportingSessionMessageList createLagoonMessages(const TarnReportingSessionMessageList& messages,
                                                              const TarnReportingSessionPreviousValues& previousValues,
                                                              double minimumPlaytime);

  // The values of a message, or of the running state, that the walk looks at. The selected format is carried along and
  // cuts nothing.
  enum class Field : std::size_t {
    Timestamp,
    Running,
    GroupSession,
    Duration,
    SelectedFormat,
    ActiveDevices,
    FormatID,
    Channels,
    Count,
  };
  using Fields = TarnReportingMessageFields<Field>;
  // Their keys in payloads, in the order of Field.
  static const Fields::Keys& fieldKeys() noexcept;

  // Whether the message changes what cuts a segment: running, group session, channels, format or devices. A value that
  // only one of the two holds is no change.
  static bool watchedFieldChangeInMessage(const Fields& message, const Fields& previous);
  // Whether both sides hold the value and it differs, read as that type.
  static bool didStringChangeInKey(Field key, const Fields& left, const Fields& right);
  // Texts by their letters, integers cut toward zero, booleans by whether the value is 0.
  static bool didIntChangeInKey(Field key, const Fields& left, const Fields& right);
  static bool didBoolChangeInKey(Field key, const Fields& left, const Fields& right);
  // The value in the first of the sources that holds it; absent when none does. It looks into that source.
  static plist::ValueView coalesceKey(Field key, std::initializer_list<const Fields*> sourceDicts);
};

}  // namespace tarn
