// SPDX-License-Identifier: Apache-2.0
// RemovedIds: which events retention took out of the middle, so that nobody takes them for lost.
//
//   recorder_removed(first, last, hash)    hash: over the two, as no event's checksum holds them
//
// Before `holds_after` nothing is expected; that moves on as the oldest go. What goes behind one that stays is noted
// here, neighbours as one range, so there are never more ranges than runs of events that are kept. The table is made
// with the first range. Whoever only reads asks within().
//
// Threads: the connection's. What fails answers SQLite's code.
#pragma once

#include <cstdint>
#include <vector>

#include "recorder/store/retention/IdRange.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class RemovedIds {
 public:
  RemovedIds() = default;
  RemovedIds(const RemovedIds&) = delete;
  RemovedIds& operator=(const RemovedIds&) = delete;

  // Gets ready for a connection, which outlives it until finalize(). Makes nothing.
  void prepare(Connection& connection) noexcept { connection_ = &connection; }
  void finalize() noexcept;

  // Notes that all of these are removed; in a transaction.
  [[nodiscard]] int add(IdRange range);
  // Moves `holds_after` over what is noted as removed or lost right after it, and forgets those notes and what is kept
  // about ids before it; in a transaction.
  [[nodiscard]] int fold();
  // The parts of a range that are noted as removed, rising; none without a table.
  [[nodiscard]] int within(IdRange range, std::vector<IdRange>& removed);

 private:
  [[nodiscard]] int hasTable(bool& has);
  [[nodiscard]] int prepareReading();
  [[nodiscard]] int prepareWriting();
  [[nodiscard]] int readHold(std::int64_t& holdsAfter);
  [[nodiscard]] int joinNeighbours(IdRange& range);
  // The last id of the first range of a list, where that goes on after `hold`; else `hold`.
  [[nodiscard]] int goOn(Statement& list, Statement& forget, bool hasHash, std::int64_t& hold);
  [[nodiscard]] int forgetBefore(std::int64_t hold);

  Connection* connection_ = nullptr;
  // Prepared once they are needed: most files never need them.
  Statement overlapping_;
  Statement insert_;
  Statement remove_;
  bool isPrepared_ = false;
};

}  // namespace tarn::recorder
