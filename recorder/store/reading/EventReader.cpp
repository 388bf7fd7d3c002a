// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/reading/EventReader.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <limits>
#include <string_view>
#include <thread>
#include <utility>

#include "recorder/store/StoreLayout.h"
#include "recorder/store/reading/EventPlaces.h"
#include "recorder/store/reading/StoreAccess.h"

namespace tarn::recorder {

namespace {

constexpr int kBusyMilliseconds = 2000;
// The pace of looking for changes: what is written can be read once it is on the disk, which nobody tells; so it is
// quick for as long as that takes as a rule, and gentle when nothing comes of it.
constexpr std::chrono::microseconds kFirstLook{500};
constexpr std::chrono::microseconds kLastLook{200'000};
constexpr int kQuickLooks = 40;
// Ids that are gone through before it is looked up where there is more of what is asked for.
constexpr std::int64_t kIdsAtOnce = 4096;
// What a read may cost, by the bytes of the file and its log. Rows of ours cost far less; a damaged or made-up file may
// lead into itself and would otherwise never end, or say far more than it holds.
constexpr int kStepsAtOnce = 1000;  // of SQLite's machine, between two looks at the bound
constexpr std::int64_t kStepsPerByte = 64;
constexpr std::int64_t kStepsOfSmallFile = 1'000'000;
constexpr std::int64_t kTextPerByte = 4;
constexpr std::int64_t kTextOfSmallFile = 65536;

int spendSteps(void* stepsLeft) {
  auto& left = *static_cast<std::int64_t*>(stepsLeft);
  left -= kStepsAtOnce;
  return left < 0 ? 1 : 0;
}

// Nothing that a file's schema says is carried out beyond reading its tables and the view of events.
void distrust(sqlite3* database, std::int64_t& stepsLeft) {
  for (const int option : {SQLITE_DBCONFIG_TRUSTED_SCHEMA, SQLITE_DBCONFIG_ENABLE_TRIGGER}) {
    sqlite3_db_config(database, option, 0, nullptr);
  }
  sqlite3_progress_handler(database, kStepsAtOnce, spendSteps, &stepsLeft);
}

Result<EventPage> missing() {
  Result<EventPage> read;
  read.value.missing = true;
  return read;
}

}  // namespace

EventReader::EventReader(std::filesystem::path file) : file_(std::move(file)), watch_(file_) {}

EventReader::Identity EventReader::identity() const {
  struct stat status {};
  if (::stat(file_.c_str(), &status) != 0) return {};
  struct stat log {};
  Identity now;
  now.there = true;
  now.device = static_cast<std::uint64_t>(status.st_dev);
  now.inode = static_cast<std::uint64_t>(status.st_ino);
  now.size = status.st_size;
  now.modified = std::int64_t{status.st_mtim.tv_sec} * 1'000'000'000 + status.st_mtim.tv_nsec;
  now.hasLog = ::stat((file_.string() + "-wal").c_str(), &log) == 0;
  return now;
}

bool EventReader::sameFile(const Identity& now) const noexcept {
  if (asItLies_) return now == opened_;
  return now.there == opened_.there && now.device == opened_.device && now.inode == opened_.inode;
}

Status EventReader::openAs(const std::string& name) {
  if (connection_.open(name, SQLITE_OPEN_READONLY | SQLITE_OPEN_URI) != SQLITE_OK) return lastError();
  sqlite3_busy_timeout(connection_.handle(), kBusyMilliseconds);
  distrust(connection_.handle(), stepsLeft_);
  addGlobFunction(connection_);
  // Only the first reading access shows whether the log and its index can be used.
  if (!connection_.integer("SELECT count(*) FROM sqlite_schema")) return lastError();
  return {};
}

void EventReader::setBounds() {
  std::int64_t bytes = 0;
  for (const std::string& name : {file_.string(), file_.string() + "-wal"}) {
    struct stat status {};
    bytes += ::stat(name.c_str(), &status) == 0 ? std::int64_t{status.st_size} : 0;
  }
  bytes = std::min(bytes, std::numeric_limits<std::int64_t>::max() / (2 * kStepsPerByte));
  stepsLeft_ = kStepsOfSmallFile + kStepsPerByte * bytes;
  textLeft_ = kTextOfSmallFile + kTextPerByte * bytes;
}

Error EventReader::lastError() const {
  return {sqlite3_errcode(connection_.handle()),
          stepsLeft_ < 0 ? "its tables lead into themselves" : connection_.errorText()};
}

Status EventReader::open() {
  opened_ = identity();
  asItLies_ = false;
  dataVersion_ = -1;
  Status error = openAs(file_.string());
  if (error.ok()) return {};
  const auto code = error->code & 0xFF;
  // No index can be made in a directory that can't be written to. Where there is no log either, nobody writes, and the
  // file alone is all there is.
  if ((code == SQLITE_CANTOPEN || code == SQLITE_READONLY) && !opened_.hasLog) {
    asItLies_ = true;
    error = openAs(uriAsItLies(file_.string()));
    if (error.ok()) return {};
  }
  connection_.close();
  return error;
}

Result<EventPage> EventReader::read(const EventQuery& query) {
  const Identity now = identity();
  if (presenceOf(file_) == Presence::Refused) {
    connection_.close();
    return {{}, refusalOf(file_)};
  }
  if (!now.there) {
    connection_.close();
    if (lastRead_) {
      lastRead_ = Identity();
    }  // whatever comes next is another file, even where it gets the same number
    return missing();
  }
  if (connection_.isOpen() && !sameFile(now)) {
    connection_.close();
  }
  setBounds();
  if (!connection_.isOpen()) {
    if (const auto error = open(); error.failed()) return {{}, about(error->text)};
  }
  Result<EventPage> result = readOpen(query);
  if (result.failed()) {
    connection_.close();
  }
  return result;
}

// In another file than the one before everything is new that doesn't carry on its ids.
std::int64_t EventReader::startingPoint(std::int64_t after) {
  if (!lastRead_ || (lastRead_->device == opened_.device && lastRead_->inode == opened_.inode)) return after;
  const auto begun = connection_.integer("SELECT value FROM recorder_state WHERE name = 'begun_after'");
  return std::min(after, begun.value_or(0));
}

Result<EventPage> EventReader::readOpen(const EventQuery& query) {
  Result<EventPage> result;
  dataVersion_ = connection_.integer("PRAGMA data_version").value_or(-1);
  if (connection_.run("BEGIN") != SQLITE_OK) return {{}, about(lastError().text)};
  std::int64_t after = query.after;
  // A file of the first layout has a table of them.
  const auto tables = connection_.integer(
      "SELECT count(*) FROM sqlite_schema, pragma_user_version WHERE (name IN ('events', 'event_rows') AND "
      "type = 'table' AND rootpage > 0) OR (name = 'events' AND type = 'view' AND user_version > 0)");
  if (tables == 0) {
    static_cast<void>(connection_.run("ROLLBACK"));
    return missing();
  }
  after = startingPoint(after);
  const bool isNewer = connection_.integer("PRAGMA user_version").value_or(0) > kLayoutVersion;
  const Status error =
      isNewer ? Error{SQLITE_CANTOPEN, "its layout is that of a newer service"} : readRows(query, after, result.value);
  static_cast<void>(connection_.run("ROLLBACK"));
  if (error.failed()) return {{}, about(error->text)};
  lastRead_ = opened_;
  return result;
}

Status EventReader::readRows(const EventQuery& query, std::int64_t after, EventPage& page) {
  const EventSelect events = selectEvents(connection_);
  page.hasSessions = events.hasSessions;
  Statement rows;
  if (prepareRows(connection_, events, query, rows) != SQLITE_OK) return lastError();
  const auto greatest =
      connection_.integer(events.isOlder ? "SELECT max(id) FROM events" : "SELECT max(id) FROM event_rows");
  const std::int64_t last = std::max(after, greatest.value_or(after));
  // The next ids are read as they come. Where they hold little of what is asked for, it is looked up where there is
  // any.
  const std::int64_t near = events.isOlder || last - after < kIdsAtOnce ? last : after + kIdsAtOnce;
  Status error = readFrom(rows, {after + 1, near}, query.limit, page);
  if (error.ok() && near < last && page.rows.size() < query.limit) {
    Result<std::vector<IdRange>> places = findPlaces(connection_, query, {near + 1, last});
    if (places.failed()) return lastError();
    for (std::size_t i = 0; error.ok() && i < places.value.size() && page.rows.size() < query.limit; ++i) {
      error = readFrom(rows, places.value[i], query.limit, page);
    }
  }
  if (error.failed()) return error;
  page.more = page.rows.size() == query.limit;
  page.lookedUpTo = page.more && !page.rows.empty() ? page.rows.back().id : last;
  return {};
}

Status EventReader::readFrom(Statement& rows, const IdRange& ids, std::size_t limit, EventPage& page) {
  rows.bind(1, ids.first).bind(2, ids.last).bind(3, static_cast<std::int64_t>(limit - page.rows.size()));
  int code = rows.step();
  for (; code == SQLITE_ROW; code = rows.step()) {
    const std::array texts{rows.text(2), rows.text(3), rows.text(4), rows.text(5)};
    for (const std::string_view text : texts) {
      textLeft_ -= static_cast<std::int64_t>(text.size());
    }
    if (textLeft_ < 0) return Error{SQLITE_CORRUPT, "its rows say more than it holds"};
    page.rows.push_back({rows.integer(0), rows.real(1), std::string(texts[0]), std::string(texts[1]),
                         std::string(texts[2]), std::string(texts[3]),
                         rows.isNull(6) ? std::nullopt : std::optional(rows.integer(6))});
  }
  if (code != SQLITE_DONE) return lastError();
  rows.reset();
  return {};
}

bool EventReader::changed() {
  const Identity now = identity();
  if (!connection_.isOpen()) return now.there;
  if (!sameFile(now)) return now.there;
  if (asItLies_) return false;
  const auto version = connection_.integer("PRAGMA data_version");
  return !version || *version != dataVersion_;
}

bool EventReader::waitForChange(std::chrono::milliseconds timeout) {
  const auto until = std::chrono::steady_clock::now() + timeout;
  auto pause = kFirstLook;
  for (int looks = 0; !changed(); ++looks) {
    const auto left = std::chrono::ceil<std::chrono::microseconds>(until - std::chrono::steady_clock::now());
    if (left <= std::chrono::microseconds(0)) return false;
    if (watch_.wait(std::min(pause, left))) {
      looks = 0;
      pause = kFirstLook;
      // A commit is many writes, and none can be read before the last.
      std::this_thread::sleep_for(std::min(kFirstLook, left));
    } else if (looks >= kQuickLooks) {
      pause = std::min(pause * 2, kLastLook);
    }
  }
  return true;
}

}  // namespace tarn::recorder
