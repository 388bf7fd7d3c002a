// SPDX-License-Identifier: Apache-2.0
#include "client/PendingReplies.h"

#include <algorithm>
#include <utility>

namespace tarn::client {

namespace {

constexpr std::uint16_t kNoServiceType = 65535;  // what a new session has

}  // namespace

// Follows what the request does to this connection's sessions. Whether it puts an end to earlier starts.
bool PendingReplies::noteRequest(const wire::Request& request) {
  const auto found = sessions_.find(request.reporterID);
  switch (request.operation) {
    case wire::Operation::CreateReportingSession:
      sessions_[request.reporterID] = {kNoServiceType, false};
      return true;
    case wire::Operation::SetServiceType:
      if (request.reporterID == 0 || found == sessions_.end() || found->second.serviceType == request.serviceType) {
        return false;
      }
      found->second = {request.serviceType, false};
      return true;
    case wire::Operation::StopReportingSessionForID:
      if (request.reporterID != 0 && found != sessions_.end()) {
        found->second.started = false;
      }
      return true;
    case wire::Operation::DestroyReportingSession:
      if (found != sessions_.end()) {
        sessions_.erase(found);
      }
      return true;
    default:
      return false;
  }
}

// Whether a start finds the session running, so that it is never answered.
bool PendingReplies::startsRunningSession(std::int64_t reporterID) {
  const auto found = sessions_.find(reporterID);
  return reporterID != 0 && found != sessions_.end() && std::exchange(found->second.started, true);
}

void PendingReplies::add(std::uint64_t id, const wire::Request& request, ReplyHandler handler) {
  if (request.operation != wire::Operation::StartReportingSessionForID) {
    const bool endsStarts = noteRequest(request);
    inOrder_.push_back({id, request.reporterID, request.operation, endsStarts, false, std::move(handler)});
    ++waiting_;
  } else if (startsRunningSession(request.reporterID)) {
    cancelled_.push_back(std::move(handler));
  } else {
    held_.emplace(HeldKey{request.reporterID, id}, std::move(handler));
    reporterOfHeld_.emplace(id, request.reporterID);
  }
}

PendingReplies::Entry* PendingReplies::find(std::uint64_t id) {
  const auto found = std::lower_bound(inOrder_.begin(), inOrder_.end(), id,
                                      [](const Entry& entry, std::uint64_t wanted) { return entry.id < wanted; });
  return found != inOrder_.end() && found->id == id && !found->done ? &*found : nullptr;
}

bool PendingReplies::take(std::uint64_t id, bool failed, ReplyHandler& handler) {
  if (Entry* entry = !inOrder_.empty() && inOrder_.front().id == id ? &inOrder_.front() : find(id)) {
    handler = std::move(entry->handler);
    entry->handler = nullptr;
    entry->done = true;
    --waiting_;
    if (entry->endsStarts && !failed) {
      cancelStartsBefore(entry->reporterID, id);
    }
    dropDone();
    return true;
  }
  const auto reporter = reporterOfHeld_.find(id);
  if (reporter == reporterOfHeld_.end()) return false;
  const auto held = held_.find({reporter->second, id});
  handler = std::move(held->second);
  held_.erase(held);
  reporterOfHeld_.erase(reporter);
  return true;
}

void PendingReplies::dropDone() {
  while (!inOrder_.empty() && inOrder_.front().done) {
    inOrder_.pop_front();
  }
}

void PendingReplies::forget(std::uint64_t id) {
  if (Entry* entry = find(id)) {
    entry->handler = nullptr;
    return;  // its place stays, so that what it does to earlier starts is still seen
  }
  const auto reporter = reporterOfHeld_.find(id);
  if (reporter != reporterOfHeld_.end()) {
    held_.erase({reporter->second, id});
    reporterOfHeld_.erase(reporter);
  }
}

void PendingReplies::cancelStartsBefore(std::int64_t reporterID, std::uint64_t id) {
  auto held = held_.lower_bound({reporterID, 0});
  while (held != held_.end() && held->first < HeldKey{reporterID, id}) {
    cancelled_.push_back(std::move(held->second));
    reporterOfHeld_.erase(held->first.second);
    held = held_.erase(held);
  }
}

bool PendingReplies::takeCancelled(ReplyHandler& handler) {
  if (cancelled_.empty()) return false;
  handler = std::move(cancelled_.front());
  cancelled_.pop_front();
  return true;
}

std::vector<PendingReplies::Rest> PendingReplies::takeAll() {
  std::vector<std::pair<std::uint64_t, Rest>> all;
  for (Entry& entry : inOrder_) {
    if (!entry.done) {
      const bool killed = entry.operation == wire::Operation::KillService;
      all.push_back({entry.id, {std::move(entry.handler), killed}});
    }
  }
  for (auto& [key, handler] : held_) {
    all.push_back({key.second, {std::move(handler), false}});
  }
  std::sort(all.begin(), all.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
  inOrder_.clear();
  waiting_ = 0;
  held_.clear();
  reporterOfHeld_.clear();
  sessions_.clear();
  std::vector<Rest> rest;
  rest.reserve(all.size());
  for (auto& [id, one] : all) {
    rest.push_back(std::move(one));
  }
  return rest;
}

}  // namespace tarn::client
