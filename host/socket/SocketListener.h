// SocketListener: accepts clients and hands each to the delegate as a connection.
//
// When the system has no descriptors left, or as many connections are open as may be, it stops accepting for a moment
// and tries again: the others wait in the socket's backlog, and the log tells it once.
//
// Owned by the platform; held by the loop as well while it accepts. Threads: the main loop's.
#pragma once

#include <memory>

#include "host/socket/ConnectionHost.h"
#include "host/socket/ListenSocket.h"
#include "platform/Listener.h"

namespace tarn::linux_host {

class SocketListener final : public platform::Listener,
                             public EventHandler,
                             public std::enable_shared_from_this<SocketListener> {
 public:
  // The host outlives the listener.
  SocketListener(ConnectionHost& host, ListenSocket socket);
  SocketListener(const SocketListener&) = delete;
  SocketListener& operator=(const SocketListener&) = delete;
  ~SocketListener() override;

  void setDelegate(std::weak_ptr<platform::ListenerDelegate> delegate) override { delegate_ = std::move(delegate); }
  void resume() override;
  // Accepts no more and removes the socket's file. Connections that are open stay.
  void close();

  void handleEvents(std::uint32_t events) override;

 private:
  void startAccepting();
  void pauseAccepting(const std::string& why);
  void take(UniqueDescriptor client);

  ConnectionHost& host_;
  ListenSocket socket_;
  std::weak_ptr<platform::ListenerDelegate> delegate_;
  std::uint64_t nextNumber_ = 1;
  bool accepting_ = false;
  bool shortage_ = false;  // logged, and nobody was accepted since
};

}  // namespace tarn::linux_host
