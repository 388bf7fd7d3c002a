// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSessionSummaryJsonFileWorker.h"

#include <cstdint>
#include <unordered_map>
#include <utility>

#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/LocalCalendar.h"
#include "plist/EscapedText.h"
#include "plist/formats/Json.h"
#include "service/vocabulary/FileNameText.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionSummaryJsonFileWorker"};
constexpr std::uint32_t kDirectoryPermissions = 0777;  // less the process's mask
// Files of one session ID, application and service that were begun in the same second; one more is an error.
constexpr int kMostFilesOfOneName = 10000;

// How many messages of a name, which tells category and type, are in the file.
using Counts = std::unordered_map<std::string, std::uint64_t>;

// The file's path without ".json".
std::string pathStem(const std::string& directory, const TarnReportingSession& session) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  const std::string application = fileNameText(TarnReportingUtilityRetrieveAppName(session.configuration()));
  std::string stem = directory + "/";
  stem += facilities.localCalendar.format(facilities.clock.epochSeconds(), "yyyyMMdd-HHmmssZ");
  stem += "-" + std::to_string(session.reporterID()) + "-" + application + "-";
  stem += TarnReportingUtilityGenerateServiceNameFromServiceType(session.serviceType());
  return stem;
}

// Makes an empty file under the first name that is free. `path` is the name that was tried last.
Status createFile(const std::string& stem, std::string& path) {
  platform::FileSystem& files = TarnReportingFacilities().fileSystem;
  path = stem + ".json";
  Status error = files.createFile(path);
  for (int number = 2; error.failed() && number <= kMostFilesOfOneName && files.exists(path); ++number) {
    path = stem + "-" + std::to_string(number) + ".json";
    error = files.createFile(path);
  }
  return error;
}

void markSessionStarted(TarnReportingSessionMessage& message) {
  static const plist::Key kIsSessionStarted("isSessionStarted");
  const MutexLock guard(message);
  message.mutableMessage().set(kIsSessionStarted, message.isSessionStarted() ? "YES" : "NO");
}

// Appends the message's object to `text`. Whether JSON can hold it; what can't isn't counted.
bool appendObject(std::string& text, const TarnReportingSessionMessage& message, Counts& counts) {
  std::string name = TarnReportingUtilityCategoryString(message.category()) + "_";
  name += TarnReportingUtilityTypeString(message.type());
  std::uint64_t& count = counts[name];
  text += "{\n  ";
  plist::appendJsonText(text, name + "_" + std::to_string(count + 1));
  text += ": ";
  if (const auto misfit = plist::appendPrettyJson(text, message.message(), 1)) {
    kLog(LogLevel::Error, "dataWithJSONObject: %@", *misfit);
    return false;
  }
  text += "\n}";
  ++count;
  return true;
}

}  // namespace

std::unique_ptr<TarnReportingSessionSummaryJsonFileWorker> TarnReportingSessionSummaryJsonFileWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  if (session->serviceType() != AudioServiceType::Test && !TarnReportingUtilityIsInternalBuild()) return nullptr;
  auto worker = std::make_unique<TarnReportingSessionSummaryJsonFileWorker>(session);
  worker->setStarted(true);
  return worker;
}

void TarnReportingSessionSummaryJsonFileWorker::stop() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner || owner->messages().empty()) return;
  writeMessages(*owner);
  closeFile();
}

void TarnReportingSessionSummaryJsonFileWorker::writeMessages(const TarnReportingSession& session) {
  Counts counts;
  std::string lines;
  bool isFirst = true;
  const TarnReportingSessionMessageList& messages = session.messages();
  for (auto at = messages.begin(); at != messages.end(); ++at) {
    if ((*at)->isRedundant()) continue;
    if (reportPath_.empty() && !openFile(session)) return;
    messages.change(at.index(), markSessionStarted);
    lines = isFirst ? "" : ",\n";
    if (!appendObject(lines, **at, counts)) continue;
    if (!writeLine(lines)) return;
    isFirst = false;
  }
}

bool TarnReportingSessionSummaryJsonFileWorker::openFile(const TarnReportingSession& session) {
  platform::FileSystem& files = TarnReportingFacilities().fileSystem;
  const std::string directory = TarnReportingLogsDirectory();
  if (const auto error = files.createDirectories(directory, kDirectoryPermissions); error.failed()) {
    kLog(LogLevel::Error, "can't create logging directory at %@: %@", directory, error->text);
  }
  std::string path;
  Status error = createFile(pathStem(directory, session), path);
  if (error.ok()) {
    auto opened = files.openForWriting(path);
    error = std::move(opened.error);
    reportFileHandle_ = std::move(opened.value);
  }
  if (error.failed()) {
    kLog(LogLevel::Error, "SummaryJsonFileWorker failed to open file. action=open file=%@ error=\"%@\"", path,
         error->text);
    setStarted(false);
    return false;
  }
  kLog(LogLevel::Info, "SummaryJsonFileWorker opened file. action=open file=%@", path);
  reportPath_ = std::move(path);
  setStarted(true);
  return writeLine("[");
}

bool TarnReportingSessionSummaryJsonFileWorker::writeLine(std::string line) {
  line += '\n';
  const Status error = reportFileHandle_->write(line);
  if (error.failed()) {
    kLog(LogLevel::Error, "SummaryJsonFileWorker failed to write line. action=writeline file=%@ error=\"%@\"",
         reportPath_, error->text);
  }
  writeFailed_ = error.failed();
  return !writeFailed_;
}

void TarnReportingSessionSummaryJsonFileWorker::closeFile() {
  if (!reportFileHandle_) return;
  if (!writeFailed_) {  // after a gap the rest would be worth nothing
    writeLine("]");
  }
  if (const auto error = reportFileHandle_->close(); error.failed()) {
    kLog(LogLevel::Error, "SummaryJsonFileWorker failed to closed file. action=close file=%@ error=\"%@\"", reportPath_,
         error->text);
  } else {
    kLog(LogLevel::Info, "SummaryJsonFileWorker closed file. action=close file=%@", reportPath_);
  }
  reportFileHandle_.reset();
  reportPath_.clear();
}

}  // namespace tarn
