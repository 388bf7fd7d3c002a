#include "derived/TarnReportingSessionVolumeMessagesWorker.h"

#include <array>
#include <string>

#include "derived/TarnReportingDerivation.h"
#include "derived/TarnReportingMessageFields.h"
#include "derived/TarnReportingSegments.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"
#include "session/TarnReportingSessionWorkerUtility.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = TarnReportingSessionVolumeMessagesWorker::kClassName;
constexpr std::string_view kOperation = "createVolumeMessages";
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

Fields initialState(const TarnReportingSessionPreviousValues& previousValues) {
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

class VolumeWalk {
 public:
  VolumeWalk(const TarnReportingSessionPreviousValues& previousValues, std::string_view process, double minimumPlaytime)
      : process_(process), minimumPlaytime_(minimumPlaytime), state_(initialState(previousValues)) {}
  void take(const plist::Dictionary& payload);
  TarnReportingSessionMessages finish();

 private:
  bool outputChanges(const Fields& message) const;
  void endSegment(const plist::ValueView& time);
  std::shared_ptr<TarnReportingSessionMessage> makeMessage(double seconds) const;

  const std::string_view process_;
  const double minimumPlaytime_;
  TarnReportingMessageFieldReader<Field> reader_{kKeys};
  Fields state_;
  bool running_ = false;
  TarnReportingSegmentClock clock_;
  TarnReportingSessionMessages derived_;
};

void VolumeWalk::take(const plist::Dictionary& payload) {
  const Fields message = reader_.read(payload);
  const plist::ValueView& time = message[Field::Timestamp];
  const bool wasRunning = state_[Field::Running].asBool();
  const bool hasEnd = message[Field::Duration].present();
  bool changed = hasEnd;
  if (const plist::ValueView& running = message[Field::Running]) {
    running_ = running.asBool();
    if (running_ && !wasRunning) {
      clock_.startAt(time);
    }
    changed = changed || !running_;
  } else {
    running_ = running_ && !hasEnd;
  }
  changed = changed || (running_ && outputChanges(message));
  if (wasRunning && changed) {
    endSegment(time);
  }
  if (!running_) {
    clock_.clear();
  }
  state_.merge(message);
}

bool VolumeWalk::outputChanges(const Fields& message) const {
  const auto changes = [&](Field field, bool (*differ)(const plist::ValueView&, const plist::ValueView&)) {
    return message[field].present() && state_[field].present() && differ(state_[field], message[field]);
  };
  return changes(Field::SelectedFormat, TarnReportingTextsDiffer) ||
         changes(Field::ActiveDevices, TarnReportingTextsDiffer) ||
         changes(Field::Spatialization, TarnReportingNumbersDiffer) ||
         changes(Field::RingerState, TarnReportingNumbersDiffer) || changes(Field::Volume, TarnReportingNumbersDiffer);
}

// Ends the segment at `time`, where the next one begins. The state is still that of the segment.
void VolumeWalk::endSegment(const plist::ValueView& time) {
  const double seconds = clock_.secondsUntil(time);
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                   "playingTime { func=%s, playingTime=%f, tarnTimestamp=%@, tarnTimestamp_double=%f, "
                   "startTarnTimestamp=%@, startTarnTimestamp_double=%f }",
                   kOperation, seconds, time, time.asDouble(), clock_.start(), clock_.start().asDouble());
  if (time.present() && clock_.started() && seconds > minimumPlaytime_ && state_[Field::Volume].present() &&
      !process_.empty()) {
    derived_.push_back(makeMessage(seconds));
    TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                     "added volume message { func=%s, action=add, count=%lu }", kOperation, derived_.size());
  } else {
    TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                     "skipped volume message, too short { func=%s, action=skip, count=%lu }", kOperation,
                     derived_.size());
  }
  clock_.startAt(time);
}

std::shared_ptr<TarnReportingSessionMessage> VolumeWalk::makeMessage(double seconds) const {
  const std::string volumeLabel = TarnReportingVolumeLabel(state_[Field::Volume].asDouble());
  const std::string lengthLabel = TarnReportingSegmentLengthLabel(seconds);
  const std::array<plist::Dictionary::Entry, 13> payload{{
      {kSelectedFormat, state_[Field::SelectedFormat]},
      {kFormatID, state_[Field::FormatID]},
      {kActiveDevices, state_[Field::ActiveDevices]},
      {keys::kHostApplicationDisplayID, process_},
      {kVolume, state_[Field::Volume]},
      {kVolumeLabel, volumeLabel},
      {kPlaySeconds, static_cast<float>(seconds)},
      {kSpatialAccessory, state_[Field::SpatialAccessory]},
      {kSpatialization, state_[Field::Spatialization]},
      {kRingerState, state_[Field::RingerState]},
      {kChannels, state_[Field::Channels]},
      {kPlaySecondsLabel, lengthLabel},
      {kTarnReportingMessageIndex, derived_.size() + 1},
  }};
  return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary::fromEntries(payload),
                                                       AudioEventCategory::Volume, AudioEventType::Summary);
}

TarnReportingSessionMessages VolumeWalk::finish() {
  TarnReportingNumberMessages(derived_);
  return std::move(derived_);
}

}  // namespace

TarnReportingSessionMessages TarnReportingSessionVolumeMessagesWorker::createVolumeMessages(
    const TarnReportingSessionMessages& messages, const TarnReportingSessionPreviousValues& previousValues,
    std::string_view process, double minimumPlaytime) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule, "entering createVolumeMessages %s",
                   kOperation);
  const TarnReportingSessionMessages combined =
      TarnReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaximumPauseSeconds);
  return TarnReportingDerivedMessages(combined, VolumeWalk(previousValues, process, minimumPlaytime));
}

std::unique_ptr<TarnReportingSessionVolumeMessagesWorker> TarnReportingSessionVolumeMessagesWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionVolumeMessagesWorker>(session);
}

void TarnReportingSessionVolumeMessagesWorker::stop() {
  TarnReportingSendDerivedMessages(
      session(), kModule, "sending volume event for reporter %lli", [](const TarnReportingSession& owner) {
        return createVolumeMessages(owner.messages(), owner.previousValues(),
                                    TarnReportingUtilityRetrieveAppName(owner.configuration()),
                                    TarnReportingUtilityVolumeMinimumPlayingTime(owner.serviceType()));
      });
}

}  // namespace tarn
