// Comparison: sets the analytics events, the ledger and the replies against what must be there, and says of each
// difference exactly what it is.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "tests/scenario/Model.h"
#include "tests/scenario/PayloadRules.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

class Comparison {
 public:
  Comparison(const std::vector<Expectation>& expectations, const Circumstances& circumstances)
      : expectations_(expectations), rules_(circumstances) {}

  // Each adds what differs to differences(). Of the events only those of the tally back-end are looked at.
  void compareEvents(const std::vector<RecordedEvent>& events);
  void compareLedger(const json& ledger, std::size_t eventCount);
  // `replies`: what the client that played the script printed.
  void compareReplies(const Expectation& expectation, const std::vector<json>& replies);

  const std::vector<std::string>& differences() const { return differences_; }
  // How many events were found where they must be.
  std::size_t matched() const { return matched_; }

 private:
  using Lane = std::vector<const RecordedEvent*>;
  void compareLane(const std::string& application, const std::vector<ExpectedEvent>& expected, const Lane& found);
  void compareUptimes(const Lane& found);
  std::string differenceOf(const ExpectedEvent& expected, const RecordedEvent& found) const;

  const std::vector<Expectation>& expectations_;
  const PayloadRules rules_;
  std::vector<std::string> differences_;
  std::size_t matched_ = 0;
};

}  // namespace tarn::scenario
