// SPDX-License-Identifier: Apache-2.0
// DeviceProperties: what the device is. Threads: any.
#pragma once

#include <optional>
#include <string_view>

namespace tarn::platform {

// Facts that don't change while the process lives, so reading them costs a look-up. Owned by the platform.
class DeviceProperties {
 public:
  virtual ~DeviceProperties() = default;
  // The boolean property of this name; nothing when the device doesn't tell or has something else than a boolean there.
  // Known are "InternalBuild", whether developers use the device, and "haptics"; a platform may have more.
  virtual std::optional<bool> boolean(std::string_view name) const = 0;
};

}  // namespace tarn::platform
