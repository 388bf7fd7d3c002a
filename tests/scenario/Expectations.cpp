// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/Expectations.h"

#include <filesystem>
#include <fstream>
#include <map>
#include <stdexcept>
#include <utility>

#include "tests/scenario/Notation.h"

namespace tarn::scenario {

namespace {

// The events of one line. Throws what json throws, or std::runtime_error.
std::vector<ExpectedEvent> eventsOf(const json& line, const std::string& origin, const std::string& script) {
  for (const auto& [key, value] : line.items()) {
    if (key != "backend" && key != "name" && key != "payload" && key != "detail") {
      throw std::runtime_error("nobody reads \"" + key + "\"");
    }
  }
  checkNotation(line);
  const json names = line.at("name").is_array() ? line.at("name") : json::array({line.at("name")});
  std::vector<ExpectedEvent> events;
  for (const json& name : names) {
    events.push_back({origin, script, line.at("backend"), name, line.value("payload", json::object()),
                      line.value("detail", json::object())});
  }
  return events;
}

template <class Event>
std::string laneOfAny(const Event& event) {
  if (event.backend == "tally") return event.payload.value("HostApplicationDisplayID", json()).dump();
  if (event.backend == "rtc") return event.detail.value("session", json()).dump();
  return event.backend == kSummaryFiles ? event.name : std::string();
}

bool areAlike(const ExpectedEvent& one, const ExpectedEvent& other) {
  return one.payload == other.payload && one.detail == other.detail;
}

std::string lineOf(const ExpectedEvent& event, const json& names) {
  nlohmann::ordered_json line;
  line["backend"] = event.backend;
  line["name"] = names.size() == 1 ? names.front() : names;
  line["payload"] = event.payload;
  if (!event.detail.empty()) {
    line["detail"] = event.detail;
  }
  return line.dump();
}

}  // namespace

std::string laneOf(const ExpectedEvent& event) {
  return laneOfAny(event);
}

std::string laneOf(const RecordedEvent& event) {
  return laneOfAny(event);
}

std::string fileName(const std::string& path) {
  return std::filesystem::path(path).filename().string();
}

std::string expectationFile(const std::string& script) {
  return std::filesystem::path(script).replace_extension(".expected.jsonl").string();
}

std::vector<ExpectedEvent> readExpectations(const std::string& script) {
  const std::string path = expectationFile(script);
  std::ifstream file(path);
  std::vector<ExpectedEvent> events;
  std::string text;
  for (std::size_t number = 1; std::getline(file, text); ++number) {
    const std::string origin = fileName(path) + ":" + std::to_string(number);
    try {
      for (ExpectedEvent& event : eventsOf(json::parse(text), origin, fileName(script))) {
        events.push_back(std::move(event));
      }
    } catch (const std::exception& trouble) {
      throw std::runtime_error(origin + ": " + trouble.what());
    }
  }
  return events;
}

void writeExpectations(const std::string& script, const std::vector<ExpectedEvent>& events) {
  std::map<std::pair<std::string, std::string>, std::vector<ExpectedEvent>> lanes;
  for (const ExpectedEvent& event : events) {
    lanes[{event.backend, laneOf(event)}].push_back(event);
  }
  std::ofstream file(expectationFile(script), std::ios::trunc);
  for (const auto& [key, lane] : lanes) {
    for (auto event = lane.begin(); event != lane.end();) {
      const ExpectedEvent& first = *event;
      json names = json::array();
      for (; event != lane.end() && areAlike(first, *event); ++event) {
        names.push_back(event->name);
      }
      file << lineOf(first, names) << '\n';
    }
  }
  if (!file.flush()) throw std::runtime_error(expectationFile(script) + ": can't be written");
}

}  // namespace tarn::scenario
