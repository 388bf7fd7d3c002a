// SPDX-License-Identifier: Apache-2.0
// What PipeWire tells of its objects, as plain data: the events that the model is fed with.
//
// Nothing here knows libpipewire, so that tests feed it from recorded dumps. Threads: one at a time.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tarn::streams {

// A number of PipeWire's registry. It is used again once its object is gone.
using ObjectId = std::uint32_t;
// Nanoseconds since 1970 UTC.
using Moment = std::int64_t;

using Properties = std::map<std::string, std::string, std::less<>>;

// The property's text, or empty.
inline std::string_view textOf(const Properties& properties, std::string_view key) {
  const auto found = properties.find(key);
  return found == properties.end() ? std::string_view() : std::string_view(found->second);
}

enum class NodeState : std::uint8_t { Error, Creating, Suspended, Idle, Running };

struct NodeFacts {
  NodeState state = NodeState::Creating;
  std::string error;  // why the state is Error
  Properties properties;
};

// The volumes of a node: factors of the amplitude, as PipeWire keeps them.
struct VolumeFacts {
  float volume = 1.0F;
  bool muted = false;
  bool softMuted = false;
  std::vector<float> channelVolumes;
  std::vector<float> softVolumes;  // the part of them that isn't done in hardware
};

struct FormatFacts {
  std::string name;  // of the samples, S16LE; or of a codec that is passed through
  std::uint32_t rate = 0;
  std::uint32_t channels = 0;
  bool operator==(const FormatFacts&) const = default;
};

struct LinkFacts {
  ObjectId output = 0;  // node
  ObjectId input = 0;   // node
  bool failed = false;
  std::string error;
};

// What a device uses for one of its profile's devices: a socket, a speaker, a screen.
struct PortFacts {
  std::string name;  // analog-output-headphones
  std::string type;  // headphones; empty when the device doesn't tell
};

// A driver's cycle as the profiler tells it.
struct CycleFacts {
  struct Follower {
    ObjectId node = 0;
    bool finished = true;             // before the next cycle began
    std::uint32_t latencyFrames = 0;  // 0 when it asks for none
  };
  ObjectId driver = 0;
  std::int64_t counter = 0;
  Moment at = 0;            // when it began
  std::int64_t frames = 0;  // how long it is: the graph's quantum
  std::uint32_t rate = 0;   // frames a second
  std::int64_t xruns = 0;   // of the driver, ever
  std::vector<Follower> followers;
};

}  // namespace tarn::streams
