// SPDX-License-Identifier: Apache-2.0
// TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue: the place of a detector of recording queues that the voice
// assistant destroys too late. No message is of interest to it, so it counts nothing and never fires.
#pragma once

#include <memory>
#include <string_view>

#include "diagnostics/snare/TarnReportingSnareWorkerInstance.h"

namespace tarn {

class TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue : public TarnReportingSnareWorkerInstance {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue";

  // For every session but single-message ones; each with a state of its own.
  static std::unique_ptr<TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSnareWorkerInstance::TarnReportingSnareWorkerInstance;

  // False, for every message.
  bool interestedInMessage(const TarnReportingSessionMessage& message) const override;
  // Never called, as nothing is of interest.
  void handleMessage(const TarnReportingSessionMessage& message);
};

}  // namespace tarn
