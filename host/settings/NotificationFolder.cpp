#include "host/settings/NotificationFolder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>

#include "host/log/PrefixedLog.h"
#include "host/settings/StateFolder.h"
#include "host/system/FileLock.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

constexpr unsigned kFolderMode = 0750;
constexpr mode_t kFileMode = 0640;
constexpr std::chrono::milliseconds kLockPatience{1000};
constexpr std::size_t kWordBytes = 8;

using Word = std::array<unsigned char, kWordBytes>;

std::optional<std::uint64_t> readWord(int file) {
  struct stat facts {};
  Word bytes{};
  if (::fstat(file, &facts) != 0 || !S_ISREG(facts.st_mode) ||
      ::pread(file, bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
    return std::nullopt;
  }
  std::uint64_t word = 0;
  for (std::size_t index = kWordBytes; index-- > 0;) {
    word = (word << 8U) | bytes[index];
  }
  return word;
}

// 0 or an errno value. One write: one post.
int writeWord(int file, std::uint64_t word) {
  Word bytes{};
  for (unsigned char& byte : bytes) {
    byte = static_cast<unsigned char>(word & 0xFFU);
    word >>= 8U;
  }
  const ssize_t written = ::pwrite(file, bytes.data(), bytes.size(), 0);
  if (written < 0) {
    return errno;
  }
  return written == static_cast<ssize_t>(bytes.size()) ? 0 : ENOSPC;
}

}  // namespace

int NotificationFolder::make() const {
  return makeFolder(path_, kFolderMode);
}

std::optional<std::uint64_t> NotificationFolder::state(std::string_view name) const {
  const std::string path = path_ + "/" + std::string(name);
  const UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW));
  return file ? readWord(file.get()) : std::nullopt;
}

std::string NotificationFolder::post(std::string_view name, std::optional<std::uint64_t> state) const {
  if (!isPlainName(name)) {
    return "\"" + std::string(name) + "\" can't name a notification";
  }
  if (const int error = make(); error != 0) {
    return path_ + errorSuffix(error);
  }
  const std::string path = path_ + "/" + std::string(name);
  struct stat facts {};
  const bool existed = ::stat(path.c_str(), &facts) == 0;
  const UniqueDescriptor file(
      ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW, kFileMode));
  if (!file) {
    return path + errorSuffix(errno);
  }
  if (!existed) {
    giveToFolderOwner(file.get(), path_);
  }
  int error = FileLock::take(file.get(), kLockPatience);
  if (error == 0) {
    error = writeWord(file.get(), state ? *state : readWord(file.get()).value_or(0));
  }
  return error == 0 ? std::string() : path + errorSuffix(error);
}

}  // namespace tarn::linux_host
