// SPDX-License-Identifier: Apache-2.0
#include "telemetry/trace/TarnReportingTraceResults.h"

#include <cstdint>
#include <unordered_map>
#include <utility>

#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/FileSystem.h"
#include "platform/LocalCalendar.h"
#include "platform/ProcessControl.h"
#include "platform/ProcessEnvironment.h"
#include "service/vocabulary/FileNameText.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "telemetry/trace/TarnReportingProbeDescriptions.h"
#include "telemetry/trace/TarnReportingTraceConfiguration.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingTraceCategory,
                                   "TarnReportingSessionTraceWorker"};  // whose results these are
constexpr std::int32_t kResultsVersion = 4;
constexpr std::uint32_t kWriterFlags = 0;
constexpr std::uint32_t kDirectoryPermissions = 0777;  // less the process's mask
constexpr double kMillisecondsInASecond = 1000;
constexpr int kMissingClassStatus = 1;  // that of a service that can't serve; 2 means that a client ended it
// The analysis library serves only those who know that its results are no promise.
constexpr std::string_view kAcknowledgementVariable = "APPROVED_BY_SKEIN_TEAM";
constexpr std::string_view kAcknowledgement = "tarnkit measures its own test sessions with it";

bool isOurs(const platform::SignpostInterval& interval) {
  return interval.subsystem.find("sys.oxbow.audio") != std::string::npos ||
         interval.subsystem.find("sys.oxbow.tarnkit") != std::string::npos;
}

double millisecondsOf(const platform::SignpostInterval& interval) {
  return interval.durationSeconds * kMillisecondsInASecond;
}

// The library; null when it or a class is missing, and then the process is ending.
std::shared_ptr<platform::TraceAnalysisLibrary> loadLibrary() {
  const platform::Facilities& facilities = TarnReportingFacilities();
  if (const auto error = facilities.processEnvironment.set(kAcknowledgementVariable, kAcknowledgement);
      error.failed()) {
    kLog(LogLevel::Error, "failed to set %@: %@", kAcknowledgementVariable, error->text);
  }
  platform::TraceAnalysis::Loaded loaded = facilities.traceAnalysis->load();
  if (!loaded.library) {
    kLog(LogLevel::Error, "Unable to find class %s", loaded.missingClass);
    facilities.processControl.exitProcess(kMissingClassStatus);
  }
  return std::move(loaded.library);
}

// The name of a result file that the configuration doesn't name.
std::string generatedFileName(const TarnReportingSession& session) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  const std::string application = fileNameText(TarnReportingUtilityRetrieveAppName(session.configuration()));
  std::string name = facilities.localCalendar.format(facilities.clock.epochSeconds(), "yyyyMMdd-HHmmssZ");
  name += "-tarnkit-" + application + "-";
  name += TarnReportingUtilityGenerateServiceNameFromServiceType(session.serviceType());
  return name + ".pdj";
}

std::string pathIn(std::string directory, std::string_view file) {
  if (!directory.ends_with('/')) {
    directory += '/';
  }
  return directory.append(file);
}

}  // namespace

TarnReportingTraceResults::TarnReportingTraceResults(const TarnReportingSession& session, std::string perfDataName,
                                                     std::uint64_t eventsLeftOut)
    : session_(session), mPerfDataName_(std::move(perfDataName)), eventsLeftOut_(eventsLeftOut) {}

void TarnReportingTraceResults::processTraceSkein(const std::optional<std::string>& tracePath) {
  const plist::ValueView path = tracePath ? plist::ValueView(*tracePath) : plist::ValueView();
  kLog(LogLevel::Info, "Starting Skein Process Trace. Path: %@", path);
  if (!tracePath || !TarnReportingFacilities().fileSystem.exists(*tracePath)) {
    kLog(LogLevel::Error, "No traceResults at path: %@", path);
    return;
  }
  const std::optional<std::vector<plist::Dictionary>> descriptions =
      readProbeDescriptions(configuredText(session_.configuration(), kProbeDescriptionsKey));
  if (!descriptions) return;
  const auto library = loadLibrary();
  if (!library) return;
  const auto model = library->openTrace(*tracePath);
  if (model.failed()) {
    kLog(LogLevel::Error, "failed to create Skein model: %@", model.error->text);
    return;
  }
  // Without a writer there is nowhere to write to.
  if (!createPDWriter()) return;
  processSignposts(*model.value);
  for (const platform::TraceProbe& probe : library->probesForDictionaries(*descriptions, *model.value)) {
    processProbe(probe);
  }
  writeLastProbe();
  writeExtensions();
  closeAndMove();
}

bool TarnReportingTraceResults::createPDWriter() {
  const platform::Facilities& facilities = TarnReportingFacilities();
  platform::FileSystem& files = facilities.fileSystem;
  const plist::Dictionary configuration = session_.configuration();
  std::string directory(configuredText(configuration, kOutputFileDirectoryKey));
  if (directory.empty()) {
    directory = files.wellKnownDirectory(platform::WellKnownDirectory::DiagnosticLogs) + "/Audio/Traces";
  }
  if (const auto error = files.createDirectories(directory, kDirectoryPermissions); error.failed()) {
    kLog(LogLevel::Error, "can't create logging directory at %@: %@", directory, error->text);
  }
  std::string outputFile(configuredText(configuration, kOutputFileNameKey));
  if (outputFile.empty()) {
    outputFile = generatedFileName(session_);
  }
  fullWriterPath_ = pathIn(directory, outputFile);
  tempWriterPath_ = pathIn(files.wellKnownDirectory(platform::WellKnownDirectory::Temporary), "temp_perfdata.pdj");
  kLog(LogLevel::Info, "tempWriterPath: %@", tempWriterPath_);
  auto opened = facilities.perfDataWriters->open(tempWriterPath_, mPerfDataName_, kResultsVersion, kWriterFlags);
  if (opened.failed()) {
    kLog(LogLevel::Error, "Failed to open perfdata writer. errno: %d", opened.error->code);
    return false;
  }
  mWriter_ = std::move(opened.value);
  return true;
}

void TarnReportingTraceResults::processSignposts(platform::TraceModel& trace) {
  struct Sums {
    std::string name;
    double total;
    std::size_t count;
  };
  const auto intervals = trace.allSignpostIntervals();
  if (intervals.failed()) {
    kLog(LogLevel::Error, "failed to create Skein signpost data model: %@", intervals.error->text);
    return;
  }
  std::vector<Sums> sums;
  std::unordered_map<std::string_view, std::size_t> places;  // in `sums`, by names that lie in `intervals`
  for (const platform::SignpostInterval& interval : intervals.value) {
    if (!isOurs(interval)) continue;
    const double milliseconds = millisecondsOf(interval);
    kLog(LogLevel::Debug, "name:%@ time:%f ms", interval.name, milliseconds);
    writeValue(interval.name, milliseconds);
    const auto [place, isNew] = places.try_emplace(interval.name, sums.size());
    if (isNew) {
      sums.push_back({interval.name, 0, 0});
    }
    sums[place->second].total += milliseconds;
    ++sums[place->second].count;
  }
  for (const Sums& of : sums) {
    writeSums(of.name, of.total, of.count);
    addKeyVariable(of.name);
  }
}

void TarnReportingTraceResults::processProbe(const platform::TraceProbe& probe) {
  kLog(LogLevel::Debug, "%@, %@", probe.name, probe.kind);
  for (const platform::TraceProbe& child : probe.children) {
    processProbe(child);
  }
  if (!probe.measuresSignpostIntervals) return;
  for (const platform::SignpostInterval& event : probe.events) {
    if (currentProbe_ && *currentProbe_ != probe.name) {
      writeSums(*currentProbe_, totalTimeValue_, totalTimeMetrics_);
      if (!knownKeyVariables_.contains(*currentProbe_)) {
        addKeyVariable(*currentProbe_);
        addKeyVariable(*currentProbe_ + " Total");
        addKeyVariable(*currentProbe_ + " AVG");
      }
      totalTimeValue_ = 0;
      totalTimeMetrics_ = 0;
    }
    currentProbe_ = probe.name;
    const double milliseconds = millisecondsOf(event);
    kLog(LogLevel::Debug, "name:%@ time:%f ms", event.name, milliseconds);
    writeValue(probe.name, milliseconds);
    totalTimeValue_ += milliseconds;
    ++totalTimeMetrics_;
  }
}

// The last probe has no follower that would write its sums. When no probe had an event there is none: its average would
// be no number.
void TarnReportingTraceResults::writeLastProbe() {
  if (currentProbe_) {
    writeSums(*currentProbe_, totalTimeValue_, totalTimeMetrics_);
  }
}

void TarnReportingTraceResults::writeExtensions() {
  const auto keyVariables = mWriter_->startExtension("@tdg-perf.key_variables");
  for (const std::string& name : keyVariables_) {
    mWriter_->stringMember(keyVariables, name, "[]");
  }
  mWriter_->endExtension(keyVariables);
  const auto database = mWriter_->startExtension("@tdg-perf.database_id");
  mWriter_->stringMember(database, "InfluxDB", "TarnReporter");
  mWriter_->endExtension(database);
  if (eventsLeftOut_ > 0) {
    const auto trace = mWriter_->startExtension("@tdg-perf.trace");
    mWriter_->stringMember(trace, "eventsLeftOut", std::to_string(eventsLeftOut_));
    mWriter_->endExtension(trace);
  }
}

void TarnReportingTraceResults::closeAndMove() {
  if (const auto error = mWriter_->close(); error.failed()) {
    kLog(LogLevel::Error, "Failed to close perfdata writer. errno: %d", error->code);
    return;
  }
  kLog(LogLevel::Info, "Moving file from tempWriterPath: %@ to %@", tempWriterPath_, fullWriterPath_);
  if (TarnReportingFacilities().fileSystem.moveFile(tempWriterPath_, fullWriterPath_).failed()) {
    kLog(LogLevel::Error, "Failed to move file");
  }
}

void TarnReportingTraceResults::writeValue(std::string_view name, double milliseconds) {
  mWriter_->newValue(name, platform::PerfDataUnit::Milliseconds, milliseconds);
}

void TarnReportingTraceResults::writeSums(const std::string& name, double total, std::size_t count) {
  writeValue(name + " Total", total);
  writeValue(name + " AVG", total / static_cast<double>(count));
}

void TarnReportingTraceResults::addKeyVariable(const std::string& name) {
  if (knownKeyVariables_.insert(name).second) {
    keyVariables_.push_back(name);
  }
}

}  // namespace tarn
