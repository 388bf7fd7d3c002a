// The worker on the recorder's capture service, whose own thread replies while sessions stop and go. For the
// sanitizers.
#include <cstdio>
#include <random>

#include "platform/linux/LinuxRandomSource.h"
#include "platform/recorder/Recorder.h"
#include "platform/recorder/RecorderSnareService.h"
#include "tests/diagnostics/SnareFixture.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn {
namespace {

using namespace testing;

class SnareReplyStress : public SnareFixture {
 protected:
  SnareReplyStress() : seed_(std::random_device{}()), random_(seed_) {
    std::printf("seed %u\n", seed_);
    platform_.log.setThreshold(LogLevel::Info);  // handlers log while the queue does
    options_.file = directory_.path() / "recorder.sqlite3";
    recorder_ = std::make_unique<recorder::Recorder>(options_, recorderLog_, platform_.clock);
    recorder_->start();
    service_ =
        std::make_unique<recorder::RecorderSnareService>(*recorder_, platform_.clock, randomSource_, std::nullopt);
    platform_.facilities().snare = service_.get();
  }
  unsigned below(unsigned bound) { return static_cast<unsigned>(random_() % bound); }
  std::string count(const std::string& name) {
    return recorder::askOne(options_.file, "SELECT count(*) FROM events WHERE name = '" + name + "'");
  }

  const unsigned seed_;
  std::mt19937 random_;
  recorder::TemporaryDirectory directory_;
  recorder::RecorderOptions options_;
  RecordingLog recorderLog_;
  linux_host::LinuxRandomSource randomSource_;
  std::unique_ptr<recorder::Recorder> recorder_;
  std::unique_ptr<recorder::RecorderSnareService> service_;
};

TEST_F(SnareReplyStress, RepliesMeetStopsRestartsAndTheEndOfSessions) {
  constexpr int kSessions = 400;
  for (int i = 0; i < kSessions; ++i) {
    Session session = startedSession(AudioServiceType::Alarms, i + 2);
    sendLowRms(session, 3);
    session->sendMessage(hapticLeak(2 * i));
    session->sendMessage(hapticLeak(2 * i + 1));
    session->sendMessage(stuckSound(i));
    platform_.clock.advance(std::chrono::seconds(15));
    for (unsigned stops = below(3); stops > 0; --stops) {
      session->stop();
      session->start();
    }
    if (below(20) == 0) TarnReportingSnareProcessState::reset();
    session.reset();  // released without a stop
  }
  service_.reset();  // waits for the handler that runs; what it didn't come to is dropped
  ASSERT_TRUE(recorder_->flush(recorder::kPatience));
  EXPECT_EQ(count("startSession"), std::to_string(kSessions));
  EXPECT_EQ(count("requestSnapshot"), std::to_string(2 * kSessions));
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
