// SPDX-License-Identifier: Apache-2.0
// TarnReportingClientServerInstance: one connected client. It is the object that the connection exports to the peer, so
// it implements every operation of the remote interface, and it owns the client's sessions.
//
// Owner: the service's list of clients and the connection; it holds the service weakly. Threads: the remote operations
// are called on the platform's thread and do their work on the server queue; everything else runs on the server queue.
//
// Reporter IDs are the client's own choice. A client may ask about any client's session (getServiceNameForReporterID,
// reporterID, getAllReporters) and its messages reach any client's session, but it types, configures, starts, stops and
// destroys only its own. No operation reports an unknown ID as an error: it is answered as if it had been done, so that
// a client needn't know what has ended meanwhile. The one error is that of sendMessage while reporting is disabled.
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

// One instance per accepted connection. It lives until its connection has ended and the service has taken it off its
// list; work that is still queued for it keeps it alive beyond that. Its end drops what sessions are left without
// stopping them, which happens only when the service went first.
class TarnReportingClientServerInstance : public platform::TarnReportingServiceProtocol,
                                          public std::enable_shared_from_this<TarnReportingClientServerInstance> {
 public:
  // Makes the instance of the process with this ID, which `user` runs, with no session; logs the ID at debug level. The
  // instance is made on whatever thread accepts connections, so it does no work on the server queue's state here. The
  // service gives it its start date, its name and its place in the index with a piece of work on the queue.
  static std::shared_ptr<TarnReportingClientServerInstance> initWithPID(
      std::int32_t processIdentifier, std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate,
      std::uint32_t user = 0);
  TarnReportingClientServerInstance(const TarnReportingClientServerInstance&) = delete;
  TarnReportingClientServerInstance& operator=(const TarnReportingClientServerInstance&) = delete;
  // Logs a line with the client's process; its sessions go with the map, in order.
  ~TarnReportingClientServerInstance() override;

  // Makes a session of no type, not started, whose only process is this client. One under the same ID is dropped
  // without being stopped, and the reply that its start may have left with it never comes; the new one takes its place
  // in the order. Any ID is taken, 0 as well; but a session under 0 can't be typed, started or sent anything. Replies
  // true.
  void createReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override;
  // Types this client's session; a number without a name of its own is kept as it is. A session that has another type
  // is replaced, whether it runs or not: by one that isn't started and keeps the configuration and the latest values.
  // The old one is dropped without being stopped. Replies true, also for 0 and for an unknown ID.
  void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, platform::Acknowledge reply) override;
  // Replies the number of the service type of any client's session under this ID: this client's own one first, then the
  // first in the order of connection. 65535 for 0, for an unknown ID and for a session without a type; while reporting
  // is disabled, others' sessions aren't found.
  void getServiceNameForReporterID(std::int64_t reporterID, platform::Reply<std::uint16_t> reply) override;
  // Merges the configuration into that of this client's session, key by key, later values winning. What runs already
  // sees the change when it next looks, which most workers do when the session stops. Replies true, also for an unknown
  // ID.
  void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID, platform::Acknowledge reply) override;
  // Starts this client's session and keeps the reply with it: true goes out when the session is stopped. At once it
  // goes out for 0, for an unknown ID and, on internal builds, for sessions of the type test. A session that runs
  // already isn't touched, and this further reply never comes. A reply that an earlier start left is sent before the
  // new one takes its place. Afterwards the running sessions of all clients are logged, in lists that are bounded.
  void startReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override;
  // Hands each of the sessions that the IDs name a record of its own; see TarnReportingMessageDelivery. Replies without
  // an error when the last one has it, also when nobody has a session under the IDs. On internal builds a message
  // without IDs gets the key "sendSingleMessage" (true) on the caller's thread, before anything is queued.
  void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                   platform::ReporterIDs reporterIDs, platform::Reply<> reply) override;
  // The same for each message of a run, at once; see TarnReportingRunDelivery.
  void sendMessages(platform::MessageRun& run) override;
  // Stops this client's session, which stays, then sends the reply that its start left with it, then logs the running
  // sessions, then replies true. An unknown session or one that doesn't run is told with an error line and replied to
  // all the same; 0 with neither.
  void stopReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override;
  // Stops this client's session when it runs, drops it with the reply that its start left, which never comes, and logs
  // the running sessions. Replies true, also when there is none.
  void destroyReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override;
  // Replies {"reporterID", "serviceType"} of any client's session under this ID, or {0, 65535}.
  void reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) override;
  // Replies the IDs of all clients' sessions, started or not, client by client in the order of connection; an ID that
  // two clients use comes twice. The list is made in slices: a session that is there all the while is in it once. The
  // single-message session is no client's and not in it.
  void getAllReporters(platform::Reply<std::vector<std::int64_t>> reply) override;
  // Ends the process with exit status 2, with no reply and no session stopped; the session records aren't told of ends
  // either. What the back-ends hold by then is theirs to bring to the disk. Any client may ask for it.
  void killService() override;
  // What the connection's quotas look at before they let a request in; see host/socket/Quotas.h. `logBytes` is the
  // estimated memory of the logged messages of all of this client's sessions, those included that were replaced while
  // somebody still holds them.
  std::size_t sessionCount() const override { return sessions_.size(); }
  std::size_t logBytes() const override { return logAccount_ ? logAccount_->bytes : 0; }
  // Whether a further create under this ID would replace a session, and so needs no room for one more.
  bool hasSession(std::int64_t reporterID) const override { return sessions_.find(reporterID) != nullptr; }
  // This client's own sessions, started or not.
  std::optional<std::uint16_t> serviceTypeOf(std::int64_t reporterID) const override;
  bool listReporterIDs(std::uint64_t& from, std::size_t atMost, std::vector<std::int64_t>& reporters) const override;

  // Ends the client: on the server queue, stops its started sessions, drops all of them and leaves the service's list.
  // A second call does nothing. Threads: any. Stopping goes on in slices, first the sessions that run, then the release
  // of all, both in the order of creation, so that a client with thousands of sessions doesn't keep others waiting.
  // Nothing happens once the service is gone or doesn't list the client. A session that there is no memory to stop is
  // dropped, with an error line.
  void handleConnectionError();

  // The session under this ID in this client's map or, when asked for, in any client's. Null when there is none. Ends
  // the process outside the server queue. A hash look-up in the own map; across all clients one more, in the service's
  // index.
  std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID, bool acrossAllClients);

  // The process at the other end, as the connection told it when it was accepted.
  std::int32_t processIdentifier() const noexcept { return processIdentifier_; }
  // Which connection it is, for the session records; set by the service before anything is asked of it.
  void setConnection(std::int64_t number) noexcept { connection_ = number; }
  // For who lists or counts sessions; only the instance changes the map.
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
                                    std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate, std::uint32_t user);
  // A session with this client's process, name and account of memory; nothing finds it until it is stored.
  std::shared_ptr<TarnReportingSession> makeSession(std::int64_t reporterID);
  // Stops the session and charges what that costs. A stop sorts and hands over the log, so half a unit per logged
  // message is charged before it. Afterwards the map knows that the session doesn't run.
  void stopSession(TarnReportingSession& session);
  // Nothing when the service is gone.
  void logReportingSessions();

  // The operations' work, on the server queue. The remote operations above only queue it, and reply unless they hand
  // their reply over.
  void create(std::int64_t reporterID);
  void retype(std::uint16_t serviceType, std::int64_t reporterID);
  void start(std::int64_t reporterID, platform::Acknowledge reply);
  void stop(std::int64_t reporterID);
  void destroy(std::int64_t reporterID);
  // Goes on until it is done or others are to have their turn, and then hands over the rest.
  void endClient();

  const std::int32_t processIdentifier_;
  std::int64_t connection_ = 0;  // 0 while nobody said
  const std::uint32_t user_;
  const std::weak_ptr<TarnReportingServiceDelegateProtocol> delegate_;

  // Server queue only. Nothing until the service's own work has listed the client; only the uptime in the client's last
  // lines needs it.
  std::optional<double> clientStartDate_;
  std::string clientProcessName_;
  TarnReportingSessionMap sessions_;
  // Shared with the sessions, which book what their logs take; it outlives a session that somebody else still holds.
  // Made with the first of them.
  std::shared_ptr<TarnReportingSessionLogAccount> logAccount_;
  // endClient() runs again for each slice, and the line with the reason of the end is written once.
  bool endTold_ = false;
};

}  // namespace tarn
