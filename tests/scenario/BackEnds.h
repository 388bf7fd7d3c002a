// BackEnds: what back-ends must receive that no model works out, as data beside a script (NAME.backends.jsonl), and its
// comparison with what they did receive. All but the analytics and the real-time-communication reporting one are such.
//
// Scripts are played at once, so the events of a back-end are an interleaving of what each script leads to. A lane is
// what keeps its order in it: a script's lines of one back-end and, where they say so, of one "lane". Each event goes
// to the lane whose next line it matches; one that no lane waits for is extra, a line that got none is missing.
#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "tests/scenario/Recorded.h"
#include "tests/scenario/ScriptData.h"

namespace tarn::scenario {

struct BackEndLine {
  std::string origin;  // FILE:LINE
  std::string script;
  std::string backend;
  std::string lane;
  std::string name;
  json payload = json::object();  // the members that are compared
  json detail = json::object();
  bool exact = false;     // no other members may be there
  std::size_t times = 1;  // so many such events, one after the other
};

// The lines beside `script`. Throws std::runtime_error with the line for one that can't be read.
std::vector<BackEndLine> backEndLines(const std::string& script);

class BackEndComparison {
 public:
  explicit BackEndComparison(std::vector<BackEndLine> lines) : lines_(std::move(lines)) {}

  // Once. Leaves events that a model works out alone.
  void compare(const std::vector<RecordedEvent>& events);

  const std::vector<std::string>& differences() const { return differences_; }
  // How many events were found where they must be.
  std::size_t matched() const { return matched_; }
  // How many there must be.
  std::size_t expected() const;

 private:
  struct Lane {
    std::vector<const BackEndLine*> lines;
    std::size_t next = 0;
    std::size_t taken = 0;  // events of the next line
  };
  using LaneKey = std::tuple<std::string, std::string, std::string>;  // back-end, script, lane
  using SessionKey = std::pair<std::string, std::string>;             // back-end, the session that the detail tells

  void place(const RecordedEvent& event);
  bool mayHold(const LaneKey& key, const RecordedEvent& event) const;
  void take(const LaneKey& key, std::size_t line, const RecordedEvent& event);
  void miss(const BackEndLine& line, std::size_t count);
  std::string nearestDifference(const RecordedEvent& event) const;

  const std::vector<BackEndLine> lines_;
  std::map<LaneKey, Lane> lanes_;
  std::map<SessionKey, LaneKey> sessions_;  // which lane's a session is, once one of its events was placed
  std::vector<std::string> differences_;
  std::size_t matched_ = 0;
};

}  // namespace tarn::scenario
