// PylonService: the wireless-diagnostics metrics of the device. Threads: the server queue.
#pragma once

#include <cstdint>
#include <string>

#include "plist/Dictionary.h"

namespace tarn::platform {

// What the service may ask of a record that is posted. The record makes an answer only when it is asked for.
class MetricRecord {
 public:
  virtual ~MetricRecord() = default;
  // The record on the wire: the bytes of its Protocol Buffers form.
  virtual std::string serialized() const = 0;
  // The fields of its text rendering, by their names and in their order.
  virtual plist::Dictionary textFields() const = 0;
};

class PylonService {
 public:
  virtual ~PylonService() = default;
  // Posts a metric. The record is asked during the call only. There is no result.
  virtual void post(std::uint32_t metricIdentifier, const MetricRecord& record) = 0;
};

}  // namespace tarn::platform
