// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/Graph.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "adapters/pipewire/core/Identity.h"
#include "adapters/pipewire/core/VolumeLaw.h"

namespace tarn::streams {

namespace {

bool startsWith(std::string_view text, std::string_view with) {
  return text.substr(0, with.size()) == with;
}

template <class Number>
std::optional<Number> numberOf(std::string_view text) {
  Number number = 0;
  const auto read = std::from_chars(text.data(), text.data() + text.size(), number);
  if (text.empty() || read.ec != std::errc() || read.ptr != text.data() + text.size()) return std::nullopt;
  return number;
}

void add(std::string& list, std::string_view part) {
  list += list.empty() ? "" : ",";
  list += part;
}

}  // namespace

struct Graph::End {
  std::string name, bus, port, portType, formFactor, profile, codec;
  std::uint32_t rate = 0;
  std::optional<double> volume;
  bool muted = false;
  bool isDefault = false;
};

void Graph::link(ObjectId id, LinkFacts facts) {
  unlink(id);
  nodes[facts.output].links.insert(id);
  nodes[facts.input].links.insert(id);
  links[id] = std::move(facts);
}

void Graph::unlink(ObjectId id) {
  const auto found = links.find(id);
  if (found == links.end()) return;
  for (const ObjectId end : {found->second.output, found->second.input}) {
    if (const auto node = nodes.find(end); node != nodes.end()) {
      node->second.links.erase(id);
    }
  }
  links.erase(found);
}

const Graph::Node* Graph::node(ObjectId id) const {
  const auto found = nodes.find(id);
  return found == nodes.end() ? nullptr : &found->second;
}

const Properties& Graph::clientOf(const Node& node) const {
  static const Properties kNone;
  const auto id = numberOf<ObjectId>(textOf(node.facts.properties, "client.id"));
  const auto found = id ? clients.find(*id) : clients.end();
  return found == clients.end() ? kNone : found->second;
}

bool Graph::isClientAwaited(const Node& node) const {
  const auto id = numberOf<ObjectId>(textOf(node.facts.properties, "client.id"));
  return id && clients.find(*id) == clients.end();
}

// Nameless when the node is no device.
Graph::End Graph::endOf(const Node& node, bool isOutput) const {
  End end;
  const Properties& properties = node.facts.properties;
  const std::string_view mediaClass = textOf(properties, "media.class");
  const bool isSink = startsWith(mediaClass, "Audio/Sink");
  const bool isStream = startsWith(mediaClass, "Stream/");
  // What one stream sends to another is no device of it; who records a stream has that as its source.
  if (!startsWith(mediaClass, "Audio/") && !(isStream && !isOutput)) return end;
  const auto deviceId = numberOf<ObjectId>(textOf(properties, "device.id"));
  const auto found = deviceId ? devices.find(*deviceId) : devices.end();
  static const Device kNone;
  const Device& device = found == devices.end() ? kNone : found->second;
  const auto either = [&](std::string_view key) {
    const std::string_view own = textOf(properties, key);
    return std::string(own.empty() ? textOf(device.properties, key) : own);
  };
  const std::string_view name = textOf(properties, "node.name");
  end.isDefault = !name.empty() && name == (isOutput ? defaultSink : defaultSource);
  end.name = withoutAddress(name.empty() ? "unknown" : name) + (isSink && !isOutput ? ".monitor" : "");
  end.bus = either("device.bus");
  if (end.bus.empty()) {
    const std::string api = either("device.api");
    end.bus = api == "bluez5" ? "bluetooth" : api.empty() ? "virtual" : "unknown";
  }
  end.formFactor = either("device.form-factor");
  end.profile = either("api.bluez5.profile");
  if (end.profile.empty()) {
    end.profile = either("device.profile.name");
  }
  end.codec = either("api.bluez5.codec");
  const auto& ports = isOutput ? device.outputs : device.inputs;
  if (const auto number = numberOf<std::int32_t>(textOf(properties, "card.profile.device"))) {
    if (const auto port = ports.find(*number); port != ports.end()) {
      end.port = port->second.name;
      end.portType = port->second.type;
    }
  }
  end.rate = node.format ? node.format->rate : 0;
  if (node.volumes) {
    end.volume = sliderVolume(linearVolume(*node.volumes));
    end.muted = isMuted(*node.volumes);
  }
  return end;
}

void Graph::forget(ObjectId id) {
  unlink(id);
  if (const auto found = nodes.find(id); found != nodes.end()) {
    const std::set<ObjectId> itsLinks = found->second.links;
    for (const ObjectId link : itsLinks) {
      unlink(link);
    }
    nodes.erase(id);
  }
  clients.erase(id);
  devices.erase(id);
}

Route Graph::routeOf(ObjectId stream, bool isOutput) const {
  const Node* const own = node(stream);
  if (own == nullptr) return {};
  std::set<ObjectId> others;
  for (const ObjectId id : own->links) {
    const LinkFacts& facts = links.at(id);
    if ((isOutput ? facts.output : facts.input) == stream) {
      others.insert(isOutput ? facts.input : facts.output);
    }
  }
  std::vector<End> ends;
  for (const ObjectId other : others) {
    if (End end = endOf(nodes.at(other), isOutput); !end.name.empty()) {
      ends.push_back(std::move(end));
    }
  }
  std::sort(ends.begin(), ends.end(), [](const End& left, const End& right) { return left.name < right.name; });
  Route route;
  route.count = ends.size();
  for (const End& end : ends) {
    add(route.devices, end.name);
    add(route.buses, end.bus);
    add(route.ports, end.port);
    add(route.portTypes, end.portType);
    add(route.formFactors, end.formFactor);
    add(route.profiles, end.profile);
    add(route.codec, end.codec);
  }
  if (!ends.empty()) {
    route.rate = ends.front().rate;
    route.volume = ends.front().volume;
    route.muted = ends.front().muted;
    route.isDefault = ends.front().isDefault;
  }
  return route;
}

}  // namespace tarn::streams
