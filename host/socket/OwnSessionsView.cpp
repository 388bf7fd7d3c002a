// SPDX-License-Identifier: Apache-2.0
#include "host/socket/OwnSessionsView.h"

namespace tarn::linux_host {

namespace {

constexpr std::uint16_t kUnknownType = 65535;
// IDs that are listed in a unit of cost.
constexpr std::size_t kListedAtOnce = 16;

// What of the sessions is to be seen. Kept by what was asked, which may outlast the view.
struct Sight {
  std::shared_ptr<const platform::TarnReportingServiceProtocol> client;
  const UserSessions& sessions;
  std::uint32_t user;

  std::optional<std::uint16_t> serviceTypeOf(std::int64_t reporterID) const {
    const auto own = client->serviceTypeOf(reporterID);
    return own ? own : sessions.serviceTypeOf(user, reporterID);
  }
};

// A listing in slices, owned by the piece of work that does its next one.
class Listing {
 public:
  Listing(const UserSessions& sessions, std::uint32_t user, std::shared_ptr<platform::WorkQueue> queue,
          platform::Reply<std::vector<std::int64_t>> reply)
      : sessions_(sessions), user_(user), queue_(std::move(queue)), reply_(std::move(reply)) {}

  // May hand itself over as the work of the next slice: the object isn't used again after the call.
  void proceed() {
    while (sessions_.list(user_, place_, kListedAtOnce, reporters_)) {
      if (queue_->spend(1)) {
        const auto queue = queue_;
        queue->asyncNext([rest = std::move(*this)]() mutable { rest.proceed(); });
        return;
      }
    }
    reply_(std::nullopt, std::move(reporters_));
  }

 private:
  const UserSessions& sessions_;
  std::uint32_t user_;
  std::shared_ptr<platform::WorkQueue> queue_;
  platform::Reply<std::vector<std::int64_t>> reply_;
  UserSessions::Place place_;
  std::vector<std::int64_t> reporters_;
};

}  // namespace

// The service does and logs what it always does. Its answer may be about anybody's session, so it isn't used.
void OwnSessionsView::getServiceNameForReporterID(std::int64_t reporterID, platform::Reply<std::uint16_t> reply) {
  service_->getServiceNameForReporterID(
      reporterID, [sight = Sight{service_, sessions_, user_}, reporterID, reply = std::move(reply)](
                      const auto& error, std::uint16_t) mutable {
        const auto type = reporterID == 0 ? std::nullopt : sight.serviceTypeOf(reporterID);
        reply(error, type.value_or(kUnknownType));
      });
}

void OwnSessionsView::reporterID(std::int64_t reporterID, platform::Reply<plist::Dictionary> reply) {
  service_->reporterID(reporterID, [sight = Sight{service_, sessions_, user_}, reporterID, reply = std::move(reply)](
                                       const auto& error, const plist::Dictionary&) mutable {
    const auto type = sight.serviceTypeOf(reporterID);
    reply(error,
          plist::Dictionary{{"reporterID", type ? reporterID : 0}, {"serviceType", type.value_or(kUnknownType)}});
  });
}

void OwnSessionsView::getAllReporters(platform::Reply<std::vector<std::int64_t>> reply) {
  queue_->async([listing = Listing(sessions_, user_, queue_, std::move(reply))]() mutable { listing.proceed(); });
}

}  // namespace tarn::linux_host
