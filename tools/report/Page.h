// SPDX-License-Identifier: Apache-2.0
// Page: the whole report as one file: HTML that is well-formed XML too, with its style inside, without scripts and
// without anything from elsewhere. Stateless. Threads: any.
//
// A page has a bound, so that it stays a page: the sessions' table ends where its share is used up, and sections of
// single sessions are added, in their order, as long as there is room. What was left out of the table is said.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "tools/report/RangePicture.h"
#include "tools/report/SessionPicture.h"

namespace tarn::report {

// Bytes.
inline constexpr std::size_t kMostBytes = 1000 * 1000;
inline constexpr std::size_t kMostTableBytes = 500 * 1000;

struct Report {
  double made = 0;                    // when, epoch seconds
  std::optional<RangePicture> range;  // with it there is an overview and a table of all sessions
  // In the order in which they are to have room.
  std::vector<SessionPicture> sessions;
  bool isComplete = false;  // each of them is in the page, however long it becomes: they were asked for
};

std::string page(const Report& report);

}  // namespace tarn::report
