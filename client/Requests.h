// One function for each remote operation: the request, ready for call(), send() or trySend().
#pragma once

#include <cstdint>
#include <utility>

#include "wire/Request.h"

namespace tarn::client {

using wire::Operation;
using wire::Request;

inline Request createReportingSession(std::int64_t reporterID) {
  return wire::makeRequest<Operation::CreateReportingSession>(reporterID);
}

inline Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID) {
  return wire::makeRequest<Operation::SetServiceType>(serviceType, reporterID);
}

inline Request getServiceNameForReporterID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::GetServiceNameForReporterID>(reporterID);
}

inline Request setConfiguration(plist::Dictionary configuration, std::int64_t reporterID) {
  return wire::makeRequest<Operation::SetConfiguration>(std::move(configuration), reporterID);
}

// The reply comes when the session stops. Send it; call() would wait that long.
inline Request startReportingSessionForID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::StartReportingSessionForID>(reporterID);
}

// Without IDs the message goes to every running session.
inline Request sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                           wire::ReporterIDs reporterIDs = std::nullopt) {
  return wire::makeRequest<Operation::SendMessage>(std::move(message), category, type, std::move(reporterIDs));
}

inline Request stopReportingSessionForID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::StopReportingSessionForID>(reporterID);
}

inline Request destroyReportingSession(std::int64_t reporterID) {
  return wire::makeRequest<Operation::DestroyReportingSession>(reporterID);
}

inline Request reporterID(std::int64_t reporterID) {
  return wire::makeRequest<Operation::ReporterID>(reporterID);
}

inline Request getAllReporters() {
  return wire::makeRequest<Operation::GetAllReporters>();
}

// Has no reply: the end of the connection is its Ok.
inline Request killService() {
  return wire::makeRequest<Operation::KillService>();
}

inline Request status() {
  return wire::makeRequest<Operation::Status>();
}

// Answered when all that this connection sent before it is committed.
inline Request settle() {
  return wire::makeRequest<Operation::Settle>();
}

}  // namespace tarn::client
