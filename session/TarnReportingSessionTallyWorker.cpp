// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionTallyWorker.h"

#include "platform/Facilities.h"
#include "platform/TallyService.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn {

std::unique_ptr<TarnReportingSessionTallyWorker> TarnReportingSessionTallyWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return std::make_unique<TarnReportingSessionTallyWorker>(session);
}

const TarnReportingSessionTallyWorker::EventNames& TarnReportingSessionTallyWorker::namesFor(
    AudioServiceType serviceType, AudioEventCategory category, AudioEventType type) {
  const std::uint64_t key = std::uint64_t{static_cast<std::uint32_t>(category)} << 32U |
                            std::uint64_t{static_cast<std::uint16_t>(type)} << 16U |
                            static_cast<std::uint16_t>(serviceType);
  if (const auto found = names_.find(key); found != names_.end()) return found->second;
  if (names_.size() == kNamesLimit) {
    names_.clear();
  }
  std::string kind = TarnReportingUtilityCategoryString(category) + ".";
  kind += TarnReportingUtilityTypeString(type);
  std::string service(TarnReportingUtilityGenerateServiceNameFromServiceType(serviceType));
  return names_.emplace(key, EventNames{"sys.oxbow.tarnkit." + kind, "sys.oxbow." + service + "." + kind})
      .first->second;
}

void TarnReportingSessionTallyWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  const std::shared_ptr<TarnReportingSession> owner = session();
  if (!owner) return;
  platform::TallyService& tally = TarnReportingFacilities().tally;
  const EventNames& names = namesFor(owner->serviceType(), message->category(), message->type());
  for (const std::string* name : {&names.ofMessage, &names.ofService}) {
    if (tally.eventIsInUse(*name)) {
      // The payload as it is now: at the session's stop a producer may change the record in place.
      tally.sendEventLazy(*name, [payload = message->message()] { return payload; });
    }
  }
}

}  // namespace tarn
