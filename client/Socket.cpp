#include "client/Socket.h"

#include <poll.h>
#include <sys/socket.h>
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

}  // namespace

Socket& Socket::operator=(Socket&& other) noexcept {
  if (this != &other) {
    close();
    fd_ = std::exchange(other.fd_, -1);
  }
  return *this;
}

Result<Socket> Socket::connect(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address.sun_path) {
    return failed("cannot connect to", path, path.empty() ? ENOENT : ENAMETOOLONG);
  }
  std::memcpy(address.sun_path, path.data(), path.size());
  Socket socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!socket.open()) return failed("cannot make a socket for", path, errno);
  const auto* generic = reinterpret_cast<const sockaddr*>(&address);
  int result = 0;
  do {
    result = ::connect(socket.fd(), generic, sizeof address);
  } while (result != 0 && errno == EINTR);
  if (result != 0) return failed("cannot connect to", path, errno);
  return {std::move(socket), {}};
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

bool Socket::waitUntilReady(bool forWriting, std::optional<std::chrono::milliseconds> timeout) const noexcept {
  pollfd watched{fd_, static_cast<short>(forWriting ? POLLIN | POLLOUT : POLLIN), 0};
  constexpr std::int64_t kLongest = std::numeric_limits<int>::max();
  const int wait = timeout ? static_cast<int>(std::clamp<std::int64_t>(timeout->count(), 0, kLongest)) : -1;
  return ::poll(&watched, 1, wait) > 0;
}

}  // namespace tarn::client
