// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/VolumeLaw.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>

namespace tarn::streams {

namespace {

// Streams have them before they have channels in hardware; a sink may tell the soft ones alone.
const std::vector<float>& channelsOf(const VolumeFacts& volumes) {
  return volumes.channelVolumes.empty() ? volumes.softVolumes : volumes.channelVolumes;
}

// What isn't a number, or below 0, silences.
double sane(float factor) {
  return factor > 0.0F ? static_cast<double>(factor) : 0.0;
}

}  // namespace

double linearVolume(const VolumeFacts& volumes) {
  const std::vector<float>& channels = channelsOf(volumes);
  if (channels.empty()) return sane(volumes.volume);
  double loudest = 0.0;
  for (const float channel : channels) {
    loudest = std::max(loudest, sane(channel));
  }
  return sane(volumes.volume) * loudest;
}

double sliderVolume(double linear) {
  constexpr double kSteps = 10000.0;
  return std::clamp(std::round(std::cbrt(linear) * kSteps) / kSteps, 0.0, 1.0);
}

bool isMuted(const VolumeFacts& volumes) {
  return volumes.muted || volumes.softMuted;
}

std::string channelVolumesText(const VolumeFacts& volumes) {
  std::string text;
  for (const float channel : channelsOf(volumes)) {
    text += text.empty() ? "" : ",";
    text += factorText(channel);
  }
  return text;
}

std::string factorText(float factor) {
  std::array<char, 32> room{};
  const auto end = std::to_chars(room.data(), room.data() + room.size(), factor);
  return std::string(room.data(), end.ptr);
}

}  // namespace tarn::streams
