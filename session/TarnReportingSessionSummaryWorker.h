// TarnReportingSessionSummaryWorker: counts a session's activity and, when the session stops, sends one summary message
// back into it, where the consumers that still run get it like any client's message.
//
// The counters are not reset at stop: the summary of a session that is started again covers its whole life.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "plist/Dictionary.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionSummaryWorker : public TarnReportingSessionWorkerProtocol,
                                          public TarnReportingSessionWorkerConsumerProtocol,
                                          public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSummaryWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionSummaryWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  bool start();
  void stop();
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

 private:
  plist::Dictionary summary(const TarnReportingSession& session) const;

  double totalActiveTime_ = 0;  // seconds, the sum of "session_duration"
  std::uint32_t activeCount_ = 0;
  std::uint32_t overloadCount_ = 0;
};

}  // namespace tarn
