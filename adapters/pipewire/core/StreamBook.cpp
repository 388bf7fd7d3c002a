// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/StreamBook.h"

#include <algorithm>
#include <utility>

#include "adapters/pipewire/core/Identity.h"
#include "adapters/pipewire/core/VolumeLaw.h"

namespace tarn::streams {

namespace {

constexpr std::string_view kPlays = "Stream/Output/Audio";
constexpr std::string_view kRecords = "Stream/Input/Audio";

std::optional<Sound> soundOf(const Graph::Node& node) {
  if (!node.volumes) return std::nullopt;
  const double linear = linearVolume(*node.volumes);
  return Sound{sliderVolume(linear), linear, isMuted(*node.volumes), channelVolumesText(*node.volumes)};
}

}  // namespace

void StreamBook::clientKnown(ObjectId id, Properties properties) {
  graph_.clients[id] = std::move(properties);
  for (const auto& [node, stream] : streams_) {
    if (!stream.hasBegun) {
      unsettled_.insert(node);
    }
  }
}

void StreamBook::nodeKnown(ObjectId id, Moment at, NodeFacts facts) {
  const bool runs = facts.state == NodeState::Running;
  const bool failed = facts.state == NodeState::Error;
  Graph::Node& node = graph_.nodes[id];
  const bool failedBefore = node.facts.state == NodeState::Error;
  if (Stream* stream = streamOf(id); stream != nullptr && stream->shallRun && !runs) {
    settleStream(id, false);
    node.facts = std::move(facts);
    stop(*stream, at);
  } else {
    node.facts = std::move(facts);
  }
  enterStream(id);
  Stream* const stream = streamOf(id);
  if (stream != nullptr && runs && !stream->shallRun) {
    stream->shallRun = true;
    stream->runsSince = at;
  }
  if (stream != nullptr) {
    touch(id, at);
  } else {
    touchAll(at);
  }
  if (failed && !failedBefore) {
    sayNodeError(id, at, node.facts.error);
  }
}

void StreamBook::volumesKnown(ObjectId id, Moment at, VolumeFacts volumes) {
  graph_.nodes[id].volumes = std::move(volumes);
  if (streamOf(id) != nullptr) {
    touch(id, at);
  } else {
    touchAll(at);
  }
}

void StreamBook::formatKnown(ObjectId id, Moment at, std::optional<FormatFacts> format) {
  graph_.nodes[id].format = std::move(format);
  touch(id, at);
}

void StreamBook::deviceKnown(ObjectId id, Moment at, Properties properties) {
  graph_.devices[id].properties = std::move(properties);
  touchAll(at);
}

void StreamBook::portKnown(ObjectId device, Moment at, bool isOutput, std::int32_t number, PortFacts port) {
  Graph::Device& known = graph_.devices[device];
  (isOutput ? known.outputs : known.inputs)[number] = std::move(port);
  touchAll(at);
}

void StreamBook::linkKnown(ObjectId id, Moment at, LinkFacts facts) {
  const auto before = graph_.links.find(id);
  const bool failedBefore = before != graph_.links.end() && before->second.failed;
  const LinkFacts now = facts;
  graph_.link(id, std::move(facts));
  touch(now.output, at);
  touch(now.input, at);
  if (now.failed && !failedBefore) {
    sayError(now.output, at, "link-error", now.error);
    sayError(now.input, at, "link-error", now.error);
  }
}

void StreamBook::defaultKnown(Moment at, bool isSink, std::string name) {
  (isSink ? graph_.defaultSink : graph_.defaultSource) = std::move(name);
  touchAll(at);
}

void StreamBook::removed(ObjectId id, Moment at) {
  endStream(id, at, kStreamEnded);
  if (const auto link = graph_.links.find(id); link != graph_.links.end()) {
    touch(link->second.output, at);
    touch(link->second.input, at);
  } else if (graph_.nodes.count(id) + graph_.devices.count(id) != 0) {
    touchAll(at);
  }
  xruns_.erase(id);
  graph_.forget(id);
}

void StreamBook::end(Moment at, std::string_view reason) {
  while (!streams_.empty()) {
    endStream(streams_.begin()->first, at, reason);
  }
  graph_ = {};
  xruns_.clear();
  unsettled_.clear();
  prepared_.clear();
  doubtsDefault_ = false;
}

void StreamBook::settle() {
  prepare();
  settlePrepared();
}

void StreamBook::settlePrepared() {
  for (const ObjectId node : std::exchange(prepared_, {})) {
    settleStream(node, true);
  }
}

StreamBook::Stream* StreamBook::streamOf(ObjectId node) {
  const auto found = streams_.find(node);
  return found == streams_.end() ? nullptr : &found->second;
}

// If the node is one.
void StreamBook::enterStream(ObjectId node) {
  if (streamOf(node) != nullptr) return;
  const std::string_view mediaClass = textOf(graph_.nodes[node].facts.properties, "media.class");
  if (mediaClass != kPlays && mediaClass != kRecords) return;
  Stream& stream = streams_[node];
  stream.number = ++lastNumber_;
  stream.isOutput = mediaClass == kPlays;
}

void StreamBook::touch(ObjectId node, Moment at) {
  Stream* const stream = streamOf(node);
  if (stream == nullptr) return;
  unsettled_.insert(node);
  if (stream->changedAt == 0) {
    stream->changedAt = at;
  }
}

// What changed may be a part of any stream's route.
void StreamBook::touchAll(Moment at) {
  for (const auto& [node, stream] : streams_) {
    if (stream.shallRun) {
      touch(node, at);
    }
  }
}

void StreamBook::settleStream(ObjectId node, bool mayWait) {
  unsettled_.erase(node);
  Stream* const stream = streamOf(node);
  if (stream == nullptr || !begin(node, *stream, mayWait)) return;
  if (stream->shallRun && !stream->runs) {
    start(*stream, factsOf(node, *stream));
  } else if (stream->runs) {
    sayChanges(*stream, factsOf(node, *stream));
  }
  stream->changedAt = 0;
}

// Whether there is a session now. One of a client that isn't known yet waits for it, as long as it may.
bool StreamBook::begin(ObjectId node, Stream& stream, bool mayWait) {
  if (stream.hasBegun) return stream.isReported;
  const Graph::Node& known = graph_.nodes[node];
  if (mayWait && graph_.isClientAwaited(known)) return false;
  BeginSession session = sessionOf(stream.number, known.facts.properties, graph_.clientOf(known), rules_);
  stream.hasBegun = true;
  stream.isReported = rules_.mayReport(session.application);
  if (stream.isReported) {
    actions_.emplace_back(std::move(session));
  }
  return stream.isReported;
}

void StreamBook::start(Stream& stream, StreamFacts facts) {
  stream.runs = true;
  ++stream.run;
  facts.quantum = {};
  stream.quantum = {};
  stream.said = std::move(facts);
  doubtDefault(stream.said.route);
  actions_.emplace_back(startMessage(occasion(stream, stream.runsSince), stream.said));
}

// A run that was never said, since it isn't reported, leaves nothing.
void StreamBook::stop(Stream& stream, Moment at) {
  stream.shallRun = false;
  if (!std::exchange(stream.runs, false)) return;
  sayOverload(stream, at);
  stream.active += std::max<Moment>(at - stream.runsSince, 0);
  actions_.emplace_back(stopMessage(occasion(stream, at)));
}

void StreamBook::sayChanges(Stream& stream, StreamFacts facts) {
  const Occasion now = occasion(stream, stream.changedAt);
  StreamFacts& said = stream.said;
  // Between two links it plays nowhere, which is no route.
  if (facts.route.count == 0) {
    facts.route = said.route;
  }
  Route route = facts.route;
  route.volume = said.route.volume;
  route.muted = said.route.muted;
  route.rate = said.route.rate;
  const bool isOtherRoute = route != said.route;
  const bool isOtherSound =
      facts.sound != said.sound || facts.route.volume != said.route.volume || facts.route.muted != said.route.muted;
  const bool isOtherGroup = stream.isOutput && (facts.route.count > 1) != (said.route.count > 1);
  const bool isOtherFormat = facts.format && facts.format != said.format;
  const bool isOtherQuantum = facts.quantum != said.quantum;
  said = std::move(facts);
  if (isOtherRoute) {
    doubtDefault(said.route);
    actions_.emplace_back(routeMessage(now, said.route));
  }
  if (isOtherGroup) {
    actions_.emplace_back(groupMessage(now, said));
  }
  if (isOtherSound) {
    actions_.emplace_back(volumeMessage(now, said));
  }
  if (isOtherFormat || isOtherQuantum) {
    actions_.emplace_back(setupMessage(now, said));
  }
}

void StreamBook::endStream(ObjectId node, Moment at, std::string_view reason) {
  Stream* const stream = streamOf(node);
  if (stream == nullptr) return;
  // Only a run that wasn't said yet is: how a stream loses its links as it goes is no change.
  const bool isUnsaid = !stream->hasBegun || (stream->shallRun && !stream->runs);
  if (isUnsaid) {
    settleStream(node, false);
  }
  stop(*stream, at);
  if (stream->isReported) {
    actions_.emplace_back(endMessage(occasion(*stream, at), stream->active, reason));
    actions_.emplace_back(EndSession{stream->number, at});
  }
  unsettled_.erase(node);
  streams_.erase(node);
}

StreamFacts StreamBook::factsOf(ObjectId node, const Stream& stream) const {
  const Graph::Node* const known = graph_.node(node);
  if (known == nullptr) return {};
  return {soundOf(*known), graph_.routeOf(node, stream.isOutput), known->format, stream.quantum};
}

bool StreamBook::anyRuns() const {
  return std::any_of(streams_.begin(), streams_.end(), [](const auto& entry) { return entry.second.runs; });
}

std::vector<StreamView> StreamBook::look() const {
  std::vector<StreamView> views;
  for (const auto& [node, stream] : streams_) {
    const Graph::Node& known = *graph_.node(node);
    const BeginSession session = sessionOf(stream.number, known.facts.properties, graph_.clientOf(known), rules_);
    views.push_back({stream.number, node, session.application,
                     std::string(textOf(known.facts.properties, "media.role")), session.serviceType, stream.isOutput,
                     rules_.mayReport(session.application), known.facts.state, factsOf(node, stream)});
  }
  return views;
}

}  // namespace tarn::streams
