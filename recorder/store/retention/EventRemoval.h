// SPDX-License-Identifier: Apache-2.0
// EventRemoval: takes events out of the recorder's file, with all that stands there for them alone.
//
// Which problem: an event shares its texts with events up to 2,048 ids after it, its checksum with those of its group,
// its place in the lists with its session's. How: the rows from the first to the last that goes, and as far around
// them as sharing reaches, are read once; what none of those that stay needs goes too, and a group is written anew as
// the runs of it that are left.
//
// Owner: the retention; inside its transactions. Threads: the writer's. What fails answers SQLite's code.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "recorder/store/retention/RemovedIds.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/EventGroup.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class EventRemoval {
 public:
  EventRemoval() = default;
  EventRemoval(const EventRemoval&) = delete;
  EventRemoval& operator=(const EventRemoval&) = delete;

  // Gets ready for a connection, which outlives it until finalize().
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;

  // Removes the rows with these ids, which rise, and notes them as removed. Costs a look at the rows around them.
  [[nodiscard]] int remove(std::span<const std::int64_t> ids);

 private:
  // What a row says beside its time.
  struct Row {
    std::int64_t id = 0;
    // By the events that brought them.
    std::int64_t kind = 0;
    std::int64_t payload = 0;
    bool hasPayload = false;
    std::int64_t session = 0;
  };

  // For ids that lie so near to each other that the rows around them are the same.
  [[nodiscard]] int removeNear(std::span<const std::int64_t> ids);
  // The rows around them: those that go, and those that stay.
  [[nodiscard]] int readAround(std::span<const std::int64_t> ids);
  [[nodiscard]] int removeRows(std::span<const std::int64_t> ids);
  [[nodiscard]] int removeTexts();
  [[nodiscard]] int removeSpans();
  [[nodiscard]] int cutGroups(std::int64_t first, std::int64_t last);
  [[nodiscard]] int writeRuns(const EventGroup& group);
  [[nodiscard]] int removeTimes(std::int64_t first, std::int64_t last);
  // How many rows stay with ids from `first` on and below `end`.
  std::int64_t stayingWithin(std::int64_t first, std::int64_t end) const noexcept;

  Statement rows_;
  Statement removeRows_;
  Statement removeTexts_;
  Statement spans_;
  Statement removeSpan_;
  Statement groups_;
  Statement removeGroup_;
  Statement insertGroup_;
  Statement removeTimes_;
  RemovedIds removedIds_;
  // Of the removal that goes on; kept for their room.
  std::vector<Row> going_;
  std::vector<Row> staying_;
  std::string hashes_;
};

}  // namespace tarn::recorder
