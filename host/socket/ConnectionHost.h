// ConnectionHost: what all connections of the listener share.
//
// Owned by the platform; outlives the listener and the connections. Threads: the main loop's, but for
// resumeRequests().
#pragma once

#include "host/loop/MainLoop.h"
#include "host/ring/RingBoard.h"
#include "host/socket/ConnectionGate.h"
#include "host/socket/HostLimits.h"
#include "host/socket/Ledger.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "wire/RequestDecoder.h"

namespace tarn::linux_host {

class ConnectionHost {
 public:
  using StatusSource = platform::UniqueFunction<plist::Dictionary()>;

  // Loop and log outlive the host, and the loop runs no more when the host ends.
  ConnectionHost(MainLoop& mainLoop, platform::Log& logSink, const HostLimits& hostLimits = {})
      : loop(mainLoop),
        log(logSink),
        limits(hostLimits),
        gate(mainLoop, hostLimits.maxQueuedWork),
        rings(mainLoop, logSink) {
    loop.addTurnHook([this] { gate.releaseHeld(); });
  }
  ConnectionHost(const ConnectionHost&) = delete;
  ConnectionHost& operator=(const ConnectionHost&) = delete;

  // The answer to `status`; without one it is the ledger alone.
  void setStatusSource(StatusSource source) { status_ = std::move(source); }
  plist::Dictionary status() {
    plist::Dictionary answer = status_ ? status_() : ledger.status(0, loop.queue()->waiting(), {});
    rings.counts.describe(answer);
    return answer;
  }

  // Tells that the pause source's answer changed. Threads: any.
  void resumeRequests() { loop.queue()->wake(); }

  MainLoop& loop;
  platform::Log& log;
  const HostLimits limits;
  Ledger ledger;
  ConnectionGate gate;
  RingBoard rings;
  // One for all connections: it keeps nothing between frames but scratch space and the key lists seen lately.
  wire::RequestDecoder decoder;
  wire::DecodedRequest request;
  wire::Refusal refusal;

 private:
  StatusSource status_;
};

}  // namespace tarn::linux_host
