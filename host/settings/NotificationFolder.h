// NotificationFolder: named notifications as files, notifications/NAME: 8 bytes, little-endian, the state word. One
// write to a file is one post, by whatever process. Threads: any; it holds its path alone.
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
  // The folder is made when it is needed.
  explicit NotificationFolder(std::string path) : path_(std::move(path)) {}

  const std::string& path() const noexcept { return path_; }
  // Makes the folder where there is none.
  Status make() const;
  // Nothing for a file that is missing, short or unreadable.
  std::optional<std::uint64_t> state(std::string_view name) const;
  // Sets the word, if one is given, and posts. Writers of a word take turns, each waiting at most a second.
  [[nodiscard]] Status post(std::string_view name, std::optional<std::uint64_t> state) const;

 private:
  const std::string path_;
};

}  // namespace tarn::linux_host
