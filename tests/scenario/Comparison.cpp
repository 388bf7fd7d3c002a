// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/Comparison.h"

#include <algorithm>
#include <iterator>
#include <map>

namespace tarn::scenario {

namespace {

constexpr const char* kMirrors = "rtc";

std::string differenceOf(const ExpectedEvent& line, const RecordedEvent& event, const Playing& playing) {
  if (line.name != event.name) return "the name is " + event.name + ", not " + line.name;
  std::string difference = differenceOf("payload", line.payload, event.payload, playing);
  return difference.empty() ? differenceOf("detail", line.detail, event.detail, playing) : difference;
}

template <class Event>
std::string shown(const Event& event) {
  return event.backend + " " + event.name + " " + event.payload.dump() +
         (event.detail.empty() ? std::string() : " " + event.detail.dump());
}

}  // namespace

Comparison::Comparison(const std::vector<ExpectedEvent>& expected, const Playing& playing) : playing_(playing) {
  for (const ExpectedEvent& line : expected) {
    laneFor(line).lines.push_back(&line);
  }
}

Comparison::Lane& Comparison::laneFor(const ExpectedEvent& line) {
  const std::string name = laneOf(line);
  const auto found = std::find_if(lanes_.begin(), lanes_.end(), [&](const Lane& lane) {
    return lane.backend == line.backend && lane.script == line.script && lane.name == name;
  });
  return found != lanes_.end() ? *found : lanes_.emplace_back(Lane{line.backend, line.script, name, {}});
}

void Comparison::compare(const std::vector<RecordedEvent>& events) {
  for (const RecordedEvent& event : events) {
    place(event);
  }
  for (Lane& lane : lanes_) {
    skipTo(lane, lane.lines.size());
  }
}

// The lane that has to skip the fewest lines gets it.
void Comparison::place(const RecordedEvent& event) {
  Lane* best = nullptr;
  std::size_t fewest = SIZE_MAX;
  for (Lane& lane : lanes_) {
    const std::size_t most = mayHold(lane, event) ? std::min(fewest, lane.lines.size() - lane.next) : 0;
    for (std::size_t skipped = 0; skipped < most; ++skipped) {
      if (differenceOf(*lane.lines[lane.next + skipped], event, playing_).empty()) {
        best = &lane;
        fewest = skipped;
        break;
      }
    }
  }
  if (best == nullptr) {
    matches_.push_back(nullptr);
    differences_.push_back("extra: " + shown(event) + nearestDifference(event));
    return;
  }
  skipTo(*best, best->next + fewest);
  matches_.push_back(best->lines[best->next++]);
  if (event.backend == kMirrors) {
    best->session = event.detail.value("session", json());
  }
}

bool Comparison::mayHold(const Lane& lane, const RecordedEvent& event) const {
  if (lane.backend != event.backend || (!event.script.empty() && lane.script != event.script)) return false;
  if (event.backend != kMirrors) return lane.name == laneOf(event);
  const json session = event.detail.value("session", json());
  const bool isKnown =
      std::any_of(lanes_.begin(), lanes_.end(), [&](const Lane& one) { return one.session == session; });
  return isKnown ? lane.session == session : lane.session.is_null();
}

void Comparison::skipTo(Lane& lane, std::size_t line) {
  for (; lane.next < line; ++lane.next) {
    differences_.push_back(lane.lines[lane.next]->origin + ": missing: " + shown(*lane.lines[lane.next]));
  }
}

// Why the next line of the same name didn't get it.
std::string Comparison::nearestDifference(const RecordedEvent& event) const {
  for (const Lane& lane : lanes_) {
    if (lane.next < lane.lines.size() && mayHold(lane, event) && lane.lines[lane.next]->name == event.name) {
      const ExpectedEvent& line = *lane.lines[lane.next];
      return " (" + line.origin + ": " + differenceOf(line, event, playing_) + ")";
    }
  }
  return {};
}

json Comparison::sessionNameOf(const RecordedEvent& event) const {
  const auto lane = std::find_if(lanes_.begin(), lanes_.end(), [&](const Lane& one) {
    return !one.session.is_null() && one.session == event.detail.value("session", json());
  });
  return lane == lanes_.end() ? json() : lane->lines.front()->detail.at("session");
}

void Comparison::compareLedger(const json& ledger, std::size_t messages, std::size_t events) {
  const std::map<std::string, json> expected = {{"messages_received", messages},
                                                {"recorder_handed_over", events},
                                                {"recorder_committed", events},
                                                {"recorder_waiting", 0},
                                                {"recorder_failed", 0},
                                                {"queued", 0},
                                                {"requests_refused", json::object()},
                                                {"connections_cut", json::object()}};
  for (const auto& [name, value] : expected) {
    json found = ledger.value(name, json());
    // A reason that was counted zero times is as good as none.
    for (auto reason = found.begin(); found.is_object() && reason != found.end();) {
      reason = *reason == 0 ? found.erase(reason) : std::next(reason);
    }
    if (found != value) {
      differences_.push_back("ledger: " + name + " is " + found.dump() + ", not " + value.dump());
    }
  }
}

}  // namespace tarn::scenario
