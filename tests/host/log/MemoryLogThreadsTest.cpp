// SPDX-License-Identifier: Apache-2.0
// The memory log worker on real threads, conditions, pipes and processes: the tools run at once, nothing that they do
// holds the service up for long, and requests of many sessions never wait for each other.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <fstream>
#include <future>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "diagnostics/TarnReportingSessionMemoryLogWorker.h"
#include "host/loop/LinuxConditions.h"
#include "host/loop/LinuxWorkQueues.h"
#include "host/machine/LinuxCommandRunner.h"
#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionWorkerClass.h"
#include "testing/FakePlatform.h"
#include "tests/host/Eventually.h"
#include "tests/host/ScratchFolder.h"
#include "tests/host/loop/RunningLoop.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;

constexpr const char* kResources = "/usr/local/bin/restop";
constexpr const char* kZones = "/usr/bin/zonetally -l";

// Runs something else in place of the tools, which are not on this machine, and gives it less time.
class StandInRunner final : public platform::CommandRunner {
 public:
  Result<std::unique_ptr<platform::RunningCommand>> start(std::string_view commandText,
                                                          std::chrono::nanoseconds timeLimit) override {
    ++starts;
    const auto found = standIns.find(commandText);
    return runner_.start(found == standIns.end() ? commandText : found->second, std::min(timeLimit, limit));
  }

  // Set before the tools run.
  std::map<std::string, std::string, std::less<>> standIns;
  std::chrono::nanoseconds limit = 60s;
  std::atomic<std::size_t> starts{0};

 private:
  LinuxCommandRunner runner_;
};

class MemoryLogThreads : public ::testing::Test {
 public:
  MemoryLogThreads() {
    TarnReportingInstallFacilities(&facilities_);
    TarnReportingSession::setAllWorkerClasses(table_);
    running_.start();
  }
  ~MemoryLogThreads() override {
    running_.onQueue([this] { sessions_.clear(); });
    running_.stop();
  }

 protected:
  void standIn(const char* tool, const std::string& command) { runner_.standIns[tool] = command; }
  // Begins a request by a session of its own and does not wait for its end.
  void beginRequest() {
    running_.loop.queue()->async([this] {
      platform_.clock.advance(6s);
      auto session = TarnReportingSession::initWithID(static_cast<std::int64_t>(sessions_.size()) + 1, {1});
      session->setServiceType(AudioServiceType::Test);
      session->start();
      sessions_.push_back(session);
      session->sendMessage(std::make_shared<TarnReportingSessionMessage>(
          plist::Dictionary{}, AudioEventCategory::Generic, AudioEventType::MemoryLog));
    });
  }
  void request() {
    beginRequest();
    running_.onQueue([] {});
  }
  // Whether the log holds the line.
  bool logged(const std::string& line) const {
    const auto texts = platform_.log.texts();
    return std::find(texts.begin(), texts.end(), line) != texts.end();
  }

  testing::FakePlatform platform_;
  testing::ScratchFolder folder_;
  testing::RunningLoop running_;
  StandInRunner runner_;
  LinuxConditions conditions_{running_.loop};
  std::vector<std::shared_ptr<TarnReportingSession>> sessions_;  // the server queue's

 private:
  platform::Facilities withRealThreads() {
    const platform::Facilities& fakes = platform_.facilities();
    return {.clock = fakes.clock,
            .workQueues = queues_,
            .conditions = conditions_,
            .log = fakes.log,
            .tracePoints = fakes.tracePoints,
            .deviceProperties = fakes.deviceProperties,
            .defaults = fakes.defaults,
            .notifications = fakes.notifications,
            .processFacts = fakes.processFacts,
            .processControl = fakes.processControl,
            .tally = fakes.tally,
            .fileSystem = fakes.fileSystem,
            .localCalendar = fakes.localCalendar,
            .randomSource = fakes.randomSource,
            .processEnvironment = fakes.processEnvironment,
            .commandRunner = runner_};
  }

  const std::vector<TarnReportingSessionWorkerClass> table_{
      TarnReportingSessionWorkerClass::of<TarnReportingSessionMemoryLogWorker>()};
  const platform::Facilities facilities_ = withRealThreads();

 protected:
  LinuxWorkQueues queues_{running_.clock, running_.loop.queue()};  // first to go: its threads use the rest
};

TEST_F(MemoryLogThreads, TheToolsRunAtOnce) {
  // Each waits for the other one's mark.
  const std::string one = folder_.file("one");
  const std::string other = folder_.file("other");
  const auto meet = [](const std::string& mine, const std::string& yours) {
    return "touch " + mine + "; until [ -e " + yours + " ]; do sleep 0.01; done; echo RESOURCE";
  };
  standIn(kZones, meet(one, other));
  standIn(kResources, meet(other, one));
  request();
  EXPECT_EQ(platform_.log.count("WIRED LOG BLOCK 1\nwiredlog: RESOURCE\n"), 2U);
}

TEST_F(MemoryLogThreads, ToolsThatAreNotThereAreTold) {
  standIn(kZones, "/nowhere/zonetally -l");
  standIn(kResources, "/etc/passwd");  // no program
  request();
  EXPECT_TRUE(logged("wiredlog: unable to execute '/usr/bin/zonetally -l'"));
  EXPECT_TRUE(logged("wiredlog: unable to execute '/usr/local/bin/restop'"));
  EXPECT_EQ(platform_.log.count("captured"), 0U);
  EXPECT_EQ(platform_.log.count("WIRED LOG BLOCK"), 0U);
}

TEST_F(MemoryLogThreads, ToolsThatHangAreEndedWithWhatTheyPrinted) {
  runner_.limit = 300ms;
  standIn(kZones, "echo first; sleep 100; echo never");
  standIn(kResources, "exec 1>&-; sleep 100");
  request();
  EXPECT_TRUE(logged("WIRED LOG BLOCK 1\nwiredlog: first\n"));
  EXPECT_TRUE(logged("wiredlog: request /usr/bin/zonetally -l captured"));
  EXPECT_TRUE(logged("wiredlog: request /usr/local/bin/restop captured"));
}

TEST_F(MemoryLogThreads, ToolsThatPrintWithoutEndAreCut) {
  standIn(kZones, "yes xxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxxx");
  standIn(kResources, "cat /dev/zero");  // nothing of it is kept
  request();
  EXPECT_TRUE(logged("wiredlog: output of '/usr/bin/zonetally -l' cut"));
  EXPECT_TRUE(logged("wiredlog: output of '/usr/local/bin/restop' cut"));
  EXPECT_GT(platform_.log.count("WIRED LOG BLOCK "), 1000U);
}

TEST_F(MemoryLogThreads, ToolsThatDieCountForWhatTheyPrinted) {
  standIn(kZones, "printf 'half a line'; kill -KILL $$");
  standIn(kResources, "kill -SEGV $$");
  request();
  EXPECT_TRUE(logged("WIRED LOG BLOCK 1\nwiredlog: half a line"));
  EXPECT_EQ(platform_.log.count("captured"), 2U);
}

TEST_F(MemoryLogThreads, RequestsOfManySessionsAreServedOneByOne) {
  constexpr std::size_t kClients = 4;
  constexpr std::size_t kRequests = 6;
  standIn(kZones, "echo zone");
  standIn(kResources, "echo RESOURCE");
  std::vector<std::thread> clients;
  for (std::size_t i = 0; i < kClients; ++i) {
    clients.emplace_back([this] {
      for (std::size_t n = 0; n < kRequests; ++n) {
        beginRequest();
      }
    });
  }
  for (std::thread& client : clients) {
    client.join();
  }
  running_.onQueue([] {});
  EXPECT_EQ(runner_.starts, 2 * kClients * kRequests);
  EXPECT_EQ(platform_.log.count("WIRED LOG BLOCK 1\n"), 2 * kClients * kRequests);
  EXPECT_EQ(platform_.log.count("gave up"), 0U);
}

TEST_F(MemoryLogThreads, OneFreeThreadIsEnough) {
  // Three queues of others are blocked for as long as the request lasts: the tools run one after the other.
  std::promise<void> release;
  const auto released = release.get_future().share();
  const auto blocked = std::make_shared<std::atomic<std::size_t>>(0);
  std::vector<std::shared_ptr<platform::WorkQueue>> others;
  for (std::size_t i = 0; i + 1 < LinuxWorkQueues::kThreads; ++i) {
    others.push_back(queues_.makeSerialQueue("another's", platform::QualityOfService::Utility));
    others.back()->async([blocked, released] {
      ++*blocked;
      released.wait();
    });
  }
  EXPECT_TRUE(testing::eventually([&] { return *blocked == LinuxWorkQueues::kThreads - 1; }));
  standIn(kZones, "echo zone");
  standIn(kResources, "echo RESOURCE");
  request();
  EXPECT_EQ(platform_.log.count("WIRED LOG BLOCK 1\n"), 2U);
  release.set_value();
}

TEST_F(MemoryLogThreads, TheWaitIsToldToTheWatchdogAsDeliberate) {
  const std::string mark = folder_.file("mark");
  standIn(kZones, "until [ -e " + mark + " ]; do sleep 0.01; done; echo zone");
  standIn(kResources, "echo RESOURCE");
  beginRequest();
  EXPECT_TRUE(testing::eventually([&] { return running_.loop.progress().sample().waitingSince.has_value(); }));
  std::ofstream(mark).close();
  running_.onQueue([] {});
  EXPECT_FALSE(running_.loop.progress().sample().waitingSince.has_value());
  EXPECT_EQ(platform_.log.count("WIRED LOG BLOCK 1\n"), 2U);
}

}  // namespace
}  // namespace tarn::linux_host
