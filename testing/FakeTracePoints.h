// SPDX-License-Identifier: Apache-2.0
// FakeTracePoints: keeps the trace points that were emitted. Threads: any.
#pragma once

#include <cstdint>
#include <functional>
#include <mutex>
#include <utility>
#include <vector>

#include "platform/TracePoints.h"
#include "testing/backends/OwnMemory.h"

namespace tarn::testing {

class FakeTracePoints final : public platform::TracePoints {
 public:
  struct Point {
    std::uint32_t code;
    std::int64_t argument;
    friend bool operator==(const Point&, const Point&) = default;
  };

  // The interface.
  void emit(std::uint32_t code, std::int64_t argument) noexcept override {
    const OwnMemory own;
    const std::lock_guard lock(mutex_);
    emitted_.push_back({code, argument});
    if (onEmit_) {
      onEmit_();
    }
  }

  // Controls.
  // Called with each point, under the lock of these points.
  void onEmit(std::function<void()> call) {
    const std::lock_guard lock(mutex_);
    onEmit_ = std::move(call);
  }
  void clear() {
    const std::lock_guard lock(mutex_);
    emitted_.clear();
  }

  // Observations.
  std::vector<Point> emitted() const {
    const std::lock_guard lock(mutex_);
    return emitted_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<Point> emitted_;    // guarded by mutex_
  std::function<void()> onEmit_;  // guarded by mutex_
};

}  // namespace tarn::testing
