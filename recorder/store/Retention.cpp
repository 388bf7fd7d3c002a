// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/Retention.h"

#include <sqlite3.h>

#include <algorithm>
#include <limits>
#include <string>
#include <utility>

#include "recorder/store/SessionSums.h"

namespace tarn::recorder {

namespace {

using SteadyClock = std::chrono::steady_clock;

// Events in one step, and groups that one looks at: a few milliseconds.
constexpr std::int64_t kSliceEvents = 512;
constexpr int kSliceGroups = 512;
constexpr std::int64_t kSliceRepeats = 1024;
// For space so many bytes at least go in one step, as each has to look around.
constexpr std::int64_t kLeastSliceBytes = std::int64_t{1} << 15;
constexpr std::int64_t kSliceShare = 512;
// Rows that are read at once.
constexpr std::int64_t kRowsAtOnce = 256;
constexpr std::int64_t kRowsCountedAtOnce = 1024;
// Deleting begins this much below the limit, so that the next commits find free pages and the file doesn't outgrow it.
constexpr std::int64_t kReserveShare = 16;
// From here on it is counted who has how much: early enough to be done in pieces before the limit is reached.
constexpr std::int64_t kCountingFrom = 3;
constexpr std::int64_t kOfQuarters = 4;
// Owners that are counted alone.
constexpr std::size_t kMostOwners = 256;

constexpr std::int64_t kFirstId = std::numeric_limits<std::int64_t>::min();

constexpr std::size_t indexOf(EventSort sort) noexcept {
  return static_cast<std::size_t>(sort);
}

void addTo(Unexported& sum, const Unexported& more) noexcept {
  if (more.count == 0) return;
  sum.within = sum.count == 0 ? more.within
                              : IdRange{std::min(sum.within.first, more.within.first),
                                        std::max(sum.within.last, more.within.last)};
  sum.count += more.count;
}

}  // namespace

struct Retention::Line {
  Owner owner;
  EventSort sort;
  std::int64_t from;  // where the rows go on
  std::vector<ScannedEvent> events;
  std::size_t at = 0;
  bool isOver = false;
};

int Retention::prepare(Connection& connection) {
  connection_ = &connection;
  const struct {
    Statement& statement;
    std::string sql;
  } all[] = {
      {oldest_, "SELECT id FROM event_rows ORDER BY id LIMIT 1"},
      {oldestRepeat_, "SELECT after_event FROM redundant_messages ORDER BY id LIMIT 1"},
      {keepLastRepeat_, "INSERT OR REPLACE INTO recorder_state SELECT 'last_repeat', max(id) FROM redundant_messages"},
      {removeRepeatSums_,
       SessionSums::removeOf(SessionSums::Redundant,
                             "SELECT id FROM (SELECT id, after_event FROM redundant_messages ORDER BY id LIMIT ?2) "
                             "WHERE after_event < ?1")},
      {removeRepeats_,
       "DELETE FROM redundant_messages WHERE id IN (SELECT id FROM redundant_messages ORDER BY id LIMIT ?2) AND "
       "after_event < ?1"},
      {groupTimes_,
       "SELECT first, seconds FROM event_groups WHERE first >= coalesce((SELECT max(first) FROM event_groups WHERE "
       "first <= ?1), ?1) ORDER BY first"},
  };
  for (const auto& [statement, sql] : all) {
    if (const int code = statement.prepare(connection.handle(), sql, true); code != SQLITE_OK) return code;
  }
  int code = scan_.prepare(connection);
  code = code == SQLITE_OK ? removal_.prepare(connection) : code;
  code = code == SQLITE_OK ? pages_.prepare(connection) : code;
  forgetShares();
  rolledBack();
  return code;
}

void Retention::finalize() noexcept {
  for (Statement* const statement :
       {&oldest_, &oldestRepeat_, &keepLastRepeat_, &removeRepeatSums_, &removeRepeats_, &groupTimes_}) {
    statement->finalize();
  }
  scan_.finalize();
  removal_.finalize();
  pages_.finalize();
  forgetShares();
}

void Retention::forgetShares() noexcept {
  shares_.clear();
  count_ = countCommitted_ = Count::None;
}

void Retention::committed() noexcept {
  shares_.committed();
  countCommitted_ = count_;
  if (expiring_.empty()) return;
  const MutexLock lock(mutex_);
  addTo(unexported_, std::exchange(leaving_, {}));
  for (const auto& [owner, events] : expiring_) {
    expired_.find(owner)->second += events;
  }
  expiring_.clear();
}

// What was counted in pieces may have counted what isn't there now.
void Retention::rolledBack() {
  if (countCommitted_ == Count::Done) {
    shares_.rolledBack();
  } else {
    forgetShares();
  }
  scan_.forget();
  agedFrom_ = {kFirstId, kFirstId};
  expiring_.clear();
  leaving_ = {};
}

std::map<Owner, std::uint64_t> Retention::expiredByOwner() const {
  std::map<Owner, std::uint64_t> expired;
  const MutexLock lock(mutex_);
  for (const auto& [owner, events] : expired_) {
    if (events > 0) {
      expired.emplace(owner, events);
    }
  }
  return expired;
}

Unexported Retention::unexported() const {
  const MutexLock lock(mutex_);
  return unexported_;
}

int Retention::readOldest(std::int64_t& id) {
  const int code = oldest_.step();
  if (code == SQLITE_ROW) {
    id = oldest_.integer(0);
  }
  oldest_.reset();
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

// They are in the order of the events that they came after, so a look at the first one tells whether there are any.
int Retention::removeRepeats(std::int64_t before, bool& removedAny) {
  int code = oldestRepeat_.step();
  removedAny = code == SQLITE_ROW && oldestRepeat_.integer(0) < before;
  oldestRepeat_.reset();
  if (!removedAny) return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
  code = keepLastRepeat_.run();
  for (Statement* const statement : {&removeRepeatSums_, &removeRepeats_}) {
    code = code == SQLITE_OK ? statement->bind(1, before).bind(2, kSliceRepeats).run() : code;
  }
  return code;
}

int Retention::addToShares(std::int64_t id, const StoredEvent& event) {
  Owner owner = kServiceItself;
  const int code = scan_.readOwner(event.session, owner);
  if (code == SQLITE_OK) {
    shares_.add(owner, sortOf(event.backend, event.name, event.detail), id, countedBytes(event));
  }
  return code;
}

int Retention::goOnCounting(std::int64_t newest, Deadline deadline) {
  if (count_ == Count::None) {
    forgetShares();
    count_ = Count::Begun;
    countNext_ = kFirstId;
    countEnd_ = newest + 1;
  }
  int code = SQLITE_OK;
  do {
    code = scan_.read(countNext_, countEnd_, kRowsCountedAtOnce, scanned_);
    if (code != SQLITE_OK) break;
    for (const ScannedEvent& event : scanned_) {
      shares_.add(event.owner, event.sort, event.id, event.bytes);
      countNext_ = event.id + 1;
    }
    if (static_cast<std::int64_t>(scanned_.size()) < kRowsCountedAtOnce) {
      count_ = Count::Done;
    }
  } while (count_ != Count::Done && SteadyClock::now() < deadline);
  return code;
}

// The last groups that are looked at stay for the next look, so that many old ones are no long walk.
int Retention::readAgedBefore(double cutoff, std::int64_t from, std::int64_t newest, std::int64_t& before) {
  before = from;
  std::int64_t end = newest + 1;
  int code = groupTimes_.bind(1, from).step();
  int aged = 0;
  for (; code == SQLITE_ROW; code = groupTimes_.step()) {
    if (groupTimes_.real(1) >= cutoff || aged == kSliceGroups) {
      end = groupTimes_.integer(0);
      break;
    }
    ++aged;
  }
  groupTimes_.reset();
  if (aged > 0) {
    before = std::max(from, end);
  }
  return code == SQLITE_ROW || code == SQLITE_DONE ? SQLITE_OK : code;
}

int Retention::pickAged(EventSort sort, double cutoff, std::int64_t newest, bool& more) {
  std::int64_t& from = agedFrom_[indexOf(sort)];
  std::int64_t before = from;
  int code = readAgedBefore(cutoff, from, newest, before);
  if (code != SQLITE_OK || before <= from) return code;
  more = true;
  code = scan_.read(from, before, kSliceEvents, scanned_);
  if (code != SQLITE_OK) return code;
  from = static_cast<std::int64_t>(scanned_.size()) < kSliceEvents ? before : scanned_.back().id + 1;
  for (const ScannedEvent& event : scanned_) {
    if (event.sort != sort) continue;
    notePicked(event);
    const bool isCounted = event.id < countNext_ || event.id >= countEnd_;
    if (count_ == Count::Done || (count_ == Count::Begun && isCounted)) {
      shares_.remove(event.owner, sort, event.bytes);
    }
  }
  return code;
}

void Retention::notePicked(const ScannedEvent& event) {
  lookAtExported();
  picked_.push_back(event.id);
  Owner owner = event.owner;
  {
    const MutexLock lock(mutex_);
    if (expired_.size() >= kMostOwners && !expired_.contains(owner)) {
      owner = kOtherOwners;
    }
    expired_.try_emplace(owner, 0);
  }
  ++expiring_[owner];
  if (exportedUpTo_ && event.id > *exportedUpTo_) {
    addTo(leaving_, {1, {event.id, event.id}});
  }
}

void Retention::lookAtExported() {
  if (std::exchange(knowsExported_, true)) return;
  exportedUpTo_ = exported_.read();
  hasExported_ = exportedUpTo_.has_value();
}

Shares::Next Retention::nextForSpace() {
  if (hasExported_) {
    if (const auto next = shares_.nextUpTo(*exportedUpTo_)) return *next;
    hasExported_ = false;
  }
  const Owner owner = shares_.largest();
  return {owner, shares_.nextSort(owner)};
}

int Retention::readNext(Line& line, std::int64_t newest) {
  while (line.at == line.events.size() && !line.isOver) {
    if (const int code = scan_.read(line.from, newest + 1, kRowsAtOnce, scanned_); code != SQLITE_OK) return code;
    line.isOver = static_cast<std::int64_t>(scanned_.size()) < kRowsAtOnce;
    line.from = scanned_.empty() ? newest + 1 : scanned_.back().id + 1;
    line.events.clear();
    line.at = 0;
    for (const ScannedEvent& event : scanned_) {
      if (event.owner == line.owner && event.sort == line.sort) {
        line.events.push_back(event);
      }
    }
  }
  return SQLITE_OK;
}

// At most half of what is there, so that of a few large ones no more go than must.
int Retention::pickForSpace(std::int64_t newest, std::int64_t excess) {
  const std::int64_t mostEvents = std::clamp<std::int64_t>(shares_.events() / 2, 1, kSliceEvents);
  const std::int64_t mostBytes =
      std::min(shares_.bytes() / 2, std::max({kLeastSliceBytes, limits_.maxBytes / kSliceShare, excess}));
  std::map<std::pair<Owner, EventSort>, Line> lines;
  lookAtExported();
  int code = SQLITE_OK;
  for (std::int64_t events = 0, bytes = 0; events < mostEvents && (events == 0 || bytes < mostBytes);) {
    if (shares_.empty()) break;
    const auto [owner, sort] = nextForSpace();
    const auto [place, isNew] = lines.try_emplace({owner, sort}, Line{owner, sort, 0, {}});
    Line& line = place->second;
    if (isNew) {
      line.from = shares_.of(owner).from[indexOf(sort)];
    }
    if (code = readNext(line, newest); code != SQLITE_OK) return code;
    if (line.at == line.events.size()) {  // somebody else has changed the file
      forgetShares();
      return SQLITE_OK;
    }
    const ScannedEvent& event = line.events[line.at];
    if (hasExported_ && event.id > *exportedUpTo_) {
      shares_.passed(owner, sort, event.id);  // the owner's next one hasn't left, so it is not its turn yet
      continue;
    }
    ++line.at;
    ++events;
    notePicked(event);
    shares_.remove(owner, sort, event.bytes);
    bytes += event.bytes;
  }
  for (const auto& [key, line] : lines) {
    shares_.passed(key.first, key.second, line.at < line.events.size() ? line.events[line.at].id : line.from);
  }
  return code;
}

int Retention::removePicked(std::uint64_t& removed) {
  if (picked_.empty()) return SQLITE_OK;
  std::sort(picked_.begin(), picked_.end());
  const int code = removal_.remove(picked_);
  removed += picked_.size();
  removedUpTo_ = std::max(removedUpTo_, picked_.back());
  return code;
}

int Retention::removeSlice(double now, std::int64_t newest, Deadline deadline, bool& more, std::uint64_t& removed) {
  more = false;
  picked_.clear();
  int code = pickAged(EventSort::Message, now - limits_.maxAgeSeconds, newest, more);
  if (code == SQLITE_OK && !more) {
    code = pickAged(EventSort::Summary, now - limits_.summaryMaxAgeSeconds, newest, more);
  }
  if (code != SQLITE_OK || more) return code == SQLITE_OK ? removePicked(removed) : code;

  PageSpace::Bytes space;
  std::int64_t oldest = kFirstId;
  code = pages_.read(space);
  code = code == SQLITE_OK ? readOldest(oldest) : code;
  const std::int64_t excess = space.used - (limits_.maxBytes - limits_.maxBytes / kReserveShare);
  if (code == SQLITE_OK) {
    code = removeRepeats(excess > 0 ? newest + 1 : std::max(oldest, agedFrom_[indexOf(EventSort::Message)]), more);
  }
  if (code != SQLITE_OK || more) return code;
  const bool isNear = space.used / kCountingFrom >= limits_.maxBytes / kOfQuarters;
  if (code == SQLITE_OK && count_ != Count::Done && (isNear || excess > 0)) {
    code = goOnCounting(newest, excess > 0 ? Deadline::max() : deadline);
    more = count_ != Count::Done;
  }
  if (code == SQLITE_OK && excess > 0) {
    code = pickForSpace(newest, excess);
    more = !picked_.empty();
  }
  return code == SQLITE_OK ? removePicked(removed) : code;
}

int Retention::expire(double now, std::int64_t newest, Deadline deadline, std::uint64_t& removed) {
  bool more = true;
  int code = SQLITE_OK;
  removedUpTo_ = 0;
  knowsExported_ = false;
  do {
    code = removeSlice(now, newest, deadline, more, removed);
    if (code == SQLITE_OK && !more) {
      code = pages_.giveBack(limits_.maxBytes, more);
    }
  } while (code == SQLITE_OK && more && SteadyClock::now() < deadline);
  hasMore_ = code == SQLITE_OK && more;
  return code;
}

}  // namespace tarn::recorder
