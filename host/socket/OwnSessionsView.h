// SPDX-License-Identifier: Apache-2.0
// OwnSessionsView: the service as a client sees it that may see its own user's sessions only. Stands between a
// connection of the ordinary socket and what the service exported to it, where only the admin socket sees everything.
//
// A session of another user is answered for as one that nobody has. What a client does to its own sessions, and whom
// its messages reach, stays as it is: sending tells nothing about who is there.
//
// Owned by the connection. Threads: as TarnReportingServiceProtocol says.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "host/socket/UserSessions.h"
#include "platform/TarnReportingServiceProtocol.h"
#include "platform/WorkQueue.h"

namespace tarn::linux_host {

class OwnSessionsView final : public platform::TarnReportingServiceProtocol {
 public:
  using Service = platform::TarnReportingServiceProtocol;

  // `sessions` outlives the view and what it was asked. `queue` is the one that the service works on.
  OwnSessionsView(std::shared_ptr<Service> service, const UserSessions& sessions, std::uint32_t user,
                  std::shared_ptr<platform::WorkQueue> queue)
      : service_(std::move(service)), sessions_(sessions), user_(user), queue_(std::move(queue)) {}

  // The client's own session first, then the user's in the order of connection.
  void getServiceNameForReporterID(std::int64_t reporterID, platform::Reply<std::uint16_t> reply) override;
  void reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) override;
  // Those of the user's clients, in the order of connection.
  void getAllReporters(platform::Reply<std::vector<std::int64_t>> reply) override;
  // Does nothing: whoever has the view refuses it.
  void killService() override {}

  // The rest is the service's.
  void createReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override {
    service_->createReportingSession(reporterID, std::move(reply));
  }
  void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, platform::Acknowledge reply) override {
    service_->setServiceType(serviceType, reporterID, std::move(reply));
  }
  void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID,
                        platform::Acknowledge reply) override {
    service_->setConfiguration(std::move(configuration), reporterID, std::move(reply));
  }
  void startReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override {
    service_->startReportingSessionForID(reporterID, std::move(reply));
  }
  void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                   platform::ReporterIDs reporterIDs, platform::Reply<> reply) override {
    service_->sendMessage(std::move(message), category, type, std::move(reporterIDs), std::move(reply));
  }
  void sendMessages(platform::MessageRun& run) override { service_->sendMessages(run); }
  void stopReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override {
    service_->stopReportingSessionForID(reporterID, std::move(reply));
  }
  void destroyReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override {
    service_->destroyReportingSession(reporterID, std::move(reply));
  }
  std::size_t sessionCount() const override { return service_->sessionCount(); }
  std::size_t logBytes() const override { return service_->logBytes(); }
  bool hasSession(std::int64_t reporterID) const override { return service_->hasSession(reporterID); }
  std::optional<std::uint16_t> serviceTypeOf(std::int64_t reporterID) const override {
    return service_->serviceTypeOf(reporterID);
  }
  bool listReporterIDs(std::uint64_t& from, std::size_t atMost, std::vector<std::int64_t>& reporters) const override {
    return service_->listReporterIDs(from, atMost, reporters);
  }

 private:
  const std::shared_ptr<Service> service_;
  const UserSessions& sessions_;
  const std::uint32_t user_;
  const std::shared_ptr<platform::WorkQueue> queue_;
};

}  // namespace tarn::linux_host
