// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/EventScan.h"

#include <sqlite3.h>

namespace tarn::recorder {

namespace {

// When there are more, all are forgotten and asked for anew.
constexpr std::size_t kMostRemembered = 8192;
// Of a row's cut, how many characters it takes out; they are of one byte each.
constexpr std::int64_t kCutLength = 0xFFFF;
constexpr std::int64_t kEmptyPayloadBytes = 2;

}  // namespace

int EventScan::prepare(Connection& connection) {
  forget();
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {
      {rows_, "SELECT id, kind, payload, cut, session FROM event_rows WHERE id >= ?1 AND id < ?2 ORDER BY id LIMIT ?3"},
      {kind_, "SELECT backend, name, text FROM event_texts WHERE id = 2 * ?1 + 1"},
      {payload_, "SELECT text FROM event_texts WHERE id = 2 * ?1"},
      {owner_, "SELECT uid FROM sessions WHERE id = ?1"}};
  for (const auto& [statement, sql] : all) {
    if (const int code = statement.prepare(connection.handle(), sql, true); code != SQLITE_OK) return code;
  }
  return SQLITE_OK;
}

void EventScan::finalize() noexcept {
  for (Statement* const statement : {&rows_, &kind_, &payload_, &owner_}) {
    statement->finalize();
  }
  forget();
}

void EventScan::forget() noexcept {
  kinds_.clear();
  owners_.clear();
  lastPayload_ = 0;
}

int EventScan::read(std::int64_t from, std::int64_t end, std::int64_t most, std::vector<ScannedEvent>& events) {
  events.clear();
  int code = rows_.bind(1, from).bind(2, end).bind(3, most).step();
  for (; code == SQLITE_ROW; code = rows_.step()) {
    ScannedEvent event{rows_.integer(0)};
    Kind kind;
    int found = readKind(event.id - rows_.integer(1), kind);
    std::int64_t payload = kEmptyPayloadBytes;
    if (found == SQLITE_OK && !rows_.isNull(2)) {
      found = readPayloadBytes(event.id - rows_.integer(2), payload);
      payload -= rows_.integer(3) & kCutLength;
    }
    if (found == SQLITE_OK) {
      found = readOwner(rows_.integer(4), event.owner);
    }
    if (found != SQLITE_OK) {
      rows_.reset();
      return found;
    }
    event.sort = kind.sort;
    event.bytes = kBytesBesideTexts + kind.bytes + payload;
    events.push_back(event);
  }
  rows_.reset();
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

int EventScan::readKind(std::int64_t id, Kind& kind) {
  if (const auto known = kinds_.find(id); known != kinds_.end()) {
    kind = known->second;
    return SQLITE_OK;
  }
  const int code = kind_.bind(1, id).step();
  if (code == SQLITE_ROW) {
    kind.sort = sortOf(kind_.text(0), kind_.text(1), kind_.text(2));
    kind.bytes = static_cast<std::int64_t>(kind_.text(0).size() + kind_.text(1).size() + kind_.text(2).size());
    if (kinds_.size() >= kMostRemembered) {
      kinds_.clear();
    }
    kinds_.emplace(id, kind);
  }
  kind_.reset();
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

int EventScan::readPayloadBytes(std::int64_t id, std::int64_t& bytes) {
  if (id != lastPayload_) {
    const int code = payload_.bind(1, id).step();
    lastPayloadBytes_ = code == SQLITE_ROW ? static_cast<std::int64_t>(payload_.text(0).size()) : 0;
    payload_.reset();
    if (code != SQLITE_ROW && code != SQLITE_DONE) {
      lastPayload_ = 0;
      return code;
    }
    lastPayload_ = id;
  }
  bytes = lastPayloadBytes_;
  return SQLITE_OK;
}

// A session that nobody has described yet is asked for again the next time.
int EventScan::readOwner(std::int64_t session, Owner& owner) {
  owner = kServiceItself;
  if (session == 0) return SQLITE_OK;
  if (const auto known = owners_.find(session); known != owners_.end()) {
    owner = known->second;
    return SQLITE_OK;
  }
  const int code = owner_.bind(1, session).step();
  if (code == SQLITE_ROW && !owner_.isNull(0)) {
    owner = owner_.integer(0);
    if (owners_.size() >= kMostRemembered) {
      owners_.clear();
    }
    owners_.emplace(session, owner);
  }
  owner_.reset();
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

}  // namespace tarn::recorder
