// One function for each remote operation: the request, ready for call(), send() or trySend().
#pragma once

#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

#include "wire/Request.h"

namespace tarn::client {

using Request = wire::Request;

Request createReportingSession(std::int64_t reporterID);
Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID);
Request getServiceNameForReporterID(std::int64_t reporterID);
Request setConfiguration(plist::Dictionary configuration, std::int64_t reporterID);
// The reply comes when the session stops. Send it; call() would wait that long.
Request startReportingSessionForID(std::int64_t reporterID);
// Without IDs the message goes to every running session.
Request sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                    std::optional<std::vector<std::int64_t>> reporterIDs = std::nullopt);
Request stopReportingSessionForID(std::int64_t reporterID);
Request destroyReportingSession(std::int64_t reporterID);
Request reporterID(std::int64_t reporterID);
Request getAllReporters();
// Has no reply: the end of the connection is its Ok.
Request killService();
Request status();

}  // namespace tarn::client
