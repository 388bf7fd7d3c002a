#include "host/settings/StateFolder.h"

#include <unistd.h>

#include <cerrno>

#include "host/system/Files.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumNameBytes = 200;  // leaves room for what the host's own files add to it
constexpr unsigned kStateDirectoryMode = 0750;

}  // namespace

bool isPlainName(std::string_view name) noexcept {
  return !name.empty() && name.size() <= kMaximumNameBytes && name.front() != '.' &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

int makeFolder(const std::string& path, unsigned mode) {
  const platform::MaybeError error = createDirectories(path, mode);
  return error ? static_cast<int>(error->code) : 0;
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
