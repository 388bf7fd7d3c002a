// SPDX-License-Identifier: Apache-2.0
// What goes wrong: cycles that weren't met, errors of nodes and links. A part of StreamBook.
#include <algorithm>
#include <utility>

#include "adapters/pipewire/core/StreamBook.h"

namespace tarn::streams {

void StreamBook::cycleSeen(const CycleFacts& cycle) {
  const auto [known, isNew] = xruns_.try_emplace(cycle.driver, cycle.xruns);
  const bool hasXrun = !isNew && cycle.xruns > known->second;
  known->second = cycle.xruns;
  const bool allFinished = std::all_of(cycle.followers.begin(), cycle.followers.end(),
                                       [](const CycleFacts::Follower& follower) { return follower.finished; });
  for (const CycleFacts::Follower& follower : cycle.followers) {
    Stream* const stream = streamOf(follower.node);
    if (stream == nullptr || !stream->runs) continue;
    follow(*stream, cycle, follower, hasXrun && allFinished);
    if (stream->quantum != stream->said.quantum) {
      touch(follower.node, cycle.at);
    }
  }
}

// Cycles that are missed in a row are one overload, from the first of them to the one that is met again.
void StreamBook::follow(Stream& stream, const CycleFacts& cycle, const CycleFacts::Follower& follower,
                        bool driverWasLate) {
  stream.quantum = {cycle.frames, cycle.rate, follower.latencyFrames};
  if (follower.finished && !driverWasLate) {
    sayOverload(stream, cycle.at);
    return;
  }
  Overload& overload = stream.overload;
  if (overload.cycles++ == 0) {
    overload.frames = cycle.frames;
    overload.counter = cycle.counter;
    stream.overloadAt = cycle.at;
  }
}

void StreamBook::sayOverload(Stream& stream, Moment until) {
  Overload overload = std::exchange(stream.overload, {});
  if (overload.cycles == 0) return;
  overload.duration = std::max<Moment>(until - stream.overloadAt, 0);
  actions_.emplace_back(overloadMessage(occasion(stream, stream.overloadAt), overload));
}

// To the node's session, or those of all streams that are linked to the device.
void StreamBook::sayNodeError(ObjectId node, Moment at, const std::string& text) {
  if (streamOf(node) != nullptr) {
    sayError(node, at, "node-error", text);
    return;
  }
  std::set<ObjectId> others;
  for (const ObjectId link : graph_.nodes[node].links) {
    const LinkFacts& facts = graph_.links.at(link);
    others.insert(facts.output == node ? facts.input : facts.output);
  }
  for (const ObjectId other : others) {
    sayError(other, at, "device-error", text);
  }
}

void StreamBook::sayError(ObjectId node, Moment at, std::string_view what, const std::string& text) {
  Stream* const stream = streamOf(node);
  if (stream == nullptr || !begin(node, *stream, false)) return;
  actions_.emplace_back(errorMessage(occasion(*stream, at), what, text));
}

}  // namespace tarn::streams
