// SPDX-License-Identifier: Apache-2.0
// TarnReportingSnareWorkerInstanceHapticLeaks: haptics hardware that was left running. The second report of one, from
// whichever sessions, makes the device take a snapshot of the logs of the session's processes.
//
// A report is a message of the type Wattlog with "Haptic_Active_Hardware_Time_Seconds". Owner: the worker; the count is
// the process's. Threads: the server queue; the reply on one of the capture service.
#pragma once

#include <memory>
#include <string_view>

#include "diagnostics/snare/TarnReportingSnareWorkerInstance.h"

namespace tarn {

class TarnReportingSnareWorkerInstanceHapticLeaks : public TarnReportingSnareWorkerInstance {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSnareWorkerInstanceHapticLeaks";

  // For every session; all share one state.
  static std::unique_ptr<TarnReportingSnareWorkerInstanceHapticLeaks> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  static bool handleSingleMessageSession() { return true; }
  using TarnReportingSnareWorkerInstance::TarnReportingSnareWorkerInstance;

  // By type and key alone, whatever the value.
  bool interestedInMessage(const TarnReportingSessionMessage& message) const override;
  // A snapshot is of what is there now, so it has no duration. The detected process is told as "Unknown".
  void fire(const TarnReportingSessionMessage& message);
};

}  // namespace tarn
