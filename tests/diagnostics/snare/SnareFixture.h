// SPDX-License-Identifier: Apache-2.0
// Sessions with the Snare worker alone, on an internal build of a device with haptics.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "diagnostics/snare/TarnReportingSessionSnareWorker.h"
#include "diagnostics/snare/TarnReportingSnareProcessState.h"
#include "diagnostics/snare/WorkerInstanceState.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

class SnareFixture : public SessionFixture {
 protected:
  using Worker = TarnReportingSessionSnareWorker;
  using Session = std::shared_ptr<TarnReportingSession>;
  using Message = std::shared_ptr<TarnReportingSessionMessage>;
  using Kind = FakeSnareService::Kind;

  SnareFixture() {
    platform_.deviceProperties.set("InternalBuild", true);
    platform_.deviceProperties.set("haptics", true);
    useWorkers<Worker>();
  }

  static Session startedSession(AudioServiceType type, std::int64_t reporterID = 7,
                                TarnReportingSession::Mode mode = TarnReportingSession::Mode::Ordinary) {
    Session session = makeSession(reporterID, mode);
    session->setServiceType(type);
    session->setClientProcessName("player");
    session->start();
    return session;
  }
  // The session's Snare worker; null when it declined.
  static Worker* workerOf(const Session& session) {
    const auto& workers = session->workers().messageWorkers();
    return workers.empty() ? nullptr : static_cast<Worker*>(workers.front().worker.get());
  }
  static std::vector<std::string> instanceNamesOf(const Session& session) {
    std::vector<std::string> names;
    for (const Worker::Member& member : workerOf(session)->instances()) {
      names.emplace_back(member.instanceClass.name);
    }
    return names;
  }
  // The state of the session's instance of this class.
  static WorkerInstanceState& stateOf(const Session& session, std::string_view instanceName) {
    for (const Worker::Member& member : workerOf(session)->instances()) {
      if (member.instanceClass.name == instanceName) return member.instance->workerState();
    }
    ADD_FAILURE() << "no instance of " << instanceName;
    static WorkerInstanceState none;
    return none;
  }

  // Messages of the three faults; `n` makes the payload differ from others.
  static Message hapticLeak(int n) {
    return message({{"Haptic_Active_Hardware_Time_Seconds", 90}, {"n", n}}, AudioEventCategory::Playback,
                   AudioEventType::Wattlog);
  }
  static Message stuckSound(int n) {
    return message({{"System_Sound_Stuck_Time_Seconds", 30}, {"n", n}}, AudioEventCategory::Output,
                   AudioEventType::Wattlog);
  }
  static Message lowRms(int n) {
    return message({{"issue_type", "LowRMS"}, {"n", n}}, AudioEventCategory::Error, AudioEventType::IssueDetector);
  }
  static void sendLowRms(const Session& session, int count) {
    for (int n = 0; n < count; ++n) {
      session->sendMessage(lowRms(n));
    }
  }

  std::vector<FakeSnareService::Call> calls() const { return platform_.snare.calls(); }
  // Whether this line was logged in the Snare worker's category.
  bool logged(LogLevel level, std::string_view module, std::string_view text) const {
    for (const RecordingLog::Entry& entry : platform_.log.entries(level)) {
      if (entry.category == "tarnrb" && entry.module == module && entry.message() == text) return true;
    }
    return false;
  }

  static constexpr std::string_view kWorker = "TarnReportingSessionSnareWorker";
  static constexpr std::string_view kHapticLeaks = "TarnReportingSnareWorkerInstanceHapticLeaks";
  static constexpr std::string_view kSSSLeaks = "TarnReportingSnareWorkerInstanceSSSLeaks";
  static constexpr std::string_view kAlarmLowRMS = "TarnReportingSnareWorkerInstanceAlarmLowRMS";
  static constexpr std::string_view kMurmur = "TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue";
};

}  // namespace tarn::testing
