#include "service/TarnReportingSessionMap.h"

#include "session/TarnReportingSession.h"

namespace tarn {

TarnReportingSessionMap::Session TarnReportingSessionMap::find(std::int64_t reporterID) const {
  const auto place = places_.find(reporterID);
  return place == places_.end() ? nullptr : ordered_.at(place->second).session;
}

bool TarnReportingSessionMap::store(std::int64_t reporterID, Session session) {
  const auto [place, isNew] = places_.try_emplace(reporterID, nextPlace_);
  if (isNew) {
    ++nextPlace_;
  }
  running_.erase(place->second);
  ordered_.insert_or_assign(place->second, Entry{reporterID, std::move(session)});
  return isNew;
}

void TarnReportingSessionMap::remove(std::int64_t reporterID) {
  if (const auto place = places_.find(reporterID); place != places_.end()) {
    running_.erase(place->second);
    ordered_.erase(place->second);
    places_.erase(place);
  }
}

void TarnReportingSessionMap::setRunning(std::int64_t reporterID, bool running) {
  const auto place = places_.find(reporterID);
  if (place == places_.end()) return;
  if (running) {
    running_.emplace(place->second, &ordered_.at(place->second));
  } else {
    running_.erase(place->second);
  }
}

}  // namespace tarn
