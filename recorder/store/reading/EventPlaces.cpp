// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/EventPlaces.h"

#include <sqlite3.h>

#include <algorithm>
#include <cstddef>
#include <string>
#include <string_view>
#include <utility>

#include "recorder/store/GlobPattern.h"
#include "recorder/store/reading/EventReader.h"
#include "recorder/store/rows/EventTable.h"

namespace tarn::recorder {

namespace {

// Of so many kinds the rows themselves are looked for, without their texts; of more it wouldn't pay.
constexpr std::size_t kFewKinds = 512;

std::string_view valueText(sqlite3_value* value) noexcept {
  const void* const bytes = sqlite3_value_blob(value);
  const auto size = static_cast<std::size_t>(sqlite3_value_bytes(value));
  return bytes == nullptr ? std::string_view() : std::string_view(static_cast<const char*>(bytes), size);
}

void matchesGlob(sqlite3_context* context, int, sqlite3_value** values) {
  sqlite3_result_int(context, globMatches(valueText(values[0]), valueText(values[1])) ? 1 : 0);
}

// Adds the first column of all rows; SQLite's result code.
int addFirsts(Statement& rows, std::vector<std::int64_t>& firsts) {
  int code = rows.step();
  for (; code == SQLITE_ROW; code = rows.step()) {
    firsts.push_back(rows.integer(0));
  }
  rows.reset();
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

// Ranges of so many ids from each of these on, in any order.
std::vector<IdRange> rangesFrom(std::vector<std::int64_t> firsts, std::int64_t reach) {
  std::vector<IdRange> ranges;
  std::sort(firsts.begin(), firsts.end());
  for (const std::int64_t first : firsts) {
    addRange(ranges, {first, first + reach - 1});
  }
  return ranges;
}

Result<std::vector<IdRange>> placesOfNames(Connection& connection, const EventQuery& query) {
  Statement kinds;
  Statement rows;
  int code = kinds.prepare(connection.handle(),
                           "SELECT id >> 1 FROM event_texts WHERE name IS NOT NULL AND matches_glob(?1, name)");
  if (code == SQLITE_OK) {
    code = rows.prepare(connection.handle(),
                        "SELECT id FROM event_rows WHERE id >= ?1 AND id < ?1 + ?2 AND kind = id - ?1");
  }
  std::vector<std::int64_t> firsts;
  if (code == SQLITE_OK) {
    code = addFirsts(kinds.bind(1, std::string_view(*query.nameGlob)), firsts);
  }
  if (code != SQLITE_OK) return {{}, connection.errorOf(code)};
  if (firsts.size() > kFewKinds) return {rangesFrom(std::move(firsts), EventTable::kReach)};
  std::vector<std::int64_t> ids;
  for (std::size_t i = 0; code == SQLITE_OK && i < firsts.size(); ++i) {
    code = addFirsts(rows.bind(1, firsts[i]).bind(2, EventTable::kReach), ids);
  }
  return {rangesFrom(std::move(ids), 1), connection.errorOf(code)};
}

Result<std::vector<IdRange>> placesOfSession(Connection& connection, const EventQuery& query) {
  Statement spans;
  int code = spans.prepare(connection.handle(), "SELECT first FROM session_spans WHERE session = ?1");
  std::vector<std::int64_t> firsts;
  if (code == SQLITE_OK) {
    code = addFirsts(spans.bind(1, *query.session), firsts);
  }
  return {rangesFrom(std::move(firsts), EventTable::kReach), connection.errorOf(code)};
}

// Those blocks whose times lie outside are passed over; the others, and those whose times aren't known, aren't.
Result<std::vector<IdRange>> placesOfTime(Connection& connection, const EventQuery& query, IdRange ids) {
  constexpr std::int64_t kBlock = std::int64_t{1} << EventTable::kBlockBits;
  Statement others;
  int code = others.prepare(connection.handle(),
                            "SELECT block FROM event_times WHERE latest < ?1 OR earliest >= ?2 ORDER BY block");
  Result<std::vector<IdRange>> ranges;
  if (code == SQLITE_OK) {
    others.bind(1, query.since.value_or(-1e300)).bind(2, query.until.value_or(1e300));
    for (code = others.step(); code == SQLITE_ROW; code = others.step()) {
      const std::int64_t first = others.integer(0) * kBlock;
      if (ids.first < first && ids.first <= ids.last) {
        addRange(ranges.value, {ids.first, std::min(first - 1, ids.last)});
      }
      ids.first = std::max(ids.first, first + kBlock);
    }
  }
  if (ids.first <= ids.last) {
    addRange(ranges.value, ids);
  }
  ranges.error = connection.errorOf(code);
  return ranges;
}

}  // namespace

void addGlobFunction(Connection& connection) {
  sqlite3_create_function_v2(connection.handle(), "matches_glob", 2, SQLITE_UTF8 | SQLITE_DETERMINISTIC, nullptr,
                             matchesGlob, nullptr, nullptr, nullptr);
}

int prepareRows(Connection& connection, const EventSelect& events, const EventQuery& query, Statement& rows) {
  std::string sql(events.sql);
  const std::string kind(events.kind);
  sql += " WHERE r.id >= ?1 AND r.id <= ?2";
  sql += query.backend ? " AND " + kind + ".backend = ?4" : "";
  sql += query.nameGlob ? " AND matches_glob(?5, " + kind + ".name)" : "";
  sql += query.session ? (events.hasSessions ? " AND r.session = ?6" : " AND NULL = ?6") : "";
  sql += query.since ? " AND r.time >= ?7" : "";
  sql += query.until ? " AND r.time < ?8" : "";
  sql += " ORDER BY r.id LIMIT ?3";
  if (const int code = rows.prepare(connection.handle(), sql); code != SQLITE_OK) return code;
  if (query.backend) {
    rows.bind(4, std::string_view(*query.backend));
  }
  if (query.nameGlob) {
    rows.bind(5, std::string_view(*query.nameGlob));
  }
  if (query.session) {
    rows.bind(6, *query.session);
  }
  if (query.since) {
    rows.bind(7, *query.since);
  }
  if (query.until) {
    rows.bind(8, *query.until);
  }
  return SQLITE_OK;
}

Result<std::vector<IdRange>> findPlaces(Connection& connection, const EventQuery& query, IdRange ids) {
  Result<std::vector<IdRange>> places{{ids}, {}};
  const auto narrow = [&places](Result<std::vector<IdRange>> found) {
    places.value = commonOf(places.value, found.value);
    places.error = found.error;
  };
  if (query.since || query.until) {
    narrow(placesOfTime(connection, query, ids));
  }
  if (places.ok() && query.session) {
    narrow(placesOfSession(connection, query));
  }
  if (places.ok() && query.nameGlob) {
    narrow(placesOfNames(connection, query));
  }
  return places;
}

}  // namespace tarn::recorder
