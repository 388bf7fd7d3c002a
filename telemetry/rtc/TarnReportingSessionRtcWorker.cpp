// SPDX-License-Identifier: Apache-2.0
#include "telemetry/rtc/TarnReportingSessionRtcWorker.h"

#include <chrono>
#include <string>
#include <utility>

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "telemetry/rtc/TarnReportingRtcMirror.h"

namespace tarn {

namespace {

constexpr std::string_view kServiceNameSuffix = "_session";
// For which a stop waits at the most while another thread carries out the start, which asks for backends and no more.
constexpr std::chrono::milliseconds kStartHelp{20};

// Of a copy only the payload is kept: there may be hundreds of thousands, and they wait for their queue.
TarnReportingRtcMirror::Stopped snapshotOf(const TarnReportingSession& session) {
  const TarnReportingSessionMessageList& log = session.messages();
  TarnReportingRtcMirror::Stopped stopped{{}, !log.empty(), session.serviceType(), session.reporterID()};
  stopped.messages.pages = log.pages();
  std::vector<plist::Dictionary>& payloads = stopped.messages.payloads;
  payloads.reserve(log.recent().size());
  for (const auto& message : log.recent()) {
    const TarnReportingSessionMessage copy(TarnReportingSessionMessage::Copy{}, *message);
    if (TarnReportingIsForRtcSummary(*message)) {
      payloads.push_back(copy.message());
    }
  }
  return stopped;
}

}  // namespace

std::unique_ptr<TarnReportingSessionRtcWorker> TarnReportingSessionRtcWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  platform::RtcReportingService* const service = TarnReportingFacilities().rtcReporting;
  if (service == nullptr || session->serviceType() == AudioServiceType::Test) return nullptr;
  return std::make_unique<TarnReportingSessionRtcWorker>(session, std::make_shared<TarnReportingRtcMirror>(*service));
}

TarnReportingSessionRtcWorker::TarnReportingSessionRtcWorker(std::weak_ptr<TarnReportingSession> session,
                                                             std::shared_ptr<TarnReportingRtcMirror> mirror)
    : TarnReportingSessionWorkerProtocol(std::move(session)), mirror_(std::move(mirror)) {}

std::uint16_t TarnReportingSessionRtcWorker::retrieveRTCReportingCategoryFromCategory(AudioEventCategory category) {
  return TarnReportingRtcMirror::retrieveRTCReportingCategoryFromCategory(category);
}

bool TarnReportingSessionRtcWorker::shouldBatchRTCReportingEventsForServiceType(AudioServiceType serviceType) {
  return TarnReportingRtcMirror::shouldBatchRTCReportingEventsForServiceType(serviceType);
}

bool TarnReportingSessionRtcWorker::started() const noexcept {
  return mirror_->started();
}

void TarnReportingSessionRtcWorker::setStarted(bool started) noexcept {
  mirror_->setStarted(started);
}

bool TarnReportingSessionRtcWorker::getRTCReportingStartedState() const noexcept {
  return mirror_->rtcReportingSessionStarted();
}

const std::shared_ptr<platform::SuspendableQueue>& TarnReportingSessionRtcWorker::rtcReportingQueue() {
  return mirror_->rtcReportingQueue();
}

bool TarnReportingSessionRtcWorker::start() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner || owner->serviceType() == AudioServiceType::Test) return false;
  std::string serviceName(owner->serviceName());
  serviceName += kServiceNameSuffix;
  // At once: a completion that comes after the session's stop keeps the worker out of the next start.
  mirror_->setStarting();
  rtcReportingQueue()->asyncAtOnce(
      [mirror = mirror_, started = TarnReportingRtcMirror::Started{
                             owner->configuration(), std::move(serviceName), owner->serviceType(), owner->reporterID(),
                             owner->isSingleMessageSession()}] { mirror->start(started); });
  return true;
}

void TarnReportingSessionRtcWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  if (mirror_->isInert()) {
    TarnReportingRtcMirror::tellNeverStarted("handleMessage");  // as its queue would, without the way there
    return;
  }
  auto copy = std::make_shared<TarnReportingSessionMessage>(message->message(), message->category(), message->type());
  rtcReportingQueue()->async([mirror = mirror_, copy = std::move(copy)] { mirror->handleMessage(copy); });
}

void TarnReportingSessionRtcWorker::stop() {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  if (mirror_->isStarting()) {
    rtcReportingQueue()->help(kStartHelp);  // so that it completes before this stop
  }
  rtcReportingQueue()->async([mirror = mirror_, stopped = snapshotOf(*owner)] { mirror->stop(stopped); });
}

// NOLINTNEXTLINE(readability-identifier-naming): its given name
void TarnReportingSessionRtcWorker::_sendMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  mirror_->_sendMessage(message);
}

}  // namespace tarn
