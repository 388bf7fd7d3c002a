#include "recorder/store/StoreReport.h"

#include <sqlite3.h>

#include <system_error>

#include "recorder/store/Connection.h"
#include "recorder/store/Remedy.h"
#include "recorder/store/StoreLayout.h"

namespace tarn::recorder {

namespace {

constexpr int kBusyMilliseconds = 2000;

// In a directory that can't be written to there can be no index of a log; without a log the file is all there is.
Status open(Connection& connection, const std::filesystem::path& file) {
  std::error_code ignored;
  if (!std::filesystem::exists(file, ignored)) return Error{SQLITE_CANTOPEN, "there is no file " + file.string()};
  Status error = connection.errorOf(connection.open(file.string(), SQLITE_OPEN_READONLY));
  if (error.ok()) {
    sqlite3_busy_timeout(connection.handle(), kBusyMilliseconds);
    // A file that was cut is looked at as far as it goes.
    sqlite3_db_config(connection.handle(), SQLITE_DBCONFIG_WRITABLE_SCHEMA, 1, nullptr);
    error = connection.readInteger("SELECT count(*) FROM sqlite_schema").error;
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
  if (auto error = open(connection, file); error.failed()) return {{}, error};
  if (auto error = connection.errorOf(connection.run("BEGIN")); error.failed()) return {{}, error};
  if (auto error = checkPages(connection); error.failed()) {
    if (remedyFor(error->code) != Remedy::SetAside) return {{}, error};
    report.damage = error->text;
  }
  // No checksum holds the text that makes the tables what they are.
  bool hasState = false;
  if (auto error = checkColumns(connection, hasState); error.failed() && report.damage.empty()) {
    report.damage = error->text;
  }
  if (auto error = checkNotes(connection); error.failed() && report.damage.empty()) {
    report.damage = error->text;
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
  if (error.failed() && report.damage.empty()) {
    report.damage = error->text;
  }
  return {report};
}

}  // namespace tarn::recorder
