// SPDX-License-Identifier: Apache-2.0
// SocketListener: accepts clients and hands each to the delegate as a connection.
//
// When the system has no descriptors left, or as many connections are open as may be, it stops accepting for a moment
// and tries again: the others wait in the socket's backlog, and the log tells it once.
//
// Owned by the platform; held by the loop as well while it accepts. Threads: the main loop's.
//
// A user that has as many connections as it may gets as many again that only say so, and beyond that clients are closed
// without a word, so that one user can't take every descriptor.
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
  // The host outlives the listener. `socket` listens, or was claimed and will by the time of resume(). Held by shared
  // pointers alone.
  SocketListener(ConnectionHost& host, ListenSocket socket, Access access = Access::Everything);
  SocketListener(const SocketListener&) = delete;
  SocketListener& operator=(const SocketListener&) = delete;
  ~SocketListener() override;

  // Decides on each client; without one, or when it has gone, clients are refused with an error line.
  void setDelegate(std::weak_ptr<platform::ListenerDelegate> delegate) override { delegate_ = std::move(delegate); }
  // Begins to accept, and says so in the log.
  void resume() override;
  // Accepts no more and removes the socket's file. Clients in the backlog are closed by the system, unless the service
  // manager keeps the socket; connections that are open stay.
  void close();

  // Accepts up to four clients; more wait for the next look at the sockets, as each costs about as much as a dozen
  // messages.
  void handleEvents(std::uint32_t events) override;

 private:
  // Watches the socket; where the system refuses that, it is tried again later.
  void startAccepting();
  // For 50 ms, and again as long as there is no room. Counted each time, logged the first.
  void pauseAccepting(const std::string& why);
  // Makes the connection and has the delegate decide, on behalf of that client.
  void take(UniqueDescriptor client);

  ConnectionHost& host_;
  ListenSocket socket_;
  const Access access_;  // of all clients that come
  // The service; weak, as it may end before the listener.
  std::weak_ptr<platform::ListenerDelegate> delegate_;
  // The loop watches the socket.
  bool accepting_ = false;
  bool shortage_ = false;  // logged, and nobody was accepted since
};

}  // namespace tarn::linux_host
