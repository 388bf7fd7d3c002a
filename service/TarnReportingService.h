// SPDX-License-Identifier: Apache-2.0
// TarnReportingService: the process's one service object. It accepts connections, keeps the list of connected clients,
// finds sessions across all of them, and owns the single-message session, which takes the messages that are sent
// without a reporter ID while no session runs.
//
// Owner: the entry point. Threads: the server queue; accepting, the look-ups by ID and removal of a client also take
// the service's lock, because a platform may call its listener's delegate on a thread of its own. The lock is taken
// before any session work and never held across a call into a session.
#pragma once

#include <atomic>
#include <chrono>
#include <memory>

#include "platform/Listener.h"
#include "plist/ThreadSafety.h"
#include "service/TarnReportingServiceDelegateProtocol.h"
#include "service/TarnReportingSessionIndex.h"

namespace tarn {

// It knows nothing of sockets or of the wire: a platform's listener hands it connections, and what it must know of the
// peer comes from the connection and from the facilities. Look-ups go through the index of all clients' sessions, so
// they cost the same with one client as with thousands.
class TarnReportingService : public TarnReportingServiceDelegateProtocol,
                             public platform::ListenerDelegate,
                             public std::enable_shared_from_this<TarnReportingService> {
 public:
  // Idle time in seconds after which the single-message session is stopped. Long enough that a burst of messages
  // without IDs shares one session and its workers, short enough that what its workers gather is flushed soon after. It
  // is looked at when a whole timeout has passed, so the session ends between one and two timeouts after its last
  // message.
  static constexpr double kSingleMessageSessionTimeoutSeconds = 5.0;

  // Starts the system monitor on the server queue. The facilities are installed and the table of worker classes is set
  // before. No client, no session, reporting enabled.
  static std::shared_ptr<TarnReportingService> create();
  TarnReportingService(const TarnReportingService&) = delete;
  TarnReportingService& operator=(const TarnReportingService&) = delete;
  ~TarnReportingService() override;

  // While disabled no session is found and messages are refused. Threads: any. Sessions that run go on, and what their
  // producers derive still arrives.
  void setReportingEnabled(bool enabled) { reportingEnabled_.store(enabled); }

  // Always takes the connection, gives it a client instance and resumes it. The instance is listed by a piece of work
  // on the server queue, with the time of day and the name of the peer's process as they are then. Requests that come
  // before that are served all the same. When the connection is interrupted or invalid, the client's end is queued; an
  // invalid one also logs the client's uptime (whole seconds, -1 while it isn't known) and sends it to analytics under
  // "sys.oxbow.tarnkit.tarnreportingclientuptime" when the process has a name and somebody wants that event. Both
  // handlers hold the client weakly.
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) override;

  // On the server queue, without the lock: nobody else changes the list. The list is one of connections, those without
  // sessions included, in the order in which they were listed.
  const Clients& getAllClients() const override TARN_UNCHECKED { return clients_; }
  // Threads: any.
  bool isReportingEnabled() const override { return reportingEnabled_.load(); }
  // The single-message session isn't among them: it takes what comes while this is empty. Logs the sessions client by
  // client: at most 32 a client, 32 clients and 32 KiB of text a call, with the count of what is left out. Costs what
  // runs, not what is there. Ends the process outside the server queue.
  Sessions getAllActiveReportingSessions() override;
  // Logs what it finds at info level and what it doesn't at error level; for 0 and while reporting is disabled it is
  // silent. The single-message session is never found by its ID.
  std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID) override;
  // A list with IDs: every session found for them, 0 skipped. No list or an empty one: every running session of every
  // client; when none runs, the single-message session, made and started when there is none. The whole look-up at once,
  // for who can't do it in slices. An ID that is named twice gives its session twice; unknown ones are left out. A list
  // whose IDs are all unknown or 0 finds nothing: it doesn't fall back to the single-message session.
  Sessions findReportingSessionsForIDs(const platform::ReporterIDs& reporterIDs) override;
  // The same in slices: gives way after each 16 IDs that were looked up, at the cost of a unit. A search without IDs is
  // done in one step. Of the unknown IDs of one search eight have an error line of their own, and one more line counts
  // the rest, or one message could write a line for each of its 65536 IDs.
  bool findNextSessions(SessionSearch& search) override;
  // Nothing happens when it isn't listed. Linear in the connected clients, once for each connection. The caller has
  // stopped and dropped the client's sessions before.
  void removeClient(const TarnReportingClientServerInstance& client) override;
  // First a line for each client, as getAllActiveReportingSessions() writes them, then one with the count of all
  // running sessions and the first of them. Called after each start, stop and destruction, and for each message without
  // IDs.
  void logReportingSessions() override;
  // ClientGone until announceEnd().
  TarnReportingClientEnd clientEnd() const override { return clientEnd_; }

  // The process is about to end in order: clients that end from now on do so for that reason. On the server queue.
  void announceEnd();
  // Stops the single-message session, for which no client speaks. Called once the clients are gone, on the server
  // queue; nothing comes in any more then. Nothing happens when there is none. Its check that is still queued finds
  // nothing to do then.
  void endSingleMessageSession();
  const TarnReportingSessionIndex& sessionIndex() const override { return *index_; }
  // On the server queue, once for each message that was dealt with.
  void countMessage(TarnReportingOutcome outcome) override { messageCounts_.add(outcome); }

  // Sessions that exist now, the single-message session included.
  std::size_t sessionCount() const;
  // What became of the messages so far. Threads: the server queue.
  const TarnReportingMessageCounts& messageCounts() const noexcept { return messageCounts_; }

 private:
  TarnReportingService();
  // What the end of a connection does beyond the end of its client: uptime line and uptime event. Nothing when the
  // client is gone already.
  void handleInvalidation(const std::weak_ptr<TarnReportingClientServerInstance>& weakClient);
  // The session of the first client in the order of connection that has one under this ID; null for none, without a
  // line.
  std::shared_ptr<TarnReportingSession> lookUp(std::int64_t reporterID) const;
  // One ID of a search: adds its session, or counts it as unknown. 0 is neither.
  void findListed(SessionSearch& search, std::int64_t reporterID);
  void logSessionsOfClients() const;
  // Notes the moment of use. A new one has the reporter ID 1, this process, the type standalone, "Unknown" as its
  // application, and is started; its check is queued one timeout and a microsecond later.
  std::shared_ptr<TarnReportingSession> retrieveSingleMessageSession();
  void queueStopSingleSession(std::chrono::nanoseconds delay);
  // Stops and drops the session when it has been idle for longer than the timeout, else queues itself again.
  void checkSingleSession();

  // Atomic, because connections' threads ask before their work is queued.
  std::atomic<bool> reportingEnabled_{true};

  // Recursive: a connection that is given its exported object under the lock may ask the service something at once.
  mutable RecursiveMutex mutex_;
  Clients clients_ TARN_GUARDED_BY(mutex_);  // changed on the server queue alone
  const std::shared_ptr<TarnReportingSessionIndex> index_;

  // Server queue only. The number tells connections by their order and none is used twice: the index orders clients by
  // it.
  std::uint64_t nextClientNumber_ = 0;
  TarnReportingMessageCounts messageCounts_;
  TarnReportingClientEnd clientEnd_ = TarnReportingClientEnd::ClientGone;
  std::shared_ptr<TarnReportingSession> singleMessageSession_;
  std::chrono::nanoseconds singleMessageSessionLastRetrieved_{};  // on the monotonic clock
};

}  // namespace tarn
