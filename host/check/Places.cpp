// SPDX-License-Identifier: Apache-2.0
#include "host/check/Places.h"

#include <pwd.h>
#include <sys/sysmacros.h>

#include <array>
#include <cstdio>
#include <sstream>
#include <vector>

#include "host/system/SmallFile.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMostLockBytes = std::size_t{1} << 20U;

}  // namespace

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

std::string nearestOf(std::string path) {
  struct stat status {};
  while (::stat(path.c_str(), &status) != 0 && path != "/" && path != ".") {
    path = folderOf(path);
  }
  return path;
}

std::string modeText(mode_t mode) {
  std::array<char, 16> text{};
  static_cast<void>(std::snprintf(text.data(), text.size(), "%04o", static_cast<unsigned>(mode & 07777U)));
  return text.data();
}

std::string userText(uid_t user) {
  std::array<char, 4096> space{};
  passwd entry{};
  passwd* found = nullptr;
  const bool isKnown = ::getpwuid_r(user, &entry, space.data(), space.size(), &found) == 0 && found != nullptr;
  return isKnown ? entry.pw_name : "uid " + std::to_string(user);
}

// "1: FLOCK  ADVISORY  WRITE 1234 fd:01:5678 0 EOF"
pid_t lockHolder(const std::string& path) {
  struct stat file {};
  if (::stat(path.c_str(), &file) != 0) return 0;
  std::array<char, 64> place{};
  static_cast<void>(std::snprintf(place.data(), place.size(), "%02x:%02x:%llu", major(file.st_dev), minor(file.st_dev),
                                  static_cast<unsigned long long>(file.st_ino)));
  const auto locks = readSmallFile("/proc/locks", kMostLockBytes);
  std::istringstream lines(locks.value);
  for (std::string line; std::getline(lines, line);) {
    std::istringstream words(line);
    std::string number;
    std::string kind;
    std::string advice;
    std::string access;
    pid_t process = 0;
    std::string where;
    words >> number >> kind >> advice >> access >> process >> where;
    if (kind == "FLOCK" && where == place.data()) return process;
  }
  return 0;
}

}  // namespace tarn::linux_host
