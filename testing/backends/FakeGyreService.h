// SPDX-License-Identifier: Apache-2.0
// FakeGyreService: keeps the requests for a stack-sampling trace. Threads: one at a time.
#pragma once

#include <vector>

#include "platform/GyreService.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakeGyreService final : public platform::GyreService, public Recorded {
 public:
  // The interface.
  void requestGyre(const platform::GyreRequest& request) override {
    happened("gyre");
    requests_.push_back(request);
  }

  // Controls.
  void clear() { requests_.clear(); }

  // Observations.
  const std::vector<platform::GyreRequest>& requests() const noexcept { return requests_; }

 private:
  std::vector<platform::GyreRequest> requests_;
};

}  // namespace tarn::testing
