// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/CleanMark.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <ctime>
#include <new>
#include <utility>

namespace tarn::recorder {

namespace {

// Longer than any line.
constexpr std::size_t kMostBytes = 256;

std::string readLine(const std::filesystem::path& path) {
  const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOFOLLOW | O_NOCTTY);
  if (file < 0) return {};
  std::array<char, kMostBytes> text{};
  const ssize_t bytes = ::read(file, text.data(), text.size());
  ::close(file);
  return {text.data(), bytes > 0 ? static_cast<std::size_t>(bytes) : 0};
}

// Changes are timed by a clock that moves once in milliseconds; this one moves with each nanosecond. Whether the file
// system keeps that.
bool giveOwnTime(const std::filesystem::path& path) {
  std::array<timespec, 2> times{};
  times[0].tv_nsec = UTIME_OMIT;
  struct stat status {};
  return ::clock_gettime(CLOCK_REALTIME, &times[1]) == 0 &&
         ::utimensat(AT_FDCWD, path.c_str(), times.data(), AT_SYMLINK_NOFOLLOW) == 0 &&
         ::lstat(path.c_str(), &status) == 0 && status.st_mtim.tv_nsec == times[1].tv_nsec;
}

}  // namespace

CleanMark::CleanMark(const std::filesystem::path& database, std::string boot)
    : database_(database),
      log_(database.string() + "-wal"),
      mark_(database.string() + ".clean"),
      boot_(std::move(boot)) {}

std::string CleanMark::lineOfNow() const {
  struct stat status {};
  if (::stat(log_.c_str(), &status) == 0 && status.st_size != 0) return {};
  if (boot_.empty() || ::lstat(database_.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return {};
  return boot_ + ' ' + std::to_string(status.st_ino) + ' ' + std::to_string(status.st_size) + ' ' +
         std::to_string(status.st_mtim.tv_sec) + ' ' + std::to_string(status.st_mtim.tv_nsec) + '\n';
}

bool CleanMark::take() noexcept {
  try {
    const std::string left = readLine(mark_);
    if (left.empty()) return false;
    // First the mark goes: it must not outlive what comes now.
    return ::unlink(mark_.c_str()) == 0 && left == lineOfNow();
  } catch (const std::bad_alloc&) {
    return false;
  }
}

void CleanMark::leave() noexcept {
  try {
    if (lineOfNow().empty() || !giveOwnTime(database_)) return;
    const std::string line = lineOfNow();
    ::unlink(mark_.c_str());
    const int file = ::open(mark_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW, 0640);
    if (file < 0) return;
    const ssize_t written = ::write(file, line.data(), line.size());
    ::close(file);
    if (written != static_cast<ssize_t>(line.size())) {
      ::unlink(mark_.c_str());
    }
  } catch (const std::bad_alloc&) {
    return;
  }
}

}  // namespace tarn::recorder
