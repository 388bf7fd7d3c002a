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

namespace tarn {

class TarnReportingService : public TarnReportingServiceDelegateProtocol,
                             public platform::ListenerDelegate,
                             public std::enable_shared_from_this<TarnReportingService> {
 public:
  // Idle time in seconds after which the single-message session is stopped.
  static constexpr double kSingleMessageSessionTimeoutSeconds = 5.0;

  // Starts the system monitor on the server queue.
  static std::shared_ptr<TarnReportingService> create();
  TarnReportingService(const TarnReportingService&) = delete;
  TarnReportingService& operator=(const TarnReportingService&) = delete;
  ~TarnReportingService() override;

  // While disabled no session is found and messages are refused. Threads: any.
  void setReportingEnabled(bool enabled) { reportingEnabled_.store(enabled); }

  // Always takes the connection, gives it a client instance and resumes it.
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) override;

  // On the server queue, without the lock: nobody else changes the list.
  const Clients& getAllClients() const override TARN_UNCHECKED { return clients_; }
  bool isReportingEnabled() const override { return reportingEnabled_.load(); }
  Sessions getAllActiveReportingSessions() override;
  std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID) override;
  // A list with IDs: every session found for them, 0 skipped. No list or an empty one: every running session of
  // every client; when none runs, the single-message session, made and started when there is none.
  Sessions findReportingSessionsForIDs(const platform::ReporterIDs& reporterIDs) override;
  void removeClient(const TarnReportingClientServerInstance& client) override;
  void logReportingSessions() override;
  TarnReportingClientEnd clientEnd() const override { return clientEnd_; }

  // The process is about to end in order: clients that end from now on do so for that reason. On the server queue.
  void announceEnd();
  // Stops the single-message session, for which no client speaks. Called once the clients are gone, on the server
  // queue; nothing comes in any more then.
  void endSingleMessageSession();

  // Sessions that exist now, the single-message session included.
  std::size_t sessionCount() const;

 private:
  TarnReportingService();
  void handleInvalidation(const std::weak_ptr<TarnReportingClientServerInstance>& weakClient);
  std::shared_ptr<TarnReportingSession> retrieveSingleMessageSession();
  void queueStopSingleSession(std::chrono::nanoseconds delay);
  void checkSingleSession();

  std::atomic<bool> reportingEnabled_{true};

  mutable RecursiveMutex mutex_;
  Clients clients_ TARN_GUARDED_BY(mutex_);  // changed on the server queue alone

  // Server queue only.
  TarnReportingClientEnd clientEnd_ = TarnReportingClientEnd::ClientGone;
  std::shared_ptr<TarnReportingSession> singleMessageSession_;
  std::chrono::nanoseconds singleMessageSessionLastRetrieved_{};  // on the monotonic clock
};

}  // namespace tarn
