// SPDX-License-Identifier: Apache-2.0
// RtcFixture: sessions with an Rtc worker, and what the reporting service was given.
#pragma once

#include <string>
#include <vector>

#include "service/vocabulary/TarnReportingVocabulary.h"
#include "telemetry/rtc/TarnReportingSessionRtcWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

class RtcFixture : public SessionFixture {
 protected:
  using RtcSession = FakeRtcReportingService::Session;
  using RtcMessage = FakeRtcReportingService::Message;
  using Texts = std::vector<std::string>;

  RtcFixture() { useWorkers<TarnReportingSessionRtcWorker>(); }

  static std::shared_ptr<TarnReportingSession> makeTyped(
      AudioServiceType type, TarnReportingSession::Mode mode = TarnReportingSession::Mode::Ordinary) {
    auto session = makeSession(7, mode);
    session->setServiceType(type);
    return session;
  }
  // A started session, its start task run.
  std::shared_ptr<TarnReportingSession> startSession(AudioServiceType type = AudioServiceType::Haptics) {
    auto session = makeTyped(type);
    session->start();
    platform_.runUntilIdle();
    return session;
  }
  static TarnReportingSessionRtcWorker& workerOf(const TarnReportingSession& session) {
    return dynamic_cast<TarnReportingSessionRtcWorker&>(*session.workers().messageWorkers().front().worker);
  }
  RtcSession onlySession() const {
    const auto sessions = platform_.rtcReporting.sessions();
    EXPECT_EQ(sessions.size(), 1U);
    return sessions.empty() ? RtcSession() : sessions.front();
  }
  // What was logged in the worker's category, with its level: "default waiting to find backends".
  Texts lines() const {
    Texts texts;
    for (const auto& entry : platform_.log.entries()) {
      if (entry.category == "tarnri") {
        EXPECT_EQ(entry.module, "TarnReportingSessionRtcWorker");
        texts.push_back(nameOf(entry.level) + " " + entry.message());
      }
    }
    return texts;
  }
  std::size_t count(const std::string& line) const {
    const Texts all = lines();
    return static_cast<std::size_t>(std::count(all.begin(), all.end(), line));
  }

 private:
  static std::string nameOf(LogLevel level) {
    switch (level) {
      case LogLevel::Debug:
        return "debug";
      case LogLevel::Info:
        return "info";
      case LogLevel::Default:
        return "default";
      case LogLevel::Error:
        return "error";
    }
    return "?";
  }
};

}  // namespace tarn::testing
