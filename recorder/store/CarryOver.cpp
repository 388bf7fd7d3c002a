// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/CarryOver.h"

#include <sqlite3.h>

#include <algorithm>
#include <system_error>

#include "recorder/store/StoreLayout.h"

namespace tarn::recorder {

namespace {

constexpr std::size_t kRowsAtOnce = 1024;
// Ids that are passed over where nothing can be read, and how far beyond the last known id one may lie.
constexpr std::int64_t kStride = 16;
constexpr std::int64_t kMostIds = std::int64_t{1} << 24;
constexpr int kStepsAtOnce = 1000;
constexpr std::int64_t kStepsPerByte = 64;
constexpr std::int64_t kStepsOfSmallFile = 1'000'000;

int spendSteps(void* stepsLeft) {
  auto& left = *static_cast<std::int64_t*>(stepsLeft);
  left -= kStepsAtOnce;
  return left < 0 ? 1 : 0;
}

}  // namespace

Status CarryOver::goOn(EventFile& into) {
  if (!opened_) {
    open(into);
  }
  while (!ended_ || !some_.empty()) {
    if (some_.empty()) {
      ended_ = !readSome(into.seconds());
    }
    if (auto error = writeSome(into); error.failed()) return error;
  }
  return finish(into);
}

void CarryOver::open(const EventFile& into) {
  opened_ = true;
  std::error_code error;
  const auto bytes = std::filesystem::file_size(from_, error);
  ended_ = static_cast<bool>(error) || connection_.open(from_.string(), SQLITE_OPEN_READONLY) != SQLITE_OK;
  if (ended_) return;
  stepsLeft_ =
      kStepsOfSmallFile + kStepsPerByte * static_cast<std::int64_t>(std::min<std::uintmax_t>(bytes, 1ULL << 40U));
  for (const int option :
       {SQLITE_DBCONFIG_TRUSTED_SCHEMA, SQLITE_DBCONFIG_ENABLE_VIEW, SQLITE_DBCONFIG_ENABLE_TRIGGER}) {
    sqlite3_db_config(connection_.handle(), option, 0, nullptr);
  }
  // A file that was cut is read as far as it goes.
  sqlite3_db_config(connection_.handle(), SQLITE_DBCONFIG_WRITABLE_SCHEMA, 1, nullptr);
  sqlite3_progress_handler(connection_.handle(), kStepsAtOnce, spendSteps, &stepsLeft_);
  const EventSelect events = selectEvents(connection_);
  const std::string columns =
      connection_.text("SELECT group_concat(name) FROM (SELECT * FROM pragma_table_info('events') ORDER BY cid)")
          .value_or("");
  const bool isOurs = !events.isOlder || columns.starts_with("id,time,backend,name,payload,detail");
  const std::string select = std::string(events.sql) + " WHERE r.id > ?1 ORDER BY r.id LIMIT 1024";
  ended_ = !isOurs || rows_.prepare(connection_.handle(), select) != SQLITE_OK;
  static_cast<void>(groups_.prepare(connection_.handle(),
                                    "SELECT first, seconds, hashes FROM event_groups WHERE first <= ?1 "
                                    "ORDER BY first DESC LIMIT 1"));
  const auto before = connection_.integer("SELECT value FROM recorder_state WHERE name = 'holds_after'");
  wanted_ = before ? *before + 1 : 0;
  removedIds_.prepare(connection_);
  last_ = upTo_ ? *upTo_ : lastToLookFor(into.lastId());
}

// An id that lies far beyond all others isn't one.
std::int64_t CarryOver::lastToLookFor(std::int64_t known) {
  const char* const greatest = selectEvents(connection_).isOlder ? "SELECT max(id) FROM events WHERE id < 1 << 62"
                                                                 : "SELECT max(id) FROM event_rows WHERE id < 1 << 62";
  const std::int64_t held = connection_.integer(greatest).value_or(0);
  return known > 0 && held - known > kMostIds ? known : std::max(known, held);
}

// Whether there may be more after these.
bool CarryOver::readSome(double now) {
  rows_.bind(1, after_);
  std::size_t seen = 0;
  int code = rows_.step();
  for (; code == SQLITE_ROW; code = rows_.step()) {
    const std::int64_t id = rows_.integer(0);
    if (id > last_) {
      code = SQLITE_DONE;
    }
    if (id <= after_ || id > last_) break;  // a tree out of order
    ++seen;
    after_ = id;
    readRow(now);
  }
  rows_.reset();
  if (stepsLeft_ < 0) return false;
  if (code == SQLITE_DONE && seen < kRowsAtOnce) return false;
  if (code != SQLITE_DONE) {
    after_ += kStride;
  }
  return after_ < last_;
}

void CarryOver::readRow(double now) {
  const std::int64_t id = rows_.integer(0);
  if (!group_.holds(id)) {
    group_.begin(0, now);
    if (groups_.bind(1, id).step() == SQLITE_ROW) {
      if (!group_.read(groups_.integer(0), groups_.real(1), groups_.text(2))) {
        group_.begin(0, now);
      }
    }
    groups_.reset();
  }
  if (!rows_.isReal(1) || !rows_.isText(2) || !rows_.isText(3) || !rows_.isText(4) || !rows_.isText(5)) return;
  const StoredEvent event{rows_.real(1), rows_.text(2), rows_.text(3), rows_.text(4), rows_.text(5), rows_.integer(6)};
  const bool proven = group_.holds(id);
  if (proven && hashOf(id, event) != group_.hash(id)) return;
  some_.push_back({id, proven ? group_.seconds() : now, event.time, std::string(event.backend), std::string(event.name),
                   std::string(event.payload), std::string(event.detail), event.session});
}

Status CarryOver::writeSome(EventFile& into) {
  if (some_.empty()) return {};
  if (auto error = into.begin(); error.failed()) return error;
  const Read* before = nullptr;
  for (const Read& row : some_) {
    const bool repeats = before != nullptr && before->payload == row.payload;
    auto error = into.carry(row.id, row.seconds,
                            {row.time, row.backend, row.name, row.payload, row.detail, row.session}, repeats);
    if (error.failed()) return error;
    before = &row;
  }
  if (auto error = into.commit(); error.failed()) return error;
  for (const Read& row : some_) {
    if (wanted_ > 0 && wanted_ < row.id) {
      miss({wanted_, row.id - 1});
    }
    wanted_ = std::max(wanted_, row.id + 1);
    if (first_ == 0) {
      first_ = row.id;
    }
  }
  carried_ += static_cast<std::int64_t>(some_.size());
  some_.clear();
  return {};
}

void CarryOver::miss(IdRange gap) {
  std::vector<IdRange> removed;
  static_cast<void>(removedIds_.within(gap, removed));
  for (const IdRange& range : removed) {
    addRange(removed_, range);
  }
  for (const IdRange& range : without(gap, removed)) {
    addRange(lost_, range);
  }
}

Status CarryOver::finish(EventFile& into) {
  rows_.finalize();
  groups_.finalize();
  if (wanted_ > 0 && wanted_ <= last_) {
    miss({wanted_, last_});
  }
  removedIds_.finalize();
  wanted_ = 0;
  into.skipTo(last_);
  if (auto error = into.begin(); error.failed()) return error;
  Status error = into.carrySessions(connection_, leftBehind_);
  for (std::size_t i = 0; error.ok() && i < lost_.size(); ++i) {
    error = into.noteLoss(lost_[i]);
  }
  const std::int64_t begins =
      lost_.empty() ? first_ : std::min(first_ == 0 ? lost_.front().first : first_, lost_.front().first);
  if (error.ok() && begins != 0) {
    error = into.noteCarried(begins);
  }
  for (std::size_t i = 0; error.ok() && i < removed_.size(); ++i) {
    error = into.noteRemoved(removed_[i]);
  }
  if (error.ok()) {
    error = into.commit();
  }
  if (error.ok()) {
    connection_.close();
  }
  return error;
}

}  // namespace tarn::recorder
