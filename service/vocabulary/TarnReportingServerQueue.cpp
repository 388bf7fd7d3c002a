// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingServerQueue.h"

#include <cstdio>
#include <cstdlib>

#include "platform/WorkQueue.h"
#include "service/vocabulary/TarnReportingUtility.h"

namespace tarn {

bool TarnReportingIsOnServerQueue() noexcept {
  return TarnReportingUtilityGetReportingServerQueue()->isCurrent();
}

void TarnReportingRequireServerQueue() noexcept {
  if (!TarnReportingIsOnServerQueue()) [[unlikely]] {
    static_cast<void>(std::fputs("tarnkit: code of the server queue was called outside it\n", stderr));
    std::abort();
  }
}

}  // namespace tarn
