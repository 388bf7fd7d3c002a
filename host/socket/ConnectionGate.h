// SPDX-License-Identifier: Apache-2.0
// ConnectionGate: whether requests may be taken now.
//
// Requests are not taken while too much work waits on the server queue, while a piece of it waits on purpose, or while
// the pause source says so (the recorder can't keep up). A connection then stops at its head request, and work that is
// done in slices at its next slice; accepting, `status` at the head of other connections and signals go on. Nothing is
// lost: what is not read waits in the sockets, and so clients are slowed.
//
// Before it comes to that, it may be crowded: then those that made it so stop first, and the others go on.
//
// Owned by ConnectionHost. Threads: the main loop's.
#pragma once

#include <cstddef>
#include <utility>

#include "host/loop/MainLoop.h"
#include "platform/UniqueFunction.h"

namespace tarn::linux_host {

class ConnectionGate {
 public:
  // The loop outlives the gate. `maxQueuedWork` counts pieces of the queue's own list: work of lanes is bounded by one
  // request each.
  ConnectionGate(const MainLoop& loop, std::size_t maxQueuedWork) : loop_(loop), maxQueuedWork_(maxQueuedWork) {}
  ConnectionGate(const ConnectionGate&) = delete;
  ConnectionGate& operator=(const ConnectionGate&) = delete;

  // Asked for every request: must be cheap. Whoever answers true wakes the queue when that ends, or connections would
  // wait for the next event. Set before anything runs; without one only the queue counts.
  void setPauseSource(platform::UniqueFunction<bool()> shouldPause) { shouldPause_ = std::move(shouldPause); }

  // Asked likewise, and only while the gate is open: whether there is little room left.
  void setCrowdSource(platform::UniqueFunction<bool()> isCrowded) { isCrowded_ = std::move(isCrowded); }

  // Whether a request may be taken: a few loads and a question, nothing is changed.
  bool open() { return loop_.queue()->ready() < maxQueuedWork_ && !loop_.waits() && !(shouldPause_ && shouldPause_()); }

  // Whether those that took much of what was done lately are to wait now; never without a source.
  bool crowded() { return isCrowded_ && isCrowded_(); }

  // Connections that stopped at a request; each tells when it stops and when it goes on or ends.
  void countHeld() noexcept { ++held_; }
  void countReleased() noexcept { --held_; }
  std::size_t heldCount() const noexcept { return held_; }

 private:
  const MainLoop& loop_;
  // HostLimits::maxQueuedWork.
  std::size_t maxQueuedWork_;
  platform::UniqueFunction<bool()> shouldPause_;
  platform::UniqueFunction<bool()> isCrowded_;
  std::size_t held_ = 0;
};

}  // namespace tarn::linux_host
