#include "host/settings/StateFolder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "host/log/HostLog.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumNameBytes = 200;  // leaves room for what the host's own files add to it
constexpr mode_t kFileMode = 0640;
constexpr unsigned kStateDirectoryMode = 0750;

int writeAll(int descriptor, std::string_view content) {
  while (!content.empty()) {
    const ssize_t written = ::write(descriptor, content.data(), content.size());
    if (written >= 0) {
      content.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      return errno;
    }
  }
  return ::fsync(descriptor) == 0 ? 0 : errno;
}

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? "." : path.substr(0, slash + 1);
}

int syncFolderOf(const std::string& path) {
  const UniqueDescriptor opened(::open(folderOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return opened && ::fsync(opened.get()) == 0 ? 0 : errno;
}

int isFolder(const std::string& path) {
  struct stat facts {};
  if (::stat(path.c_str(), &facts) != 0) {
    return errno;
  }
  return S_ISDIR(facts.st_mode) ? 0 : ENOTDIR;
}

}  // namespace

bool isPlainName(std::string_view name) noexcept {
  return !name.empty() && name.size() <= kMaximumNameBytes && name.front() != '.' &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

int makeFolder(const std::string& path, unsigned mode) {
  for (std::size_t slash = path.find('/', 1);; slash = path.find('/', slash + 1)) {
    const std::string part = path.substr(0, slash);
    if (::mkdir(part.c_str(), mode) != 0 && errno != EEXIST) {
      const int error = errno;
      // A folder that is there may still refuse to be made, above a mount or on a read-only disk.
      if (isFolder(part) != 0) {
        return error;
      }
    }
    if (slash == std::string::npos) {
      return isFolder(path);
    }
  }
}

void giveToFolderOwner(int descriptor, const std::string& folder) noexcept {
  struct stat facts {};
  if (::geteuid() == 0 && ::stat(folder.c_str(), &facts) == 0 &&
      ::fchown(descriptor, facts.st_uid, facts.st_gid) != 0) {
    return;  // a disk without owners: then nobody misses one
  }
}

int replaceFile(const std::string& path, const std::string& temporary, std::string_view content) {
  struct stat old {};
  const bool existed = ::stat(path.c_str(), &old) == 0;
  const mode_t mode = existed ? old.st_mode & 07777U : kFileMode;
  UniqueDescriptor file(::open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, kFileMode));
  if (!file) {
    return errno;
  }
  if (!existed || ::geteuid() != 0 || ::fchown(file.get(), old.st_uid, old.st_gid) != 0) {
    giveToFolderOwner(file.get(), folderOf(path));
  }
  int error = ::fchmod(file.get(), mode) == 0 ? writeAll(file.get(), content) : errno;
  file.reset();
  if (error == 0 && ::rename(temporary.c_str(), path.c_str()) != 0) {
    error = errno;
  }
  if (error != 0) {
    ::unlink(temporary.c_str());
    return error;
  }
  return syncFolderOf(path);
}

std::string prepareStateDirectory(const std::string& path) {
  int error = makeFolder(path, kStateDirectoryMode);
  if (error == 0 && ::access(path.c_str(), R_OK | W_OK | X_OK) != 0) {
    error = errno;
  }
  return error == 0 ? std::string() : "state directory " + path + errorSuffix(error);
}

std::string holdStateDirectory(const std::string& path, FileLock& lock, std::chrono::milliseconds patience) {
  const int error = lock.take(path + "/.lock", patience);
  if (error == ETIMEDOUT) {
    return "another service uses the state directory " + path;
  }
  return error == 0 ? std::string() : "state directory " + path + errorSuffix(error);
}

}  // namespace tarn::linux_host
