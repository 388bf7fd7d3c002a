#include "recorder/store/EventFile.h"

#include <sqlite3.h>

#include <utility>

namespace tarn::recorder {

namespace {

// Pages of the write-ahead log beyond which it is brought into the database: 8 MiB, a few dozen milliseconds of work.
constexpr int kCheckpointPages = 1024;

}  // namespace

EventFile::EventFile(std::filesystem::path path, const RetentionLimits& limits, const platform::Clock& clock)
    : path_(std::move(path)), clock_(clock), retention_(limits) {}

Outcome EventFile::refuse(Outcome outcome, std::string problem) {
  problem_ = std::move(problem);
  return outcome;
}

Outcome EventFile::judge(int code) {
  if (code == SQLITE_OK || code == SQLITE_ROW || code == SQLITE_DONE) return Outcome::Done;
  problem_ = connection_.errorText();
  if (code == SQLITE_READONLY_DBMOVED) return Outcome::Moved;
  switch (code & 0xFF) {
    case SQLITE_FULL:
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      return Outcome::Wait;
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
    case SQLITE_FORMAT:
    // Our statements are sound, so when one doesn't fit, the tables are no longer those that we made.
    case SQLITE_ERROR:
    case SQLITE_CONSTRAINT:
    case SQLITE_MISMATCH:
      return Outcome::SetAside;
    default:
      return Outcome::Reopen;
  }
}

void EventFile::finalizeStatements() noexcept {
  begin_.finalize();
  insert_.finalize();
  keepLastId_.finalize();
  commit_.finalize();
  retention_.finalize();
}

void EventFile::close() noexcept {
  finalizeStatements();
  connection_.closeAndTidy();
}

void EventFile::closeAfterFault() noexcept {
  finalizeStatements();
  connection_.close();
}

void EventFile::leave() noexcept {
  if (isOpen()) {
    sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, nullptr, nullptr);
  }
  closeAfterFault();
}

Outcome EventFile::begin() {
  Identity now;
  if (!readIdentity(now)) return refuse(Outcome::Moved, "it is gone");
  if (now != opened_) return refuse(Outcome::Moved, "another file is in its place");
  nextId_ = lastId_ + 1;
  expiring_ = 0;
  return judge(begin_.run());
}

Outcome EventFile::append(const Row& row) {
  const int code = insert_.bind(1, nextId_)
                       .bind(2, row.time)
                       .bind(3, row.backend)
                       .bind(4, row.name)
                       .bind(5, row.payload)
                       .bind(6, row.detail)
                       .run();
  if (code == SQLITE_OK) {
    ++nextId_;
    return Outcome::Done;
  }
  const Outcome outcome = judge(code);
  rollback();
  return outcome;
}

Outcome EventFile::expire(std::chrono::steady_clock::time_point deadline) {
  int code = retention_.expire(clock_.epochSeconds(), deadline, expiring_);
  if (code == SQLITE_OK && expiring_ > 0) {
    code = keepLastId_.bind(1, nextId_ - 1).run();
  }
  const Outcome outcome = judge(code);
  if (outcome != Outcome::Done) {
    rollback();
  }
  return outcome;
}

Outcome EventFile::commit() {
  const Outcome outcome = judge(commit_.run());
  if (outcome != Outcome::Done) {
    rollback();
    return outcome;
  }
  lastId_ = nextId_ - 1;
  expired_ += std::exchange(expiring_, 0);
  return Outcome::Done;
}

void EventFile::rollback() noexcept {
  // Many faults end the transaction by themselves.
  if (isOpen() && sqlite3_get_autocommit(connection_.handle()) == 0) {
    static_cast<void>(connection_.run("ROLLBACK"));
  }
}

Outcome EventFile::checkpointIfDue() {
  if (logPages_ < kCheckpointPages) return Outcome::Done;
  int pages = 0;
  const int code = sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, &pages, nullptr);
  // A reader in the way is no fault: the rest is brought in later.
  if ((code & 0xFF) == SQLITE_BUSY) return Outcome::Done;
  if (code == SQLITE_OK) {
    logPages_ = 0;
  }
  return judge(code);
}

}  // namespace tarn::recorder
