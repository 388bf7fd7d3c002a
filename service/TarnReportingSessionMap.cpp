// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingSessionMap.h"

#include "service/TarnReportingSessionIndex.h"
#include "session/TarnReportingSession.h"

namespace tarn {

TarnReportingSessionMap::Session TarnReportingSessionMap::find(std::int64_t reporterID) const {
  const auto place = places_.find(reporterID);
  return place == places_.end() ? nullptr : ordered_.at(place->second).session;
}

TarnReportingSessionMap::~TarnReportingSessionMap() {
  while (const Session session = first()) {
    remove(session->reporterID());
  }
}

void TarnReportingSessionMap::list(std::shared_ptr<TarnReportingSessionIndex> index, std::uint64_t number,
                                   TarnReportingClientServerInstance& client) {
  index_ = std::move(index);
  number_ = number;
  client_ = &client;
  for (const auto& [place, entry] : ordered_) {
    index_->add(entry.reporterID, number_, *client_);
  }
  noteRunning(static_cast<std::ptrdiff_t>(running_.size()));
}

void TarnReportingSessionMap::store(std::int64_t reporterID, Session session) {
  if (const auto place = places_.find(reporterID); place != places_.end()) {
    setRunning(reporterID, false);
    ordered_.at(place->second).session = std::move(session);
    if (index_ != nullptr) {
      index_->noteReplaced();
    }
    return;
  }
  const auto entry = ordered_.emplace(nextPlace_, Entry{reporterID, std::move(session), {}}).first;
  try {
    Running spare{{nextPlace_, &entry->second}};
    entry->second.whileNotRunning = spare.extract(spare.begin());
    places_.emplace(reporterID, nextPlace_);
    if (index_ != nullptr) {
      index_->add(reporterID, number_, *client_);
    }
  } catch (...) {
    places_.erase(reporterID);
    ordered_.erase(entry);
    throw;
  }
  ++nextPlace_;
}

void TarnReportingSessionMap::remove(std::int64_t reporterID) {
  const auto place = places_.find(reporterID);
  if (place == places_.end()) return;
  noteRunning(-static_cast<std::ptrdiff_t>(running_.erase(place->second)));
  if (index_ != nullptr) {
    index_->remove(reporterID, number_);
  }
  const auto removed = ordered_.extract(place->second);  // ends when nothing finds it any more
  places_.erase(place);
}

void TarnReportingSessionMap::setRunning(std::int64_t reporterID, bool running) noexcept {
  const auto place = places_.find(reporterID);
  if (place == places_.end()) return;
  Entry& entry = ordered_.find(place->second)->second;
  if (running == entry.whileNotRunning.empty()) return;
  if (running) {
    running_.insert(std::move(entry.whileNotRunning));
  } else {
    entry.whileNotRunning = running_.extract(place->second);
  }
  noteRunning(running ? 1 : -1);
}

void TarnReportingSessionMap::noteRunning(std::ptrdiff_t more) noexcept {
  if (index_ != nullptr) {
    index_->addRunning(more);
  }
}

}  // namespace tarn
