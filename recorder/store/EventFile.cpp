#include "recorder/store/EventFile.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <string>
#include <system_error>
#include <utility>

#include "recorder/store/Remedy.h"
#include "recorder/store/StoreLayout.h"
#include "recorder/store/files/MappedGuard.h"

namespace tarn::recorder {

namespace {

constexpr std::int64_t kFrameHeaderBytes = 24;
constexpr int kBusyMilliseconds = 50;

// Makes the folders above the file where they are missing; the opening tells when that failed. They come from the host
// in its own way; here only one that was taken away while the service runs is made again.
void makeFoldersAbove(const std::filesystem::path& path) {
  std::filesystem::path folder;
  for (const auto& part : path.parent_path()) {
    folder /= part;
    static_cast<void>(::mkdir(folder.c_str(), 0750));
  }
}

Error statusError(int error) {
  return {SQLITE_IOERR_FSTAT, "its status can't be read (" + std::generic_category().message(error) + ")"};
}

}  // namespace

EventFile::EventFile(std::filesystem::path path, const RetentionLimits& limits, const platform::Clock& clock,
                     std::string boot)
    : path_(std::move(path)), clock_(clock), retention_(limits), time_(clock, std::move(boot)) {}

Result<EventFile::Identity> EventFile::readIdentity() const {
  struct stat status {};
  if (::stat(path_.c_str(), &status) == 0) {
    return {{static_cast<std::uint64_t>(status.st_dev), static_cast<std::uint64_t>(status.st_ino)}};
  }
  const int error = errno;
  return {{}, error == ENOENT ? Error{SQLITE_READONLY_DBMOVED, "it is gone"} : statusError(error)};
}

Status EventFile::open() {
  Status error = checkPath();
  if (error.ok()) {
    error = openConnection();
  }
  if (error.ok()) {
    error = checkContent();
  }
  if (error.ok()) {
    error = settleDoubt();
  }
  if (error.ok()) {
    error = time_.open(connection_);
  }
  if (error.ok()) {
    error = prepareStatements();
  }
  if (error.failed()) {
    closeAfterFault();
  } else {
    checked_ = opened_;
    checkpointer_.open(path_.string());
  }
  return error;
}

Status EventFile::checkPath() {
  if (auto error = putOddCompanionsAside(); error.failed()) return error;
  struct stat status {};
  if (::stat(path_.c_str(), &status) == 0) {
    // A directory, a pipe or a device can be opened, or hang in it; none can be a database.
    if (S_ISREG(status.st_mode)) return {};
    return Error{SQLITE_NOTADB, "not a regular file"};
  }
  if (const int error = errno; error != ENOENT) return statusError(error);
  makeFoldersAbove(path_);
  return {};
}

// A directory, a pipe or a link in the place of the log or its index is none of ours, and no link is followed.
Status EventFile::putOddCompanionsAside() {
  for (const char* const suffix : {"-wal", "-shm"}) {
    const std::string name = path_.string() + suffix;
    struct stat status {};
    if (::lstat(name.c_str(), &status) != 0 || S_ISREG(status.st_mode)) continue;
    const std::filesystem::path aside = freeName(suffix);
    std::error_code failure;
    std::filesystem::rename(name, aside, failure);
    if (failure) {
      return Error{SQLITE_CANTOPEN, name + " is no regular file and can't be set aside: " + failure.message()};
    }
    putAside_.push_back(aside.filename().string());
  }
  return {};
}

Status EventFile::openConnection() {
  MappedGuard::guardSqlite();
  tornBefore_ = MappedGuard::torn();
  indexBytes_ = 0;
  const int code = connection_.open(path_.string(), SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE);
  if (code != SQLITE_OK) return connection_.errorOf(code);
  const Result<Identity> identity = readIdentity();
  if (identity.failed()) return Error{SQLITE_IOERR_FSTAT, identity.error->text + " right after it was opened"};
  opened_ = identity.value;
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
  logInode_ = 0;
  if (auto error = prepareConnection(connection_); error.failed()) return error;
  const Result<std::int64_t> bytes = connection_.readInteger("PRAGMA page_size");
  pageBytes_ = bytes.value;
  if (bytes.failed()) return bytes.error;
  // A log that is started again is cut to this.
  const std::string limit = "PRAGMA journal_size_limit=" + std::to_string(2 * logLimit_);
  return connection_.errorOf(connection_.run(limit.c_str()));
}

Status EventFile::checkContent() {
  if (checked_ != opened_) {
    if (auto error = checkPages(connection_); error.failed()) return error;
  }
  bool made = false;
  Status error = checkTables(connection_, lastId_, made);
  if (error.ok() && made && expected_ > 0) {
    goneUpTo_ = expected_;
  }
  if (error.ok()) {
    expected_ = 0;
  }
  return error;
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
  sqlite3* const database = connection_.handle();
  int code = begin_.prepare(database, "BEGIN IMMEDIATE", true);
  const auto prepareInsert = [&](Statement& statement, const char* verb) {
    const std::string sql =
        std::string(verb) + " INTO events(id, time, backend, name, payload, detail) VALUES(?1, ?2, ?3, ?4, ?5, ?6)";
    return statement.prepare(database, sql, true);
  };
  if (code == SQLITE_OK) {
    code = prepareInsert(insert_, "INSERT");
  }
  if (code == SQLITE_OK) {
    code = prepareInsert(carry_, "INSERT OR REPLACE");
  }
  if (code == SQLITE_OK) {
    code = keepLastId_.prepare(database, "INSERT OR REPLACE INTO recorder_state VALUES('last_id', ?1)", true);
  }
  if (code == SQLITE_OK) {
    code = commit_.prepare(database, "COMMIT", true);
  }
  if (code == SQLITE_OK) {
    code = insertGroup_.prepare(database, "INSERT OR REPLACE INTO event_groups VALUES(?1, ?2, ?3)", true);
  }
  if (code == SQLITE_OK) {
    code = retention_.prepare(connection_);
  }
  return connection_.errorOf(code);
}

void EventFile::finalizeStatements() noexcept {
  begin_.finalize();
  insert_.finalize();
  carry_.finalize();
  keepLastId_.finalize();
  commit_.finalize();
  insertGroup_.finalize();
  check_.finalize();
  retention_.finalize();
}

void EventFile::close() noexcept {
  checkpointer_.close();
  finalizeStatements();
  connection_.closeAndTidy();
}

void EventFile::closeAfterFault() noexcept {
  checkpointer_.close();
  finalizeStatements();
  connection_.close();
}

void EventFile::closeForAnotherLook() noexcept {
  closeAfterFault();
  checked_ = {};
}

void EventFile::leave() noexcept {
  checkpointer_.finish();
  if (isOpen()) {
    sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, nullptr, nullptr);
  }
  closeAfterFault();
}

std::filesystem::path EventFile::freeName(const std::string& suffix) const {
  const std::string base =
      path_.string() + ".damaged-" + std::to_string(static_cast<std::int64_t>(clock_.epochSeconds()));
  std::filesystem::path name = base + suffix;
  std::error_code ignored;
  for (int n = 2; std::filesystem::exists(std::filesystem::symlink_status(name, ignored)); ++n) {
    name = base + "-" + std::to_string(n) + suffix;
  }
  return name;
}

Result<std::filesystem::path> EventFile::setAside() {
  const std::filesystem::path aside = freeName("");
  std::error_code failure;
  std::filesystem::rename(path_, aside, failure);
  if (!failure) {
    expected_ = 0;
  }
  if (failure) return {{}, Error{failure.value(), "it can't be set aside: " + failure.message()}};
  // The log and its index go along: what they hold belongs to the old file, and a fresh one must not find them.
  for (const char* const suffix : {"-wal", "-shm"}) {
    std::filesystem::rename(path_.string() + suffix, aside.string() + suffix, failure);
    if (failure && failure != std::errc::no_such_file_or_directory) {
      std::filesystem::remove(path_.string() + suffix, failure);
    }
  }
  return {aside};
}

Status EventFile::begin() {
  const Result<Identity> now = readIdentity();
  if (now.failed()) return now.error;
  if (now.value != opened_) return Error{SQLITE_READONLY_DBMOVED, "another file is in its place"};
  if (auto error = checkLog(); error.failed()) return error;
  if (auto error = checkIndex(); error.failed()) {
    closeForAnotherLook();
    return error;
  }
  indexBytes_ = indexBytes();
  nextId_ = lastId_ + 1;
  expiring_ = 0;
  group_.begin(nextId_, time_.seconds());
  return connection_.errorOf(begin_.run());
}

// What was committed and isn't in the database yet stands in the log alone. One that was taken away is still in our
// hands, and is brought in; one that was cut is not.
Status EventFile::checkLog() {
  if (logPages_ == 0) return {};
  struct stat status {};
  const std::string name = path_.string() + "-wal";
  const bool isThere = ::stat(name.c_str(), &status) == 0;
  if (!isThere && errno != ENOENT) return statusError(errno);
  constexpr std::int64_t kHeaderBytes = 32;
  const std::int64_t frameBytes = pageBytes_ + kFrameHeaderBytes;
  if (isThere && logInode_ == 0) {
    logInode_ = status.st_ino;
  }
  if (!isThere || status.st_ino != logInode_) {
    checkpointer_.finish();
    sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, nullptr, nullptr);
    closeForAnotherLook();
    return Error{SQLITE_IOERR, "its log was taken away"};
  }
  if (status.st_size >= kHeaderBytes + logPages_ * frameBytes) return {};
  closeForAnotherLook();
  return Error{SQLITE_IOERR, "its log was cut"};
}

std::int64_t EventFile::indexBytes() const {
  struct stat status {};
  return ::stat((path_.string() + "-shm").c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
}

// Where the log's index is cut, SQLite would take old pages for the newest.
Status EventFile::checkIndex() const {
  if (MappedGuard::torn() == tornBefore_ && indexBytes() >= indexBytes_) return {};
  return Error{SQLITE_IOERR, "the index of its log was cut"};
}

Status EventFile::append(const StoredEvent& event) {
  Status error = insertAs(nextId_, event, insert_);
  if (error.ok()) {
    ++nextId_;
  }
  return error;
}

Status EventFile::carry(std::int64_t id, double seconds, const StoredEvent& event) {
  if (id != group_.end() || seconds != group_.seconds()) {
    if (auto error = connection_.errorOf(writeGroup()); error.failed()) {
      connection_.rollback();
      return error;
    }
    group_.begin(id, seconds);
  }
  skipTo(id);
  nextId_ = lastId_ + 1;
  return insertAs(id, event, carry_);
}

Status EventFile::insertAs(std::int64_t id, const StoredEvent& event, Statement& statement) {
  int code = statement.bind(1, id)
                 .bind(2, std::isnan(event.time) ? 0.0 : event.time)
                 .bind(3, event.backend)
                 .bind(4, event.name)
                 .bind(5, event.payload)
                 .bind(6, event.detail)
                 .run();
  if (code == SQLITE_OK) {
    group_.add(hashOf(id, event));
    if (group_.size() == EventGroup::kMostEvents) {
      code = writeGroup();
    }
  }
  Status error = connection_.errorOf(code);
  if (error.failed()) {
    connection_.rollback();
  }
  return error;
}

// Writes the group of what was appended, and begins another one after it.
int EventFile::writeGroup() {
  if (group_.size() == 0) return SQLITE_OK;
  groupHashes_ = group_.hashes();
  const int code = insertGroup_.bind(1, group_.first()).bind(2, group_.seconds()).bindBytes(3, groupHashes_).run();
  group_.begin(group_.end(), group_.seconds());
  return code;
}

Status EventFile::noteLoss(const IdRange& lost) {
  Statement insert;
  int code = insert.prepare(connection_.handle(), "INSERT OR REPLACE INTO recorder_losses VALUES(?1, ?2)");
  if (code == SQLITE_OK) {
    code = insert.bind(1, lost.first).bind(2, lost.last).run();
  }
  // The next one to open the file must not miss them again.
  if (code == SQLITE_OK) {
    code = keepLastId_.bind(1, lastId_).run();
  }
  Status error = connection_.errorOf(code);
  if (error.failed()) {
    connection_.rollback();
  }
  return error;
}

Status EventFile::noteCarried(std::int64_t first) {
  Statement note;
  int code = note.prepare(connection_.handle(),
                          "INSERT OR REPLACE INTO recorder_state "
                          "VALUES('holds_after', ?1 - 1), ('begun_after', ?2), ('last_id', ?2)");
  if (code == SQLITE_OK) {
    code = note.bind(1, first).bind(2, lastId_).run();
  }
  Status error = connection_.errorOf(code);
  if (error.failed()) {
    connection_.rollback();
  }
  return error;
}

Status EventFile::expire(std::chrono::steady_clock::time_point deadline) {
  int code = writeGroup();
  if (code == SQLITE_OK) {
    code = retention_.expire(time_.seconds(), nextId_ - 1, deadline, expiring_);
  }
  if (code == SQLITE_OK && expiring_ > 0) {
    code = keepLastId_.bind(1, nextId_ - 1).run();
  }
  Status error = connection_.errorOf(code);
  if (error.failed()) {
    connection_.rollback();
  }
  return error;
}

Status EventFile::commit() {
  int code = writeGroup();
  if (auto error = checkIndex(); error.failed()) {
    closeForAnotherLook();
    return error;
  }
  if (code == SQLITE_OK) {
    code = commit_.run();
  }
  if (auto error = connection_.errorOf(code); error.failed()) {
    // What could not be written as a whole is not in; readers need somebody who keeps the file open.
    if (remedyFor(code) == Remedy::Wait) {
      connection_.rollback();
      return error;
    }
    inDoubt_ = std::max(inDoubt_, nextId_ - 1 - lastId_);
    closeAfterFault();
    return error;
  }
  lastId_ = nextId_ - 1;
  logBytes_ = logPages_ * (pageBytes_ + kFrameHeaderBytes);
  expired_ += std::exchange(expiring_, 0);
  return {};
}

Status EventFile::verify(std::chrono::steady_clock::time_point deadline) {
  Status error;
  if (check_.isDone()) {
    error = check_.begin();
  }
  if (error.ok()) {
    error = check_.goOn(deadline);
  }
  if (error.ok() && !check_.lost().empty()) {
    error = Error{SQLITE_CORRUPT, "damaged: events " + textOf(check_.lost()) + " aren't as they were written"};
  }
  if (error.failed()) {
    check_.finalize();
  }
  return error;
}

Status EventFile::checkpointIfDue() {
  // Whether all of it is in: nothing was committed in the meantime.
  if (checkpointer_.takeBroughtIn() == logPages_) {
    logPages_ = 0;
  }
  const std::int64_t bytes = logPages_ * pageBytes_;
  if (bytes < logLimit_ || (bytes < 2 * logLimit_ && checkpointer_.begin())) return {};
  checkpointer_.finish();
  int pages = 0;
  const int code = sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, &pages, nullptr);
  // A reader in the way is no fault: the rest is brought in later.
  if ((code & 0xFF) == SQLITE_BUSY) return {};
  if (code == SQLITE_OK) {
    logPages_ = 0;
  }
  return connection_.errorOf(code);
}

}  // namespace tarn::recorder
