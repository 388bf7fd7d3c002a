// SPDX-License-Identifier: Apache-2.0
// StreamBook: turns what happens in PipeWire's graph into what is to be reported of its streams.
//
//   events of the graph --> Graph (as it is now) --> StreamBook (what was said of it) --> actions
//
// A stream is a node that an application plays to or records from; it has one session from when it is seen to when it
// goes, and in it runs, from each time that sound flows to when it pauses. Several events make one change, as when a
// stream comes with its volume, its format and its links, so what changed is said when whoever feeds the book knows
// that all was told (`settle`). Times are those of the events. While a stream doesn't run nothing is said of it: each
// run begins with a message that tells all.
//
// Owned by the program's shell, or by a test. Threads: one at a time. It looks at no clock.
#pragma once

#include <map>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "adapters/pipewire/core/Graph.h"
#include "adapters/pipewire/core/GraphFacts.h"
#include "adapters/pipewire/core/Rules.h"
#include "adapters/pipewire/core/StreamActions.h"
#include "adapters/pipewire/core/StreamMessages.h"

namespace tarn::streams {

// A stream as a table shows it.
struct StreamView {
  StreamNumber number = 0;
  ObjectId node = 0;
  std::string application;
  std::string role;
  std::uint16_t serviceType = 0;
  bool isOutput = true;
  bool isReported = true;  // by the rules
  NodeState state = NodeState::Creating;
  StreamFacts facts;
};

class StreamBook {
 public:
  explicit StreamBook(Rules rules) : rules_(std::move(rules)) {}
  StreamBook(const StreamBook&) = delete;
  StreamBook& operator=(const StreamBook&) = delete;

  // Events. What is told of an object replaces what was told of it before.
  void clientKnown(ObjectId id, Properties properties);
  void nodeKnown(ObjectId id, Moment at, NodeFacts facts);
  void volumesKnown(ObjectId id, Moment at, VolumeFacts volumes);
  void formatKnown(ObjectId id, Moment at, std::optional<FormatFacts> format);
  void deviceKnown(ObjectId id, Moment at, Properties properties);
  void portKnown(ObjectId device, Moment at, bool isOutput, std::int32_t number, PortFacts port);
  void linkKnown(ObjectId id, Moment at, LinkFacts facts);
  void defaultKnown(Moment at, bool isSink, std::string name);
  void cycleSeen(const CycleFacts& cycle);
  // No cycles are told until further notice; xruns meanwhile are nobody's.
  void cyclesEnded() { xruns_.clear(); }
  void removed(ObjectId id, Moment at);
  // PipeWire is gone, or nobody looks any longer: all streams end and nothing is known.
  void end(Moment at, std::string_view reason);

  // All that belongs to what was told until now is told: says what changed.
  void settle();
  // The same in two steps, where more may be told in between: what was told until `prepare` is said by
  // `settlePrepared`.
  void prepare() { prepared_.merge(unsettled_); }
  void settlePrepared();
  bool isSettled() const { return unsettled_.empty() && prepared_.empty(); }
  // Whether, since the last call, a stream was said to play to or record from what isn't the default. PipeWire's server
  // tells nobody of a new default any longer once a client that asked for it went before it was answered, so that
  // whoever looks at the graph then asks for the default anew.
  bool takeDoubtOfDefault() { return std::exchange(doubtsDefault_, false); }
  // What is to be done since the last call.
  Actions take() { return std::exchange(actions_, {}); }

  // Whether any stream that is reported runs.
  bool anyRuns() const;
  std::vector<StreamView> look() const;

 private:
  struct Stream {
    StreamNumber number = 0;
    bool isOutput = true;
    bool isReported = true;
    bool hasBegun = false;
    bool runs = false;      // as it was said
    bool shallRun = false;  // as it is
    std::int64_t run = 0;   // number of the current or last one
    Moment runsSince = 0;   // when it began to run
    Moment active = 0;      // runs that are over, in all
    Moment changedAt = 0;   // the first change that wasn't said; 0: there is none
    StreamFacts said;
    Quantum quantum;
    Overload overload;  // of the cycles that were just missed; without any: no cycles
    Moment overloadAt = 0;
  };
  using Streams = std::map<ObjectId, Stream>;

  Stream* streamOf(ObjectId node);
  void enterStream(ObjectId node);
  void touch(ObjectId node, Moment at);
  void touchAll(Moment at);
  void settleStream(ObjectId node, bool mayWait);
  bool begin(ObjectId node, Stream& stream, bool mayWait);
  void start(Stream& stream, StreamFacts facts);
  void stop(Stream& stream, Moment at);
  void sayChanges(Stream& stream, StreamFacts facts);
  void doubtDefault(const Route& route) { doubtsDefault_ = doubtsDefault_ || (route.count > 0 && !route.isDefault); }
  void endStream(ObjectId node, Moment at, std::string_view reason);
  void follow(Stream& stream, const CycleFacts& cycle, const CycleFacts::Follower& follower, bool driverWasLate);
  void sayOverload(Stream& stream, Moment until);
  void sayError(ObjectId node, Moment at, std::string_view what, const std::string& text);
  void sayNodeError(ObjectId node, Moment at, const std::string& text);
  StreamFacts factsOf(ObjectId node, const Stream& stream) const;
  Occasion occasion(const Stream& stream, Moment at) const { return {stream.number, stream.isOutput, stream.run, at}; }

  Rules rules_;
  Graph graph_;
  Streams streams_;
  std::set<ObjectId> unsettled_, prepared_;
  std::map<ObjectId, std::int64_t> xruns_;  // of the drivers
  StreamNumber lastNumber_ = 0;
  bool doubtsDefault_ = false;
  Actions actions_;
};

}  // namespace tarn::streams
