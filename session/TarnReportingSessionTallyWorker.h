// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionTallyWorker: forwards every message of a session, as it arrives, to the analytics-event service,
// under two event names: one of the message's category and type, one with the session's service name before them.
//
// It runs everywhere: from the session's creation on, in single-message sessions, for every service type.
//
// The payload is the one that the intake left: stamped, tagged, without blanks in keys. Redundant messages aren't
// forwarded.
//
// Owner: the session. Threads: the server queue; the service may ask for the payload later, on a thread of its own.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingTallyNames;

// It has no start and no stop of its own: the session notes that it runs.
class TarnReportingSessionTallyWorker : public TarnReportingSessionWorkerProtocol,
                                        public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionTallyWorker";

  // For every session.
  static std::unique_ptr<TarnReportingSessionTallyWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  // So messages that come before the session's start are reported too.
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // For each of the two names, in this order: asks whether anybody wants the event, and hands the payload over only
  // then. A payload handed over is a share of the present one; what a producer changes later isn't in it.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;

 private:
  std::shared_ptr<TarnReportingTallyNames> names_;  // from the first message on
};

}  // namespace tarn
