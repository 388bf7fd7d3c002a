// SPDX-License-Identifier: Apache-2.0
#include "bench/Message.h"

#include <chrono>

#include "plist/Key.h"
#include "wire/Encoder.h"

namespace tarn::bench {

namespace {

constexpr std::uint32_t kPlayback = 4;
constexpr std::uint16_t kStart = 1;
constexpr double kSecondsBetween = 0.0009765625;

const plist::Key kTimestamp("tarnreporting_timestamp");
const plist::Key kSystemUptime("systemuptime_sec");
const plist::Key kProcessUptime("processuptime_ms");
const plist::Key kVolume("volume_scalar_value");
const plist::Key kUnderruns("underrun_count");

// Stamps that are a year old would be replaced by the service.
double stamp(std::uint64_t moment) {
  static const double start =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  return start + static_cast<double>(moment) * kSecondsBetween;
}

double systemUptime(std::uint64_t moment) {
  return 86400.5 + static_cast<double>(moment) * kSecondsBetween;
}

double volume(std::uint64_t content) {
  return static_cast<double>(content % 1024) / 1024;
}

}  // namespace

plist::Dictionary makeMessage(std::uint64_t content, std::uint64_t moment) {
  return {{"tarnreporting_timestamp", stamp(moment)},
          {"systemuptime_sec", systemUptime(moment)},
          {"processuptime_ms", 20'000 + moment},
          {"client_application", "sys.oxbow.music.player"},
          {"audio_route", "BuiltInSpeaker"},
          {"stream_sample_rate_hz", 48000.0},
          {"buffer_frame_count", 512},
          {"voice_processing", false},
          {"volume_scalar_value", volume(content)},
          {"underrun_count", kFirstCount + content},
          {"codec_name", "lossless"},
          {"session_token", "9f2c1d7e"}};
}

plist::Dictionary makeLoggedMessage(std::uint64_t content, std::uint64_t moment) {
  plist::Dictionary message = makeMessage(content, moment);
  message.set("audiotag", "PlaybackStart");
  message.set("HostApplicationDisplayID", "sys.oxbow.music");
  return message;
}

wire::Request makeRequest() {
  wire::Request request;
  request.operation = wire::Operation::SendMessage;
  request.dictionary = makeMessage(0);
  request.category = kPlayback;
  request.type = kStart;
  request.reporterIDs = std::vector<std::int64_t>{kReporterID};
  return request;
}

void renumber(wire::Request& request, std::uint64_t number) {
  plist::Dictionary& message = request.dictionary;
  message.set(kTimestamp, stamp(number));
  message.set(kSystemUptime, systemUptime(number));
  message.set(kProcessUptime, 20'000 + number);
  message.set(kVolume, volume(number));
  message.set(kUnderruns, kFirstCount + number);
}

std::string makeFrame(std::uint64_t number) {
  wire::Request request = makeRequest();
  renumber(request, number);
  std::string frame;
  wire::Encoder(frame).request(123'456, request);
  return frame;
}

std::string makeCbor(std::uint64_t number) {
  std::string bytes;
  wire::appendValue(bytes, makeMessage(number));
  return bytes;
}

}  // namespace tarn::bench
