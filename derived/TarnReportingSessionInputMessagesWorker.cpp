#include "derived/TarnReportingSessionInputMessagesWorker.h"

#include <array>
#include <set>
#include <string>
#include <vector>

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

constexpr std::string_view kModule = TarnReportingSessionInputMessagesWorker::kClassName;
constexpr std::string_view kOperation = "createInputMessages";
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

// The format's two values and the codec's rate, which nothing here looks at again, are left out of the state.
Fields initialState(const TarnReportingSessionPreviousValues& previousValues) {
  Fields state;
  for (const Field field : {Field::ActiveDevices, Field::OperationMode, Field::InputPort, Field::Vocoder}) {
    state[field] = "unknown";
  }
  state.merge(Fields(kKeys, previousValues));
  return state;
}

class InputWalk {
 public:
  InputWalk(const TarnReportingSessionPreviousValues& previousValues, std::string_view process,
            double minimumRunningtime)
      : process_(process), minimumRunningtime_(minimumRunningtime), state_(initialState(previousValues)) {}
  void take(const plist::Dictionary& payload);
  TarnReportingSessionMessages finish();

 private:
  // For a field that the state holds from the beginning on.
  bool differsFromState(const Fields& message, Field field) const;
  void noteCodec(const Fields& message);
  void endSegment(const plist::ValueView& time);
  std::shared_ptr<TarnReportingSessionMessage> makeMessage(double seconds) const;
  std::string joinedCodecs() const;

  const std::string_view process_;
  const double minimumRunningtime_;
  TarnReportingMessageFieldReader<Field> reader_{kKeys};
  Fields state_;
  bool running_ = false;
  TarnReportingSegmentClock clock_;
  std::set<std::string> codecs_;  // "codec:rate", since the last message that came out
  TarnReportingSessionMessages derived_;
};

void InputWalk::take(const plist::Dictionary& payload) {
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
  if (running_) {
    changed = changed || differsFromState(message, Field::ActiveDevices);
    noteCodec(message);
  }
  if (wasRunning && changed) {
    endSegment(time);
  }
  if (!running_) {
    clock_.clear();
  }
  state_.merge(message);
}

bool InputWalk::differsFromState(const Fields& message, Field field) const {
  return message[field].present() && !(message[field] == state_[field]);
}

void InputWalk::noteCodec(const Fields& message) {
  if (!differsFromState(message, Field::Vocoder)) {
    return;
  }
  const std::string rate = message[Field::VocoderRate].asText();
  if (!rate.starts_with("0.")) {
    codecs_.insert(message[Field::Vocoder].asText() + ":" + rate);
  }
}

// Ends the segment at `time`, where the next one begins. The state is still that of the segment.
void InputWalk::endSegment(const plist::ValueView& time) {
  const double seconds = clock_.secondsUntil(time);
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                   "runningTime { func=%s, runningTime=%f, tarnTimestamp=%@, tarnTimestamp_double=%f, "
                   "startTarnTimestamp=%@, startTarnTimestamp_double=%f }",
                   kOperation, seconds, time, time.asDouble(), clock_.start(), clock_.start().asDouble());
  if (time.present() && clock_.started() && seconds > minimumRunningtime_ && !process_.empty()) {
    derived_.push_back(makeMessage(seconds));
    codecs_.clear();
    TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                     "added input message { func=%s, action=add, count=%lu }", kOperation, derived_.size());
  } else {
    TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                     "skipped input message, too short { func=%s, action=skip, count=%lu }", kOperation,
                     derived_.size());
  }
  clock_.startAt(time);
}

std::shared_ptr<TarnReportingSessionMessage> InputWalk::makeMessage(double seconds) const {
  const std::string lengthLabel = TarnReportingSegmentLengthLabel(seconds);
  const std::string codecs = joinedCodecs();
  std::vector<plist::Dictionary::Entry> payload{
      {keys::kHostApplicationDisplayID, process_},
      {kRunningSeconds, static_cast<float>(seconds)},
      {kRunningSecondsLabel, lengthLabel},
      {kTarnReportingMessageIndex, derived_.size() + 1},
      {kOperationMode, state_[Field::OperationMode]},
      {kInputPort, state_[Field::InputPort]},
      {kActiveDevices, state_[Field::ActiveDevices]},
  };
  if (!codecs_.empty()) {
    payload.push_back({kVocoders, codecs});
  }
  return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary::fromEntries(payload),
                                                       AudioEventCategory::Input, AudioEventType::Summary);
}

std::string InputWalk::joinedCodecs() const {
  std::string joined;
  for (const std::string& codec : codecs_) {
    joined += (joined.empty() ? "" : ",") + codec;
  }
  return joined;
}

TarnReportingSessionMessages InputWalk::finish() {
  TarnReportingNumberMessages(derived_);
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule,
                   "returning input messages { func=%s, action=return, count=%lu }", kOperation, derived_.size());
  return std::move(derived_);
}

}  // namespace

TarnReportingSessionMessages TarnReportingSessionInputMessagesWorker::createInputMessages(
    const TarnReportingSessionMessages& messages, const TarnReportingSessionPreviousValues& previousValues,
    std::string_view process, double minimumRunningtime) {
  TarnReportingLog(TarnReportingSessionCategory(), LogLevel::Debug, kModule, "entering createInputMessages %s",
                   kOperation);
  const TarnReportingSessionMessages combined =
      TarnReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaximumPauseSeconds);
  return TarnReportingDerivedMessages(combined, InputWalk(previousValues, process, minimumRunningtime));
}

std::unique_ptr<TarnReportingSessionInputMessagesWorker> TarnReportingSessionInputMessagesWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionInputMessagesWorker>(session);
}

void TarnReportingSessionInputMessagesWorker::stop() {
  TarnReportingSendDerivedMessages(
      session(), kModule, "sending input summary event for reporter %lli", [](const TarnReportingSession& owner) {
        return createInputMessages(owner.messages(), owner.previousValues(),
                                   TarnReportingUtilityRetrieveAppName(owner.configuration()),
                                   TarnReportingUtilityVolumeMinimumPlayingTime(owner.serviceType()));
      });
}

}  // namespace tarn
