// SPDX-License-Identifier: Apache-2.0
// TarnReportingServiceDelegateProtocol: what a client's connection may ask of the service.
//
// Threads: the server queue; the look-ups by ID and removeClient take the service's lock as well.
//
// The instances know the service by this alone, and hold it weakly: the service owns them. TarnReportingService.h tells
// what each answer costs and logs; a test may stand in for the service with a handful of sessions.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"
#include "service/TarnReportingMessageCounts.h"

namespace tarn {

class TarnReportingClientServerInstance;
class TarnReportingSession;
class TarnReportingSessionIndex;

// Why a client ends, and its sessions with it.
enum class TarnReportingClientEnd : std::uint8_t {
  ClientGone,       // its connection is over
  ServiceStopping,  // the process ends in order
};
// "client-gone" or "service-stopping", as the lines about the end of clients have it. The text is static.
std::string_view TarnReportingClientEndName(TarnReportingClientEnd end) noexcept;

class TarnReportingServiceDelegateProtocol {
 public:
  // In the order of connection. Who is given sessions shares them: they outlive their client's end while they are
  // looked at.
  using Clients = std::vector<std::shared_ptr<TarnReportingClientServerInstance>>;
  using Sessions = std::vector<std::shared_ptr<TarnReportingSession>>;

  // A look-up of a list of IDs that is done in parts. Begun with the IDs alone; whoever asked for it keeps it between
  // the parts.
  struct SessionSearch {
    platform::ReporterIDs reporterIDs;
    Sessions found;
    std::size_t next = 0;     // of the IDs
    std::size_t unknown = 0;  // IDs under which there is no session
  };

  virtual ~TarnReportingServiceDelegateProtocol() = default;
  // The connected clients in the order of connection.
  virtual const Clients& getAllClients() const = 0;
  // False: no session is found by an ID, and messages are refused.
  virtual bool isReportingEnabled() const = 0;
  // Every started session, client by client.
  virtual Sessions getAllActiveReportingSessions() = 0;
  // The first session of any client under this ID; nothing for 0 and while reporting is disabled.
  virtual std::shared_ptr<TarnReportingSession> findReportingSessionForID(std::int64_t reporterID) = 0;
  // The sessions that a message with this list of IDs goes to; see TarnReportingService.
  virtual Sessions findReportingSessionsForIDs(const platform::ReporterIDs& reporterIDs) = 0;
  // Goes on with such a look-up until it is done or others are to have their turn; whether it is done.
  virtual bool findNextSessions(SessionSearch& search) = 0;
  // Takes the client off the list; nothing happens when it isn't on it.
  virtual void removeClient(const TarnReportingClientServerInstance& client) = 0;
  // Logs which sessions run, in lists that are bounded.
  virtual void logReportingSessions() = 0;
  // Why a client that ends now does.
  virtual TarnReportingClientEnd clientEnd() const = 0;
  // Of all clients' sessions.
  virtual const TarnReportingSessionIndex& sessionIndex() const = 0;
  // Tells what became of a message. Once for each message, by whoever replies to it.
  virtual void countMessage(TarnReportingOutcome outcome) = 0;
};

}  // namespace tarn
