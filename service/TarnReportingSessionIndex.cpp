#include "service/TarnReportingSessionIndex.h"

#include <algorithm>

namespace tarn {

void TarnReportingSessionIndex::add(std::int64_t reporterID, std::uint64_t number, Client& client) {
  auto& holders = holders_[reporterID];
  const auto place = std::find_if(holders.rbegin(), holders.rend(), [&](const Holder& h) { return h.number < number; });
  holders.insert(place.base(), Holder{number, &client});
  ++sessionCount_;
  if (++sessionsOf_[number] == 1) {
    clients_.emplace(number, &client);
  }
}

void TarnReportingSessionIndex::remove(std::int64_t reporterID, std::uint64_t number) {
  const auto entry = holders_.find(reporterID);
  if (entry == holders_.end()) return;
  if (std::erase_if(entry->second, [&](const Holder& holder) { return holder.number == number; }) == 0) return;
  if (entry->second.empty()) {
    holders_.erase(entry);
  }
  --sessionCount_;
  if (const auto count = sessionsOf_.find(number); count != sessionsOf_.end() && --count->second == 0) {
    sessionsOf_.erase(count);
    clients_.erase(number);
  }
}

TarnReportingSessionIndex::Client* TarnReportingSessionIndex::firstHolder(std::int64_t reporterID) const {
  const auto entry = holders_.find(reporterID);
  return entry == holders_.end() ? nullptr : entry->second.front().client;
}

}  // namespace tarn
