// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingMessageDelivery.h"

#include <algorithm>

#include "platform/Facilities.h"
#include "platform/TracePoints.h"
#include "service/TarnReportingSlices.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingClientCategory, "TarnReportingClientServerInstance"};
constexpr std::string_view kErrorDomain = "sys.oxbow.audio.reporting";
constexpr std::int64_t kReportingDisabled = 1;
constexpr std::uint32_t kTraceSend = 0x21044824;
// Of handing a message to a session, in units of about a microsecond.
constexpr std::size_t kDeliveryCost = 4;

plist::ValueView textOf(const platform::ReporterIDs& reporterIDs, plist::Array& storage) {
  if (!reporterIDs) return {};
  for (const std::int64_t reporterID : *reporterIDs) {
    storage.append(reporterID);
  }
  return storage;
}

// The better of two sessions' outcomes of one message.
void improve(TarnReportingOutcome& outcome, TarnReportingOutcome another) {
  outcome = std::min(outcome, another);
}

}  // namespace

void TarnReportingMessageDelivery::begin(std::int32_t processIdentifier,
                                         const std::weak_ptr<TarnReportingServiceDelegateProtocol>& service) {
  plist::Array storage;
  kLog(LogLevel::Debug, "sending message for reporter %@", [&] { return textOf(search_.reporterIDs, storage); });
  TarnReportingFacilities().tracePoints.emit(kTraceSend, processIdentifier);
  const auto delegate = service.lock();
  if (!delegate || !delegate->isReportingEnabled()) {
    account_.close(TarnReportingOutcome::Refused);
    reply_(platform::RemoteError{kErrorDomain, kReportingDisabled, "reporting is disabled"});
    return;
  }
  if (search_.reporterIDs && search_.reporterIDs->size() == 1) {
    deliverToOne(*delegate);
  } else {
    proceed(*delegate, service);
  }
}

void TarnReportingMessageDelivery::deliverToOne(TarnReportingServiceDelegateProtocol& service) {
  if (const auto session = service.findReportingSessionForID(search_.reporterIDs->front())) {
    handOver(session, true);
  }
  finish();
}

void TarnReportingMessageDelivery::proceed(TarnReportingServiceDelegateProtocol& service,
                                           const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate) {
  found_ = found_ || service.findNextSessions(search_);
  if (!found_) {
    giveWay(delegate);
    return;
  }
  auto& sessions = search_.found;
  while (next_ < sessions.size()) {
    const std::shared_ptr<TarnReportingSession> session = std::move(sessions[next_++]);
    const bool isLast = next_ == sessions.size();
    handOver(session, isLast);
    if (!isLast && TarnReportingSpend(kDeliveryCost)) {
      giveWay(delegate);
      return;
    }
  }
  finish();
}

void TarnReportingMessageDelivery::finish() {
  account_.close(outcome_);
  reply_(std::nullopt);
}

void TarnReportingMessageDelivery::giveWay(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate) {
  TarnReportingContinueLater([delegate, rest = std::move(*this)]() mutable {
    if (const auto service = delegate.lock()) {
      rest.proceed(*service, delegate);
    }
  });
}

void TarnReportingMessageDelivery::handOver(const std::shared_ptr<TarnReportingSession>& session, bool isLast) {
  if (isForWhoeverRuns() && !session->started()) {
    improve(outcome_, TarnReportingOutcome::Undeliverable);  // it was stopped while others had their turn
    return;
  }
  // Each session changes its own; the last one, mostly the only one, needs no copy for it.
  const auto record = std::make_shared<TarnReportingSessionMessage>(isLast ? std::move(message_) : message_,
                                                                    static_cast<AudioEventCategory>(category_),
                                                                    static_cast<AudioEventType>(type_));
  const std::size_t workers = session->sendMessage(record);
  improve(outcome_, TarnReportingOutcomeOf(record->isRedundant(), workers));
}

}  // namespace tarn
