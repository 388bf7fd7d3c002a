// SPDX-License-Identifier: Apache-2.0
#include "host/check/StoreHead.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <span>
#include <string_view>

#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"

namespace tarn::linux_host {

namespace {

using namespace std::string_view_literals;

constexpr std::string_view kMagic = "SQLite format 3\0"sv;
constexpr std::size_t kVersionPlace = 60;
constexpr off_t kLogHead = 32;
constexpr off_t kFrameHead = 24;

UniqueDescriptor openToLook(const std::string& path) {
  return UniqueDescriptor(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
}

template <std::size_t Size>
bool readAt(int file, off_t place, std::array<char, Size>& bytes) {
  return ::pread(file, bytes.data(), bytes.size(), place) == static_cast<ssize_t>(bytes.size());
}

template <std::size_t Size>
std::uint32_t numberAt(const std::array<char, Size>& bytes, std::size_t place) {
  std::uint32_t number = 0;
  for (std::size_t index = place; index < place + 4; ++index) {
    number = number << 8U | static_cast<unsigned char>(bytes.at(index));
  }
  return number;
}

// Of the newest page 1 that was committed, else `before`.
std::int64_t versionInLog(int log, std::int64_t before) {
  std::array<char, kLogHead> head{};
  if (!readAt(log, 0, head)) return before;
  const std::uint32_t pageBytes = numberAt(head, 8);
  if (pageBytes < 512 || pageBytes > 65536) return before;
  std::int64_t committed = before;
  std::int64_t written = before;
  std::array<char, kFrameHead> frame{};
  std::array<char, 4> version{};
  for (off_t place = kLogHead; readAt(log, place, frame); place += kFrameHead + static_cast<off_t>(pageBytes)) {
    const bool isOfThisLog = numberAt(frame, 8) == numberAt(head, 16) && numberAt(frame, 12) == numberAt(head, 20);
    if (!isOfThisLog) break;
    if (numberAt(frame, 0) == 1 && readAt(log, place + kFrameHead + off_t{kVersionPlace}, version)) {
      written = numberAt(version, 0);
    }
    committed = numberAt(frame, 4) != 0 ? written : committed;
  }
  return committed;
}

}  // namespace

Result<std::int64_t> layoutVersionOf(const std::string& path) {
  const UniqueDescriptor file = openToLook(path);
  if (!file) return {{}, errorOf(path, errno)};
  std::array<char, 100> head{};
  const ssize_t size = ::pread(file.get(), head.data(), head.size(), 0);
  if (size < 0) return {{}, errorOf(path, errno)};
  const bool isEmpty = size == 0;
  if (!isEmpty &&
      (size < static_cast<ssize_t>(head.size()) || !std::string_view(head.data(), head.size()).starts_with(kMagic))) {
    return {{}, Error{0, path + " is no database"}};
  }
  const std::int64_t inFile = numberAt(head, kVersionPlace);
  const UniqueDescriptor log = openToLook(path + "-wal");
  return {log ? versionInLog(log.get(), inFile) : inFile, {}};
}

}  // namespace tarn::linux_host
