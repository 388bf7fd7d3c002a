// SPDX-License-Identifier: Apache-2.0
// WriterLimits: what the writer may take of the disk, from how much the options say is kept. Threads: any.
#pragma once

#include <algorithm>
#include <cstdint>

#include "recorder/RecorderOptions.h"
#include "recorder/store/Retention.h"

namespace tarn::recorder {

inline std::int64_t capOf(const RecorderOptions& options) {
  return std::max<std::int64_t>(options.maxMegabytes, 1) * (std::int64_t{1} << 20);
}

inline RetentionLimits limitsOf(const RecorderOptions& options) {
  constexpr double kSecondsADay = 86'400;
  return {capOf(options), options.maxAgeDays * kSecondsADay,
          std::max(options.summaryMaxAgeDays, options.maxAgeDays) * kSecondsADay};
}

// One transaction of a small file must not outgrow what retention keeps free.
inline std::int64_t transactionBytes(const RecorderOptions& options) {
  return std::clamp(capOf(options) / 16, std::int64_t{1} << 16, std::int64_t{1} << 23);
}

// Beyond this the log is brought in, and beyond twice as much commits wait for it.
inline std::int64_t logLimit(const RecorderOptions& options) {
  return std::clamp(capOf(options) / 32, std::int64_t{1} << 16, std::int64_t{1} << 24);
}

// Nor may the log, which takes one transaction more than its limits.
inline std::int64_t logReserve(const RecorderOptions& options) {
  constexpr std::int64_t kPages = std::int64_t{1} << 17;  // that a transaction touches beside its events
  return 2 * (logLimit(options) + transactionBytes(options)) + kPages;
}

}  // namespace tarn::recorder
