// SPDX-License-Identifier: Apache-2.0
#include "client/Requests.h"

#include <utility>

#include "client/tarnkit/Values.h"

#include <tarnkit/Requests.h>

namespace tarnkit {

namespace client = tarn::client;

Request::Request(tarn::wire::Request content)
    : content_(std::make_shared<const tarn::wire::Request>(std::move(content))) {}

Request createReportingSession(std::int64_t reporterID) {
  return Request(client::createReportingSession(reporterID));
}

Request setServiceType(std::uint16_t serviceType, std::int64_t reporterID) {
  return Request(client::setServiceType(serviceType, reporterID));
}

Request getServiceNameForReporterID(std::int64_t reporterID) {
  return Request(client::getServiceNameForReporterID(reporterID));
}

Request setConfiguration(const Dictionary& configuration, std::int64_t reporterID) {
  return Request(client::setConfiguration(client::packed(configuration), reporterID));
}

Request startReportingSessionForID(std::int64_t reporterID) {
  return Request(client::startReportingSessionForID(reporterID));
}

Request sendMessage(const Dictionary& message, std::uint32_t category, std::uint16_t type,
                    std::optional<std::vector<std::int64_t>> reporterIDs) {
  return Request(client::sendMessage(client::packed(message), category, type, std::move(reporterIDs)));
}

Request stopReportingSessionForID(std::int64_t reporterID) {
  return Request(client::stopReportingSessionForID(reporterID));
}

Request destroyReportingSession(std::int64_t reporterID) {
  return Request(client::destroyReportingSession(reporterID));
}

Request reporterID(std::int64_t reporterID) {
  return Request(client::reporterID(reporterID));
}

Request getAllReporters() {
  return Request(client::getAllReporters());
}

Request killService() {
  return Request(client::killService());
}

Request status() {
  return Request(client::status());
}

Request settle() {
  return Request(client::settle());
}

}  // namespace tarnkit
