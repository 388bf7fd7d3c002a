// SPDX-License-Identifier: Apache-2.0
#include "host/system/FolderNames.h"

#include <dirent.h>

#include <cerrno>
#include <iterator>
#include <memory>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {
constexpr std::size_t kMostEntries = 16384;
}

Result<FolderNames> folderNames(const std::string& folder, std::size_t limit,
                                const std::function<bool(std::string_view)>& isWanted) {
  Result<FolderNames> found;
  auto& [names, complete] = found.value;
  const std::unique_ptr<DIR, int (*)(DIR*)> directory(::opendir(folder.c_str()), &::closedir);
  if (directory == nullptr) {
    found.error = lastSystemError();
    return found;
  }
  for (std::size_t seen = 0; seen <= kMostEntries; ++seen) {
    errno = 0;
    const dirent* const entry = ::readdir(directory.get());  // NOLINT(concurrency-mt-unsafe): a stream of our own
    if (entry == nullptr) {
      if (errno != 0) {
        found.error = lastSystemError();
      }
      return found;
    }
    if (!isWanted(entry->d_name)) continue;
    names.insert(entry->d_name);
    if (names.size() > limit) {
      names.erase(std::prev(names.end()));
      complete = false;
    }
  }
  complete = false;
  return found;
}

}  // namespace tarn::linux_host
