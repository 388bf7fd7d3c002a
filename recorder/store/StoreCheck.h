// SPDX-License-Identifier: Apache-2.0
// StoreCheck: compares the recorder's rows with their checksums, group by group, in steps as long as one likes.
//
// Every id that retention hasn't removed is either there and as it was written, or unproven (its row is there, its
// checksum isn't), or lost. Events that were written before there were checksums are taken as they are. Finalized
// before its connection closes. Threads: the connection's.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/retention/IdRange.h"
#include "recorder/store/retention/RemovedIds.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/EventGroup.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class StoreCheck {
 public:
  // The connection outlives it. As new, it counts as done.
  explicit StoreCheck(Connection& connection) : connection_(connection) {}
  StoreCheck(const StoreCheck&) = delete;
  StoreCheck& operator=(const StoreCheck&) = delete;

  // Starts again, with what was noted as lost by now. An error is one of reading; the check is then to be started
  // again.
  [[nodiscard]] Status begin();
  // Passes over what is too damaged to be read, 16 ids at a time, and counts it as lost; for a report. Without it such
  // a page is an error.
  void tolerateDamage() noexcept { tolerant_ = true; }
  // Goes on until the deadline; at least one group is looked at. Between two calls events may come and go.
  [[nodiscard]] Status goOn(std::chrono::steady_clock::time_point deadline);
  // Whether it came to the last id.
  bool isDone() const noexcept { return done_; }
  // Ends it; what was found so far stays.
  void finalize() noexcept;

  // What was found so far: how many rows are as they were written, and the ids of those that aren't. Known are the ids
  // that the recorder itself has noted as lost.
  std::int64_t good() const noexcept { return good_; }
  const std::vector<IdRange>& unproven() const noexcept { return unproven_; }
  const std::vector<IdRange>& lost() const noexcept { return lost_; }
  const std::vector<IdRange>& knownLost() const noexcept { return knownLost_; }
  // The first event that its session doesn't lead to, in words; empty for none.
  std::string strayText() const;

 private:
  // What the recorder has noted as lost, in rising order.
  [[nodiscard]] Status readKnown();
  // The group that was read, and before it the ids that no group holds.
  [[nodiscard]] Status lookAtGroup();
  // Ids from `first` up to but without `end`; without a group nothing proves them.
  [[nodiscard]] Status lookAtRows(std::int64_t first, std::int64_t end, const EventGroup* group);
  // As it was written, unproven or lost.
  void lookAtRow(std::int64_t id, const EventGroup* group);
  // Whether the events of the group are found by their sessions.
  [[nodiscard]] Status lookForStrays();
  // The ids after the last group, up to the last that was given.
  [[nodiscard]] Status finish();
  // These aren't there: lost, but for those that retention removed.
  [[nodiscard]] Status miss(std::int64_t first, std::int64_t end);
  // Told apart by whether the recorder has noted it.
  void lose(std::int64_t first, std::int64_t end);

  Connection& connection_;
  // Groups from an id on, and rows between two ids.
  Statement groups_;
  Statement rows_;
  RemovedIds removedIds_;
  std::vector<IdRange> removed_;  // of a gap that is looked at
  Statement strays_;
  // That is looked at.
  EventGroup group_;
  // Where goOn() goes on. Every id from the file's first up to here was looked at.
  std::int64_t next_ = 0;  // the id that must come next
  bool done_ = true;
  bool tolerant_ = false;
  // Bounds what is passed over of a file whose last id is damage.
  int stridesLeft_ = 0;
  std::int64_t good_ = 0;
  std::int64_t stray_ = 0;
  std::vector<IdRange> unproven_;
  std::vector<IdRange> lost_;
  std::vector<IdRange> knownLost_;
  std::vector<IdRange> known_;  // as noted
};

}  // namespace tarn::recorder
