// SPDX-License-Identifier: Apache-2.0
// The Rtc worker on the machine's own queues, with completions from other threads at any time; run under
// ThreadSanitizer as well.
#include <gtest/gtest.h>
#include <poll.h>

#include <atomic>
#include <filesystem>
#include <random>

#include "host/loop/LinuxWorkQueues.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"
#include "telemetry/rtc/TarnReportingSessionRtcWorker.h"
#include "testing/FakePlatform.h"
#include "tests/host/Eventually.h"
#include "tests/host/loop/SteadyClock.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

using namespace std::chrono_literals;
using namespace testing;

constexpr std::array kTable{TarnReportingSessionWorkerClass::of<TarnReportingSessionRtcWorker>()};

class RtcStress : public ::testing::Test {
 protected:
  RtcStress() {
    platform_.log.setThreshold(LogLevel::Error);
    TarnReportingInstallFacilities(&facilities_);
    TarnReportingSession::setAllWorkerClasses(kTable);
  }
  ~RtcStress() override { platform_.rtcReporting.completions().dropAll(); }

  static std::shared_ptr<TarnReportingSession> makeSession(std::int64_t reporterID) {
    auto session = TarnReportingSession::initWithID(reporterID, {1});
    session->setServiceType(AudioServiceType::Haptics);
    return session;
  }
  static void send(TarnReportingSession& session, std::int64_t number) {
    session.sendMessage(std::make_shared<TarnReportingSessionMessage>(
        plist::Dictionary{{"n", number}}, AudioEventCategory::Playback, AudioEventType::Start));
  }
  static std::size_t threads() {
    const std::filesystem::directory_iterator tasks("/proc/self/task");
    return static_cast<std::size_t>(std::distance(begin(tasks), end(tasks)));
  }

  FakePlatform platform_;
  SteadyClock clock_;
  // The caller's thread stands in for the server queue.
  linux_host::LinuxWorkQueues queues_{
      clock_, platform_.workQueues.makeSerialQueue("server", platform::QualityOfService::UserInteractive)};
  const platform::Facilities facilities_{.clock = platform_.clock,
                                         .workQueues = queues_,
                                         .conditions = platform_.conditions,
                                         .log = platform_.log,
                                         .tracePoints = platform_.tracePoints,
                                         .deviceProperties = platform_.deviceProperties,
                                         .defaults = platform_.defaults,
                                         .notifications = platform_.notifications,
                                         .processFacts = platform_.processFacts,
                                         .processControl = platform_.processControl,
                                         .tally = platform_.tally,
                                         .fileSystem = platform_.fileSystem,
                                         .localCalendar = platform_.localCalendar,
                                         .randomSource = platform_.randomSource,
                                         .processEnvironment = platform_.processEnvironment,
                                         .commandRunner = platform_.commandRunner,
                                         .rtcReporting = &platform_.rtcReporting};
};

// All start while the service is slow; then each is heard out whole, in its order, by a handful of threads.
TEST_F(RtcStress, AThousandSessionsOnASlowServiceKeepTheirOrder) {
  constexpr std::int64_t kSessions = 1000;
  constexpr std::int64_t kMessages = 10;
  platform_.rtcReporting.completions().delayOn(queues_.makeSerialQueue("service", platform::QualityOfService::Utility),
                                               300ms);
  const std::size_t threadsBefore = threads();
  std::vector<std::shared_ptr<TarnReportingSession>> sessions;
  for (std::int64_t i = 0; i < kSessions; ++i) {
    sessions.push_back(makeSession(i + 1));
    sessions.back()->start();
    for (std::int64_t n = 0; n < kMessages; ++n) {
      send(*sessions.back(), n);
    }
    if (i % 2 == 0) {
      sessions.back()->stop();
    }
    if (i % 3 == 0) {
      sessions.back().reset();
    }
  }
  EXPECT_EQ(threads(), threadsBefore);  // with those of the pool
  ASSERT_TRUE(queues_.settle(60s));
  const auto made = platform_.rtcReporting.sessions();
  ASSERT_EQ(made.size(), 1000U);
  for (const auto& each : made) {
    const auto i = static_cast<std::size_t>(each.sessionInfo["sessionID"].asInt64() - 1);
    ASSERT_EQ(each.messages.size(), static_cast<std::size_t>(kMessages) + (i % 2 == 0 ? 1 : 0));
    for (std::int64_t n = 0; n < kMessages; ++n) {
      ASSERT_EQ(each.messages[static_cast<std::size_t>(n)].payload["n"].asInt64(), n);
    }
    ASSERT_EQ(each.flushes, i % 2 == 0 ? 1U : 0U);
  }
  sessions.clear();
  const auto allReleased = [&] {
    const auto now = platform_.rtcReporting.sessions();
    return std::all_of(now.begin(), now.end(), [](const auto& each) { return each.released; });
  };
  EXPECT_TRUE(eventually(allReleased));
}

// One session whose completion never comes in time holds up no other, though all share four threads.
TEST_F(RtcStress, SessionsThatWaitHoldNoThread) {
  platform_.rtcReporting.completions().set(ReplyFault::Hold);
  std::vector<std::shared_ptr<TarnReportingSession>> waiting;
  for (std::int64_t i = 0; i < 100; ++i) {
    waiting.push_back(makeSession(i + 1));
    waiting.back()->start();
  }
  ASSERT_TRUE(eventually([&] { return platform_.rtcReporting.completions().held() == 100; }));
  platform_.rtcReporting.completions().set(ReplyFault::None);
  const auto other = makeSession(1000);
  other->start();
  send(*other, 1);
  EXPECT_TRUE(eventually([&] { return platform_.rtcReporting.sessions().back().messages.size() == 1; }));
  EXPECT_EQ(platform_.rtcReporting.completions().deliverHeld(), 100U);
  EXPECT_TRUE(queues_.settle(60s));
}

// Sessions that come, are stopped and go at any time, with completions from threads of their own: none, one or two,
// before or after the stop.
TEST_F(RtcStress, CompletionsComeFromAnyThreadAtAnyTime) {
  for (const std::uint64_t seed : testSeeds(1)) {
    SCOPED_TRACE(seedNote(seed));
    std::mt19937 random(seed);
    auto& completions = platform_.rtcReporting.completions();
    std::atomic<bool> over{false};
    std::thread deliverer([&] {
      while (!over) {
        completions.deliverHeld();
        ::poll(nullptr, 0, 1);
      }
    });
    constexpr ReplyFault kFaults[] = {ReplyFault::None, ReplyFault::Hold, ReplyFault::Twice, ReplyFault::OtherThread};
    std::vector<std::shared_ptr<TarnReportingSession>> sessions(20);
    for (int step = 0; step < 4000; ++step) {
      auto& session = sessions[random() % sessions.size()];
      completions.set(kFaults[random() % std::size(kFaults)]);
      if (!session) {
        session = makeSession(step + 1);
        session->start();
      } else if (random() % 8 == 0) {
        session.reset();
      } else if (random() % 4 == 0) {
        session->stop();
        session->start();
      } else {
        send(*session, step);
      }
      if (step % 500 == 0) {
        completions.joinThreads();
      }
    }
    sessions.clear();
    over = true;
    deliverer.join();
    completions.joinThreads();
    completions.deliverHeld();
    // A start task that runs only now has its completion held once more.
    EXPECT_TRUE(eventually([&] {
      completions.deliverHeld();
      completions.joinThreads();
      return queues_.settle(1ms);
    }));
    for (const auto& each : platform_.rtcReporting.sessions()) {
      std::int64_t last = -1;
      for (const auto& sent : each.messages) {
        if (sent.category != 0xFFFF) {
          ASSERT_GT(sent.payload["n"].asInt64(), last);
          last = sent.payload["n"].asInt64();
        }
      }
      ASSERT_TRUE(each.released);
    }
  }
}

}  // namespace
}  // namespace tarn
