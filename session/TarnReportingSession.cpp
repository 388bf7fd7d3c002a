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
                                                                       Mode mode) {
  TarnReportingRequireServerQueue();
  struct Constructible : TarnReportingSession {
    Constructible(std::int64_t theID, std::vector<std::int32_t> identifiers, Mode theMode)
        : TarnReportingSession(theID, std::move(identifiers), theMode) {}
  };
  std::shared_ptr<TarnReportingSession> session =
      std::make_shared<Constructible>(reporterID, std::move(processIdentifiers), mode);
  session->workers_.startWorkersFromClasses(workerClasses().startOnInitWorkerClasses, session);
  kLog(LogLevel::Info, "created reporting session for ID: %lli", reporterID);
  trace(kTraceCreated, reporterID);
  return session;
}

TarnReportingSession::TarnReportingSession(std::int64_t reporterID, std::vector<std::int32_t> processIdentifiers,
                                           Mode mode)
    : reporterID_(reporterID),
      processIdentifiers_(std::move(processIdentifiers)),
      mode_(mode),
      serviceName_(TarnReportingUtilityGenerateServiceNameFromServiceType(serviceType_)),
      log_(reporterID) {}

TarnReportingSession::~TarnReportingSession() {
  kLog(LogLevel::Info, "deallocing this session %lli", reporterID_);
  trace(kTraceDestroyed, reporterID_);
}

void TarnReportingSession::setServiceType(AudioServiceType serviceType) {
  TarnReportingRequireServerQueue();
  serviceType_ = serviceType;
  serviceName_ = TarnReportingUtilityGenerateServiceNameFromServiceType(serviceType);
  kLog(LogLevel::Info, "setting service type %@", serviceName_);
}

void TarnReportingSession::updateConfigurationWithContentsOfConfiguration(const plist::Dictionary* configuration) {
  TarnReportingRequireServerQueue();
  static const plist::Key kMirrored("KvHostApplicationDisplayID");
  if (configuration == nullptr) return;
  configuration_.set(keys::kHostApplicationDisplayID, configuration->get(kMirrored));
  configuration_.merge(*configuration);
}

void TarnReportingSession::start() {
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
  workers_.startWorkersFromClasses(workerClasses().initializableWorkerClasses, shared_from_this());
  starting.failed = false;
}

void TarnReportingSession::stop() {
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
