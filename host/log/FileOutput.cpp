// SPDX-License-Identifier: Apache-2.0
#include "host/log/FileOutput.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <utility>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

FileOutput::FileOutput(std::string path) : path_(std::move(path)) {}

Status FileOutput::open() {
  // What isn't a file (a pipe, a terminal) holds nobody up either.
  UniqueDescriptor opened(
      ::open(path_.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC | O_NOCTTY | O_NONBLOCK, 0640));
  struct stat facts {};
  if (!opened || ::fstat(opened.get(), &facts) != 0) return lastSystemError();
  file_ = std::move(opened);
  device_ = facts.st_dev;
  inode_ = facts.st_ino;
  setMayStall(!S_ISREG(facts.st_mode));
  beginAnew();
  return {};
}

int FileOutput::descriptor() {
  struct stat facts {};
  const bool same = file_ && ::stat(path_.c_str(), &facts) == 0 && facts.st_dev == device_ && facts.st_ino == inode_;
  if (same) return file_.get();
  const auto error = open();
  if (error.ok()) return file_.get();
  // A file that was only renamed still takes the line; one that was removed would swallow it.
  const bool kept = file_ && ::fstat(file_.get(), &facts) == 0 && facts.st_nlink > 0;
  return kept ? file_.get() : -static_cast<int>(error->code);
}

}  // namespace tarn::linux_host
