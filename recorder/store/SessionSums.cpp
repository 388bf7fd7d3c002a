// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/SessionSums.h"

#include <sqlite3.h>

#include "recorder/store/files/RowHash.h"

namespace tarn::recorder {

namespace {

// By value and kind: the same bytes mean something else as another kind.
void addValue(RowHash& hash, sqlite3_value* value) {
  const int kind = sqlite3_value_type(value);
  hash.add(static_cast<std::uint64_t>(kind));
  switch (kind) {
    case SQLITE_INTEGER:
      hash.add(static_cast<std::uint64_t>(sqlite3_value_int64(value)));
      break;
    case SQLITE_FLOAT:
      hash.add(sqlite3_value_double(value));
      break;
    case SQLITE_TEXT:
    case SQLITE_BLOB: {
      const void* const bytes = sqlite3_value_blob(value);
      const auto size = static_cast<std::size_t>(sqlite3_value_bytes(value));
      hash.add(bytes == nullptr ? std::string_view() : std::string_view(static_cast<const char*>(bytes), size));
      break;
    }
    default:
      break;
  }
}

void rowHash(sqlite3_context* context, int count, sqlite3_value** values) {
  RowHash hash;
  for (int i = 0; i < count; ++i) {
    addValue(hash, values[i]);
  }
  sqlite3_result_int64(context, static_cast<sqlite3_int64>(hash.value()));
}

// "row_hashes.id" of a row whose id this is.
std::string placeOf(std::size_t place, std::string_view id) {
  return std::string("4 * ").append(id).append(" + ").append(std::to_string(place));
}

}  // namespace

int SessionSums::addFunction(Connection& connection) {
  return sqlite3_create_function_v2(connection.handle(), "row_hash", -1, SQLITE_UTF8 | SQLITE_DETERMINISTIC, nullptr,
                                    rowHash, nullptr, nullptr, nullptr);
}

std::string SessionSums::hashOfRow(std::size_t place) {
  return "row_hash(" + std::to_string(place) + ", " + std::string(kTables.at(place).columns) + ")";
}

std::string SessionSums::sealAll() {
  std::string sql;
  for (std::size_t place = 0; place < kTables.size(); ++place) {
    sql += "INSERT OR REPLACE INTO row_hashes SELECT " + placeOf(place, "id") + ", " + hashOfRow(place) + " FROM " +
           std::string(kTables.at(place).name) + ";";
  }
  return sql;
}

std::string SessionSums::removeOf(std::size_t place, std::string_view ids) {
  return "DELETE FROM row_hashes WHERE id IN (SELECT " + placeOf(place, "id") + " FROM (" + std::string(ids) + "));";
}

int SessionSums::prepare(Connection& connection) {
  int code = addFunction(connection);
  for (std::size_t place = 0; code == SQLITE_OK && place < kTables.size(); ++place) {
    const std::string row = " FROM " + std::string(kTables.at(place).name) + " WHERE id = ?1";
    code = look_.at(place).prepare(connection.handle(),
                                   "SELECT (SELECT " + hashOfRow(place) + row +
                                       ") IS (SELECT hash FROM row_hashes WHERE id = " + placeOf(place, "?1") + ")",
                                   true);
    if (code == SQLITE_OK) {
      code = seal_.at(place).prepare(
          connection.handle(),
          "INSERT OR REPLACE INTO row_hashes SELECT " + placeOf(place, "id") + ", " + hashOfRow(place) + row, true);
    }
  }
  return code;
}

void SessionSums::finalize() noexcept {
  for (std::size_t place = 0; place < kTables.size(); ++place) {
    look_[place].finalize();
    seal_[place].finalize();
  }
}

int SessionSums::change(Place place, std::int64_t row, Statement& statement) {
  Statement& look = look_.at(place);
  int code = look.bind(1, row).step();
  const bool isWhole = code == SQLITE_ROW && look.integer(0) != 0;
  look.reset();
  if (code != SQLITE_ROW) return code;
  code = statement.run();
  return code == SQLITE_OK && isWhole ? seal_.at(place).bind(1, row).run() : code;
}

}  // namespace tarn::recorder
