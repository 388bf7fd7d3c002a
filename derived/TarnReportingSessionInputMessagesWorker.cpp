// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSessionInputMessagesWorker.h"

#include <array>
#include <set>
#include <string>
#include <vector>

#include "derived/TarnReportingDerivation.h"
#include "derived/TarnReportingMessageFields.h"
#include "derived/TarnReportingSegmentWalk.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"
#include "session/TarnReportingSessionWorkerUtility.h"

namespace tarn {

namespace {

constexpr double kMaximumPauseSeconds = 2;

enum class Field : std::size_t {
  Timestamp,
  Running,
  Duration,
  ActiveDevices,
  Vocoder,
  VocoderRate,
  OperationMode,
  InputPort,
  Count,
};
using Fields = TarnReportingMessageFields<Field>;

const plist::Key kActiveDevices("active_devices");
const plist::Key kOperationMode("vp_config_operation_mode");
const plist::Key kInputPort("vp_config_input_port");
const plist::Key kRunningSeconds("inputrunning_seconds");
const plist::Key kRunningSecondsLabel("inputrunning_secondsBucketed");
const plist::Key kVocoders("vocoders");

// In the order of Field.
const Fields::Keys kKeys{plist::Key("tarnreporting_timestamp"),
                         plist::Key("session_input_running"),
                         plist::Key("session_duration"),
                         kActiveDevices,
                         plist::Key("vp_config_primary_vocoder"),
                         plist::Key("vp_config_primary_vocoderFs"),
                         kOperationMode,
                         kInputPort};

// The spatial settings, here too.
const std::array<plist::Key, 2> kKeysToCombine{plist::Key("spatial-audio-accessory-feature"),
                                               plist::Key("spatializationEnabled")};

class InputRules {
 public:
  using Field = tarn::Field;

  static constexpr TarnReportingLogger kLog{TarnReportingSessionCategory,
                                            TarnReportingSessionInputMessagesWorker::kClassName};
  static constexpr std::string_view kOperation = "createInputMessages";
  static constexpr LogText kLength{
      "runningTime { func=%s, runningTime=%f, tarnTimestamp=%@, tarnTimestamp_double=%f, "
      "startTarnTimestamp=%@, startTarnTimestamp_double=%f }"};
  static constexpr LogText kAdded{"added input message { func=%s, action=add, count=%lu }"};
  static constexpr LogText kSkipped{"skipped input message, too short { func=%s, action=skip, count=%lu }"};

  static const Fields::Keys& keys() { return kKeys; }
  static Fields initialState(const TarnReportingSessionPreviousValues& previousValues);
  bool cuts(const Fields& message, const Fields& state);
  static bool suffices(const Fields&) { return true; }
  std::shared_ptr<TarnReportingSessionMessage> makeMessage(const TarnReportingSegment<Field>& segment);

 private:
  std::string joinedCodecs() const;

  std::set<std::string> codecs_;  // "codec:rate", since the last message that came out
};

// The format's two values and the codec's rate, which nothing here looks at again, are left out of the state.
Fields InputRules::initialState(const TarnReportingSessionPreviousValues& previousValues) {
  Fields state;
  for (const Field field : {Field::ActiveDevices, Field::OperationMode, Field::InputPort, Field::Vocoder}) {
    state[field] = "unknown";
  }
  state.merge(Fields(kKeys, previousValues));
  return state;
}

// Notes the codec, too: each that was seen while input ran is told.
bool InputRules::cuts(const Fields& message, const Fields& state) {
  // For a field that the state holds from the beginning on.
  const auto changes = [&](Field field) { return message[field].present() && !(message[field] == state[field]); };
  if (changes(Field::Vocoder)) {
    const std::string rate = message[Field::VocoderRate].asText();
    if (!rate.starts_with("0.")) {
      codecs_.insert(message[Field::Vocoder].asText() + ":" + rate);
    }
  }
  return changes(Field::ActiveDevices);
}

std::shared_ptr<TarnReportingSessionMessage> InputRules::makeMessage(const TarnReportingSegment<Field>& segment) {
  const std::string lengthLabel = TarnReportingSegmentLengthLabel(segment.seconds);
  const std::string codecs = joinedCodecs();
  std::vector<plist::Dictionary::Entry> payload{
      {keys::kHostApplicationDisplayID, segment.process},
      {kRunningSeconds, static_cast<float>(segment.seconds)},
      {kRunningSecondsLabel, lengthLabel},
      {kTarnReportingMessageIndex, segment.index},
      {kOperationMode, segment.state[Field::OperationMode]},
      {kInputPort, segment.state[Field::InputPort]},
      {kActiveDevices, segment.state[Field::ActiveDevices]},
  };
  if (!codecs_.empty()) {
    payload.push_back({kVocoders, codecs});
  }
  codecs_.clear();
  return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary::fromEntries(payload),
                                                       AudioEventCategory::Input, AudioEventType::Summary);
}

std::string InputRules::joinedCodecs() const {
  std::string joined;
  for (const std::string& codec : codecs_) {
    joined += (joined.empty() ? "" : ",") + codec;
  }
  return joined;
}

}  // namespace

TarnReportingSessionMessageList TarnReportingSessionInputMessagesWorker::createInputMessages(
    const TarnReportingSessionMessageList& messages, const TarnReportingSessionPreviousValues& previousValues,
    std::string_view process, double minimumRunningtime) {
  InputRules::kLog(LogLevel::Debug, "entering createInputMessages %s", InputRules::kOperation);
  const TarnReportingCombinedMessages combined =
      TarnReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaximumPauseSeconds);
  TarnReportingSessionMessageList derived = TarnReportingDerivedMessages(
      combined, TarnReportingSegmentWalk<InputRules>(previousValues, process, minimumRunningtime));
  InputRules::kLog(LogLevel::Debug, "returning input messages { func=%s, action=return, count=%lu }",
                   InputRules::kOperation, derived.size());
  return derived;
}

std::unique_ptr<TarnReportingSessionInputMessagesWorker> TarnReportingSessionInputMessagesWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionInputMessagesWorker>(session);
}

void TarnReportingSessionInputMessagesWorker::stop() {
  TarnReportingSendDerivedMessages(session(), InputRules::kLog, "sending input summary event for reporter %lli",
                                   [](const TarnReportingSession& owner) {
                                     return createInputMessages(
                                         owner.messages(), owner.previousValues(),
                                         TarnReportingUtilityRetrieveAppName(owner.configuration()),
                                         TarnReportingUtilityVolumeMinimumPlayingTime(owner.serviceType()));
                                   });
}

}  // namespace tarn
