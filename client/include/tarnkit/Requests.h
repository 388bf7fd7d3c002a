// Request: one of the remote operations with its arguments, ready to be sent as often as you like.
//
// Reporter IDs are yours to choose. An ID that nobody knows is no error: the operation answers as if it had worked.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include <tarnkit/Value.h>

namespace tarn::wire {
struct Request;  // the library's own form
}

namespace tarnkit {

class Request {
 public:
  explicit Request(tarn::wire::Request content);
  const tarn::wire::Request& content() const noexcept { return *content_; }

 private:
  std::shared_ptr<const tarn::wire::Request> content_;
};

// Makes a session of this connection; one under the same ID is replaced.
Request createReportingSession(std::int64_t reporterID);
// Another type than the session has makes a new session in its place, not started, with the same configuration.
Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID);
// Despite its name the reply is the service type as a number; 65535 for an unknown session.
Request getServiceNameForReporterID(std::int64_t reporterID);
Request setConfiguration(const Dictionary& configuration, std::int64_t reporterID);
// The reply comes when the session stops. Send it; call() would wait that long.
Request startReportingSessionForID(std::int64_t reporterID);
// Any connection may send to a session. Without IDs the message goes to every running session.
Request sendMessage(const Dictionary& message, std::uint32_t category, std::uint16_t type,
                    std::optional<std::vector<std::int64_t>> reporterIDs = std::nullopt);
Request stopReportingSessionForID(std::int64_t reporterID);
Request destroyReportingSession(std::int64_t reporterID);
// Answers "reporterID" and "serviceType"; 0 and 65535 for an unknown session.
Request reporterID(std::int64_t reporterID);
// Answers the reporter IDs of all clients.
Request getAllReporters();
// Ends the service. Has no reply: the end of the connection is its Ok.
Request killService();
// Answers the service's counters and levels.
Request status();
// Answered when all that this connection sent before it is on the disk.
Request settle();

}  // namespace tarnkit
