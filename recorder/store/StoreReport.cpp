// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/StoreReport.h"

#include <sqlite3.h>

#include <system_error>

#include "recorder/store/StoreLayout.h"
#include "recorder/store/files/Remedy.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

namespace {

constexpr int kBusyMilliseconds = 2000;

// As everybody would open it, or overlooking what can be overlooked.
Status openAs(Connection& connection, const std::string& name, bool tolerant) {
  Status error = connection.errorOf(connection.open(name, SQLITE_OPEN_READONLY));
  if (error.failed()) return error;
  sqlite3_busy_timeout(connection.handle(), kBusyMilliseconds);
  sqlite3_db_config(connection.handle(), SQLITE_DBCONFIG_WRITABLE_SCHEMA, tolerant ? 1 : 0, nullptr);
  return connection.readInteger("SELECT count(*) FROM sqlite_schema").error;
}

// In a directory that can't be written to there can be no index of a log; without a log the file is all there is. One
// that was cut, or whose schema nobody else would take, is looked at as far as it goes; `damage` tells then.
Status open(Connection& connection, const std::filesystem::path& file, std::string& damage) {
  std::error_code ignored;
  if (!std::filesystem::exists(file, ignored)) return Error{SQLITE_CANTOPEN, "there is no file " + file.string()};
  Status error = openAs(connection, file.string(), false);
  if (error.failed() && remedyFor(error->code) == Remedy::SetAside) {
    damage = error->text;
    error = openAs(connection, file.string(), true);
  }
  const auto kind = error.failed() ? error->code & 0xFF : 0;
  if ((kind == SQLITE_CANTOPEN || kind == SQLITE_READONLY) &&
      !std::filesystem::exists(file.string() + "-wal", ignored)) {
    return connection.errorOf(connection.open(uriAsItLies(file.string()), SQLITE_OPEN_READONLY | SQLITE_OPEN_URI));
  }
  return error;
}

}  // namespace

Result<StoreReport> inspectStore(const std::filesystem::path& file) {
  Connection connection;
  StoreReport report;
  if (auto error = open(connection, file, report.damage); error.failed()) return {{}, error};
  if (auto error = connection.errorOf(connection.run("BEGIN")); error.failed()) return {{}, error};
  if (auto error = checkPages(connection, true); error.failed()) {
    if (remedyFor(error->code) != Remedy::SetAside) return {{}, error};
    report.damage = report.damage.empty() ? error->text : report.damage;
  }
  // No checksum holds the text that makes the tables what they are.
  if (auto error = checkSchema(connection); error.failed()) {
    if (remedyFor(error->code) != Remedy::SetAside) return {{}, error};
    report.damage = report.damage.empty() ? error->text : report.damage;
  }
  StoreCheck check(connection);
  check.tolerateDamage();
  Status error = check.begin();
  if (error.ok()) {
    error = check.goOn(std::chrono::steady_clock::time_point::max());
  }
  report.whole = check.good();
  report.lost = check.lost();
  report.notedLost = check.knownLost();
  report.unproven = check.unproven();
  check.finalize();
  if (report.damage.empty()) {
    report.damage = check.strayText();
  }
  SessionCheck sessions(connection);
  Status rows = sessions.begin();
  for (Status failed; !sessions.isDone();) {
    failed = sessions.goOn(std::chrono::steady_clock::time_point::max());
    rows = rows.ok() ? failed : rows;
  }
  report.damagedRows = sessions.damaged();
  error = error.ok() ? rows : error;
  if (error.failed() && report.damage.empty()) {
    report.damage = error->text;
  }
  return {report};
}

}  // namespace tarn::recorder
