#include "client/Requests.h"

namespace tarn::client {

namespace {

Request request(wire::Operation operation, std::int64_t reporterID = 0) {
  Request made;
  made.operation = operation;
  made.reporterID = reporterID;
  return made;
}

}  // namespace

Request createReportingSession(std::int64_t reporterID) {
  return request(wire::Operation::CreateReportingSession, reporterID);
}

Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID) {
  Request made = request(wire::Operation::SetServiceType, reporterID);
  made.serviceType = serviceType;
  return made;
}

Request getServiceNameForReporterID(std::int64_t reporterID) {
  return request(wire::Operation::GetServiceNameForReporterID, reporterID);
}

Request setConfiguration(plist::Dictionary configuration, std::int64_t reporterID) {
  Request made = request(wire::Operation::SetConfiguration, reporterID);
  made.dictionary = std::move(configuration);
  return made;
}

Request startReportingSessionForID(std::int64_t reporterID) {
  return request(wire::Operation::StartReportingSessionForID, reporterID);
}

Request sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                    std::optional<std::vector<std::int64_t>> reporterIDs) {
  Request made = request(wire::Operation::SendMessage);
  made.dictionary = std::move(message);
  made.category = category;
  made.type = type;
  made.reporterIDs = std::move(reporterIDs);
  return made;
}

Request stopReportingSessionForID(std::int64_t reporterID) {
  return request(wire::Operation::StopReportingSessionForID, reporterID);
}

Request destroyReportingSession(std::int64_t reporterID) {
  return request(wire::Operation::DestroyReportingSession, reporterID);
}

Request reporterID(std::int64_t reporterID) {
  return request(wire::Operation::ReporterID, reporterID);
}

Request getAllReporters() {
  return request(wire::Operation::GetAllReporters);
}

Request killService() {
  return request(wire::Operation::KillService);
}

Request status() {
  return request(wire::Operation::Status);
}

}  // namespace tarn::client
