// SPDX-License-Identifier: Apache-2.0
// RawSocket: a client that speaks bytes, for what no client library would send. Threads: one at a time.
#pragma once

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>

#include "tests/e2e/support/Programs.h"

namespace tarn::e2e {

class RawSocket {
 public:
  explicit RawSocket(const std::string& path) : fd_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.data(), path.size());
    isConnected_ = ::connect(fd_, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    timeval patience{kDeadline.count(), 0};
    ::setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    ::setsockopt(fd_, SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
  }
  ~RawSocket() { close(); }
  RawSocket(const RawSocket&) = delete;
  RawSocket& operator=(const RawSocket&) = delete;

  bool isConnected() const { return isConnected_; }
  // Whether the service took all of it.
  bool send(std::string_view bytes) {
    while (!bytes.empty()) {
      const ssize_t count = ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
      if (count <= 0) return false;
      bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
  }
  bool sendFrame(std::string_view body) { return send(frame(body)); }
  // The next frame's body; empty at the end of the connection or of the patience.
  std::string receiveFrame() {
    const std::string header = receiveBytes(4);
    if (header.size() != 4) return {};
    std::uint32_t length = 0;
    for (std::size_t index = 0; index < 4; ++index) {
      length |= static_cast<std::uint32_t>(static_cast<unsigned char>(header[index])) << (8 * index);
    }
    return receiveBytes(length);
  }
  // Whether the service ended the connection; what it still sent is passed over.
  bool isAtEnd() {
    char byte = 0;
    ssize_t count = 0;
    do {
      count = ::recv(fd_, &byte, 1, 0);
    } while (count > 0);
    return count == 0 || errno == ECONNRESET;
  }
  void close() {
    if (fd_ >= 0) {
      ::close(fd_);
      fd_ = -1;
    }
  }

  static std::string frame(std::string_view body) {
    std::string bytes;
    for (std::size_t index = 0; index < 4; ++index) {
      bytes.push_back(static_cast<char>(body.size() >> (8 * index) & 0xFFU));
    }
    return bytes + std::string(body);
  }

 private:
  std::string receiveBytes(std::size_t wanted) {
    std::string bytes(wanted, '\0');
    std::size_t have = 0;
    while (have < wanted) {
      const ssize_t count = ::recv(fd_, bytes.data() + have, wanted - have, 0);
      if (count <= 0) return {};
      have += static_cast<std::size_t>(count);
    }
    return bytes;
  }

  int fd_;
  bool isConnected_ = false;
};

}  // namespace tarn::e2e
