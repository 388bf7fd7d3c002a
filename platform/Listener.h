// SPDX-License-Identifier: Apache-2.0
// Listener and Connection: how clients reach the service. Threads: the platform's own, which on Linux is the thread
// that also serves the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "platform/UniqueFunction.h"

namespace tarn::platform {

class TarnReportingServiceProtocol;

// One client's, from its acceptance to its end. The platform holds it until it is over, and it holds the exported
// object.
class Connection {
 public:
  // Runs once at the most, as work of the connection.
  using Handler = UniqueFunction<void()>;

  virtual ~Connection() = default;
  // The peer's process ID, as the kernel saw it when the peer connected; 0 when it lies outside of our process
  // namespace. By now another process may have it.
  virtual std::int32_t processIdentifier() const = 0;
  // By which the platform tells its connections apart, from 1; no number is given twice.
  virtual std::int64_t number() const = 0;
  // The user for whom the peer runs (its uid), likewise.
  virtual std::uint32_t user() const noexcept = 0;
  // A short text for the log: which peer this is. UTF-8, without a line end.
  virtual std::string description() const = 0;
  // The object that serves the peer's requests, held until the connection is over. Set before resume().
  virtual void setExportedObject(std::shared_ptr<TarnReportingServiceProtocol> object) = 0;
  // Called when the connection broke (the peer was cut off or reset it); the invalidation handler follows. Not called
  // for a peer that closed in order. Both are set before resume().
  virtual void setInterruptionHandler(Handler handler) = 0;
  // Called once when the connection is over, after every request that came whole before the end.
  virtual void setInvalidationHandler(Handler handler) = 0;
  // Begins to deliver requests, in the order in which they came. A connection that is never resumed delivers nothing
  // and ends with its last owner.
  virtual void resume() = 0;
};

// The service's side of accepting.
class ListenerDelegate {
 public:
  virtual ~ListenerDelegate() = default;
  // Whether the connection is taken; when it is, the delegate has set it up and resumed it. False: the platform closes
  // it.
  virtual bool listenerShouldAcceptNewConnection(const std::shared_ptr<Connection>& connection) = 0;
};

// One a socket.
class Listener {
 public:
  virtual ~Listener() = default;
  // Who is asked about each connection; set before resume(). While there is none, connections are refused.
  virtual void setDelegate(std::weak_ptr<ListenerDelegate> delegate) = 0;
  // Begins to accept; clients that connected before wait until then.
  virtual void resume() = 0;
};

}  // namespace tarn::platform
