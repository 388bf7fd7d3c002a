// SPDX-License-Identifier: Apache-2.0
#include "tests/host/socket/RecordingService.h"

#include <algorithm>
#include <set>

#include "plist/ValueView.h"

namespace tarn::testing {

// What is exported to one client.
class RecordingService::Client final : public platform::TarnReportingServiceProtocol {
 public:
  Client(RecordingService& service, int number)
      : service_(service), number_(number), prefix_(std::to_string(number) + " ") {}

  void createReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override {
    work("createReportingSession " + std::to_string(reporterID),
         [this, reporterID, reply = std::move(reply)]() mutable {
           sessions_.insert(reporterID);
           reply(std::nullopt, true);
         });
  }
  void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, platform::Acknowledge reply) override {
    acknowledged("setServiceType " + std::to_string(serviceType) + " " + std::to_string(reporterID), std::move(reply));
  }
  void getServiceNameForReporterID(std::int64_t reporterID, platform::Reply<std::uint16_t> reply) override {
    work("getServiceNameForReporterID " + std::to_string(reporterID),
         [reply = std::move(reply)]() mutable { reply(std::nullopt, std::uint16_t{65535}); });
  }
  void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID,
                        platform::Acknowledge reply) override {
    acknowledged("setConfiguration " + plist::description(configuration) + " " + std::to_string(reporterID),
                 std::move(reply));
  }
  void startReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override {
    work("startReportingSessionForID " + std::to_string(reporterID),
         [this, reporterID, reply = std::move(reply)]() mutable {
           service_.heldStarts.push_back({reporterID, std::move(reply)});
         });
  }
  void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                   platform::ReporterIDs reporterIDs, platform::Reply<> reply) override {
    std::string ids = reporterIDs ? "ids" : "none";
    for (const auto id : reporterIDs.value_or(std::vector<std::int64_t>())) {
      ids += " " + std::to_string(id);
    }
    const bool twice = service_.replyTwice;
    work("sendMessage " + plist::description(message) + " " + std::to_string(category) + " " + std::to_string(type) +
             " " + ids,
         [twice, reply = std::move(reply)]() mutable {
           reply(std::nullopt);
           if (twice) {
             reply(std::nullopt);
           }
         });
  }
  void sendMessages(platform::MessageRun& run) override {
    service_.events.push_back(prefix_ + "run");
    while (const platform::MessageRun::Message* const message = run.next()) {
      service_.events.push_back(prefix_ + "message " + plist::description(message->payload->dictionary()["number"]) +
                                " to " + std::to_string(message->reporterID));
      service_.receivedThen.push_back(service_.received ? service_.received() : 0);
      service_.allocate(Short::Working);
      service_.queue_->spend(service_.runCost);
    }
  }
  void stopReportingSessionForID(std::int64_t reporterID, platform::Acknowledge reply) override {
    if (service_.slices == 0) {
      acknowledged("stopReportingSessionForID " + std::to_string(reporterID), std::move(reply));
      return;
    }
    service_.queue_->async([this, reporterID, reply = std::move(reply)]() mutable {
      stopInSlices(reporterID, service_.slices, std::move(reply));
    });
  }
  void destroyReportingSession(std::int64_t reporterID, platform::Acknowledge reply) override {
    work("destroyReportingSession " + std::to_string(reporterID), [reply = std::move(reply)]() mutable {
      reply(platform::RemoteError{"sys.oxbow.audio.reporting", 1, "refused"}, false);
    });
  }
  void reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) override {
    const std::string padding(service_.replyPadding, 'x');
    work("reporterID " + std::to_string(reporterID), [reporterID, padding, reply = std::move(reply)]() mutable {
      reply(std::nullopt, plist::Dictionary{{"reporterID", reporterID}, {"padding", padding}});
    });
  }
  void getAllReporters(platform::Reply<std::vector<std::int64_t>> reply) override {
    work("getAllReporters", [this, reply = std::move(reply)]() mutable { reply(std::nullopt, service_.reporters); });
  }
  void killService() override {
    work("killService", [] {});
  }
  std::size_t sessionCount() const override { return sessions_.size(); }
  std::size_t logBytes() const override {
    const auto found = service_.logBytes.find(number_);
    return found == service_.logBytes.end() ? 0 : found->second;
  }
  bool hasSession(std::int64_t reporterID) const override { return sessions_.contains(reporterID); }
  bool listReporterIDs(std::uint64_t& /*from*/, std::size_t /*atMost*/,
                       std::vector<std::int64_t>& reporters) const override {
    reporters.insert(reporters.end(), sessions_.begin(), sessions_.end());
    return false;
  }

 private:
  void stopInSlices(std::int64_t reporterID, int left, platform::Acknowledge reply) {
    for (; left != 0; --left) {
      service_.events.push_back(prefix_ + "slice");
      if (service_.onSlice) {
        service_.onSlice(left - 1);
      }
      if (service_.queue_->spend(4)) {
        service_.queue_->asyncNext([this, reporterID, left, reply = std::move(reply)]() mutable {
          stopInSlices(reporterID, left - 1, std::move(reply));
        });
        return;
      }
    }
    service_.events.push_back(prefix_ + "stopped " + std::to_string(reporterID));
    reply(std::nullopt, true);
  }
  template <class Body>
  void work(std::string event, Body body) {
    service_.mostWaiting = std::max(service_.mostWaiting, service_.queue_->waiting());
    service_.allocate(Short::HandingOver);
    service_.queue_->async([this, event = std::move(event), body = std::move(body)]() mutable {
      service_.events.push_back(prefix_ + event);
      service_.allocate(Short::Working);
      body();
      service_.allocate(Short::AfterTheReply);
    });
  }
  void acknowledged(std::string event, platform::Acknowledge reply) {
    work(std::move(event), [reply = std::move(reply)]() mutable { reply(std::nullopt, true); });
  }

  RecordingService& service_;
  const int number_;
  std::string prefix_;
  std::set<std::int64_t> sessions_;  // those that were made
};

bool RecordingService::listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) {
  allocate(Short::Accepting);
  const int number = ++clients_;
  processIdentifiers.push_back(connection->processIdentifier());
  openers.emplace_back(connection->number(), connection->user());
  descriptions.push_back(connection->description());
  connection->setExportedObject(std::make_shared<Client>(*this, number));
  connection->setInterruptionHandler([this, number] {
    events.push_back(std::to_string(number) + " interrupted");
    allocate(Short::Ending);
  });
  connection->setInvalidationHandler([this, number] {
    events.push_back(std::to_string(number) + " invalidated");
    allocate(Short::Ending);
  });
  connection->resume();
  return true;
}

}  // namespace tarn::testing
