// ConnectionHost: what all connections of the listener share.
//
// Owned by the platform; outlives the listener and the connections. Threads: the main loop's, but for
// resumeRequests().
#pragma once

#include <unordered_set>

#include "host/loop/MainLoop.h"
#include "host/socket/ConnectionGate.h"
#include "host/socket/HostLimits.h"
#include "host/socket/Ledger.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

// A connection that is open.
class OpenConnection {
 public:
  virtual ~OpenConnection() = default;
  // From now on nothing more comes in: the connection ends as if its client had closed it now.
  virtual void endInput() = 0;
};

class ConnectionHost {
 public:
  using StatusSource = platform::UniqueFunction<plist::Dictionary()>;

  // Loop and log outlive the host, and the loop runs no more when the host ends.
  ConnectionHost(MainLoop& mainLoop, platform::Log& logSink, const HostLimits& hostLimits = {})
      : loop(mainLoop), log(logSink), limits(hostLimits), gate(mainLoop, hostLimits.maxQueuedWork) {
    loop.addTurnHook([this] { gate.releaseHeld(); });
  }
  ConnectionHost(const ConnectionHost&) = delete;
  ConnectionHost& operator=(const ConnectionHost&) = delete;

  // The answer to `status`; without one it is the ledger alone.
  void setStatusSource(StatusSource source) { status_ = std::move(source); }
  plist::Dictionary status() { return status_ ? status_() : ledger.status(0, loop.queue()->waiting(), {}); }

  // Connections note themselves while they are open.
  void add(OpenConnection& connection) { open_.insert(&connection); }
  void remove(OpenConnection& connection) { open_.erase(&connection); }
  // Ends all connections in order.
  void endInputs() {
    for (OpenConnection* connection : open_) {
      connection->endInput();
    }
  }

  // Tells that the pause source's answer changed. Threads: any.
  void resumeRequests() { loop.queue()->wake(); }

  MainLoop& loop;
  platform::Log& log;
  const HostLimits limits;
  Ledger ledger;
  ConnectionGate gate;
  // One for all connections: it keeps nothing between frames but scratch space and the key lists seen lately.
  wire::RequestDecoder decoder;
  wire::DecodedRequest request;
  wire::Refusal refusal;

 private:
  StatusSource status_;
  std::unordered_set<OpenConnection*> open_;
};

}  // namespace tarn::linux_host
