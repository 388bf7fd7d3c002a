// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/FolderPublisher.h"

#include <system_error>
#include <utility>

#include "host/system/FileReplacement.h"
#include "host/system/Files.h"
#include "host/system/SystemError.h"

namespace tarn::fleet {

namespace {

constexpr mode_t kFolderMode = 0700;

}  // namespace

std::int64_t FolderPublisher::measure() const {
  std::int64_t bytes = 0;
  std::error_code error;
  for (auto file = std::filesystem::directory_iterator(folder_, error);
       !error && file != std::filesystem::directory_iterator(); file.increment(error)) {
    std::error_code gone;
    const std::uintmax_t size = file->file_size(gone);
    bytes += gone ? 0 : static_cast<std::int64_t>(size);
  }
  return bytes;
}

Status FolderPublisher::publish(std::uint64_t number, const std::string& id, const std::string& bytes) {
  if (Status made = linux_host::createDirectories(folder_.string(), kFolderMode); made.failed()) {
    return linux_host::errorOf(folder_.string(), *made);
  }
  const auto size = static_cast<std::int64_t>(bytes.size());
  if (bytes_ < 0 || bytes_ + size > most_) {
    bytes_ = measure();
  }
  if (bytes_ + size > most_) return Error{0, folder_.string() + ": full"};
  const std::string path = (folder_ / (id + ".tnf")).string();
  if (Status written = linux_host::replaceFile(path, path + ".new", bytes); written.failed()) {
    return linux_host::errorOf(path, *written);
  }
  bytes_ += size;
  outcomes_.push_back({number, {}});
  return {};
}

void FolderPublisher::wait(std::chrono::milliseconds, std::vector<Outcome>& outcomes) {
  outcomes.insert(outcomes.end(), outcomes_.begin(), outcomes_.end());
  outcomes_.clear();
}

}  // namespace tarn::fleet
