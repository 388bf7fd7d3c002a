// SPDX-License-Identifier: Apache-2.0
// HostConfiguration: the files that it is read from.
#include <unistd.h>

#include <cerrno>

#include "host/settings/HostConfiguration.h"
#include "host/system/FolderNames.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumFileBytes = std::size_t{1} << 20U;
constexpr std::size_t kMostDropIns = 256;

bool isDropIn(std::string_view name) {
  return !name.starts_with('.') && name.ends_with(".toml");
}

// Their paths, in order; none where there is no such folder.
Result<std::vector<std::string>> dropInsOf(const std::string& path) {
  const std::string folder = path + ".d";
  const Result<FolderNames> listed = folderNames(folder, kMostDropIns, isDropIn);
  if (listed.failed() && listed.error->code == ENOENT) return {};
  if (listed.failed()) return {{}, errorOf(folder, *listed.error)};
  if (!listed.value.complete) return {{}, Error{0, folder + ": too many files"}};
  std::vector<std::string> paths;
  for (const std::string& name : listed.value.names) {
    paths.push_back(folder + "/" + name);
  }
  return {std::move(paths), {}};
}

// Also when it only can't be told: reading it says what is wrong.
bool isThere(const std::string& path) {
  return ::access(path.c_str(), F_OK) == 0 || (errno != ENOENT && errno != ENOTDIR);
}

}  // namespace

Result<HostConfiguration> readConfiguration(const std::string& path, const HostConfiguration& base) {
  const auto file = readSmallFile(path, kMaximumFileBytes);
  if (file.failed()) return {{}, errorOf(path, *file.error)};
  return parseConfiguration(file.value, path, base);
}

Result<HostConfiguration> readConfigurationWithDropIns(const std::string& path, bool mayBeAbsent) {
  Result<std::vector<std::string>> files = dropInsOf(path);
  if (files.failed()) return {{}, std::move(files.error)};
  if (!mayBeAbsent || isThere(path)) {
    files.value.insert(files.value.begin(), path);
  }
  Result<HostConfiguration> read;
  for (const std::string& file : files.value) {
    read = readConfiguration(file, read.value);
    if (read.failed()) return {{}, std::move(read.error)};
  }
  return read;
}

}  // namespace tarn::linux_host
