// SPDX-License-Identifier: Apache-2.0
// RecorderPylonService: the metric service as the recorder stands in for it. A metric is recorded under back-end
// "pylon" by its identifier in decimal: the fields of its text rendering, and its bytes on the wire as `wire`, in
// lower-case hexadecimal. So a metric can be read by people and compared byte by byte.
//
// Owner: the platform. Threads: the server queue.
#pragma once

#include <cstdint>

#include "platform/Clock.h"
#include "platform/PylonService.h"

namespace tarn::recorder {

class Recorder;

class RecorderPylonService : public platform::PylonService {
 public:
  // The recorder and the clock outlive this.
  RecorderPylonService(Recorder& recorder, const platform::Clock& clock) noexcept
      : recorder_(recorder), clock_(clock) {}

  // Forms the text fields and the bytes here and now. Nothing fails and nothing waits.
  void post(std::uint32_t metricIdentifier, const platform::MetricRecord& record) override;

 private:
  Recorder& recorder_;
  const platform::Clock& clock_;
};

}  // namespace tarn::recorder
