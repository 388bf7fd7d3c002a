#include "session/TarnReportingSessionWorkerUtility.h"

#include <algorithm>
#include <vector>

#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

constexpr std::string_view kInvalidCoordinates = "plac_invalid_";

double timeOf(const TarnReportingSessionMessage& message) {
  return message.message().get(keys::kTimestamp).asDouble();
}

}  // namespace

TarnReportingSessionMessages TarnReportingSessionWorkerUtility::combineRapidMessages(
    const TarnReportingSessionMessages& messages, std::span<const plist::Key> keysToCombine, double maximumPausetime) {
  TarnReportingSessionMessages result;
  std::vector<bool> seen(keysToCombine.size());
  TarnReportingSessionMessage* head = nullptr;
  for (const auto& message : messages) {
    const auto key = std::find_if(keysToCombine.begin(), keysToCombine.end(),
                                  [&](const plist::Key& each) { return message->message().contains(each); });
    if (key == keysToCombine.end()) {
      result.push_back(message);
      continue;
    }
    const auto place = static_cast<std::size_t>(key - keysToCombine.begin());
    if (seen[place]) {
      seen.assign(seen.size(), false);
      head = nullptr;
    }
    seen[place] = true;
    if (head != nullptr && timeOf(*message) - timeOf(*head) < maximumPausetime) {
      const MutexLock guard(*head);
      head->mutableMessage().merge(message->message());
      continue;
    }
    if (head == nullptr) {
      head = message.get();
    }
    result.push_back(message);
  }
  return result;
}

bool TarnReportingSessionWorkerUtility::isParleyXYerrorMessage(const TarnReportingSessionMessage& message) {
  return message.message().hasKeyWithPrefix(kInvalidCoordinates);
}

}  // namespace tarn
