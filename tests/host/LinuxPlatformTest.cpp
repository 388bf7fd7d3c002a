// SPDX-License-Identifier: Apache-2.0
// What holds between the machine's facilities: pauses, status, and the order of the end.
#include "host/LinuxPlatform.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <future>
#include <thread>

#include "host/log/JournalOutput.h"
#include "host/log/PrefixedLog.h"
#include "host/loop/WorkOwner.h"
#include "host/machine/LinuxClock.h"
#include "platform/SessionRecords.h"
#include "platform/TarnReportingServiceProtocol.h"
#include "testing/RecordingLog.h"
#include "tests/host/Eventually.h"
#include "tests/host/InChild.h"
#include "tests/host/TemporaryFolder.h"
#include "tests/host/socket/RecordingService.h"
#include "tests/host/socket/TestClient.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using testing::eventually;
using testing::messageRequest;
using testing::TestClient;

// A service manager that notes what it is told.
class NotedManager final : public ServiceManager {
 public:
  void notifyReady() override { ready = true; }
  void notifyStopping(std::chrono::microseconds longest) override {
    bounds.push_back(longest);
    if (onStopping) {
      onStopping();
    }
  }
  std::optional<std::chrono::microseconds> watchdogInterval() const override { return std::nullopt; }

  bool ready = false;
  std::function<void()> onStopping;
  std::vector<std::chrono::microseconds> bounds;  // that it was told of the end
};

class LinuxPlatformTest : public ::testing::Test {
 protected:
  ~LinuxPlatformTest() override { stop(); }

  // The configuration is set by tests before this.
  LinuxPlatform& make() {
    platform_.emplace(configuration_, folder_.path(), JsonDeviceProperties(),
                      LinuxPlatform::Ground{clock_,
                                            log_,
                                            manager_,
                                            {},
                                            [this] {
                                              return Result<HostConfiguration>{next_, {}};
                                            },
                                            [this](platform::LogLevel level) { level_ = level; },
                                            &ids_});
    service_ = std::make_shared<testing::RecordingService>(platform_->loop().queue());
    return *platform_;
  }
  std::string listen() {
    return platform_->listen({ListenSocket::claim(socket()).value, {}}, service_, [] { return std::size_t{3}; }).text();
  }
  void serve() {
    serving_ = std::thread([this] { platform_->serve(); });
  }
  void stop() {
    if (serving_.joinable()) {
      platform_->loop().stop();
      serving_.join();
    }
  }
  void startAndServe() {
    make();
    ASSERT_EQ(platform_->start().text(), "");
    ASSERT_EQ(listen(), "");
    serve();
  }
  // What an entry that is logged for a new session of this process says of it; empty: nothing.
  std::string journalSession(const std::string& process) {
    platform::SessionRecords* const records = platform_->facilities().sessionRecords;
    platform::SessionFacts facts;
    facts.process = process;
    const platform::SessionScope scope(records, records->created(facts));
    const JournalOutput journal(folder_.path("journal"), [this] { return ids_.of(WorkOwner::current()); });
    const std::string entry = journal.formed(0, {kHostCategory, platform::LogLevel::Default, "", 0, "text"});
    const std::string field = "\nTARN_SESSION=";
    const std::size_t place = entry.find(field);
    return place == std::string::npos
               ? ""
               : entry.substr(place + field.size(), entry.find('\n', place + 1) - place - field.size());
  }
  // Serves nothing but the end.
  void end() {
    platform_->loop().stop();
    platform_->serve();
  }
  void record(std::string_view event) { platform_->facilities().wattlog->logRegisteredEvent(1, event, {}); }
  // A queue of a worker's own, with one piece of work that lasts until it is let go.
  std::shared_ptr<platform::WorkQueue> heldQueue() {
    auto queue = platform_->facilities().workQueues.makeSerialQueue("own", platform::QualityOfService::Utility);
    queue->async([this] { letGo_.get_future().wait(); });
    return queue;
  }
  std::string socket() const { return folder_.path("socket"); }
  std::vector<std::string> recorded() const {
    return recorder::ask(folder_.path("recorder.sqlite3"), "SELECT backend || ' ' || name FROM events ORDER BY id");
  }
  // Whether a message is held up while others are answered, and whether it goes on after `makeRoom`.
  void expectPauseUntil(const std::function<void()>& makeRoom) {
    TestClient other(socket());
    TestClient client(socket());
    ASSERT_TRUE(client.request(1, messageRequest({{"a", 1}})));
    std::int64_t asked = 0;
    ASSERT_TRUE(eventually([&] {
      const auto status = other.status();
      return status && status->get("frames_received").asInt64() > ++asked;
    }));
    EXPECT_EQ(other.status()->get("messages_received").asInt64(), 0);
    EXPECT_FALSE(client.readable(0));
    makeRoom();
    EXPECT_TRUE(client.reply());
    EXPECT_EQ(other.status()->get("messages_received").asInt64(), 1);
  }

  TemporaryFolder folder_;
  testing::RecordingLog log_;
  LinuxClock clock_;
  NotedManager manager_;
  HostConfiguration configuration_;
  HostConfiguration next_;  // as the files have it when they are read anew
  LogSessionIds ids_;
  platform::LogLevel level_ = platform::LogLevel::Default;
  std::promise<void> letGo_;
  std::optional<LinuxPlatform> platform_;
  std::shared_ptr<testing::RecordingService> service_;
  std::thread serving_;
};

TEST_F(LinuxPlatformTest, RequestsWaitWhileTheRecorderIsFull) {
  configuration_.recorder.highWaterEvents = 1;
  configuration_.recorder.lowWaterEvents = 0;
  make();
  record("event");  // stays, as nothing writes before the start
  ASSERT_EQ(listen(), "");
  serve();
  expectPauseUntil([this] { platform_->loop().queue()->async([this] { EXPECT_EQ(platform_->start().text(), ""); }); });
}

TEST_F(LinuxPlatformTest, RequestsWaitWhileTheWorkersQueuesAreFull) {
  configuration_.limits.poolWork = {.high = 1, .low = 0};
  startAndServe();
  const auto queue = heldQueue();
  expectPauseUntil([this] { letGo_.set_value(); });
}

TEST_F(LinuxPlatformTest, WhoKeepsTheWorkersQueuesBusyWaitsBeforeTheyAreFull) {
  configuration_.recorder.highWaterEvents = 12;
  startAndServe();
  // The user that most was done for lately, who is forgotten with the last connection.
  TestClient earlier(socket());
  ASSERT_TRUE(earlier.status());
  const auto queue = heldQueue();
  for (int piece = 0; piece < 256; ++piece) {
    queue->async([] {});
  }
  expectPauseUntil([this] { letGo_.set_value(); });
}

TEST_F(LinuxPlatformTest, SettleIsAnsweredWhenWhatTheQueuesHoldAndTheRecorderHasIsCommitted) {
  configuration_.recorder.groupTime = configuration_.recorder.quietTime = 1h;
  startAndServe();
  const auto queue = heldQueue();
  queue->async([this] { record("from a queue"); });
  record("at once");
  TestClient client(socket());
  ASSERT_TRUE(client.request(1, testing::requestOf(wire::Operation::Settle)));
  ASSERT_TRUE(TestClient(socket()).status());
  EXPECT_FALSE(client.readable(20));
  letGo_.set_value();
  ASSERT_TRUE(client.reply());
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog at once", "wattlog from a queue"}));
}

TEST_F(LinuxPlatformTest, StatusTellsSessionsQueuedWorkAndTheRecordersCounters) {
  configuration_.recorder.groupTime = configuration_.recorder.quietTime = 1h;
  startAndServe();
  const auto queue = heldQueue();
  queue->async([] {});
  record("one");
  record("two");
  const auto status = TestClient(socket()).status();
  ASSERT_TRUE(status);
  EXPECT_EQ(status->get("sessions"), plist::ValueView(3));
  EXPECT_EQ(status->get("queued"), plist::ValueView(2));
  EXPECT_EQ(status->get("recorder_handed_over"), plist::ValueView(2));
  EXPECT_EQ(status->get("recorder_waiting"), plist::ValueView(2));
  EXPECT_EQ(status->get("recorder_committed"), plist::ValueView(0));
  EXPECT_EQ(status->get("recorder_expired"), plist::ValueView(0));
  EXPECT_TRUE(status->get("recorder_expired_by_user").dictionary().empty());
  EXPECT_EQ(status->get("recorder_expired_unexported").dictionary(), (plist::Dictionary{{"count", 0}}));
  EXPECT_EQ(status->get("recorder_failed"), plist::ValueView(0));
  EXPECT_EQ(status->get("connections_open"), plist::ValueView(1));
  letGo_.set_value();
}

TEST_F(LinuxPlatformTest, ListeningTellsTheManagerThatTheServiceIsReady) {
  make();
  ASSERT_EQ(platform_->start().text(), "");
  EXPECT_FALSE(manager_.ready);
  ASSERT_EQ(listen(), "");
  EXPECT_TRUE(manager_.ready);
  end();
}

TEST_F(LinuxPlatformTest, FailedListenCommitsWhatTheRecorderHoldsAndIsTold) {
  make();
  ASSERT_EQ(platform_->start().text(), "");
  record("event");
  std::filesystem::create_directory(folder_.path("gone"));
  ListenSocket socket = ListenSocket::claim(folder_.path("gone/socket")).value;
  std::filesystem::remove_all(folder_.path("gone"));
  EXPECT_NE(platform_->listen({std::move(socket), {}}, service_, [] { return std::size_t{0}; }).text(), "");
  EXPECT_FALSE(manager_.ready);
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog event"}));
}

// The manager is told, then nobody can connect any more, then the queues' work reaches the recorder, then it commits.
TEST_F(LinuxPlatformTest, EndClosesTheListenerThenSettlesTheQueuesThenCommits) {
  configuration_.limits.settleTime = 20s;
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  bool listenedWhenToldToStop = false;
  manager_.onStopping = [&] { listenedWhenToldToStop = std::filesystem::exists(socket()); };
  const auto queue = platform_->facilities().workQueues.makeSerialQueue("own", platform::QualityOfService::Utility);
  queue->async([this] {
    EXPECT_TRUE(eventually([this] { return !std::filesystem::exists(socket()); }));
    record("last");
  });
  end();
  EXPECT_TRUE(listenedWhenToldToStop);
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog last"}));
}

TEST_F(LinuxPlatformTest, EndServesTheRequestsThatWereTaken) {
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  platform_->loop().queue()->async([this] { record("taken"); });
  end();
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog taken"}));
}

// How long it waits for queues that get shorter is SettlingTest's.
TEST_F(LinuxPlatformTest, EndWaitsForMoreQueuesThanThePoolHasThreads) {
  configuration_.limits.settleTime = 20s;
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  for (std::size_t piece = 0; piece < 3 * LinuxWorkQueues::kThreads; ++piece) {
    const auto queue = platform_->facilities().workQueues.makeSerialQueue("own", platform::QualityOfService::Utility);
    queue->async([this] {
      EXPECT_TRUE(eventually([this] { return !std::filesystem::exists(socket()); }));
      record("piece");
    });
  }
  end();
  EXPECT_EQ(recorded().size(), 3 * LinuxWorkQueues::kThreads);
  EXPECT_FALSE(log_.contains("left undone"));
}

TEST_F(LinuxPlatformTest, WorkThatABackEndKeepsWaitingIsLeftUndoneAndTold) {
  configuration_.limits.settleTime = 10ms;
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  const auto queue =
      platform_->facilities().workQueues.makeSuspendableQueue("own", platform::QualityOfService::Utility);
  queue->async([queue] { queue->suspend(1h, [] { ADD_FAILURE(); }); });
  queue->async([] { ADD_FAILURE(); });
  record("event");
  end();
  EXPECT_TRUE(log_.contains(platform::LogLevel::Default, "2 pieces of work of the workers' queues are left undone"));
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog event"}));
}

TEST_F(LinuxPlatformTest, EndInOrderServesWhatClientsSentAndThenTheirEnds) {
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  TestClient first(socket());
  TestClient second(socket());
  // All of it lies in the sockets when the end begins.
  ASSERT_TRUE(first.request(1, testing::requestOf(wire::Operation::GetAllReporters)));
  ASSERT_TRUE(second.request(1, testing::requestOf(wire::Operation::CreateReportingSession, 7)));
  ASSERT_TRUE(second.request(2, testing::requestOf(wire::Operation::DestroyReportingSession, 7)));
  std::vector<std::string> eventsBefore;
  platform_->loop().queue()->asyncAfter(50ms, [&] {
    platform_->endClients([&] { eventsBefore = service_->events; });
    platform_->endClients([] { ADD_FAILURE(); });
  });
  platform_->serve();
  EXPECT_TRUE(first.reply());
  EXPECT_TRUE(first.ended());
  EXPECT_TRUE(second.reply());
  EXPECT_TRUE(second.reply());
  EXPECT_TRUE(second.ended());
  std::sort(eventsBefore.begin(), eventsBefore.end());
  EXPECT_EQ(eventsBefore, (std::vector<std::string>{"1 getAllReporters", "1 invalidated", "2 createReportingSession 7",
                                                    "2 destroyReportingSession 7", "2 invalidated"}));
  ASSERT_EQ(manager_.bounds.size(), 2U);  // for the clients, then for the commit
  EXPECT_EQ(manager_.bounds[0], 10s);
}

TEST_F(LinuxPlatformTest, EndInOrderEndsHeldConnectionsOnceTheyMayGoOn) {
  configuration_.recorder.highWaterEvents = 1;
  configuration_.recorder.lowWaterEvents = 0;
  make();
  record("event");  // stays, as nothing writes before the start
  ASSERT_EQ(listen(), "");
  TestClient client(socket());
  ASSERT_TRUE(client.request(1, messageRequest({{"a", 1}})));
  ASSERT_TRUE(client.request(2, messageRequest({{"a", 2}})));
  auto& queue = *platform_->loop().queue();
  queue.asyncAfter(50ms, [this] { platform_->endClients([] {}); });
  queue.asyncAfter(100ms, [this] { EXPECT_EQ(platform_->start().text(), ""); });
  platform_->serve();
  EXPECT_TRUE(client.reply());
  EXPECT_TRUE(client.reply());
  EXPECT_TRUE(client.ended());
}

TEST_F(LinuxPlatformTest, EndInOrderThatGetsStuckCommitsAndExitsInTime) {
  configuration_.limits.endTime = 100ms;
  const auto begin = std::chrono::steady_clock::now();
  const int status = testing::inChild([this] {
    make();
    if (platform_->start().failed() || !listen().empty()) return 1;
    platform_->loop().queue()->async([this] { platform_->endClients([] {}); });
    platform_->loop().queue()->async([this] {
      record("event");
      std::this_thread::sleep_for(1h);  // somebody's work that never ends
    });
    platform_->serve();
    return 1;
  });
  EXPECT_EQ(status, 0);
  EXPECT_LT(std::chrono::steady_clock::now() - begin, 20s);
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog event"}));
}

TEST_F(LinuxPlatformTest, ExitOfTheProcessMakesSafeWhatWasTaken) {
  const int status = testing::inChild([this] {
    make();
    if (platform_->start().failed() || !listen().empty()) return 1;
    record("event");
    platform_->loop().queue()->async([this] { platform_->facilities().processControl.exitProcess(2); });
    platform_->serve();
    return 1;
  });
  EXPECT_EQ(status, 2);
  EXPECT_EQ(recorded(), (std::vector<std::string>{"wattlog event"}));
  EXPECT_FALSE(std::filesystem::exists(socket()));
}

TEST_F(LinuxPlatformTest, ReloadReachesEveryPartThatTakesSomethingOver) {
  make();
  next_.logLevel = platform::LogLevel::Debug;
  next_.tally.inUse = {"wanted"};
  next_.rtc.available = false;
  next_.limits.quotas.sessionsPerUser = 9;
  next_.limits.logs.bytesInAll = 65'536;
  next_.limits.maxFrameBytes = 100;
  next_.paths.flume = "/elsewhere";
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  platform_->loop().queue()->async([this] { platform_->reload(); });
  serve();
  TestClient client(socket());
  ASSERT_TRUE(eventually([&] { return client.status()->get("configuration_generation") == plist::ValueView(1); }));
  const plist::Dictionary limits = client.status()->get("quotas").dictionary().get("limits").dictionary();
  EXPECT_EQ(limits.get("sessions_per_user"), plist::ValueView(9));
  EXPECT_EQ(client.status()->get("configuration_waiting").asText(), "(paths.flume)");
  stop();
  const platform::Facilities& facilities = platform_->facilities();
  EXPECT_EQ(level_, platform::LogLevel::Debug);
  EXPECT_TRUE(facilities.tally.eventIsInUse("wanted"));
  EXPECT_FALSE(facilities.tally.eventIsInUse("another"));
  EXPECT_EQ(facilities.rtcReporting->newHierarchyToken({}), std::nullopt);
  EXPECT_EQ(facilities.overflow->bounds().bytesInAll, 65'536U);
}

TEST_F(LinuxPlatformTest, NothingIsReloadedWhileTheClientsEnd) {
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  next_.logLevel = platform::LogLevel::Debug;
  platform_->loop().queue()->async([this] {
    platform_->endClients([] {});
    platform_->reload();
  });
  platform_->serve();
  EXPECT_EQ(level_, platform::LogLevel::Default);
}

TEST_F(LinuxPlatformTest, HandsOutEverythingThatAMachineHasOnTheConfiguredPaths) {
  configuration_.paths.diagnosticLogs = "/elsewhere";
  make();
  const platform::Facilities& facilities = platform_->facilities();
  EXPECT_EQ(facilities.fileSystem.wellKnownDirectory(platform::WellKnownDirectory::DiagnosticLogs),
            "/elsewhere/DiagnosticLogs");
  EXPECT_EQ(facilities.fileSystem.wellKnownDirectory(platform::WellKnownDirectory::Temporary), folder_.path("tmp"));
  EXPECT_TRUE(facilities.wattlog && facilities.pylon && facilities.snare && facilities.tattle && facilities.gyre);
  EXPECT_TRUE(facilities.flume && facilities.rtcReporting && facilities.performanceTrace);
  EXPECT_TRUE(facilities.traceAnalysis && facilities.perfDataWriters && facilities.signposts);
  EXPECT_TRUE(facilities.sessionRecords);
  EXPECT_FALSE(facilities.accessories);
}

TEST_F(LinuxPlatformTest, WithoutTheRecorderNothingStandsInAndNothingIsWritten) {
  configuration_.recorderEnabled = false;
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  const platform::Facilities& facilities = platform_->facilities();
  EXPECT_FALSE(facilities.wattlog || facilities.pylon || facilities.snare || facilities.tattle || facilities.gyre);
  EXPECT_FALSE(facilities.rtcReporting);
  EXPECT_TRUE(facilities.flume && facilities.performanceTrace && facilities.signposts);
  EXPECT_FALSE(facilities.tally.eventIsInUse("sys.oxbow.tarnkit.Playback.Start"));
  facilities.tally.sendEventLazy("event", [] { return plist::Dictionary(); });
  end();
  EXPECT_FALSE(std::filesystem::exists(folder_.path("recorder.sqlite3")));
}

// At once, from a worker's own queue, put off, and nobody's in between.
TEST_F(LinuxPlatformTest, AnEventIsThatOfTheSessionForWhichItWasHandedOver) {
  make();
  ASSERT_EQ(platform_->start().text(), "");
  ASSERT_EQ(listen(), "");
  platform::SessionRecords& records = *platform_->facilities().sessionRecords;
  const auto queue = platform_->facilities().workQueues.makeSerialQueue("own", platform::QualityOfService::Utility);
  for (const std::string name : {"a", "b"}) {
    platform::SessionFacts facts;
    facts.process = name;
    const platform::SessionScope scope(&records, records.created(facts));
    record(name);
    queue->async([this, name] { record(name + " queued"); });
    queue->asyncAfter(1ms, [this, name] { record(name + " delayed"); });
  }
  record("nobody's");
  std::promise<void> over;
  queue->asyncAfter(20ms, [&over] { over.set_value(); });
  over.get_future().wait();
  end();
  EXPECT_EQ(recorder::ask(folder_.path("recorder.sqlite3"),
                          "SELECT events.name || ': ' || coalesce(sessions.process, '-') FROM events "
                          "LEFT JOIN sessions ON sessions.id = events.session ORDER BY events.name"),
            (std::vector<std::string>{"a: a", "a delayed: a", "a queued: a", "b: b", "b delayed: b", "b queued: b",
                                      "nobody's: -"}));
}

TEST_F(LinuxPlatformTest, TheJournalNamesASessionByItsIdInTheFileAlsoInTheNextRun) {
  std::vector<std::string> told;
  for (const std::vector<std::string>& names : {std::vector<std::string>{"a", "b"}, {"c"}}) {
    make();
    ASSERT_EQ(platform_->start().text(), "");
    ASSERT_EQ(listen(), "");
    for (const std::string& name : names) {
      told.push_back(name + ": " + journalSession(name));
    }
    end();
    platform_.reset();
  }
  EXPECT_EQ(told, (std::vector<std::string>{"a: 1", "b: 2", "c: 3"}));
  EXPECT_EQ(
      recorder::ask(folder_.path("recorder.sqlite3"), "SELECT process || ': ' || id FROM sessions ORDER BY process"),
      told);
}

TEST_F(LinuxPlatformTest, WithoutTheRecorderTheJournalCountsSessionsFromOneInEachRun) {
  configuration_.recorderEnabled = false;
  for (int run = 0; run < 2; ++run) {
    make();
    ASSERT_EQ(platform_->start().text(), "");
    ASSERT_EQ(listen(), "");
    EXPECT_EQ(journalSession("a"), "1");
    EXPECT_EQ(journalSession("b"), "2");
    end();
    platform_.reset();
  }
}

TEST_F(LinuxPlatformTest, TheJournalNamesNoSessionWhileIdsAreNotKnown) {
  folder_.write("recorder.sqlite3/in the way", "");
  make();
  EXPECT_EQ(journalSession("a"), "");
}

TEST_F(LinuxPlatformTest, TemporaryFolderThatCannotBeMadeFailsTheStart) {
  folder_.write("tmp", "in the way");
  EXPECT_EQ(make().start().text(), folder_.path("tmp") + ": Not a directory");
}

}  // namespace
}  // namespace tarn::linux_host
