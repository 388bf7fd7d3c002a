// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/Recorded.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <regex>
#include <stdexcept>
#include <thread>
#include <utility>

#include "plist/formats/Json.h"
#include "recorder/store/reading/EventReader.h"

namespace tarn::scenario {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPause{20};

Clock::time_point deadlineIn(double seconds) {
  return Clock::now() + std::chrono::ceil<Clock::duration>(std::chrono::duration<double>(seconds));
}

}  // namespace

std::vector<RecordedEvent> recordedEvents(const std::string& stateDirectory, std::int64_t after) {
  std::vector<RecordedEvent> events;
  recorder::EventReader reader(stateDirectory + "/recorder.sqlite3");
  recorder::EventQuery query;
  query.after = after;
  Result<recorder::EventPage> page;
  do {
    page = reader.read(query);
    if (page.failed()) throw std::runtime_error("can't read the recorder: " + page.error->text);
    for (const recorder::EventRow& row : page.value.rows) {
      events.push_back({row.id, row.backend, row.name, json::parse(row.payload), json::parse(row.detail)});
    }
    query.after = page.value.lookedUpTo;
  } while (page.value.more);
  return events;
}

std::vector<RecordedEvent> summaryFiles(const std::string& stateDirectory) {
  // TIME-ID-APPLICATION-SERVICE.json, with a number at the end when the name was taken.
  static const std::regex pattern(R"(\d{8}-\d{6}[+-]\d{4}-(.*?)(-\d+)?)");
  const std::filesystem::path directory = stateDirectory + "/DiagnosticLogs/Audio/Reporting";
  std::vector<std::filesystem::path> paths;
  if (std::filesystem::exists(directory)) {
    for (const auto& entry : std::filesystem::directory_iterator(directory)) {
      paths.push_back(entry.path());
    }
  }
  std::sort(paths.begin(), paths.end(), [](const auto& one, const auto& other) { return one.stem() < other.stem(); });
  std::vector<RecordedEvent> files;
  for (const auto& path : paths) {
    std::ifstream file(path, std::ios::binary);
    const std::string text(std::istreambuf_iterator<char>(file), {});
    json content = json::parse(text, nullptr, false);
    // The number of lines tells whether it is printed as it must be.
    const json payload = {{"lines", std::count(text.begin(), text.end(), '\n')},
                          {"content", content.is_discarded() ? json(text) : std::move(content)}};
    const std::string stem = path.stem().string();
    std::smatch parts;
    const bool isNamed = path.extension() == ".json" && std::regex_match(stem, parts, pattern);
    files.push_back({0, kSummaryFiles, isNamed ? parts[1].str() : path.filename().string(), payload});
  }
  return files;
}

std::vector<RecordedEvent> repliesTo(const std::string& script, const std::string& outputPath) {
  std::multimap<std::size_t, RecordedEvent> replies;
  std::ifstream file(outputPath);
  for (std::string text; std::getline(file, text);) {
    const json reply = json::parse(text);
    const auto line = reply.at("line").get<std::size_t>();
    const json& error = reply.at("error");
    replies.insert(
        {line,
         {0, kReplies, std::to_string(line) + " " + reply.at("op").get<std::string>(),
          error.is_null() ? json{{"result", reply.at("result")}} : json{{"error", error}}, json::object(), script}});
  }
  std::vector<RecordedEvent> ordered;
  for (const auto& [line, reply] : replies) {
    ordered.push_back(reply);
  }
  return ordered;
}

ServiceWatch::ServiceWatch(const std::string& socket, double patienceSeconds) {
  const auto deadline = deadlineIn(patienceSeconds);
  while (!client_) {
    auto connected = client::ClientConnection::connect(socket);
    client_ = std::move(connected.value);
    if (!client_ && Clock::now() > deadline) {
      throw std::runtime_error("the service can't be reached: " + connected.error->text);
    }
    if (!client_) {
      std::this_thread::sleep_for(kPause);
    }
  }
}

json ServiceWatch::ledgerAtRest(double patienceSeconds, std::size_t leastEvents) {
  const auto deadline = deadlineIn(patienceSeconds);
  while (true) {
    const client::Reply reply = client_->call(client::status());
    if (!reply.ok()) throw std::runtime_error("the service doesn't tell its status: " + reply.error.text);
    std::string text;
    plist::appendJson(text, reply.dictionary());
    json ledger = json::parse(text);
    const bool isAtRest = ledger.value("queued", 1) == 0 && ledger.value("recorder_waiting", 1) == 0 &&
                          ledger.value("connections_open", 0) == 1;
    if (isAtRest && (ledger.value("recorder_committed", std::size_t{0}) >= leastEvents || Clock::now() > deadline)) {
      return ledger;
    }
    if (Clock::now() > deadline) throw std::runtime_error("the service doesn't come to rest: " + ledger.dump());
    std::this_thread::sleep_for(kPause);
  }
}

}  // namespace tarn::scenario
