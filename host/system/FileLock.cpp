// SPDX-License-Identifier: Apache-2.0
#include "host/system/FileLock.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>

#include <cerrno>
#include <utility>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr int kNapMilliseconds = 1;

}  // namespace

Status FileLock::take(int descriptor, std::chrono::milliseconds patience) {
  // The kernel has no bounded wait for such a lock. Holders keep it for a few writes, so a short nap finds it free.
  const auto deadline = std::chrono::steady_clock::now() + patience;
  while (::flock(descriptor, LOCK_EX | LOCK_NB) != 0) {
    if (errno != EWOULDBLOCK && errno != EINTR) return lastSystemError();
    if (std::chrono::steady_clock::now() >= deadline) return systemError(ETIMEDOUT);
    ::poll(nullptr, 0, kNapMilliseconds);
  }
  return {};
}

Status FileLock::take(const std::string& path, std::chrono::milliseconds patience) {
  // Readable is all that a lock asks for, so one that another user made will do.
  UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0644));
  if (!file) return lastSystemError();
  Status taken = take(file.get(), patience);
  if (taken.ok()) {
    file_ = std::move(file);
  }
  return taken;
}

}  // namespace tarn::linux_host
