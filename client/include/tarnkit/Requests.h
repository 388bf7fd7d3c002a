// SPDX-License-Identifier: Apache-2.0
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

// Made by the functions below. Copies share one content that never changes, so they cost a count, may be kept and sent
// on any thread, and one may be sent a thousand times without being made again.
class Request {
 public:
  // The library's own: for the functions below and for the client.
  explicit Request(tarn::wire::Request content);
  const tarn::wire::Request& content() const noexcept { return *content_; }

 private:
  std::shared_ptr<const tarn::wire::Request> content_;
};

// Makes a session of this connection; one under the same ID is replaced, and its start's reply never comes. The session
// has no type and isn't started yet. Answers true, as all do that have no other result.
Request createReportingSession(std::int64_t reporterID);
// What the session is for, of the numbers in docs/wire.md. Another type than the session has makes a new session in its
// place, not started, with the same configuration and latest values.
Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID);
// Despite its name the reply is the service type, see Reply::number(); 65535 for an unknown session.
Request getServiceNameForReporterID(std::int64_t reporterID);
// Merges these members into the session's configuration: keys that it has get the new value, the others stay.
// "HostApplicationDisplayID" names the application that this is about.
Request setConfiguration(const Dictionary& configuration, std::int64_t reporterID);
// Starts the session. The reply comes when the session stops: send this, call() would wait that long. The handler gets
// Cancelled when the reply can't come any more. A start of an unknown session is answered at once.
Request startReportingSessionForID(std::int64_t reporterID);
// Hands a message to these sessions, each as often as it is named, at most 65536 in all. Any connection may send to a
// session. Without IDs, and with an empty list, the message goes to every running session of every client; when none
// runs, to a session that the service makes for it. A message without "tarnreporting_timestamp" (seconds since 1970)
// gets the time of its arrival. The reply has no result; it is an Error while reporting is disabled.
Request sendMessage(const Dictionary& message, std::uint32_t category, std::uint16_t type,
                    std::optional<std::vector<std::int64_t>> reporterIDs = std::nullopt);
// Stops the session, which stays and may be started again. The reply of its start comes before this one's.
Request stopReportingSessionForID(std::int64_t reporterID);
// Stops the session if it runs, and drops it. The reply of its start never comes.
Request destroyReportingSession(std::int64_t reporterID);
// Answers a dictionary, "reporterID" and "serviceType"; 0 and 65535 for an unknown session.
Request reporterID(std::int64_t reporterID);
// Answers the reporter IDs of all sessions of all clients, see Reply::numbers().
Request getAllReporters();
// Ends the service. Has no reply: the end of the connection is its Ok.
Request killService();
// Answers the service's counters and levels as a dictionary; docs/operations.md tells what they mean. At once, also
// while other requests have to wait.
Request status();
// Answered when all that this connection sent before it is on the disk; at once where nothing is recorded, and never
// when recording failed, so call it with a time.
Request settle();

}  // namespace tarnkit
