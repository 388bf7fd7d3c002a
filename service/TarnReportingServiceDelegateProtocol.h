// TarnReportingServiceDelegateProtocol: what a client's connection may ask of the service.
//
// Threads: the server queue; the look-ups by ID and removeClient take the service's lock as well.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"

namespace tarn {

class TarnReportingClientServerInstance;
class TarnReportingSession;

// Why a client ends, and its sessions with it.
enum class TarnReportingClientEnd : std::uint8_t {
  ClientGone,       // its connection is over
  ServiceStopping,  // the process ends in order
};
std::string_view TarnReportingClientEndName(TarnReportingClientEnd end) noexcept;

class TarnReportingServiceDelegateProtocol {
 public:
  using Clients = std::vector<std::shared_ptr<TarnReportingClientServerInstance>>;
  using Sessions = std::vector<std::shared_ptr<TarnReportingSession>>;

  virtual ~TarnReportingServiceDelegateProtocol() = default;
  // The connected clients in the order of connection.
  virtual const Clients& getAllClients() const = 0;
  virtual bool isReportingEnabled() const = 0;
  // Every started session, client by client.
  virtual Sessions getAllActiveReportingSessions() = 0;
  // The first session of any client under this ID; nothing for 0 and while reporting is disabled.
  virtual std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID) = 0;
  // The sessions that a message with this list of IDs goes to; see TarnReportingService.
  virtual Sessions findReportingSessionsForIDs(const platform::ReporterIDs& reporterIDs) = 0;
  virtual void removeClient(const TarnReportingClientServerInstance& client) = 0;
  virtual void logReportingSessions() = 0;
  // Why a client that ends now does.
  virtual TarnReportingClientEnd clientEnd() const = 0;
};

}  // namespace tarn
