// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakeTallyService.h"

#include <utility>

#include "testing/backends/RecordingSessionRecords.h"

namespace tarn::testing {

bool FakeTallyService::eventIsInUse(std::string_view name) {
  askedNames_.emplace_back(name);
  return isInUse(name);
}

void FakeTallyService::sendEventLazy(std::string_view name, PayloadCallback payload) {
  sentNames_.emplace_back(name);
  if (!isInUse(name)) return;
  switch (calls_) {
    case PayloadCalls::AtOnce:
      events_.push_back({std::string(name), payload(), RecordingSessionRecords::current()});
      break;
    case PayloadCalls::Later:
      pending_.push_back({std::string(name), std::move(payload), RecordingSessionRecords::current()});
      break;
    case PayloadCalls::Never:
      break;
  }
}

void FakeTallyService::useAll() {
  inUse_.reset();
}

void FakeTallyService::useOnly(std::set<std::string, std::less<>> names) {
  inUse_ = std::move(names);
}

std::size_t FakeTallyService::callPending() {
  std::size_t called = 0;
  while (!pending_.empty()) {
    Pending next = std::move(pending_.front());
    pending_.pop_front();
    events_.push_back({std::move(next.name), next.payload(), next.session});
    ++called;
  }
  return called;
}

void FakeTallyService::clear() {
  pending_.clear();
  events_.clear();
  sentNames_.clear();
  askedNames_.clear();
}

std::vector<plist::Dictionary> FakeTallyService::payloads(std::string_view name) const {
  std::vector<plist::Dictionary> payloads;
  for (const Event& event : events_) {
    if (event.name == name) {
      payloads.push_back(event.payload);
    }
  }
  return payloads;
}

}  // namespace tarn::testing
