// DeviceProperties: what the device is. Threads: any.
#pragma once

#include <optional>
#include <string_view>

namespace tarn::platform {

class DeviceProperties {
 public:
  virtual ~DeviceProperties() = default;
  // The boolean property of this name ("InternalBuild", "haptics"); nothing when the device doesn't tell.
  virtual std::optional<bool> boolean(std::string_view name) const = 0;
};

}  // namespace tarn::platform
