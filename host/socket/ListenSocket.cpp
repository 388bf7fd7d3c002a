// SPDX-License-Identifier: Apache-2.0
#include "host/socket/ListenSocket.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <systemd/sd-daemon.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string_view>
#include <vector>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

bool fillAddress(const std::string& path, sockaddr_un& address) {
  address = {};
  address.sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address.sun_path) return false;
  std::memcpy(address.sun_path, path.data(), path.size());
  return true;
}

const sockaddr* generic(const sockaddr_un& address) {
  return reinterpret_cast<const sockaddr*>(&address);  // what the system's calls want
}

UniqueDescriptor makeSocket() {
  return UniqueDescriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
}

Error isTaken(const std::string& path) {
  return {EADDRINUSE, "another service is listening on " + path};
}

constexpr std::string_view kLockSuffix = ".lock";
// By which the service manager names the admin socket.
constexpr std::string_view kAdminName = "admin";

std::string lockPathOf(const std::string& path) {
  return path + std::string(kLockSuffix);
}

// Takes the lock of the path; an error when another service has it.
Result<UniqueDescriptor> takeLock(const std::string& path) {
  const std::string lockPath = lockPathOf(path);
  for (;;) {
    UniqueDescriptor lock(::open(lockPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    if (!lock) return {{}, errorOf("can't open " + lockPath, errno)};
    if (::flock(lock.get(), LOCK_EX | LOCK_NB) != 0) {
      return {{}, errno == EWOULDBLOCK ? isTaken(path) : errorOf("can't lock " + lockPath, errno)};
    }
    // The holder before may have removed the file between our open and our lock; then ours locks nothing.
    struct stat ours {};
    struct stat theirs {};
    if (::fstat(lock.get(), &ours) == 0 && ::stat(lockPath.c_str(), &theirs) == 0 && ours.st_ino == theirs.st_ino &&
        ours.st_dev == theirs.st_dev) {
      return {std::move(lock), {}};
    }
  }
}

// Makes room at the path: removes a socket file that nobody listens on. An error is what stands in the way.
Status clearStale(const std::string& path, const sockaddr_un& address) {
  struct stat file {};
  if (::lstat(path.c_str(), &file) != 0) return errno == ENOENT ? Status() : errorOf("can't look at " + path, errno);
  if (!S_ISSOCK(file.st_mode)) return Error{0, path + " exists and is not a socket"};
  const UniqueDescriptor probe = makeSocket();
  if (!probe) return errorOf("can't make a socket", errno);
  if (::connect(probe.get(), generic(address), sizeof address) == 0 || errno == EAGAIN || errno == EPROTOTYPE) {
    return isTaken(path);
  }
  if (errno != ECONNREFUSED) return errorOf("can't tell whether a service is listening on " + path, errno);
  if (::unlink(path.c_str()) != 0) return errorOf("can't remove the stale socket " + path, errno);
  return {};
}

// The names of what was handed over, one for each descriptor in their order.
Result<std::vector<std::string>> takeHandedOverNames() {
  char** given = nullptr;
  const int count = sd_listen_fds_with_names(1, &given);
  if (count < 0) return {{}, errorOf("can't take the socket that was handed over", -count)};
  const std::unique_ptr<char*, decltype(&std::free)> list(given, &std::free);
  std::vector<std::string> names;
  for (int index = 0; index < count; ++index) {
    const std::unique_ptr<char, decltype(&std::free)> name(given[index], &std::free);
    names.emplace_back(name.get());
  }
  return {std::move(names), {}};
}

}  // namespace

ListenSocket::ListenSocket(ListenSocket&& other) noexcept {
  *this = std::move(other);
}

ListenSocket& ListenSocket::operator=(ListenSocket&& other) noexcept {
  if (this != &other) {
    close();
    socket_ = std::move(other.socket_);
    lock_ = std::move(other.lock_);
    name_ = std::move(other.name_);
    device_ = other.device_;
    inode_ = other.inode_;
  }
  return *this;
}

ListenSocket::~ListenSocket() {
  close();
}

void ListenSocket::close() noexcept {
  if (lock_) {
    struct stat file {};
    if (::lstat(name_.c_str(), &file) == 0 && file.st_dev == device_ && file.st_ino == inode_) {
      ::unlink(name_.c_str());
    }
    // Also when there is no memory for a path.
    std::array<char, sizeof(sockaddr_un) + kLockSuffix.size()> lockPath{};
    static_cast<void>(std::snprintf(lockPath.data(), lockPath.size(), "%s%s", name_.c_str(), kLockSuffix.data()));
    ::unlink(lockPath.data());
  }
  socket_.reset();
  lock_.reset();
}

Result<ListenSockets> ListenSocket::takeHandedOver() {
  Result<std::vector<std::string>> names = takeHandedOverNames();
  if (names.failed()) return {{}, std::move(names.error)};
  const auto admins = std::count(names.value.begin(), names.value.end(), kAdminName);
  const auto ordinary = static_cast<std::ptrdiff_t>(names.value.size()) - admins;
  if (ordinary > 1) return {{}, Error{0, std::to_string(ordinary) + " sockets were handed over, one is expected"}};
  if (admins > 1) return {{}, Error{0, std::to_string(admins) + " admin sockets were handed over, one is expected"}};
  ListenSockets sockets;
  int descriptor = SD_LISTEN_FDS_START;
  for (const std::string& name : names.value) {
    if (sd_is_socket_unix(descriptor, SOCK_STREAM, 1, nullptr, 0) <= 0) {
      return {{}, Error{0, "what was handed over is not a listening Unix stream socket"}};
    }
    const bool isAdmin = name == kAdminName;
    ListenSocket& taken = isAdmin ? sockets.admin : sockets.ordinary;
    taken.socket_ = UniqueDescriptor(descriptor);
    taken.name_ = isAdmin ? "handed over as admin" : "handed over";
    ::fcntl(descriptor, F_SETFL, ::fcntl(descriptor, F_GETFL) | O_NONBLOCK);
    ++descriptor;
  }
  return {std::move(sockets), {}};
}

std::string ListenSocket::path() const {
  if (lock_) return name_;
  sockaddr_un address{};
  socklen_t size = sizeof address;
  if (::getsockname(socket_.get(), reinterpret_cast<sockaddr*>(&address), &size) != 0) return {};
  const std::string_view place(address.sun_path, sizeof address.sun_path);
  return place.starts_with('/') ? std::string(place.substr(0, place.find('\0'))) : std::string();
}

Result<ListenSocket> ListenSocket::claim(const std::string& path) {
  sockaddr_un address;
  if (!fillAddress(path, address)) {
    return {{},
            Error{ENAMETOOLONG, "can't listen on \"" + path + "\": a path of 1 to " +
                                    std::to_string(sizeof address.sun_path - 1) + " bytes is expected"}};
  }
  Result<UniqueDescriptor> lock = takeLock(path);
  if (lock.failed()) return {{}, std::move(lock.error)};
  // From here on its end gives the lock back.
  ListenSocket socket;
  socket.name_ = path;
  socket.lock_ = std::move(lock.value);
  if (Status cleared = clearStale(path, address); cleared.failed()) return {{}, std::move(cleared)};
  return {std::move(socket), {}};
}

Status ListenSocket::listen(mode_t mode) {
  if (socket_) return {};
  sockaddr_un address;
  fillAddress(name_, address);
  UniqueDescriptor made = makeSocket();
  struct stat file {};
  // Until it listens nobody can connect, so nobody comes before the mode.
  if (!made || ::bind(made.get(), generic(address), sizeof address) != 0 || ::lstat(name_.c_str(), &file) != 0) {
    return errorOf("can't listen on " + name_, errno);
  }
  device_ = file.st_dev;
  inode_ = file.st_ino;
  if (::chmod(name_.c_str(), mode) != 0 || ::listen(made.get(), SOMAXCONN) != 0) {
    return errorOf("can't listen on " + name_, errno);
  }
  socket_ = std::move(made);
  return {};
}

}  // namespace tarn::linux_host
