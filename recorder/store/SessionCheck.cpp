// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/SessionCheck.h"

#include <sqlite3.h>

#include <algorithm>
#include <iterator>
#include <limits>

namespace tarn::recorder {

namespace {

constexpr std::int64_t kRowsAtOnce = 256;
constexpr std::size_t kTables = SessionSums::kTables.size();

// Ids from one on, and whether each row is as its checksum says.
std::string rowsOf(std::size_t place) {
  return "SELECT id, " + SessionSums::hashOfRow(place) +
         " IS (SELECT hash FROM row_hashes WHERE row_hashes.id = 4 * t.id + " + std::to_string(place) + ") FROM " +
         std::string(SessionSums::kTables.at(place).name) + " AS t WHERE id >= ?1 ORDER BY id LIMIT ?2";
}

// Checksums from one on, and whether each has its row.
std::string sumsOf() {
  std::string sql = "SELECT id, CASE id & 3";
  for (std::size_t place = 0; place < kTables; ++place) {
    sql += " WHEN " + std::to_string(place) + " THEN EXISTS (SELECT 1 FROM " +
           std::string(SessionSums::kTables.at(place).name) + " AS t WHERE t.id = h.id >> 2)";
  }
  return sql + " END FROM row_hashes AS h WHERE id >= ?1 ORDER BY id LIMIT ?2";
}

std::vector<IdRange> joined(const std::vector<IdRange>& some, const std::vector<IdRange>& others) {
  std::vector<IdRange> all;
  std::merge(some.begin(), some.end(), others.begin(), others.end(), std::back_inserter(all),
             [](const IdRange& a, const IdRange& b) { return a.first < b.first; });
  std::vector<IdRange> ranges;
  for (const IdRange& range : all) {
    addRange(ranges, range);
  }
  return ranges;
}

}  // namespace

std::int64_t countOf(const DamagedRows& damaged) {
  std::int64_t count = 0;
  for (const auto& ids : damaged) {
    count += countOf(ids);
  }
  return count;
}

std::string textOf(const DamagedRows& damaged) {
  std::string text;
  for (std::size_t place = 0; place < kTables; ++place) {
    if (damaged.at(place).empty()) continue;
    text +=
        (text.empty() ? "" : "; ") + std::string(SessionSums::kTables.at(place).name) + " " + textOf(damaged.at(place));
  }
  return text;
}

Status SessionCheck::begin() {
  finalize();
  damaged_ = gone_ = {};
  const auto sums =
      connection_.readInteger("SELECT count(*) FROM sqlite_schema WHERE name = 'row_hashes' AND type = 'table'");
  if (sums.failed() || sums.value == 0) return sums.error;
  if (const int code = SessionSums::addFunction(connection_); code != SQLITE_OK) return connection_.errorOf(code);
  place_ = 0;
  next_ = std::numeric_limits<std::int64_t>::min();
  done_ = false;
  return {};
}

void SessionCheck::finalize() noexcept {
  rows_.finalize();
  done_ = true;
}

Status SessionCheck::goOn(std::chrono::steady_clock::time_point deadline) {
  Status error;
  do {
    error = lookAtSome();
  } while (error.ok() && !done_ && std::chrono::steady_clock::now() < deadline);
  rows_.finalize();
  if (error.failed()) {
    goToNextTable();
  }
  return error;
}

Status SessionCheck::prepare() {
  return connection_.errorOf(rows_.prepare(connection_.handle(), place_ < kTables ? rowsOf(place_) : sumsOf()));
}

Status SessionCheck::lookAtSome() {
  if (rows_.handle() == nullptr) {
    if (auto error = prepare(); error.failed()) return error;
  }
  std::int64_t seen = 0;
  int code = rows_.bind(1, next_).bind(2, kRowsAtOnce).step();
  for (; code == SQLITE_ROW && seen < kRowsAtOnce; code = rows_.step()) {
    const std::int64_t id = rows_.integer(0);
    if (id < next_) break;  // a tree out of order
    if (rows_.integer(1) == 0) {
      place_ < kTables ? addRange(damaged_.at(place_), {id, id})
                       : addRange(gone_.at(static_cast<std::size_t>(id & 3)), {id >> 2, id >> 2});
    }
    if (id == std::numeric_limits<std::int64_t>::max()) break;
    next_ = id + 1;
    ++seen;
  }
  rows_.reset();
  if (code == SQLITE_ROW && seen < kRowsAtOnce) return Error{SQLITE_CORRUPT, "damaged: its ids are out of order"};
  if (code != SQLITE_DONE) return connection_.errorOf(code);
  if (seen < kRowsAtOnce) {
    goToNextTable();
  }
  return {};
}

void SessionCheck::goToNextTable() {
  rows_.finalize();
  next_ = std::numeric_limits<std::int64_t>::min();
  if (!done_ && ++place_ > kTables) {
    done_ = true;
    for (std::size_t place = 0; place < kTables; ++place) {
      damaged_.at(place) = joined(damaged_.at(place), gone_.at(place));
    }
  }
}

Status verifySome(StoreCheck& events, SessionCheck& sessions, std::chrono::steady_clock::time_point deadline) {
  Status error;
  if (events.isDone() && sessions.isDone()) {
    error = events.begin();
    error = error.ok() ? sessions.begin() : error;
  }
  const bool hasTime = events.isDone();
  if (error.ok() && !events.isDone()) {
    error = events.goOn(deadline);
  }
  if (error.ok() && events.isDone() && !sessions.isDone() && (hasTime || std::chrono::steady_clock::now() < deadline)) {
    error = sessions.goOn(deadline);
  }
  if (error.ok() && !events.lost().empty()) {
    error = Error{SQLITE_CORRUPT, "damaged: events " + textOf(events.lost()) + " aren't as they were written"};
  } else if (error.ok() && countOf(sessions.damaged()) > 0) {
    error = Error{SQLITE_CORRUPT, "damaged: " + textOf(sessions.damaged()) + " aren't as they were written"};
  }
  if (error.failed()) {
    events.finalize();
    sessions.finalize();
  }
  return error;
}

}  // namespace tarn::recorder
