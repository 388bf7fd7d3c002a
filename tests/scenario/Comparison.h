// SPDX-License-Identifier: Apache-2.0
// Comparison: sets what arrived against what must arrive, and says of each difference exactly what it is.
//
// Scripts are played at once, so the events of a back-end are a mixture of what each script leads to. The lines of a
// script are lanes (see laneOf), each with an order of its own. An event goes to the lane whose next line it matches;
// one that no lane waits for is extra, a line that got none is missing. A session of the reporting service that mirrors
// sessions stays in the lane that got its first event.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "tests/scenario/Expectations.h"
#include "tests/scenario/Notation.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

class Comparison {
 public:
  // `expected` outlives it.
  Comparison(const std::vector<ExpectedEvent>& expected, const Playing& playing);

  // Once.
  void compare(const std::vector<RecordedEvent>& events);
  // The service's own counts: so many messages were sent, so many events recorded, and nothing else happened.
  void compareLedger(const json& ledger, std::size_t messages, std::size_t events);

  const std::vector<std::string>& differences() const { return differences_; }
  // After compare(): for each event the line that it matched; null for an extra one.
  const std::vector<const ExpectedEvent*>& matches() const { return matches_; }
  // After compare(): the name that the lines give to the session of an event; null when none of its events matched.
  json sessionNameOf(const RecordedEvent& event) const;

 private:
  struct Lane {
    std::string backend;
    std::string script;
    std::string name;
    std::vector<const ExpectedEvent*> lines;
    std::size_t next = 0;
    json session{};  // the number of the session whose events are here; null until the first came
  };

  Lane& laneFor(const ExpectedEvent& line);
  void place(const RecordedEvent& event);
  bool mayHold(const Lane& lane, const RecordedEvent& event) const;
  void skipTo(Lane& lane, std::size_t line);
  std::string nearestDifference(const RecordedEvent& event) const;

  const Playing playing_;
  std::vector<Lane> lanes_;
  std::vector<const ExpectedEvent*> matches_;
  std::vector<std::string> differences_;
};

}  // namespace tarn::scenario
