// SPDX-License-Identifier: Apache-2.0
// What the diagnostic workers add to the intake of a message that none of them wants, which is nearly every one: all
// together and each alone, on an internal build with all of their settings on. In this process.
#include <algorithm>
#include <array>
#include <memory>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "bench/Intake.h"
#include "bench/Measure.h"
#include "bench/Processes.h"
#include "bench/SessionPlatform.h"
#include "bench/figures/Figures.h"
#include "diagnostics/TarnReportingSessionDPWorker.h"
#include "diagnostics/TarnReportingSessionMemoryLogWorker.h"
#include "diagnostics/TarnReportingSessionTattleWorker.h"
#include "diagnostics/TarnReportingSessionWattlogWorker.h"
#include "diagnostics/pylon/TarnReportingSessionPylonWorker.h"
#include "diagnostics/snare/TarnReportingSessionSnareWorker.h"
#include "diagnostics/snare/WorkerInstanceState.h"
#include "session/TarnReportingSession.h"

namespace tarn::bench {

namespace {

constexpr double kTargetNanoseconds = 150;
constexpr std::size_t kWindows = 40;
// The Tattle worker looks at no message of a session's first 5 seconds: these last ten.
constexpr std::size_t kWarm = 10 * Feeder::kWindow;
constexpr std::size_t kHolders = 2;  // instances of the Snare worker that can hold a message without firing

// As they stand in the table of the service.
constexpr std::array kWorkers{TarnReportingSessionWorkerClass::of<TarnReportingSessionWattlogWorker>(),
                              TarnReportingSessionWorkerClass::of<TarnReportingSessionMemoryLogWorker>(),
                              TarnReportingSessionWorkerClass::of<TarnReportingSessionPylonWorker>(),
                              TarnReportingSessionWorkerClass::of<TarnReportingSessionSnareWorker>(),
                              TarnReportingSessionWorkerClass::of<TarnReportingSessionDPWorker>(),
                              TarnReportingSessionWorkerClass::of<TarnReportingSessionTattleWorker>()};
using Classes = std::span<const TarnReportingSessionWorkerClass>;
constexpr Classes kAll(kWorkers);

struct Figure {
  const char* name;
  Classes workers;
  bool held;  // whether the instances of the Snare worker hold a last message to compare with
};

constexpr std::array kFigures{
    Figure{"diagnostic workers, added to a message that none wants", kAll, false},
    Figure{"Wattlog worker alone, added", kAll.subspan(0, 1), false},
    Figure{"memory log worker alone, added", kAll.subspan(1, 1), false},
    Figure{"Pylon worker alone, added", kAll.subspan(2, 1), false},
    Figure{"Snare worker alone, added", kAll.subspan(3, 1), false},
    Figure{"DP worker alone, added", kAll.subspan(4, 1), false},
    Figure{"Tattle worker alone, added", kAll.subspan(5, 1), false},
    Figure{"diagnostic workers, added, last messages held", kAll, true},
    Figure{"Snare worker alone, added, last messages held", kAll.subspan(3, 1), true},
};

// The Snare worker of the session, null without one.
const TarnReportingSessionSnareWorker* snareWorkerOf(const TarnReportingSession& session) {
  for (const auto& member : session.workers().messageWorkers()) {
    if (const auto* snare = dynamic_cast<const TarnReportingSessionSnareWorker*>(member.worker.get())) return snare;
  }
  return nullptr;
}

std::size_t messagesHeld(const TarnReportingSession& session) {
  const TarnReportingSessionSnareWorker* const snare = snareWorkerOf(session);
  if (snare == nullptr) return 0;
  return static_cast<std::size_t>(
      std::count_if(snare->instances().begin(), snare->instances().end(),
                    [](const auto& member) { return member.instance->workerState().lastMessage != nullptr; }));
}

// A message for the instance that counts leaks of haptics, and one for the instance that counts low alarms.
void sendWanted(TarnReportingSession& session) {
  plist::Dictionary leak = makeMessage(1);
  leak.set("Haptic_Active_Hardware_Time_Seconds", 90);
  plist::Dictionary low = makeMessage(2);
  low.set("issue_type", "LowRMS");
  session.sendMessage(std::make_shared<TarnReportingSessionMessage>(std::move(leak), AudioEventCategory::Playback,
                                                                    AudioEventType::Wattlog));
  session.sendMessage(std::make_shared<TarnReportingSessionMessage>(std::move(low), AudioEventCategory::Error,
                                                                    AudioEventType::IssueDetector));
}

// A session with these workers, and playback states for it.
class Intake {
 public:
  explicit Intake(Classes workers) : session_(makeWith(workers)), feeder_(*session_, AudioEventType::State) {
    if (session_->workers().messageWorkers().size() != workers.size()) {
      fail("a diagnostic worker declined");
    }
  }

  TarnReportingSession& session() { return *session_; }
  void warm() { feeder_.fillTo(kWarm); }
  double measure() { return feeder_.measure(); }

 private:
  static std::shared_ptr<TarnReportingSession> makeWith(Classes workers) {
    TarnReportingSession::setAllWorkerClasses(workers);
    return makeSession(AudioServiceType::Alarms);  // so that low alarms interest the Snare worker
  }

  const std::shared_ptr<TarnReportingSession> session_;
  Feeder feeder_;
};

// Nanoseconds of a message without the workers, then what they add: the median of the differences of windows that
// follow one another.
std::vector<double> measureAdded(const Figure& figure, std::size_t windows) {
  SessionPlatform platform(Tally::WantsNothing);
  platform.offerDiagnostics();
  Intake without({});
  Intake with(figure.workers);
  without.warm();
  with.warm();
  // After the first of the others: a key list remembers the first list that was made of it, which has to be theirs.
  if (figure.held) {
    sendWanted(with.session());
  }
  if (messagesHeld(with.session()) != (figure.held ? kHolders : 0)) {
    fail("the instances of the Snare worker hold other messages than they should");
  }
  Samples plain;
  Samples added;
  for (std::size_t i = 0; i < windows; ++i) {
    // Who comes first changes, as the second finds the caches warmer.
    const double first = i % 2 == 0 ? without.measure() : with.measure();
    const double second = i % 2 == 0 ? with.measure() : without.measure();
    plain.push_back(i % 2 == 0 ? first : second);
    added.push_back(i % 2 == 0 ? second - first : first - second);
  }
  return {median(plain), median(added)};
}

}  // namespace

void measureDiagnostics(const Settings& settings, Table& table) {
  std::array<Samples, kFigures.size()> plain;
  std::array<Samples, kFigures.size()> added;
  for (int round = 0; round < settings.rounds; ++round) {
    for (std::size_t i = 0; i < kFigures.size(); ++i) {
      const auto values = measureInChild([&] { return measureAdded(kFigures[i], settings.count(kWindows) + 1); });
      plain[i].push_back(values.at(0));
      added[i].push_back(values.at(1));
    }
  }
  for (std::size_t i = 0; i < kFigures.size(); ++i) {
    const double ours = median(added[i]);
    const double theirs = median(plain[i]);
    Row row{kFigures[i].name, nanoseconds(ours), "intake without " + nanoseconds(theirs), times(ours / theirs), "", {}};
    if (kFigures[i].workers.size() == kAll.size()) {
      row.target = "<= 150 ns";
      table.addWithTarget(row, ours, kTargetNanoseconds);
    } else {
      table.add(row);
    }
  }
}

}  // namespace tarn::bench
