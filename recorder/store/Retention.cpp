// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/Retention.h"

#include <sqlite3.h>

#include <algorithm>

#include "recorder/store/EventTable.h"

namespace tarn::recorder {

namespace {

// Ids in one deletion, and pages given back in one go: a few milliseconds each.
constexpr std::int64_t kSliceIds = 256;
constexpr std::int64_t kPagesAtOnce = 64;
// Deleting begins this much below the limit, so that the next commits find free pages and the file doesn't outgrow it.
constexpr std::int64_t kReserveShare = 16;

}  // namespace

int Retention::prepare(Connection& connection) {
  connection_ = &connection;
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {
      {oldest_, "SELECT id FROM event_rows ORDER BY id LIMIT 1"},
      {pageCount_, "PRAGMA page_count"},
      {freePages_, "PRAGMA freelist_count"},
      {groupTimes_, "SELECT first, seconds FROM event_groups ORDER BY first"},
      {removeBefore_, "DELETE FROM event_rows WHERE id < ?1"},
      // Texts that a row after them still names stay; such a row isn't far.
      {removeTexts_,
       "DELETE FROM event_texts WHERE id < 2 * ?1 AND id NOT IN "
       "(SELECT 2 * (id - kind) + 1 FROM event_rows WHERE id >= ?1 AND id < ?1 + ?2 AND id - kind < ?1 UNION ALL "
       "SELECT 2 * (id - payload) FROM event_rows WHERE id >= ?1 AND id < ?1 + ?3 AND id - payload < ?1)"},
      {removeSpans_, "DELETE FROM session_spans WHERE first <= ?1 - ?2"},
      {removeTimes_, "DELETE FROM event_times WHERE block < ?1 >> ?2"},
      // The group in which the bound lies stays.
      {removeGroups_, "DELETE FROM event_groups WHERE first < (SELECT max(first) FROM event_groups WHERE first <= ?1)"},
      {removeLosses_, "DELETE FROM recorder_losses WHERE last < ?1"},
      {keepHoldsAfter_, "INSERT OR REPLACE INTO recorder_state VALUES('holds_after', ?1 - 1)"},
  };
  for (const auto& [statement, sql] : all) {
    if (const int code = statement.prepare(connection.handle(), sql, true); code != SQLITE_OK) return code;
  }
  pageBytes_ = connection.integer("PRAGMA page_size").value_or(4096);
  return SQLITE_OK;
}

void Retention::finalize() noexcept {
  for (Statement* const statement : {&oldest_, &pageCount_, &freePages_, &groupTimes_, &removeBefore_, &removeTexts_,
                                     &removeSpans_, &removeTimes_, &removeGroups_, &removeLosses_, &keepHoldsAfter_}) {
    statement->finalize();
  }
}

int Retention::readOldest(std::int64_t& id, bool& any) {
  const int code = oldest_.step();
  any = code == SQLITE_ROW;
  if (any) {
    id = oldest_.integer(0);
  }
  oldest_.reset();
  return any || code == SQLITE_DONE ? SQLITE_OK : code;
}

// The first id that isn't too old, `atMost` when all before that are; 0 when no group says that anything is.
int Retention::readAgedBefore(double cutoff, std::int64_t atMost, std::int64_t& before) {
  before = 0;
  bool aged = false;
  int code = groupTimes_.step();
  for (; code == SQLITE_ROW; code = groupTimes_.step()) {
    const std::int64_t first = groupTimes_.integer(0);
    if (first >= atMost) break;
    if (groupTimes_.real(1) >= cutoff) {
      atMost = first;
      break;
    }
    aged = true;
  }
  groupTimes_.reset();
  if (aged) {
    before = atMost;
  }
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

int Retention::removeBefore(std::int64_t id, std::uint64_t& removed) {
  int code = removeBefore_.bind(1, id).run();
  if (code != SQLITE_OK) return code;
  removed += static_cast<std::uint64_t>(sqlite3_changes64(connection_->handle()));
  removeTexts_.bind(2, EventTable::kReach).bind(3, EventTable::kPayloadReach);
  removeSpans_.bind(2, EventTable::kReach);
  removeTimes_.bind(2, std::int64_t{EventTable::kBlockBits});
  for (Statement* const statement :
       {&removeTexts_, &removeSpans_, &removeTimes_, &removeGroups_, &removeLosses_, &keepHoldsAfter_}) {
    if (code = statement->bind(1, id).run(); code != SQLITE_OK) return code;
  }
  return SQLITE_OK;
}

int Retention::readPragma(Statement& pragma, std::int64_t& value) {
  const int code = pragma.step();
  if (code == SQLITE_ROW) {
    value = pragma.integer(0);
  }
  pragma.reset();
  return code == SQLITE_ROW ? SQLITE_OK : code;
}

int Retention::readSizes(std::int64_t& fileBytes, std::int64_t& usedBytes) {
  std::int64_t pages = 0;
  std::int64_t freePages = 0;
  int code = readPragma(pageCount_, pages);
  if (code == SQLITE_OK) {
    code = readPragma(freePages_, freePages);
  }
  fileBytes = pages * pageBytes_;
  usedBytes = (pages - freePages) * pageBytes_;
  return code;
}

int Retention::removeSlice(double now, std::int64_t newest, bool& removedAny, std::uint64_t& removed) {
  removedAny = false;
  std::int64_t fileBytes = 0;
  std::int64_t usedBytes = 0;
  std::int64_t oldest = 0;
  bool any = false;
  int code = readSizes(fileBytes, usedBytes);
  if (code == SQLITE_OK) {
    code = readOldest(oldest, any);
  }
  if (code != SQLITE_OK || !any) return code;

  std::int64_t before = std::min(oldest + kSliceIds, newest + 1);
  if (usedBytes <= limits_.maxBytes - limits_.maxBytes / kReserveShare) {
    code = readAgedBefore(now - limits_.maxAgeSeconds, before, before);
  } else {
    // Of a few large ones at most half, so that no more go than must.
    before = std::min(before, oldest + std::max<std::int64_t>((newest - oldest + 1) / 2, 1));
  }
  if (code != SQLITE_OK || before <= oldest) return code;
  removedAny = true;
  return removeBefore(before, removed);
}

int Retention::giveBackPages(bool& gaveAny) {
  std::int64_t fileBytes = 0;
  std::int64_t usedBytes = 0;
  gaveAny = false;
  const int code = readSizes(fileBytes, usedBytes);
  if (code != SQLITE_OK || fileBytes <= limits_.maxBytes || fileBytes == usedBytes) return code;
  const std::int64_t excess =
      (std::min(fileBytes - limits_.maxBytes, fileBytes - usedBytes) + pageBytes_ - 1) / pageBytes_;
  const std::string pragma = "PRAGMA incremental_vacuum(" + std::to_string(std::min(excess, kPagesAtOnce)) + ")";
  const int vacuumed = connection_->run(pragma.c_str());
  if (vacuumed != SQLITE_OK) return vacuumed;
  std::int64_t left = 0;
  const int read = readSizes(left, usedBytes);
  // A file that was made without the page map can't shrink; its free pages are used again all the same.
  gaveAny = left < fileBytes;
  return read;
}

int Retention::expire(double now, std::int64_t newest, std::chrono::steady_clock::time_point deadline,
                      std::uint64_t& removed) {
  bool more = true;
  int code = SQLITE_OK;
  do {
    code = removeSlice(now, newest, more, removed);
    if (code == SQLITE_OK && !more) {
      code = giveBackPages(more);
    }
  } while (code == SQLITE_OK && more && std::chrono::steady_clock::now() < deadline);
  hasMore_ = code == SQLITE_OK && more;
  return code;
}

}  // namespace tarn::recorder
