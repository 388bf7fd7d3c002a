// SPDX-License-Identifier: Apache-2.0
#include "client/Socket.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/types.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <limits>
#include <system_error>
#include <utility>

namespace tarn::client {

namespace {

Result<Socket> failed(const char* what, const std::string& path, int errorNumber) {
  return {{}, Error{errorNumber, std::string(what) + " " + path + ": " + std::generic_category().message(errorNumber)}};
}

bool wouldWait(int errorNumber) noexcept {
  return errorNumber == EAGAIN || errorNumber == EINTR;
}

// A local socket has no room in its listener's line or is connected at once: there is nothing to wait for but time.
int connectUntil(int fd, const sockaddr_un& address, std::chrono::steady_clock::time_point deadline) noexcept {
  constexpr std::chrono::milliseconds kLongestPause(20);
  std::chrono::milliseconds pause(1);
  const auto* generic = reinterpret_cast<const sockaddr*>(&address);
  while (::connect(fd, generic, sizeof address) != 0) {
    if (errno == EINTR) continue;
    if (errno != EAGAIN) return errno;
    if (std::chrono::steady_clock::now() >= deadline) return ETIMEDOUT;
    ::poll(nullptr, 0, static_cast<int>(pause.count()));
    pause = std::min(2 * pause, kLongestPause);
  }
  return 0;
}

}  // namespace

Socket& Socket::operator=(Socket&& other) noexcept {
  if (this != &other) {
    close();
    fd_ = std::exchange(other.fd_, -1);
  }
  return *this;
}

Result<Socket> Socket::connect(const std::string& path, std::chrono::milliseconds timeout) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address.sun_path) {
    return failed("cannot connect to", path, path.empty() ? ENOENT : ENAMETOOLONG);
  }
  std::memcpy(address.sun_path, path.data(), path.size());
  Socket socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!socket.open()) return failed("cannot make a socket for", path, errno);
  const int error = connectUntil(socket.fd(), address, std::chrono::steady_clock::now() + timeout);
  if (error != 0) return failed("cannot connect to", path, error);
  const int flags = ::fcntl(socket.fd(), F_GETFL);
  if (flags < 0 || ::fcntl(socket.fd(), F_SETFL, flags & ~O_NONBLOCK) != 0) {
    return failed("cannot set up the socket for", path, errno);
  }
  return {std::move(socket), {}};
}

void Socket::limitReceiving(std::chrono::milliseconds timeout) noexcept {
  const auto microseconds = std::chrono::duration_cast<std::chrono::microseconds>(timeout).count();
  const std::int64_t limit = std::max<std::int64_t>(microseconds, 1);  // 0 would be for ever
  const timeval time{limit / 1000000, limit % 1000000};
  ::setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &time, sizeof time);
}

void Socket::close() noexcept {
  if (fd_ >= 0) {
    ::close(std::exchange(fd_, -1));
  }
}

std::ptrdiff_t Socket::sendSome(std::string_view bytes) noexcept {
  const ssize_t sent = ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
  return sent >= 0 ? sent : (wouldWait(errno) ? 0 : -1);
}

std::ptrdiff_t Socket::receiveSome(std::span<std::byte> space, bool mayWait) noexcept {
  const ssize_t received = ::recv(fd_, space.data(), space.size(), mayWait ? 0 : MSG_DONTWAIT);
  if (received > 0) return received;
  return received < 0 && wouldWait(errno) ? 0 : -1;
}

bool Socket::waitUntilReady(bool forWriting, std::chrono::milliseconds timeout) const noexcept {
  pollfd watched{fd_, static_cast<short>(forWriting ? POLLIN | POLLOUT : POLLIN), 0};
  constexpr std::int64_t kLongest = std::numeric_limits<int>::max();
  return ::poll(&watched, 1, static_cast<int>(std::clamp<std::int64_t>(timeout.count(), 0, kLongest))) > 0;
}

}  // namespace tarn::client
