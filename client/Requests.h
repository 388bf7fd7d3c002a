// SPDX-License-Identifier: Apache-2.0
// One function for each remote operation: the request, ready for call(), send() or trySend().
//
// What an operation takes stands in the table of operations, and makeRequest() holds these functions to it. What the
// reply carries is told here; Reply::number(), dictionary() and numbers() read it. Where nothing is told it is true.
// Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <utility>

#include "wire/Request.h"

namespace tarn::client {

// As the tools and the tests write them.
using wire::Operation;
using wire::Request;

// A session of this connection under an ID of its own choice, in place of one that is there. Nothing is sent by making
// a request; each can't fail but for want of memory.
inline Request createReportingSession(std::int64_t reporterID) {
  return wire::makeRequest<Operation::CreateReportingSession>(reporterID);
}

// Another type than the session has makes it anew, not started, with configuration and latest values kept.
inline Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID) {
  return wire::makeRequest<Operation::SetServiceType>(serviceType, reporterID);
}

// The result is the service type as a number: see Reply::number().
inline Request getServiceNameForReporterID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::GetServiceNameForReporterID>(reporterID);
}

// Merged into what the session has; the dictionary's block is shared, not copied.
inline Request setConfiguration(plist::Dictionary configuration, std::int64_t reporterID) {
  return wire::makeRequest<Operation::SetConfiguration>(std::move(configuration), reporterID);
}

// The reply comes when the session stops, or is Cancelled when it can't come. Send it; call() would wait that long.
inline Request startReportingSessionForID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::StartReportingSessionForID>(reporterID);
}

// Without IDs the message goes to every running session; likewise with an empty list. At most 65536 IDs.
inline Request sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                           wire::ReporterIDs reporterIDs = std::nullopt) {
  return wire::makeRequest<Operation::SendMessage>(std::move(message), category, type, std::move(reporterIDs));
}

// The session stays and may be started again. The start's handler is called before this one's.
inline Request stopReportingSessionForID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::StopReportingSessionForID>(reporterID);
}

// Stops and drops it; handlers of its starts get Cancelled.
inline Request destroyReportingSession(std::int64_t reporterID) {
  return wire::makeRequest<Operation::DestroyReportingSession>(reporterID);
}

// The result is a dictionary of "reporterID" and "serviceType"; 0 and 65535 for an unknown session.
inline Request reporterID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::ReporterID>(reporterID);
}

// The result is a list of the IDs of all clients' sessions.
inline Request getAllReporters() {
  return wire::makeRequest<Operation::GetAllReporters>();
}

// Ends the service. Has no reply: the end of the connection is its Ok, and every other request that is outstanding then
// gets ConnectionLost.
inline Request killService() {
  return wire::makeRequest<Operation::KillService>();
}

// The result is the service's counters and levels. Answered also while other requests have to wait.
inline Request status() {
  return wire::makeRequest<Operation::Status>();
}

// Answered when all that this connection sent before it is committed; never when that failed, so with a time.
inline Request settle() {
  return wire::makeRequest<Operation::Settle>();
}

}  // namespace tarn::client
