// SPDX-License-Identifier: Apache-2.0
// What the walks that cut a session into segments have in common: when the segment began, how values are compared, the
// buckets of lengths and volumes, and the numbering of the messages that come out.
//
// Threads: the server queue.
#pragma once

#include <span>
#include <string>
#include <utility>

#include "plist/Key.h"
#include "plist/Value.h"
#include "plist/ValueView.h"
#include "session/TarnReportingSessionMessageList.h"

namespace tarn {

// The beginning of the segment that runs, if one does. The time stamp is kept as the message has it, for the log; it
// lies in that message's payload until keep(). One a walk.
class TarnReportingSegmentClock {
 public:
  // An absent time stamp leaves no beginning.
  void startAt(const plist::ValueView& time) noexcept { start_ = time; }
  void clear() noexcept { start_ = {}; }
  // Copies the time stamp; what it lay in may go.
  void keep() {
    plist::Value copy(start_);
    kept_ = std::move(copy);
    start_ = kept_.view();
  }

  bool started() const noexcept { return start_.present(); }
  const plist::ValueView& start() const noexcept { return start_; }
  // Seconds from the beginning to the time stamp; what is absent counts as 0.
  double secondsUntil(const plist::ValueView& time) const noexcept { return time.asDouble() - start_.asDouble(); }

 private:
  plist::ValueView start_;
  plist::Value kept_;
};

// Comparisons of values that should be numbers or texts; values of other kinds are read as such. Two numbers are
// compared by value across their kinds, and so exactly; anything else as doubles, where a text that is no number is 0.
bool TarnReportingNumbersDiffer(const plist::ValueView& first, const plist::ValueView& second);
// By their text forms, where one isn't a text.
bool TarnReportingTextsDiffer(const plist::ValueView& first, const plist::ValueView& second);

// The bounds of the bucket labels: seconds up to five hours, and volumes in steps of a sixteenth. Readers of the events
// count by these labels, so a bound that moves breaks comparisons with earlier data. Longer and louder than the last
// gives the last.
std::span<const double> TarnReportingUtilityBucketNumberToStringTimes() noexcept;
std::span<const double> TarnReportingUtilityBucketNumberToStringVolumes() noexcept;
// The labels themselves. Whole seconds, as "1800", and up to four decimals, as "0.0625" or "0.5"; of two bounds equally
// near the larger.
std::string TarnReportingSegmentLengthLabel(double seconds);
std::string TarnReportingVolumeLabel(double volume);

// The index of a message among the derived ones, from 1, and how many there are. "msgidx"; with the count readers see
// whether they have all of a session's.
extern const plist::Key kTarnReportingMessageIndex;
// Tells each of the derived messages how many they are. Sets "msgcnt", in place, since the count is known only at the
// end.
void TarnReportingNumberMessages(const TarnReportingSessionMessageList& derived);

}  // namespace tarn
