// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSession.h"

#include <optional>

#include "platform/Facilities.h"
#include "platform/TracePoints.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingServerQueue.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSession"};

constexpr std::uint32_t kTraceCreated = 0x21044828;
constexpr std::uint32_t kTraceStarted = 0x2104482C;
constexpr std::uint32_t kTraceStopped = 0x21044830;
constexpr std::uint32_t kTraceDestroyed = 0x21044834;

// A single-message session has none: it takes the messages of many clients, of whom none opened it.
platform::SessionRecords* recordsFor(TarnReportingSession::Mode mode) {
  return mode == TarnReportingSession::Mode::Ordinary ? TarnReportingFacilities().sessionRecords : nullptr;
}

// By which application the session records know the session.
std::string applicationOf(const plist::Dictionary& configuration) {
  const plist::ValueView application = configuration.get(keys::kHostApplicationDisplayID);
  return application ? application.asText() : std::string();
}

// The table of worker classes and, once the first session is made, the lists derived from it.
struct ClassLists {
  std::span<const TarnReportingSessionWorkerClass> all;
  std::optional<TarnReportingSessionWorkerClasses> derived;
};

void trace(std::uint32_t code, std::int64_t reporterID) {
  TarnReportingFacilities().tracePoints.emit(code, reporterID);
}

}  // namespace

void TarnReportingSession::setAllWorkerClasses(std::span<const TarnReportingSessionWorkerClass> table) {
  *ProcessState::of<ClassLists>() = {table, std::nullopt};
}

std::span<const TarnReportingSessionWorkerClass> TarnReportingSession::getAllWorkerClasses() {
  return ProcessState::of<ClassLists>()->all;
}

const TarnReportingSessionWorkerClasses& TarnReportingSession::workerClasses() {
  const auto lists = ProcessState::of<ClassLists>();
  if (!lists->derived) {
    lists->derived.emplace(lists->all);
  }
  return *lists->derived;
}

std::shared_ptr<TarnReportingSession> TarnReportingSession::initWithID(std::int64_t reporterID,
                                                                       std::vector<std::int32_t> processIdentifiers,
                                                                       Mode mode, const Opener& opener) {
  TarnReportingRequireServerQueue();
  struct Constructible : TarnReportingSession {
    Constructible(std::int64_t theID, std::vector<std::int32_t> identifiers, Mode theMode, const Opener& theOpener)
        : TarnReportingSession(theID, std::move(identifiers), theMode, theOpener) {}
  };
  std::shared_ptr<TarnReportingSession> session =
      std::make_shared<Constructible>(reporterID, std::move(processIdentifiers), mode, opener);
  const platform::SessionScope scope = session->chronicle_.enter();
  session->workers_.startWorkersFromClasses(workerClasses().startOnInitWorkerClasses, session);
  kLog(LogLevel::Info, "created reporting session for ID: %lli", reporterID);
  trace(kTraceCreated, reporterID);
  return session;
}

TarnReportingSession::TarnReportingSession(std::int64_t reporterID, std::vector<std::int32_t> processIdentifiers,
                                           Mode mode, const Opener& opener)
    : reporterID_(reporterID),
      processIdentifiers_(std::move(processIdentifiers)),
      mode_(mode),
      user_(opener.user),
      connection_(opener.connection),
      serviceName_(TarnReportingUtilityGenerateServiceNameFromServiceType(serviceType_)),
      application_(TarnReportingUtilityRetrieveAppName(configuration_)),
      clientProcessName_(opener.process),
      chronicle_(recordsFor(mode), facts()),
      log_(reporterID) {}

TarnReportingSession::~TarnReportingSession() {
  kLog(LogLevel::Info, "deallocing this session %lli", reporterID_);
  trace(kTraceDestroyed, reporterID_);
  const platform::SessionScope scope = chronicle_.enter();
  workers_.release();
}

void TarnReportingSession::setServiceType(AudioServiceType serviceType) {
  TarnReportingRequireServerQueue();
  const platform::SessionScope scope = chronicle_.enter();
  const std::string_view serviceName = TarnReportingUtilityGenerateServiceNameFromServiceType(serviceType);
  if (chronicle_.isKept() && serviceType != serviceType_) {
    platform::SessionFacts changed = facts();
    changed.serviceType = static_cast<std::int64_t>(serviceType);
    changed.serviceName = serviceName;
    chronicle_.describe(changed);
  }
  serviceType_ = serviceType;
  serviceName_ = serviceName;
  kLog(LogLevel::Info, "setting service type %@", serviceName_);
}

void TarnReportingSession::updateConfigurationWithContentsOfConfiguration(const plist::Dictionary* configuration) {
  TarnReportingRequireServerQueue();
  static const plist::Key kMirrored("KvHostApplicationDisplayID");
  if (configuration == nullptr) return;
  const platform::SessionScope scope = chronicle_.enter();
  plist::Dictionary merged = configuration_;
  merged.set(keys::kHostApplicationDisplayID, configuration->get(kMirrored));
  merged.merge(*configuration);
  plist::Key appName(TarnReportingUtilityRetrieveAppName(merged));
  if (chronicle_.isKept()) {
    std::string application = applicationOf(merged);
    if (application != applicationOf(configuration_)) {
      platform::SessionFacts changed = facts();
      changed.application = std::move(application);
      chronicle_.describe(changed);
    }
  }
  application_ = std::move(appName);
  configuration_ = std::move(merged);
}

void TarnReportingSession::setClientProcessName(std::string name) {
  if (chronicle_.isKept() && name != clientProcessName_) {
    platform::SessionFacts changed = facts();
    changed.process = name;
    chronicle_.describe(changed);
  }
  clientProcessName_ = std::move(name);
}

platform::SessionFacts TarnReportingSession::facts() const {
  platform::SessionFacts facts;
  facts.reporter = reporterID_;
  facts.connection = connection_;
  facts.pid = processIdentifiers_.empty() ? 0 : processIdentifiers_.front();
  facts.uid = user_;
  facts.process = clientProcessName_;
  facts.application = applicationOf(configuration_);
  facts.serviceType = static_cast<std::int64_t>(serviceType_);
  facts.serviceName = serviceName_;
  return facts;
}

void TarnReportingSession::start() {
  const platform::SessionScope scope = chronicle_.enter();
  appendMarker(AudioEventType::Start, "start");
  kLog(LogLevel::Info, "start called. reporterID=%lli", reporterID_);
  if (started_) {
    kLog(LogLevel::Info, "%lli is already started", reporterID_);
    return;
  }
  kLog(LogLevel::Debug, "self.started==false. starting. reporterID=%lli", reporterID_);
  // A start that fails in the middle goes on where it stopped when it is tried again.
  struct Starting {
    bool& started;
    bool failed = true;
    ~Starting() { started = !failed; }
  } starting{started_};
  started_ = true;
  trace(kTraceStarted, reporterID_);
  chronicle_.start();
  workers_.startWorkersFromClasses(workerClasses().initializableWorkerClasses, shared_from_this());
  starting.failed = false;
}

void TarnReportingSession::stop() {
  const platform::SessionScope scope = chronicle_.enter();
  appendMarker(AudioEventType::Stop, "stop");
  kLog(LogLevel::Debug, "stop called. reporterID=%lli", reporterID_);
  if (!started_) return;
  kLog(LogLevel::Debug, "ending session. reporterID=%lli", reporterID_);
  trace(kTraceStopped, reporterID_);
  log_.sort();
  workers_.stopWorkers(reporterID_);
  log_.clear();
  totalMessageCount_ = 0;
  started_ = false;
  chronicle_.stop();
}

void TarnReportingSession::appendMarker(AudioEventType type, std::string_view method) {
  TarnReportingRequireServerQueue();
  const std::string suffix(method);
  const std::size_t count = log_.size();
  auto marker = std::make_shared<TarnReportingSessionMessage>(
      plist::Dictionary{{"method", method},
                        {"messages_at_" + suffix, count},
                        {"unique_messages_at_" + suffix, count},
                        {"reporterid", reporterID_},
                        {"running_at_" + suffix, started_ ? "YES" : "NO"}},
      AudioEventCategory::Setup, type);
  addMissingDates(*marker);
  addAudioMessageTag(*marker);
  log_.append(std::move(marker));
}

std::string TarnReportingSession::description() const {
  std::string text = "reporterID=" + std::to_string(reporterID_) + ",serviceName=";
  text += serviceName_;
  text += ",ownerPid=" + std::to_string(processIdentifiers_.empty() ? 0 : processIdentifiers_.front());
  text += ",clientProcessName=" + (clientProcessName_.empty() ? std::string("(null)") : clientProcessName_);
  text += ",HostApplicationDisplayID=" + TarnReportingUtilityRetrieveAppName(configuration_);
  text += started_ ? ",started=1" : ",started=0";
  text += isSingleMessageSession() ? ",singleMessageSession=1" : ",singleMessageSession=0";
  return text;
}

}  // namespace tarn
