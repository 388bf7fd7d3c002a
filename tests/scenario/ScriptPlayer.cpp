// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/ScriptPlayer.h"

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <utility>

#include "tests/scenario/Expectations.h"

namespace tarn::scenario {

namespace {

constexpr const char* kDirectory = "@DIRECTORY@";

std::string contentOf(const std::string& path) {
  std::ifstream file(path);
  if (!file) throw std::runtime_error(path + ": can't be read");
  return {std::istreambuf_iterator<char>(file), {}};
}

std::string replaced(std::string text, const std::string& what, const std::string& with) {
  for (std::size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + with.size())) {
    text.replace(at, what.size(), with);
  }
  return text;
}

}  // namespace

ScriptPlayer::ScriptPlayer(Service service, std::string directory)
    : service_(std::move(service)), directory_(std::move(directory)) {
  copies_ = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
  if (::mkdtemp(copies_.data()) == nullptr) throw std::runtime_error("can't make a temporary directory");
}

ScriptPlayer::~ScriptPlayer() {
  std::error_code ignored;
  std::filesystem::remove_all(copies_, ignored);
}

bool ScriptPlayer::play(const std::vector<std::string>& scripts) {
  std::vector<ScriptProcess> processes;
  processes.reserve(scripts.size());
  for (const std::string& script : scripts) {
    const std::string copy = copies_ + "/" + fileName(script);
    std::ofstream(copy) << replaced(contentOf(script), kDirectory, directory_);
    processes.emplace_back(service_, copy, copies_);
  }
  bool succeeded = true;
  for (ScriptProcess& process : processes) {
    const int status = process.wait();
    if (status != 0) {
      succeeded = false;
      std::fprintf(stderr, "scenario: %s ended with status %d: %s\n", process.script().c_str(), status,
                   contentOf(process.complaintsPath()).c_str());
    }
  }
  return succeeded;
}

std::vector<RecordedEvent> ScriptPlayer::replies(const std::string& script) const {
  return repliesTo(fileName(script), copies_ + "/" + fileName(script) + ".replies");
}

std::size_t ScriptPlayer::messagesOf(const std::string& script) const {
  std::size_t count = 0;
  std::ifstream file(script);
  for (std::string line; std::getline(file, line);) {
    count += json::parse(line).value("op", std::string()) == "sendMessage" ? 1U : 0U;
  }
  return count;
}

std::vector<RecordedEvent> withoutDirectory(std::vector<RecordedEvent> events, const std::string& directory) {
  for (RecordedEvent& event : events) {
    for (json* value : {&event.payload, &event.detail}) {
      if (const std::string text = value->dump(); !directory.empty() && text.find(directory) != std::string::npos) {
        *value = json::parse(replaced(text, directory, kDirectory));
      }
    }
  }
  return events;
}

}  // namespace tarn::scenario
