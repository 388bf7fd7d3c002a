// SPDX-License-Identifier: Apache-2.0
#include "host/check/StateChecks.h"

#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>

#include "host/check/Places.h"
#include "host/check/StoreHead.h"
#include "host/system/FolderNames.h"
#include "host/system/SystemError.h"
#include "recorder/store/StoreLayout.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMostNames = 256;
constexpr std::string_view kStoreName = "recorder.sqlite3";

std::string storeOf(const std::string& stateDirectory) {
  return stateDirectory + "/" + std::string(kStoreName);
}

FolderNames namesIn(const std::string& folder) {
  return folderNames(folder, kMostNames, [](std::string_view name) { return name != "." && name != ".."; }).value;
}

Check wouldBeMade(const char* name, const std::string& path) {
  struct stat link {};
  if (::lstat(path.c_str(), &link) == 0) {
    return bad(name, path + " is a link to nothing; remove it, or make the folder that it names");
  }
  const std::string nearest = nearestOf(path);
  if (::access(nearest.c_str(), W_OK | X_OK) == 0) return good(name, path + " isn't there, the service makes it");
  const int error = errno;
  return bad(name, path + " isn't there and can't be made in " + nearest + errorSuffix(error) +
                       "; make it, with its owner the service's user and mode 0750");
}

// What lies in the directory and isn't its owner's, or is a link in the lock's place; empty: nothing.
std::string intruderIn(const std::string& path, uid_t owner) {
  for (const std::string& name : namesIn(path).names) {
    const std::string entry = path + "/" + name;
    struct stat status {};
    if (::lstat(entry.c_str(), &status) != 0) continue;
    if (name == ".lock" && S_ISLNK(status.st_mode)) return entry + " is a link, which no service takes; remove it";
    if (status.st_uid != owner) {
      return entry + " belongs to " + userText(status.st_uid) + ", the directory to " + userText(owner) +
             "; change its owner with chown";
    }
  }
  return {};
}

}  // namespace

Check checkStateDirectory(const std::string& path) {
  const char* const name = "state-directory";
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) {
    const int error = errno;
    if (error == ENOENT) return wouldBeMade(name, path);
    return bad(name, path + errorSuffix(error) + "; name another one with --state-dir");
  }
  if (!S_ISDIR(status.st_mode)) return bad(name, path + " is no folder; name another one with --state-dir");
  if (::access(path.c_str(), R_OK | W_OK | X_OK) != 0) {
    const int error = errno;
    return bad(name, path + errorSuffix(error) + "; it belongs to " + userText(status.st_uid) +
                         ", ask as that user or as root");
  }
  if ((status.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
    return bad(
        name, path + " has mode " + modeText(status.st_mode) + ", so that others may change what is in it; chmod 0750");
  }
  if (const std::string intruder = intruderIn(path, status.st_uid); !intruder.empty()) return bad(name, intruder);
  const pid_t holder = lockHolder(path + "/.lock");
  return good(name, path + " of " + userText(status.st_uid) + ", mode " + modeText(status.st_mode) +
                        (holder > 0 ? ", used by process " + std::to_string(holder) : ""));
}

Check checkStore(const std::string& stateDirectory, bool isRecorded) {
  const char* const name = "store";
  const std::string path = storeOf(stateDirectory);
  if (!isRecorded) return good(name, "the recorder is off");
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) {
    const int error = errno;
    if (error == ENOENT) return good(name, path + " isn't there, the service makes it");
    return bad(name, path + errorSuffix(error) + "; mend the state directory first");
  }
  if (!S_ISREG(status.st_mode)) return bad(name, path + " is no file; remove it");
  if (::access(path.c_str(), R_OK | W_OK) != 0) {
    const int error = errno;
    return bad(name, path + errorSuffix(error) + "; it belongs to " + userText(status.st_uid));
  }
  const Result<std::int64_t> version = layoutVersionOf(path);
  if (version.failed()) return bad(name, version.error->text + "; the service sets it aside and begins a new one");
  const std::string layout = "layout " + std::to_string(version.value);
  if (version.value > recorder::kLayoutVersion) {
    return bad(name, path + " has " + layout + ", of a newer service; this one knows those up to " +
                         std::to_string(recorder::kLayoutVersion) + ": install the newer one, or move the file away");
  }
  const bool isOlder = version.value < recorder::kLayoutVersion;
  return good(name, path + ", " + layout + (isOlder ? ", which the service brings to the present one" : ""));
}

Check checkSpace(const std::string& stateDirectory, const HostConfiguration& configuration) {
  const char* const name = "space";
  if (!configuration.recorderEnabled) return good(name, "the recorder is off");
  const std::string folder = nearestOf(stateDirectory);
  struct statvfs disk {};
  if (::statvfs(folder.c_str(), &disk) != 0) {
    const int error = errno;
    return bad(name, folder + errorSuffix(error) + "; mend the state directory first");
  }
  std::uint64_t used = 0;
  for (const std::string& entry : namesIn(stateDirectory).names) {
    struct stat status {};
    if (entry.starts_with(kStoreName) && ::lstat((stateDirectory + "/" + entry).c_str(), &status) == 0) {
      used += static_cast<std::uint64_t>(status.st_blocks) * 512U;
    }
  }
  const std::uint64_t free = std::uint64_t{disk.f_bavail} * disk.f_frsize;
  const std::uint64_t cap = static_cast<std::uint64_t>(configuration.recorder.maxMegabytes) << 20U;
  const auto megabytes = [](std::uint64_t bytes) { return std::to_string(bytes >> 20U) + " MiB"; };
  const std::string what = megabytes(free) + " are free in " + folder + ", the recorder has " + megabytes(used) +
                           " of the " + megabytes(cap) + " that it may take";
  if (used + free >= cap) return good(name, what);
  return bad(name, what + "; make room, or lower [recorder] max_megabytes");
}

}  // namespace tarn::linux_host
