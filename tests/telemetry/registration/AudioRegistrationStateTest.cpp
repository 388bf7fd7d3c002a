// SPDX-License-Identifier: Apache-2.0
// The audio-registration worker's life, and the moments that outlive it.
#include "tests/telemetry/registration/AudioRegistrationFixture.h"

namespace tarn {
namespace {

using namespace testing;

TEST_F(AudioRegistration, ConstructionForASessionAlwaysFailsAndSaysSo) {
  platform_.log.clear();
  EXPECT_EQ(TarnReportingSessionAudioRegistrationWorker::initWithSession(session_), nullptr);
  const auto entries = platform_.log.entries();
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_EQ(entries[0].message(), "TarnReportingSessionAudioRegistrationWorker unsupported");
  EXPECT_EQ(entries[0].level, platform::LogLevel::Debug);
  EXPECT_EQ(entries[0].category, "tarnrz");
}

TEST_F(AudioRegistration, StartSaysSoAndRuns) {
  platform_.log.clear();
  EXPECT_TRUE(worker_->start());
  EXPECT_TRUE(worker_->started());
  EXPECT_EQ(messages(), (std::vector<std::string>{"Starting TarnReportingSessionAudioRegistrationWorker"}));
}

TEST_F(AudioRegistration, EveryLineHasItsLevelAndItsModule) {
  const auto lines = [this] {
    std::vector<std::string> texts;
    for (const auto& entry : platform_.log.entries()) {
      EXPECT_EQ(entry.category, "tarnrz");
      const bool isDefault = entry.level == platform::LogLevel::Default;
      EXPECT_TRUE(isDefault || entry.level == platform::LogLevel::Debug) << entry.message();
      texts.push_back((isDefault ? "default " : "debug ") + std::string(entry.module) + ": " +
                      entry.message().substr(0, 20));
    }
    platform_.log.clear();
    return texts;
  };
  platform_.accessories.add(buds(now()));
  platform_.log.clear();
  worker_->start();
  handle(kBuds);
  const std::string ours = "TarnReportingSessionAudioRegistrationWorker: ";
  EXPECT_EQ(lines(), (std::vector<std::string>{
                         "debug " + ours + "Starting TarnReporti", "debug " + ours + "Time to next BT Enum",
                         "debug BTAccess: BTAccess initialize", "debug BaseUnit: BaseUnit initialize",
                         "default BaseUnit: Enumerate Bluetooth!"}));
  platform_.defaults.set(kSuite, kNextKey, now() - 1);
  worker_->stop();
  const std::string publication = "TarnReportingRegistrationPublication: ";
  EXPECT_EQ(lines(), (std::vector<std::string>{
                         "debug " + ours + "Stopping TarnReporti", "default " + ours + "Time to next Invocat",
                         "debug " + ours + "We could publish", "debug " + ours + "At least one active ",
                         "debug " + ours + "entering rtcreportin", "default " + publication + "RTCReportingAgent fa",
                         "debug " + publication + "Message Sent->"}));
}

TEST_F(AudioRegistration, StartIsToldBeforeTheWorkerRuns) {
  std::vector<bool> running;
  platform_.order.start([&](const std::string& entry) {
    if (entry == "log Starting TarnReportingSessionAudioRegistrationWorker") {
      running.push_back(worker_->started());
    }
  });
  worker_->start();
  EXPECT_EQ(running, (std::vector<bool>{false}));
}

TEST_F(AudioRegistration, MomentsAreLoadedOnce) {
  handle(kBuds);
  platform_.defaults.set(kSuite, kCheckKey, now() + kDay);
  platform_.advance(std::chrono::seconds(60));
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 2U);
  platform_.defaults.set(kSuite, kNextKey, now() + 10);
  EXPECT_EQ(state_->nextInvocationEpoch(), now() + 10);
  platform_.defaults.set(kSuite, kNextKey, now() + 20);
  EXPECT_EQ(state_->nextInvocationEpoch(), now() + 10);
}

TEST_F(AudioRegistration, CheckOutlivesARestart) {
  handle(kBuds);
  forgetState();
  platform_.advance(std::chrono::seconds(30));
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
}

TEST_F(AudioRegistration, StopBeforeAnyEnumerationEnds) {
  platform_.log.clear();
  worker_->stop();
  EXPECT_EQ(messages(), (std::vector<std::string>{"Stopping TarnReportingSessionAudioRegistrationWorker",
                                                  "There have been no BT enumerations. Skip further processing"}));
  EXPECT_TRUE(platform_.defaults.writes().empty());
}

TEST_F(AudioRegistration, FirstEverStopSchedulesWithinAWeek) {
  enumerate({buds(now())});
  platform_.randomSource.push(604799);
  worker_->stop();
  EXPECT_EQ(platform_.randomSource.bounds(), (std::vector<std::uint64_t>{604800}));
  EXPECT_EQ(stored(kNextKey), now() + 604799);
  EXPECT_EQ(messages().back(), "Current Epoch: 1750000000.000000; nextInvocationEpoch is 1750604799.000000");
  EXPECT_TRUE(backendSessions().empty());
}

TEST_F(AudioRegistration, ScheduleOutlivesARestart) {
  platform_.defaults.set(kSuite, kNextKey, now() + 43200);
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(messages(), (std::vector<std::string>{"Stopping TarnReportingSessionAudioRegistrationWorker",
                                                  "Time to next Invocation: 43200.000000 seconds / 0.500000 days"}));
  EXPECT_TRUE(platform_.randomSource.bounds().empty());
}

TEST_F(AudioRegistration, NothingIsDueAtTheVeryMoment) {
  platform_.defaults.set(kSuite, kNextKey, now());
  enumerate({buds(now())});
  worker_->stop();
  EXPECT_EQ(platform_.log.count("We could publish"), 0U);
  platform_.advance(std::chrono::milliseconds(1));
  worker_->stop();
  EXPECT_EQ(platform_.log.count("We could publish"), 1U);
}

TEST_F(AudioRegistration, DefaultsOfOtherKindsAreReadAsNumbers) {
  platform_.defaults.set(kSuite, kNextKey, "1750000000.5 or so");
  platform_.defaults.set(kSuite, kCheckKey, plist::Array{1, 2});
  enumerate({buds(now())});
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
  worker_->stop();
  EXPECT_EQ(messages().back(), "Time to next Invocation: 0.500000 seconds / 0.000006 days");
}

TEST_F(AudioRegistration, StoreThatCannotBeWrittenIsLoggedAndTheProcessGoesOn) {
  platform_.defaults.failWrites(true);
  handle(kBuds);
  const auto errors = platform_.log.entries(platform::LogLevel::Error);
  ASSERT_EQ(errors.size(), 2U);
  EXPECT_EQ(errors[0].message(), "failed to store " + std::string(kCheckKey));
  EXPECT_EQ(errors[1].message(), "failed to store " + std::string(kInfoKey));
  EXPECT_EQ(errors[0].module, "TarnReportingRegistrationState");
  handle(kBuds);
  EXPECT_EQ(platform_.accessories.enumerations(), 1U);
}

}  // namespace
}  // namespace tarn
