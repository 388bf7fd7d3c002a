// SPDX-License-Identifier: Apache-2.0
#include "bench/SessionStream.h"

#include <initializer_list>
#include <vector>

#include "plist/Dictionary.h"

namespace tarn::bench {

namespace {

using Entry = plist::Dictionary::Entry;
using Record = std::shared_ptr<TarnReportingSessionMessage>;

constexpr double kOrdinarySeconds = 0.25;  // between two messages
constexpr double kSegmentSeconds = 1;
constexpr std::uint64_t kSongMessages = 200;

const plist::Key kTimestamp("tarnreporting_timestamp");
const plist::Key kSystemUptime("systemuptime_sec");
const plist::Key kProcessUptime("processuptime_ms");
const plist::Key kOutputRunning("session_output_running");
const plist::Key kInputRunning("session_input_running");
const plist::Key kDuration("session_duration");
const plist::Key kVolume("KvSessionVolume");
const plist::Key kDevices("active_devices");
const plist::Key kFormat("session_selected_format");
const plist::Key kFormatID("mFormatID");
const plist::Key kChannels("mChannelsPerFrame");
const plist::Key kRinger("ringerstate");
const plist::Key kSpatialAccessory("spatial-audio-accessory-feature");
const plist::Key kSpatialization("spatializationEnabled");
const plist::Key kVocoder("vp_config_primary_vocoder");
const plist::Key kVocoderRate("vp_config_primary_vocoderFs");
const plist::Key kOperationMode("vp_config_operation_mode");
const plist::Key kInputPort("vp_config_input_port");
const plist::Key kGroup("lagoon_session");
const plist::Key kMembers("lagoon_member_count");
const plist::Key kUnderruns("underrun_count");
const plist::Key kPackets("packet_count");
const plist::Key kToken("session_token");

// A message with the four values that differ from message to message and with these.
Record makeRecord(AudioEventCategory category, AudioEventType type, double time, std::uint64_t number,
                  std::initializer_list<Entry> more) {
  std::vector<Entry> entries{{kTimestamp, time},
                             {kSystemUptime, static_cast<std::int64_t>(time) % 1'000'000},
                             {kProcessUptime, 20'000 + number},
                             {category == AudioEventCategory::Input ? kPackets : kUnderruns, 70'000 + number}};
  for (const Entry& entry : more) {
    entries.push_back(entry);
  }
  return std::make_shared<TarnReportingSessionMessage>(plist::Dictionary::fromEntries(entries), category, type);
}

// A state of the output: two values, and how it plays.
Record makeOutputState(AudioEventType type, double time, std::uint64_t number, const Entry& first,
                       const Entry& second) {
  return makeRecord(AudioEventCategory::Playback, type, time, number,
                    {first,
                     second,
                     {kDevices, "BuiltInSpeaker"},
                     {kFormat, "lossless"},
                     {kFormatID, "alac"},
                     {kChannels, 2},
                     {kRinger, true},
                     {kToken, "9f2c1d7e"}});
}

Record makeVolumeState(AudioEventType type, double time, std::uint64_t number, double volume) {
  return makeOutputState(type, time, number, {kOutputRunning, true}, {kVolume, volume});
}

Record makeSpatialState(double time, std::uint64_t number, const plist::Key& key, bool value) {
  return makeOutputState(AudioEventType::State, time, number, {key, value}, {kOutputRunning, true});
}

Record makeInputState(double time, std::uint64_t number, bool running) {
  return makeRecord(AudioEventCategory::Input, AudioEventType::State, time, number,
                    {{kInputRunning, running},
                     {kDevices, "BuiltInSpeaker"},
                     {kVocoder, "opus"},
                     {kVocoderRate, number % 3 == 0 ? "16000.0" : "24000.0"},
                     {kOperationMode, "chat"},
                     {kInputPort, "BuiltInMic"},
                     {kToken, "9f2c1d7e"}});
}

Record makeOrdinary(std::uint64_t number, double startSeconds) {
  const std::uint64_t place = number % kSongMessages;
  double time = startSeconds + static_cast<double>(number) * kOrdinarySeconds;
  if (place % 50 == 30) {
    time -= 2.5 * kOrdinarySeconds;  // it was overtaken by two others
  }
  if (place == kSongMessages - 1) {
    return makeRecord(AudioEventCategory::Playback, AudioEventType::Stop, time, number,
                      {{kOutputRunning, false}, {kDuration, 49.75}, {kToken, "9f2c1d7e"}});
  }
  if (place == 100 || place == 101) {
    return makeSpatialState(time, number, place == 100 ? kSpatialAccessory : kSpatialization,
                            number / kSongMessages % 2 == 0);
  }
  if (place % 10 == 5) return makeInputState(time, number, place > 20 && place < 180);
  if (place % 20 == 8) {
    return makeRecord(AudioEventCategory::Lagoon, AudioEventType::State, time, number,
                      {{kGroup, place > 40 && place < 150 ? 1 : 0}, {kMembers, 3}, {kToken, "9f2c1d7e"}});
  }
  const double volume = 0.25 + static_cast<double>(place / 50) / 8;
  return makeVolumeState(place == 0 ? AudioEventType::Start : AudioEventType::State, time, number, volume);
}

}  // namespace

Record makeStreamMessage(Stream stream, std::uint64_t number, double startSeconds) {
  switch (stream) {
    case Stream::Ordinary:
      return makeOrdinary(number, startSeconds);
    case Stream::MergingPairs:
      return makeSpatialState(startSeconds + static_cast<double>(number) * kOrdinarySeconds, number,
                              number % 2 == 0 ? kSpatialAccessory : kSpatialization, true);
    case Stream::EndingSegments:
      return makeVolumeState(AudioEventType::State, startSeconds + static_cast<double>(number) * kSegmentSeconds,
                             number, number / 2 % 2 == 0 ? 0.25 : 0.5);
  }
  return nullptr;
}

}  // namespace tarn::bench
