// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/EventFile.h"

#include <sqlite3.h>

#include <algorithm>
#include <cmath>
#include <string>
#include <utility>

#include "recorder/store/StoreLayout.h"
#include "recorder/store/StoreMigration.h"
#include "recorder/store/files/MappedGuard.h"
#include "recorder/store/files/Remedy.h"

namespace tarn::recorder {

namespace {

constexpr std::int64_t kLogHeaderBytes = 32;
constexpr std::int64_t kFrameHeaderBytes = 24;
constexpr int kBusyMilliseconds = 50;
// Read through in milliseconds, and no more than what the connection keeps of it in memory.
constexpr std::int64_t kSmallBytes = 4 << 20;

}  // namespace

EventFile::EventFile(std::filesystem::path path, const RetentionLimits& limits, const platform::Clock& clock,
                     std::string boot)
    : files_(path, clock), cleanMark_(path, boot), retention_(limits), time_(clock, std::move(boot)) {}

Status EventFile::open() {
  Status error = files_.prepare();
  isAsLeft_ = cleanMark_.take();
  for (const auto step : {&EventFile::openConnection, &EventFile::checkContent, &EventFile::settleDoubt,
                          &EventFile::openTime, &EventFile::prepareStatements}) {
    if (error.failed()) break;
    error = (this->*step)();
  }
  if (error.failed()) {
    closeAfterFault();
  } else {
    files_.noteGood();
    checkpointer_.open(path().string());
  }
  return error;
}

Status EventFile::openConnection() {
  MappedGuard::guardSqlite();
  files_.forgetCompanions();
  const int code = connection_.open(path().string(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
  if (code != SQLITE_OK) return connection_.errorOf(code);
  if (auto error = files_.noteOpened(); error.failed()) return error;
  // Without the right to write SQLite falls back to reading.
  if (sqlite3_db_readonly(connection_.handle(), "main") == 1) {
    return Error{SQLITE_READONLY, "the file can't be written to (read-only)"};
  }
  sqlite3_busy_timeout(connection_.handle(), kBusyMilliseconds);
  sqlite3_wal_hook(
      connection_.handle(),
      [](void* logPages, sqlite3*, const char*, int pages) {
        *static_cast<int*>(logPages) = pages;
        return SQLITE_OK;
      },
      &logPages_);
  logPages_ = 0;
  if (auto error = prepareConnection(connection_); error.failed()) return error;
  const Result<std::int64_t> bytes = connection_.readInteger("PRAGMA page_size");
  pageBytes_ = bytes.value;
  if (bytes.failed()) return bytes.error;
  // A log that is started again is cut to this.
  const std::string limit = "PRAGMA journal_size_limit=" + std::to_string(2 * logLimit_);
  return connection_.errorOf(connection_.run(limit.c_str()));
}

Status EventFile::checkContent() {
  const Result<std::int64_t> pages = connection_.readInteger("PRAGMA page_count");
  if (pages.failed()) return pages.error;
  // What is small stays in memory once it is read through, so a read that errs later can't come between.
  if (pages.value * pageBytes_ <= kSmallBytes) {
    isAsLeft_ = false;
  }
  if (!files_.isKnownGood() && !isAsLeft_) {
    if (auto error = checkPages(connection_); error.failed()) return error;
  }
  Tables found = Tables::Current;
  Status error = checkTables(connection_, lastId_, found);
  if (error.ok() && found == Tables::Older) {
    error = migrateOlder();
  }
  if (error.ok() && found == Tables::Made && expected_ > 0) {
    goneUpTo_ = expected_;
  }
  if (error.ok()) {
    expected_ = 0;
  }
  return error;
}

Status EventFile::migrateOlder() {
  if (const auto last = readLastId(connection_); last.failed()) return last.error;
  const Result<std::int64_t> events = migrate(connection_);
  if (events.failed()) return events.error;
  migrated_ = events.value;
  // Its log is as large as all of it. A reader in the way is no fault.
  const int code =
      sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  logPages_ = code == SQLITE_OK ? 0 : logPages_;
  return {};
}

// Rows that are in were written once, but their synchronisation failed: only in the database, and synchronised with it,
// are they safe. A reader in the way of that is no fault.
Status EventFile::settleDoubt() {
  const Result<std::int64_t> last = readLastId(connection_);
  if (last.failed()) return last.error;
  if (inDoubt_ > 0) {
    const int code =
        sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
    if (code != SQLITE_OK && (code & 0xFF) != SQLITE_BUSY) return connection_.errorOf(code);
    doubtIn_ = std::clamp<std::int64_t>(last.value - lastId_, 0, inDoubt_);
    inDoubt_ = 0;
  }
  if (last.value < lastId_) {
    missing_ = IdRange{last.value + 1, lastId_};
  }
  lastId_ = std::max(lastId_, last.value);
  return {};
}

std::int64_t EventFile::takeRowsInDoubt() noexcept {
  return std::exchange(doubtIn_, 0);
}

Status EventFile::prepareStatements() {
  const struct {
    Statement& statement;
    const char* sql;
  } all[] = {{begin_, "BEGIN IMMEDIATE"},
             {keepLastId_, "INSERT OR REPLACE INTO recorder_state VALUES('last_id', ?1)"},
             {commit_, "COMMIT"},
             {insertGroup_, "INSERT OR REPLACE INTO event_groups VALUES(?1, ?2, ?3)"}};
  for (const auto& [statement, sql] : all) {
    const int code = statement.prepare(connection_.handle(), sql, true);
    if (code != SQLITE_OK) return connection_.errorOf(code);
  }
  runBegun_ = false;
  int code = table_.prepare(connection_);
  code = code == SQLITE_OK ? sessions_.prepare(connection_) : code;
  code = code == SQLITE_OK ? retention_.prepare(connection_) : code;
  return connection_.errorOf(code);
}

void EventFile::finalizeStatements() noexcept {
  for (Statement* const statement : {&begin_, &keepLastId_, &commit_, &insertGroup_}) {
    statement->finalize();
  }
  table_.finalize();
  sessions_.finalize();
  check_.finalize();
  sessionCheck_.finalize();
  retention_.finalize();
}

void EventFile::close() noexcept {
  checkpointer_.close();
  finalizeStatements();
  const bool wasOpen = isOpen();
  connection_.closeAndTidy();
  if (wasOpen && files_.isKnownGood()) {
    cleanMark_.leave();
  }
}

void EventFile::closeAfterFault() noexcept {
  checkpointer_.close();
  finalizeStatements();
  connection_.close();
}

void EventFile::closeForAnotherLook() noexcept {
  closeAfterFault();
  files_.forgetGood();
}

void EventFile::leave() noexcept {
  checkpointer_.finish();
  if (isOpen()) {
    sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, nullptr, nullptr);
  }
  closeAfterFault();
}

Result<std::filesystem::path> EventFile::setAside() {
  auto aside = files_.setAside();
  if (!aside.failed()) {
    expected_ = 0;
  }
  return aside;
}

Status EventFile::begin() {
  if (auto error = files_.checkIsOpened(); error.failed()) return error;
  if (auto error = checkLog(); error.failed()) return error;
  if (auto error = files_.checkIndex(); error.failed()) {
    closeForAnotherLook();
    return error;
  }
  files_.noteIndex();
  nextId_ = lastId_ + 1;
  expiring_ = 0;
  group_.begin(nextId_, time_.seconds());
  return connection_.errorOf(begin_.run());
}

// What was committed and isn't in the database yet stands in the log alone. One that was taken away is still in our
// hands, and is brought in; one that was cut is not.
Status EventFile::checkLog() {
  if (logPages_ == 0) return {};
  const auto log = files_.lookAtLog(kLogHeaderBytes + logPages_ * (pageBytes_ + kFrameHeaderBytes));
  if (log.failed()) return log.error;
  switch (log.value) {
    case StoreFiles::LogState::Whole:
      return {};
    case StoreFiles::LogState::Gone:
      checkpointer_.finish();
      sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, nullptr, nullptr);
      closeForAnotherLook();
      return Error{SQLITE_IOERR, "its log was taken away"};
    case StoreFiles::LogState::Cut:
      closeForAnotherLook();
      return Error{SQLITE_IOERR, "its log was cut"};
  }
  return {};
}

Status EventFile::rollbackAfter(int code) {
  Status error = connection_.errorOf(code);
  if (error.failed()) {
    rollback();
  }
  return error;
}

void EventFile::rollback() {
  connection_.rollback();
  retention_.rolledBack();
  table_.forget();
  sessions_.rolledBack();
}

Status EventFile::beginRun(const RunFacts& run) {
  Status error = begin();
  error = error.ok() ? rollbackAfter(sessions_.beginRun(run)) : error;
  error = error.ok() ? commit() : error;
  runBegun_ = error.ok();
  return error;
}

Status EventFile::endRun(double time) {
  Status error = begin();
  error = error.ok() ? rollbackAfter(sessions_.endRun(time)) : error;
  return error.ok() ? commit() : error;
}

Status EventFile::append(const SessionNote& note) {
  return rollbackAfter(sessions_.write(note, time_.seconds()));
}

Status EventFile::append(const SessionNote& repeat, std::int64_t repeated) {
  return rollbackAfter(sessions_.repeat(repeat, repeated, nextId_ - 1));
}

Status EventFile::append(const StoredEvent& event, bool repeatsPayload, platform::SessionNumber owner) {
  StoredEvent owned = event;
  owned.session = sessions_.rowOf(owner);
  Status error = rollbackAfter(sessions_.noteEvent(owner, nextId_));
  if (error.failed()) return error;
  error = insertAs(nextId_, owned, repeatsPayload, false);
  error = error.ok() ? rollbackAfter(retention_.added(nextId_, owned)) : error;
  if (error.ok()) {
    ++nextId_;
  }
  return error;
}

Status EventFile::insertAs(std::int64_t id, const StoredEvent& event, bool repeatsPayload, bool replacing) {
  int code = table_.insert(id, event, repeatsPayload, replacing);
  if (code == SQLITE_OK) {
    group_.add(hashOf(id, event));
    if (group_.size() == EventGroup::kMostEvents) {
      code = writeGroup();
    }
  }
  return rollbackAfter(code);
}

// Writes the group of what was appended, and begins another one after it.
int EventFile::writeGroup() {
  if (group_.size() == 0) return SQLITE_OK;
  groupHashes_ = group_.hashes();
  const int code = insertGroup_.bind(1, group_.first()).bind(2, group_.seconds()).bindBytes(3, groupHashes_).run();
  group_.begin(group_.end(), group_.seconds());
  return code;
}

Status EventFile::expire(std::chrono::steady_clock::time_point deadline) {
  int code = writeGroup();
  code = code == SQLITE_OK ? retention_.expire(time_.seconds(), nextId_ - 1, deadline, expiring_) : code;
  // The next events must not name texts that went.
  if (nextId_ - retention_.removedUpTo() <= EventTable::kPayloadReach) {
    table_.forget();
  }
  if (code == SQLITE_OK && expiring_ > 0) {
    code = keepLastId_.bind(1, nextId_ - 1).run();
  }
  if (code == SQLITE_OK && (expiring_ > 0 || nextId_ == lastId_ + 1)) {
    code = sessions_.expire(time_.seconds(), retention_.maxAgeSeconds(), retention_.mostSessions());
  }
  return rollbackAfter(code);
}

Status EventFile::commit() {
  int code = writeGroup();
  if (auto error = files_.checkIndex(); error.failed()) {
    closeForAnotherLook();
    return error;
  }
  if (code == SQLITE_OK) {
    code = commit_.run();
  }
  if (auto error = connection_.errorOf(code); error.failed()) {
    // What could not be written as a whole is not in; readers need somebody who keeps the file open.
    if (remedyFor(code) == Remedy::Wait) {
      rollback();
      return error;
    }
    inDoubt_ = std::max(inDoubt_, nextId_ - 1 - lastId_);
    closeAfterFault();
    return error;
  }
  sessions_.committed();
  retention_.committed();
  lastId_ = nextId_ - 1;
  logBytes_ = logPages_ * (pageBytes_ + kFrameHeaderBytes);
  expired_ += std::exchange(expiring_, 0);
  return {};
}

Status EventFile::verify(std::chrono::steady_clock::time_point deadline) {
  return verifySome(check_, sessionCheck_, deadline);
}

Status EventFile::checkpointIfDue() {
  // Whether all of it is in: nothing was committed in the meantime.
  if (checkpointer_.takeBroughtIn() == logPages_) {
    logPages_ = 0;
  }
  const std::int64_t bytes = logPages_ * pageBytes_;
  // After a failure nothing is well before it works: a file that was opened again counts its log from the next commit.
  const bool isDue = bytes >= logLimit_ || bringInFailed_;
  if (!isDue || (bytes < 2 * logLimit_ && !bringInFailed_ && checkpointer_.begin())) return {};
  checkpointer_.finish();
  int pages = 0;
  int broughtIn = 0;
  const int code =
      sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, &pages, &broughtIn);
  // A reader in the way is no fault: the rest is brought in later, and until then the log is as long as it is.
  if ((code & 0xFF) == SQLITE_BUSY) return {};
  bringInFailed_ = code != SQLITE_OK;
  if (!bringInFailed_ && broughtIn == pages) {
    logPages_ = 0;
  }
  return connection_.errorOf(code);
}

}  // namespace tarn::recorder
