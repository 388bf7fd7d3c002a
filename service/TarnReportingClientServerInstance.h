// TarnReportingClientServerInstance: one connected client. It is the object that the connection exports to the peer, so
// it implements every operation of the remote interface, and it owns the client's sessions.
//
// Owner: the service's list of clients and the connection; it holds the service weakly. Threads: the remote operations
// are called on the platform's thread and do their work on the server queue; everything else runs on the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/TarnReportingServiceProtocol.h"
#include "service/TarnReportingSessionMap.h"
#include "session/TarnReportingSessionLogMemory.h"

namespace tarn {

class TarnReportingServiceDelegateProtocol;
class TarnReportingSession;
class TarnReportingSessionIndex;

class TarnReportingClientServerInstance : public platform::TarnReportingServiceProtocol,
                                          public std::enable_shared_from_this<TarnReportingClientServerInstance> {
 public:
  static std::shared_ptr<TarnReportingClientServerInstance> initWithPID(
      std::int32_t processIdentifier, std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate);
  TarnReportingClientServerInstance(const TarnReportingClientServerInstance&) = delete;
  TarnReportingClientServerInstance& operator=(const TarnReportingClientServerInstance&) = delete;
  ~TarnReportingClientServerInstance() override;

  void createReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override;
  void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, platform::Acknowledge reply) override;
  void getServiceNameForReporterID(std::int64_t reporterID, platform::Reply<std::uint16_t> reply) override;
  void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID, platform::Acknowledge reply) override;
  void startReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override;
  void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                   platform::ReporterIDs reporterIDs, platform::Reply<> reply) override;
  void stopReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override;
  void destroyReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override;
  void reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) override;
  void getAllReporters(platform::Reply<std::vector<std::int64_t>> reply) override;
  void killService() override;
  std::size_t sessionCount() const override { return sessions_.size(); }
  std::size_t logBytes() const override { return logAccount_->bytes; }
  bool hasSession(std::int64_t reporterID) const override { return sessions_.find(reporterID) != nullptr; }

  // Ends the client: on the server queue, stops its started sessions, drops all of them and leaves the service's list.
  // A second call does nothing. Threads: any.
  void handleConnectionError();

  // The session under this ID in this client's map or, when asked for, in any client's.
  std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID, bool acrossAllClients);

  std::int32_t processIdentifier() const noexcept { return processIdentifier_; }
  const TarnReportingSessionMap& clientReportingSessionMap() const noexcept { return sessions_; }
  // When the connection was accepted, in epoch seconds; set by the service.
  std::optional<double> clientStartDate() const noexcept { return clientStartDate_; }
  void setClientStartDate(double epochSeconds) noexcept { clientStartDate_ = epochSeconds; }
  // Empty while it is not known; set by the service.
  const std::string& clientProcessName() const noexcept { return clientProcessName_; }
  void setClientProcessName(std::string name) { clientProcessName_ = std::move(name); }
  // Lists the client's sessions in the index under the client's number; by the service, once.
  void listSessions(std::shared_ptr<TarnReportingSessionIndex> index, std::uint64_t number);

 private:
  TarnReportingClientServerInstance(std::int32_t processIdentifier,
                                    std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate);
  std::shared_ptr<TarnReportingSession> makeSession(std::int64_t reporterID);
  // Stops the session and charges what that costs.
  void stopSession(TarnReportingSession& session);
  void logReportingSessions();

  // The operations' work, on the server queue.
  void create(std::int64_t reporterID);
  void retype(std::uint16_t serviceType, std::int64_t reporterID);
  void start(std::int64_t reporterID, platform::Acknowledge reply);
  void stop(std::int64_t reporterID);
  void destroy(std::int64_t reporterID);
  // Goes on until it is done or others are to have their turn, and then hands over the rest.
  void endClient();

  const std::int32_t processIdentifier_;
  const std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate_;

  // Server queue only.
  std::optional<double> clientStartDate_;
  std::string clientProcessName_;
  TarnReportingSessionMap sessions_;
  const std::shared_ptr<TarnReportingSessionLogAccount> logAccount_ =
      std::make_shared<TarnReportingSessionLogAccount>();
  bool endTold_ = false;
};

}  // namespace tarn
