// The remote operations of TarnReportingClient that wait for their reply.
#include <utility>

#include "client/TarnReportingClient.h"

namespace tarn::client {

Reply TarnReportingClient::createReportingSession(std::int64_t reporterID) {
  return call(client::createReportingSession(reporterID));
}

Reply TarnReportingClient::setServiceType(std::uint16_t serviceType, std::int64_t reporterID) {
  return call(client::setServiceType(serviceType, reporterID));
}

Reply TarnReportingClient::getServiceNameForReporterID(std::int64_t reporterID) {
  return call(client::getServiceNameForReporterID(reporterID));
}

Reply TarnReportingClient::setConfiguration(const plist::Dictionary& configuration, std::int64_t reporterID) {
  return call(client::setConfiguration(configuration, reporterID));
}

SendStatus TarnReportingClient::startReportingSessionForID(std::int64_t reporterID, ReplyHandler handler) {
  return send(client::startReportingSessionForID(reporterID), std::move(handler));
}

Reply TarnReportingClient::sendMessage(const plist::Dictionary& message, std::uint32_t category, std::uint16_t type,
                                       std::optional<std::vector<std::int64_t>> reporterIDs) {
  return call(client::sendMessage(message, category, type, std::move(reporterIDs)));
}

Reply TarnReportingClient::stopReportingSessionForID(std::int64_t reporterID) {
  return call(client::stopReportingSessionForID(reporterID));
}

Reply TarnReportingClient::destroyReportingSession(std::int64_t reporterID) {
  return call(client::destroyReportingSession(reporterID));
}

Reply TarnReportingClient::reporterID(std::int64_t reporterID) {
  return call(client::reporterID(reporterID));
}

Reply TarnReportingClient::getAllReporters() {
  return call(client::getAllReporters());
}

Reply TarnReportingClient::killService() {
  return call(client::killService());
}

Reply TarnReportingClient::status() {
  return call(client::status());
}

}  // namespace tarn::client
