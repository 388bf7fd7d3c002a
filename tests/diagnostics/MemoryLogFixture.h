// SPDX-License-Identifier: Apache-2.0
// Sessions with the memory-log worker, tools that print what a test says, and what the worker logged of it.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "diagnostics/TarnReportingSessionMemoryLogWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

class MemoryLogFixture : public SessionFixture {
 protected:
  using CommandEnd = platform::CommandEnd;
  using Strings = std::vector<std::string>;
  using Worker = TarnReportingSessionMemoryLogWorker;

  static constexpr const char* kResources = "/usr/local/bin/restop";
  static constexpr const char* kZones = "/usr/bin/zonetally -l";

  MemoryLogFixture() {
    useWorkers<Worker, ConsumerWorker>();
    runToolsDuringWaits();
  }

  void runToolsDuringWaits() {
    platform_.conditions.onWait([this](auto) {
      platform_.runUntilIdle();
      return WaitEnd::TimesOut;
    });
  }
  static std::shared_ptr<TarnReportingSession> startedSession(AudioServiceType type = AudioServiceType::Test,
                                                              std::int64_t reporterID = 7) {
    auto session = makeSession(reporterID);
    session->setServiceType(type);
    session->start();
    return session;
  }
  static void request(TarnReportingSession& session, plist::Dictionary payload = {}) {
    session.sendMessage(message(std::move(payload), AudioEventCategory::Generic, AudioEventType::MemoryLog));
  }
  void describe(const char* command, std::string output, CommandEnd end = {}) {
    platform_.commandRunner.describe(command, {std::move(output), end, {}});
  }
  std::size_t runs() const { return platform_.commandRunner.runs().size(); }
  // The lines of the worker, which are those without a module.
  Strings lines() const {
    Strings found;
    for (const auto& entry : platform_.log.entries()) {
      if (entry.module.empty()) {
        EXPECT_EQ(entry.subsystem, "sys.oxbow.tarnkit");
        EXPECT_EQ(entry.category, "tarnrr");
        EXPECT_EQ(entry.level, LogLevel::Error);
        found.push_back(entry.text);
      }
    }
    return found;
  }
  // The blocks, and the lines that are none.
  Strings blocks() const {
    Strings found = lines();
    std::erase_if(found, [](const std::string& line) { return !line.starts_with("WIRED LOG BLOCK "); });
    return found;
  }
  Strings notes() const {
    Strings found = lines();
    std::erase_if(found, [](const std::string& line) { return line.starts_with("WIRED LOG BLOCK "); });
    return found;
  }
  // The blocks of a request when the tool prints this and the other one nothing.
  Strings blocksOf(const char* command, const std::string& output) {
    describe(kResources, "");
    describe(kZones, "");
    describe(command, output);
    platform_.log.clear();
    platform_.clock.advance(std::chrono::seconds(6));
    request(*startedSession());
    return blocks();
  }
};

}  // namespace tarn::testing
