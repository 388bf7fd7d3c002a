// SPDX-License-Identifier: Apache-2.0
#include "host/settings/StateDirectory.h"

#include <sys/types.h>
#include <unistd.h>

#include <cerrno>

#include "host/system/Files.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr mode_t kStateDirectoryMode = 0750;

}  // namespace

Status prepareStateDirectory(const std::string& path) {
  Status made = createDirectories(path, kStateDirectoryMode);
  if (made.ok() && ::access(path.c_str(), R_OK | W_OK | X_OK) != 0) {
    made = lastSystemError();
  }
  return made.ok() ? Status() : errorOf("state directory " + path, *made);
}

Status holdStateDirectory(const std::string& path, FileLock& lock, std::chrono::milliseconds patience) {
  const Status taken = lock.take(path + "/.lock", patience);
  if (taken.code() == ETIMEDOUT) return Error{ETIMEDOUT, "another service uses the state directory " + path};
  return taken.ok() ? Status() : errorOf("state directory " + path, *taken);
}

}  // namespace tarn::linux_host
