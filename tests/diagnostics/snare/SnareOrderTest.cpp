// SPDX-License-Identifier: Apache-2.0
// What an instance does across the log, the capture service and its state, in order.
#include <algorithm>
#include <thread>

#include "diagnostics/snare/TarnReportingSnareWorkerInstanceAlarmLowRMS.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceHapticLeaks.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceSSSLeaks.h"
#include "tests/diagnostics/snare/SnareFixture.h"

namespace tarn {
namespace {

using namespace testing;

class SnareOrder : public SnareFixture {
 protected:
  // The entries from the making of the reporter on, with what the observer adds to one.
  std::vector<std::string> entries() const {
    std::vector<std::string> found = platform_.order.entries();
    found.erase(found.begin(), std::find(found.begin(), found.end(), "snare reporter"));
    std::erase_if(found, [](const std::string& entry) {
      return entry.starts_with("log TarnReportingSession") || entry.starts_with("log Interested");
    });
    return found;
  }
  // Whether the state's capture was set already when this was logged.
  void watchIdentifier(const WorkerInstanceState& state, std::string line) {
    platform_.order.start([this, &state, line = std::move(line)](const std::string& entry) {
      if (entry.starts_with("log " + line)) {
        identifierThen_ = state.currentSnareSessionIdentifier->get().value_or("none");
      }
    });
  }

  std::string identifierThen_ = "not logged";
};

TEST_F(SnareOrder, AHapticLeakIsAskedForThenAnsweredThenAccepted) {
  const Session session = startedSession(AudioServiceType::Haptics);
  session->sendMessage(hapticLeak(1));
  watchIdentifier(stateOf(session, kHapticLeaks), "Started Snare session for haptics leaks.");
  session->sendMessage(hapticLeak(2));
  EXPECT_EQ(entries(), (std::vector<std::string>{"snare reporter", "snare snapshot",
                                                 "log Started Snare session. sessionId=capture-1",
                                                 "log Started Snare session for haptics leaks. sessionId=capture-1 "
                                                 "response={success = 1; sessionIdentifier = capture-1}",
                                                 "log Parameters to Snare session accepted."}));
  EXPECT_EQ(identifierThen_, "capture-1");
}

TEST_F(SnareOrder, AStuckSoundIsAskedForThenAnsweredThenAccepted) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  watchIdentifier(stateOf(session, kSSSLeaks), "Started Snare session for system sound server leaks.");
  session->sendMessage(stuckSound(1));
  EXPECT_EQ(entries(), (std::vector<std::string>{
                           "snare reporter", "snare snapshot", "log Started Snare session. sessionId=capture-1",
                           "log Started Snare session for system sound server leaks. sessionId=capture-1 "
                           "response={success = 1; sessionIdentifier = capture-1}",
                           "log Parameters to Snare session accepted."}));
  EXPECT_EQ(identifierThen_, "capture-1");
}

TEST_F(SnareOrder, AStuckSoundIsAskedForUnderTheLockWithTheLimitBegun) {
  const Session session = startedSession(AudioServiceType::SystemSounds);
  TarnReportingSnareProcessState::RateLimit& limit = TarnReportingSnareProcessState::shared()->systemSoundRateLimit();
  std::optional<double> lastFire;
  bool locked = false;
  platform_.order.start([&](const std::string& entry) TARN_UNCHECKED {  // by whoever holds the lock
    if (entry == "snare snapshot") {
      lastFire = limit.lastFire;
      std::thread([&] {
        if (limit.lock.tryLock()) {
          limit.lock.unlock();
        } else {
          locked = true;
        }
      }).join();
    }
  });
  session->sendMessage(stuckSound(1));
  EXPECT_EQ(lastFire, now());
  EXPECT_TRUE(locked);
}

TEST_F(SnareOrder, AnAlarmIsAskedForThenAnsweredThenAcceptedAndCancelledAfterItsLine) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 2);
  watchIdentifier(stateOf(session, kAlarmLowRMS), "Started Snare session for alarm Low RMS.");
  session->sendMessage(lowRms(2));
  EXPECT_EQ(entries(), (std::vector<std::string>{
                           "snare reporter", "snare start", "log Started Snare session. sessionId=capture-1",
                           "log Started Snare session for alarm Low RMS. sessionId=capture-1 timeout=60.000000 "
                           "response={success = 1; sessionIdentifier = capture-1}",
                           "log Parameters to Snare session for alarm Low RMS accepted. Will fire if not cancelled. "
                           "timeout=60.000000."}));
  EXPECT_EQ(identifierThen_, "capture-1");
  platform_.order.start();
  workerOf(session)->stop();
  EXPECT_EQ(platform_.order.entries(),
            (std::vector<std::string>{
                "log Stop called. Cancelling Snare session for alarm Low RMS. sessionId=capture-1 timeout=60.000000",
                "snare cancel capture-1"}));
}

TEST_F(SnareOrder, AReplyOfNothingIsToldAsNothing) {
  platform_.snare.replyNextWith(std::nullopt);
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  EXPECT_TRUE(logged(LogLevel::Info, kAlarmLowRMS,
                     "Started Snare session for alarm Low RMS. sessionId=NONE_RETURNED timeout=60.000000 "
                     "response=(null)"));
  platform_.snare.replyNextWith(std::nullopt);
  session->sendMessage(stuckSound(1));
  EXPECT_TRUE(logged(LogLevel::Info, kSSSLeaks,
                     "Started Snare session for system sound server leaks. sessionId=NONE_RETURNED response=(null)"));
  platform_.snare.replyNextWith(std::nullopt);
  session->sendMessage(hapticLeak(1));
  session->sendMessage(hapticLeak(2));
  EXPECT_TRUE(logged(LogLevel::Info, kHapticLeaks,
                     "Started Snare session for haptics leaks. sessionId=NONE_RETURNED response=(null)"));
}

TEST_F(SnareOrder, AnInstanceBehindItsSessionAsksForNothing) {
  const std::weak_ptr<TarnReportingSession> gone = makeSession();
  ASSERT_TRUE(gone.expired());
  const Message any = lowRms(1);
  const auto state = std::make_shared<WorkerInstanceState>();
  state->symptomReporter = platform_.snare.createReporter();
  TarnReportingSnareWorkerInstanceAlarmLowRMS alarm(gone, state);
  TarnReportingSnareWorkerInstanceHapticLeaks haptics(gone, state);
  TarnReportingSnareWorkerInstanceSSSLeaks sounds(gone, state, TarnReportingSnareProcessState::shared());
  EXPECT_FALSE(alarm.interestedInMessage(*any));
  alarm.fire(*any);
  haptics.fire(*any);
  sounds.fire(*any);
  EXPECT_TRUE(calls().empty());
  TarnReportingSnareProcessState::RateLimit& limit = TarnReportingSnareProcessState::shared()->systemSoundRateLimit();
  const MutexLock lock(limit.lock);
  EXPECT_FALSE(limit.lastFire);
}

}  // namespace
}  // namespace tarn
