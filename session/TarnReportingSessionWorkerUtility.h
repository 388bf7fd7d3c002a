// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionWorkerUtility: algorithms over messages that several workers share. Never made.
//
// Threads: the server queue.
#pragma once

#include <cstddef>
#include <span>
#include <vector>

#include "plist/Key.h"
#include "session/TarnReportingSessionMessageList.h"

namespace tarn {

// A list of messages without some of them, which were merged into others; the list outlives it.
class TarnReportingCombinedMessages {
 public:
  // All are left in at first. A bit a message.
  explicit TarnReportingCombinedMessages(const TarnReportingSessionMessageList& all) : all_(all), merged_(all.size()) {}

  const TarnReportingSessionMessageList& all() const noexcept { return all_; }
  // By its place in the list.
  bool isMerged(std::size_t index) const { return merged_[index]; }
  void setMerged(std::size_t index) { merged_[index] = true; }

 private:
  const TarnReportingSessionMessageList& all_;
  std::vector<bool> merged_;  // so that an hour of messages takes no second list of them
};

class TarnReportingSessionWorkerUtility {
 public:
  TarnReportingSessionWorkerUtility() = delete;

  // Folds bursts of state messages into one, so that a client that tells of two settings in two messages a fraction of
  // a second apart counts as one change. With the keys A and B and a pause of 5 seconds:
  //
  //   time     0    1      2    9    10   11
  //   message  A    other  B    B    A    A
  //   result   AB   other       B         A      (AB carries the time 2, the second B that of 10)
  //
  // A message is filed under the first of `keysToCombine` that it carries; one that carries none passes through. The
  // first message filed heads a group. A later one with another key, less than the pause after the head's time, is
  // merged into the head, time included, and left out. One that comes too late passes through, but the head stays. A
  // key that the group has seen, merged or passed, begins a new group.
  //
  // Returns the messages that are left, in their order: the same records, not copies. The payloads of the heads are
  // changed in place. `maximumPausetime` is in seconds.
  static TarnReportingCombinedMessages combineRapidMessages(const TarnReportingSessionMessageList& messages,
                                                            std::span<const plist::Key> keysToCombine,
                                                            double maximumPausetime);

  // Whether the message reports one of the video-call application's errors of invalid coordinates.
  static bool isParleyXYerrorMessage(const TarnReportingSessionMessage& message);
};

}  // namespace tarn
