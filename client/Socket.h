// SPDX-License-Identifier: Apache-2.0
// Socket: a connected Unix-domain stream socket, closed with its owner. Threads: one at a time.
//
// It knows nothing of frames: it moves bytes, as many as the system takes or has at once, and says when that is over.
#pragma once

#include <chrono>
#include <cstddef>
#include <span>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::client {

// Owns one descriptor, which programs that are started don't inherit. What may wait says so and for how long. Nothing
// here throws or raises a signal.
class Socket {
 public:
  Socket() noexcept = default;
  // Takes over the descriptor.
  explicit Socket(int fd) noexcept : fd_(fd) {}
  // The other one is closed afterwards.
  Socket(Socket&& other) noexcept : fd_(other.fd_) { other.fd_ = -1; }
  Socket& operator=(Socket&& other) noexcept;
  ~Socket() { close(); }

  // Connects to the socket at `path`, waiting at most so long for a listener that has others to accept first. The
  // error's number is the system's and its text names the path: ENAMETOOLONG where the path doesn't fit an address,
  // ETIMEDOUT when the time was up.
  static Result<Socket> connect(const std::string& path, std::chrono::milliseconds timeout);

  // -1 once it is closed.
  int fd() const noexcept { return fd_; }
  // How long receiving waits at most when it is told to wait; kept by the system, so that no poll is needed.
  void limitReceiving(std::chrono::milliseconds timeout) noexcept;
  bool open() const noexcept { return fd_ >= 0; }
  // Closing a closed one does nothing.
  void close() noexcept;

  // Bytes moved: more than 0, 0 when nothing can be moved now, -1 when the connection is over. Neither raises SIGPIPE;
  // sending never waits, receiving waits for the first byte when told to, at most as long as was set.
  std::ptrdiff_t sendSome(std::string_view bytes) noexcept;
  std::ptrdiff_t receiveSome(std::span<std::byte> space, bool mayWait) noexcept;
  // Waits until the socket can be read or, when asked, written. False when the time is over, or a signal came first.
  bool waitUntilReady(bool forWriting, std::chrono::milliseconds timeout) const noexcept;

 private:
  int fd_ = -1;
};

}  // namespace tarn::client
