// SPDX-License-Identifier: Apache-2.0
// What the mirror of sessions in the real-time-communication reporting service costs: the hand-over of a message, the
// stop of a long session, and what a thousand live sessions hold.
#include <array>
#include <atomic>
#include <filesystem>
#include <memory>
#include <thread>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/figures/Figures.h"
#include "client/ClientConnection.h"
#include "host/loop/LinuxWorkQueues.h"
#include "host/machine/LinuxClock.h"
#include "platform/Facilities.h"
#include "platform/RtcReportingService.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "telemetry/rtc/TarnReportingSessionRtcWorker.h"
#include "testing/FakePlatform.h"

namespace tarn::bench {

namespace {

constexpr double kHandOverTarget = 300;
constexpr std::size_t kHandedOver = 50'000;
constexpr std::size_t kStopped = 100'000;
constexpr std::size_t kLiveSessions = 1000;

constexpr std::array kTable{TarnReportingSessionWorkerClass::of<TarnReportingSessionRtcWorker>()};

// A service that finds a backend at once and forgets what it is told.
class ForgetfulService final : public platform::RtcReportingService {
 public:
  std::optional<std::string> newHierarchyToken(const std::optional<std::string>&) override { return "token"; }
  std::shared_ptr<platform::RtcReportingSession> createSession(
      const plist::Dictionary&, const plist::Dictionary&, const std::optional<std::vector<std::string>>&) override {
    return std::make_shared<Session>(flushes_);
  }
  void waitForFlushes(int count) const {
    while (flushes_ < count) {
      std::this_thread::yield();
    }
  }

 private:
  class Session final : public platform::RtcReportingSession {
   public:
    explicit Session(std::atomic<int>& flushes) : flushes_(flushes) {}
    void startConfiguration(StartCompletion completion) override { completion(std::vector<std::string>{"forgetful"}); }
    SendResult sendMessage(std::uint16_t, std::uint16_t, const plist::Dictionary& payload) override {
      keep(payload);
      return {true, {}};
    }
    void flushMessages() override { ++flushes_; }
    std::string description() const override { return "forgetful"; }

   private:
    std::atomic<int>& flushes_;
  };

  std::atomic<int> flushes_{0};
};

// The platform of the tests, but for the machine's clock and queues and the service.
class Platform {
 public:
  Platform() {
    fakes_.log.setThreshold(platform::LogLevel::Error);
    TarnReportingInstallFacilities(&facilities_);
    TarnReportingSession::setAllWorkerClasses(kTable);
  }
  ForgetfulService& service() { return service_; }
  void settle() {
    while (!queues_.settle(std::chrono::seconds(1))) {
    }
  }

 private:
  testing::FakePlatform fakes_;
  linux_host::LinuxClock clock_;
  ForgetfulService service_;
  // The caller's thread stands in for the server queue.
  linux_host::LinuxWorkQueues queues_{
      clock_, fakes_.workQueues.makeSerialQueue("server", platform::QualityOfService::UserInteractive)};
  const platform::Facilities facilities_{.clock = clock_,
                                         .workQueues = queues_,
                                         .conditions = fakes_.conditions,
                                         .log = fakes_.log,
                                         .tracePoints = fakes_.tracePoints,
                                         .deviceProperties = fakes_.deviceProperties,
                                         .defaults = fakes_.defaults,
                                         .notifications = fakes_.notifications,
                                         .processFacts = fakes_.processFacts,
                                         .processControl = fakes_.processControl,
                                         .tally = fakes_.tally,
                                         .fileSystem = fakes_.fileSystem,
                                         .localCalendar = fakes_.localCalendar,
                                         .randomSource = fakes_.randomSource,
                                         .processEnvironment = fakes_.processEnvironment,
                                         .commandRunner = fakes_.commandRunner,
                                         .rtcReporting = &service_};
};

std::shared_ptr<TarnReportingSession> makeSession() {
  auto session = TarnReportingSession::initWithID(kReporterID, {1});
  session->setServiceType(AudioServiceType::Generic);
  return session;
}

std::shared_ptr<TarnReportingSessionMessage> makeRecord(std::size_t number) {
  return std::make_shared<TarnReportingSessionMessage>(makeLoggedMessage(number, number), AudioEventCategory::Playback,
                                                       AudioEventType::Start);
}

// Nanoseconds by the clock for which a message keeps the session, while the pool's threads send those before it.
std::vector<double> measureHandOver(std::size_t count) {
  Platform platform;
  const auto session = makeSession();
  const auto worker = TarnReportingSessionRtcWorker::initWithSession(session);
  worker->start();
  std::vector<std::shared_ptr<TarnReportingSessionMessage>> records;
  for (std::size_t i = 0; i < count; ++i) {
    records.push_back(makeRecord(i));
  }
  for (std::size_t i = 0; i < count / 10; ++i) {
    worker->handleMessage(records[i]);
  }
  const double start = nowSeconds();
  for (const auto& record : records) {
    worker->handleMessage(record);
  }
  const double seconds = nowSeconds() - start;
  platform.settle();
  return {seconds * 1e9 / static_cast<double>(count)};
}

// Seconds for which the stop keeps the session, and until the summary event is sent and the service flushed.
std::vector<double> measureStop(std::size_t count, bool mirrored) {
  Platform platform;
  if (!mirrored) {
    TarnReportingSession::setAllWorkerClasses({});
  }
  const auto session = makeSession();
  session->start();
  while (session->messages().size() < count) {
    session->sendMessage(makeRecord(session->messages().size()));
  }
  platform.settle();
  const double start = nowSeconds();
  session->stop();
  const double stopped = nowSeconds();
  platform.service().waitForFlushes(mirrored ? 1 : 0);
  return {stopped - start, nowSeconds() - start};
}

std::size_t threadsOf(pid_t process) {
  const std::filesystem::directory_iterator tasks("/proc/" + std::to_string(process) + "/task");
  return static_cast<std::size_t>(std::distance(begin(tasks), end(tasks)));
}

// Threads with a thousand live sessions, and resident bytes that each of them took; of a real service.
std::vector<double> measureLiveSessions(const Settings& settings) {
  ServiceSetup setup;
  setup.mirrorsSessions = true;
  const ServiceProcess service(settings, setup);
  auto connected = client::ClientConnection::connect(service.socketPath());
  if (connected.failed()) {
    fail("can't connect: " + connected.error->text);
  }
  client::ClientConnection& client = *connected.value;
  const auto startSessions = [&](std::int64_t from, std::size_t count) {
    for (std::size_t i = 0; i < count; ++i) {
      const std::int64_t id = from + static_cast<std::int64_t>(i);
      const std::vector<std::int64_t> ids{id};
      const bool sent = client.call(client::createReportingSession(id)).ok() &&
                        client.send(client::startReportingSessionForID(id)) == client::SendStatus::Sent &&
                        client.call(client::sendMessage(makeMessage(1), 4, 1, ids)).ok();
      if (!sent) {
        fail("the service refuses a session");
      }
    }
    while (client.call(client::status()).dictionary().get("queued").asInt64() != 0) {
      std::this_thread::yield();
    }
  };
  startSessions(1, 100);
  const double before = residentBytes(service.id());
  startSessions(1000, kLiveSessions);
  return {static_cast<double>(threadsOf(service.id())),
          (residentBytes(service.id()) - before) / static_cast<double>(kLiveSessions)};
}

}  // namespace

void measureMirror(const Settings& settings, Table& table) {
  Samples handOvers;
  Samples stops;
  Samples plainStops;
  Samples summaries;
  Samples threads;
  Samples sessions;
  for (int round = 0; round < settings.rounds; ++round) {
    handOvers.push_back(measureInChild([&] { return measureHandOver(settings.count(kHandedOver)); }).front());
    const std::vector<double> stop = measureInChild([&] { return measureStop(settings.count(kStopped), true); });
    plainStops.push_back(measureInChild([&] { return measureStop(settings.count(kStopped), false); }).front());
    stops.push_back(stop[0]);
    summaries.push_back(stop[1]);
    const std::vector<double> live = measureLiveSessions(settings);
    threads.push_back(live[0]);
    sessions.push_back(live[1]);
  }
  table.addWithTarget({"mirror, hand-over of a message", nanoseconds(median(handOvers)), {}, {}, "<= 300 ns", {}},
                      median(handOvers), kHandOverTarget);
  table.add({"mirror, stop of a long session",
             microseconds(median(stops)),
             "without a mirror " + microseconds(median(plainStops)),
             times(median(stops) / median(plainStops)),
             "",
             {}});
  table.add({"mirror, stop until its summary event is sent", microseconds(median(summaries)), {}, {}, "", {}});
  table.add({"threads of the service, 1000 live sessions", counted(median(threads), "threads"), {}, {}, "", {}});
  table.add({"resident bytes a live session", bytes(median(sessions)), {}, {}, "", {}});
}

}  // namespace tarn::bench
