// SPDX-License-Identifier: Apache-2.0
// ReportStore: reads from the recorder's file what a report is made of, all of one moment.
//
// Over many sessions the events are passed over once, and only the payloads that can count are brought out. How the
// file is opened: StoreMoment. Owner: who makes a report. Threads: one at a time. It may block on the disk.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "tools/report/Rows.h"
#include "tools/report/StoreMoment.h"

namespace tarn::report {

class ReportStore {
 public:
  explicit ReportStore(std::filesystem::path file) : moment_(std::move(file)) {}
  ReportStore(const ReportStore&) = delete;
  ReportStore& operator=(const ReportStore&) = delete;

  // To be called once, before anything else. Every error names the file.
  [[nodiscard]] Status open() { return moment_.open(); }
  // Sessions of which a part lies in the range, by their ids; without those that made way for another before they ever
  // ran (recorder::kIsUsed).
  Result<std::vector<SessionRow>> sessions(const TimeRange& range);
  // Those of these that are there.
  Result<std::vector<SessionRow>> sessionsOf(const std::vector<std::int64_t>& ids);
  // Periods of which a part lies in the range.
  Result<std::vector<PeriodRow>> periods(const TimeRange& range);
  // Calls `take` for each event of the range that a report over many sessions may count; see isCountedByName(). The
  // row is the reader's own and changes with the next one. `progress` hears how much is read, from 0 to 1.
  [[nodiscard]] Status countedEvents(const TimeRange& range, const std::function<void(const EventRow&)>& take,
                                     const std::function<void(double)>& progress = {});
  // All events of these sessions in the order of their ids, by session. Payloads are those of the messages alone.
  Result<std::map<std::int64_t, std::vector<EventRow>>> eventsOf(const std::vector<std::int64_t>& ids);
  Result<std::map<std::int64_t, std::vector<PeriodRow>>> periodsOf(const std::vector<std::int64_t>& ids);

 private:
  // Asks with the range's ends in the first two places.
  [[nodiscard]] Status each(const std::string& sql, const TimeRange& range, const StoreMoment::Take& take);

  // The number in the one row of an answer; 0 for none.
  Result<std::int64_t> numberOf(const std::string& sql);

  StoreMoment moment_;
};

}  // namespace tarn::report
