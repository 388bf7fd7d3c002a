// SPDX-License-Identifier: Apache-2.0
// NotificationFolder: named notifications as files, notifications/NAME: 8 bytes, little-endian, the state word. One
// write to a file is one post, by whatever process.
//
// What doesn't need the service running: the tool posts with it, the service watches with FileNotificationCenter.
// Threads: any; it holds its path alone.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "plist/Result.h"

namespace tarn::linux_host {

class NotificationFolder {
 public:
  // Looks at nothing; the folder is made when it is needed.
  explicit NotificationFolder(std::string path) : path_(std::move(path)) {}

  const std::string& path() const noexcept { return path_; }
  // Makes the folder (mode 0750), and what is missing above it, where there is none.
  Status make() const;
  // Nothing for a file that is missing, shorter than 8 bytes, unreadable, a link or no regular file; further bytes are
  // left unread. No lock is taken: the word is written in one call.
  std::optional<std::uint64_t> state(std::string_view name) const;
  // Sets the word, if one is given, and posts; without one the word is written anew as it was, 0 when there was none.
  // Writers of a word take turns by a lock on its file, each waiting at most a second (ETIMEDOUT). EINVAL for a name
  // that can't be a file's, ENOSPC when the disk took a part. A new file has mode 0640 and, from root's hands, its
  // folder's owner. The text of an error names the path.
  [[nodiscard]] Status post(std::string_view name, std::optional<std::uint64_t> state) const;

 private:
  const std::string path_;
};

}  // namespace tarn::linux_host
