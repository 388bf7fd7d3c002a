// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/rows/Connection.h"

#include <sqlite3.h>

#include <system_error>
#include <utility>

#include "plist/Hex.h"
#include "recorder/store/files/SqliteStart.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

int Connection::open(const std::string& name, int flags) {
  close();
  startSqlite();
  const int code = sqlite3_open_v2(name.c_str(), &database_, flags | SQLITE_OPEN_NOMUTEX, nullptr);
  if (database_ != nullptr) {
    sqlite3_extended_result_codes(database_, 1);
    sqlite3_db_config(database_, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
  }
  return code;
}

void Connection::close() noexcept {
  sqlite3_close_v2(std::exchange(database_, nullptr));
}

void Connection::closeAndTidy() noexcept {
  if (database_ != nullptr) {
    sqlite3_db_config(database_, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 0, nullptr);
    close();
  }
}

int Connection::run(const char* sql) noexcept {
  return sqlite3_exec(database_, sql, nullptr, nullptr, nullptr);
}

std::optional<std::int64_t> Connection::integer(const char* sql) {
  Statement statement;
  if (statement.prepare(database_, sql) != SQLITE_OK || statement.step() != SQLITE_ROW || statement.isNull(0)) {
    return std::nullopt;
  }
  return statement.integer(0);
}

std::optional<std::string> Connection::text(const char* sql) {
  Statement statement;
  if (statement.prepare(database_, sql) != SQLITE_OK || statement.step() != SQLITE_ROW) return std::nullopt;
  return std::string(statement.text(0));
}

Result<std::int64_t> Connection::readInteger(const char* sql) {
  Statement statement;
  int code = statement.prepare(database_, sql);
  if (code == SQLITE_OK) {
    code = statement.step();
  }
  if (code == SQLITE_ROW) return {statement.integer(0)};
  return {{}, code == SQLITE_DONE ? Error{SQLITE_CORRUPT, "damaged: no answer"} : errorOf(code)};
}

Result<std::string> Connection::readText(const char* sql) {
  Statement statement;
  int code = statement.prepare(database_, sql);
  if (code == SQLITE_OK) {
    code = statement.step();
  }
  if (code == SQLITE_ROW) return {std::string(statement.text(0))};
  return {{}, code == SQLITE_DONE ? Error{SQLITE_CORRUPT, "damaged: no answer"} : errorOf(code)};
}

Status Connection::errorOf(int code) const {
  if (code == SQLITE_OK || code == SQLITE_ROW || code == SQLITE_DONE) return {};
  return Error{code, errorText()};
}

void Connection::rollback() noexcept {
  if (database_ != nullptr && sqlite3_get_autocommit(database_) == 0) {
    static_cast<void>(run("ROLLBACK"));
  }
}

std::string Connection::errorText() const {
  if (database_ == nullptr) return "out of memory";
  std::string text = sqlite3_errmsg(database_);
  const int systemError = sqlite3_system_errno(database_);
  const int kind = sqlite3_errcode(database_) & 0xFF;
  if (systemError != 0 && (kind == SQLITE_IOERR || kind == SQLITE_CANTOPEN || kind == SQLITE_FULL)) {
    text.append(" (").append(std::generic_category().message(systemError)).append(")");
  }
  return text;
}

// Some characters would mean something in it.
std::string uriAsItLies(const std::string& path) {
  std::string uri = "file:";
  for (const char c : path) {
    if (c == '%' || c == '?' || c == '#') {
      uri += '%';
      plist::appendHex(uri, c);
    } else {
      uri.push_back(c);
    }
  }
  return uri + "?mode=ro&immutable=1";
}

}  // namespace tarn::recorder
