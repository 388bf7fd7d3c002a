// SPDX-License-Identifier: Apache-2.0
#include "host/check/SocketChecks.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <sstream>
#include <string_view>

#include "host/check/Places.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

using namespace std::string_view_literals;

constexpr int kPatienceMilliseconds = 5000;
constexpr std::size_t kMostSocketBytes = std::size_t{8} << 20U;
// [1, 100]: `status`, which a service answers whatever it is doing.
constexpr std::string_view kQuestion = "\x04\0\0\0\x82\x01\x18\x64"sv;
constexpr unsigned kListens = 0x10000;

// By the kernel's list, which a look at disturbs nobody: "Num: RefCount Protocol Flags Type St Inode Path".
bool isListenedOn(const std::string& path) {
  const auto sockets = readSmallFile("/proc/net/unix", kMostSocketBytes);
  std::istringstream lines(sockets.value);
  for (std::string line; std::getline(lines, line);) {
    std::istringstream words(line);
    std::string skipped;
    unsigned flags = 0;
    std::string where;
    words >> skipped >> skipped >> skipped >> std::hex >> flags >> skipped >> skipped >> skipped >> where;
    if ((flags & kListens) != 0 && where == path) return true;
  }
  return false;
}

// What keeps a service from answering there; empty: nothing.
std::string whySilent(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(address.sun_path, path.data(), path.size());
  const UniqueDescriptor client(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!client || ::connect(client.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    return lastSystemError().text;
  }
  if (::send(client.get(), kQuestion.data(), kQuestion.size(), MSG_NOSIGNAL) < 0) return lastSystemError().text;
  pollfd waiting{client.get(), POLLIN, 0};
  std::array<char, 16> answer{};
  if (::poll(&waiting, 1, kPatienceMilliseconds) <= 0) return "no answer within 5 s";
  const ssize_t size = ::recv(client.get(), answer.data(), answer.size(), 0);
  // A length, then an array of the request's id, no error and the result.
  return size >= 7 && std::string_view(answer.data() + 4, 3) == "\x83\x01\xf6"sv ? "" : "no answer of a service";
}

// A service that made its socket by itself holds the lock beside it.
std::string lockOf(const std::string& path) {
  return path + ".lock";
}

}  // namespace

Check checkSocketDirectory(const CheckSubject& subject) {
  const char* const name = "socket-directory";
  if (subject.isHandedOver) return good(name, "the service manager's to make");
  if (!subject.options.socketPath) {
    return bad(name, "neither --socket nor XDG_RUNTIME_DIR names a socket; name one with --socket");
  }
  const std::string folder = folderOf(*subject.options.socketPath);
  struct stat status {};
  if (::stat(folder.c_str(), &status) != 0) {
    const int error = errno;
    const std::string nearest = nearestOf(folder);
    if (error == ENOENT && subject.options.socketIsDefault && ::access(nearest.c_str(), W_OK | X_OK) == 0) {
      return good(name, folder + " isn't there, the service makes it");
    }
    return bad(name, folder + errorSuffix(error) + "; make it, for the service's user");
  }
  if (!S_ISDIR(status.st_mode)) return bad(name, folder + " is no folder; name another socket with --socket");
  const std::string what = folder + " of " + userText(status.st_uid) + ", mode " + modeText(status.st_mode);
  if ((status.st_mode & S_IWOTH) != 0 && (status.st_mode & S_ISVTX) == 0) {
    return bad(name, what + ": anybody may put a socket in its place; chmod o-w");
  }
  if (::access(folder.c_str(), W_OK | X_OK) == 0) return good(name, what);
  const int error = errno;
  // Where somebody listens already there is nothing to be made.
  if (isListenedOn(*subject.options.socketPath)) return good(name, what);
  return bad(name, what + errorSuffix(error) + "; give it to the service's user");
}

namespace {

// What is to be said of the socket at a path that `option` names.
Check checkSocketAt(const char* name, const std::string& path, const std::string& option, const CheckSubject& subject) {
  if (path.size() >= sizeof sockaddr_un{}.sun_path) {
    return bad(name, path + " is longer than the " + std::to_string(sizeof sockaddr_un{}.sun_path - 1) +
                         " bytes of a socket's address; name a shorter one with " + option);
  }
  struct stat status {};
  if (::lstat(path.c_str(), &status) != 0) {
    const int error = errno;
    if (error == ENOENT) return good(name, path + " isn't there, the service makes it");
    return bad(name, path + errorSuffix(error) + "; mend its folder");
  }
  if (!S_ISSOCK(status.st_mode)) return bad(name, path + " is no socket; remove it, or name another with " + option);
  if (!isListenedOn(path)) return good(name, path + " is stale, the service replaces it");
  const pid_t holder = lockHolder(lockOf(path));
  if (holder == 0 && !subject.unitFolders.empty()) return good(name, path + " is the service manager's");
  const std::string why = whySilent(path);
  if (!why.empty()) {
    return bad(name, path + " is taken by " + (holder > 0 ? "process " + std::to_string(holder) : "another program") +
                         ": " + why + "; end it, or name another with " + option);
  }
  return good(name, path + " answers" + (holder > 0 ? ", process " + std::to_string(holder) : ""));
}

bool isTheManagers(const std::string& path, const CheckSubject& subject) {
  return !subject.unitFolders.empty() && isListenedOn(path) && lockHolder(lockOf(path)) == 0;
}

}  // namespace

Check checkSocket(const CheckSubject& subject) {
  const char* const name = "socket";
  if (subject.isHandedOver) return good(name, "handed over by the service manager");
  if (!subject.options.socketPath) return bad(name, "none is named; name one with --socket");
  return checkSocketAt(name, *subject.options.socketPath, "--socket", subject);
}

Check checkAdminSocket(const CheckSubject& subject) {
  const char* const name = "admin-socket";
  const ServiceOptions& options = subject.options;
  if (subject.isHandedOver) return good(name, "handed over by the service manager");
  if (!options.adminSocketPath && !options.socketPath) return bad(name, "none is named; name one with --admin-socket");
  const std::string path = options.adminSocketPath.value_or(adminSocketPath(options.socketPath.value_or("")));
  if (options.socketPath && isTheManagers(*options.socketPath, subject) && !isListenedOn(path)) {
    return bad(name, path + " isn't the service manager's, as " + *options.socketPath +
                         " is; systemctl enable --now tarnreportingd-admin.socket");
  }
  return checkSocketAt(name, path, "--admin-socket", subject);
}

}  // namespace tarn::linux_host
