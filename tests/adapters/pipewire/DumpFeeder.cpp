// SPDX-License-Identifier: Apache-2.0
#include "tests/adapters/pipewire/DumpFeeder.h"

#include <array>
#include <fstream>
#include <nlohmann/json.hpp>
#include <string_view>

namespace tarn::streams {

namespace {

using nlohmann::json;

Properties propertiesOf(const json& object) {
  Properties properties;
  for (const auto& [key, value] : object.items()) {
    properties[key] = value.is_string() ? value.get<std::string>() : value.dump();
  }
  return properties;
}

NodeState stateOf(const std::string& name) {
  constexpr std::array<std::string_view, 5> kNames{"error", "creating", "suspended", "idle", "running"};
  for (std::size_t i = 0; i < kNames.size(); ++i) {
    if (kNames[i] == name) return static_cast<NodeState>(i);
  }
  throw std::runtime_error("no state: " + name);
}

void feedNode(StreamBook& book, ObjectId id, const json& info, Moment at) {
  const json params = info.value("params", json::object());
  for (const json& props : params.value("Props", json::array())) {
    if (!props.contains("channelVolumes")) continue;
    book.volumesKnown(
        id, at,
        {props.value("volume", 1.0F), props.value("mute", false), props.value("softMute", false),
         props["channelVolumes"].get<std::vector<float>>(), props.value("softVolumes", std::vector<float>())});
  }
  for (const json& format : params.value("Format", json::array())) {
    book.formatKnown(id, at,
                     FormatFacts{format.value("format", ""), format.value("rate", 0U), format.value("channels", 0U)});
  }
  book.nodeKnown(
      id, at,
      {stateOf(info.at("state")), info.at("error").is_null() ? "" : info.at("error"), propertiesOf(info.at("props"))});
}

void feedDevice(StreamBook& book, ObjectId id, const json& info, Moment at) {
  book.deviceKnown(id, at, propertiesOf(info.at("props")));
  for (const json& route : info.at("params").value("Route", json::array())) {
    const json words = route.value("info", json::array());
    std::string type;
    for (std::size_t i = 1; i + 1 < words.size(); i += 2) {
      if (words[i] == "port.type") {
        type = words[i + 1];
      }
    }
    book.portKnown(id, at, route.at("direction") == "Output", route.at("device"), {route.at("name"), type});
  }
}

void feedDefaults(StreamBook& book, const json& entries, Moment at) {
  for (const json& entry : entries) {
    if (entry.at("key") == "default.audio.sink") {
      book.defaultKnown(at, true, entry.at("value").at("name"));
    } else if (entry.at("key") == "default.audio.source") {
      book.defaultKnown(at, false, entry.at("value").at("name"));
    }
  }
}

void feedObject(StreamBook& book, const json& object, Moment at) {
  const std::string type = object.at("type");
  const ObjectId id = object.at("id");
  if (type == "PipeWire:Interface:Client") {
    book.clientKnown(id, propertiesOf(object.at("info").at("props")));
  } else if (type == "PipeWire:Interface:Node") {
    feedNode(book, id, object.at("info"), at);
  } else if (type == "PipeWire:Interface:Device") {
    feedDevice(book, id, object.at("info"), at);
  } else if (type == "PipeWire:Interface:Link") {
    const json& info = object.at("info");
    const bool failed = info.at("state") == "error";
    book.linkKnown(id, at,
                   {info.at("output-node-id"), info.at("input-node-id"), failed,
                    failed ? info.at("error").get<std::string>() : ""});
  } else if (type == "PipeWire:Interface:Metadata" && object.at("props").at("metadata.name") == "default") {
    feedDefaults(book, object.at("metadata"), at);
  }
}

}  // namespace

void feedDump(StreamBook& book, const std::string& path, Moment at) {
  std::ifstream file(path);
  for (const json& object : json::parse(file)) {
    feedObject(book, object, at);
  }
  book.settle();
}

}  // namespace tarn::streams
