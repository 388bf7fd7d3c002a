#include "host/socket/ListenSocket.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <systemd/sd-daemon.h>

#include <cerrno>
#include <cstring>

#include "host/log/PrefixedLog.h"

namespace tarn::linux_host {

namespace {

bool fillAddress(const std::string& path, sockaddr_un& address) {
  address = {};
  address.sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address.sun_path) {
    return false;
  }
  std::memcpy(address.sun_path, path.data(), path.size());
  return true;
}

const sockaddr* generic(const sockaddr_un& address) {
  return reinterpret_cast<const sockaddr*>(&address);  // what the system's calls want
}

UniqueDescriptor makeSocket() {
  return UniqueDescriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
}

std::string lockPathOf(const std::string& path) {
  return path + ".lock";
}

// Takes the lock of the path; nothing when another service has it or an error came up.
UniqueDescriptor takeLock(const std::string& path, std::string& error) {
  const std::string lockPath = lockPathOf(path);
  for (;;) {
    UniqueDescriptor lock(::open(lockPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    if (!lock) {
      error = "can't open " + lockPath + errorSuffix(errno);
      return {};
    }
    if (::flock(lock.get(), LOCK_EX | LOCK_NB) != 0) {
      error = errno == EWOULDBLOCK ? "another service is listening on " + path
                                   : "can't lock " + lockPath + errorSuffix(errno);
      return {};
    }
    // The holder before may have removed the file between our open and our lock; then ours locks nothing.
    struct stat ours {};
    struct stat theirs {};
    if (::fstat(lock.get(), &ours) == 0 && ::stat(lockPath.c_str(), &theirs) == 0 && ours.st_ino == theirs.st_ino &&
        ours.st_dev == theirs.st_dev) {
      return lock;
    }
  }
}

// Makes room at the path: removes a socket file that nobody listens on. What stands in the way, or nothing.
std::string clearStale(const std::string& path, const sockaddr_un& address) {
  struct stat file {};
  if (::lstat(path.c_str(), &file) != 0) {
    return errno == ENOENT ? std::string() : "can't look at " + path + errorSuffix(errno);
  }
  if (!S_ISSOCK(file.st_mode)) {
    return path + " exists and is not a socket";
  }
  const UniqueDescriptor probe = makeSocket();
  if (!probe) {
    return "can't make a socket" + errorSuffix(errno);
  }
  if (::connect(probe.get(), generic(address), sizeof address) == 0 || errno == EAGAIN || errno == EPROTOTYPE) {
    return "another service is listening on " + path;
  }
  if (errno != ECONNREFUSED) {
    return "can't tell whether a service is listening on " + path + errorSuffix(errno);
  }
  if (::unlink(path.c_str()) != 0) {
    return "can't remove the stale socket " + path + errorSuffix(errno);
  }
  return {};
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
    ::unlink(lockPathOf(name_).c_str());
  }
  socket_.reset();
  lock_.reset();
}

ListenSocket::Result ListenSocket::takeHandedOver() {
  Result result;
  const int count = sd_listen_fds(1);
  if (count == 0) {
    return result;
  }
  if (count < 0) {
    result.error = "can't take the socket that was handed over" + errorSuffix(-count);
  } else if (count > 1) {
    result.error = std::to_string(count) + " sockets were handed over, one is expected";
  } else if (sd_is_socket_unix(SD_LISTEN_FDS_START, SOCK_STREAM, 1, nullptr, 0) <= 0) {
    result.error = "what was handed over is not a listening Unix stream socket";
  } else {
    result.socket.socket_ = UniqueDescriptor(SD_LISTEN_FDS_START);
    result.socket.name_ = "handed over";
    const int flags = ::fcntl(SD_LISTEN_FDS_START, F_GETFL);
    ::fcntl(SD_LISTEN_FDS_START, F_SETFL, flags | O_NONBLOCK);
  }
  return result;
}

ListenSocket::Result ListenSocket::claim(const std::string& path) {
  Result result;
  sockaddr_un address;
  if (!fillAddress(path, address)) {
    result.error = "can't listen on \"" + path + "\": a path of 1 to " + std::to_string(sizeof address.sun_path - 1) +
                   " bytes is expected";
    return result;
  }
  UniqueDescriptor lock = takeLock(path, result.error);
  if (!lock) {
    return result;
  }
  // From here on its end gives the lock back.
  ListenSocket socket;
  socket.name_ = path;
  socket.lock_ = std::move(lock);
  result.error = clearStale(path, address);
  if (result.error.empty()) {
    result.socket = std::move(socket);
  }
  return result;
}

std::string ListenSocket::listen(mode_t mode) {
  if (socket_) {
    return {};
  }
  sockaddr_un address;
  fillAddress(name_, address);
  UniqueDescriptor made = makeSocket();
  struct stat file {};
  // Until it listens nobody can connect, so nobody comes before the mode.
  if (!made || ::bind(made.get(), generic(address), sizeof address) != 0 || ::lstat(name_.c_str(), &file) != 0) {
    return "can't listen on " + name_ + errorSuffix(errno);
  }
  device_ = file.st_dev;
  inode_ = file.st_ino;
  if (::chmod(name_.c_str(), mode) != 0 || ::listen(made.get(), SOMAXCONN) != 0) {
    return "can't listen on " + name_ + errorSuffix(errno);
  }
  socket_ = std::move(made);
  return {};
}

}  // namespace tarn::linux_host
