// SPDX-License-Identifier: Apache-2.0
// ReportMaker: chooses what a report shows and reads it. Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

#include "plist/Result.h"
#include "tools/report/Page.h"
#include "tools/report/ReportStore.h"
#include "tools/report/Rows.h"

namespace tarn::report {

// Sessions by their ids, or those of the range where none is named. Of named ones all is shown, and the range bounds
// what is counted of several together.
struct ReportRequest {
  std::vector<std::int64_t> sessions;
  TimeRange range;
};

// Over a range the worst sessions come first and then the newest small ones, as long as the page has room; see Page.h.
// One session alone has no overview. Fails when the store can't be read, and when a named session isn't there.
// `progress` hears how much of the store is read, from 0 to 1.
Result<Report> makeReport(ReportStore& store, const ReportRequest& request, double now,
                          const std::function<void(double)>& progress = {});

}  // namespace tarn::report
