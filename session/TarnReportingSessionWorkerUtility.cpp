#include "session/TarnReportingSessionWorkerUtility.h"

#include <algorithm>
#include <vector>

#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

constexpr std::string_view kInvalidCoordinates = "plac_invalid_";

}  // namespace

TarnReportingCombinedMessages TarnReportingSessionWorkerUtility::combineRapidMessages(
    const TarnReportingSessionMessageList& messages, std::span<const plist::Key> keysToCombine,
    double maximumPausetime) {
  TarnReportingCombinedMessages combined(messages);
  std::vector<bool> seen(keysToCombine.size());
  bool hasHead = false;
  std::size_t head = 0;
  double headTime = 0;
  for (auto at = messages.begin(); at != messages.end(); ++at) {
    const std::shared_ptr<TarnReportingSessionMessage>& message = *at;
    const plist::Dictionary& payload = message->message();
    const auto key = std::find_if(keysToCombine.begin(), keysToCombine.end(),
                                  [&](const plist::Key& each) { return payload.contains(each); });
    if (key == keysToCombine.end()) continue;
    const auto place = static_cast<std::size_t>(key - keysToCombine.begin());
    if (seen[place]) {
      seen.assign(seen.size(), false);
      hasHead = false;
    }
    seen[place] = true;
    const plist::ValueView time = payload.get(keys::kTimestamp);
    if (hasHead && time.asDouble() - headTime < maximumPausetime) {
      // Its own count: the page that it lies in may go when the head's is read.
      const plist::Dictionary merged = payload;
      headTime = time.present() ? time.asDouble() : headTime;
      messages.change(head, [&](TarnReportingSessionMessage& record) {
        const MutexLock guard(record);
        record.mutableMessage().merge(merged);
      });
      combined.setMerged(at.index());
      continue;
    }
    if (!hasHead) {
      hasHead = true;
      head = at.index();
      headTime = time.asDouble();
    }
  }
  return combined;
}

bool TarnReportingSessionWorkerUtility::isParleyXYerrorMessage(const TarnReportingSessionMessage& message) {
  return message.message().hasKeyWithPrefix(kInvalidCoordinates);
}

}  // namespace tarn
