#include "tests/scenario/BackEnds.h"

#include <stdexcept>

namespace tarn::scenario {

namespace {

// What must be there and isn't; empty when all is. Objects are looked into, so that some members of an inner one can be
// left open too.
std::string differenceOf(const std::string& path, const json& wanted, const json& found) {
  if (!wanted.is_object() || !found.is_object()) {
    return wanted == found ? std::string() : path + " is " + found.dump() + ", not " + wanted.dump();
  }
  for (const auto& [key, value] : wanted.items()) {
    const std::string inner = std::string(path).append(".").append(key);
    if (!found.contains(key)) {
      return inner + " is missing";
    }
    if (std::string difference = differenceOf(inner, value, found.at(key)); !difference.empty()) {
      return difference;
    }
  }
  return {};
}

std::string differenceOf(const BackEndLine& line, const RecordedEvent& event) {
  if (line.name != event.name) {
    return "the name is " + event.name + ", not " + line.name;
  }
  std::string difference = differenceOf("payload", line.payload, event.payload);
  if (difference.empty()) {
    difference = differenceOf("detail", line.detail, event.detail);
  }
  if (difference.empty() && line.exact && (line.payload != event.payload || line.detail != event.detail)) {
    difference = "members beyond those listed are there";
  }
  return difference;
}

std::size_t leavesOf(const json& value) {
  if (!value.is_object()) {
    return 1;
  }
  std::size_t leaves = 0;
  for (const json& inner : value) {
    leaves += leavesOf(inner);
  }
  return leaves;
}

// What has a model of its own.
bool followsFromScript(const std::string& backend) {
  return backend == "tally" || backend == "rtc";
}

// How much a line says: the closer one gets the event that two lanes wait for.
std::size_t weightOf(const BackEndLine& line) {
  return leavesOf(line.payload) + leavesOf(line.detail) + (line.exact ? 1 : 0);
}

std::string shown(const RecordedEvent& event) {
  return event.backend + " event " + std::to_string(event.id) + " " + event.name + " " + event.payload.dump() + " " +
         event.detail.dump();
}

// The session that an event tells of: its number or token in the detail; empty when it tells none.
std::string sessionOf(const RecordedEvent& event) {
  const auto session = event.detail.find("session");
  return session == event.detail.end() ? std::string() : session->dump();
}

}  // namespace

std::vector<BackEndLine> backEndLines(const std::string& script) {
  std::vector<BackEndLine> lines;
  for (const DataLine& line : linesBeside(script, "backends")) {
    allowOnly(line, {"backend", "lane", "name", "payload", "detail", "exact", "times"});
    const json& value = line.value;
    try {
      lines.push_back({line.origin, fileName(script), member(line, "backend"), value.value("lane", std::string()),
                       member(line, "name"), value.value("payload", json::object()),
                       value.value("detail", json::object()), value.value("exact", false),
                       value.value("times", std::size_t{1})});
    } catch (const json::exception& trouble) {
      throw std::runtime_error(line.origin + ": " + trouble.what());
    }
    if (followsFromScript(lines.back().backend)) {
      throw std::runtime_error(line.origin + ": the events of " + lines.back().backend +
                               " follow from the script itself");
    }
  }
  return lines;
}

std::size_t BackEndComparison::expected() const {
  std::size_t count = 0;
  for (const BackEndLine& line : lines_) {
    count += line.times;
  }
  return count;
}

void BackEndComparison::compare(const std::vector<RecordedEvent>& events) {
  for (const BackEndLine& line : lines_) {
    if (line.times > 0) {
      lanes_[{line.backend, line.script, line.lane}].lines.push_back(&line);
    }
  }
  for (const RecordedEvent& event : events) {
    if (!followsFromScript(event.backend)) {
      place(event);
    }
  }
  for (const auto& [key, lane] : lanes_) {
    for (std::size_t index = lane.next; index < lane.lines.size(); ++index) {
      miss(*lane.lines[index], lane.lines[index]->times - (index == lane.next ? lane.taken : 0));
    }
  }
}

// The lane that has to skip the fewest lines gets it, and among those the one whose line says most.
void BackEndComparison::place(const RecordedEvent& event) {
  const LaneKey* best = nullptr;
  std::size_t bestLine = 0;
  std::pair<std::size_t, std::size_t> bestRank;  // smaller is better
  for (const auto& [key, lane] : lanes_) {
    if (!mayHold(key, event)) {
      continue;
    }
    for (std::size_t index = lane.next; index < lane.lines.size(); ++index) {
      const std::pair rank{index - lane.next, SIZE_MAX - weightOf(*lane.lines[index])};
      if ((best == nullptr || rank < bestRank) && differenceOf(*lane.lines[index], event).empty()) {
        best = &key;
        bestLine = index;
        bestRank = rank;
      }
    }
  }
  if (best == nullptr) {
    differences_.push_back("extra: " + shown(event) + nearestDifference(event));
  } else {
    take(*best, bestLine, event);
  }
}

bool BackEndComparison::mayHold(const LaneKey& key, const RecordedEvent& event) const {
  if (std::get<0>(key) != event.backend) {
    return false;
  }
  const auto owner = sessions_.find({event.backend, sessionOf(event)});
  return owner == sessions_.end() || owner->second == key;
}

void BackEndComparison::take(const LaneKey& key, std::size_t line, const RecordedEvent& event) {
  Lane& lane = lanes_.at(key);
  for (; lane.next < line; ++lane.next) {
    miss(*lane.lines[lane.next], lane.lines[lane.next]->times - lane.taken);
    lane.taken = 0;
  }
  ++matched_;
  if (++lane.taken == lane.lines[line]->times) {
    ++lane.next;
    lane.taken = 0;
  }
  if (const std::string session = sessionOf(event); !session.empty()) {
    sessions_.try_emplace({event.backend, session}, key);
  }
}

void BackEndComparison::miss(const BackEndLine& line, std::size_t count) {
  differences_.push_back(line.origin + ": missing: " + line.backend + " " + line.name + " " + line.payload.dump() +
                         " " + line.detail.dump() + (count > 1 ? ", " + std::to_string(count) + " times" : ""));
}

// Why the next line of the same name didn't get it.
std::string BackEndComparison::nearestDifference(const RecordedEvent& event) const {
  for (const auto& [key, lane] : lanes_) {
    if (lane.next < lane.lines.size() && mayHold(key, event) && lane.lines[lane.next]->name == event.name) {
      const BackEndLine& line = *lane.lines[lane.next];
      return " (" + line.origin + ": " + differenceOf(line, event) + ")";
    }
  }
  return {};
}

}  // namespace tarn::scenario
