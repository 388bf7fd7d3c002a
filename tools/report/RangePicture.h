// SPDX-License-Identifier: Apache-2.0
// RangePicture: what is to be seen of many sessions over a range of time.
//
// Everything is counted within the range: of a period the seconds that lie in it, of events those that were handed over
// in it. Rows may come in any order after their session; events and periods of sessions that weren't added don't count.
// Owner: who makes a report. Threads: one at a time.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "tools/report/Rows.h"

namespace tarn::report {

// One session's figures within the range.
struct SessionFigures {
  SessionRow session;
  double activeSeconds = 0;
  std::int64_t messages = 0;  // of the periods that overlap the range, each whole: a row doesn't say when they came
  std::int64_t redundant = 0;
  std::int64_t overloads = 0;
  std::int64_t errors = 0;
  std::int64_t issues = 0;
};

// The sessions of one application and service type.
struct GroupFigures {
  std::string application;
  std::string serviceName;
  std::int64_t sessions = 0;
  double activeSeconds = 0;
  std::int64_t overloads = 0;
  std::int64_t errors = 0;
};

// A stretch of the range.
struct TimeBin {
  double from = 0;
  double to = 0;
  double activeSeconds = 0;  // of all sessions together
  std::int64_t overloads = 0;
};

// Volumes are counted by the nearest sixteenth.
inline constexpr std::size_t kVolumeBuckets = 17;

struct RangePicture {
  double from = 0;
  double to = 0;
  SessionFigures totals;                             // its session means nothing
  std::vector<SessionFigures> sessions;              // the newest first
  std::vector<GroupFigures> groups;                  // the most sessions first, then the most active
  std::vector<TimeBin> days;                         // whole days of UTC, or as many of them as a picture has room for
  std::vector<TimeBin> hours;                        // whole hours, or whole days where the range is long
  std::array<double, kVolumeBuckets> playSeconds{};  // of derived segments, by volume
  std::vector<std::size_t> worst;  // up to ten of `sessions`, those with the most overloads and errors
};

class RangeBuilder {
 public:
  // `now` ends what is open, and the range where nothing else does.
  RangeBuilder(TimeRange range, double now) : range_(range), now_(now) {}
  RangeBuilder(const RangeBuilder&) = delete;
  RangeBuilder& operator=(const RangeBuilder&) = delete;

  void add(const SessionRow& session);
  void add(const PeriodRow& period);
  // Only what counts need be added; see isCountedByName().
  void add(const EventRow& event);
  RangePicture picture();

 private:
  // Fills the bins from the periods and the overloads.
  void fill(std::vector<TimeBin>& bins) const;

  const TimeRange range_;
  const double now_;
  std::vector<SessionFigures> sessions_;
  std::map<std::int64_t, std::size_t> places_;  // of sessions, by their ids
  std::vector<std::pair<double, double>> periods_;
  std::vector<double> overloads_;
  std::array<double, kVolumeBuckets> playSeconds_{};
};

}  // namespace tarn::report
