// TarnReportingSnareWorkerInstanceHapticLeaks: haptics hardware that was left running. The second report of one, from
// whichever sessions, makes the device take a snapshot of the logs of the session's processes.
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

  bool interestedInMessage(const TarnReportingSessionMessage& message) const override;
  void fire(const TarnReportingSessionMessage& message);
};

}  // namespace tarn
