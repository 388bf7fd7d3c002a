// Account: the readable story of what arrived: for each back-end what it got, for each session what became of it.
#pragma once

#include <string>
#include <vector>

#include "tests/scenario/Model.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

// Both print to stdout. A table of back-ends with one event of each, and the names that each got:
void printBackends(const std::vector<RecordedEvent>& events);
// For each application the order of its messages, what was derived from them and the summaries:
void printSessions(const std::vector<Expectation>& expectations, const std::vector<RecordedEvent>& events);

}  // namespace tarn::scenario
