// SPDX-License-Identifier: Apache-2.0
#include "fleet/cursor/ArrivedFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::fleet {

namespace {

// It says nothing but how many events there were.
constexpr mode_t kForAll = 0644;

bool writeWhole(const std::string& path, const std::string& text) {
  linux_host::UniqueDescriptor file(
      ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, kForAll));
  const auto size = static_cast<ssize_t>(text.size());
  return file && ::fchmod(file.get(), kForAll) == 0 && ::write(file.get(), text.data(), text.size()) == size;
}

}  // namespace

Status ArrivedFile::write(std::int64_t id) {
  if (written_ == id) return {};
  const std::string beside = path_ + ".new";
  errno = 0;
  if (!writeWhole(beside, std::to_string(id) + '\n') || ::rename(beside.c_str(), path_.c_str()) != 0) {
    return linux_host::errorOf(path_, errno != 0 ? errno : ENOSPC);  // a short write says nothing else
  }
  written_ = id;
  return {};
}

}  // namespace tarn::fleet
