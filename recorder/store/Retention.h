// SPDX-License-Identifier: Apache-2.0
// Retention: which events must go, in steps small enough to fit into a commit.
//
// Which problem: the file must stay within its size while events pour in, without a vacuum that would stop everything,
// and nobody who pours may push out what others have. How: a deletion frees pages, new events take them, so the file
// stops growing a little below the limit. When the limit itself came down, free pages are given back to the file system
// a few at a time.
//
// For space go the events of whoever has most (see Shares). Who has how much is counted only from three quarters of
// the limit on: all rows are gone through once, in pieces, and what comes and goes after that is added up. Nothing of
// it is kept in the file.
//
// The rows of repeated messages say least: for space all of them go before an event does, the oldest first, else as
// those of messages do.
//
// What has left the device already goes before anything that hasn't: that is here alone (see ExportedIds). What goes
// all the same, for space or for its age, is counted.
//
// Too old: messages and summaries each have an age. An event's is that of its group, on the recorder's own time and not
// by the event's; what was recorded before there were groups is as old as the first group.
//
// Owner: the event file; all calls stand inside its transactions. Threads: the writer's, but for expiredByOwner() and
// unexported().
#pragma once

#include <array>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <map>
#include <optional>
#include <utility>
#include <vector>

#include "plist/ThreadSafety.h"
#include "recorder/store/retention/EventOwner.h"
#include "recorder/store/retention/EventRemoval.h"
#include "recorder/store/retention/EventScan.h"
#include "recorder/store/retention/ExportedIds.h"
#include "recorder/store/retention/IdRange.h"
#include "recorder/store/retention/PageSpace.h"
#include "recorder/store/retention/Shares.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

// What is kept; all hold at once.
struct RetentionLimits {
  // Of the database's pages in use. A sixteenth below it deleting begins.
  std::int64_t maxBytes;
  double maxAgeSeconds;
  double summaryMaxAgeSeconds;
};

// Events that went without having left the device, and the ids between which they lie.
struct Unexported {
  std::uint64_t count = 0;
  IdRange within;
  friend bool operator==(const Unexported&, const Unexported&) = default;
};

class Retention {
 public:
  using Deadline = std::chrono::steady_clock::time_point;
  // Stands in counts for all whom there is no room to count alone.
  static constexpr Owner kOtherOwners = -2;

  explicit Retention(const RetentionLimits& limits) : limits_(limits) {}
  Retention(const Retention&) = delete;
  Retention& operator=(const Retention&) = delete;

  // As what lies beside the database takes more or less of the cap; holds from the next expire() on.
  void setMaxBytes(std::int64_t maxBytes) noexcept { limits_.maxBytes = maxBytes; }
  // Other limits, likewise.
  void setLimits(const RetentionLimits& limits) noexcept { limits_ = limits; }
  // Where whoever carries events away says how far that is; empty: nobody does.
  void setExported(std::filesystem::path file) noexcept { exported_.setFile(std::move(file)); }
  // For sessions whose events are gone: how old their rows get, and how many there may be, so that they take a
  // thirtieth of the limit or so.
  double maxAgeSeconds() const noexcept { return limits_.maxAgeSeconds; }
  std::int64_t mostSessions() const noexcept { return limits_.maxBytes / kBytesASession; }
  // Gets ready for a connection, which outlives it until finalize(). SQLite's result code.
  [[nodiscard]] int prepare(Connection& connection);
  // Lets go of the connection's statements; safe without any.
  void finalize() noexcept;

  // An event was added, with the row of its session.
  [[nodiscard]] int added(std::int64_t id, const StoredEvent& event) {
    return count_ == Count::None ? 0 /* SQLITE_OK */ : addToShares(id, event);
  }
  // Events were added in another way: what everybody has is to be counted anew.
  void forgetShares() noexcept;
  // What was done since the last of these two is safe, or isn't there.
  void committed() noexcept;
  void rolledBack();

  // Removes events until all is within the limits or `deadline` has passed; at least one step is done. `now` is of the
  // recorder's time, `newest` the last id there is. Adds the number of removed events to `removed`. SQLite's result
  // code.
  [[nodiscard]] int expire(double now, std::int64_t newest, Deadline deadline, std::uint64_t& removed);
  // Whether the last expire() stopped with work left.
  bool hasMore() const noexcept { return hasMore_; }
  // The greatest id that it removed; 0 for none.
  std::int64_t removedUpTo() const noexcept { return removedUpTo_; }
  // How many events of each were removed by the transactions committed so far, since this was made. Threads: any.
  std::map<Owner, std::uint64_t> expiredByOwner() const;
  // Of them, those that hadn't left the device; none where nobody carries any away. Threads: any.
  Unexported unexported() const;

 private:
  static constexpr std::int64_t kBytesASession = 8192;
  // How far who has how much is known.
  enum class Count : std::uint8_t { None, Begun, Done };
  // The next events of one owner and sort, while a step picks.
  struct Line;

  [[nodiscard]] int addToShares(std::int64_t id, const StoredEvent& event);
  // One step: a few events that are too old, else for space. `more` when there may be another.
  [[nodiscard]] int removeSlice(double now, std::int64_t newest, Deadline deadline, bool& more, std::uint64_t& removed);
  // Picks of one sort what is too old, of a few groups.
  [[nodiscard]] int pickAged(EventSort sort, double cutoff, std::int64_t newest, bool& more);
  // Where the events that are too old end, by their groups, from `from` on; `from` where none is.
  [[nodiscard]] int readAgedBefore(double cutoff, std::int64_t from, std::int64_t newest, std::int64_t& before);
  // Picks for space, of which the database has so many bytes too few.
  [[nodiscard]] int pickForSpace(std::int64_t newest, std::int64_t excess);
  void lookAtExported();
  // Whose event goes next for space: of what has left the device, and of the rest when there is none of that.
  [[nodiscard]] Shares::Next nextForSpace();
  [[nodiscard]] int readNext(Line& line, std::int64_t newest);
  [[nodiscard]] int goOnCounting(std::int64_t newest, Deadline deadline);
  // Removes what was picked.
  [[nodiscard]] int removePicked(std::uint64_t& removed);
  void notePicked(const ScannedEvent& event);
  // The lowest id; `id` stays in an empty file.
  [[nodiscard]] int readOldest(std::int64_t& id);
  // Rows of repeated messages that came before this event, the oldest first, so many as one step takes.
  [[nodiscard]] int removeRepeats(std::int64_t before, bool& removedAny);

  RetentionLimits limits_;
  // Between prepare() and finalize().
  Connection* connection_ = nullptr;
  // Prepared once for each connection, as they run with every commit.
  Statement oldest_;
  Statement oldestRepeat_;
  Statement keepLastRepeat_;
  Statement removeRepeatSums_;
  Statement removeRepeats_;
  Statement groupTimes_;
  EventScan scan_;
  EventRemoval removal_;
  PageSpace pages_;
  Shares shares_;
  ExportedIds exported_;
  // In this expire(), once anything goes: what has left the device, and whether any of that may be here still.
  bool knowsExported_ = false;
  bool hasExported_ = false;
  std::optional<std::int64_t> exportedUpTo_;
  Count count_ = Count::None;
  Count countCommitted_ = Count::None;  // as the last commit left it
  // While they are counted: where that goes on, and what came after it had begun and is counted as it comes.
  std::int64_t countNext_ = 0;
  std::int64_t countEnd_ = 0;
  // By sort: below this id none is too old any more.
  std::array<std::int64_t, 2> agedFrom_{};
  std::vector<std::int64_t> picked_;
  std::vector<ScannedEvent> scanned_;        // kept for its room
  std::map<Owner, std::uint64_t> expiring_;  // in this transaction
  Unexported leaving_;                       // likewise
  mutable Mutex mutex_;
  Unexported unexported_ TARN_GUARDED_BY(mutex_);
  // Has everybody whom expiring_ has, so that a commit needs no memory.
  std::map<Owner, std::uint64_t> expired_ TARN_GUARDED_BY(mutex_);
  std::int64_t removedUpTo_ = 0;
  bool hasMore_ = false;
};

}  // namespace tarn::recorder
