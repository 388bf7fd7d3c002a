#include "service/TarnReportingSessionIndex.h"

namespace tarn {

void TarnReportingSessionIndex::add(std::int64_t reporterID, std::uint64_t number, Client& client) {
  holders_.emplace(reporterID, Holder{number, &client});
  if (++sessionsOf_[number] == 1) {
    clients_.emplace(number, &client);
  }
}

void TarnReportingSessionIndex::remove(std::int64_t reporterID, std::uint64_t number) {
  const auto [begin, end] = holders_.equal_range(reporterID);
  for (auto holder = begin; holder != end; ++holder) {
    if (holder->second.number == number) {
      holders_.erase(holder);
      break;
    }
  }
  if (const auto count = sessionsOf_.find(number); count != sessionsOf_.end() && --count->second == 0) {
    sessionsOf_.erase(count);
    clients_.erase(number);
  }
}

TarnReportingSessionIndex::Client* TarnReportingSessionIndex::firstHolder(std::int64_t reporterID) const {
  const auto [begin, end] = holders_.equal_range(reporterID);
  const Holder* first = nullptr;
  for (auto holder = begin; holder != end; ++holder) {
    if (first == nullptr || holder->second.number < first->number) {
      first = &holder->second;
    }
  }
  return first == nullptr ? nullptr : first->client;
}

}  // namespace tarn
