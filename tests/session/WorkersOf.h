// SPDX-License-Identifier: Apache-2.0
// The workers of a session by their kind, in the order of creation.
#pragma once

#include <vector>

#include "session/TarnReportingSession.h"

namespace tarn::testing {

using Members = std::vector<const TarnReportingSessionWorkerSet::Member*>;

template <class Which>
Members workersOf(const TarnReportingSession& session, const Which& which) {
  Members members;
  for (const auto& member : session.workers().messageWorkers()) {
    if (which(member)) {
      members.push_back(&member);
    }
  }
  return members;
}

inline Members consumersOf(const TarnReportingSession& session) {
  return workersOf(session, [](const auto& member) { return member.consumer != nullptr; });
}

inline Members producersOf(const TarnReportingSession& session) {
  return workersOf(session, [](const auto& member) { return member.workerClass->isProducer; });
}

}  // namespace tarn::testing
