// SPDX-License-Identifier: Apache-2.0
// Rows of the recorder's file as the report takes them: plain data, whoever has read them. Times are epoch seconds.
//
// Nothing of them is trusted: names, texts and payloads are what clients sent. Threads: plain data.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "recorder/store/reading/SessionReader.h"

namespace tarn::report {

using recorder::PeriodRow;
using recorder::SessionRow;

// One event that a back-end got on a session's behalf.
struct EventRow {
  std::int64_t id = 0;
  std::int64_t session = 0;
  double time = 0;  // of the hand-over
  std::string backend;
  std::string name;
  std::string payload;  // a JSON object
};

// What is looked at: from the first moment up to, but without, the second. Nothing: no bound.
struct TimeRange {
  std::optional<double> since;
  std::optional<double> until;
};

// The seconds that two stretches have in common.
inline double overlap(double from, double to, double since, double until) {
  const double begin = from < since ? since : from;
  const double end = to > until ? until : to;
  return end > begin ? end - begin : 0;
}

}  // namespace tarn::report
