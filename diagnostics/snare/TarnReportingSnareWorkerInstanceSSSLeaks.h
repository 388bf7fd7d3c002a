// SPDX-License-Identifier: Apache-2.0
// TarnReportingSnareWorkerInstanceSSSLeaks: a system sound that got stuck in the system sound server. Every report that
// is no repeat makes the device take a snapshot of the logs of the session's processes, but at most one in 15 seconds,
// whichever sessions the reports come from.
//
// A report is a message of the type Wattlog with "System_Sound_Stuck_Time_Seconds". Owner: the worker; count and rate
// limit are the process's. Threads: the server queue; the reply on one of the capture service.
#pragma once

#include <memory>
#include <string_view>

#include "diagnostics/snare/TarnReportingSnareProcessState.h"
#include "diagnostics/snare/TarnReportingSnareWorkerInstance.h"

namespace tarn {

class TarnReportingSnareWorkerInstanceSSSLeaks : public TarnReportingSnareWorkerInstance {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSnareWorkerInstanceSSSLeaks";

  // For every session; all share one state.
  static std::unique_ptr<TarnReportingSnareWorkerInstanceSSSLeaks> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool handleSingleMessageSession() { return true; }
  // Both states are kept for as long as the instance lives.
  TarnReportingSnareWorkerInstanceSSSLeaks(std::weak_ptr<TarnReportingSession> session,
                                           std::shared_ptr<WorkerInstanceState> workerState,
                                           std::shared_ptr<TarnReportingSnareProcessState> processState);

  // By type and key alone, whatever the value.
  bool interestedInMessage(const TarnReportingSessionMessage& message) const override;
  // Within 15 seconds of the last snapshot, and while the clock stands before it, it only logs a line at info level;
  // the count begins anew all the same.
  void fire(const TarnReportingSessionMessage& message);

 private:
  // Under the lock of the rate limit.
  void requestSnapshot(const TarnReportingSession& session, const TarnReportingSessionMessage& message);

  const std::shared_ptr<TarnReportingSnareProcessState> processState_;
};

}  // namespace tarn
