// TarnReportingMessageDelivery: a message on its way to its sessions. A list of IDs may be long and a broadcast wide,
// so the look-up and the hand-over are done in slices.
//
// Owned by the piece of work that does its next slice. Threads: the server queue.
#pragma once

#include <cstdint>
#include <memory>

#include "plist/Dictionary.h"
#include "service/TarnReportingServiceDelegateProtocol.h"

namespace tarn {

class TarnReportingMessageDelivery {
 public:
  TarnReportingMessageDelivery(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                               platform::ReporterIDs reporterIDs, platform::Reply<> reply)
      : message_(std::move(message)),
        category_(category),
        type_(type),
        reply_(std::move(reply)),
        search_{std::move(reporterIDs), {}} {}
  TarnReportingMessageDelivery(TarnReportingMessageDelivery&&) = default;
  TarnReportingMessageDelivery& operator=(TarnReportingMessageDelivery&&) = default;

  std::uint32_t category() const noexcept { return category_; }
  // Delivers it, and replies at the end: with an error where the service is gone or reporting is disabled.
  void begin(std::int32_t processIdentifier, const std::weak_ptr<TarnReportingServiceDelegateProtocol>& service);

 private:
  void proceed(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate);
  void giveWay(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate);
  void handOver(const std::shared_ptr<TarnReportingSession>& session, bool isLast);
  bool isForWhoeverRuns() const { return !search_.reporterIDs || search_.reporterIDs->empty(); }

  plist::Dictionary message_;
  std::uint32_t category_;
  std::uint16_t type_;
  platform::Reply<> reply_;
  TarnReportingServiceDelegateProtocol::SessionSearch search_;
  bool found_ = false;    // the search is over
  std::size_t next_ = 0;  // of the sessions that were found
  TarnReportingOutcome outcome_ = TarnReportingOutcome::WithoutSession;
};

}  // namespace tarn
