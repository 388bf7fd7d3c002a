// SPDX-License-Identifier: Apache-2.0
// A test session on an internal build, with a trace facility, an analysis library and result files in memory.
#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "telemetry/trace/TarnReportingSessionTraceWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

class TraceFixture : public SessionFixture {
 protected:
  using Strings = std::vector<std::string>;
  using Values = std::vector<std::pair<std::string, double>>;

  static constexpr const char* kDescriptions = "/device/probes.plist";
  static constexpr const char* kTrace = "/device/traces/1";
  static constexpr const char* kTemporaryFile = "/device/tmp/temp_perfdata.pdj";
  static constexpr const char* kDirectory = "/device/DiagnosticLogs/Audio/Traces";

  TraceFixture() {
    useWorkers<TarnReportingSessionTraceWorker, ConsumerWorker>();
    platform_.deviceProperties.set("InternalBuild", true);
    platform_.clock.setEpochSeconds(1706707501);  // 2024-01-31 13:25:01 UTC
    platform_.localCalendar.setSecondsEastOfUtc(3600);
    platform_.fileSystem.putFile(kDescriptions, "<plist><dict><key>name</key><string>probe</string></dict></plist>");
    platform_.fileSystem.putFile(kTrace, "a trace");
    putTemporaryFile();
  }

  FakePerformanceTraceService& facility() { return platform_.performanceTrace; }
  // The facility answers while somebody waits.
  void answerInWaits() {
    facility().callbacks().set(ReplyFault::Hold);
    platform_.conditions.onWait([this](auto) {
      facility().callbacks().deliverHeld();
      return WaitEnd::TimesOut;  // unless that signalled
    });
  }

  // What the writer would have written; each move takes it away.
  void putTemporaryFile() { platform_.fileSystem.putFile(kTemporaryFile, "values"); }

  // A session of the service type Test, with descriptions of probes unless the configuration says something else.
  static std::shared_ptr<TarnReportingSession> makeTestSession(plist::Dictionary configuration = {}) {
    auto session = makeSession(4711);
    session->setServiceType(AudioServiceType::Test);
    if (!configuration.contains("TarnReportingSkeinPlistFilePath")) {
      configuration.set(plist::Key("TarnReportingSkeinPlistFilePath"), kDescriptions);
    }
    session->updateConfigurationWithContentsOfConfiguration(&configuration);
    return session;
  }
  // A whole session.
  static void play(plist::Dictionary configuration = {}) {
    const auto session = makeTestSession(std::move(configuration));
    session->start();
    session->stop();
  }
  static TarnReportingSessionWorkerProtocol& workerOf(const TarnReportingSession& session) {
    return *session.workers().messageWorkers().front().worker;
  }

  Strings lines(platform::LogLevel level) const {
    Strings found;
    for (const auto& entry : platform_.log.entries(level)) {
      if (entry.category == "tarnrt") {
        EXPECT_EQ(entry.module, TarnReportingSessionTraceWorker::kClassName);
        found.push_back(entry.message());
      }
    }
    return found;
  }
  Strings errors() const { return lines(platform::LogLevel::Error); }
  std::vector<double> waits() const {
    std::vector<double> seconds;
    for (const auto& timeout : platform_.conditions.timeouts()) {
      seconds.push_back(timeout.count());
    }
    return seconds;
  }
  // The one file that was opened.
  const FakePerfDataWriters::File& file() const {
    EXPECT_EQ(platform_.perfDataWriters.files().size(), 1U);
    return *platform_.perfDataWriters.files().at(0);
  }
  Strings keyVariables() const {
    Strings names;
    EXPECT_EQ(file().extensions.at(0).name, "@tdg-perf.key_variables");
    for (const auto& [name, text] : file().extensions.at(0).members) {
      EXPECT_EQ(text, "[]");
      names.push_back(name);
    }
    return names;
  }

  static platform::SignpostInterval interval(std::string name, double seconds,
                                             std::string subsystem = "sys.oxbow.tarnkit") {
    return {std::move(subsystem), std::move(name), seconds};
  }
  // A probe of signpost intervals with events of these durations.
  static platform::TraceProbe probe(const std::string& name, const std::vector<double>& seconds,
                                    std::vector<platform::TraceProbe> children = {}) {
    platform::TraceProbe made;
    made.name = name;
    made.kind = "SkeinSignpostIntervalProbe";
    made.measuresSignpostIntervals = true;
    for (const double each : seconds) {
      made.events.push_back(interval("event of " + name, each));
    }
    made.children = std::move(children);
    return made;
  }
};

}  // namespace tarn::testing
