#include "tests/scenario/SummaryFiles.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <map>
#include <regex>
#include <sstream>

namespace tarn::scenario {

namespace {

constexpr const char* kMessagePrefix = "sys.oxbow.tarnkit.";
constexpr const char* kUptimeEvent = "sys.oxbow.tarnkit.tarnreportingclientuptime";

// TIME-ID-APPLICATION-SERVICE.json, with a number behind when the name was taken.
bool isNamedFor(const std::string& name, const ExpectedFile& expected) {
  static const std::regex pattern(R"(\d{8}-\d{6}[+-]\d{4}-(.*?)(-\d+)?\.json)");
  std::smatch parts;
  std::string application = expected.application;
  std::replace(application.begin(), application.end(), '/', '_');
  return std::regex_match(name, parts, pattern) &&
         parts[1] == std::to_string(expected.reporterID) + "-" + application + "-" + expected.service;
}

double stampOf(const RecordedEvent* event) {
  return event->payload.value("tarnreporting_timestamp", 0.0);
}

// What the events of one application tell of messages: each is there twice, once under the common name.
std::vector<const RecordedEvent*> messagesOf(const std::string& application, const std::vector<RecordedEvent>& events) {
  std::vector<const RecordedEvent*> messages;
  for (const RecordedEvent& event : events) {
    if (event.backend == "tally" && event.name.starts_with(kMessagePrefix) && event.name != kUptimeEvent &&
        event.payload.value("HostApplicationDisplayID", std::string()) == application) {
      messages.push_back(&event);
    }
  }
  return messages;
}

// The member's name for the next message of this kind: its category and type, and a number from 1.
std::string nextMember(const RecordedEvent& event, std::map<std::string, int>& counts) {
  std::string kind = event.name.substr(std::string(kMessagePrefix).size());
  std::replace(kind.begin(), kind.end(), '.', '_');
  return kind + "_" + std::to_string(++counts[kind]);
}

bool isMarker(const std::string& name, const json& message) {
  return (name == "Setup_Start_1" && message.value("method", json()) == "start") ||
         (name == "Setup_Stop_1" && message.value("method", json()) == "stop");
}

}  // namespace

SummaryFiles::SummaryFiles(const std::string& stateDirectory) {
  const std::filesystem::path directory = stateDirectory + "/DiagnosticLogs/Audio/Reporting";
  if (!std::filesystem::exists(directory)) {
    return;
  }
  for (const auto& entry : std::filesystem::directory_iterator(directory)) {
    std::ostringstream content;
    content << std::ifstream(entry.path(), std::ios::binary).rdbuf();
    files_.push_back({entry.path().string(), entry.path().filename().string(), content.str()});
  }
  const auto stemOf = [](const File& file) { return std::filesystem::path(file.name).stem().string(); };
  std::sort(files_.begin(), files_.end(),
            [&](const File& left, const File& right) { return stemOf(left) < stemOf(right); });
}

void SummaryFiles::compare(const std::vector<Expectation>& expectations, const std::vector<RecordedEvent>& events) {
  std::map<std::string, std::size_t> used;  // how many of an application's messages are in earlier files
  for (const Expectation& expectation : expectations) {
    for (const ExpectedFile& expected : expectation.files) {
      const auto file = std::find_if(files_.begin(), files_.end(),
                                     [&](const File& one) { return !one.isClaimed && isNamedFor(one.name, expected); });
      Messages messages = messagesOf(expected.application, events);
      const std::size_t from = std::min(used[expected.application], messages.size());
      const std::size_t to = std::min(from + expected.received + expected.made, messages.size());
      used[expected.application] = to;
      if (file == files_.end()) {
        differences_.push_back(expectation.script + ": no summary file of reporter " +
                               std::to_string(expected.reporterID) + ", " + expected.service);
        continue;
      }
      file->isClaimed = true;
      const auto at = [&messages](std::size_t index) { return messages.begin() + static_cast<std::ptrdiff_t>(index); };
      compareFile(*file, expected, Messages(at(from), at(to)));
    }
  }
  for (const File& file : files_) {
    if (!file.isClaimed) {
      differences_.push_back("extra: the summary file " + file.name);
    }
  }
}

void SummaryFiles::compareFile(const File& file, const ExpectedFile& expected, Messages messages) {
  const auto differs = [&](const std::string& how) { differences_.push_back(file.name + ": " + how); };
  const json written = json::parse(file.content, nullptr, false);
  if (!written.is_array() || !file.content.starts_with("[\n{\n  \"") || !file.content.ends_with("\n}\n]\n")) {
    differs("not the lines of a pretty-printed array");
    return;
  }
  const auto received = messages.begin() + static_cast<std::ptrdiff_t>(std::min(expected.received, messages.size()));
  std::stable_sort(messages.begin(), received,
                   [](const auto* one, const auto* other) { return stampOf(one) < stampOf(other); });
  std::map<std::string, int> counts;
  std::size_t markers = 0;
  std::size_t beforeStart = 0;
  std::size_t next = 0;
  for (const json& object : written) {
    if (!object.is_object() || object.size() != 1) {
      differs("an element that is no object of one member: " + object.dump());
      return;
    }
    const std::string& name = object.begin().key();
    json message = object.begin().value();
    const json isStarted = message.value("isSessionStarted", json());
    message.erase("isSessionStarted");
    if (isMarker(name, message)) {
      ++markers;
      continue;
    }
    if (next == messages.size()) {
      differs(name + " is in no event");
      return;
    }
    const RecordedEvent& event = *messages[next++];
    beforeStart += isStarted == "NO" ? 1U : 0U;
    if (const std::string wanted = nextMember(event, counts); name != wanted) {
      differs(name + " is where " + wanted + " must be");
    } else if (message != event.payload || (isStarted != "YES" && isStarted != "NO")) {
      differs(name + " is " + object.begin().value().dump() + ", the recorder has " + event.payload.dump());
    }
  }
  if (next != messages.size() || markers != 2 || beforeStart != expected.beforeStart) {
    differs(std::to_string(next) + " messages and " + std::to_string(markers) + " markers, " +
            std::to_string(beforeStart) + " before the start; expected " + std::to_string(messages.size()) +
            ", 2 and " + std::to_string(expected.beforeStart));
  }
}

void SummaryFiles::print() const {
  constexpr int kLinesShown = 14;
  std::printf("summary files\n");
  for (const File& file : files_) {
    std::printf("  %s: %zu lines\n", file.path.c_str(),
                static_cast<std::size_t>(std::count(file.content.begin(), file.content.end(), '\n')));
    std::istringstream lines(file.content);
    std::string line;
    for (int shown = 0; shown < kLinesShown && std::getline(lines, line); ++shown) {
      std::printf("    %s\n", line.c_str());
    }
    if (lines.peek() != std::char_traits<char>::eof()) {
      std::printf("    ...\n");
    }
  }
}

}  // namespace tarn::scenario
