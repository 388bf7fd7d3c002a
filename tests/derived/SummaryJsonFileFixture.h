// SPDX-License-Identifier: Apache-2.0
// A session whose summary file goes to files in memory, at a fixed moment in a fixed zone.
#pragma once

#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "derived/TarnReportingSessionSummaryJsonFileWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

using nlohmann::json;

class SummaryJsonFileFixture : public SessionFixture {
 protected:
  static constexpr const char* kDirectory = "/device/DiagnosticLogs/Audio/Reporting";

  SummaryJsonFileFixture() {
    useWorkers<TarnReportingSessionSummaryJsonFileWorker, ConsumerWorker>();
    platform_.clock.setEpochSeconds(1706707501);  // 2024-01-31 13:25:01 UTC
    platform_.localCalendar.setSecondsEastOfUtc(3600);
  }

  static std::shared_ptr<TarnReportingSession> makeTestSession() {
    auto session = makeSession(4711);
    session->setServiceType(AudioServiceType::Test);
    return session;
  }
  static void configure(TarnReportingSession& session, const plist::ValueView& application) {
    const plist::Dictionary configuration{{"HostApplicationDisplayID", application}};
    session.updateConfigurationWithContentsOfConfiguration(&configuration);
  }
  // A period with nothing but its markers.
  static void stopAndStart(TarnReportingSession& session) {
    session.start();
    session.stop();
  }

  static std::string pathOf(const std::string& name) { return std::string(kDirectory) + "/" + name; }
  std::string contentOf(const std::string& path) const {
    return platform_.fileSystem.content(path).value_or("no file");
  }
  // The content of the one file that there is.
  std::string onlyFile() const {
    const auto files = platform_.fileSystem.files();
    EXPECT_EQ(files.size(), 1U);
    return files.empty() ? std::string() : contentOf(files.front());
  }
  static std::string golden(const std::string& name) {
    std::ostringstream content;
    content << std::ifstream(std::string(TARN_GOLDEN_FILES) + "/" + name, std::ios::binary).rdbuf();
    return content.str();
  }
  // The member of each object, in order; every object has one.
  static std::vector<std::string> memberNames(const std::string& file) {
    std::vector<std::string> names;
    for (const json& object : json::parse(file)) {
      EXPECT_EQ(object.size(), 1U);
      names.push_back(object.begin().key());
    }
    return names;
  }
  // What the worker logged at a level.
  std::vector<std::string> ownLines(platform::LogLevel level) const {
    std::vector<std::string> lines;
    for (const auto& entry : platform_.log.entries(level)) {
      if (entry.module == TarnReportingSessionSummaryJsonFileWorker::kClassName) {
        lines.push_back(entry.message());
      }
    }
    return lines;
  }
};

}  // namespace tarn::testing
