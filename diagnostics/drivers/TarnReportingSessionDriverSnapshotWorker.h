// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionDriverSnapshotWorker: brackets a session with two samples of what the audio drivers count, and at
// its stop sends the difference into the same session.
//
// It applies where the platform has driver report channels. The samples of the start are the worker's own; what takes
// them is shared by all sessions (see TarnReportingDriverUtility).
//
// Owner: the session. Threads: the server queue, which waits for the drivers' answers.
#pragma once

#include <memory>
#include <optional>
#include <string_view>

#include "diagnostics/drivers/TarnReportingDriverUtility.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// A producer: its messages reach the consumers, which stop after it. Not in single-message sessions.
class TarnReportingSessionDriverSnapshotWorker : public TarnReportingSessionWorkerProtocol,
                                                 public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionDriverSnapshotWorker";

  // Nothing where the platform has no report channels.
  static std::unique_ptr<TarnReportingSessionDriverSnapshotWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Samples; always true. Driver groups that have no channel when the first session of the process starts stay without
  // one.
  bool start();
  // Samples again and sends. Without a start in between, a second one sends against no snapshot. Nothing is sent when
  // the session is gone or was never started.
  void stop();

  // What the start sampled; nothing before it and after the stop.
  const std::optional<TarnReportingDriverUtility::SnapShot>& driverSnapShot() const noexcept { return driverSnapShot_; }

 private:
  std::shared_ptr<const TarnReportingDriverUtility> utility_;  // the process's one, from the first start on
  std::optional<TarnReportingDriverUtility::SnapShot> driverSnapShot_;
};

}  // namespace tarn
