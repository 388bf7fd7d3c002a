// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingSessionIndex.h"

#include <algorithm>

namespace tarn {

void TarnReportingSessionIndex::add(std::int64_t reporterID, std::uint64_t number, Client& client) {
  std::size_t& sessions = sessionsOf_[number];
  auto& holders = holders_[reporterID];
  try {
    const auto place =
        std::find_if(holders.rbegin(), holders.rend(), [&](const Holder& h) { return h.number < number; });
    holders.insert(place.base(), Holder{number, &client});
    clients_.emplace(number, &client);
  } catch (...) {
    removeHolder(reporterID, number);
    throw;
  }
  ++sessions;
  ++sessionCount_;
  ++changes_;
}

bool TarnReportingSessionIndex::removeHolder(std::int64_t reporterID, std::uint64_t number) noexcept {
  const auto entry = holders_.find(reporterID);
  if (entry == holders_.end()) return false;
  const bool removed = std::erase_if(entry->second, [&](const Holder& h) { return h.number == number; }) != 0;
  if (entry->second.empty()) {
    holders_.erase(entry);
  }
  return removed;
}

void TarnReportingSessionIndex::remove(std::int64_t reporterID, std::uint64_t number) {
  if (!removeHolder(reporterID, number)) return;
  --sessionCount_;
  ++changes_;
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
