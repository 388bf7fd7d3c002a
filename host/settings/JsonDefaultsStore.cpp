// SPDX-License-Identifier: Apache-2.0
#include "host/settings/JsonDefaultsStore.h"

#include <fcntl.h>

#include <cerrno>
#include <ctime>
#include <functional>
#include <optional>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "host/settings/PlainName.h"
#include "host/system/FileLock.h"
#include "host/system/FileReplacement.h"
#include "host/system/Files.h"
#include "host/system/JsonValues.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "JsonDefaultsStore";
constexpr std::string_view kPreferencesUser = "mobile";
constexpr std::size_t kMaximumCachedSuites = 64;
constexpr mode_t kFolderMode = 0750;
// Files are stamped by a clock that moves in steps of some milliseconds: two changes within a step look alike.
constexpr std::int64_t kSettlingNanoseconds = 100'000'000;

std::int64_t nanoseconds(const timespec& time) {
  return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
}

JsonDefaultsStore::Suite parsed(const std::string& path, std::string_view text) {
  const JsonReading reading = readJson(text, kMaximumJsonNesting, JsonNull::Absent);
  if (reading.fault) return {{}, Error{0, path + ":" + reading.fault->description()}};
  if (reading.value.kind() != plist::Kind::Dictionary) {
    return {{}, Error{0, path + ":1:1: a defaults file holds one JSON object"}};
  }
  return {reading.value.view().dictionary(), {}};
}

}  // namespace

JsonDefaultsStore::JsonDefaultsStore(std::string folder, platform::Log& log, std::chrono::milliseconds lockPatience)
    : folder_(std::move(folder)), log_(log), lockPatience_(lockPatience) {}

plist::Value JsonDefaultsStore::value(std::string_view suiteName, std::string_view key) const {
  return suite(suiteName).value.get(key);
}

plist::Value JsonDefaultsStore::preference(std::string_view key, std::string_view applicationDomain,
                                           std::string_view user) const {
  return user == kPreferencesUser ? value(applicationDomain, key) : plist::Value();
}

bool JsonDefaultsStore::setValue(std::string_view suiteName, std::string_view key, const plist::ValueView& value) {
  const Status stored = store(suiteName, key, value);
  if (stored.failed()) {
    logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule, "defaults not written: " + stored->text);
  }
  return stored.ok();
}

JsonDefaultsStore::Suite JsonDefaultsStore::suite(std::string_view name) const {
  if (!isPlainName(name)) return {};
  const std::string path = pathOf(name);
  struct stat facts {};
  const Stamp now = stampOf(::stat(path.c_str(), &facts), facts);
  const MutexLock lock(mutex_);
  auto at = cache_.find(name);
  if (at == cache_.end()) {
    if (cache_.size() == kMaximumCachedSuites) {
      cache_.clear();  // a service knows a handful of suites; whoever asks for more pays with another read
    }
    at = cache_.emplace(name, Cached()).first;
  } else if (at->second.settled && at->second.stamp == now) {
    return at->second.suite;
  }
  Cached& cached = at->second;
  cached.suite = read(path, cached.stamp);
  cached.settled = isSettled(cached.stamp);
  logFault(cached);
  return cached.suite;
}

Status JsonDefaultsStore::store(std::string_view suiteName, std::string_view key, const plist::ValueView& value) {
  if (!isPlainName(suiteName)) return Error{EINVAL, "\"" + std::string(suiteName) + "\" can't name a suite"};
  const std::string path = pathOf(suiteName);
  if (const Status made = createDirectories(folder_, kFolderMode); made.failed()) return errorOf(folder_, *made);
  FileLock writers;
  const std::string lock = folder_ + "/.lock";
  if (const Status taken = writers.take(lock, lockPatience_); taken.failed()) return errorOf(lock, *taken);
  Stamp stamp;
  Suite current = read(path, stamp);
  if (current.failed()) {
    return Error{current.error->code, "the file is broken and is left as it is: " + current.error->text};
  }
  if (value.present()) {
    current.value.set(key, value);
  } else if (!current.value.remove(key)) {
    return {};
  }
  const std::optional<std::string> text = jsonText(current.value, JsonLayout::Indented);
  if (!text) return Error{0, "the value of \"" + std::string(key) + "\" has no JSON form"};
  if (text->size() > kMaximumFileBytes) {
    return Error{EFBIG, path + " would be larger than " + std::to_string(kMaximumFileBytes) + " bytes"};
  }
  const Status replaced = replaceFile(path, folder_ + "/." + std::string(suiteName) + ".tmp", *text);
  return replaced.ok() ? Status() : errorOf(path, *replaced);
}

std::string JsonDefaultsStore::pathOf(std::string_view suiteName) const {
  return folder_ + "/" + std::string(suiteName) + ".json";
}

JsonDefaultsStore::Stamp JsonDefaultsStore::stampOf(int result, const struct stat& facts) {
  if (result != 0) return {false, errno, 0, 0, 0, 0, 0};
  return {true, 0, facts.st_dev, facts.st_ino, facts.st_size, nanoseconds(facts.st_mtim), nanoseconds(facts.st_ctim)};
}

bool JsonDefaultsStore::isSettled(const Stamp& stamp) {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME, &now);
  return !stamp.exists || nanoseconds(now) - stamp.changedNanoseconds > kSettlingNanoseconds;
}

// Reads the file and tells which state of it that was.
JsonDefaultsStore::Suite JsonDefaultsStore::read(const std::string& path, Stamp& stamp) {
  const UniqueDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | O_NOFOLLOW));
  struct stat facts {};
  if (!file) {
    const int error = errno;
    const int result = ::stat(path.c_str(), &facts);
    stamp = stampOf(result, facts);
    return error == ENOENT ? Suite() : Suite{{}, errorOf(path, error)};
  }
  stamp = stampOf(::fstat(file.get(), &facts), facts);
  const auto content = readSmallFile(file.get(), kMaximumFileBytes);
  if (content.failed()) return {{}, errorOf(path, *content.error)};
  return parsed(path, content.value);
}

void JsonDefaultsStore::logFault(Cached& cached) const {
  const Status& read = cached.suite.error;
  if (read == cached.logged && (read.ok() || cached.stamp == cached.loggedStamp)) return;
  cached.logged = read;
  if (read.ok()) return;
  cached.loggedStamp = cached.stamp;
  logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule,
              "defaults file is broken and reads as empty: " + read->text);
}

}  // namespace tarn::linux_host
