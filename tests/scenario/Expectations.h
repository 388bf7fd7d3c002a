// SPDX-License-Identifier: Apache-2.0
// Expectations: what a script must lead to, as data beside it: NAME.expected.jsonl for NAME.jsonl. One JSON object a
// line, with the backend, the name, the payload and, where there is one, the detail of an event; the values in the
// notation of Notation.h. A list of names stands for as many events, alike but for the name.
#pragma once

#include <string>
#include <vector>

#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

struct ExpectedEvent {
  std::string origin;  // FILE:LINE
  std::string script;
  std::string backend;
  std::string name;
  json payload = json::object();
  json detail = json::object();
};

// Within a lane the order counts. That of analytics events is their application, that of mirrored sessions the session,
// that of a summary file its name; all other events of a back-end are in one.
std::string laneOf(const ExpectedEvent& event);
std::string laneOf(const RecordedEvent& event);

// The last part of a path.
std::string fileName(const std::string& path);
// Where the expectations of a script stand.
std::string expectationFile(const std::string& script);
// What stands there; nothing when there is no such file. Throws std::runtime_error with the line for what can't be
// read.
std::vector<ExpectedEvent> readExpectations(const std::string& script);
// Replaces it, a lane after the other. Throws std::runtime_error.
void writeExpectations(const std::string& script, const std::vector<ExpectedEvent>& events);

}  // namespace tarn::scenario
