// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/StoreFiles.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <cerrno>
#include <system_error>

#include "recorder/store/files/MappedGuard.h"

namespace tarn::recorder {

namespace {

constexpr const char* kLog = "-wal";
constexpr const char* kIndex = "-shm";

// Makes the folders above the file where they are missing; the opening tells when that failed. They come from the host
// in its own way; here only one that was taken away while the service runs is made again.
void makeFoldersAbove(const std::filesystem::path& path) {
  std::filesystem::path folder;
  for (const auto& part : path.parent_path()) {
    folder /= part;
    static_cast<void>(::mkdir(folder.c_str(), 0750));
  }
}

Error statusError(int error) {
  return {SQLITE_IOERR_FSTAT, "its status can't be read (" + std::generic_category().message(error) + ")"};
}

}  // namespace

StoreFiles::StoreFiles(std::filesystem::path path, const platform::Clock& clock)
    : path_(std::move(path)), log_(path_.string() + kLog), index_(path_.string() + kIndex), clock_(clock) {}

Status StoreFiles::prepare() {
  if (auto error = putOddCompanionsAside(); error.failed()) return error;
  struct stat status {};
  if (::stat(path_.c_str(), &status) == 0) {
    // A directory, a pipe or a device can be opened, or hang in it; none can be a database.
    if (S_ISREG(status.st_mode)) return {};
    return Error{SQLITE_NOTADB, "not a regular file"};
  }
  if (const int error = errno; error != ENOENT) return statusError(error);
  makeFoldersAbove(path_);
  return {};
}

// A directory, a pipe or a link in the place of the log or its index is none of ours, and no link is followed.
Status StoreFiles::putOddCompanionsAside() {
  for (const auto& [name, suffix] : {std::pair(log_, kLog), std::pair(index_, kIndex)}) {
    struct stat status {};
    if (::lstat(name.c_str(), &status) != 0 || S_ISREG(status.st_mode)) continue;
    const std::filesystem::path aside = freeName(suffix);
    std::error_code failure;
    std::filesystem::rename(name, aside, failure);
    if (failure) {
      return Error{SQLITE_CANTOPEN, name.string() + " is no regular file and can't be set aside: " + failure.message()};
    }
    putAside_.push_back(aside.filename().string());
  }
  return {};
}

void StoreFiles::forgetCompanions() noexcept {
  tornBefore_ = MappedGuard::torn();
  indexBytes_ = 0;
  logInode_ = 0;
}

Result<StoreFiles::Identity> StoreFiles::readIdentity() const {
  struct stat status {};
  if (::stat(path_.c_str(), &status) == 0) {
    return {{static_cast<std::uint64_t>(status.st_dev), static_cast<std::uint64_t>(status.st_ino)}};
  }
  const int error = errno;
  return {{}, error == ENOENT ? Error{SQLITE_READONLY_DBMOVED, "it is gone"} : statusError(error)};
}

Status StoreFiles::noteOpened() {
  const Result<Identity> identity = readIdentity();
  if (identity.failed()) return Error{SQLITE_IOERR_FSTAT, identity.error->text + " right after it was opened"};
  opened_ = identity.value;
  return {};
}

Status StoreFiles::checkIsOpened() const {
  const Result<Identity> now = readIdentity();
  if (now.failed()) return now.error;
  if (now.value != opened_) return Error{SQLITE_READONLY_DBMOVED, "another file is in its place"};
  return {};
}

Result<StoreFiles::LogState> StoreFiles::lookAtLog(std::int64_t bytes) {
  struct stat status {};
  const bool isThere = ::stat(log_.c_str(), &status) == 0;
  if (!isThere && errno != ENOENT) return {{}, statusError(errno)};
  if (isThere && logInode_ == 0) {
    logInode_ = status.st_ino;
  }
  if (!isThere || status.st_ino != logInode_) return {LogState::Gone};
  return {status.st_size >= bytes ? LogState::Whole : LogState::Cut};
}

std::int64_t StoreFiles::indexBytes() const noexcept {
  struct stat status {};
  return ::stat(index_.c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
}

Status StoreFiles::checkIndex() const {
  if (MappedGuard::torn() == tornBefore_ && indexBytes() >= indexBytes_) return {};
  return Error{SQLITE_IOERR, "the index of its log was cut"};
}

std::filesystem::path StoreFiles::freeName(const std::string& suffix) const {
  const std::string base =
      path_.string() + ".damaged-" + std::to_string(static_cast<std::int64_t>(clock_.epochSeconds()));
  std::filesystem::path name = base + suffix;
  std::error_code ignored;
  for (int n = 2; std::filesystem::exists(std::filesystem::symlink_status(name, ignored)); ++n) {
    name = base + "-" + std::to_string(n) + suffix;
  }
  return name;
}

Result<std::filesystem::path> StoreFiles::setAside() const {
  const std::filesystem::path aside = freeName("");
  std::error_code failure;
  std::filesystem::rename(path_, aside, failure);
  if (failure) return {{}, Error{failure.value(), "it can't be set aside: " + failure.message()}};
  // The log and its index go along: what they hold belongs to the old file, and a fresh one must not find them.
  for (const auto& [name, suffix] : {std::pair(log_, kLog), std::pair(index_, kIndex)}) {
    std::filesystem::rename(name, aside.string() + suffix, failure);
    if (failure && failure != std::errc::no_such_file_or_directory) {
      std::filesystem::remove(name, failure);
    }
  }
  return {aside};
}

}  // namespace tarn::recorder
