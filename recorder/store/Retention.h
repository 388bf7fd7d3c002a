// SPDX-License-Identifier: Apache-2.0
// Retention: which events must go, oldest first, in steps small enough to fit into a commit.
//
// Which problem: the file must stay within its size while events pour in, without a vacuum that would stop everything.
// How: a deletion frees pages, new events take them, so the file stops growing a little below the limit. When the limit
// itself came down, free pages are given back to the file system a few at a time.
//
// "Oldest" is the lowest id, so what is left has no gaps. An event's age is that of its group, on the recorder's own
// time and not by the event's; what was recorded before there were groups is as old as the first group.
//
// Owner: the event file; all calls stand inside its transactions. Threads: the writer's.
#pragma once

#include <chrono>
#include <cstdint>

#include "recorder/store/Connection.h"
#include "recorder/store/Statement.h"

namespace tarn::recorder {

// What is kept; both hold at once.
struct RetentionLimits {
  // Of the database's pages in use. A sixteenth below it deleting begins.
  std::int64_t maxBytes;
  double maxAgeSeconds;
};

class Retention {
 public:
  explicit Retention(const RetentionLimits& limits) : limits_(limits) {}
  Retention(const Retention&) = delete;
  Retention& operator=(const Retention&) = delete;

  // As what lies beside the database takes more or less of the cap; holds from the next expire() on.
  void setMaxBytes(std::int64_t maxBytes) noexcept { limits_.maxBytes = maxBytes; }
  // For sessions whose events are gone: how old their rows get, and how many there may be, so that they take a
  // thirtieth of the limit or so.
  double maxAgeSeconds() const noexcept { return limits_.maxAgeSeconds; }
  std::int64_t mostSessions() const noexcept { return limits_.maxBytes / kBytesASession; }
  // Gets ready for a connection, which outlives it until finalize(). SQLite's result code.
  [[nodiscard]] int prepare(Connection& connection);
  // Lets go of the connection's statements; safe without any.
  void finalize() noexcept;

  // Removes events until all is within the limits or `deadline` has passed; at least one step is done. `now` is of the
  // recorder's time, `newest` the last id there is. Adds the number of removed events to `removed`. SQLite's result
  // code.
  [[nodiscard]] int expire(double now, std::int64_t newest, std::chrono::steady_clock::time_point deadline,
                           std::uint64_t& removed);
  // Whether the last expire() stopped with work left.
  bool hasMore() const noexcept { return hasMore_; }

 private:
  static constexpr std::int64_t kBytesASession = 8192;

  // The lowest id; `any` is false in an empty file.
  [[nodiscard]] int readOldest(std::int64_t& id, bool& any);
  // Where the events that are too old end, by their groups; at most `atMost`.
  [[nodiscard]] int readAgedBefore(double cutoff, std::int64_t atMost, std::int64_t& before);
  // Removes the events before this id, with their groups and noted losses and with the texts that no later event
  // shares, and notes that the file holds what comes after.
  [[nodiscard]] int removeBefore(std::int64_t id, std::uint64_t& removed);
  [[nodiscard]] int readPragma(Statement& pragma, std::int64_t& value);
  // Of the file, and of its pages in use.
  [[nodiscard]] int readSizes(std::int64_t& fileBytes, std::int64_t& usedBytes);
  // 256 ids at the most, a few milliseconds' work.
  [[nodiscard]] int removeSlice(double now, std::int64_t newest, bool& removedAny, std::uint64_t& removed);
  // 64 pages at the most, and only where the file is over its limit.
  [[nodiscard]] int giveBackPages(bool& gaveAny);

  RetentionLimits limits_;
  // Between prepare() and finalize().
  Connection* connection_ = nullptr;
  // Prepared once for each connection, as they run with every commit.
  Statement oldest_;
  Statement pageCount_;
  Statement freePages_;
  Statement groupTimes_;
  Statement removeBefore_;
  Statement removeTexts_;
  Statement removeSpans_;
  Statement removeTimes_;
  Statement removeGroups_;
  Statement removeLosses_;
  Statement keepHoldsAfter_;
  // Of a page of the database, as prepare() found it.
  std::int64_t pageBytes_ = 0;
  bool hasMore_ = false;
};

}  // namespace tarn::recorder
