#include "service/TarnReportingService.h"

#include <algorithm>
#include <cmath>

#include "derived/TarnReportingSystemMonitor.h"
#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/ProcessFacts.h"
#include "platform/TallyService.h"
#include "platform/WorkQueue.h"
#include "service/TarnReportingClientServerInstance.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingServerQueue.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingServiceDelegateCategory, "TarnReportingService"};
constexpr std::string_view kUptimeEvent = "sys.oxbow.tarnkit.tarnreportingclientuptime";
constexpr std::int64_t kSingleMessageReporterID = 1;
constexpr std::chrono::duration<double> kTimeout(TarnReportingService::kSingleMessageSessionTimeoutSeconds);

// Every start, stop and message without IDs logs these lists. So that a client with thousands of running sessions can't
// slow down the others or fill the disk with them, a long one ends in the count of those that it leaves out.
plist::Array descriptions(const TarnReportingServiceDelegateProtocol::Sessions& sessions) {
  constexpr std::size_t kMostListed = 32;
  const std::size_t listed = sessions.size() <= kMostListed ? sessions.size() : kMostListed - 1;
  plist::Array texts;
  for (std::size_t i = 0; i < listed; ++i) {
    texts.append(sessions[i]->description());
  }
  if (listed < sessions.size()) {
    texts.append("and " + std::to_string(sessions.size() - listed) + " more");
  }
  return texts;
}

plist::ValueView nameOf(const TarnReportingClientServerInstance& client) {
  const std::string& name = client.clientProcessName();
  return name.empty() ? plist::ValueView() : plist::ValueView(name);
}

// Whole seconds since the client's start date, -1 without one.
std::int64_t uptimeOf(const TarnReportingClientServerInstance& client) {
  const std::optional<double> start = client.clientStartDate();
  if (!start) {
    kLog(LogLevel::Default, "clientStartDate is nil. clientpid=%d clientprocessname=%@", client.processIdentifier(),
         nameOf(client));
    return -1;
  }
  const double interval = TarnReportingFacilities().clock.epochSeconds() - *start;
  if (interval < 0) {
    kLog(LogLevel::Default, "clientStartDate is in the past. clientpid=%d clientprocessname=%@",
         client.processIdentifier(), nameOf(client));
  }
  return plist::ValueView(std::abs(interval)).asInt64();
}

}  // namespace

std::string_view TarnReportingClientEndName(TarnReportingClientEnd end) noexcept {
  return end == TarnReportingClientEnd::ClientGone ? "client-gone" : "service-stopping";
}

std::shared_ptr<TarnReportingService> TarnReportingService::create() {
  struct Constructible : TarnReportingService {};
  auto service = std::make_shared<Constructible>();
  TarnReportingSystemMonitor::initializeWithQueue(TarnReportingUtilityGetReportingServerQueue());
  return service;
}

TarnReportingService::TarnReportingService() = default;

TarnReportingService::~TarnReportingService() {
  kLog(LogLevel::Default, "destroying service");
}

bool TarnReportingService::listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) {
  const std::int32_t processIdentifier = connection->processIdentifier();
  kLog(LogLevel::Default, "newConnection: %@", [&] { return connection->description(); });
  std::shared_ptr<TarnReportingClientServerInstance> client;
  {
    const MutexLock lock(mutex_);
    client = TarnReportingClientServerInstance::initWithPID(processIdentifier, weak_from_this());
    connection->setExportedObject(client);
  }
  TarnReportingUtilityGetReportingServerQueue()->async([self = shared_from_this(), client, processIdentifier] {
    client->setClientStartDate(TarnReportingFacilities().clock.epochSeconds());
    client->setClientProcessName(TarnReportingFacilities().processFacts.processName(processIdentifier).value_or(""));
    const MutexLock lock(self->mutex_);
    self->clients_.push_back(client);
  });
  const std::weak_ptr<TarnReportingClientServerInstance> weakClient = client;
  connection->setInterruptionHandler([weakClient] {
    kLog(LogLevel::Default, "interruptionHandler: connection exited");
    if (const auto interrupted = weakClient.lock()) {
      interrupted->handleConnectionError();
    }
  });
  connection->setInvalidationHandler([weakSelf = weak_from_this(), weakClient] {
    if (const auto self = weakSelf.lock()) {
      self->handleInvalidation(weakClient);
    }
  });
  connection->resume();
  return true;
}

void TarnReportingService::handleInvalidation(const std::weak_ptr<TarnReportingClientServerInstance>& weakClient) {
  const std::shared_ptr<TarnReportingClientServerInstance> client = weakClient.lock();
  if (!client) return;
  client->handleConnectionError();
  const std::int64_t uptime = uptimeOf(*client);
  const std::string& name = client->clientProcessName();
  kLog(LogLevel::Default, "invalidationHandler: connection exited process=%@ uptime_sec=%d", nameOf(*client), uptime);
  if (name.empty()) {
    kLog(LogLevel::Default, "clientProcessName is nil. clientpid=%d", client->processIdentifier());
    return;
  }
  if (platform::TallyService& tally = TarnReportingFacilities().tally; tally.eventIsInUse(kUptimeEvent)) {
    tally.sendEventLazy(kUptimeEvent, [name, uptime] {
      return plist::Dictionary{{"processName", name}, {"seconds", uptime}};
    });
  }
}

TarnReportingService::Sessions TarnReportingService::getAllActiveReportingSessions() {
  TarnReportingRequireServerQueue();
  Sessions active;
  for (const auto& client : getAllClients()) {
    Sessions ofClient;
    client->clientReportingSessionMap().forEach(
        [&](std::int64_t, const std::shared_ptr<TarnReportingSession>& session) {
          if (session->started()) {
            ofClient.push_back(session);
          }
        });
    kLog(LogLevel::Default, "sessions for client %i : %@", client->processIdentifier(),
         [&] { return descriptions(ofClient); });
    active.insert(active.end(), ofClient.begin(), ofClient.end());
  }
  return active;
}

std::shared_ptr<TarnReportingSession> TarnReportingService::findReportingSessionForID(std::int64_t reporterID) {
  const MutexLock lock(mutex_);
  if (reporterID == 0 || !isReportingEnabled()) return nullptr;
  for (const auto& client : clients_) {
    if (auto session = client->clientReportingSessionMap().find(reporterID)) {
      kLog(LogLevel::Info, "found reporting session %lli for client %i", reporterID, client->processIdentifier());
      return session;
    }
  }
  kLog(LogLevel::Error, "failed to find reporting session %lli", reporterID);
  return nullptr;
}

TarnReportingService::Sessions TarnReportingService::findReportingSessionsForIDs(
    const platform::ReporterIDs& reporterIDs) {
  if (reporterIDs && !reporterIDs->empty()) {
    Sessions found;
    for (const std::int64_t reporterID : *reporterIDs) {
      if (auto session = findReportingSessionForID(reporterID)) {
        found.push_back(std::move(session));
      }
    }
    return found;
  }
  Sessions active = getAllActiveReportingSessions();
  logReportingSessions();
  if (active.empty()) {
    active.push_back(retrieveSingleMessageSession());
  }
  return active;
}

void TarnReportingService::removeClient(const TarnReportingClientServerInstance& client) {
  const MutexLock lock(mutex_);
  const auto found =
      std::find_if(clients_.begin(), clients_.end(), [&](const auto& listed) { return listed.get() == &client; });
  if (found != clients_.end()) {
    clients_.erase(found);
  }
}

void TarnReportingService::announceEnd() {
  clientEnd_ = TarnReportingClientEnd::ServiceStopping;
}

void TarnReportingService::endSingleMessageSession() {
  if (singleMessageSession_) {
    singleMessageSession_->stop();
    singleMessageSession_.reset();
  }
}

void TarnReportingService::logReportingSessions() {
  const Sessions active = getAllActiveReportingSessions();
  kLog(LogLevel::Default, "%ld active reporting session(s) %@", active.size(), [&] { return descriptions(active); });
}

std::size_t TarnReportingService::sessionCount() const {
  const MutexLock lock(mutex_);
  std::size_t count = singleMessageSession_ ? 1 : 0;
  for (const auto& client : clients_) {
    count += client->clientReportingSessionMap().size();
  }
  return count;
}

std::shared_ptr<TarnReportingSession> TarnReportingService::retrieveSingleMessageSession() {
  singleMessageSessionLastRetrieved_ = TarnReportingFacilities().clock.monotonic();
  if (!singleMessageSession_) {
    kLog(LogLevel::Default, "Creating singleMessageSession");
    singleMessageSession_ = TarnReportingSession::initWithID(
        kSingleMessageReporterID, {TarnReportingFacilities().processFacts.ownProcessIdentifier()},
        TarnReportingSession::Mode::SingleMessage);
    singleMessageSession_->setServiceType(AudioServiceType::Standalone);
    const plist::Dictionary configuration{{"HostApplicationDisplayID", "Unknown"}};
    singleMessageSession_->updateConfigurationWithContentsOfConfiguration(&configuration);
    singleMessageSession_->start();
    // The extra microsecond lets a session that was used just once exceed the timeout at the first check.
    queueStopSingleSession(std::chrono::duration_cast<std::chrono::nanoseconds>(kTimeout) +
                           std::chrono::microseconds(1));
  }
  return singleMessageSession_;
}

void TarnReportingService::queueStopSingleSession(std::chrono::nanoseconds delay) {
  TarnReportingUtilityGetReportingServerQueue()->asyncAfter(delay, [weakSelf = weak_from_this()] {
    if (const auto self = weakSelf.lock()) {
      self->checkSingleSession();
    }
  });
}

void TarnReportingService::checkSingleSession() {
  if (!singleMessageSession_) {
    return;  // it ended with the service
  }
  const std::chrono::duration<double> idle =
      TarnReportingFacilities().clock.monotonic() - singleMessageSessionLastRetrieved_;
  if (idle > kTimeout) {
    kLog(LogLevel::Default, "Stopping singleMessageSession timeout=%f", kTimeout.count());
    singleMessageSession_->stop();
    singleMessageSession_.reset();
    return;
  }
  kLog(LogLevel::Debug, "Not stopping singleMessageSession timeSinceLastUsed=%f timeout=%f", idle.count(),
       kTimeout.count());
  queueStopSingleSession(std::chrono::duration_cast<std::chrono::nanoseconds>(kTimeout));
}

}  // namespace tarn
