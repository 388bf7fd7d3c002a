// SPDX-License-Identifier: Apache-2.0
// TarnReportingSnareWorkerInstanceAlarmLowRMS: an alarm that plays at too low a level. The third report of a session
// begins a capture of a minute, once in the life of the worker; a session that stops sooner cancels it, since an alarm
// that is over so quickly was heard.
//
// A report is a message of the category Error and the type IssueDetector whose "issue_type" is "LowRMS". Owner: the
// worker. Threads: the server queue; the reply on one of the capture service.
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

  // Only in sessions of the service types Alarms and Test.
  bool interestedInMessage(const TarnReportingSessionMessage& message) const override;
  // Asks the service for the capture and keeps the identifier that it replies, for the stop. Whether the service takes
  // the request is logged, and so is its reply.
  void fire(const TarnReportingSessionMessage& message);
  // Cancels the capture, also one that was cancelled before. One whose reply hasn't come is not known yet and goes on.
  void stop();

 private:
  // The capture completes after so long, unless it is cancelled.
  const double snareAlarmLowRmsDuration_ = 60.0;  // seconds
};

}  // namespace tarn
