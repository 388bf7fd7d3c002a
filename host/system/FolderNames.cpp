#include "host/system/FolderNames.h"

#include <dirent.h>

#include <cerrno>
#include <iterator>
#include <memory>

namespace tarn::linux_host {

namespace {
constexpr std::size_t kMostEntries = 16384;
}

FolderNames folderNames(const std::string& folder, std::size_t limit,
                        const std::function<bool(std::string_view)>& isWanted) {
  FolderNames found;
  const std::unique_ptr<DIR, int (*)(DIR*)> directory(::opendir(folder.c_str()), &::closedir);
  if (directory == nullptr) {
    found.error = errno;
    return found;
  }
  for (std::size_t seen = 0; seen <= kMostEntries; ++seen) {
    errno = 0;
    const dirent* const entry = ::readdir(directory.get());  // NOLINT(concurrency-mt-unsafe): a stream of our own
    if (entry == nullptr) {
      found.error = errno;
      return found;
    }
    if (!isWanted(entry->d_name)) {
      continue;
    }
    found.names.insert(entry->d_name);
    if (found.names.size() > limit) {
      found.names.erase(std::prev(found.names.end()));
      found.complete = false;
    }
  }
  found.complete = false;
  return found;
}

}  // namespace tarn::linux_host
