// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/ExportedIds.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <charconv>
#include <string_view>

namespace tarn::recorder {

namespace {

// Longer than any id with its line's end.
constexpr std::size_t kMostBytes = 32;

std::optional<std::int64_t> readId(const std::filesystem::path& path) {
  const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
  if (file < 0) return std::nullopt;
  std::array<char, kMostBytes> text{};
  struct stat facts {};
  const bool isFile = ::fstat(file, &facts) == 0 && S_ISREG(facts.st_mode);
  const ssize_t bytes = isFile ? ::read(file, text.data(), text.size()) : -1;
  ::close(file);
  if (bytes <= 0 || static_cast<std::size_t>(bytes) == text.size() ||
      text[static_cast<std::size_t>(bytes) - 1] != '\n') {
    return std::nullopt;
  }
  const char* const last = text.data() + bytes - 1;
  std::int64_t id = 0;
  const auto [end, error] = std::from_chars(text.data(), last, id);
  return error == std::errc() && end == last && id >= 0 ? std::optional(id) : std::nullopt;
}

}  // namespace

std::optional<std::int64_t> ExportedIds::read() const {
  return file_.empty() ? std::nullopt : readId(file_);
}

}  // namespace tarn::recorder
