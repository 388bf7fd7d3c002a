// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSessionLagoonMessagesWorker.h"

#include <array>
#include <string>

#include "derived/TarnReportingDerivation.h"
#include "derived/TarnReportingSegments.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"

namespace tarn {

namespace {

using Worker = TarnReportingSessionLagoonMessagesWorker;
using Field = Worker::Field;
using Fields = Worker::Fields;

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, Worker::kClassName};
constexpr std::string_view kOperation = "createLagoonMessages";

const plist::Key kSelectedFormat("session_selected_format");
const plist::Key kActiveDevices("active_devices");
const plist::Key kFormatID("mFormatID");
const plist::Key kChannels("mChannelsPerFrame");
const plist::Key kPlaySeconds("play_seconds");
const plist::Key kPlaySecondsLabel("play_secondsBucketed");

// In the order of Field.
const Fields::Keys kKeys{plist::Key("tarnreporting_timestamp"),
                         plist::Key("session_output_running"),
                         plist::Key("lagoon_session"),
                         plist::Key("session_duration"),
                         kSelectedFormat,
                         kActiveDevices,
                         kFormatID,
                         kChannels};

Fields defaultValues() {
  Fields defaults;
  defaults[Field::SelectedFormat] = "unknown";
  defaults[Field::ActiveDevices] = "unknown";
  defaults[Field::FormatID] = "unknown";
  defaults[Field::Channels] = -1;
  return defaults;
}

bool bothHold(Field key, const Fields& left, const Fields& right) {
  return left[key].present() && right[key].present();
}

bool isInGroup(const plist::ValueView& groupSession) {
  return groupSession.asInt64() == 1;
}

class LagoonWalk {
 public:
  LagoonWalk(const TarnReportingSessionPreviousValues& previousValues, double minimumPlaytime);
  void take(const plist::Dictionary& payload);
  void keep();
  TarnReportingSessionMessageList finish();

 private:
  void endSegment(const plist::ValueView& time);
  std::shared_ptr<TarnReportingSessionMessage> makeMessage(double seconds) const;

  const double minimumPlaytime_;
  const Fields defaults_ = defaultValues();
  TarnReportingMessageFieldReader<Field> reader_{kKeys};
  Fields state_;
  Fields::Kept kept_;
  bool running_;
  bool inGroup_;
  TarnReportingSegmentClock clock_;
  TarnReportingSessionMessageList derived_;
};

LagoonWalk::LagoonWalk(const TarnReportingSessionPreviousValues& previousValues, double minimumPlaytime)
    : minimumPlaytime_(minimumPlaytime),
      state_(kKeys, previousValues),
      running_(state_[Field::Running].asBool()),
      inGroup_(isInGroup(state_[Field::GroupSession])) {
  if (running_ && inGroup_) {
    clock_.startAt(state_[Field::Timestamp]);
  }
}

void LagoonWalk::take(const plist::Dictionary& payload) {
  const Fields message = reader_.read(payload);
  const plist::ValueView& time = message[Field::Timestamp];
  const plist::ValueView& group = message[Field::GroupSession];
  const plist::ValueView& running = message[Field::Running];
  const bool wasRunning = state_[Field::Running].asBool();
  const bool wasGroup = isInGroup(state_[Field::GroupSession]);
  const bool hasEnd = message[Field::Duration].present();

  inGroup_ = group.present() ? isInGroup(group) : inGroup_;
  running_ = running.present() ? running.asBool() : running_;
  if (inGroup_ && running_ && !clock_.started()) {
    clock_.startAt(time);
  }
  inGroup_ = inGroup_ && !hasEnd;
  running_ = running_ && !hasEnd;

  const bool closes = hasEnd || (wasRunning && wasGroup && Worker::watchedFieldChangeInMessage(message, state_));
  if (closes && clock_.started()) {
    endSegment(time);
  }
  state_.merge(message);
}

// Ends the segment at `time`, where the next one begins if output still runs in the group. The state is still that of
// the segment.
void LagoonWalk::endSegment(const plist::ValueView& time) {
  const double seconds = clock_.secondsUntil(time);
  kLog(LogLevel::Debug,
       "playingTime { func=%s, playingTime=%f, tarnTimestamp=%@, tarnTimestamp_double=%f, "
       "startTarnTimestamp=%@, startTarnTimestamp_double=%f }",
       kOperation, seconds, time, time.asDouble(), clock_.start(), clock_.start().asDouble());
  if (seconds > minimumPlaytime_ && isInGroup(state_[Field::GroupSession])) {
    derived_.append(makeMessage(seconds));
    kLog(LogLevel::Debug, "added lagoon message { func=%s, action=add, count=%lu }", kOperation, derived_.size());
  } else {
    kLog(LogLevel::Debug,
         "skipped lagoon message, too short or not actually an lagoon session { func=%s, action=skip, "
         "count=%lu }",
         kOperation, derived_.size());
  }
  if (inGroup_ && running_) {
    clock_.startAt(time);
  } else {
    clock_.clear();
  }
}

std::shared_ptr<TarnReportingSessionMessage> LagoonWalk::makeMessage(double seconds) const {
  const std::string lengthLabel = TarnReportingSegmentLengthLabel(seconds);
  const std::array<plist::Dictionary::Entry, 7> payload{{
      {kSelectedFormat, Worker::coalesceKey(Field::SelectedFormat, {&state_, &defaults_})},
      {kActiveDevices, Worker::coalesceKey(Field::ActiveDevices, {&state_, &defaults_})},
      {kFormatID, Worker::coalesceKey(Field::FormatID, {&state_, &defaults_})},
      {kChannels, Worker::coalesceKey(Field::Channels, {&state_, &defaults_})},
      {kPlaySeconds, static_cast<float>(seconds)},
      {kPlaySecondsLabel, lengthLabel},
      {kTarnReportingMessageIndex, derived_.size() + 1},
  }};
  auto message = std::make_shared<TarnReportingSessionMessage>(plist::Dictionary::fromEntries(payload),
                                                               AudioEventCategory::Lagoon, AudioEventType::Summary);
  if (!TarnReportingUtilityIsInternalBuild()) {
    message->setDestinationWorkers({"TarnReportingSessionTallyWorker", "TarnReportingSessionSummaryJsonFileWorker"});
  }
  return message;
}

void LagoonWalk::keep() {
  state_.keepIn(kept_);
  clock_.keep();
}

TarnReportingSessionMessageList LagoonWalk::finish() {
  TarnReportingNumberMessages(derived_);
  // A list is made, which may fail, and then moved into: making one of another can't tell that there was no memory.
  TarnReportingSessionMessageList finished;
  finished = std::move(derived_);
  return finished;
}

}  // namespace

const Fields::Keys& TarnReportingSessionLagoonMessagesWorker::fieldKeys() noexcept {
  return kKeys;
}

bool TarnReportingSessionLagoonMessagesWorker::watchedFieldChangeInMessage(const Fields& message,
                                                                           const Fields& previous) {
  return didBoolChangeInKey(Field::Running, message, previous) ||
         didIntChangeInKey(Field::GroupSession, message, previous) ||
         didIntChangeInKey(Field::Channels, message, previous) ||
         didStringChangeInKey(Field::FormatID, message, previous) ||
         didStringChangeInKey(Field::ActiveDevices, message, previous);
}

bool TarnReportingSessionLagoonMessagesWorker::didStringChangeInKey(Field key, const Fields& left,
                                                                    const Fields& right) {
  return bothHold(key, left, right) && TarnReportingTextsDiffer(left[key], right[key]);
}

bool TarnReportingSessionLagoonMessagesWorker::didIntChangeInKey(Field key, const Fields& left, const Fields& right) {
  return bothHold(key, left, right) && left[key].asInt64() != right[key].asInt64();
}

bool TarnReportingSessionLagoonMessagesWorker::didBoolChangeInKey(Field key, const Fields& left, const Fields& right) {
  return bothHold(key, left, right) && left[key].asBool() != right[key].asBool();
}

plist::ValueView TarnReportingSessionLagoonMessagesWorker::coalesceKey(
    Field key, std::initializer_list<const Fields*> sourceDicts) {
  for (const Fields* source : sourceDicts) {
    if ((*source)[key].present()) return (*source)[key];
  }
  return {};
}

TarnReportingSessionMessageList TarnReportingSessionLagoonMessagesWorker::createLagoonMessages(
    const TarnReportingSessionMessageList& messages, const TarnReportingSessionPreviousValues& previousValues,
    double minimumPlaytime) {
  kLog(LogLevel::Debug, "entering createLagoonMessages %s", kOperation);
  return TarnReportingDerivedMessages(messages, LagoonWalk(previousValues, minimumPlaytime));
}

std::unique_ptr<TarnReportingSessionLagoonMessagesWorker> TarnReportingSessionLagoonMessagesWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionLagoonMessagesWorker>(session);
}

void TarnReportingSessionLagoonMessagesWorker::stop() {
  TarnReportingSendDerivedMessages(
      session(), kLog, "sending lagoon event for reporter %lli", [](const TarnReportingSession& owner) {
        return createLagoonMessages(owner.messages(), owner.previousValues(),
                                    TarnReportingUtilityVolumeMinimumPlayingTime(owner.serviceType()));
      });
}

}  // namespace tarn
