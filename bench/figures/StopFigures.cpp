// SPDX-License-Identifier: Apache-2.0
// What the stop of a session costs, by the number of messages that it logged: sorting, deriving, taking in what was
// derived, the summary file and the release of the log. In a process of its own for each figure, with the real workers
// and an analytics service that takes every event and drops it.
#include <malloc.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/SessionPlatform.h"
#include "bench/SessionStream.h"
#include "bench/figures/Figures.h"
#include "platform/Clock.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn::bench {

namespace {

constexpr double kTargetNanoseconds = 3000;   // a message, without the file
constexpr double kTargetMemory = 0.5;         // of the log's own
constexpr double kMeasuredMessages = 50'000;  // at the least, in as many stops as it takes
constexpr double kStreamAgeSeconds = 30.0 * 86400;

struct Kind {
  const char* name;
  Stream stream;
  bool writesFile;
};

constexpr std::array kKinds{
    Kind{"ordinary", Stream::Ordinary, false}, Kind{"merging pairs", Stream::MergingPairs, false},
    Kind{"ending segments", Stream::EndingSegments, false}, Kind{"ordinary, summary file", Stream::Ordinary, true}};

double allocatedBytes() {
  const struct mallinfo2 facts = ::mallinfo2();
  return static_cast<double>(facts.uordblks + facts.hblkhd);
}

// Stops after all other workers, when the log is at its longest and nothing else is left of the stop: sees what the
// log takes.
class LogWitness final : public TarnReportingSessionWorkerProtocol {
 public:
  static constexpr std::string_view kClassName = "LogWitness";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  static std::unique_ptr<LogWitness> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return std::make_unique<LogWitness>(session);
  }
  void stop() { seen_ = allocatedBytes(); }
  // Allocated bytes at the last stop of any session.
  static double seen() { return seen_; }

 private:
  static inline double seen_ = 0;
};

// The workers of the service, and the witness.
std::span<const TarnReportingSessionWorkerClass> witnessedWorkerClasses() {
  static const std::vector<TarnReportingSessionWorkerClass> classes = [] {
    const auto table = TarnReportingWorkerClasses();
    std::vector<TarnReportingSessionWorkerClass> all(table.begin(), table.end());
    all.push_back(TarnReportingSessionWorkerClass::of<LogWitness>());
    return all;
  }();
  return classes;
}

std::shared_ptr<TarnReportingSession> makeSession(const Kind& kind) {
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  auto session = TarnReportingSession::initWithID(kReporterID, {1});
  session->setServiceType(kind.writesFile ? AudioServiceType::Test : AudioServiceType::Generic);
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  return session;
}

void fill(TarnReportingSession& session, const Kind& kind, std::size_t length) {
  const double start = TarnReportingFacilities().clock.epochSeconds() - kStreamAgeSeconds;
  session.start();
  for (std::uint64_t number = 0; session.messages().size() < length; ++number) {
    session.sendMessage(makeStreamMessage(kind.stream, number, start));
  }
}

// A session that is filled and stopped until enough was measured: nanoseconds of processor time of a stop, bytes that
// the log takes at its end, derived messages included, and how many more were resident at the most.
std::vector<double> measureStops(const Kind& kind, std::size_t length, const std::string& directory) {
  ::malloc_trim(0);  // what this program freed before must not serve again
  const SessionPlatform platform(Tally::TakesEverything, directory);
  TarnReportingSession::setAllWorkerClasses(witnessedWorkerClasses());
  const auto warm = makeSession(kind);
  fill(*warm, kind, 1000);
  warm->stop();
  const auto session = makeSession(kind);
  const double allocatedBefore = allocatedBytes();
  const double residentBefore = residentBytes(0);
  Samples samples;
  do {
    // A file in the same second as another would have to look for a free name.
    std::filesystem::remove_all(directory + "/DiagnosticLogs");
    fill(*session, kind, length);
    samples.push_back(nanosecondsEach(1, [&](std::size_t) { session->stop(); }));
  } while (static_cast<double>(samples.size() * length) < kMeasuredMessages);
  const double log = LogWitness::seen() - allocatedBefore;
  return {median(samples), log, std::max(peakResidentBytes() - residentBefore - log, 0.0)};
}

std::string powerOfTen(std::size_t length) {
  std::size_t power = 0;
  for (std::size_t rest = length; rest >= 10; rest /= 10) {
    ++power;
  }
  return "10^" + std::to_string(power);
}

class StopFigure {
 public:
  StopFigure(const Kind& kind, std::size_t length) : kind_(kind), length_(length) {}

  void measure(const Settings& settings) {
    const TemporaryDirectory directory(settings.directory);
    const auto values = measureInChild([&] { return measureStops(kind_, length_, directory.path()); });
    nanoseconds_.push_back(values.at(0));
    logBytes_.push_back(values.at(1));
    extraBytes_.push_back(values.at(2));
  }

  double nanosecondsEach() const { return median(nanoseconds_) / static_cast<double>(length_); }

  void addTime(Table& table, double first) const {
    Row row{"stop of " + powerOfTen(length_) + " messages, " + kind_.name + ", a message",
            nanoseconds(nanosecondsEach()),
            "in all " + milliseconds(median(nanoseconds_) / 1e9),
            times(nanosecondsEach() / first) + " of 10^3",
            "",
            {}};
    if (kind_.writesFile) {
      table.add(row);
    } else {
      row.target = "<= 3.00 us";
      table.addWithTarget(row, nanosecondsEach(), kTargetNanoseconds);
    }
  }

  void addMemory(Table& table) const {
    const double ratio = median(extraBytes_) / median(logBytes_);
    table.addWithTarget({"stop of " + powerOfTen(length_) + " messages, " + kind_.name + ", extra memory",
                         megabytes(median(extraBytes_)),
                         "the log " + megabytes(median(logBytes_)),
                         times(ratio),
                         "<= 0.50 x the log",
                         {}},
                        ratio, kTargetMemory);
  }

 private:
  Kind kind_;
  std::size_t length_;
  Samples nanoseconds_;
  Samples logBytes_;
  Samples extraBytes_;
};

}  // namespace

void measureStop(const Settings& settings, Table& table) {
  const std::vector<std::size_t> lengths = settings.quick ? std::vector<std::size_t>{1'000, 10'000}
                                                          : std::vector<std::size_t>{1'000, 10'000, 100'000, 1'000'000};
  for (const Kind& kind : kKinds) {
    std::vector<StopFigure> figures;
    for (const std::size_t length : lengths) {
      figures.emplace_back(kind, length);
    }
    for (int round = 0; round < settings.rounds; ++round) {
      for (StopFigure& figure : figures) {
        figure.measure(settings);
      }
    }
    for (const StopFigure& figure : figures) {
      figure.addTime(table, figures.front().nanosecondsEach());
    }
    figures.back().addMemory(table);
  }
}

}  // namespace tarn::bench
