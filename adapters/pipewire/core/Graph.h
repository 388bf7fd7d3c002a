// SPDX-License-Identifier: Apache-2.0
// Graph: the objects of PipeWire that concern audio, as they are now, and what follows for a stream from its links.
//
// It keeps what it is told and nothing else. Owned by the StreamBook. Threads: one at a time.
#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "adapters/pipewire/core/GraphFacts.h"

namespace tarn::streams {

// Where a stream plays to or records from. Of several devices, each text has one part for each, with commas.
struct Route {
  std::string devices;      // names of the sinks or sources, in the order of their names; empty: it is linked to none
  std::size_t count = 0;    // devices
  std::string buses;        // pci, usb, bluetooth; "virtual" where there is no hardware
  std::string ports;        // analog-output-headphones
  std::string portTypes;    // headphones
  std::string formFactors;  // headset
  std::string profiles;     // a2dp-sink, hdmi-stereo
  std::string codec;        // of Bluetooth
  std::uint32_t rate = 0;   // of the first device, in frames a second
  std::optional<double> volume;  // of the first device, as a slider shows it
  bool muted = false;
  bool isDefault = false;  // the first device is the one that the user chose
  bool operator==(const Route&) const = default;
};

class Graph {
 public:
  struct Node {
    NodeFacts facts;
    std::optional<VolumeFacts> volumes;
    std::optional<FormatFacts> format;
    std::set<ObjectId> links;
  };
  struct Device {
    Properties properties;
    std::map<std::int32_t, PortFacts> outputs, inputs;  // by the number that a node calls card.profile.device
  };

  // Of objects that are there. A link's ends have a node each, even where nothing was told of it.
  std::map<ObjectId, Properties> clients;
  std::map<ObjectId, Node> nodes;
  std::map<ObjectId, Device> devices;
  std::map<ObjectId, LinkFacts> links;
  std::string defaultSink, defaultSource;

  // Enters a link, or what is new of it.
  void link(ObjectId id, LinkFacts facts);
  void unlink(ObjectId id);

  const Node* node(ObjectId id) const;
  // Of the node's client; empty when it has none.
  const Properties& clientOf(const Node& node) const;
  // Whether the node has a client that isn't known yet.
  bool isClientAwaited(const Node& node) const;
  // Where a stream of this direction is linked to.
  Route routeOf(ObjectId stream, bool isOutput) const;
  // Whatever has this number, with the links of a node, is gone.
  void forget(ObjectId id);

 private:
  struct End;  // a device at the other end of a stream's links
  End endOf(const Node& node, bool isOutput) const;
};

}  // namespace tarn::streams
