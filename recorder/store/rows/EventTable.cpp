// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/rows/EventTable.h"

#include <sqlite3.h>

#include <algorithm>
#include <cmath>
#include <limits>

namespace tarn::recorder {

namespace {

// When there are more, all are forgotten and written anew.
constexpr std::size_t kMostKinds = 4096;
constexpr std::size_t kMostSpans = 65'536;
// Longer details tell of one event alone, so nobody looks for them again.
constexpr std::size_t kLongestKind = 512;

constexpr std::string_view kEmptyPayload = "{}";
constexpr std::string_view kMirror = "rtc";

}  // namespace

int EventTable::prepare(Connection& connection) {
  forget();
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {
      {insert_, "INSERT INTO event_rows VALUES(?1, ?2, ?3, ?4, ?5, ?6)"},
      {replace_, "INSERT OR REPLACE INTO event_rows VALUES(?1, ?2, ?3, ?4, ?5, ?6)"},
      {insertText_, "INSERT OR REPLACE INTO event_texts VALUES(?1, ?2, ?3, ?4)"},
      {insertSpan_, "INSERT OR REPLACE INTO session_spans VALUES(?1, ?2)"},
      {insertTimes_, "INSERT OR REPLACE INTO event_times VALUES(?1, ?2, ?3)"},
      {readTimes_, "SELECT min(time), max(time) FROM event_rows WHERE id >= ?1 AND id < ?2"},
  };
  for (const auto& [statement, sql] : all) {
    if (const int code = statement.prepare(connection.handle(), sql, true); code != SQLITE_OK) return code;
  }
  return SQLITE_OK;
}

void EventTable::finalize() noexcept {
  for (Statement* const statement : {&insert_, &replace_, &insertText_, &insertSpan_, &insertTimes_, &readTimes_}) {
    statement->finalize();
  }
  forget();
}

void EventTable::forget() noexcept {
  kinds_.clear();
  spans_.clear();
  recent_.clear();
  lastSession_ = lastSpan_ = lastPayload_ = 0;
  block_ = -1;
}

int EventTable::insert(std::int64_t id, const StoredEvent& event, bool repeatsPayload, bool replacing) {
  const double time = std::isnan(event.time) ? 0.0 : event.time;
  std::int64_t kind = id;
  Place payload;
  int code = placeKind(id, event, kind);
  if (code == SQLITE_OK) {
    code = placePayload(id, event, repeatsPayload, payload);
  }
  if (code == SQLITE_OK && event.session != 0) {
    code = noteSession(id, event.session);
  }
  if (code == SQLITE_OK) {
    code = noteTime(id, time);
  }
  if (code != SQLITE_OK) return code;
  Statement& row = replacing ? replace_ : insert_;
  row.bind(1, id).bind(2, time).bind(3, id - kind);
  payload.empty ? row.bindNull(4) : row.bind(4, payload.back);
  payload.cut == 0 ? row.bindNull(5) : row.bind(5, payload.cut);
  event.session == 0 ? row.bindNull(6) : row.bind(6, event.session);
  return row.run();
}

int EventTable::placeKind(std::int64_t id, const StoredEvent& event, std::int64_t& first) {
  const bool isShared = event.name.size() + event.detail.size() <= kLongestKind;
  if (isShared) {
    key_.assign(event.backend).push_back('\0');
    key_.append(event.name).push_back('\0');
    key_.append(event.detail);
    const auto known = kinds_.find(std::string_view(key_));
    if (known != kinds_.end() && id - known->second < kReach) {
      first = known->second;
      return SQLITE_OK;
    }
    if (known != kinds_.end()) {
      known->second = id;
    } else {
      if (kinds_.size() >= kMostKinds) {
        kinds_.clear();
      }
      kinds_.emplace(key_, id);
    }
  }
  first = id;
  return insertText_.bind(1, 2 * id + 1).bind(2, event.backend).bind(3, event.name).bind(4, event.detail).run();
}

int EventTable::placePayload(std::int64_t id, const StoredEvent& event, bool repeats, Place& place) {
  place.empty = event.payload == kEmptyPayload;
  if (place.empty) return SQLITE_OK;
  if (repeats && lastPayload_ != 0 && id - lastPayload_ < kPayloadReach) {
    place.back = id - lastPayload_;
    return SQLITE_OK;
  }
  if (event.backend == kMirror) {
    hasMirrors_ = true;
    if (const auto found = recent_.find(event.payload); found && id - found->id < kPayloadReach) {
      place.back = id - found->id;
      place.cut = found->cut;
      lastPayload_ = 0;
      return SQLITE_OK;
    }
  } else if (hasMirrors_) {
    recent_.add(id, event.payload);
  }
  lastPayload_ = id;
  return insertText_.bind(1, 2 * id).bindNull(2).bindNull(3).bind(4, event.payload).run();
}

int EventTable::noteSession(std::int64_t id, std::int64_t session) {
  const std::int64_t first = id & -kReach;
  if (session == lastSession_ && first == lastSpan_) return SQLITE_OK;
  if (spans_.size() >= kMostSpans) {
    spans_.clear();
  }
  const auto [span, isNew] = spans_.try_emplace(session, first);
  const bool begins = isNew || span->second != first;
  span->second = first;
  lastSession_ = session;
  lastSpan_ = first;
  return begins ? insertSpan_.bind(1, session).bind(2, first).run() : SQLITE_OK;
}

// A block's times are written when the next one begins; until then, and where a rollback or another run left it
// unknown, they are those of its rows.
int EventTable::noteTime(std::int64_t id, double time) {
  const std::int64_t block = id >> kBlockBits;
  if (block != block_) {
    if (const int code = writeTimes(); code != SQLITE_OK) return code;
    block_ = -1;
    int code = readTimes_.bind(1, block << kBlockBits).bind(2, (block + 1) << kBlockBits).step();
    const bool hasRows = code == SQLITE_ROW && !readTimes_.isNull(0);
    earliest_ = hasRows ? readTimes_.real(0) : std::numeric_limits<double>::infinity();
    latest_ = hasRows ? readTimes_.real(1) : -std::numeric_limits<double>::infinity();
    readTimes_.reset();
    if (code != SQLITE_ROW) return code;
    block_ = block;
  }
  earliest_ = std::min(earliest_, time);
  latest_ = std::max(latest_, time);
  return SQLITE_OK;
}

int EventTable::writeTimes() {
  if (block_ < 0) return SQLITE_OK;
  return insertTimes_.bind(1, block_).bind(2, earliest_).bind(3, latest_).run();
}

}  // namespace tarn::recorder
