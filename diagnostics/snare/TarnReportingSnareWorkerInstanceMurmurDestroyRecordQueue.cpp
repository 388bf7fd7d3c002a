// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/snare/TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue.h"

#include "diagnostics/snare/WorkerInstanceState.h"
#include "session/TarnReportingSession.h"

namespace tarn {

std::unique_ptr<TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue>
TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  if (session->isSingleMessageSession()) return nullptr;
  return std::make_unique<TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue>(
      session, std::make_shared<WorkerInstanceState>());
}

bool TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue::interestedInMessage(
    const TarnReportingSessionMessage& /*message*/) const {
  return false;
}

void TarnReportingSnareWorkerInstanceMurmurDestroyRecordQueue::handleMessage(
    const TarnReportingSessionMessage& /*message*/) {}

}  // namespace tarn
