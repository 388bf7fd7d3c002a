// TarnReportingServiceProtocol: the remote interface, the only way into the service. A listener's connections call the
// object that the service exports to them, with arguments that are already decoded and checked.
//
// Every operation returns at once and does its work on the reporting server queue. Nothing is thrown. Each reply is
// called at most once, on the server queue; a reply that is destroyed uncalled will never come.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"

namespace tarn::platform {

struct RemoteError {
  std::string_view domain;  // a static text
  std::int64_t code = 0;
  std::string text;
};

template <class... Results>
using Reply = UniqueFunction<void(const std::optional<RemoteError>& error, Results... results)>;

// What setServiceType, setConfiguration and company answer: true, always.
using Acknowledge = Reply<bool>;
// Absent and empty mean the same to the service: every running session.
using ReporterIDs = std::optional<std::vector<std::int64_t>>;

class TarnReportingServiceProtocol {
 public:
  virtual ~TarnReportingServiceProtocol() = default;
  // Makes a session under this ID of the client's choice, in place of the one that it has there.
  virtual void createReportingSession(std::int64_t reporterID, Acknowledge reply) = 0;
  // Types the session. One that has a type already is replaced by a new one of the new type, not started, which keeps
  // configuration and latest values.
  virtual void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, Acknowledge reply) = 0;
  // Despite its name it answers the service type: 65535 for an unknown session.
  virtual void getServiceNameForReporterID(std::int64_t reporterID, Reply<std::uint16_t> reply) = 0;
  // Merges the configuration into the session's.
  virtual void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID, Acknowledge reply) = 0;
  // Makes the workers of the session's type and starts them. The reply is held until the session stops.
  virtual void startReportingSessionForID(std::int64_t reporterID, Acknowledge reply) = 0;
  // Hands each of these sessions a record of the message. Refused with an error while reporting is disabled.
  virtual void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                           ReporterIDs reporterIDs, Reply<> reply) = 0;
  // Stops the session, which stays and may be started again; the held reply of its start goes out first.
  virtual void stopReportingSessionForID(std::int64_t reporterID, Acknowledge reply) = 0;
  // Stops the session if it runs, and drops it; the held reply of its start never comes.
  virtual void destroyReportingSession(std::int64_t reporterID, Acknowledge reply) = 0;
  // Answers "reporterID" and "serviceType"; 0 and 65535 for an unknown session.
  virtual void reporterID(std::int64_t reporterID, Reply<plist::Dictionary> reply) = 0;
  // Answers the reporter IDs of all sessions of all clients.
  virtual void getAllReporters(Reply<std::vector<std::int64_t>> reply) = 0;
  // Ends the process at once, without a reply.
  virtual void killService() = 0;

  // No remote operations: what the client has now, for whoever bounds that. Threads: the server queue's.
  virtual std::size_t sessionCount() const { return 0; }
  virtual std::size_t logBytes() const { return 0; }  // memory that the messages of its sessions take
  virtual bool hasSession(std::int64_t reporterID) const {
    static_cast<void>(reporterID);
    return false;
  }
};

}  // namespace tarn::platform
