// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingClientServerInstance.h"

#include <algorithm>
#include <new>

#include "platform/Facilities.h"
#include "platform/ProcessControl.h"
#include "platform/TracePoints.h"
#include "platform/WorkQueue.h"
#include "service/TarnReportingMessageDelivery.h"
#include "service/TarnReportingRunDelivery.h"
#include "service/TarnReportingSessionListing.h"
#include "service/TarnReportingSlices.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingServerQueue.h"
#include "service/vocabulary/TarnReportingSignpost.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = "TarnReportingClientServerInstance";
constexpr TarnReportingLogger kLog{TarnReportingClientCategory, kModule};
constexpr int kKilledExitStatus = 2;

constexpr std::uint32_t kTraceCreate = 0x21044814;
constexpr std::uint32_t kTraceStart = 0x21044818;
constexpr std::uint32_t kTraceStop = 0x2104481C;

// What long work costs, in units of about a microsecond.
constexpr std::size_t kStopCost = 32;
constexpr std::size_t kMessagesPerStopCost = 2;  // of the stopped session's log
constexpr std::size_t kRemovalsAtOnce = 4;       // sessions that are released in a unit's time and some

void trace(std::uint32_t code, std::int64_t reporterID) {
  TarnReportingFacilities().tracePoints.emit(code, reporterID);
}

// The work of an operation on the server queue.
TarnReportingSignpost operation(std::string_view verb, platform::SignpostArgument argument = {}) noexcept {
  return {SignpostCategory::Operation, kModule, verb, argument};
}

void onServerQueue(platform::Work work) {
  TarnReportingUtilityGetReportingServerQueue()->async(std::move(work));
}

// How sessions end whose client ends so.
platform::SessionEnd sessionEndOf(TarnReportingClientEnd end) noexcept {
  return end == TarnReportingClientEnd::ServiceStopping ? platform::SessionEnd::ServiceStopping
                                                        : platform::SessionEnd::ClientGone;
}

// Sends the reply that a start call left with the session, if there is one.
void sendHeldReply(TarnReportingSession& session) {
  if (platform::Acknowledge held = std::move(session.transactionCompleteBlock())) {
    held(std::nullopt, true);
  }
}

}  // namespace

std::shared_ptr<TarnReportingClientServerInstance> TarnReportingClientServerInstance::initWithPID(
    std::int32_t processIdentifier, std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate, std::uint32_t user) {
  struct Constructible : TarnReportingClientServerInstance {
    Constructible(std::int32_t pid, std::weak_ptr<TarnReportingServiceDelegateProtocol> service, std::uint32_t theUser)
        : TarnReportingClientServerInstance(pid, std::move(service), theUser) {}
  };
  return std::make_shared<Constructible>(processIdentifier, std::move(delegate), user);
}

TarnReportingClientServerInstance::TarnReportingClientServerInstance(
    std::int32_t processIdentifier, std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate, std::uint32_t user)
    : processIdentifier_(processIdentifier), user_(user), delegate_(std::move(delegate)) {
  kLog(LogLevel::Debug, "new client with pid %lu", processIdentifier_);
}

TarnReportingClientServerInstance::~TarnReportingClientServerInstance() {
  kLog(LogLevel::Default, "dealloc %i from the server client list", processIdentifier_);
}

void TarnReportingClientServerInstance::createReportingSession(std::int64_t reporterID, platform::Acknowledge reply) {
  onServerQueue([self = shared_from_this(), reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("createReportingSession", {"reporterID", reporterID});
    self->create(reporterID);
    reply(std::nullopt, true);
  });
}

void TarnReportingClientServerInstance::setServiceType(std::uint16_t serviceType, std::int64_t reporterID,
                                                       platform::Acknowledge reply) {
  onServerQueue([self = shared_from_this(), serviceType, reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("setServiceType", {"reporterID", reporterID});
    self->retype(serviceType, reporterID);
    reply(std::nullopt, true);
  });
}

void TarnReportingClientServerInstance::getServiceNameForReporterID(std::int64_t reporterID,
                                                                    platform::Reply<std::uint16_t> reply) {
  onServerQueue([self = shared_from_this(), reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("getServiceNameForReporterID", {"reporterID", reporterID});
    kLog(LogLevel::Default, "fetching seviceType");
    const auto session = reporterID == 0 ? nullptr : self->findReportingSessionForID(reporterID, true);
    reply(std::nullopt, static_cast<std::uint16_t>(session ? session->serviceType() : AudioServiceType::Unknown));
  });
}

void TarnReportingClientServerInstance::setConfiguration(plist::Dictionary configuration, std::int64_t reporterID,
                                                         platform::Acknowledge reply) {
  onServerQueue([self = shared_from_this(), configuration = std::move(configuration), reporterID,
                 reply = std::move(reply)]() mutable {
    const auto signpost = operation("setConfiguration", {"reporterID", reporterID});
    kLog(LogLevel::Default, "setting configuration");
    if (const auto session = self->findReportingSessionForID(reporterID, false)) {
      session->updateConfigurationWithContentsOfConfiguration(&configuration);
    }
    reply(std::nullopt, true);
  });
}

void TarnReportingClientServerInstance::startReportingSessionForID(std::int64_t reporterID,
                                                                   platform::Acknowledge reply) {
  onServerQueue([self = shared_from_this(), reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("startReportingSessionForID", {"reporterID", reporterID});
    self->start(reporterID, std::move(reply));
  });
}

void TarnReportingClientServerInstance::sendMessage(plist::Dictionary message, std::uint32_t category,
                                                    std::uint16_t type, platform::ReporterIDs reporterIDs,
                                                    platform::Reply<> reply) {
  TarnReportingMessageAccount account(delegate_);
  if ((!reporterIDs || reporterIDs->empty()) && TarnReportingUtilityIsInternalBuild()) {
    // Workers of internal builds tell by this key that the message came without a session.
    if (const auto service = delegate_.lock(); service && service->isReportingEnabled()) {
      message.set("sendSingleMessage", true);
    }
  }
  onServerQueue([self = shared_from_this(),
                 delivery = TarnReportingMessageDelivery(std::move(message), category, type, std::move(reporterIDs),
                                                         std::move(reply), std::move(account))]() mutable {
    const auto signpost = operation("sendMessage", {"category", delivery.category()});
    delivery.begin(self->processIdentifier_, self->delegate_);
  });
}

void TarnReportingClientServerInstance::sendMessages(platform::MessageRun& run) {
  TarnReportingRequireServerQueue();
  TarnReportingRunDelivery delivery(processIdentifier_, delegate_.lock());
  while (const platform::MessageRun::Message* const message = run.next()) {
    delivery.deliver(*message);
  }
}

void TarnReportingClientServerInstance::stopReportingSessionForID(std::int64_t reporterID,
                                                                  platform::Acknowledge reply) {
  onServerQueue([self = shared_from_this(), reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("stopReportingSessionForID", {"reporterID", reporterID});
    self->stop(reporterID);
    reply(std::nullopt, true);
  });
}

void TarnReportingClientServerInstance::destroyReportingSession(std::int64_t reporterID, platform::Acknowledge reply) {
  onServerQueue([self = shared_from_this(), reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("destroyReportingSession", {"reporterID", reporterID});
    self->destroy(reporterID);
    reply(std::nullopt, true);
  });
}

void TarnReportingClientServerInstance::reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) {
  onServerQueue([self = shared_from_this(), reporterID, reply = std::move(reply)]() mutable {
    const auto signpost = operation("reporterID", {"reporterID", reporterID});
    kLog(LogLevel::Default, "validating reporter %lli", reporterID);
    const auto session = self->findReportingSessionForID(reporterID, true);
    const auto type = session ? session->serviceType() : AudioServiceType::Unknown;
    reply(std::nullopt,
          plist::Dictionary{{"reporterID", session ? reporterID : 0}, {"serviceType", static_cast<int>(type)}});
  });
}

void TarnReportingClientServerInstance::getAllReporters(platform::Reply<std::vector<std::int64_t>> reply) {
  onServerQueue([self = shared_from_this(), listing = TarnReportingSessionListing(std::move(reply))]() mutable {
    const auto signpost = operation("getAllReporters");
    listing.proceed(self->delegate_);
  });
}

void TarnReportingClientServerInstance::killService() {
  onServerQueue([] {
    const auto signpost = operation("killService");
    kLog(LogLevel::Default, "DESTROYING SERVICE");
    TarnReportingFacilities().processControl.exitProcess(kKilledExitStatus);
  });
}

std::optional<std::uint16_t> TarnReportingClientServerInstance::serviceTypeOf(std::int64_t reporterID) const {
  const auto session = sessions_.find(reporterID);
  return session ? std::optional(static_cast<std::uint16_t>(session->serviceType())) : std::nullopt;
}

bool TarnReportingClientServerInstance::listReporterIDs(std::uint64_t& from, std::size_t atMost,
                                                        std::vector<std::int64_t>& reporters) const {
  const std::size_t most = reporters.size() + atMost;
  return !sessions_.forEachFrom(from, [&](std::int64_t reporterID) {
    reporters.push_back(reporterID);
    return reporters.size() < most;
  });
}

void TarnReportingClientServerInstance::handleConnectionError() {
  onServerQueue([self = shared_from_this()] {
    const auto signpost = operation("handleConnectionError");
    self->endClient();
  });
}

std::shared_ptr<TarnReportingSession> TarnReportingClientServerInstance::findReportingSessionForID(
    std::int64_t reporterID, bool acrossAllClients) {
  TarnReportingRequireServerQueue();
  auto session = sessions_.find(reporterID);
  if (!session && acrossAllClients) {
    if (const auto service = delegate_.lock()) {
      session = service->findReportingSessionForID(reporterID);
    }
  }
  return session;
}

std::shared_ptr<TarnReportingSession> TarnReportingClientServerInstance::makeSession(std::int64_t reporterID) {
  auto session = TarnReportingSession::initWithID(
      reporterID, {processIdentifier_}, TarnReportingSession::Mode::Ordinary, {connection_, user_, clientProcessName_});
  if (!logAccount_) {
    logAccount_ = ProcessState::of<TarnReportingSessionLogMemory>()->makeAccount(user_);
  }
  session->setLogAccount(logAccount_);
  return session;
}

void TarnReportingClientServerInstance::listSessions(std::shared_ptr<TarnReportingSessionIndex> index,
                                                     std::uint64_t number) {
  // A platform may deliver requests before the service's own work lists the client.
  sessions_.list(std::move(index), number, *this);
}

void TarnReportingClientServerInstance::stopSession(TarnReportingSession& session) {
  TarnReportingSpend(session.messages().size() / kMessagesPerStopCost);
  session.stop();
  sessions_.setRunning(session.reporterID(), session.started());
}

void TarnReportingClientServerInstance::logReportingSessions() {
  if (const auto service = delegate_.lock()) {
    service->logReportingSessions();
  }
}

void TarnReportingClientServerInstance::create(std::int64_t reporterID) {
  kLog(LogLevel::Default, "creating session for reporter %lli", reporterID);
  trace(kTraceCreate, reporterID);
  auto session = makeSession(reporterID);
  if (const auto earlier = sessions_.find(reporterID)) {
    earlier->chronicle().end(platform::SessionEnd::Replaced);
  }
  sessions_.store(reporterID, std::move(session));
  kLog(LogLevel::Default, "session created for reporter %lli", reporterID);
}

void TarnReportingClientServerInstance::retype(std::uint16_t serviceType, std::int64_t reporterID) {
  kLog(LogLevel::Default, "setting service type %i for reporter %lli", serviceType, reporterID);
  const auto type = static_cast<AudioServiceType>(serviceType);
  const auto session = reporterID == 0 ? nullptr : findReportingSessionForID(reporterID, false);
  if (session && session->serviceType() == type) {
    session->setServiceType(type);
  } else if (session) {
    // A session's type is settled with its workers, so a change of type is a new session.
    const auto replacement = makeSession(reporterID);
    replacement->updateConfigurationWithContentsOfConfiguration(&session->configuration());
    replacement->previousValues().merge(session->previousValues());
    replacement->setServiceType(type);
    session->chronicle().end(platform::SessionEnd::Retyped);
    sessions_.store(reporterID, replacement);
  }
  kLog(LogLevel::Default, "service type %i set for reporter  %lli", serviceType, reporterID);
}

void TarnReportingClientServerInstance::start(std::int64_t reporterID, platform::Acknowledge reply) {
  kLog(LogLevel::Default, "starting session for reporter %lli", reporterID);
  trace(kTraceStart, reporterID);
  const auto session = reporterID == 0 ? nullptr : findReportingSessionForID(reporterID, false);
  if (!session) {
    reply(std::nullopt, true);
    return;
  }
  if (session->started()) {
    return;  // the reply of the first start stands for both
  }
  session->start();
  sessions_.setRunning(reporterID, session->started());
  sendHeldReply(*session);
  session->transactionCompleteBlock() = std::move(reply);
  if (session->serviceType() == AudioServiceType::Test && TarnReportingUtilityIsInternalBuild()) {
    session->transactionCompleteBlock()(std::nullopt, true);  // test clients don't wait for the stop
  }
  logReportingSessions();
}

void TarnReportingClientServerInstance::stop(std::int64_t reporterID) {
  kLog(LogLevel::Default, "stopping session for reporter %lli", reporterID);
  trace(kTraceStop, reporterID);
  if (reporterID == 0) return;
  const auto session = findReportingSessionForID(reporterID, false);
  if (session && session->started()) {
    stopSession(*session);
    sendHeldReply(*session);
    logReportingSessions();
  } else {
    kLog(
        LogLevel::Error,
        "Stop called, but session==nil or session.started==false. reporterID=%lli session=%@ session.started=%i",
        reporterID, [&] { return session ? session->description() : std::string("(null)"); },
        session && session->started());
  }
  kLog(LogLevel::Default, "stopping %lli", reporterID);
}

void TarnReportingClientServerInstance::destroy(std::int64_t reporterID) {
  kLog(LogLevel::Default, "destroying session for reporter %lli", reporterID);
  if (const auto session = sessions_.find(reporterID)) {
    if (session->started()) {
      stopSession(*session);
    }
    session->chronicle().end(platform::SessionEnd::Destroyed);
  }
  sessions_.remove(reporterID);
  kLog(LogLevel::Default, "destroying %lli", reporterID);
  logReportingSessions();
}

void TarnReportingClientServerInstance::endClient() {
  const auto service = delegate_.lock();
  if (!service) return;
  const auto& clients = service->getAllClients();
  const bool isListed =
      std::any_of(clients.begin(), clients.end(), [&](const auto& client) { return client.get() == this; });
  if (!isListed) return;
  if (const auto end = service->clientEnd();
      end != TarnReportingClientEnd::ClientGone && !std::exchange(endTold_, true)) {
    kLog(LogLevel::Default, "ending client %i. reason=%s", processIdentifier_, TarnReportingClientEndName(end));
  }
  const platform::SessionEnd sessionEnd = sessionEndOf(service->clientEnd());
  const auto rest = [self = shared_from_this()] { self->endClient(); };
  while (const auto session = sessions_.firstRunning()) {
    try {
      stopSession(*session);
    } catch (const std::bad_alloc&) {
      kLog(LogLevel::Error, "no memory to stop session %lli, it is dropped", session->reporterID());
      sessions_.remove(session->reporterID());
    }
    session->chronicle().end(sessionEnd);
    if (sessions_.size() > 1 && TarnReportingSpend(kStopCost)) {
      TarnReportingContinueLater(rest);
      return;
    }
  }
  while (const auto session = sessions_.first()) {
    session->chronicle().endUnlessStopped(sessionEnd);
    sessions_.remove(session->reporterID());
    if (sessions_.size() % kRemovalsAtOnce == 1 && TarnReportingSpend(kRemovalsAtOnce)) {
      TarnReportingContinueLater(rest);
      return;
    }
  }
  service->removeClient(*this);
  sessions_.unlist();
  kLog(LogLevel::Default, "removing %i from the server client list", processIdentifier_);
}

}  // namespace tarn
