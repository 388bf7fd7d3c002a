// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/drivers/TarnReportingSessionDriverSnapshotWorker.h"

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn {

std::unique_ptr<TarnReportingSessionDriverSnapshotWorker> TarnReportingSessionDriverSnapshotWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  if (TarnReportingFacilities().flume == nullptr) return nullptr;
  return std::make_unique<TarnReportingSessionDriverSnapshotWorker>(session);
}

bool TarnReportingSessionDriverSnapshotWorker::start() {
  utility_ = TarnReportingDriverUtility::shared();
  if (utility_) {
    driverSnapShot_ = utility_->getSnapShot();
  }
  return true;
}

void TarnReportingSessionDriverSnapshotWorker::stop() {
  if (const std::shared_ptr<TarnReportingSession> owner = session(); owner && utility_) {
    utility_->sendDriverLogsForSession(*owner, driverSnapShot_.value_or(TarnReportingDriverUtility::SnapShot()));
  }
  driverSnapShot_.reset();
}

}  // namespace tarn
