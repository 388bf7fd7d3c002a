// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSessionVolumeMessagesWorker.h"

#include <array>
#include <string>

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

constexpr double kMaximumPauseSeconds = 5;

enum class Field : std::size_t {
  Timestamp,
  Running,
  Duration,
  SelectedFormat,
  ActiveDevices,
  FormatID,
  SpatialAccessory,
  Spatialization,
  RingerState,
  Channels,
  Volume,
  Count,
};
using Fields = TarnReportingMessageFields<Field>;

const plist::Key kSelectedFormat("session_selected_format");
const plist::Key kActiveDevices("active_devices");
const plist::Key kFormatID("mFormatID");
const plist::Key kSpatialAccessory("spatial-audio-accessory-feature");
const plist::Key kSpatialization("spatializationEnabled");
const plist::Key kRingerState("ringerstate");
const plist::Key kChannels("mChannelsPerFrame");
const plist::Key kVolume("KvSessionVolume");
const plist::Key kVolumeLabel("KvSessionVolumeBucketed");
const plist::Key kPlaySeconds("play_seconds");
const plist::Key kPlaySecondsLabel("play_secondsBucketed");

// In the order of Field.
const Fields::Keys kKeys{plist::Key("tarnreporting_timestamp"),
                         plist::Key("session_output_running"),
                         plist::Key("session_duration"),
                         kSelectedFormat,
                         kActiveDevices,
                         kFormatID,
                         kSpatialAccessory,
                         kSpatialization,
                         kRingerState,
                         kChannels,
                         kVolume};

const std::array<plist::Key, 2> kKeysToCombine{kSpatialAccessory, kSpatialization};

struct VolumeRules {
  using Field = tarn::Field;

  static constexpr TarnReportingLogger kLog{TarnReportingSessionCategory,
                                            TarnReportingSessionVolumeMessagesWorker::kClassName};
  static constexpr std::string_view kOperation = "createVolumeMessages";
  static constexpr LogText kLength{
      "playingTime { func=%s, playingTime=%f, tarnTimestamp=%@, tarnTimestamp_double=%f, "
      "startTarnTimestamp=%@, startTarnTimestamp_double=%f }"};
  static constexpr LogText kAdded{"added volume message { func=%s, action=add, count=%lu }"};
  static constexpr LogText kSkipped{"skipped volume message, too short { func=%s, action=skip, count=%lu }"};

  static const Fields::Keys& keys() { return kKeys; }
  static Fields initialState(const TarnReportingSessionPreviousValues& previousValues);
  static bool cuts(const Fields& message, const Fields& state);
  static bool suffices(const Fields& state) { return state[Field::Volume].present(); }
  static std::shared_ptr<TarnReportingSessionMessage> makeMessage(const TarnReportingSegment<Field>& segment);
};

Fields VolumeRules::initialState(const TarnReportingSessionPreviousValues& previousValues) {
  Fields state;
  state[Field::SelectedFormat] = "unknown";
  state[Field::ActiveDevices] = "unknown";
  state[Field::FormatID] = "unknown";
  state[Field::SpatialAccessory] = false;
  state[Field::Spatialization] = false;
  state[Field::RingerState] = false;
  state[Field::Channels] = -1;
  state.merge(Fields(kKeys, previousValues));
  // Output counts as not running before the first message: what ran before it yields no message of its own.
  state[Field::Running] = {};
  return state;
}

bool VolumeRules::cuts(const Fields& message, const Fields& state) {
  const auto changes = [&](Field field, bool (*differ)(const plist::ValueView&, const plist::ValueView&)) {
    return message[field].present() && state[field].present() && differ(state[field], message[field]);
  };
  return changes(Field::SelectedFormat, TarnReportingTextsDiffer) ||
         changes(Field::ActiveDevices, TarnReportingTextsDiffer) ||
         changes(Field::Spatialization, TarnReportingNumbersDiffer) ||
         changes(Field::RingerState, TarnReportingNumbersDiffer) || changes(Field::Volume, TarnReportingNumbersDiffer);
}

std::shared_ptr<TarnReportingSessionMessage> VolumeRules::makeMessage(const TarnReportingSegment<Field>& segment) {
  const Fields& state = segment.state;
  const std::string volumeLabel = TarnReportingVolumeLabel(state[Field::Volume].asDouble());
  const std::string lengthLabel = TarnReportingSegmentLengthLabel(segment.seconds);
  const std::array<plist::Dictionary::Entry, 13> payload{{
      {kSelectedFormat, state[Field::SelectedFormat]},
      {kFormatID, state[Field::FormatID]},
      {kActiveDevices, state[Field::ActiveDevices]},
      {keys::kHostApplicationDisplayID, segment.process},
      {kVolume, state[Field::Volume]},
      {kVolumeLabel, volumeLabel},
      {kPlaySeconds, static_cast<float>(segment.seconds)},
      {kSpatialAccessory, state[Field::SpatialAccessory]},
      {kSpatialization, state[Field::Spatialization]},
      {kRingerState, state[Field::RingerState]},
      {kChannels, state[Field::Channels]},
      {kPlaySecondsLabel, lengthLabel},
      {kTarnReportingMessageIndex, segment.index},
  }};
  return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary::fromEntries(payload),
                                                       AudioEventCategory::Volume, AudioEventType::Summary);
}

}  // namespace

TarnReportingSessionMessageList TarnReportingSessionVolumeMessagesWorker::createVolumeMessages(
    const TarnReportingSessionMessageList& messages, const TarnReportingSessionPreviousValues& previousValues,
    std::string_view process, double minimumPlaytime) {
  VolumeRules::kLog(LogLevel::Debug, "entering createVolumeMessages %s", VolumeRules::kOperation);
  const TarnReportingCombinedMessages combined =
      TarnReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaximumPauseSeconds);
  return TarnReportingDerivedMessages(combined,
                                      TarnReportingSegmentWalk<VolumeRules>(previousValues, process, minimumPlaytime));
}

std::unique_ptr<TarnReportingSessionVolumeMessagesWorker> TarnReportingSessionVolumeMessagesWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionVolumeMessagesWorker>(session);
}

void TarnReportingSessionVolumeMessagesWorker::stop() {
  TarnReportingSendDerivedMessages(
      session(), VolumeRules::kLog, "sending volume event for reporter %lli", [](const TarnReportingSession& owner) {
        return createVolumeMessages(owner.messages(), owner.previousValues(),
                                    TarnReportingUtilityRetrieveAppName(owner.configuration()),
                                    TarnReportingUtilityVolumeMinimumPlayingTime(owner.serviceType()));
      });
}

}  // namespace tarn
