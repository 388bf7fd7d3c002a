#include "recorder/store/StateUsage.h"

#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <sstream>
#include <system_error>
#include <tuple>

namespace tarn::recorder {

namespace {

constexpr std::int64_t kAsideShare = 4;  // a fourth of the cap
constexpr std::int64_t kKindShare = 8;   // an eighth of it, each kind that others write
constexpr std::int64_t kLeastShare = 4;  // the database has a fourth at the least
constexpr double kSecondsADay = 86'400;
constexpr std::int64_t kNanosecondsASecond = 1'000'000'000;

std::int64_t sizeOf(const std::string& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
}

}  // namespace

std::vector<StateUsage::Found> StateUsage::filesOf(const std::filesystem::path& folder, const std::string& prefix) {
  std::vector<Found> found;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(folder, error), end; !error && entry != end; entry.increment(error)) {
    struct stat status {};
    if (!entry->path().filename().string().starts_with(prefix)) continue;
    if (::lstat(entry->path().c_str(), &status) != 0 || !S_ISREG(status.st_mode)) continue;
    found.push_back({entry->path(), std::int64_t{status.st_size},
                     std::int64_t{status.st_mtim.tv_sec} * kNanosecondsASecond + status.st_mtim.tv_nsec});
  }
  return found;
}

// The files of a kind, those longest unchanged first.
std::vector<StateUsage::Found> StateUsage::filesOf(std::size_t kind) const {
  const auto takes = [this](std::size_t one, const Found& file) {
    return kinds_[one].folder == file.path.parent_path() && file.path.filename().string().ends_with(kinds_[one].ending);
  };
  std::vector<Found> files = filesOf(kinds_[kind].folder, "");
  std::erase_if(files, [&](const Found& file) {
    for (std::size_t before = 0; before < kind; ++before) {
      if (takes(before, file)) return true;
    }
    return !takes(kind, file);
  });
  std::sort(files.begin(), files.end(), [](const Found& one, const Found& other) {
    return std::tie(one.changed, one.path) < std::tie(other.changed, other.path);
  });
  return files;
}

void StateUsage::removeAged(std::vector<Found>& files, double maxAgeDays, const AgeOf& ageOf,
                            std::vector<std::string>& removed) {
  std::erase_if(files, [&](const Found& file) {
    std::error_code error;
    const double changed = static_cast<double>(file.changed) / static_cast<double>(kNanosecondsASecond);
    if (ageOf(changed) <= maxAgeDays * kSecondsADay || !std::filesystem::remove(file.path, error)) return false;
    removed.push_back(file.path.filename().string() + ": it is older than its kind may get");
    return true;
  });
}

// Removes from the front until the rest is within the share; what the rest takes.
std::int64_t StateUsage::keepWithin(const std::vector<Found>& files, std::int64_t share,
                                    std::vector<std::string>& removed) {
  std::int64_t bytes = 0;
  for (const Found& file : files) {
    bytes += file.bytes;
  }
  for (const Found& file : files) {
    if (bytes <= share) break;
    std::error_code error;
    if (!std::filesystem::remove(file.path, error)) continue;
    bytes -= file.bytes;
    removed.push_back(file.path.filename().string() + ": its kind is over its share");
  }
  return bytes;
}

std::vector<std::string> StateUsage::tidy(const AgeOf& ageOf) {
  std::vector<std::string> removed;
  std::vector<Found> aside = filesOf(file_.parent_path(), file_.filename().string() + ".damaged-");
  removeAged(aside, asideMaxAgeDays_, ageOf, removed);
  std::sort(aside.begin(), aside.end(), [](const Found& one, const Found& other) { return one.path > other.path; });
  beside_ = keepWithin(aside, cap_ / kAsideShare, removed);
  for (std::size_t kind = 0; kind < kinds_.size(); ++kind) {
    std::vector<Found> files = filesOf(kind);
    removeAged(files, kinds_[kind].maxAgeDays, ageOf, removed);
    beside_ += keepWithin(files, cap_ / kKindShare, removed);
  }
  beside_ += sizeOf(file_.string() + "-shm") + sizeOf(file_.string() + ".counts");
  return removed;
}

std::int64_t StateUsage::databaseBytes(std::int64_t logBytes) const noexcept {
  return std::max(cap_ - beside_ - logBytes, cap_ / kLeastShare);
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
