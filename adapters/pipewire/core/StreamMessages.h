// SPDX-License-Identifier: Apache-2.0
// What is said of a stream, and the messages that say it: pure functions from facts to keys of the data dictionary.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "adapters/pipewire/core/Graph.h"
#include "adapters/pipewire/core/StreamActions.h"

namespace tarn::streams {

// The graph's cycle, as the profiler tells it; all 0 until it has.
struct Quantum {
  std::int64_t frames = 0;
  std::uint32_t rate = 0;
  std::uint32_t latencyFrames = 0;
  bool operator==(const Quantum&) const = default;
};

struct Sound {
  double slider = 0.0;  // where a mixer's slider stands, muted or not
  double linear = 0.0;
  bool muted = false;
  std::string channels;
  bool operator==(const Sound&) const = default;
};

// All that is said of a stream that runs.
struct StreamFacts {
  std::optional<Sound> sound;
  Route route;
  std::optional<FormatFacts> format;
  Quantum quantum;
};

// What a message is of, and when.
struct Occasion {
  StreamNumber stream = 0;
  bool isOutput = true;
  std::int64_t run = 0;  // which of the stream's runs it is, from 1: no two runs have equal messages
  Moment at = 0;
};

struct Overload {
  std::int64_t frames = 0;   // of the cycle
  std::int64_t counter = 0;  // of the first cycle that was missed
  std::int64_t cycles = 0;   // in a row
  Moment duration = 0;
};

// Why a stream's session ends.
inline constexpr std::string_view kStreamEnded = "stream-ended";
inline constexpr std::string_view kPipeWireEnded = "pipewire-ended";
inline constexpr std::string_view kAdapterEnded = "adapter-ended";

PostMessage startMessage(const Occasion& occasion, const StreamFacts& facts);
PostMessage stopMessage(const Occasion& occasion);
PostMessage volumeMessage(const Occasion& occasion, const StreamFacts& facts);
PostMessage routeMessage(const Occasion& occasion, const Route& route);
// Playback to several devices begins or is over.
PostMessage groupMessage(const Occasion& occasion, const StreamFacts& facts);
PostMessage setupMessage(const Occasion& occasion, const StreamFacts& facts);
PostMessage overloadMessage(const Occasion& occasion, const Overload& overload);
// `what` is node-error, device-error or link-error.
PostMessage errorMessage(const Occasion& occasion, std::string_view what, std::string_view text);
// The session's last; `active` is how long it ran in all.
PostMessage endMessage(const Occasion& occasion, Moment active, std::string_view reason);

// The format in words: S16LE 48000 Hz 2 ch.
std::string formatText(const FormatFacts& format);

}  // namespace tarn::streams
