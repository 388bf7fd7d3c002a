#include "recorder/store/Retention.h"

#include <sqlite3.h>

#include <algorithm>

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
  sqlite3* const database = connection.handle();
  int code = oldest_.prepare(database, "SELECT id, time FROM events ORDER BY id LIMIT 1", true);
  if (code == SQLITE_OK) {
    code = pageCount_.prepare(database, "PRAGMA page_count", true);
  }
  if (code == SQLITE_OK) {
    code = freePages_.prepare(database, "PRAGMA freelist_count", true);
  }
  if (code == SQLITE_OK) {
    code = removeBefore_.prepare(database, "DELETE FROM events WHERE id < ?1", true);
  }
  if (code == SQLITE_OK) {
    code = removeAgedBefore_.prepare(database, "DELETE FROM events WHERE id < ?1 AND time < ?2", true);
  }
  pageBytes_ = connection.integer("PRAGMA page_size").value_or(4096);
  return code;
}

void Retention::finalize() noexcept {
  oldest_.finalize();
  pageCount_.finalize();
  freePages_.finalize();
  removeBefore_.finalize();
  removeAgedBefore_.finalize();
}

int Retention::readOldest(std::int64_t& id, double& time, bool& any) {
  const int code = oldest_.step();
  any = code == SQLITE_ROW;
  if (any) {
    id = oldest_.integer(0);
    time = oldest_.real(1);
  }
  oldest_.reset();
  return any || code == SQLITE_DONE ? SQLITE_OK : code;
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

int Retention::removeSlice(double now, bool& removedAny, std::uint64_t& removed) {
  removedAny = false;
  std::int64_t fileBytes = 0;
  std::int64_t usedBytes = 0;
  std::int64_t oldestId = 0;
  double oldestTime = 0;
  bool any = false;
  int code = readSizes(fileBytes, usedBytes);
  if (code == SQLITE_OK) {
    code = readOldest(oldestId, oldestTime, any);
  }
  if (code != SQLITE_OK || !any) return code;

  const double cutoff = now - limits_.maxAgeSeconds;
  const std::int64_t behind = oldestId + kSliceIds;
  if (usedBytes > limits_.maxBytes - limits_.maxBytes / kReserveShare) {
    code = removeBefore_.bind(1, behind).run();
  } else if (oldestTime < cutoff) {
    code = removeAgedBefore_.bind(1, behind).bind(2, cutoff).run();
  } else {
    return SQLITE_OK;
  }
  if (code == SQLITE_OK) {
    removedAny = true;
    removed += static_cast<std::uint64_t>(sqlite3_changes64(connection_->handle()));
  }
  return code;
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

int Retention::expire(double now, std::chrono::steady_clock::time_point deadline, std::uint64_t& removed) {
  bool more = true;
  int code = SQLITE_OK;
  do {
    code = removeSlice(now, more, removed);
    if (code == SQLITE_OK && !more) {
      code = giveBackPages(more);
    }
  } while (code == SQLITE_OK && more && std::chrono::steady_clock::now() < deadline);
  hasMore_ = code == SQLITE_OK && more;
  return code;
}

}  // namespace tarn::recorder
