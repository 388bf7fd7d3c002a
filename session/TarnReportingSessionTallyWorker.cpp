// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionTallyWorker.h"

#include "platform/Facilities.h"
#include "platform/TallyService.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingTallyNames.h"

namespace tarn {

std::unique_ptr<TarnReportingSessionTallyWorker> TarnReportingSessionTallyWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionTallyWorker>(session);
}

void TarnReportingSessionTallyWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  platform::TallyService& tally = TarnReportingFacilities().tally;
  if (names_ == nullptr) {
    names_ = ProcessState::of<TarnReportingTallyNames>();
  }
  const TarnReportingTallyNames::Names& names = names_->of(owner->serviceType(), message->category(), message->type());
  for (const std::string* name : {&names.ofMessage, &names.ofService}) {
    if (tally.eventIsInUse(*name)) {
      // The payload as it is now: at the session's stop a producer may change the record in place.
      tally.sendEventLazy(*name, [payload = message->message()] { return payload; });
    }
  }
}

}  // namespace tarn
