// SPDX-License-Identifier: Apache-2.0
#include "host/system/Files.h"

#include <sys/stat.h>
#include <unistd.h>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

Status writeAll(int descriptor, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t written = ::write(descriptor, bytes.data(), bytes.size());
    if (written >= 0) {
      bytes.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
}

Status createDirectories(const std::string& path, mode_t mode) {
  for (std::size_t slash = path.find('/', 1);; slash = path.find('/', slash + 1)) {
    const std::string part = path.substr(0, slash);
    if (::mkdir(part.c_str(), mode) != 0) {
      const int failure = errno;
      // A folder that is there may still refuse to be made, above a mount or on a read-only disk.
      struct stat facts {};
      const bool isThere = ::stat(part.c_str(), &facts) == 0 && S_ISDIR(facts.st_mode);
      if (!isThere) return systemError(failure == EEXIST ? ENOTDIR : failure);
    }
    if (slash == std::string::npos) return {};
  }
}

void giveToFolderOwner(int descriptor, const std::string& folder) noexcept {
  struct stat facts {};
  if (::geteuid() == 0 && ::stat(folder.c_str(), &facts) == 0 &&
      ::fchown(descriptor, facts.st_uid, facts.st_gid) != 0) {
    return;  // a disk without owners: then nobody misses one
  }
}

}  // namespace tarn::linux_host
