// SPDX-License-Identifier: Apache-2.0
// PylonService: the wireless-diagnostics metrics of the device. Threads: the server queue.
#pragma once

#include <cstdint>
#include <string>

#include "plist/Dictionary.h"

namespace tarn::platform {

// What the service may ask of a record that is posted. The record makes an answer only when it is asked for, since a
// service wants one form and not both. Owned by whoever posts, and there for the call.
class MetricRecord {
 public:
  virtual ~MetricRecord() = default;
  // The record on the wire: the bytes of its Protocol Buffers form.
  virtual std::string serialized() const = 0;
  // The fields of its text rendering, by their names and in their order, for people and for tools that know no records.
  virtual plist::Dictionary textFields() const = 0;
};

// Owned by the platform, which may lack it.
class PylonService {
 public:
  virtual ~PylonService() = default;
  // Posts a metric of this kind: the identifier says what record it is. The record is asked during the call only. There
  // is no result: a service that takes nothing loses it.
  virtual void post(std::uint32_t metricIdentifier, const MetricRecord& record) = 0;
};

}  // namespace tarn::platform
