// Listener and Connection: how clients reach the service. Threads: the platform's own, which on Linux is the thread
// that also serves the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "platform/UniqueFunction.h"

namespace tarn::platform {

class TarnReportingServiceProtocol;

class Connection {
 public:
  using Handler = UniqueFunction<void()>;

  virtual ~Connection() = default;
  // The peer's process ID, as the kernel saw it when the peer connected.
  virtual std::int32_t processIdentifier() const = 0;
  // A short text for the log: which peer this is.
  virtual std::string description() const = 0;
  // The object that serves the peer's requests. Set before resume().
  virtual void setExportedObject(std::shared_ptr<TarnReportingServiceProtocol> object) = 0;
  // Called when the connection broke (the peer was cut off or reset it); the invalidation handler follows.
  virtual void setInterruptionHandler(Handler handler) = 0;
  // Called once when the connection is over, after every request that came whole before the end.
  virtual void setInvalidationHandler(Handler handler) = 0;
  // Begins to deliver requests.
  virtual void resume() = 0;
};

class ListenerDelegate {
 public:
  virtual ~ListenerDelegate() = default;
  // Whether the connection is taken; when it is, the delegate has set it up and resumed it.
  virtual bool listenerShouldAcceptNewConnection(const std::shared_ptr<Connection>& connection) = 0;
};

class Listener {
 public:
  virtual ~Listener() = default;
  // Who is asked about each connection; set before resume().
  virtual void setDelegate(std::weak_ptr<ListenerDelegate> delegate) = 0;
  // Begins to accept.
  virtual void resume() = 0;
};

}  // namespace tarn::platform
