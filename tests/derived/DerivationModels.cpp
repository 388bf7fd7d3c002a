// SPDX-License-Identifier: Apache-2.0
#include "tests/derived/DerivationModels.h"

#include <cmath>
#include <optional>
#include <set>
#include <utility>

namespace tarn::testing {

namespace {

using plist::Value;

constexpr double kMinimum = 0.5;
constexpr const char* kTime = "tarnreporting_timestamp";

bool has(const ModelPayload& payload, const std::string& key) {
  return payload.count(key) != 0;
}

Value valueOf(const ModelPayload& payload, const std::string& key) {
  return has(payload, key) ? payload.at(key) : Value();
}

double number(const Value& value) {
  return value.view().asDouble();
}

bool isSet(const ModelPayload& payload, const std::string& key) {
  return has(payload, key) && number(payload.at(key)) != 0;
}

std::string text(const Value& value) {
  return plist::description(value.view());
}

// Not a number is the same as not a number when both are numbers.
bool numbersDiffer(const Value& a, const Value& b) {
  const bool bothNumbers = a.view().isNumber() && b.view().isNumber();
  if (bothNumbers && std::isnan(number(a)) && std::isnan(number(b))) return false;
  return number(a) != number(b);
}

std::string label(double value, const std::vector<std::pair<double, const char*>>& buckets) {
  const char* best = nullptr;
  double bestDistance = 0;
  for (const auto& [bound, name] : buckets) {
    const double distance = std::fabs(value - bound);
    if (best == nullptr || !(distance > bestDistance)) {
      best = name;
      bestDistance = distance;
    }
  }
  return best;
}

std::string lengthLabel(double seconds) {
  return label(seconds, {{0, "0"},
                         {1, "1"},
                         {5, "5"},
                         {10, "10"},
                         {30, "30"},
                         {60, "60"},
                         {300, "300"},
                         {1800, "1800"},
                         {3600, "3600"},
                         {7200, "7200"},
                         {18000, "18000"}});
}

std::string volumeLabel(double volume) {
  return label(volume, {{0, "0.0"},
                        {0.0625, "0.0625"},
                        {0.125, "0.125"},
                        {0.1875, "0.1875"},
                        {0.25, "0.25"},
                        {0.3125, "0.3125"},
                        {0.375, "0.375"},
                        {0.4375, "0.4375"},
                        {0.5, "0.5"},
                        {0.5625, "0.5625"},
                        {0.625, "0.625"},
                        {0.6875, "0.6875"},
                        {0.75, "0.75"},
                        {0.8125, "0.8125"},
                        {0.875, "0.875"},
                        {0.9375, "0.9375"},
                        {1, "1.0"}});
}

void layOver(ModelPayload& state, const ModelPayload& later) {
  for (const auto& [key, value] : later) {
    state[key] = value;
  }
}

// The state before each message.
ModelPayloads statesBefore(const ModelPayloads& messages, ModelPayload state) {
  ModelPayloads states;
  for (const ModelPayload& message : messages) {
    states.push_back(state);
    layOver(state, message);
  }
  return states;
}

// Whether the stream runs after each message, by the key that tells.
std::vector<bool> runningAfter(const ModelPayloads& messages, const std::string& key, bool running) {
  std::vector<bool> after;
  for (const ModelPayload& message : messages) {
    running = has(message, key) ? isSet(message, key) : running && !has(message, "session_duration");
    after.push_back(running);
  }
  return after;
}

// When the segment that message `i` ends began: looks back for the latest message that ended one, started the stream or
// found it at rest.
Value segmentStart(const ModelPayloads& messages, const std::string& key, const ModelPayloads& states,
                   const std::vector<bool>& running, const std::vector<bool>& cuts, std::size_t i,
                   const Value& carried) {
  while (i-- > 0) {
    if (!running[i]) return Value();
    const bool starts = isSet(messages[i], key) && !isSet(states[i], key);
    if (cuts[i] || starts) return valueOf(messages[i], kTime);
  }
  return carried;
}

ModelPayloads selected(const ModelPayloads& messages, const std::vector<std::size_t>& places) {
  ModelPayloads left;
  for (const std::size_t place : places) {
    left.push_back(messages[place]);
  }
  return left;
}

void number(ModelPayloads& derived) {
  for (std::size_t i = 0; i < derived.size(); ++i) {
    derived[i]["msgidx"] = i + 1;
    derived[i]["msgcnt"] = derived.size();
  }
}

}  // namespace

// A key that comes again begins a new group, and nothing else does; so the groups are known before any time is read.
std::vector<std::size_t> combineModel(ModelPayloads& messages, const std::vector<std::string>& keys, double pause) {
  std::vector<std::vector<std::size_t>> groups(1);
  std::set<std::string> seen;
  std::set<std::size_t> left;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    left.insert(i);
    std::optional<std::string> filed;
    for (const std::string& key : keys) {
      if (!filed && has(messages[i], key)) {
        filed = key;
      }
    }
    if (!filed) continue;
    if (!seen.insert(*filed).second) {
      groups.emplace_back();
      seen = {*filed};
    }
    groups.back().push_back(i);
  }
  for (const auto& group : groups) {
    for (const std::size_t member : group) {
      const std::size_t head = group.front();
      const double difference = number(valueOf(messages[member], kTime)) - number(valueOf(messages[head], kTime));
      if (member != head && difference < pause) {
        layOver(messages[head], messages[member]);
        left.erase(member);
      }
    }
  }
  return {left.begin(), left.end()};
}

ModelPayloads volumeModel(ModelPayloads& all, const ModelPayload& previous, const std::string& process) {
  const ModelPayloads messages =
      selected(all, combineModel(all, {"spatial-audio-accessory-feature", "spatializationEnabled"}, 5.0));
  ModelPayload state{{"session_selected_format", "unknown"},
                     {"active_devices", "unknown"},
                     {"mFormatID", "unknown"},
                     {"spatial-audio-accessory-feature", false},
                     {"spatializationEnabled", false},
                     {"ringerstate", false},
                     {"mChannelsPerFrame", -1}};
  layOver(state, previous);
  const bool carried = isSet(state, "session_output_running");
  const Value carriedStart = carried ? valueOf(state, kTime) : Value();
  if (carried) {
    state.erase("session_output_running");
  }
  const ModelPayloads states = statesBefore(messages, state);
  const std::vector<bool> running = runningAfter(messages, "session_output_running", carried);

  std::vector<bool> cuts;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    const auto both = [&](const char* key) { return has(messages[i], key) && has(states[i], key); };
    bool changed = has(messages[i], "session_duration");
    changed |= has(messages[i], "session_output_running") && !running[i];
    for (const char* key : {"session_selected_format", "active_devices"}) {
      changed |= running[i] && both(key) && text(messages[i].at(key)) != text(states[i].at(key));
    }
    for (const char* key : {"spatializationEnabled", "ringerstate", "KvSessionVolume"}) {
      changed |= running[i] && both(key) && numbersDiffer(messages[i].at(key), states[i].at(key));
    }
    cuts.push_back(changed && isSet(states[i], "session_output_running"));
  }

  ModelPayloads derived;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    const Value start = segmentStart(messages, "session_output_running", states, running, cuts, i, carriedStart);
    const double length = number(valueOf(messages[i], kTime)) - number(start);
    if (!cuts[i] || !has(messages[i], kTime) || !start.present() || !(length > kMinimum) ||
        !has(states[i], "KvSessionVolume") || process.empty()) {
      continue;
    }
    ModelPayload payload;
    for (const char* key : {"session_selected_format", "mFormatID", "active_devices", "KvSessionVolume", "ringerstate",
                            "spatial-audio-accessory-feature", "spatializationEnabled", "mChannelsPerFrame"}) {
      payload[key] = states[i].at(key);
    }
    payload["HostApplicationDisplayID"] = process;
    payload["KvSessionVolumeBucketed"] = volumeLabel(number(states[i].at("KvSessionVolume")));
    payload["play_seconds"] = static_cast<float>(length);
    payload["play_secondsBucketed"] = lengthLabel(length);
    derived.push_back(payload);
  }
  number(derived);
  return derived;
}

ModelPayloads inputModel(ModelPayloads& all, const ModelPayload& previous, const std::string& process) {
  const ModelPayloads messages =
      selected(all, combineModel(all, {"spatial-audio-accessory-feature", "spatializationEnabled"}, 2.0));
  ModelPayload state;
  for (const char* key : {"session_selected_format", "active_devices", "mFormatID", "vp_config_operation_mode",
                          "vp_config_input_port", "vp_config_primary_vocoderFs", "vp_config_primary_vocoder"}) {
    state[key] = "unknown";
  }
  layOver(state, previous);
  const ModelPayloads states = statesBefore(messages, state);
  const std::vector<bool> running = runningAfter(messages, "session_input_running", false);
  const auto differs = [&](std::size_t i, const char* key) {
    return has(messages[i], key) && !(messages[i].at(key) == states[i].at(key));
  };

  std::vector<bool> cuts;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    bool changed = has(messages[i], "session_duration");
    changed |= has(messages[i], "session_input_running") && !running[i];
    changed |= running[i] && differs(i, "active_devices");
    cuts.push_back(changed && isSet(states[i], "session_input_running"));
  }

  ModelPayloads derived;
  std::size_t firstUnlisted = 0;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    const Value start = segmentStart(messages, "session_input_running", states, running, cuts, i, Value());
    const double length = number(valueOf(messages[i], kTime)) - number(start);
    if (!cuts[i] || !has(messages[i], kTime) || !start.present() || !(length > kMinimum) || process.empty()) continue;
    std::set<std::string> codecs;
    for (; firstUnlisted <= i; ++firstUnlisted) {
      const std::string rate = text(valueOf(messages[firstUnlisted], "vp_config_primary_vocoderFs"));
      if (running[firstUnlisted] && differs(firstUnlisted, "vp_config_primary_vocoder") && rate.substr(0, 2) != "0.") {
        codecs.insert(text(messages[firstUnlisted].at("vp_config_primary_vocoder")) + ":" + rate);
      }
    }
    ModelPayload payload{{"HostApplicationDisplayID", process},
                         {"inputrunning_seconds", static_cast<float>(length)},
                         {"inputrunning_secondsBucketed", lengthLabel(length)}};
    for (const char* key : {"vp_config_operation_mode", "vp_config_input_port", "active_devices"}) {
      payload[key] = states[i].at(key);
    }
    if (!codecs.empty()) {
      std::string joined;
      for (const std::string& codec : codecs) {
        joined += codec + ",";
      }
      joined.pop_back();
      payload["vocoders"] = joined;
    }
    derived.push_back(payload);
  }
  number(derived);
  return derived;
}

ModelPayloads lagoonModel(const ModelPayloads& messages, const ModelPayload& previous) {
  const ModelPayload defaults{{"session_selected_format", "unknown"},
                              {"active_devices", "unknown"},
                              {"mFormatID", "unknown"},
                              {"mChannelsPerFrame", -1}};
  const ModelPayloads states = statesBefore(messages, previous);
  const auto flag = [](const ModelPayload& payload) {
    return has(payload, "lagoon_session") && payload.at("lagoon_session").view().asInt64() == 1;
  };
  bool inGroup = flag(previous);
  bool running = isSet(previous, "session_output_running");
  Value start = inGroup && running ? valueOf(previous, kTime) : Value();

  ModelPayloads derived;
  for (std::size_t i = 0; i < messages.size(); ++i) {
    const ModelPayload& message = messages[i];
    const auto both = [&](const char* key) { return has(message, key) && has(states[i], key); };
    const bool hasEnd = has(message, "session_duration");
    if (has(message, "lagoon_session")) {
      inGroup = flag(message);
    }
    if (has(message, "session_output_running")) {
      running = isSet(message, "session_output_running");
    }
    if (inGroup && running && !start.present()) {
      start = valueOf(message, kTime);
    }
    if (hasEnd) {
      inGroup = false;
      running = false;
    }
    bool watched = both("session_output_running") &&
                   isSet(message, "session_output_running") != isSet(states[i], "session_output_running");
    for (const char* key : {"lagoon_session", "mChannelsPerFrame"}) {
      watched |= both(key) && message.at(key).view().asInt64() != states[i].at(key).view().asInt64();
    }
    for (const char* key : {"mFormatID", "active_devices"}) {
      watched |= both(key) && text(message.at(key)) != text(states[i].at(key));
    }
    const bool closes = hasEnd || (isSet(states[i], "session_output_running") && flag(states[i]) && watched);
    if (!closes || !start.present()) continue;
    const double length = number(valueOf(message, kTime)) - number(start);
    if (length > kMinimum && flag(states[i])) {
      ModelPayload payload = defaults;
      for (auto& [key, value] : payload) {
        value = has(states[i], key) ? states[i].at(key) : value;
      }
      payload["play_seconds"] = static_cast<float>(length);
      payload["play_secondsBucketed"] = lengthLabel(length);
      derived.push_back(payload);
    }
    start = inGroup && running ? valueOf(message, kTime) : Value();
  }
  number(derived);
  return derived;
}

}  // namespace tarn::testing
