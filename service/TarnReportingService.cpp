// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingService.h"

#include <algorithm>
#include <cmath>
#include <new>

#include "derived/TarnReportingSystemMonitor.h"
#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/ProcessFacts.h"
#include "platform/TallyService.h"
#include "platform/WorkQueue.h"
#include "service/TarnReportingClientServerInstance.h"
#include "service/TarnReportingSlices.h"
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

// Every start, stop and message without IDs logs lists of sessions, client by client and all together. So that clients
// with thousands of running sessions, and thousands of clients, can't slow down the others or fill the disk with them,
// a long list ends in the count of what it leaves out, and all texts of a call together are bounded.
constexpr std::size_t kMostListed = 32;
constexpr std::size_t kMostListedBytes = 32768;
// Unknown IDs of one message that have an error line of their own.
constexpr std::size_t kMostUnknownListed = 8;
// IDs that are looked up, at a cost of about a microsecond, before others may have their turn.
constexpr std::size_t kLookUpsAtOnce = 16;

class SessionTexts {
 public:
  // The descriptions of the sessions, `count` in all, that `forEach` visits.
  template <class ForEach>
  plist::Array of(std::size_t count, ForEach forEach) {
    const std::size_t most = count <= kMostListed ? count : kMostListed - 1;
    plist::Array texts;
    forEach([&](const std::shared_ptr<TarnReportingSession>& session) {
      if (texts.size() == most) return false;
      const std::string text = session->description();
      if (text.size() > bytesLeft_) {
        bytesLeft_ = 0;
        return false;
      }
      bytesLeft_ -= text.size();
      texts.append(text);
      return true;
    });
    if (texts.size() < count) {
      texts.append("and " + std::to_string(count - texts.size()) + " more");
    }
    return texts;
  }
  bool exhausted() const noexcept { return bytesLeft_ == 0; }

 private:
  std::size_t bytesLeft_ = kMostListedBytes;
};

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

TarnReportingService::TarnReportingService() : index_(std::make_shared<TarnReportingSessionIndex>()) {}

TarnReportingService::~TarnReportingService() {
  kLog(LogLevel::Default, "destroying service");
}

bool TarnReportingService::listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) {
  const std::int32_t processIdentifier = connection->processIdentifier();
  kLog(LogLevel::Default, "newConnection: %@", [&] { return connection->description(); });
  std::shared_ptr<TarnReportingClientServerInstance> client;
  {
    const MutexLock lock(mutex_);
    client = TarnReportingClientServerInstance::initWithPID(processIdentifier, weak_from_this(), connection->user());
    client->setConnection(connection->number());
    connection->setExportedObject(client);
  }
  TarnReportingUtilityGetReportingServerQueue()->async([self = shared_from_this(), client, processIdentifier] {
    client->setClientStartDate(TarnReportingFacilities().clock.epochSeconds());
    {
      const MutexLock lock(self->mutex_);
      self->clients_.push_back(client);
      client->listSessions(self->index_, self->nextClientNumber_++);
    }
    client->setClientProcessName(TarnReportingFacilities().processFacts.processName(processIdentifier).value_or(""));
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
  logSessionsOfClients();
  Sessions active;
  active.reserve(index_->runningCount());
  for (const auto& [number, client] : index_->clients()) {
    client->clientReportingSessionMap().forEachRunning([&](const std::shared_ptr<TarnReportingSession>& session) {
      active.push_back(session);
      return true;
    });
  }
  return active;
}

// A line for each client; of many, for the first of those that have sessions, and one that counts the rest.
void TarnReportingService::logSessionsOfClients() const {
  SessionTexts texts;
  const auto logClient = [&texts](const TarnReportingClientServerInstance& client) {
    kLog(LogLevel::Default, "sessions for client %i : %@", client.processIdentifier(), [&] {
      const TarnReportingSessionMap& sessions = client.clientReportingSessionMap();
      return texts.of(sessions.runningCount(), [&](auto visit) { sessions.forEachRunning(visit); });
    });
  };
  if (getAllClients().size() <= kMostListed) {
    for (const auto& client : getAllClients()) {
      logClient(*client);
    }
    return;
  }
  std::size_t listed = 0;
  for (const auto& [number, client] : index_->clients()) {
    if (listed == kMostListed || texts.exhausted()) break;
    logClient(*client);
    ++listed;
  }
  kLog(LogLevel::Default, "sessions of %ld more clients are not listed", getAllClients().size() - listed);
}

std::shared_ptr<TarnReportingSession> TarnReportingService::findReportingSessionForID(std::int64_t reporterID) {
  const MutexLock lock(mutex_);
  if (reporterID == 0 || !isReportingEnabled()) return nullptr;
  auto session = lookUp(reporterID);
  if (!session) {
    kLog(LogLevel::Error, "failed to find reporting session %lli", reporterID);
  }
  return session;
}

std::shared_ptr<TarnReportingSession> TarnReportingService::lookUp(std::int64_t reporterID) const {
  const auto* const client = index_->firstHolder(reporterID);
  if (client == nullptr) return nullptr;
  kLog(LogLevel::Info, "found reporting session %lli for client %i", reporterID, client->processIdentifier());
  return client->clientReportingSessionMap().find(reporterID);
}

TarnReportingService::Sessions TarnReportingService::findReportingSessionsForIDs(
    const platform::ReporterIDs& reporterIDs) {
  SessionSearch search{reporterIDs, {}};
  while (!findNextSessions(search)) {
  }
  return std::move(search.found);
}

bool TarnReportingService::findNextSessions(SessionSearch& search) {
  if (!search.reporterIDs || search.reporterIDs->empty()) {
    search.found = getAllActiveReportingSessions();
    logReportingSessions();
    if (search.found.empty()) {
      search.found.push_back(retrieveSingleMessageSession());
    }
    return true;
  }
  const std::vector<std::int64_t>& reporterIDs = *search.reporterIDs;
  while (search.next < reporterIDs.size()) {
    findListed(search, reporterIDs[search.next++]);
    if (search.next % kLookUpsAtOnce == 0 && search.next < reporterIDs.size() && TarnReportingSpend(1)) return false;
  }
  if (search.unknown > kMostUnknownListed) {
    kLog(LogLevel::Error, "failed to find %ld more reporting sessions", search.unknown - kMostUnknownListed);
  }
  return true;
}

void TarnReportingService::findListed(SessionSearch& search, std::int64_t reporterID) {
  const MutexLock lock(mutex_);
  if (reporterID == 0 || !isReportingEnabled()) return;
  if (auto session = lookUp(reporterID)) {
    search.found.push_back(std::move(session));
  } else if (++search.unknown <= kMostUnknownListed) {
    kLog(LogLevel::Error, "failed to find reporting session %lli", reporterID);
  }
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
  if (const auto session = std::exchange(singleMessageSession_, nullptr)) {
    session->stop();
  }
}

void TarnReportingService::logReportingSessions() {
  TarnReportingRequireServerQueue();
  logSessionsOfClients();
  kLog(LogLevel::Default, "%ld active reporting session(s) %@", index_->runningCount(), [this] {
    return SessionTexts().of(index_->runningCount(), [this](auto visit) {
      const auto& clients = index_->clients();
      static_cast<void>(std::all_of(clients.begin(), clients.end(), [&](const auto& entry) {
        return entry.second->clientReportingSessionMap().forEachRunning(visit);
      }));
    });
  });
}

std::size_t TarnReportingService::sessionCount() const {
  const MutexLock lock(mutex_);
  return index_->sessionCount() + (singleMessageSession_ ? 1 : 0);
}

std::shared_ptr<TarnReportingSession> TarnReportingService::retrieveSingleMessageSession() {
  singleMessageSessionLastRetrieved_ = TarnReportingFacilities().clock.monotonic();
  if (!singleMessageSession_) {
    kLog(LogLevel::Default, "Creating singleMessageSession");
    const auto session = TarnReportingSession::initWithID(
        kSingleMessageReporterID, {TarnReportingFacilities().processFacts.ownProcessIdentifier()},
        TarnReportingSession::Mode::SingleMessage);
    session->setServiceType(AudioServiceType::Standalone);
    const plist::Dictionary configuration{{"HostApplicationDisplayID", "Unknown"}};
    session->updateConfigurationWithContentsOfConfiguration(&configuration);
    session->start();
    // The extra microsecond lets a session that was used just once exceed the timeout at the first check.
    queueStopSingleSession(std::chrono::duration_cast<std::chrono::nanoseconds>(kTimeout) +
                           std::chrono::microseconds(1));
    singleMessageSession_ = session;  // as a whole, or the next message makes another
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
    endSingleMessageSession();
    return;
  }
  kLog(LogLevel::Debug, "Not stopping singleMessageSession timeSinceLastUsed=%f timeout=%f", idle.count(),
       kTimeout.count());
  try {
    queueStopSingleSession(std::chrono::duration_cast<std::chrono::nanoseconds>(kTimeout));
  } catch (const std::bad_alloc&) {
    endSingleMessageSession();  // nobody would look at it again
  }
}

}  // namespace tarn
