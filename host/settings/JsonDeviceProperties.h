// JsonDeviceProperties: what the device is, from a file that holds one JSON object of properties:
// {"InternalBuild": false, "haptics": false}. Without a file the device has neither property.
//
// A property that the system knows must be true or false; others are taken as they are, for newer systems.
// Threads: any; it never changes once it is made.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/DeviceProperties.h"
#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class JsonDeviceProperties final : public platform::DeviceProperties {
 public:
  // The device without a file.
  JsonDeviceProperties();

  // Takes the properties of the file instead, all or none. An error reads "FILE:LINE:COLUMN: text", "FILE:LINE: text"
  // or "FILE: text". At most 1 MiB is read.
  [[nodiscard]] Status load(const std::string& path);

  std::optional<bool> boolean(std::string_view name) const override;

 private:
  plist::Dictionary properties_;
};

}  // namespace tarn::linux_host
