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

struct RetentionLimits {
  std::int64_t maxBytes;
  double maxAgeSeconds;
};

class Retention {
 public:
  explicit Retention(const RetentionLimits& limits) : limits_(limits) {}
  Retention(const Retention&) = delete;
  Retention& operator=(const Retention&) = delete;

  void setMaxBytes(std::int64_t maxBytes) noexcept { limits_.maxBytes = maxBytes; }
  // Gets ready for a connection, or lets go of it.
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;

  // Removes events until all is within the limits or `deadline` has passed; at least one step is done. `now` is of the
  // recorder's time, `newest` the last id there is. Adds the number of removed events to `removed`. SQLite's result
  // code.
  [[nodiscard]] int expire(double now, std::int64_t newest, std::chrono::steady_clock::time_point deadline,
                           std::uint64_t& removed);
  // Whether the last expire() stopped with work left.
  bool hasMore() const noexcept { return hasMore_; }

 private:
  [[nodiscard]] int readOldest(std::int64_t& id, bool& any);
  [[nodiscard]] int readAgedBefore(double cutoff, std::int64_t atMost, std::int64_t& before);
  [[nodiscard]] int removeBefore(std::int64_t id, std::uint64_t& removed);
  [[nodiscard]] int readPragma(Statement& pragma, std::int64_t& value);
  [[nodiscard]] int readSizes(std::int64_t& fileBytes, std::int64_t& usedBytes);
  [[nodiscard]] int removeSlice(double now, std::int64_t newest, bool& removedAny, std::uint64_t& removed);
  [[nodiscard]] int giveBackPages(bool& gaveAny);

  RetentionLimits limits_;
  Connection* connection_ = nullptr;
  Statement oldest_;
  Statement pageCount_;
  Statement freePages_;
  Statement groupTimes_;
  Statement removeBefore_;
  Statement removeGroups_;
  Statement removeLosses_;
  Statement keepHoldsAfter_;
  std::int64_t pageBytes_ = 0;
  bool hasMore_ = false;
};

}  // namespace tarn::recorder
