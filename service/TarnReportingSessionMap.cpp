#include "service/TarnReportingSessionMap.h"

#include "session/TarnReportingSession.h"

namespace tarn {

TarnReportingSessionMap::Session TarnReportingSessionMap::find(std::int64_t reporterID) const {
  const auto place = places_.find(reporterID);
  return place == places_.end() ? nullptr : ordered_.at(place->second).session;
}

void TarnReportingSessionMap::store(std::int64_t reporterID, Session session) {
  const auto [place, isNew] = places_.try_emplace(reporterID, nextPlace_);
  if (isNew) {
    ++nextPlace_;
  }
  ordered_.insert_or_assign(place->second, Entry{reporterID, std::move(session)});
}

void TarnReportingSessionMap::remove(std::int64_t reporterID) {
  if (const auto place = places_.find(reporterID); place != places_.end()) {
    ordered_.erase(place->second);
    places_.erase(place);
  }
}

void TarnReportingSessionMap::clear() {
  ordered_.clear();
  places_.clear();
}

}  // namespace tarn
