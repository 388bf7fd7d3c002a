// SPDX-License-Identifier: Apache-2.0
#include "host/settings/NotificationFolder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>

#include "host/settings/PlainName.h"
#include "host/system/FileLock.h"
#include "host/system/Files.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

constexpr mode_t kFolderMode = 0750;
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

// One write: one post.
Status writeWord(int file, std::uint64_t word) {
  Word bytes{};
  for (unsigned char& byte : bytes) {
    byte = static_cast<unsigned char>(word & 0xFFU);
    word >>= 8U;
  }
  const ssize_t written = ::pwrite(file, bytes.data(), bytes.size(), 0);
  if (written < 0) return lastSystemError();
  return written == static_cast<ssize_t>(bytes.size()) ? Status() : systemError(ENOSPC);
}

}  // namespace

Status NotificationFolder::make() const {
  return createDirectories(path_, kFolderMode);
}

std::optional<std::uint64_t> NotificationFolder::state(std::string_view name) const {
  const std::string path = path_ + "/" + std::string(name);
  const UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW));
  return file ? readWord(file.get()) : std::nullopt;
}

Status NotificationFolder::post(std::string_view name, std::optional<std::uint64_t> state) const {
  if (!isPlainName(name)) return Error{EINVAL, "\"" + std::string(name) + "\" can't name a notification"};
  if (const Status made = make(); made.failed()) return errorOf(path_, *made);
  const std::string path = path_ + "/" + std::string(name);
  struct stat facts {};
  const bool existed = ::stat(path.c_str(), &facts) == 0;
  const UniqueDescriptor file(
      ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW, kFileMode));
  if (!file) return errorOf(path, errno);
  if (!existed) {
    giveToFolderOwner(file.get(), path_);
  }
  Status written = FileLock::take(file.get(), kLockPatience);
  if (written.ok()) {
    written = writeWord(file.get(), state ? *state : readWord(file.get()).value_or(0));
  }
  return written.ok() ? Status() : errorOf(path, *written);
}

}  // namespace tarn::linux_host
