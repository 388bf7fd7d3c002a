// Long work on the server queue is done in slices: it tells what it has cost, and hands over its rest when others are
// to have their turn.
//
// Threads: the server queue.
#pragma once

#include "platform/WorkQueue.h"
#include "service/vocabulary/TarnReportingUtility.h"

namespace tarn {

// Charges so many units of about a microsecond to whoever the work is done for. Whether others are to have their turn
// before it goes on.
inline bool TarnReportingSpend(std::size_t cost) {
  return TarnReportingUtilityGetReportingServerQueue()->spend(cost);
}

// Does the rest when its turn comes again. The last thing that a slice does.
inline void TarnReportingContinueLater(platform::Work rest) {
  TarnReportingUtilityGetReportingServerQueue()->asyncNext(std::move(rest));
}

}  // namespace tarn
