// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSessionOrientationMessagesWorker.h"

namespace tarn {

std::unique_ptr<TarnReportingSessionOrientationMessagesWorker>
TarnReportingSessionOrientationMessagesWorker::initWithSession(const std::shared_ptr<TarnReportingSession>&) {
  return nullptr;
}

}  // namespace tarn
