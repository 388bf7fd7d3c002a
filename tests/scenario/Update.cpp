// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/Update.h"

#include <map>
#include <set>
#include <string>

#include "tests/scenario/Comparison.h"

namespace tarn::scenario {

namespace {

// Names for sessions that the old expectations don't know.
class SessionNames {
 public:
  explicit SessionNames(const std::vector<ExpectedEvent>& old) {
    for (const ExpectedEvent& line : old) {
      taken_.insert(line.detail.value("session", json()));
    }
  }
  const json& nameOf(const json& session) {
    json& name = names_[session];
    for (int number = 1; name.is_null(); ++number) {
      const json candidate = "<session " + std::to_string(number) + ">";
      if (taken_.insert(candidate).second) {
        name = candidate;
      }
    }
    return name;
  }

 private:
  std::set<json> taken_;
  std::map<json, json> names_;
};

}  // namespace

std::vector<ExpectedEvent> updated(const std::vector<ExpectedEvent>& old, const std::vector<RecordedEvent>& events,
                                   const Playing& playing) {
  Comparison comparison(old, playing);
  comparison.compare(events);
  SessionNames names(old);
  std::vector<ExpectedEvent> lines;
  for (std::size_t index = 0; index < events.size(); ++index) {
    const RecordedEvent& event = events[index];
    if (const ExpectedEvent* line = comparison.matches()[index]; line != nullptr) {
      lines.push_back(*line);
      continue;
    }
    ExpectedEvent& line = lines.emplace_back();
    line = {"",
            event.script,
            event.backend,
            event.name,
            asExpectation(event.payload, playing),
            asExpectation(event.detail, playing)};
    if (const json session = event.detail.value("session", json()); session.is_number()) {
      const json known = comparison.sessionNameOf(event);
      line.detail["session"] = known.is_null() ? names.nameOf(session) : known;
    }
  }
  return lines;
}

}  // namespace tarn::scenario
