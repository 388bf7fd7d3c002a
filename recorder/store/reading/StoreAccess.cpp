// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/StoreAccess.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <limits>
#include <string_view>
#include <system_error>

#include "recorder/store/GlobPattern.h"
#include "recorder/store/StoreLayout.h"

namespace tarn::recorder {

namespace {

constexpr int kBusyMilliseconds = 2000;
constexpr int kStepsAtOnce = 1000;  // of SQLite's machine, between two looks at the bound
constexpr std::int64_t kStepsPerByte = 64;
constexpr std::int64_t kStepsOfSmallFile = 1'000'000;

std::string_view valueText(sqlite3_value* value) noexcept {
  const void* const bytes = sqlite3_value_blob(value);
  const auto size = static_cast<std::size_t>(sqlite3_value_bytes(value));
  return bytes == nullptr ? std::string_view() : std::string_view(static_cast<const char*>(bytes), size);
}

void matchesGlob(sqlite3_context* context, int, sqlite3_value** values) {
  sqlite3_result_int(context, globMatches(valueText(values[0]), valueText(values[1])) ? 1 : 0);
}

int spendSteps(void* stepsLeft) {
  auto& left = *static_cast<std::int64_t*>(stepsLeft);
  left -= kStepsAtOnce;
  return left < 0 ? 1 : 0;
}

// Opens a name and reads from it once.
Status openAs(Connection& connection, const std::string& name, ReadBounds& bounds) {
  if (connection.open(name, SQLITE_OPEN_READONLY | SQLITE_OPEN_URI) != SQLITE_OK) return bounds.lastError(connection);
  sqlite3* const database = connection.handle();
  sqlite3_busy_timeout(database, kBusyMilliseconds);
  for (const int option : {SQLITE_DBCONFIG_TRUSTED_SCHEMA, SQLITE_DBCONFIG_ENABLE_TRIGGER}) {
    sqlite3_db_config(database, option, 0, nullptr);
  }
  bounds.watch(connection);
  sqlite3_create_function_v2(database, "matches_glob", 2, SQLITE_UTF8 | SQLITE_DETERMINISTIC, nullptr, matchesGlob,
                             nullptr, nullptr, nullptr);
  if (!connection.integer("SELECT count(*) FROM sqlite_schema")) return bounds.lastError(connection);
  return {};
}

}  // namespace

void ReadBounds::begin(const std::filesystem::path& file) {
  std::int64_t bytes = 0;
  for (const std::string& name : {file.string(), file.string() + "-wal"}) {
    struct stat status {};
    bytes += ::stat(name.c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
  }
  bytes = std::min(bytes, std::numeric_limits<std::int64_t>::max() / (2 * kStepsPerByte));
  stepsLeft_ = kStepsOfSmallFile + kStepsPerByte * bytes;
}

void ReadBounds::watch(Connection& connection) {
  sqlite3_progress_handler(connection.handle(), kStepsAtOnce, spendSteps, &stepsLeft_);
}

Error ReadBounds::lastError(const Connection& connection) const {
  return {sqlite3_errcode(connection.handle()),
          stepsLeft_ < 0 ? "its tables lead into themselves" : connection.errorText()};
}

Presence presenceOf(const std::filesystem::path& file) {
  // Not by opening it: a process that closes a file loses SQLite's locks on it.
  if (::faccessat(AT_FDCWD, file.c_str(), R_OK, AT_EACCESS) == 0) return Presence::There;
  if (errno == EACCES || errno == EPERM) return Presence::Refused;
  return errno == ENOENT || errno == ENOTDIR ? Presence::Missing : Presence::There;
}

Error refusalOf(const std::filesystem::path& file) {
  return {EACCES, file.string() + " refuses this user: " + std::generic_category().message(EACCES)};
}

Status openToRead(Connection& connection, const std::filesystem::path& file, ReadBounds& bounds, bool& asItLies) {
  struct stat log {};
  const bool hasLog = ::stat((file.string() + "-wal").c_str(), &log) == 0;
  asItLies = false;
  Status error = openAs(connection, file.string(), bounds);
  if (error.ok()) return {};
  const auto code = error->code & 0xFF;
  // No index can be made in a directory that can't be written to. Where there is no log either, nobody writes, and the
  // file alone is all there is.
  if ((code == SQLITE_CANTOPEN || code == SQLITE_READONLY) && !hasLog) {
    asItLies = true;
    error = openAs(connection, uriAsItLies(file.string()), bounds);
    if (error.ok()) return {};
  }
  connection.close();
  return error;
}

Error noSessionsIn(const std::filesystem::path& file) {
  return {0,
          file.string() + " has no sessions yet: it is of version 0, and a service that knows them begins with them"};
}

Status requireSessions(Connection& connection, const std::filesystem::path& file) {
  const Result<std::int64_t> version = connection.readInteger("PRAGMA user_version");
  if (version.failed()) return version.error;
  if (version.value < kFirstVersionWithSessions) return noSessionsIn(file);
  if (version.value > kLayoutVersion) {
    return Error{0, file.string() + " is of version " + std::to_string(version.value) +
                        ", which is newer than this program: it reads up to " + std::to_string(kLayoutVersion)};
  }
  return {};
}

}  // namespace tarn::recorder
