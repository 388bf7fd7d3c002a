// SPDX-License-Identifier: Apache-2.0
// The worker that brings the device's settings into a session.
#include "derived/TarnReportingSessionSystemMonitorWorker.h"

#include <mutex>
#include <thread>

#include "derived/TarnReportingSystemMonitor.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "tests/session/SessionFixture.h"
#include "tests/session/WorkersOf.h"

namespace tarn {
namespace {

using namespace testing;

constexpr const char* kAccessory = "spatial-audio-accessory-feature";
constexpr const char* kAccessoryChanged = "sys.oxbow.homeshell.spatial-audio-accessory-feature.changed";
constexpr const char* kHomeshell = "sys.oxbow.homeshell";
constexpr const char* kTarnkit = "sys.oxbow.tarnkit";
constexpr const char* kServiceChanged = "sys.oxbow.tarnkit.reporting";
constexpr const char* kRinger = "ringerstate";
constexpr const char* kRingerChanged = "sys.oxbow.homeshell.ringerstate";

class SystemMonitorWorker : public SessionFixture {
 public:
  SystemMonitorWorker() { useWorkers<TarnReportingSessionSystemMonitorWorker, ConsumerWorker>(); }

 protected:
  static void startMonitor() {
    TarnReportingSystemMonitor::initializeWithQueue(TarnReportingUtilityGetReportingServerQueue());
  }
  void change(const char* domain, const char* key, const plist::ValueView& value, const char* notification) {
    platform_.defaults.set(domain, key, value);
    notify(notification);
  }
  void notify(const char* notification, std::optional<std::uint64_t> word = {}) {
    ASSERT_TRUE(platform_.notifications.post(notification, word));
    platform_.runUntilIdle();
  }
  // What the session's consumer got, without what the intake adds to every message.
  static std::vector<plist::Dictionary> received() {
    std::vector<plist::Dictionary> payloads;
    for (const auto& message : script().received) {
      EXPECT_EQ(message->category(), AudioEventCategory::Setup);
      EXPECT_EQ(message->type(), AudioEventType::Setup);
      EXPECT_EQ(message->message()["audiotag"].text(), "SetupSetup");
      plist::Dictionary payload = message->message();
      for (const char* key : {"tarnreporting_timestamp", "invalid_timestamp", "audiotag", "HostApplicationDisplayID"}) {
        EXPECT_TRUE(payload.remove(key)) << key;
      }
      payloads.push_back(payload);
    }
    return payloads;
  }
};

using Payloads = std::vector<plist::Dictionary>;

TEST_F(SystemMonitorWorker, FeatureWithoutAStateAtStartSendsNothing) {
  startMonitor();
  const auto session = makeSession();
  session->start();
  EXPECT_TRUE(script().received.empty());
}

TEST_F(SystemMonitorWorker, StartSendsOneMessagePerKnownFeatureWithLastUpdatedAndNoUptime) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  platform_.defaults.set(kTarnkit, "device_name", "Kitchen");
  platform_.clock.setEpochSeconds(1700000000.5);
  startMonitor();
  platform_.clock.setEpochSeconds(1700000060.0);
  const auto session = makeSession();
  session->start();
  EXPECT_EQ(received(), (Payloads{{{kAccessory, true}, {"last_updated", 1700000000.5}},
                                  {{"device_name", "Kitchen"}, {"last_updated", 1700000000.5}}}));
  for (const auto& message : script().received) {
    EXPECT_EQ(message->message()["tarnreporting_timestamp"].asDouble(), 1700000060.0);
    EXPECT_FALSE(message->message().contains("systemuptime_sec"));
  }
}

TEST_F(SystemMonitorWorker, EachStartSendsTheStatesAnew) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  startMonitor();
  const auto session = makeSession();
  session->start();
  session->stop();
  session->start();
  EXPECT_EQ(received().size(), 2U);
}

TEST_F(SystemMonitorWorker, ChangedSettingDuringASessionSendsExactlyOneMessageWithTheNewValue) {
  platform_.defaults.set(kTarnkit, "device_name", "Kitchen");
  startMonitor();
  const auto session = makeSession();
  session->start();
  script().received.clear();
  platform_.clock.setEpochSeconds(1800000000.25);
  change(kTarnkit, "device_name", "Bath", kServiceChanged);
  EXPECT_EQ(received(), (Payloads{{{"device_name", "Bath"}, {"last_updated", 1800000000.25}}}));
}

TEST_F(SystemMonitorWorker, EachChangeSendsAMessageOfItsOwn) {
  startMonitor();
  const auto session = makeSession();
  session->start();
  for (const std::uint64_t word : {1U, 0U, 1U}) {
    notify(kRingerChanged, word);
  }
  const Payloads payloads = received();
  ASSERT_EQ(payloads.size(), 3U);
  EXPECT_TRUE(payloads[0][kRinger].boolValue());
  EXPECT_FALSE(payloads[1][kRinger].boolValue());
  EXPECT_TRUE(payloads[2][kRinger].boolValue());
}

TEST_F(SystemMonitorWorker, NotificationWithoutAChangeSendsNothing) {
  platform_.defaults.set(kHomeshell, kAccessory, true);
  startMonitor();
  const auto session = makeSession();
  session->start();
  script().received.clear();
  platform_.clock.advance(std::chrono::seconds(5));
  notify(kAccessoryChanged);
  EXPECT_TRUE(script().received.empty());
}

TEST_F(SystemMonitorWorker, AfterStopNoMessageIsSent) {
  startMonitor();
  const auto session = makeSession();
  session->start();
  session->stop();
  notify(kRingerChanged, 1);
  EXPECT_TRUE(script().received.empty());
  EXPECT_EQ(session->totalMessageCount(), 0);
}

TEST_F(SystemMonitorWorker, BeforeStartNoMessageIsSent) {
  startMonitor();
  const auto session = makeSession();
  notify(kRingerChanged, 1);
  EXPECT_EQ(session->totalMessageCount(), 0);
}

TEST_F(SystemMonitorWorker, AfterASecondStartAChangeStillSendsOneMessage) {
  startMonitor();
  const auto session = makeSession();
  session->start();
  session->stop();
  session->start();
  notify(kRingerChanged, 1);
  EXPECT_EQ(received().size(), 1U);
}

TEST_F(SystemMonitorWorker, EverySessionThatRunsGetsItsOwnMessage) {
  startMonitor();
  const auto first = makeSession(1);
  const auto second = makeSession(2);
  const auto idle = makeSession(3);
  first->start();
  second->start();
  notify(kRingerChanged, 1);
  EXPECT_EQ(first->totalMessageCount(), 1);
  EXPECT_EQ(second->totalMessageCount(), 1);
  EXPECT_EQ(idle->totalMessageCount(), 0);
}

// Stops the session as soon as it hears of a setting.
class StoppingWorker : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "StoppingWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<StoppingWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<StoppingWorker>(session);
  }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override { session()->stop(); }
};

TEST_F(SystemMonitorWorker, SessionThatStopsOnAChangeHearsOfNoLaterOne) {
  useWorkers<TarnReportingSessionSystemMonitorWorker, ConsumerWorker, StoppingWorker>();
  startMonitor();
  const auto session = makeSession();
  session->start();
  notify(kRingerChanged, 1);
  notify(kRingerChanged, 0);
  EXPECT_FALSE(session->started());
  EXPECT_EQ(received().size(), 1U);
}

TEST_F(SystemMonitorWorker, SessionDroppedWithoutAStopLeavesNoObserverBehind) {
  startMonitor();
  auto session = makeSession();
  session->start();
  const std::weak_ptr<TarnReportingSession> gone = session;
  session.reset();
  EXPECT_TRUE(gone.expired());
  notify(kRingerChanged, 1);
  EXPECT_TRUE(script().received.empty());
}

TEST_F(SystemMonitorWorker, WorkerDroppedBeforeItsSessionTakesItsObserversAlong) {
  useWorkers<ConsumerWorker>();
  startMonitor();
  const auto session = makeSession();
  session->start();
  auto worker = TarnReportingSessionSystemMonitorWorker::initWithSession(session);
  EXPECT_TRUE(worker->start());
  notify(kRingerChanged, 1);
  EXPECT_EQ(received().size(), 1U);
  worker.reset();
  notify(kRingerChanged, 0);
  EXPECT_EQ(received().size(), 1U);
}

TEST_F(SystemMonitorWorker, WithoutADictionaryThereIsNothingToObserve) {
  useWorkers<ConsumerWorker>();
  const auto session = makeSession();
  session->start();
  TarnReportingSessionSystemMonitorWorker worker(session, nullptr, {kRinger});
  EXPECT_TRUE(worker.start());
  worker.stop();
  EXPECT_TRUE(script().received.empty());
}

TEST_F(SystemMonitorWorker, ObserversDoNotKeepTheDictionaryAlive) {
  startMonitor();
  const std::weak_ptr<TarnReportingSystemMonitorDictionary> dictionary =
      TarnReportingSystemMonitor::getSystemMonitorDictionary();
  auto session = makeSession();
  session->start();
  TarnReportingSystemMonitor::reset();
  EXPECT_FALSE(dictionary.expired());  // the worker's share
  session.reset();
  EXPECT_TRUE(dictionary.expired());
}

TEST_F(SystemMonitorWorker, WithoutAMonitorItRunsAndSendsNothing) {
  const auto session = makeSession();
  session->start();
  ASSERT_EQ(producersOf(*session).size(), 1U);
  EXPECT_TRUE(producersOf(*session).front()->worker->started());
  session->stop();
  EXPECT_TRUE(script().received.empty());
}

TEST_F(SystemMonitorWorker, ValuesOfAnyTypeArePassedOnAsTheyAre) {
  const plist::Dictionary value{{"left", 1}, {"right", plist::Array{1.5F, "x"}}};
  platform_.defaults.set(kHomeshell, kAccessory, value);
  startMonitor();
  const auto session = makeSession();
  session->start();
  const Payloads payloads = received();
  ASSERT_EQ(payloads.size(), 1U);
  EXPECT_EQ(payloads[0][kAccessory].dictionary(), value);
}

// The worker of a session that sends what it is told to its consumer.
class HandleChange : public SystemMonitorWorker {
 protected:
  static void handle(const plist::Dictionary& state) {
    const auto session = makeSession();
    session->start();
    TarnReportingSessionSystemMonitorWorker::initWithSession(session)->handleChange(state);
  }
};

TEST_F(HandleChange, StampBecomesLastUpdatedAndTheUptimeGoes) {
  handle({{kRinger, true}, {"tarnreporting_timestamp", 1700000000.5}, {"systemuptime_sec", 99}});
  EXPECT_EQ(received(), (Payloads{{{kRinger, true}, {"last_updated", 1700000000.5}}}));
}

TEST_F(HandleChange, StateWithoutAStampIsSentAsItIs) {
  handle({{kRinger, true}, {"systemuptime_sec", 99}});
  EXPECT_EQ(received(), (Payloads{{{kRinger, true}, {"systemuptime_sec", 99}}}));
}

TEST_F(HandleChange, EmptyStateSendsNothing) {
  handle({});
  EXPECT_TRUE(script().received.empty());
}

TEST_F(HandleChange, WithoutItsSessionItSendsNothing) {
  auto session = makeSession();
  session->start();
  const auto worker = TarnReportingSessionSystemMonitorWorker::initWithSession(session);
  session.reset();
  worker->handleChange({{kRinger, true}});
  EXPECT_TRUE(script().received.empty());
}

// Lets another thread take the dictionary's lock while it handles a message.
class LockingWorker : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "LockingWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<LockingWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<LockingWorker>(session);
  }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {
    std::thread other([] {
      const std::lock_guard guard(*TarnReportingSystemMonitor::getSystemMonitorDictionary());
      trail().emplace_back("got in");  // never, if the lock were held
    });
    other.join();
  }
};

TEST_F(SystemMonitorWorker, MessagesAreSentWithoutTheDictionarysLock) {
  useWorkers<TarnReportingSessionSystemMonitorWorker, LockingWorker>();
  platform_.defaults.set(kHomeshell, kAccessory, true);
  startMonitor();
  makeSession()->start();
  EXPECT_EQ(trail(), (std::vector<std::string>{"got in"}));
}

}  // namespace
}  // namespace tarn
