// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionWorkerUtility.h"

#include <algorithm>
#include <optional>
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
  struct Head {
    std::size_t index;
    double time;
  };
  std::optional<Head> head;
  const auto take = [&](std::size_t index, const TarnReportingSessionMessageList::Record& message) {
    const plist::Dictionary& payload = message->message();
    const auto key = std::find_if(keysToCombine.begin(), keysToCombine.end(),
                                  [&](const plist::Key& each) { return payload.contains(each); });
    if (key == keysToCombine.end()) return;
    const auto place = static_cast<std::size_t>(key - keysToCombine.begin());
    if (seen[place]) {
      seen.assign(seen.size(), false);
      head.reset();
    }
    seen[place] = true;
    const plist::ValueView time = payload.get(keys::kTimestamp);
    if (!head) {
      head = {index, time.asDouble()};
    } else if (time.asDouble() - head->time < maximumPausetime) {
      // Its own count: the page that it lies in may go when the head's is read.
      const plist::Dictionary merged = payload;
      head->time = time.present() ? time.asDouble() : head->time;
      messages.change(head->index, [&](TarnReportingSessionMessage& record) {
        const MutexLock guard(record);
        record.mutableMessage().merge(merged);
      });
      combined.setMerged(index);
    }
  };
  messages.forEach(take, [] {});
  return combined;
}

bool TarnReportingSessionWorkerUtility::isParleyXYerrorMessage(const TarnReportingSessionMessage& message) {
  return message.message().hasKeyWithPrefix(kInvalidCoordinates);
}

}  // namespace tarn
