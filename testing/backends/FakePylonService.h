// SPDX-License-Identifier: Apache-2.0
// FakePylonService: a metric service that asks each record for everything and keeps the answers. Threads: one at a
// time.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/PylonService.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakePylonService final : public platform::PylonService, public Recorded {
 public:
  struct Metric {
    std::uint32_t identifier = 0;
    std::string bytes;
    plist::Dictionary fields;
  };

  // The interface.
  void post(std::uint32_t metricIdentifier, const platform::MetricRecord& record) override {
    happened("metric");
    metrics_.push_back({metricIdentifier, record.serialized(), record.textFields()});
  }

  // Controls.
  void clear() { metrics_.clear(); }

  // Observations.
  const std::vector<Metric>& metrics() const noexcept { return metrics_; }

 private:
  std::vector<Metric> metrics_;
};

}  // namespace tarn::testing
