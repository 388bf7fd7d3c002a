// SPDX-License-Identifier: Apache-2.0
// SessionOverview: what a line tells of a session: its row, its periods and how many overloads it had. Threads: one.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/reading/SessionReader.h"
#include "tools/ctl/terminal/Progress.h"

namespace tarn::ctl {

struct SessionOverview {
  recorder::SessionRow row;
  std::vector<recorder::PeriodRow> periods;
  std::int64_t overloads = 0;
  double active = 0;  // seconds between its starts and its stops, until now for one that runs
  // In all periods.
  std::int64_t messages = 0;
  std::int64_t redundant = 0;

  // "stopped", "open", "running": how it ended, or how it is.
  std::string state() const;
};

// Of sessions that stand by ascending id; `now` in epoch seconds. Overloads are counted by the sessions' own summaries
// and, of one that goes on or has none, by its events. The error names the file.
Result<std::vector<SessionOverview>> overviewsOf(recorder::SessionReader& reader,
                                                 std::vector<recorder::SessionRow> sessions, double now,
                                                 const ProgressHandler& progress = {});

// One object: the columns of the row, then running, active, periods, messages, redundant, overloads.
std::string overviewJson(const SessionOverview& overview);

}  // namespace tarn::ctl
