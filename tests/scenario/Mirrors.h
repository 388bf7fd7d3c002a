// Mirrors: what the real-time-communication reporting service received, set against the sessions of the scripts: one
// session there for each period, one event for each message, and at the end one event that joins all of them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "tests/scenario/Model.h"
#include "tests/scenario/PayloadRules.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

// How many events the sessions of these scripts lead to.
std::size_t mirrorEvents(const std::vector<Expectation>& expectations);

class MirrorComparison {
 public:
  MirrorComparison(const std::vector<Expectation>& expectations, PayloadRules rules, bool internalBuild)
      : expectations_(expectations), rules_(std::move(rules)), internalBuild_(internalBuild) {}

  // Once. Of the events only those of the service are looked at. The order counts within each of its sessions; the
  // sessions of one reporter ID and type must come in the order of its starts.
  void compare(const std::vector<RecordedEvent>& events);
  // Shows to stdout each session with its events. After compare().
  void print() const;

  const std::vector<std::string>& differences() const { return differences_; }
  // How many events were found where they must be.
  std::size_t matched() const { return matched_; }

 private:
  using Events = std::vector<const RecordedEvent*>;  // of one session there
  void compareSession(const std::string& where, const ExpectedMirror& expected, const Events& found);
  std::string differenceOfInfo(const ExpectedMirror& expected, const RecordedEvent& found) const;
  std::string differenceOfMessage(const ExpectedEvent& expected, const RecordedEvent& found) const;
  std::string differenceOfSummary(const ExpectedMirror& expected, const Events& messages,
                                  const RecordedEvent& found) const;

  const std::vector<Expectation>& expectations_;
  const PayloadRules rules_;
  const bool internalBuild_;
  std::map<std::int64_t, Events> sessions_;  // by the service's numbers
  std::vector<std::string> differences_;
  std::size_t matched_ = 0;
};

}  // namespace tarn::scenario
