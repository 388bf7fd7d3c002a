// Whether a message costs the same in a long session as in a short one. In this process, with the real workers and an
// analytics service that wants nothing.
#include <malloc.h>

#include <memory>
#include <vector>

#include "bench/Figures.h"
#include "bench/Measure.h"
#include "bench/Message.h"
#include "platform/Facilities.h"
#include "platform/TallyService.h"
#include "platform/TracePoints.h"
#include "platform/linux/LinuxClock.h"
#include "platform/testing/FakePlatform.h"
#include "service/TarnReportingPlatform.h"
#include "service/TarnReportingWorkerClasses.h"
#include "session/TarnReportingSession.h"

namespace tarn::bench {

namespace {

constexpr double kTarget = 1.2;
constexpr std::size_t kWindow = 1000;  // messages that are measured at each length of the log

class NoTally final : public platform::TallyService {
 public:
  bool eventIsInUse(std::string_view) override { return false; }
  void sendEventLazy(std::string_view, PayloadCallback) override {}
};

class NoTracePoints final : public platform::TracePoints {
 public:
  void emit(std::uint32_t, std::int64_t) noexcept override {}
};

// The platform of the tests, but for the facilities that a message meets: the fakes note down everything.
class Platform {
 public:
  Platform() {
    fakes_.log.setThreshold(platform::LogLevel::Error);
    TarnReportingInstallFacilities(&facilities_);
    TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
  }

 private:
  testing::FakePlatform fakes_;
  linux_host::LinuxClock clock_;
  NoTally tally_;
  NoTracePoints tracePoints_;
  const platform::Facilities facilities_{.clock = clock_,
                                         .workQueues = fakes_.workQueues,
                                         .conditions = fakes_.conditions,
                                         .log = fakes_.log,
                                         .tracePoints = tracePoints_,
                                         .deviceProperties = fakes_.deviceProperties,
                                         .defaults = fakes_.defaults,
                                         .notifications = fakes_.notifications,
                                         .processFacts = fakes_.processFacts,
                                         .processControl = fakes_.processControl,
                                         .tally = tally_,
                                         .fileSystem = fakes_.fileSystem,
                                         .localCalendar = fakes_.localCalendar,
                                         .randomSource = fakes_.randomSource,
                                         .processEnvironment = fakes_.processEnvironment,
                                         .commandRunner = fakes_.commandRunner};
};

std::shared_ptr<TarnReportingSession> makeSession() {
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  auto session = TarnReportingSession::initWithID(kReporterID, {1});
  session->setServiceType(AudioServiceType::Generic);
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  return session;
}

class Feeder {
 public:
  explicit Feeder(TarnReportingSession& session) : session_(session), request_(makeRequest()) {}

  void fillTo(std::size_t length) {
    while (session_.messages().size() < length) {
      session_.sendMessage(makeRecord());
    }
  }
  // Nanoseconds a message of the next ones, which are made beforehand.
  double measure() {
    std::vector<TarnReportingSession::MessagePointer> records;
    for (std::size_t i = 0; i < kWindow; ++i) {
      records.push_back(makeRecord());
    }
    return nanosecondsEach(kWindow, [&](std::size_t i) { session_.sendMessage(records[i]); });
  }

 private:
  TarnReportingSession::MessagePointer makeRecord() {
    renumber(request_, ++number_);
    return std::make_shared<TarnReportingSessionMessage>(request_.dictionary, AudioEventCategory::Playback,
                                                         AudioEventType::Start);
  }

  TarnReportingSession& session_;
  wire::Request request_;
  std::uint64_t number_ = 0;
};

// One session's way through all lengths, in a process as fresh as the service is.
std::vector<double> measureLengths(const std::vector<std::size_t>& lengths) {
  ::malloc_trim(0);  // what this program freed before must not serve again
  const Platform platform;
  const auto warm = makeSession();
  Feeder(*warm).fillTo(10 * kWindow);
  const auto session = makeSession();
  Feeder feeder(*session);
  std::vector<double> results;
  for (const std::size_t length : lengths) {
    feeder.fillTo(length);
    results.push_back(feeder.measure());
  }
  return results;
}

std::string nameOf(std::size_t length) {
  std::size_t power = 0;
  for (std::size_t rest = length; rest >= 10; rest /= 10) {
    ++power;
  }
  return "intake with 10^" + std::to_string(power) + " messages logged";
}

}  // namespace

void measureGrowth(const Settings& settings, Table& table) {
  const std::vector<std::size_t> lengths = settings.quick ? std::vector<std::size_t>{1'000, 10'000, 20'000}
                                                          : std::vector<std::size_t>{1'000, 100'000, 1'000'000};
  std::vector<Samples> samples(lengths.size());
  for (int round = 0; round < settings.rounds; ++round) {
    const std::vector<double> results = measureInChild([&] { return measureLengths(lengths); });
    for (std::size_t i = 0; i < results.size(); ++i) {
      samples[i].push_back(results[i]);
    }
  }
  const double first = median(samples.front());
  table.add({nameOf(lengths.front()), nanoseconds(first), "", "", "", {}});
  for (std::size_t i = 1; i < lengths.size(); ++i) {
    const double ours = median(samples[i]);
    table.addWithTarget({nameOf(lengths[i]),
                         nanoseconds(ours),
                         "with 10^3 " + nanoseconds(first),
                         times(ours / first),
                         "<= 1.20 x the first",
                         {}},
                        ours / first, kTarget);
  }
}

}  // namespace tarn::bench
