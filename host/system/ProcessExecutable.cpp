// SPDX-License-Identifier: Apache-2.0
#include "host/system/ProcessExecutable.h"

#include <unistd.h>

#include <climits>

#include "host/system/SmallFile.h"

namespace tarn::linux_host {

std::string executableOf(std::int32_t process) {
  const std::string folder = "/proc/" + std::to_string(process);
  std::string path(PATH_MAX, '\0');
  if (const ssize_t size = ::readlink((folder + "/exe").c_str(), path.data(), path.size()); size > 0) {
    path.resize(static_cast<std::size_t>(size));
    return path;
  }
  constexpr std::size_t kLongestName = 64;
  const auto name = readSmallFile(folder + "/comm", kLongestName);
  if (name.failed() || name.value.empty()) return "an unknown program";
  return "[" + name.value.substr(0, name.value.find('\n')) + "]";
}

}  // namespace tarn::linux_host
