// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingRunDelivery.h"

#include <utility>

#include "platform/Facilities.h"
#include "platform/TracePoints.h"
#include "service/TarnReportingSessionIndex.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingSignpost.h"
#include "session/TarnReportingSession.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = "TarnReportingClientServerInstance";
constexpr TarnReportingLogger kLog{TarnReportingClientCategory, kModule};
constexpr std::uint32_t kTraceSend = 0x21044824;

// Counts the message when it is over, however that comes.
class Account {
 public:
  explicit Account(TarnReportingServiceDelegateProtocol& service) noexcept : service_(service) {}
  Account(const Account&) = delete;
  Account& operator=(const Account&) = delete;
  ~Account() { service_.countMessage(outcome); }

  TarnReportingOutcome outcome = TarnReportingOutcome::Refused;

 private:
  TarnReportingServiceDelegateProtocol& service_;
};

}  // namespace

TarnReportingRunDelivery::TarnReportingRunDelivery(std::int32_t processIdentifier,
                                                   std::shared_ptr<TarnReportingServiceDelegateProtocol> service)
    : processIdentifier_(processIdentifier), service_(std::move(service)) {}

TarnReportingRunDelivery::~TarnReportingRunDelivery() = default;

void TarnReportingRunDelivery::deliver(const platform::MessageRun::Message& message) {
  if (service_ == nullptr) return;
  const TarnReportingSignpost signpost(SignpostCategory::Operation, kModule, "sendMessage",
                                       {"category", message.category});
  Account account(*service_);
  kLog(LogLevel::Debug, "sending message for reporter %@", [&] { return plist::Array{message.reporterID}; });
  TarnReportingFacilities().tracePoints.emit(kTraceSend, processIdentifier_);
  if (service_->isReportingEnabled()) {
    account.outcome = handOver(message);
  }
}

TarnReportingOutcome TarnReportingRunDelivery::handOver(const platform::MessageRun::Message& message) {
  TarnReportingSession* const session = sessionFor(message.reporterID);
  if (session == nullptr) return TarnReportingOutcome::WithoutSession;
  const TarnReportingSession::Taken taken = session->sendMessage(
      *message.payload, static_cast<AudioEventCategory>(message.category), static_cast<AudioEventType>(message.type));
  return TarnReportingOutcomeOf(taken.isRedundant, taken.workers);
}

TarnReportingSession* TarnReportingRunDelivery::sessionFor(std::int64_t reporterID) {
  const std::uint64_t changes = service_->sessionIndex().changes();
  const bool isKnown = session_ != nullptr && reporterID == reporterID_ && changes == changes_;
  if (!isKnown || detail::logEnabled(LogLevel::Info)) {
    session_ = service_->findReportingSessionForID(reporterID);
    reporterID_ = reporterID;
    changes_ = changes;
  }
  return session_.get();
}

}  // namespace tarn
