// SPDX-License-Identifier: Apache-2.0
// ListenSocket: the socket on which clients reach the service: handed over by the service manager, or bound to a path.
//
// A path belongs to one service at a time. Who holds the lock on PATH.lock may replace a stale socket file and remove
// its own at the end, so two services that start at once never take each other's file away. A socket that somebody
// listens on is never replaced, nor is a file that is no socket.
//
// Owned by the listener. Threads: one at a time.
#pragma once

#include <sys/types.h>

#include <string>

#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

struct ListenSockets;

class ListenSocket {
 public:
  // Owner and group may connect; who is in the group is for the installation to say.
  static constexpr mode_t kDefaultMode = 0660;
  // Of the admin socket: its owner alone.
  static constexpr mode_t kAdminMode = 0600;

  ListenSocket() = default;
  ListenSocket(ListenSocket&& other) noexcept;
  ListenSocket& operator=(ListenSocket&& other) noexcept;
  ListenSocket(const ListenSocket&) = delete;
  ListenSocket& operator=(const ListenSocket&) = delete;
  // Closes it; a socket file that listen() made is removed when it is still the same one, and so is the lock's. One
  // that was handed over stays with the service manager.
  ~ListenSocket();

  // The sockets that the service manager handed over (LISTEN_FDS), taken out of the environment, so that no child takes
  // them for its own. One of the name "admin" (LISTEN_FDNAMES) is the admin socket, one of any other name or without
  // one the ordinary socket. Those that it didn't hand over are left empty, which is no error; it is one when there are
  // two of a kind, or one that is not a listening Unix stream socket. To be called once, at the start.
  static Result<ListenSockets> takeHandedOver();
  // The right to this path, which no other service gets from here on; a socket file that nobody listens on is removed.
  // Nothing is there to connect to before listen(). An error is one line that names the path: another service has it
  // (EADDRINUSE), it is longer than a socket's address may be, it is no socket, or its folder can't be written. Never
  // waits for another service.
  static Result<ListenSocket> claim(const std::string& path);
  // Listens at the claimed path, with this file mode before anybody can connect; one that was handed over listens
  // already, and so does one that this was called for before. An error names the path.
  [[nodiscard]] Status listen(mode_t mode = kDefaultMode);

  // Doesn't block; -1 before listen(). It stays this object's.
  int descriptor() const noexcept { return socket_.get(); }
  // Whether there is one, claimed or listening.
  explicit operator bool() const noexcept { return socket_ || lock_; }
  // "/run/x/socket", "handed over" or "handed over as admin".
  // For log lines.
  const std::string& name() const noexcept { return name_; }
  // Where clients find it; empty when it has no place in the file system.
  std::string path() const;

 private:
  // What its end does, and another socket's taking its place.
  void close() noexcept;

  UniqueDescriptor socket_;
  UniqueDescriptor lock_;  // held while the file is ours
  std::string name_;
  dev_t device_ = 0;  // with the inode: which file is ours
  ino_t inode_ = 0;
};

// The sockets of a service; either may be missing.
struct ListenSockets {
  ListenSocket ordinary;
  ListenSocket admin;  // its clients may always see and do everything
};

}  // namespace tarn::linux_host
