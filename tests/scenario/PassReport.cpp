// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/PassReport.h"

#include <cstdio>
#include <fstream>
#include <map>
#include <stdexcept>

namespace tarn::scenario {

namespace {

// For people who don't know the names.
std::string meaningOf(const std::string& backend) {
  static const std::map<std::string, std::string> meanings = {
      {"tally", "analytics"},       {"rtc", "mirrored sessions"}, {"wattlog", "power log"},
      {"pylon", "device metrics"},  {"snare", "bug capture"},     {"tattle", "prompts to file a bug"},
      {"gyre", "traces of stacks"}, {kReplies, "replies"},        {kSummaryFiles, "summary files"}};
  const auto found = meanings.find(backend);
  return found == meanings.end() ? backend : found->second;
}

}  // namespace

void printPassReport(const std::string& summary, const std::vector<RecordedEvent>& events) {
  std::map<std::string, std::size_t> counts;
  for (const RecordedEvent& event : events) {
    ++counts[event.backend];
  }
  std::string line;
  for (const auto& [backend, count] : counts) {
    line += (line.empty() ? "" : ", ") + meaningOf(backend) + " (" + backend + ") " + std::to_string(count);
  }
  std::printf("%s\n    %s\n", summary.c_str(), line.c_str());
}

void writeDetails(const std::string& path, const std::string& summary, const std::vector<std::string>& differences,
                  const std::vector<RecordedEvent>& events, const std::vector<const ExpectedEvent*>& matches) {
  std::ofstream file(path, std::ios::app);
  file << "== " << summary << '\n';
  for (const std::string& difference : differences) {
    file << "difference: " << difference << '\n';
  }
  for (std::size_t index = 0; index < events.size(); ++index) {
    const RecordedEvent& event = events[index];
    file << (matches[index] == nullptr ? "not expected" : matches[index]->origin) << ": " << event.backend << ' '
         << event.name << ' ' << event.payload.dump();
    if (!event.detail.empty()) {
      file << ' ' << event.detail.dump();
    }
    file << '\n';
  }
  if (!file.flush()) throw std::runtime_error(path + ": can't be written");
}

}  // namespace tarn::scenario
