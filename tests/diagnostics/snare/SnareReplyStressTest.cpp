// SPDX-License-Identifier: Apache-2.0
// The worker on the recorder's capture service, whose own queue replies while sessions stop and go. For the
// sanitizers.
#include <random>

#include "host/loop/LinuxWorkQueues.h"
#include "host/machine/LinuxRandomSource.h"
#include "recorder/Recorder.h"
#include "recorder/RecorderSnareService.h"
#include "tests/diagnostics/snare/SnareFixture.h"
#include "tests/host/loop/SteadyClock.h"
#include "tests/recorder/RecorderFixture.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace testing;

class SnareReplyStress : public SnareFixture {
 protected:
  SnareReplyStress() {
    platform_.log.setThreshold(LogLevel::Info);  // handlers log while the queue does
    options_.file = directory_.path() / "recorder.sqlite3";
    recorder_ = std::make_unique<recorder::Recorder>(options_, recorderLog_, platform_.clock);
    recorder_->start();
    service_ = std::make_unique<recorder::RecorderSnareService>(*recorder_, platform_.clock, randomSource_, workQueues_,
                                                                std::nullopt);
    platform_.facilities().snare = service_.get();
  }
  std::string count(const std::string& name) {
    return recorder::askOne(options_.file, "SELECT count(*) FROM events WHERE name = '" + name + "'");
  }

  recorder::TemporaryDirectory directory_;
  recorder::RecorderOptions options_;
  RecordingLog recorderLog_;
  linux_host::LinuxRandomSource randomSource_;
  std::unique_ptr<recorder::Recorder> recorder_;
  SteadyClock steady_;
  linux_host::LinuxWorkQueues workQueues_{steady_, nullptr};
  std::unique_ptr<recorder::RecorderSnareService> service_;
};

TEST_F(SnareReplyStress, RepliesMeetStopsRestartsAndTheEndOfSessions) {
  // Two rounds of three requests each: no more than may wait for their replies when none comes meanwhile.
  constexpr int kSessions = recorder::RecorderSnareService::kMostWaitingReplies / 6;
  int sessions = 0;
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    std::mt19937 random(seed);
    sessions += kSessions;
    for (int i = 0; i < kSessions; ++i) {
      Session session = startedSession(AudioServiceType::Alarms, i + 2);
      sendLowRms(session, 3);
      session->sendMessage(hapticLeak(2 * i));
      session->sendMessage(hapticLeak(2 * i + 1));
      session->sendMessage(stuckSound(i));
      platform_.clock.advance(std::chrono::seconds(15));
      for (auto stops = random() % 3; stops > 0; --stops) {
        session->stop();
        session->start();
      }
      session.reset();  // released without a stop
    }
    ASSERT_TRUE(recorder_->flush(recorder::kPatience));  // its queue takes one round
  }
  service_.reset();  // waits for the handler that runs; what it didn't come to is dropped
  ASSERT_TRUE(recorder_->flush(recorder::kPatience));
  EXPECT_EQ(count("startSession"), std::to_string(sessions));
  EXPECT_EQ(count("requestSnapshot"), std::to_string(2 * sessions));
  EXPECT_FALSE(platform_.log.contains("not accepted"));
}

TEST_F(SnareReplyStress, TheServiceMayGoBeforeItsSessions) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  platform_.facilities().snare = nullptr;
  service_.reset();
  session->stop();
  session->start();
  ASSERT_TRUE(recorder_->flush(recorder::kPatience));
  EXPECT_EQ(count("startSession"), "1");
}

TEST_F(SnareReplyStress, AStopBehindTheReplyCancelsWhatWasReplied) {
  const Session session = startedSession(AudioServiceType::Alarms);
  sendLowRms(session, 3);
  WorkerInstanceState& state = stateOf(session, kAlarmLowRMS);
  ASSERT_TRUE(recorder::eventually([&] { return state.currentSnareSessionIdentifier->get().has_value(); }));
  session->stop();
  ASSERT_TRUE(recorder_->flush(recorder::kPatience));
  EXPECT_EQ(recorder::askOne(options_.file, "SELECT detail ->> 'session' FROM events WHERE name = 'cancelSession'"),
            *state.currentSnareSessionIdentifier->get());
}

}  // namespace
}  // namespace tarn
