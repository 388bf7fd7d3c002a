// TracePoints: informational marks in the system's trace, by code. Threads: any. A platform without a tracer drops
// them.
#pragma once

#include <cstdint>

namespace tarn::platform {

class TracePoints {
 public:
  virtual ~TracePoints() = default;
  // Marks that the point of this code was passed, with a number that belongs to it. Never fails.
  virtual void emit(std::uint32_t code, std::int64_t argument) noexcept = 0;
};

}  // namespace tarn::platform
