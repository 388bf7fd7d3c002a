// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionOrientationMessagesWorker: a producer for the device's orientation that applies to no session. It
// is in no table of worker classes.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// Kept as a name that a table may list: a class that declines every session costs one call a start.
class TarnReportingSessionOrientationMessagesWorker : public TarnReportingSessionWorkerProtocol,
                                                      public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionOrientationMessagesWorker";

  // Nothing, for every session.
  static std::unique_ptr<TarnReportingSessionOrientationMessagesWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
};

}  // namespace tarn
