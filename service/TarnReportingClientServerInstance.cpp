#include "service/TarnReportingClientServerInstance.h"

#include <algorithm>

#include "platform/Facilities.h"
#include "platform/ProcessControl.h"
#include "platform/TracePoints.h"
#include "platform/WorkQueue.h"
#include "service/TarnReportingServiceDelegateProtocol.h"
#include "service/TarnReportingSessionIndex.h"
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
constexpr std::string_view kErrorDomain = "sys.oxbow.audio.reporting";
constexpr std::int64_t kReportingDisabled = 1;
constexpr int kKilledExitStatus = 2;

constexpr std::uint32_t kTraceCreate = 0x21044814;
constexpr std::uint32_t kTraceStart = 0x21044818;
constexpr std::uint32_t kTraceStop = 0x2104481C;
constexpr std::uint32_t kTraceSend = 0x21044824;

// What long work costs, in units of about a microsecond.
constexpr std::size_t kDeliveryCost = 2;
constexpr std::size_t kStopCost = 32;
constexpr std::size_t kMessagesPerStopCost = 2;  // of the stopped session's log
constexpr std::size_t kRemovalsAtOnce = 4;       // sessions that are released in a unit's time and some
constexpr std::size_t kListedAtOnce = 64;        // IDs that are listed in one

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

// Whether others are to have their turn before work goes on that has cost so much more.
bool spend(std::size_t cost) {
  return TarnReportingUtilityGetReportingServerQueue()->spend(cost);
}

void continueLater(platform::Work rest) {
  TarnReportingUtilityGetReportingServerQueue()->asyncNext(std::move(rest));
}

// Sends the reply that a start call left with the session, if there is one.
void sendHeldReply(TarnReportingSession& session) {
  if (platform::Acknowledge held = std::move(session.transactionCompleteBlock())) {
    held(std::nullopt, true);
  }
}

plist::ValueView textOf(const platform::ReporterIDs& reporterIDs, plist::Array& storage) {
  if (!reporterIDs) return {};
  for (const std::int64_t reporterID : *reporterIDs) {
    storage.append(reporterID);
  }
  return storage;
}

// What became of a record that so many workers got.
TarnReportingOutcome outcomeOf(const TarnReportingSessionMessage& record, std::size_t workers) {
  if (record.isRedundant()) return TarnReportingOutcome::Redundant;
  return workers != 0 ? TarnReportingOutcome::Delivered : TarnReportingOutcome::Unwanted;
}

// The better of two sessions' outcomes of one message.
void improve(TarnReportingOutcome& outcome, TarnReportingOutcome another) {
  outcome = std::min(outcome, another);
}

}  // namespace

// A message on its way to its sessions.
struct TarnReportingClientServerInstance::Delivery {
  plist::Dictionary message;
  std::uint32_t category;
  std::uint16_t type;
  platform::Reply<> reply;
  TarnReportingServiceDelegateProtocol::SessionSearch search;
  bool found = false;    // the search is over
  bool gaveWay = false;  // others' work was done since then
  std::size_t next = 0;  // of the sessions that were found
  TarnReportingOutcome outcome = TarnReportingOutcome::WithoutSession;

  bool toWhoeverRuns() const { return !search.reporterIDs || search.reporterIDs->empty(); }
};

// The listing of all reporter IDs.
struct TarnReportingClientServerInstance::Listing {
  platform::Reply<std::vector<std::int64_t>> reply;
  std::vector<std::int64_t> reporters;
  std::uint64_t client = 0;                 // the number of the one whose sessions are listed
  TarnReportingSessionMap::Place from = 0;  // among its sessions
};

std::shared_ptr<TarnReportingClientServerInstance> TarnReportingClientServerInstance::initWithPID(
    std::int32_t processIdentifier, std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate) {
  struct Constructible : TarnReportingClientServerInstance {
    Constructible(std::int32_t pid, std::weak_ptr<TarnReportingServiceDelegateProtocol> service)
        : TarnReportingClientServerInstance(pid, std::move(service)) {}
  };
  return std::make_shared<Constructible>(processIdentifier, std::move(delegate));
}

TarnReportingClientServerInstance::TarnReportingClientServerInstance(
    std::int32_t processIdentifier, std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate)
    : processIdentifier_(processIdentifier), delegate_(std::move(delegate)) {
  kLog(LogLevel::Debug, "new client with pid %lu", processIdentifier_);
}

TarnReportingClientServerInstance::~TarnReportingClientServerInstance() {
  kLog(LogLevel::Default, "dealloc %i from the server client list", processIdentifier_);
  while (const auto session = sessions_.first()) {
    removeSession(session->reporterID());
  }
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
  if ((!reporterIDs || reporterIDs->empty()) && TarnReportingUtilityIsInternalBuild()) {
    // Workers of internal builds tell by this key that the message came without a session.
    if (const auto service = delegate_.lock(); service && service->isReportingEnabled()) {
      message.set("sendSingleMessage", true);
    }
  }
  onServerQueue([self = shared_from_this(),
                 delivery = Delivery{
                     std::move(message), category, type, std::move(reply), {std::move(reporterIDs), {}}}]() mutable {
    const auto signpost = operation("sendMessage", {"category", delivery.category});
    self->beginToSend(delivery);
  });
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
  onServerQueue([self = shared_from_this(), reply = std::move(reply)]() mutable {
    const auto signpost = operation("getAllReporters");
    Listing listing{std::move(reply), {}};
    self->continueListing(listing);
  });
}

void TarnReportingClientServerInstance::killService() {
  onServerQueue([] {
    const auto signpost = operation("killService");
    kLog(LogLevel::Default, "DESTROYING SERVICE");
    TarnReportingFacilities().processControl.exitProcess(kKilledExitStatus);
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
  auto session = TarnReportingSession::initWithID(reporterID, {processIdentifier_});
  session->setClientProcessName(clientProcessName_);
  return session;
}

void TarnReportingClientServerInstance::setSessionIndex(std::shared_ptr<TarnReportingSessionIndex> index,
                                                        std::uint64_t number) {
  index_ = std::move(index);
  number_ = number;
  // A platform may deliver requests before the service's own work lists the client.
  sessions_.forEach([this](std::int64_t reporterID, const std::shared_ptr<TarnReportingSession>&) {
    index_->add(reporterID, number_, *this);
  });
  index_->addRunning(static_cast<std::ptrdiff_t>(sessions_.runningCount()));
}

void TarnReportingClientServerInstance::storeSession(std::int64_t reporterID,
                                                     std::shared_ptr<TarnReportingSession> session) {
  const std::size_t running = sessions_.runningCount();
  const bool isNew = sessions_.store(reporterID, std::move(session));
  if (index_ != nullptr) {
    index_->addRunning(static_cast<std::ptrdiff_t>(sessions_.runningCount() - running));
    if (isNew) {
      index_->add(reporterID, number_, *this);
    }
  }
}

void TarnReportingClientServerInstance::removeSession(std::int64_t reporterID) {
  const auto session = sessions_.find(reporterID);
  if (session == nullptr) return;
  const std::size_t running = sessions_.runningCount();
  sessions_.remove(reporterID);
  if (index_ != nullptr) {
    index_->addRunning(static_cast<std::ptrdiff_t>(sessions_.runningCount() - running));
    index_->remove(reporterID, number_);
  }
}

void TarnReportingClientServerInstance::noteRunning(const TarnReportingSession& session) {
  const std::size_t running = sessions_.runningCount();
  sessions_.setRunning(session.reporterID(), session.started());
  if (index_ != nullptr) {
    index_->addRunning(static_cast<std::ptrdiff_t>(sessions_.runningCount() - running));
  }
}

void TarnReportingClientServerInstance::stopSession(TarnReportingSession& session) {
  spend(session.messages().size() / kMessagesPerStopCost);
  session.stop();
  noteRunning(session);
}

void TarnReportingClientServerInstance::logReportingSessions() {
  if (const auto service = delegate_.lock()) {
    service->logReportingSessions();
  }
}

void TarnReportingClientServerInstance::create(std::int64_t reporterID) {
  kLog(LogLevel::Default, "creating session for reporter %lli", reporterID);
  trace(kTraceCreate, reporterID);
  storeSession(reporterID, makeSession(reporterID));
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
    storeSession(reporterID, replacement);
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
  noteRunning(*session);
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
  if (const auto session = sessions_.find(reporterID); session && session->started()) {
    stopSession(*session);
  }
  removeSession(reporterID);
  kLog(LogLevel::Default, "destroying %lli", reporterID);
  logReportingSessions();
}

void TarnReportingClientServerInstance::beginToSend(Delivery& delivery) {
  plist::Array storage;
  kLog(LogLevel::Debug, "sending message for reporter %@",
       [&] { return textOf(delivery.search.reporterIDs, storage); });
  trace(kTraceSend, processIdentifier_);
  const auto service = delegate_.lock();
  if (!service || !service->isReportingEnabled()) {
    if (service) {
      service->countMessage(TarnReportingOutcome::Refused);
    }
    delivery.reply(platform::RemoteError{kErrorDomain, kReportingDisabled, "reporting is disabled"});
    return;
  }
  continueSending(delivery);
}

void TarnReportingClientServerInstance::continueSending(Delivery& delivery) {
  const auto service = delegate_.lock();
  if (!service) return;
  const auto giveWay = [&] {
    delivery.gaveWay = delivery.found;
    continueLater(
        [self = shared_from_this(), delivery = std::move(delivery)]() mutable { self->continueSending(delivery); });
  };
  delivery.found = delivery.found || service->findNextSessions(delivery.search);
  if (!delivery.found) {
    giveWay();
    return;
  }
  auto& sessions = delivery.search.found;
  while (delivery.next < sessions.size()) {
    const std::shared_ptr<TarnReportingSession> session = std::move(sessions[delivery.next++]);
    const bool isLast = delivery.next == sessions.size();
    if (delivery.gaveWay && delivery.toWhoeverRuns() && !session->started()) {
      improve(delivery.outcome, TarnReportingOutcome::Undeliverable);  // it was stopped meanwhile
    } else {
      // Each session changes its own; the last one, mostly the only one, needs no copy for it.
      const auto record = std::make_shared<TarnReportingSessionMessage>(
          isLast ? std::move(delivery.message) : delivery.message, static_cast<AudioEventCategory>(delivery.category),
          static_cast<AudioEventType>(delivery.type));
      improve(delivery.outcome, outcomeOf(*record, session->sendMessage(record)));
    }
    if (!isLast && spend(kDeliveryCost)) {
      giveWay();
      return;
    }
  }
  service->countMessage(delivery.outcome);
  delivery.reply(std::nullopt);
}

void TarnReportingClientServerInstance::continueListing(Listing& listing) {
  const auto service = delegate_.lock();
  if (!service) {
    listing.reply(std::nullopt, {});
    return;
  }
  const auto& clients = service->sessionIndex().clients();
  for (auto entry = clients.lower_bound(listing.client); entry != clients.end(); ++entry) {
    if (entry->first != listing.client) {
      listing.client = entry->first;
      listing.from = 0;
    }
    const bool whole = entry->second->sessions_.forEachFrom(listing.from, [&](std::int64_t reporterID) {
      listing.reporters.push_back(reporterID);
      return listing.reporters.size() % kListedAtOnce != 0 || !spend(1);
    });
    if (!whole) {
      continueLater(
          [self = shared_from_this(), listing = std::move(listing)]() mutable { self->continueListing(listing); });
      return;
    }
  }
  spend(listing.reporters.size() / kListedAtOnce);  // what the reply takes
  listing.reply(std::nullopt, std::move(listing.reporters));
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
  const auto rest = [self = shared_from_this()] { self->endClient(); };
  while (const auto session = sessions_.firstRunning()) {
    stopSession(*session);
    if (sessions_.size() > 1 && spend(kStopCost)) {
      continueLater(rest);
      return;
    }
  }
  while (const auto session = sessions_.first()) {
    removeSession(session->reporterID());
    if (sessions_.size() % kRemovalsAtOnce == 1 && spend(kRemovalsAtOnce)) {
      continueLater(rest);
      return;
    }
  }
  service->removeClient(*this);
  index_ = nullptr;  // sessions that it still makes are for nobody else to find
  kLog(LogLevel::Default, "removing %i from the server client list", processIdentifier_);
}

}  // namespace tarn
