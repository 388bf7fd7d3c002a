// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionRtcWorker: mirrors one session into the real-time-communication reporting service: one session
// there for each period between start and stop, one event for each message, and at the stop one summary event that
// folds all of the session's messages together.
//
// All traffic with the service runs on a private serial queue, so that it sees the events in the order in which the
// session handed them over, and what comes while its session is still being set up waits after that. The worker only
// captures and hands over; see TarnReportingRtcMirror for the rest. It runs for every service type but "test", in
// single-message sessions too.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/WorkQueue.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingRtcMirror;

// Owner: the session. Threads: the server queue, but for what says otherwise.
class TarnReportingSessionRtcWorker : public TarnReportingSessionWorkerProtocol,
                                      public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionRtcWorker";

  // Nothing for sessions of type "test", and where there is no such service.
  static std::unique_ptr<TarnReportingSessionRtcWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool handleSingleMessageSession() { return true; }
  // The mirror is the worker's own; tests look at it.
  TarnReportingSessionRtcWorker(std::weak_ptr<TarnReportingSession> session,
                                std::shared_ptr<TarnReportingRtcMirror> mirror);

  // The category as the service knows it: without the upper half, which tells groups of tests apart.
  static std::uint16_t retrieveRTCReportingCategoryFromCategory(AudioEventCategory category);
  // Whether the service may hold events back and send many at once.
  static bool shouldBatchRTCReportingEventsForServiceType(AudioServiceType serviceType);

  // Also set, on a thread of the service, by a completion of the start that has a list, whenever it comes. One that
  // comes after the stop thus keeps the worker out of the session's next start.
  bool started() const noexcept override;
  void setStarted(bool started) noexcept override;
  // Whether a session of the service can be used. Threads: any.
  bool getRTCReportingStartedState() const noexcept;
  // The private queue, made on first use.
  const std::shared_ptr<platform::SuspendableQueue>& rtcReportingQueue();

  // True before the service's session exists.
  bool start();
  // Captures the log as it is now, by sharing payloads, and hands it over. When a start hasn't asked for backends yet,
  // it helps with that for up to 20 ms, so that a session that is stopped at once is still mirrored. Nothing when the
  // session is gone.
  void stop();
  // Hands over a record of its own with the payload of this moment; redundant messages don't come here.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
  // For work of rtcReportingQueue(): sends the message. Outside internal builds the record loses its time stamp.
  // NOLINTNEXTLINE(readability-identifier-naming): its given name
  void _sendMessage(const std::shared_ptr<TarnReportingSessionMessage>& message);

 private:
  const std::shared_ptr<TarnReportingRtcMirror> mirror_;
};

}  // namespace tarn
