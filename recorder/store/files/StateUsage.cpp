// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/StateUsage.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <memory>
#include <new>
#include <sstream>
#include <string_view>
#include <system_error>
#include <tuple>

namespace tarn::recorder {

namespace {

constexpr std::int64_t kAsideShare = 4;   // a fourth of the cap
constexpr std::int64_t kFolderShare = 8;  // an eighth of it, each folder
constexpr std::int64_t kLeastShare = 4;   // the database has a fourth at the least

struct Found {
  std::filesystem::path path;
  std::int64_t bytes = 0;
  std::int64_t changed = 0;
};

// By the system's own calls: the standard library's walk ends the process when no memory is left for a name.
std::vector<Found> filesOf(const std::filesystem::path& folder, std::string_view prefix) {
  std::vector<Found> found;
  const std::unique_ptr<DIR, int (*)(DIR*)> entries(::opendir(folder.c_str()), &::closedir);
  if (entries == nullptr) {
    if (errno == ENOMEM) throw std::bad_alloc();
    return found;
  }
  while (const dirent* const entry = ::readdir(entries.get())) {
    struct stat status {};
    if (!std::string_view(entry->d_name).starts_with(prefix)) continue;
    if (::fstatat(::dirfd(entries.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
    if (!S_ISREG(status.st_mode)) continue;
    found.push_back({folder / entry->d_name, std::int64_t{status.st_size},
                     std::int64_t{status.st_mtim.tv_sec} * 1'000'000'000 + status.st_mtim.tv_nsec});
  }
  return found;
}

// Removes from the front until the rest is within the share; what the rest takes.
std::int64_t keepWithin(const std::vector<Found>& files, std::int64_t share, std::vector<std::string>& removed) {
  std::int64_t bytes = 0;
  for (const Found& file : files) {
    bytes += file.bytes;
  }
  for (const Found& file : files) {
    if (bytes <= share) break;
    std::error_code error;
    if (!std::filesystem::remove(file.path, error)) continue;
    bytes -= file.bytes;
    removed.push_back(file.path.filename().string());
  }
  return bytes;
}

std::int64_t sizeOf(const std::string& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
}

}  // namespace

std::vector<std::string> StateUsage::tidy() {
  std::vector<std::string> removed;
  std::vector<Found> aside = filesOf(file_.parent_path(), file_.filename().string() + ".damaged-");
  std::sort(aside.begin(), aside.end(), [](const Found& one, const Found& other) { return one.path > other.path; });
  beside_ = keepWithin(aside, cap_ / kAsideShare, removed);
  for (const std::filesystem::path& folder : folders_) {
    std::vector<Found> files = filesOf(folder, "");
    std::sort(files.begin(), files.end(), [](const Found& one, const Found& other) {
      return std::tie(one.changed, one.path) < std::tie(other.changed, other.path);
    });
    beside_ += keepWithin(files, cap_ / kFolderShare, removed);
  }
  beside_ += sizeOf(file_.string() + "-shm") + sizeOf(file_.string() + ".counts");
  return removed;
}

std::int64_t StateUsage::databaseBytes(std::int64_t logBytes) const noexcept {
  const std::int64_t others = others_ ? others_->load() : 0;
  return std::max(cap_ - beside_ - others - logBytes, cap_ / kLeastShare);
}

// A line of the kernel's: "1: POSIX  ADVISORY  READ 1234 fd:01:5678 123 127".
std::vector<std::string> readersOf(const std::filesystem::path& database) {
  constexpr std::int64_t kFirstReadLock = 123;
  constexpr std::int64_t kLastReadLock = 127;
  std::vector<std::string> readers;
  struct stat status {};
  if (::stat((database.string() + "-shm").c_str(), &status) != 0) return readers;
  std::ostringstream place;
  place << std::hex;
  place.width(2);
  place.fill('0');
  place << major(status.st_dev) << ':';
  place.width(2);
  place << minor(status.st_dev) << ':' << std::dec << status.st_ino;
  std::ifstream locks("/proc/locks");
  for (std::string line; std::getline(locks, line);) {
    std::istringstream words(line);
    std::string number;
    std::string kind;
    std::string manner;
    std::string access;
    std::string file;
    std::int64_t process = 0;
    std::int64_t first = 0;
    std::int64_t last = 0;
    words >> number >> kind >> manner >> access >> process >> file >> first >> last;
    if (!words || access != "READ" || file != place.str() || process <= 0 || process == ::getpid()) continue;
    if (last < kFirstReadLock || first > kLastReadLock) continue;
    std::string name;
    std::ifstream command("/proc/" + std::to_string(process) + "/comm");
    std::getline(command, name);
    readers.push_back(std::to_string(process) + " (" + name + ")");
  }
  return readers;
}

}  // namespace tarn::recorder
