// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionPylonWorker: posts one metric record for every message about a detected audio issue, as it
// arrives, to the wireless-diagnostics metric service.
//
// It runs from the session's creation on and in single-message sessions; not where the device has no metric service.
// Nothing is kept between messages.
//
// Owner: the session. Threads: the server queue.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// It has no start and no stop: the session notes that it runs. Redundant messages aren't posted.
class TarnReportingSessionPylonWorker : public TarnReportingSessionWorkerProtocol,
                                        public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionPylonWorker";

  // Nothing where the device has no metric service.
  static std::unique_ptr<TarnReportingSessionPylonWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // A message of another type than IssueDetector is left alone. What an issue message doesn't say is logged and stays
  // at its default in the record. The record's fields are "issue_type", "rtaid_client" and "node", each as text up to
  // its first NUL, and "any_channel_silence_seconds", cut to a whole number and its low 32 bits, as the duration. The
  // timestamp isn't set. The service is handed the record only for the call, and asks it for the form that it wants.
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override;
};

}  // namespace tarn
