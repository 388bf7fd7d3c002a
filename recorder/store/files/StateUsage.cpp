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
#include <functional>
#include <memory>
#include <new>
#include <sstream>
#include <string_view>
#include <system_error>
#include <tuple>
#include <utility>

namespace tarn::recorder {

namespace {

constexpr std::int64_t kShares = 32;
constexpr std::int64_t kLeastShare = 4;  // the database has a fourth at the least
constexpr double kSecondsADay = 86'400;

struct Found {
  std::filesystem::path path;
  std::int64_t bytes = 0;
  std::int64_t changed = 0;
};

// By the system's own calls: the standard library's walk ends the process when no memory is left for a name.
std::vector<Found> filesOf(const std::filesystem::path& folder, const std::function<bool(std::string_view)>& isOne) {
  std::vector<Found> found;
  const std::unique_ptr<DIR, int (*)(DIR*)> entries(::opendir(folder.c_str()), &::closedir);
  if (entries == nullptr) {
    if (errno == ENOMEM) throw std::bad_alloc();
    return found;
  }
  while (const dirent* const entry = ::readdir(entries.get())) {
    struct stat status {};
    if (!isOne(entry->d_name)) continue;
    if (::fstatat(::dirfd(entries.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
    if (!S_ISREG(status.st_mode)) continue;
    found.push_back({folder / entry->d_name, std::int64_t{status.st_size},
                     std::int64_t{status.st_mtim.tv_sec} * 1'000'000'000 + status.st_mtim.tv_nsec});
  }
  return found;
}

// Removes what is too old, then from the front until the rest is within the kind's share; what the rest takes.
std::int64_t keepWithin(const std::vector<Found>& files, const FileKind& kind, std::int64_t cap,
                        const StateUsage::AgeOf& ageOf, std::vector<StateUsage::Removed>& removed) {
  std::int64_t bytes = 0;
  for (const Found& file : files) {
    bytes += file.bytes;
  }
  std::vector<bool> isOld;
  for (const Found& file : files) {
    isOld.push_back(ageOf(file.path.string()) > kind.maxAgeDays * kSecondsADay);
  }
  for (const bool old : {true, false}) {
    for (std::size_t i = 0; i < files.size(); ++i) {
      if (old ? !isOld[i] : isOld[i] || bytes <= cap * kind.share / kShares) continue;
      std::error_code error;
      const Found& file = files[i];
      removed.reserve(removed.size() + 1);
      StateUsage::Removed told{file.path.filename().string(), kind.name, old};
      if (!std::filesystem::remove(file.path, error)) continue;
      bytes -= file.bytes;
      removed.push_back(std::move(told));
    }
  }
  return bytes;
}

// Of a folder with several kinds each file is of one.
bool isOf(const FileKind& kind, const std::vector<FileKind>& kinds, std::string_view name) {
  if (!kind.isRest) return name.ends_with(kind.suffix);
  return std::none_of(kinds.begin(), kinds.end(), [&](const FileKind& other) {
    return !other.isRest && other.folder == kind.folder && name.ends_with(other.suffix);
  });
}

std::int64_t sizeOf(const std::string& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
}

}  // namespace

std::vector<StateUsage::Removed> StateUsage::tidy(const AgeOf& ageOf) {
  std::vector<Removed> removed;
  const std::string prefix = file_.filename().string() + ".damaged-";
  std::vector<Found> aside = filesOf(aside_.folder, [&](std::string_view name) { return name.starts_with(prefix); });
  std::sort(aside.begin(), aside.end(), [](const Found& one, const Found& other) { return one.path > other.path; });
  beside_ = keepWithin(aside, aside_, cap_, ageOf, removed);
  for (const FileKind& kind : kinds_) {
    std::vector<Found> files = filesOf(kind.folder, [&](std::string_view name) { return isOf(kind, kinds_, name); });
    std::sort(files.begin(), files.end(), [](const Found& one, const Found& other) {
      return std::tie(one.changed, one.path) < std::tie(other.changed, other.path);
    });
    beside_ += keepWithin(files, kind, cap_, ageOf, removed);
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
