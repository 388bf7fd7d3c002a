// SPDX-License-Identifier: Apache-2.0
// TracePoints: informational marks in the system's trace, by code. Threads: any. A platform without a tracer drops
// them.
#pragma once

#include <cstdint>

namespace tarn::platform {

// Owned by the platform. Costs next to nothing while nobody traces, so it stands in every operation and session.
class TracePoints {
 public:
  virtual ~TracePoints() = default;
  // Marks that the point of this code was passed, with a number that belongs to it: a reporter ID mostly. Never fails.
  // Codes are the system's own, fixed numbers by which tools know the points.
  virtual void emit(std::uint32_t code, std::int64_t argument) noexcept = 0;
};

}  // namespace tarn::platform
