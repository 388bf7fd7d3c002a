// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/rows/Statement.h"

#include <sqlite3.h>

namespace tarn::recorder {

int Statement::prepare(sqlite3* database, std::string_view sql, bool kept) {
  finalize();
  return sqlite3_prepare_v3(database, sql.data(), static_cast<int>(sql.size()),
                            kept ? unsigned{SQLITE_PREPARE_PERSISTENT} : 0U, &statement_, nullptr);
}

void Statement::finalize() noexcept {
  sqlite3_finalize(statement_);
  statement_ = nullptr;
}

// A binding fails only for a place that the text doesn't have or without memory; the step after it then answers.
Statement& Statement::bind(int place, std::int64_t value) noexcept {
  sqlite3_bind_int64(statement_, place, value);
  return *this;
}

Statement& Statement::bind(int place, double value) noexcept {
  sqlite3_bind_double(statement_, place, value);
  return *this;
}

Statement& Statement::bindNull(int place) noexcept {
  sqlite3_bind_null(statement_, place);
  return *this;
}

Statement& Statement::bindBytes(int place, std::string_view bytes) noexcept {
  sqlite3_bind_blob64(statement_, place, bytes.data(), bytes.size(), nullptr /* SQLITE_STATIC */);
  return *this;
}

Statement& Statement::bind(int place, std::string_view text) noexcept {
  const char* const start = text.data() != nullptr ? text.data() : "";
  sqlite3_bind_text64(statement_, place, start, text.size(), nullptr /* SQLITE_STATIC */, SQLITE_UTF8);
  return *this;
}

int Statement::step() noexcept {
  return sqlite3_step(statement_);
}

void Statement::reset() noexcept {
  sqlite3_reset(statement_);
}

int Statement::run() noexcept {
  int code = sqlite3_step(statement_);
  while (code == SQLITE_ROW) {
    code = sqlite3_step(statement_);
  }
  sqlite3_reset(statement_);
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

bool Statement::isNull(int column) const noexcept {
  return sqlite3_column_type(statement_, column) == SQLITE_NULL;
}

bool Statement::isReal(int column) const noexcept {
  return sqlite3_column_type(statement_, column) == SQLITE_FLOAT;
}

bool Statement::isText(int column) const noexcept {
  return sqlite3_column_type(statement_, column) == SQLITE_TEXT;
}

std::int64_t Statement::integer(int column) const noexcept {
  return sqlite3_column_int64(statement_, column);
}

double Statement::real(int column) const noexcept {
  return sqlite3_column_double(statement_, column);
}

std::string_view Statement::text(int column) const noexcept {
  const void* const bytes = sqlite3_column_blob(statement_, column);
  const int size = sqlite3_column_bytes(statement_, column);
  return bytes == nullptr ? std::string_view()
                          : std::string_view(static_cast<const char*>(bytes), static_cast<std::size_t>(size));
}

}  // namespace tarn::recorder
