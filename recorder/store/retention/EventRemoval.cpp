// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/retention/EventRemoval.h"

#include <sqlite3.h>

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <unordered_map>
#include <utility>

#include "recorder/store/rows/EventTable.h"

namespace tarn::recorder {

namespace {

// Ids further apart than this have nothing around them in common.
constexpr std::int64_t kNear = 2 * EventTable::kPayloadReach;
// Of what is looked at in one go.
constexpr std::int64_t kWidest = 8 * EventTable::kPayloadReach;

constexpr std::int64_t textOfKind(std::int64_t id) noexcept {
  return 2 * id + 1;
}

constexpr std::int64_t textOfPayload(std::int64_t id) noexcept {
  return 2 * id;
}

void sortOut(std::vector<std::int64_t>& ids) {
  std::sort(ids.begin(), ids.end());
  ids.erase(std::unique(ids.begin(), ids.end()), ids.end());
}

}  // namespace

int EventRemoval::prepare(Connection& connection) {
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {
      {rows_, "SELECT id, kind, payload, session FROM event_rows WHERE id >= ?1 AND id < ?2 ORDER BY id"},
      {removeRows_, "DELETE FROM event_rows WHERE id >= ?1 AND id <= ?2"},
      {removeTexts_, "DELETE FROM event_texts WHERE id >= ?1 AND id <= ?2"},
      {spans_, "SELECT first FROM session_spans WHERE session = ?1 AND first > ?2 AND first <= ?3"},
      {removeSpan_, "DELETE FROM session_spans WHERE session = ?1 AND first = ?2"},
      {groups_, "SELECT first, seconds, hashes FROM event_groups WHERE first > ?1 AND first <= ?2 ORDER BY first"},
      {removeGroup_, "DELETE FROM event_groups WHERE first = ?1"},
      {insertGroup_, "INSERT OR REPLACE INTO event_groups VALUES(?1, ?2, ?3)"},
      {removeTimes_,
       "DELETE FROM event_times WHERE block >= ?1 AND block <= ?2 AND NOT EXISTS (SELECT 1 FROM event_rows WHERE id >= "
       "block * ?3 AND id < (block + 1) * ?3)"},
  };
  for (const auto& [statement, sql] : all) {
    if (const int code = statement.prepare(connection.handle(), sql, true); code != SQLITE_OK) return code;
  }
  removedIds_.prepare(connection);
  return SQLITE_OK;
}

void EventRemoval::finalize() noexcept {
  for (Statement* const statement : {&rows_, &removeRows_, &removeTexts_, &spans_, &removeSpan_, &groups_,
                                     &removeGroup_, &insertGroup_, &removeTimes_}) {
    statement->finalize();
  }
  removedIds_.finalize();
}

int EventRemoval::remove(std::span<const std::int64_t> ids) {
  for (std::size_t begin = 0; begin < ids.size();) {
    std::size_t end = begin + 1;
    while (end < ids.size() && ids[end] - ids[end - 1] <= kNear && ids[end] - ids[begin] <= kWidest) {
      ++end;
    }
    if (const int code = removeNear(ids.subspan(begin, end - begin)); code != SQLITE_OK) return code;
    begin = end;
  }
  return removedIds_.fold();
}

int EventRemoval::removeNear(std::span<const std::int64_t> ids) {
  int code = readAround(ids);
  code = code == SQLITE_OK ? removeRows(ids) : code;
  code = code == SQLITE_OK ? removeTexts() : code;
  code = code == SQLITE_OK ? removeSpans() : code;
  code = code == SQLITE_OK ? cutGroups(ids.front(), ids.back()) : code;
  return code == SQLITE_OK ? removeTimes(ids.front(), ids.back()) : code;
}

// A text lies a payload's reach before the row that names it, and another row that names it as far after.
int EventRemoval::readAround(std::span<const std::int64_t> ids) {
  going_.clear();
  staying_.clear();
  rows_.bind(1, ids.front() - EventTable::kPayloadReach).bind(2, ids.back() + EventTable::kPayloadReach);
  int code = rows_.step();
  for (std::size_t next = 0; code == SQLITE_ROW; code = rows_.step()) {
    const std::int64_t id = rows_.integer(0);
    while (next < ids.size() && ids[next] < id) {
      ++next;
    }
    const bool goes = next < ids.size() && ids[next] == id;
    (goes ? going_ : staying_)
        .push_back({id, id - rows_.integer(1), id - rows_.integer(2), !rows_.isNull(2), rows_.integer(3)});
  }
  rows_.reset();
  return code == SQLITE_DONE ? SQLITE_OK : code;
}

std::int64_t EventRemoval::stayingWithin(std::int64_t first, std::int64_t end) const noexcept {
  const auto isBefore = [](const Row& row, std::int64_t id) { return row.id < id; };
  const auto row = std::lower_bound(staying_.begin(), staying_.end(), first, isBefore);
  return std::lower_bound(row, staying_.end(), end, isBefore) - row;
}

// Ids that lie between two of them and are nowhere are not noted: they may be lost.
int EventRemoval::removeRows(std::span<const std::int64_t> ids) {
  for (std::size_t begin = 0; begin < ids.size();) {
    std::size_t end = begin + 1;
    while (end < ids.size() && ids[end] == ids[end - 1] + 1) {
      ++end;
    }
    const IdRange range{ids[begin], ids[end - 1]};
    int code = removeRows_.bind(1, range.first).bind(2, range.last).run();
    code = code == SQLITE_OK ? removedIds_.add(range) : code;
    if (code != SQLITE_OK) return code;
    begin = end;
  }
  return SQLITE_OK;
}

// Those that only rows that go have named, in as few ranges as those that stay leave between them. A damaged row may
// name anything; no sound one names what lies further back than texts are shared.
int EventRemoval::removeTexts() {
  std::vector<std::int64_t> used;
  std::vector<std::int64_t> named;
  for (const std::vector<Row>* const rows : {&staying_, &going_}) {
    std::vector<std::int64_t>& texts = rows == &staying_ ? used : named;
    for (const Row& row : *rows) {
      if (row.kind <= row.id && row.id - row.kind < EventTable::kReach) {
        texts.push_back(textOfKind(row.kind));
      }
      if (row.hasPayload && row.payload <= row.id && row.id - row.payload < EventTable::kPayloadReach) {
        texts.push_back(textOfPayload(row.payload));
      }
    }
    sortOut(texts);
  }
  std::vector<std::int64_t> unused;
  std::set_difference(named.begin(), named.end(), used.begin(), used.end(), std::back_inserter(unused));
  for (std::size_t begin = 0; begin < unused.size();) {
    const auto nextUsed = std::upper_bound(used.begin(), used.end(), unused[begin]);
    std::size_t end = begin + 1;
    while (end < unused.size() && (nextUsed == used.end() || unused[end] < *nextUsed)) {
      ++end;
    }
    if (const int code = removeTexts_.bind(1, unused[begin]).bind(2, unused[end - 1]).run(); code != SQLITE_OK) {
      return code;
    }
    begin = end;
  }
  return SQLITE_OK;
}

int EventRemoval::removeSpans() {
  std::unordered_map<std::int64_t, std::vector<std::int64_t>> left;  // rows that stay, by session
  std::vector<std::int64_t> sessions;
  for (const Row& row : going_) {
    if (row.session != 0 && left.try_emplace(row.session).second) {
      sessions.push_back(row.session);
    }
  }
  for (const Row& row : staying_) {
    if (const auto found = left.find(row.session); found != left.end()) {
      found->second.push_back(row.id);
    }
  }
  for (const std::int64_t session : sessions) {
    const std::vector<std::int64_t>& rows = left[session];
    std::vector<std::int64_t> empty;
    spans_.bind(1, session).bind(2, going_.front().id - EventTable::kReach).bind(3, going_.back().id);
    int code = spans_.step();
    for (; code == SQLITE_ROW; code = spans_.step()) {
      const std::int64_t first = spans_.integer(0);
      const auto row = std::lower_bound(rows.begin(), rows.end(), first);
      if (row == rows.end() || *row >= first + EventTable::kReach) {
        empty.push_back(first);
      }
    }
    spans_.reset();
    code = code == SQLITE_DONE ? SQLITE_OK : code;
    for (std::size_t i = 0; code == SQLITE_OK && i < empty.size(); ++i) {
      code = removeSpan_.bind(1, session).bind(2, empty[i]).run();
    }
    if (code != SQLITE_OK) return code;
  }
  return SQLITE_OK;
}

// One whose own checksum is wrong proves nothing, and stays as long as anything stays that it may have told of.
int EventRemoval::cutGroups(std::int64_t first, std::int64_t last) {
  std::vector<EventGroup> cut;
  groups_.bind(1, first - EventGroup::kMostEvents).bind(2, last);
  int code = groups_.step();
  for (; code == SQLITE_ROW; code = groups_.step()) {
    EventGroup group;
    const bool isWhole = group.read(groups_.integer(0), groups_.real(1), groups_.text(2));
    const std::int64_t begin = groups_.integer(0);
    const bool stays = isWhole ? stayingWithin(begin, group.end()) == group.size()
                               : stayingWithin(begin, begin + EventGroup::kMostEvents) > 0;
    if (!stays) {
      cut.push_back(std::move(group));
    }
  }
  groups_.reset();
  code = code == SQLITE_DONE ? SQLITE_OK : code;
  for (std::size_t i = 0; code == SQLITE_OK && i < cut.size(); ++i) {
    code = removeGroup_.bind(1, cut[i].first()).run();
    code = code == SQLITE_OK ? writeRuns(cut[i]) : code;
  }
  return code;
}

int EventRemoval::writeRuns(const EventGroup& group) {
  EventGroup run;
  run.begin(group.first(), group.seconds());
  int code = SQLITE_OK;
  for (std::int64_t id = group.first(); code == SQLITE_OK && id <= group.end(); ++id) {
    if (id < group.end() && stayingWithin(id, id + 1) > 0) {
      run.add(group.hash(id));
      continue;
    }
    if (run.size() > 0) {
      hashes_ = run.hashes();
      code = insertGroup_.bind(1, run.first()).bind(2, run.seconds()).bindBytes(3, hashes_).run();
    }
    run.begin(id + 1, group.seconds());
  }
  return code;
}

int EventRemoval::removeTimes(std::int64_t first, std::int64_t last) {
  return removeTimes_.bind(1, first >> EventTable::kBlockBits)
      .bind(2, last >> EventTable::kBlockBits)
      .bind(3, std::int64_t{1} << EventTable::kBlockBits)
      .run();
}

}  // namespace tarn::recorder
