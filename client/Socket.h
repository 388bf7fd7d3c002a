// Socket: a connected Unix-domain stream socket, closed with its owner. Threads: one at a time.
#pragma once

#include <chrono>
#include <cstddef>
#include <span>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::client {

class Socket {
 public:
  Socket() noexcept = default;
  explicit Socket(int fd) noexcept : fd_(fd) {}
  Socket(Socket&& other) noexcept : fd_(other.fd_) { other.fd_ = -1; }
  Socket& operator=(Socket&& other) noexcept;
  ~Socket() { close(); }

  // Connects to the socket at `path`, waiting at most so long for a listener that has others to accept first. An error
  // names the path; ETIMEDOUT: it had no time.
  static Result<Socket> connect(const std::string& path, std::chrono::milliseconds timeout);

  int fd() const noexcept { return fd_; }
  // How long receiving waits at most when it is told to wait.
  void limitReceiving(std::chrono::milliseconds timeout) noexcept;
  bool open() const noexcept { return fd_ >= 0; }
  void close() noexcept;

  // Bytes moved: more than 0, 0 when nothing can be moved now, -1 when the connection is over. Neither raises SIGPIPE;
  // sending never waits, receiving waits for the first byte when told to, at most as long as was set.
  std::ptrdiff_t sendSome(std::string_view bytes) noexcept;
  std::ptrdiff_t receiveSome(std::span<std::byte> space, bool mayWait) noexcept;
  // Waits until the socket can be read or, when asked, written. False when the time is over.
  bool waitUntilReady(bool forWriting, std::chrono::milliseconds timeout) const noexcept;

 private:
  int fd_ = -1;
};

}  // namespace tarn::client
