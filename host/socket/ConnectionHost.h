// SPDX-License-Identifier: Apache-2.0
// ConnectionHost: what all connections of the listener share: limits, the ledger, the gate, the turns, what is under
// way, and the scratch space of decoding. It knows no connection but as one that is open and can be ended.
//
//   a turn of the loop:  the queue's own work -> the rings' look -> serveShares(): turns of connections -> flushes
//
// Owned by the platform; outlives the listener and the connections. Threads: the main loop's, but for resumeRequests().
#pragma once

#include <unordered_set>
#include <utility>

#include "host/loop/MainLoop.h"
#include "host/ring/RingBoard.h"
#include "host/socket/ConnectionEnds.h"
#include "host/socket/ConnectionGate.h"
#include "host/socket/FairShares.h"
#include "host/socket/HalfFrames.h"
#include "host/socket/HostLimits.h"
#include "host/socket/Ledger.h"
#include "host/socket/Quotas.h"
#include "host/socket/UserSessions.h"
#include "host/system/MemoryReserve.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

// A connection that is open.
class OpenConnection {
 public:
  virtual ~OpenConnection() = default;
  // From now on nothing more comes in: the connection ends as if its client had closed it now. What had come is served,
  // the end is the usual one. Again does nothing more.
  virtual void endInput() = 0;
  // Tells its user's quotas what its sessions' logs take now, which others' messages change too.
  virtual void noteLogBytes() = 0;
  // The host ends now, and is asked for nothing afterwards, whoever holds the connection still.
  virtual void leaveHost() noexcept = 0;
};

// What the clients of a socket may see and do.
enum class Access : std::uint8_t {
  Everything,
  OwnSessions,  // sees its user's sessions alone, and doesn't end the service
};

class ConnectionHost {
 public:
  // Who answers `status`, and who says when everything is committed: the platform, which alone knows the service and
  // the recorder. With a user, the answer names that one and no other; its totals are the same.
  using StatusSource = platform::UniqueFunction<plist::Dictionary(std::optional<std::uint32_t> onlyUser)>;
  using SettleSource = platform::UniqueFunction<void(platform::Work done)>;

  // Loop and log outlive the host, and the loop runs no more when the host ends: the turn's hooks and the queue's pause
  // source that it leaves there call back here.
  ConnectionHost(MainLoop& mainLoop, platform::Log& logSink, const HostLimits& hostLimits = {})
      : loop(mainLoop),
        log(logSink),
        limits(hostLimits),
        gate(mainLoop, hostLimits.maxQueuedWork),
        halfFrames(hostLimits.halfFrameTime, hostLimits.quotas.waitingBytes),
        rings(mainLoop, logSink) {
    loop.queue()->setPauseSource([this] { return !takesFrom(shares.served()); });
    loop.addTurnHook([this] { serveShares(); });
  }
  ConnectionHost(const ConnectionHost&) = delete;
  ConnectionHost& operator=(const ConnectionHost&) = delete;
  // Leaves the connections that are open still, as at an end whose time was up, to whoever holds them.
  ~ConnectionHost() {
    for (OpenConnection* connection : std::exchange(open_, {})) {
      connection->leaveHost();
    }
  }

  // The answer to `status`; without one it is the ledger alone, as in tests. Asked at the request, so what it costs
  // holds up everybody.
  void setStatusSource(StatusSource source) { status_ = std::move(source); }
  // A dictionary of counts and levels of this moment, the rings' among them.
  plist::Dictionary status(std::optional<std::uint32_t> onlyUser = std::nullopt) {
    plist::Dictionary answer = status_ ? status_(onlyUser) : ledger.status(0, loop.queue()->waiting(), {});
    rings.counts.describe(answer);
    return answer;
  }

  // Connections note themselves while they are open; this holds none of them.
  void add(OpenConnection& connection) { open_.insert(&connection); }
  void remove(OpenConnection& connection) { open_.erase(&connection); }
  // Ends all connections in order, as when a signal ends the service. They end one after another in later turns.
  void endInputs() {
    rings.serviceEnds = true;
    for (OpenConnection* connection : open_) {
      connection->endInput();
    }
  }

  // Takes over the bounds that may change while the service runs: the quotas and those of half frames at once, the
  // longest frame for connections that come. Who has more than a quota by now keeps it, and gets no more.
  void adopt(const HostLimits& changed) {
    limits.maxFrameBytes = changed.maxFrameBytes;
    limits.quotas = changed.quotas;
    limits.halfFrameTime = changed.halfFrameTime;
    halfFrames.setBounds(changed.halfFrameTime, changed.quotas.waitingBytes);
    watchHalfFrames();
  }

  // The quotas with what everybody has of them now, or only this user; part of `status`.
  plist::Dictionary quotaUse(std::optional<std::uint32_t> onlyUser = std::nullopt) {
    shares.forEachParty([](ShareParty& party) { party.largestLog = 0; });
    for (OpenConnection* connection : open_) {
      connection->noteLogBytes();
    }
    return quotaStatus(limits.quotas, shares, onlyUser);
  }

  // How `settle` finds out that what was handed over so far is committed; `done` is work of the server queue then, and
  // is destroyed uncalled when it never will be. Without one there is nothing to commit. Set before anything runs.
  void setSettleSource(SettleSource source) { settle_ = std::move(source); }
  // Calls `done` when everything that was handed over before is on the disk, what the ends of connections made
  // included; `failed` when memory is missing to find that out. Of the two at most one is called.
  void settle(platform::Work done, platform::Work failed) {
    ends.afterThese([this, done = std::move(done), failed = std::move(failed)]() mutable {
      if (!settle_) {
        done();
      } else if (!MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { settle_(std::move(done)); })) {
        failed();
      }
    });
  }

  // Whether requests of this user may be taken now, and its long work may go on; null: of one that isn't known. False
  // for everybody while the gate is shut, and for heavy users while it is crowded.
  bool takesFrom(const ShareParty* party) {
    return gate.open() && (party == nullptr || !gate.crowded() || !shares.isHeavy(*party));
  }

  // Looks after half frames as long as there are some: by one timer at an eighth of the time that they have, and at
  // once when they are too many bytes. While the gate is shut nothing is read, so nobody can complete one, and their
  // time begins anew.
  void watchHalfFrames() {
    if (halfFrames.overfull()) {
      halfFrames.sweep(loop.clock().monotonic());
    }
    if (halfFrames.empty() || watchesHalfFrames_) return;
    const WorkLane::Scope nobodys(nullptr);
    loop.queue()->asyncAfter(limits.halfFrameTime / kLooksAtHalfFrames, [this] {
      watchesHalfFrames_ = false;
      if (gate.open()) {
        MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [this] { halfFrames.sweep(loop.clock().monotonic()); });
      } else {
        halfFrames.restart(loop.clock().monotonic());
      }
      watchHalfFrames();
    });
    watchesHalfFrames_ = true;
  }

  // Tells that the pause source's answer changed: there is one more turn, in which the held requests are looked at.
  // Threads: any.
  void resumeRequests() { loop.queue()->wake(); }

  // The parts that connections use, open to them: each has its own header and says there what it does.
  MainLoop& loop;
  platform::Log& log;
  HostLimits limits;  // changed by adopt() alone
  Ledger ledger;
  ConnectionGate gate;
  FairShares shares;
  UserSessions sessions;
  ConnectionEnds ends;
  HalfFrames halfFrames;
  // After the loop and the log, on which it stands.
  RingBoard rings;
  // One for all connections: it keeps nothing between frames but scratch space and the key lists seen lately. A request
  // is served or held before the next one is decoded, so `request` and `refusal` are free again each time.
  wire::RequestDecoder decoder;
  wire::DecodedRequest request;
  wire::Refusal refusal;
  // Of the next connection, on whichever socket it comes; no number is given twice.
  std::uint64_t nextConnection = 1;
  // Whether replies to a client that has more requests waiting may be gathered over some turns, which saves system
  // calls; not at the end of the process, when there may be no further turn.
  bool gathersReplies = true;

 private:
  // Cost of the requests that are served before the sockets are looked at again, in units of about a microsecond: a
  // client that sends a request now waits for this much of the others'. A lone client need not give way, so a look at
  // the sockets is shared by more requests.
  static constexpr std::int64_t kCostPerTurn = 64;
  static constexpr std::int64_t kCostPerTurnAlone = 512;
  // Within the time that a half frame may take: one that is late is cut off at most an eighth later.
  static constexpr int kLooksAtHalfFrames = 8;

  // The turn's hook. When the budget is used up and somebody could go on, the loop doesn't sleep.
  void serveShares() {
    const bool more = shares.serve(ledger.connectionsOpen > 1 ? kCostPerTurn : kCostPerTurnAlone,
                                   [this](const ShareParty& party) { return takesFrom(&party); });
    if (more) {
      loop.queue()->wake();
    }
  }

  StatusSource status_;
  // From their resume() to their end.
  std::unordered_set<OpenConnection*> open_;
  SettleSource settle_;
  // A timer is set.
  bool watchesHalfFrames_ = false;
};

}  // namespace tarn::linux_host
