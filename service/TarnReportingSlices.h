// SPDX-License-Identifier: Apache-2.0
// Long work on the server queue is done in slices: it tells what it has cost, and hands over its rest when others are
// to have their turn.
//
// Threads: the server queue.
//
// A slice looks like this: do a bounded piece, `if (TarnReportingSpend(cost))` hand what is left over and return.
// Between two slices anything else may run, but for other requests of the same client, so a slice looks again at what
// it needs.
#pragma once

#include "platform/WorkQueue.h"
#include "service/vocabulary/TarnReportingUtility.h"

namespace tarn {

// Charges so many units of about a microsecond to whoever the work is done for. Whether others are to have their turn
// before it goes on. True when the credit of the turn is spent, or when so much work waits that no more may be made.
// Where a platform knows no turns it is always false, and the work is done in one go.
inline bool TarnReportingSpend(std::size_t cost) {
  return TarnReportingUtilityGetReportingServerQueue()->spend(cost);
}

// Does the rest when its turn comes again. The last thing that a slice does. Only after TarnReportingSpend() was true.
// The rest owns what it needs.
inline void TarnReportingContinueLater(platform::Work rest) {
  TarnReportingUtilityGetReportingServerQueue()->asyncNext(std::move(rest));
}

}  // namespace tarn
