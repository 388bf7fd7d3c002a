// SPDX-License-Identifier: Apache-2.0
#include "host/system/FileReplacement.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <utility>

#include "host/system/Files.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr mode_t kFileMode = 0640;

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? "." : path.substr(0, slash + 1);
}

Status syncFolderOf(const std::string& path) {
  const UniqueDescriptor opened(::open(folderOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return opened && ::fsync(opened.get()) == 0 ? Status() : lastSystemError();
}

}  // namespace

void FileReplacement::begin(UniqueDescriptor file, std::string beside) noexcept {
  file_ = std::move(file);
  beside_ = std::move(beside);
}

void FileReplacement::write(std::string_view bytes) {
  if (failure_.ok()) {
    failure_ = writeAll(file_.get(), bytes);
  }
}

Status FileReplacement::takePlace(const std::string& path) {
  if (failure_.ok() && ::fsync(file_.get()) != 0) {
    failure_ = lastSystemError();
  }
  file_.reset();
  if (failure_.ok() && std::rename(beside_.c_str(), path.c_str()) != 0) {
    failure_ = lastSystemError();
  }
  if (failure_.ok()) {
    beside_.clear();
  }
  discard();
  return failure_;
}

void FileReplacement::discard() noexcept {
  if (!beside_.empty()) {
    ::unlink(beside_.c_str());
  }
  beside_.clear();
}

Status replaceFile(const std::string& path, const std::string& temporary, std::string_view content) {
  struct stat old {};
  const bool existed = ::stat(path.c_str(), &old) == 0;
  UniqueDescriptor file(::open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, kFileMode));
  if (!file) return lastSystemError();
  FileReplacement replacement;
  replacement.begin(std::move(file), temporary);
  const int descriptor = replacement.descriptor();
  if (!existed || ::geteuid() != 0 || ::fchown(descriptor, old.st_uid, old.st_gid) != 0) {
    giveToFolderOwner(descriptor, folderOf(path));
  }
  if (::fchmod(descriptor, existed ? old.st_mode & 07777U : kFileMode) != 0) return lastSystemError();
  replacement.write(content);
  if (auto error = replacement.takePlace(path); error.failed()) return error;
  return syncFolderOf(path);
}

}  // namespace tarn::linux_host
