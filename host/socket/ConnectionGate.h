// ConnectionGate: whether requests may be taken now, and who waits until they may.
//
// Requests are not taken while too much work waits on the server queue, while a piece of it waits on purpose, or while
// the pause source says so (the recorder can't keep up). A connection then stops at its head request; accepting,
// `status` at the head of other connections and signals go on. Nothing is lost: what is not read waits in the sockets,
// and so clients are slowed.
//
// Owned by ConnectionHost. Threads: the main loop's.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "host/loop/MainLoop.h"
#include "platform/UniqueFunction.h"

namespace tarn::linux_host {

// A connection that stopped at its head request.
class HeldConnection {
 public:
  virtual ~HeldConnection() = default;
  // The gate is open: goes on where it stopped. May be held again.
  virtual void serveHeldRequest() = 0;
};

class ConnectionGate {
 public:
  // The loop outlives the gate.
  ConnectionGate(const MainLoop& loop, std::size_t maxQueuedWork) : loop_(loop), maxQueuedWork_(maxQueuedWork) {}
  ConnectionGate(const ConnectionGate&) = delete;
  ConnectionGate& operator=(const ConnectionGate&) = delete;

  // Asked for every request: must be cheap. Whoever answers true wakes the queue when that ends.
  void setPauseSource(platform::UniqueFunction<bool()> shouldPause) { shouldPause_ = std::move(shouldPause); }

  bool open() { return loop_.queue()->ready() < maxQueuedWork_ && !loop_.waits() && !(shouldPause_ && shouldPause_()); }
  void hold(std::shared_ptr<HeldConnection> connection) { held_.push_back(std::move(connection)); }
  // Lets the held go on, first come first, while the gate is open. Called once a turn.
  void releaseHeld();
  std::size_t heldCount() const noexcept { return held_.size(); }

 private:
  const MainLoop& loop_;
  std::size_t maxQueuedWork_;
  platform::UniqueFunction<bool()> shouldPause_;
  std::vector<std::shared_ptr<HeldConnection>> held_;
};

}  // namespace tarn::linux_host
