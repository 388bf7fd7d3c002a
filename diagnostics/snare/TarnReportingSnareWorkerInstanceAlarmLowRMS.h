// TarnReportingSnareWorkerInstanceAlarmLowRMS: an alarm that plays at too low a level. The third report of a session
// begins a capture of a minute, once in the life of the worker; a session that stops sooner cancels it, since an alarm
// that is over so quickly was heard.
#pragma once

#include <memory>
#include <string_view>

#include "diagnostics/snare/TarnReportingSnareWorkerInstance.h"

namespace tarn {

class TarnReportingSnareWorkerInstanceAlarmLowRMS : public TarnReportingSnareWorkerInstance {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSnareWorkerInstanceAlarmLowRMS";

  // For every session but single-message ones; each with a state of its own.
  static std::unique_ptr<TarnReportingSnareWorkerInstanceAlarmLowRMS> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSnareWorkerInstance::TarnReportingSnareWorkerInstance;

  bool interestedInMessage(const TarnReportingSessionMessage& message) const override;
  void fire(const TarnReportingSessionMessage& message);
  // Cancels the capture, also one that was cancelled before. One whose reply hasn't come is not known yet and goes on.
  void stop();

 private:
  const double snareAlarmLowRmsDuration_ = 60.0;  // seconds
};

}  // namespace tarn
