// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/StreamMessages.h"

#include <tarnreporting_messages.hpp>
#include <utility>

namespace tarn::streams {

namespace {

using tarnreporting::Category;
using tarnreporting::Type;
namespace keys = tarnreporting::keys;

constexpr double kSecond = 1e9;
constexpr std::size_t kMostErrorText = 256;

PostMessage message(const Occasion& occasion, Category category, Type type) {
  PostMessage made{
      occasion.stream, static_cast<std::uint32_t>(category), static_cast<std::uint16_t>(type), occasion.at, {}};
  if (occasion.run > 0) {
    made.fields.push_back({keys::kStreamRun, occasion.run});
  }
  return made;
}

Category sideOf(const Occasion& occasion) {
  return occasion.isOutput ? Category::Playback : Category::Input;
}

std::string_view runningKey(const Occasion& occasion) {
  return occasion.isOutput ? keys::kSessionOutputRunning : keys::kSessionInputRunning;
}

void addText(Fields& fields, std::string_view key, const std::string& text) {
  if (!text.empty() && text.find_first_not_of(',') != std::string::npos) {
    fields.push_back({key, text});
  }
}

void addSound(Fields& fields, const StreamFacts& facts) {
  if (facts.sound) {
    fields.push_back({keys::kKvSessionVolume, facts.sound->muted ? 0.0 : facts.sound->slider});
    fields.push_back({keys::kVolumeLinear, facts.sound->linear});
    fields.push_back({keys::kMuted, facts.sound->muted});
    addText(fields, keys::kChannelVolumes, facts.sound->channels);
  }
  if (facts.route.volume) {
    fields.push_back({keys::kDeviceVolume, *facts.route.volume});
    fields.push_back({keys::kDeviceMuted, facts.route.muted});
  }
}

void addRoute(Fields& fields, const Route& route) {
  fields.push_back({keys::kActiveDevices, route.devices.empty() ? std::string("none") : route.devices});
  addText(fields, keys::kDeviceBus, route.buses);
  addText(fields, keys::kDevicePort, route.ports);
  addText(fields, keys::kDevicePortType, route.portTypes);
  addText(fields, keys::kDeviceFormFactor, route.formFactors);
  addText(fields, keys::kDeviceProfile, route.profiles);
  addText(fields, keys::kBluetoothCodec, route.codec);
  fields.push_back({keys::kDeviceIsDefault, route.isDefault});
}

void addFormat(Fields& fields, const std::optional<FormatFacts>& format) {
  if (!format) return;
  fields.push_back({keys::kSessionSelectedFormat, formatText(*format)});
  fields.push_back({keys::kMFormatID, format->name});
  fields.push_back({keys::kMChannelsPerFrame, static_cast<std::int64_t>(format->channels)});
  fields.push_back({keys::kSampleRate, static_cast<std::int64_t>(format->rate)});
}

// A recording's voice codec is that of the device. The service tells a codec of a run only where it came up anew, so
// each run ends without one.
void addCodec(Fields& fields, const Route& route) {
  if (route.codec.empty()) return;
  fields.push_back({keys::kVpConfigPrimaryVocoder, route.codec});
  fields.push_back({keys::kVpConfigPrimaryVocoderFs, std::to_string(route.rate) + ".0"});
}

void addGroup(Fields& fields, const Route& route) {
  fields.push_back({keys::kLagoonSession, std::int64_t{route.count > 1 ? 1 : 0}});
}

void addInput(Fields& fields, const Route& route) {
  addCodec(fields, route);
  addText(fields, keys::kVpConfigInputPort, route.ports.empty() ? route.devices : route.ports);
}

}  // namespace

PostMessage startMessage(const Occasion& occasion, const StreamFacts& facts) {
  PostMessage made = message(occasion, sideOf(occasion), Type::Start);
  made.fields.push_back({runningKey(occasion), true});
  addSound(made.fields, facts);
  addRoute(made.fields, facts.route);
  addFormat(made.fields, facts.format);
  if (occasion.isOutput) {
    addGroup(made.fields, facts.route);
  } else {
    addInput(made.fields, facts.route);
  }
  return made;
}

PostMessage stopMessage(const Occasion& occasion) {
  PostMessage made = message(occasion, sideOf(occasion), Type::Stop);
  made.fields.push_back({runningKey(occasion), false});
  if (occasion.isOutput) {
    made.fields.push_back({keys::kLagoonSession, std::int64_t{0}});
  } else {
    made.fields.push_back({keys::kVpConfigPrimaryVocoder, std::string("none")});
    made.fields.push_back({keys::kVpConfigPrimaryVocoderFs, std::string("0.0")});
  }
  return made;
}

PostMessage volumeMessage(const Occasion& occasion, const StreamFacts& facts) {
  PostMessage made = message(occasion, Category::Volume, Type::Generic);
  addSound(made.fields, facts);
  return made;
}

PostMessage routeMessage(const Occasion& occasion, const Route& route) {
  PostMessage made = message(occasion, Category::RouteChange, Type::Generic);
  addRoute(made.fields, route);
  if (!occasion.isOutput) {
    addInput(made.fields, route);
  }
  return made;
}

PostMessage groupMessage(const Occasion& occasion, const StreamFacts& facts) {
  PostMessage made = message(occasion, Category::Lagoon, facts.route.count > 1 ? Type::Start : Type::Stop);
  addGroup(made.fields, facts.route);
  made.fields.push_back({keys::kDeviceCount, static_cast<std::int64_t>(facts.route.count)});
  return made;
}

PostMessage setupMessage(const Occasion& occasion, const StreamFacts& facts) {
  PostMessage made = message(occasion, sideOf(occasion), Type::Setup);
  addFormat(made.fields, facts.format);
  if (facts.quantum.frames > 0) {
    made.fields.push_back({keys::kGraphQuantum, facts.quantum.frames});
    made.fields.push_back({keys::kGraphRate, static_cast<std::int64_t>(facts.quantum.rate)});
    made.fields.push_back({keys::kStreamLatencyFrames, static_cast<std::int64_t>(facts.quantum.latencyFrames)});
  }
  return made;
}

PostMessage overloadMessage(const Occasion& occasion, const Overload& overload) {
  PostMessage made = message(occasion, Category::IO, Type::Error);
  made.fields.push_back({keys::kIssueType, std::string("overload")});
  made.fields.push_back({keys::kSmallestBufferFrameSize, overload.frames});
  made.fields.push_back({keys::kIoCycle, overload.counter});
  made.fields.push_back({keys::kOverloadCycles, overload.cycles});
  made.fields.push_back({keys::kOverloadSeconds, static_cast<double>(overload.duration) / kSecond});
  return made;
}

PostMessage errorMessage(const Occasion& occasion, std::string_view what, std::string_view text) {
  PostMessage made = message(occasion, Category::Error, Type::Error);
  made.fields.push_back({keys::kIssueType, std::string(what)});
  addText(made.fields, keys::kErrorText, std::string(text.substr(0, kMostErrorText)));
  return made;
}

PostMessage endMessage(const Occasion& occasion, Moment active, std::string_view reason) {
  PostMessage made = message(occasion, Category::Generic, Type::Stop);
  if (occasion.run > 0) {
    made.fields.push_back({keys::kSessionDuration, static_cast<double>(active) / kSecond});
  }
  made.fields.push_back({keys::kEndReason, std::string(reason)});
  return made;
}

std::string formatText(const FormatFacts& format) {
  return format.name + " " + std::to_string(format.rate) + " Hz " + std::to_string(format.channels) + " ch";
}

}  // namespace tarn::streams
