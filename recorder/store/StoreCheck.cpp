// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/StoreCheck.h"

#include <sqlite3.h>

#include <algorithm>

#include "recorder/store/StoreLayout.h"

namespace tarn::recorder {

namespace {

// Ids that are passed over where nothing can be read.
constexpr std::int64_t kStride = 16;
constexpr int kMostStrides = 1'000'000;

// Whether the row has the kinds of values that the recorder writes; other kinds may have the same bytes.
bool isAsWritten(const Statement& row) noexcept {
  const bool hasSession = row.isNull(6) || row.integer(6) != 0;
  return row.isReal(1) && row.isText(2) && row.isText(3) && row.isText(4) && row.isText(5) && hasSession;
}

}  // namespace

Status StoreCheck::begin() {
  finalize();
  next_ = 0;
  good_ = stray_ = 0;
  stridesLeft_ = kMostStrides;
  unproven_.clear();
  lost_.clear();
  knownLost_.clear();
  if (auto error = readKnown(); error.failed()) return error;
  int code = groups_.prepare(connection_.handle(),
                             "SELECT first, seconds, hashes FROM event_groups WHERE first >= ?1 - 63 ORDER BY first");
  if (code == SQLITE_OK) {
    const std::string rows(selectEvents(connection_).sql);
    code = rows_.prepare(connection_.handle(), rows + " WHERE r.id >= ?1 AND r.id < ?2 ORDER BY r.id");
  }
  removedIds_.prepare(connection_);
  if (code == SQLITE_OK && !selectEvents(connection_).isOlder) {
    code = strays_.prepare(connection_.handle(),
                           "SELECT r.id FROM event_rows AS r WHERE r.id >= ?1 AND r.id < ?2 AND r.session IS NOT NULL "
                           "AND NOT EXISTS (SELECT 1 FROM session_spans AS s WHERE s.session = r.session AND s.first = "
                           "(r.id & -256)) LIMIT 1");
  }
  done_ = code != SQLITE_OK;
  return connection_.errorOf(code);
}

void StoreCheck::finalize() noexcept {
  groups_.finalize();
  rows_.finalize();
  removedIds_.finalize();
  strays_.finalize();
  done_ = true;
}

Status StoreCheck::goOn(std::chrono::steady_clock::time_point deadline) {
  // Before the first that must be there: removed by retention, perhaps since the last piece; older than the checksums;
  // or never in this file.
  const Result<std::int64_t> before =
      connection_.readInteger("SELECT coalesce((SELECT value FROM recorder_state WHERE name = 'holds_after'), 0)");
  if (before.failed() && !tolerant_) return before.error;
  next_ = std::max(next_, before.value + 1);
  groups_.bind(1, next_);
  do {
    const int code = groups_.step();
    if (code != SQLITE_ROW) {
      groups_.reset();
      return code == SQLITE_DONE || tolerant_ ? finish() : connection_.errorOf(code);
    }
    if (!group_.read(groups_.integer(0), groups_.real(1), groups_.text(2))) continue;
    if (auto error = lookAtGroup(); error.failed()) {
      groups_.reset();
      return error;
    }
  } while (std::chrono::steady_clock::now() < deadline);
  groups_.reset();
  return {};
}

// What a damaged group held is told when the next one comes.
Status StoreCheck::lookAtGroup() {
  if (group_.end() <= next_) return {};
  if (next_ < group_.first()) {
    if (auto error = lookAtRows(next_, group_.first(), nullptr); error.failed()) return error;
  }
  if (auto error = lookAtRows(std::max(next_, group_.first()), group_.end(), &group_); error.failed()) return error;
  next_ = group_.end();
  return lookForStrays();
}

// An event that its session's spans don't lead to is there, but nobody who asks for the session finds it.
Status StoreCheck::lookForStrays() {
  if (strays_.handle() == nullptr) return {};
  const int code = strays_.bind(1, group_.first()).bind(2, group_.end()).step();
  const std::int64_t stray = code == SQLITE_ROW ? strays_.integer(0) : 0;
  strays_.reset();
  if (code == SQLITE_DONE || (code != SQLITE_ROW && tolerant_)) return {};
  if (code != SQLITE_ROW) return connection_.errorOf(code);
  stray_ = stray_ == 0 ? stray : stray_;
  return tolerant_ ? Status() : Error{SQLITE_CORRUPT, strayText()};
}

std::string StoreCheck::strayText() const {
  return stray_ == 0 ? std::string()
                     : "damaged: the spans of its session don't lead to event " + std::to_string(stray_);
}

// Without a group nothing proves the rows.
Status StoreCheck::lookAtRows(std::int64_t first, std::int64_t end, const EventGroup* group) {
  int code = SQLITE_ROW;
  Status error;
  while (first < end && error.ok()) {
    code = rows_.bind(1, first).bind(2, end).step();
    for (; code == SQLITE_ROW && error.ok(); code = rows_.step()) {
      const std::int64_t id = rows_.integer(0);
      if (id < first || id >= end) break;  // a tree out of order
      error = miss(first, id);
      first = id + 1;
      lookAtRow(id, group);
    }
    rows_.reset();
    if (code == SQLITE_DONE || !tolerant_ || --stridesLeft_ < 0) break;
    const std::int64_t next = std::min(first + kStride, end);
    error = miss(first, next);
    first = next;
  }
  if (error.failed()) return error;
  if (!tolerant_ && code != SQLITE_DONE) {
    return code == SQLITE_ROW ? Error{SQLITE_CORRUPT, "damaged: its ids are out of order"} : connection_.errorOf(code);
  }
  return miss(first, end);
}

Status StoreCheck::miss(std::int64_t first, std::int64_t end) {
  if (first >= end) return {};
  const int code = removedIds_.within({first, end - 1}, removed_);
  if (code != SQLITE_OK && !tolerant_) return connection_.errorOf(code);
  for (const IdRange& gap : without({first, end - 1}, removed_)) {
    lose(gap.first, gap.last + 1);
  }
  return {};
}

void StoreCheck::lookAtRow(std::int64_t id, const EventGroup* group) {
  const StoredEvent event{rows_.real(1), rows_.text(2), rows_.text(3), rows_.text(4), rows_.text(5), rows_.integer(6)};
  if (!isAsWritten(rows_) || (group != nullptr && hashOf(id, event) != group->hash(id))) {
    lose(id, id + 1);
  } else if (group == nullptr) {
    addRange(unproven_, {id, id});
  } else {
    ++good_;
  }
}

Status StoreCheck::finish() {
  const Result<std::int64_t> last = readLastId(connection_);
  if (last.failed()) return last.error;
  if (next_ <= last.value) {
    if (auto error = lookAtRows(next_, last.value + 1, nullptr); error.failed()) return error;
  }
  done_ = true;
  return {};
}

Status StoreCheck::readKnown() {
  known_.clear();
  Statement losses;
  int code = losses.prepare(connection_.handle(), "SELECT first, last FROM recorder_losses ORDER BY first");
  if (code == SQLITE_OK) {
    for (code = losses.step(); code == SQLITE_ROW; code = losses.step()) {
      addRange(known_, {losses.integer(0), losses.integer(1)});
    }
  }
  return connection_.errorOf(code);
}

void StoreCheck::lose(std::int64_t first, std::int64_t end) {
  for (const IdRange& known : known_) {
    if (first >= end) return;
    if (known.last < first || known.first >= end) continue;
    if (first < known.first) {
      addRange(lost_, {first, known.first - 1});
    }
    addRange(knownLost_, {std::max(first, known.first), std::min(end - 1, known.last)});
    first = known.last + 1;
  }
  if (first < end) {
    addRange(lost_, {first, end - 1});
  }
}

}  // namespace tarn::recorder
