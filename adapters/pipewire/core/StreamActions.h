// SPDX-License-Identifier: Apache-2.0
// What is to be reported: sessions that begin, messages, sessions that end. What the model makes of PipeWire's events.
//
// Plain data. Keys are texts of the program and live for ever. Threads: one at a time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "adapters/pipewire/core/GraphFacts.h"

namespace tarn::streams {

// A stream's own number, which is never used again.
using StreamNumber = std::uint64_t;

using FieldValue = std::variant<bool, std::int64_t, double, std::string>;

struct Field {
  std::string_view key;
  FieldValue value;
  bool operator==(const Field&) const = default;
};
using Fields = std::vector<Field>;

struct BeginSession {
  StreamNumber stream = 0;
  std::uint16_t serviceType = 0;
  std::string application;
  Fields configuration;
};

struct PostMessage {
  StreamNumber stream = 0;
  std::uint32_t category = 0;
  std::uint16_t type = 0;
  Moment stamp = 0;
  Fields fields;
};

struct EndSession {
  StreamNumber stream = 0;
  Moment stamp = 0;
};

using Action = std::variant<BeginSession, PostMessage, EndSession>;
using Actions = std::vector<Action>;

}  // namespace tarn::streams
