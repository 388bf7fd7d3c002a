// SPDX-License-Identifier: Apache-2.0
// PassReport: what a newcomer wants to know of a pass, and the details for who looks for one.
#pragma once

#include <string>
#include <vector>

#include "tests/scenario/Expectations.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

// Two lines to stdout: "summary", and how many events each back-end got.
void printPassReport(const std::string& summary, const std::vector<RecordedEvent>& events);
// Adds to the file at `path` the differences, and each event with the line that it matched. Throws std::runtime_error.
void writeDetails(const std::string& path, const std::string& summary, const std::vector<std::string>& differences,
                  const std::vector<RecordedEvent>& events, const std::vector<const ExpectedEvent*>& matches);

}  // namespace tarn::scenario
