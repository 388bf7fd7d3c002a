// SPDX-License-Identifier: Apache-2.0
// RingBoard: all rings of the service: who is looked at, when, and what was counted.
//
// While any ring is awake, all are looked at once a turn of the loop, and by one timer where nothing else makes a turn:
// every RingLimits::lookEvery, or 25 times as rarely when rings only wait for the recorder. A ring without records for
// a while sleeps; its client then wakes us. So an idle service does nothing.
//
// Owned by what the connections share; outlives the connections. Threads: the main loop's.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <vector>

#include "host/loop/MainLoop.h"
#include "host/ring/ConnectionRings.h"
#include "host/ring/RingCounts.h"
#include "host/ring/RingLimits.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

class RingBoard {
 public:
  using CommitSource = platform::UniqueFunction<CommitPoint()>;

  // Loop and log outlive the board, and the loop runs no more when the board ends, as the look at the rings is a turn's
  // hook that stays.
  RingBoard(MainLoop& loop, platform::Log& log, const RingLimits& limits = {});
  RingBoard(const RingBoard&) = delete;
  RingBoard& operator=(const RingBoard&) = delete;
  ~RingBoard();

  // Where the recorder tells how far it is; asked once a look of a connection that waits for it. Without one everything
  // counts as committed once it is taken. Before the first connection.
  void setCommitSource(CommitSource source) { commits_ = std::move(source); }

  // The rings of a connection, made with its first request about one. Also forgets the connections that are gone.
  std::shared_ptr<ConnectionRings> connect(std::weak_ptr<RingOwner> owner);

  // For the connections: how far the recorder is now.
  CommitPoint commitPoint() { return commits_ ? commits_() : CommitPoint{}; }
  // Whether any connection has this memory open; two readers of one ring would each take the other's records.
  bool isOpen(const RingIdentity& identity) const noexcept;
  // Looks at these rings from now on until they sleep, beginning with the next turn, which this brings about. Does
  // nothing more for those that are looked at already.
  void activate(std::shared_ptr<ConnectionRings> rings);

  // What the connections' rings share with the board, open to them: they are parts of one thing in several files.
  MainLoop& loop;
  platform::Log& log;
  // As they were given; the connections keep to them.
  const RingLimits limits;
  RingCounts counts;
  // Set before the connections end because the service does: their clients live on and come again to the next one.
  bool serviceEnds = false;
  // One for all rings: it keeps nothing between records but scratch space. A record is decoded and handed on before the
  // next one is looked at, so `request` and `refusal` are free again each time.
  wire::RequestDecoder decoder;
  wire::DecodedRequest request;
  wire::Refusal refusal;

 private:
  // The turn's hook: every active connection has its turn once; those that fell asleep are dropped.
  void look();
  // Sees that there is a turn in time. One timer at most counts; an earlier moment replaces it.
  void armTimer(std::chrono::nanoseconds now);

  CommitSource commits_;
  // All connections', for isOpen(); those that are gone are removed with the next connection.
  std::vector<std::weak_ptr<ConnectionRings>> all_;
  // Those that are looked at. Held, so that what was published before a connection's end is served.
  std::vector<std::shared_ptr<ConnectionRings>> active_;
  std::vector<std::shared_ptr<ConnectionRings>> turn_;                           // those whose turn it is
  std::chrono::nanoseconds nextLook_ = std::chrono::nanoseconds::max();          // for which the timer is set
  const std::shared_ptr<RingBoard*> self_ = std::make_shared<RingBoard*>(this);  // for the timer, which may outlive us
};

}  // namespace tarn::linux_host
