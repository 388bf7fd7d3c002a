// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/RemovedIds.h"

#include <sqlite3.h>

#include <algorithm>
#include <string>

#include "recorder/store/files/RowHash.h"
#include "recorder/store/rows/EventTable.h"

namespace tarn::recorder {

namespace {

std::int64_t hashOf(const IdRange& range) noexcept {
  RowHash hash;
  hash.add(static_cast<std::uint64_t>(range.first));
  hash.add(static_cast<std::uint64_t>(range.last));
  return static_cast<std::int64_t>(hash.value());
}

// Of a row of the table; one that was damaged says nothing, so that what it stood for shows.
bool readRange(const Statement& row, IdRange& range) noexcept {
  range = {row.integer(0), row.integer(1)};
  return range.first <= range.last && row.integer(2) == hashOf(range);
}

}  // namespace

void RemovedIds::finalize() noexcept {
  for (Statement* const statement : {&overlapping_, &insert_, &remove_}) {
    statement->finalize();
  }
  isPrepared_ = false;
}

int RemovedIds::hasTable(bool& has) {
  const Result<std::int64_t> tables =
      connection_->readInteger("SELECT count(*) FROM sqlite_schema WHERE name = 'recorder_removed' AND type = 'table'");
  has = tables.ok() && tables.value > 0;
  return tables.ok() ? SQLITE_OK : static_cast<int>(tables.error->code);
}

// From the range before on, which may reach into what is asked for.
int RemovedIds::prepareReading() {
  if (overlapping_.handle() != nullptr) return SQLITE_OK;
  return overlapping_.prepare(connection_->handle(),
                              "SELECT first, last, hash FROM recorder_removed WHERE first >= coalesce((SELECT "
                              "max(first) FROM recorder_removed WHERE first <= ?1), ?1) AND first <= ?2 ORDER BY first",
                              true);
}

int RemovedIds::prepareWriting() {
  if (isPrepared_) return SQLITE_OK;
  int code = connection_->run(
      "CREATE TABLE IF NOT EXISTS recorder_removed(first INTEGER PRIMARY KEY, last INTEGER, hash INTEGER)");
  code = code == SQLITE_OK ? prepareReading() : code;
  if (code == SQLITE_OK) {
    code = insert_.prepare(connection_->handle(), "INSERT OR REPLACE INTO recorder_removed VALUES(?1, ?2, ?3)", true);
  }
  if (code == SQLITE_OK) {
    code = remove_.prepare(connection_->handle(), "DELETE FROM recorder_removed WHERE first = ?1", true);
  }
  isPrepared_ = code == SQLITE_OK;
  return code;
}

int RemovedIds::readHold(std::int64_t& holdsAfter) {
  const Result<std::int64_t> value =
      connection_->readInteger("SELECT coalesce((SELECT value FROM recorder_state WHERE name = 'holds_after'), 0)");
  holdsAfter = value.value;
  return value.ok() ? SQLITE_OK : static_cast<int>(value.error->code);
}

int RemovedIds::add(IdRange range) {
  std::int64_t hold = 0;
  int code = readHold(hold);
  range.first = std::max(range.first, hold + 1);
  if (code != SQLITE_OK || range.first > range.last) return code;
  code = prepareWriting();
  code = code == SQLITE_OK ? joinNeighbours(range) : code;
  return code == SQLITE_OK ? insert_.bind(1, range.first).bind(2, range.last).bind(3, hashOf(range)).run() : code;
}

// What touches the range, or lies within it, becomes part of it.
int RemovedIds::joinNeighbours(IdRange& range) {
  std::vector<std::int64_t> joined;
  overlapping_.bind(1, range.first - 1).bind(2, range.last + 1);
  int code = overlapping_.step();
  for (; code == SQLITE_ROW; code = overlapping_.step()) {
    IdRange other;
    if (!readRange(overlapping_, other) || other.last < range.first - 1) continue;
    joined.push_back(other.first);
    range = {std::min(range.first, other.first), std::max(range.last, other.last)};
  }
  overlapping_.reset();
  code = code == SQLITE_DONE ? SQLITE_OK : code;
  for (std::size_t i = 0; code == SQLITE_OK && i < joined.size(); ++i) {
    code = remove_.bind(1, joined[i]).run();
  }
  return code;
}

int RemovedIds::goOn(Statement& list, Statement& forget, bool hasHash, std::int64_t& hold) {
  int code = list.step();
  IdRange range{list.integer(0), list.integer(1)};
  const bool isWhole = code == SQLITE_ROW && (!hasHash || readRange(list, range));
  list.reset();
  if (code != SQLITE_ROW) return code == SQLITE_DONE ? SQLITE_OK : code;
  if (!isWhole || range.first > hold + 1) return SQLITE_OK;
  hold = std::max(hold, range.last);
  return forget.bind(1, range.first).run();
}

int RemovedIds::fold() {
  std::int64_t hold = 0;
  int code = readHold(hold);
  bool has = false;
  code = code == SQLITE_OK ? hasTable(has) : code;
  if (code != SQLITE_OK || !has) return code;
  code = prepareWriting();
  Statement removed;
  Statement losses;
  Statement forgetLoss;
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {{removed, "SELECT first, last, hash FROM recorder_removed ORDER BY first LIMIT 1"},
             {losses, "SELECT first, last FROM recorder_losses ORDER BY first LIMIT 1"},
             {forgetLoss, "DELETE FROM recorder_losses WHERE first = ?1"}};
  for (const auto& [statement, sql] : all) {
    code = code == SQLITE_OK ? statement.prepare(connection_->handle(), sql) : code;
  }
  const std::int64_t held = hold;
  for (std::int64_t before = hold - 1; code == SQLITE_OK && before != hold;) {
    before = hold;
    code = goOn(removed, remove_, true, hold);
    code = code == SQLITE_OK ? goOn(losses, forgetLoss, false, hold) : code;
  }
  return code == SQLITE_OK && hold > held ? forgetBefore(hold) : code;
}

// The group in which the next one lies stays.
int RemovedIds::forgetBefore(std::int64_t hold) {
  const std::string next = std::to_string(hold + 1);
  return connection_->run(
      ("INSERT OR REPLACE INTO recorder_state VALUES('holds_after', " + std::to_string(hold) +
       ");"
       "DELETE FROM event_groups WHERE first < (SELECT max(first) FROM event_groups WHERE first <= " +
       next +
       ");"
       "DELETE FROM event_times WHERE block < " +
       next + " >> " + std::to_string(EventTable::kBlockBits))
          .c_str());
}

int RemovedIds::within(IdRange range, std::vector<IdRange>& removed) {
  removed.clear();
  if (overlapping_.handle() == nullptr) {
    bool has = false;
    const int code = hasTable(has);
    if (code != SQLITE_OK || !has) return code;
  }
  int code = prepareReading();
  if (code != SQLITE_OK) return code;
  overlapping_.bind(1, range.first).bind(2, range.last);
  for (code = overlapping_.step(); code == SQLITE_ROW; code = overlapping_.step()) {
    IdRange other;
    if (!readRange(overlapping_, other) || other.last < range.first) continue;
    addRange(removed, {std::max(other.first, range.first), std::min(other.last, range.last)});
  }
  overlapping_.reset();
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

}  // namespace tarn::recorder
