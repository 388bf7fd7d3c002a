// TarnReportingSessionLagoonMessagesWorker: when a session stops, cuts the time during which output ran inside a shared
// group-media session into segments, at every change of a watched value, and sends one summary message a segment into
// the session. Outside internal builds these go to the analytics events and the summary file alone.
//
// It does nothing while the session runs and keeps nothing.
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

class TarnReportingSessionLagoonMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                 public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionLagoonMessagesWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionLagoonMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  void stop();

  // The summary messages of these messages, in order, addressed as stop does. `previousValues`: the values from which
  // the walk starts. At a stop they are the session's, so they are older than the first message only under keys that
  // none of these messages has; under the others they are already the last of these: output that they say still runs
  // counts from the last time stamp. Segments of `minimumPlaytime` seconds or less are left out.
  static TarnReportingSessionMessageList createLagoonMessages(const TarnReportingSessionMessageList& messages,
                                                              const TarnReportingSessionPreviousValues& previousValues,
                                                              double minimumPlaytime);

  // The values of a message, or of the running state, that the walk looks at.
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

  // Whether the message changes what cuts a segment: running, group session, channels, format or devices.
  static bool watchedFieldChangeInMessage(const Fields& message, const Fields& previous);
  // Whether both sides hold the value and it differs, read as that type.
  static bool didStringChangeInKey(Field key, const Fields& left, const Fields& right);
  static bool didIntChangeInKey(Field key, const Fields& left, const Fields& right);
  static bool didBoolChangeInKey(Field key, const Fields& left, const Fields& right);
  // The value in the first of the sources that holds it; absent when none does.
  static plist::ValueView coalesceKey(Field key, std::initializer_list<const Fields*> sourceDicts);
};

}  // namespace tarn
